#pragma once

// The assistant's object model: the records that the plug-in reads and fills, its three commands
// and its replies. Every field is optional, so that a missing value differs from zero. A record
// reaches the assistant as its dictionary: {"class": "<record class>", "<field>": value, ...} with
// absent fields left out and nested records as nested dictionaries (README, "Reply dictionaries").

#include "platform/core/Object.h"
#include "platform/value/Json.h"
#include "platform/value/Value.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdlib>
#include <cstdint>
#include <cstring>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <type_traits>
#include <vector>

namespace kyn {

// Error codes of the assistant's object model (signed 64-bit, fixed values).
inline constexpr std::int64_t AXKynNotLoggedInErrorCode = 1001;
inline constexpr std::int64_t AXKynServiceRestrictedInRegionErrorCode = 1002;
inline constexpr std::int64_t AXKynServiceRestrictedInAccountErrorCode = 1003;
inline constexpr std::int64_t AXKynLockedErrorCode = 1004;
inline constexpr std::int64_t AXKynServiceNotAvailableErrorCode = 1005;
inline constexpr std::int64_t AXKynNotAFriendErrorCode = 1006;
inline constexpr std::int64_t AXKynNoFriendsErrorCode = 1007;
inline constexpr std::int64_t AXKynGeoFenceNotCreatedErrorCode = 1008;
inline constexpr std::int64_t AXKynLabelNotFoundErrorCode = 1009;
inline constexpr std::int64_t AXKynAddressNotFoundErrorCode = 1010;

/// The constant's name for an error code ("AXKynNotLoggedInErrorCode"), or nothing.
[[nodiscard]] std::optional<std::string_view> errorCodeName(std::int64_t code) noexcept;

// Values of a geofence command's trigger (when the notice comes: the friend arrives, leaves, or is
// there now or next) and fence type (whom it goes to: the user, or the friend about the user).
inline constexpr std::string_view AXKynGeoFenceTriggerOnArrivalValue = "OnArrival";
inline constexpr std::string_view AXKynGeoFenceTriggerOnDepartureValue = "OnDeparture";
inline constexpr std::string_view AXKynGeoFenceTriggerImmediateValue = "Immediate";
inline constexpr std::string_view AXKynFenceTypeNotifyMeValue = "Me";
inline constexpr std::string_view AXKynFenceTypeNotifyOthersValue = "Others";

/// An optional array of records (absent differs from empty).
template <class T>
using AXArray = std::optional<std::vector<std::shared_ptr<T>>>;

/// Base of every record of the assistant's object model.
class AXObject : public platform::Object {
 public:
  [[nodiscard]] virtual std::string_view className() const = 0;
  [[nodiscard]] virtual Value dictionary() const = 0;
  /// Appends the dictionary as JSON text, written from the fields without making the dictionary:
  /// the same JSON as `toJson(dictionary())`, numbers sometimes in fewer digits.
  void appendJson(std::string& out) const {
    platform::JsonTextWriter writer(out);
    writeJson(writer);
  }
  /// The same through a writer, which nested records share.
  virtual void writeJson(platform::JsonTextWriter& out) const = 0;
  /// "<ClassName {dictionary}>"
  [[nodiscard]] std::string description() const override;
  void appendDescription(std::string& out) const override;
};

namespace detail {

/// Counts a record's fields.
struct FieldCounter {
  std::size_t count = 0;
  template <class T>
  void operator()(std::string_view /*key*/, const T& /*v*/) {
    ++count;
  }
};

/// Writes present fields into a dictionary. Each key comes once, so members are appended without
/// looking for one of the same name.
struct FieldWriter {
  Value::object_t::Container& out;

  void operator()(std::string_view key, const std::optional<std::string>& v) const {
    if (v) out.emplace_back(key, *v);
  }
  void operator()(std::string_view key, const std::optional<double>& v) const {
    if (v && std::isfinite(*v)) out.emplace_back(key, *v);  // JSON cannot carry NaN or infinity
  }
  void operator()(std::string_view key, const std::optional<bool>& v) const {
    if (v) out.emplace_back(key, *v);
  }
  void operator()(std::string_view key, const std::optional<std::int64_t>& v) const {
    if (v) out.emplace_back(key, *v);
  }
  template <class T>
  void operator()(std::string_view key, const std::shared_ptr<T>& v) const {
    if (v) out.emplace_back(key, v->dictionary());
  }
  template <class T>
  void operator()(std::string_view key, const AXArray<T>& v) const {
    if (!v) return;
    Value array = Value::array();
    array.get_ref<Value::array_t&>().reserve(v->size());
    for (const auto& item : *v) {
      if (item) array.push_back(item->dictionary());
    }
    out.emplace_back(key, std::move(array));
  }
};

/// Writes present fields as JSON text by the rules of FieldWriter. Each follows the "class" member,
/// hence the leading comma; the keys are plain identifiers and need no escaping.
struct FieldJsonWriter {
  platform::JsonTextWriter& out;

  /// `,"key":`, made in one step. Keys are the literals of the records' field lists: their length
  /// is known when compiling, so the copy needs no call.
  template <std::size_t N>
  void key(const char (&k)[N]) const {
    char text[N + 3];
    text[0] = ',';
    text[1] = '"';
    std::memcpy(text + 2, k, N - 1);
    text[N + 1] = '"';
    text[N + 2] = ':';
    out += std::string_view(text, N + 3);
  }
  template <class Key>
  void operator()(const Key& k, const std::optional<std::string>& v) const {
    if (!v) return;
    key(k);
    out.string(*v);
  }
  template <class Key>
  void operator()(const Key& k, const std::optional<double>& v) const {
    if (!v || !std::isfinite(*v)) return;
    key(k);
    out.number(*v);
  }
  template <class Key>
  void operator()(const Key& k, const std::optional<bool>& v) const {
    if (!v) return;
    key(k);
    out += *v ? "true" : "false";
  }
  template <class Key>
  void operator()(const Key& k, const std::optional<std::int64_t>& v) const {
    if (!v) return;
    key(k);
    out.number(*v);
  }
  template <class Key, class T>
  void operator()(const Key& k, const std::shared_ptr<T>& v) const {
    if (!v) return;
    key(k);
    v->writeJson(out);
  }
  template <class Key, class T>
  void operator()(const Key& k, const AXArray<T>& v) const {
    if (!v) return;
    key(k);
    out += '[';
    bool first = true;
    for (const auto& item : *v) {
      if (!item) continue;
      if (!first) out += ',';
      first = false;
      item->writeJson(out);
    }
    out += ']';
  }
};

/// Lists a record's field names, in order.
struct FieldNames {
  std::string_view* names;
  std::size_t count = 0;
  std::size_t room;
  template <class T>
  void operator()(std::string_view key, const T& /*v*/) {
    if (count < room) names[count] = key;
    ++count;
  }
};

/// A record's field names, listed once per record type.
template <class Derived>
struct FieldKeys {
  static constexpr std::size_t kMax = 16;
  std::array<std::string_view, kMax> names{};
  std::size_t count = 0;

  static const FieldKeys& get() {
    static const FieldKeys keys = [] {
      FieldKeys k;
      Derived record;
      FieldNames lister{k.names.data(), 0, kMax};
      Derived::fields(record, lister);
      // A record with more fields than there is room for is a programming error that the first
      // read of it shows; raise kMax.
      if (lister.count > kMax) std::abort();
      k.count = lister.count;
      return k;
    }();
    return keys;
  }
};

/// Reads fields from the values found for them, field by field in order; a value of the wrong type
/// leaves its field absent.
struct FieldReader {
  const platform::JsonView* found;
  std::size_t next = 0;

  platform::JsonView take() { return found[next++]; }
  void operator()(std::string_view /*key*/, std::optional<std::string>& v) { platform::setStringValue(v, take()); }
  void operator()(std::string_view /*key*/, std::optional<double>& v) {
    auto n = platform::numberValue(take());
    v = (n && std::isfinite(*n)) ? n : std::nullopt;
  }
  void operator()(std::string_view /*key*/, std::optional<bool>& v) { v = platform::boolValue(take()); }
  void operator()(std::string_view /*key*/, std::optional<std::int64_t>& v) {
    const platform::JsonView m = take();
    v = m.isNumber() ? std::optional<std::int64_t>(platform::integerValue(m)) : std::nullopt;
  }
  template <class T>
  void operator()(std::string_view /*key*/, std::shared_ptr<T>& v) {
    const platform::JsonView m = take();
    v = m.isObject() ? T::fromDictionary(m) : nullptr;
  }
  template <class T>
  void operator()(std::string_view /*key*/, AXArray<T>& v) {
    const platform::JsonView m = take();
    if (!m.isArray()) {
      v.reset();
      return;
    }
    v.emplace();
    v->reserve(m.size());
    for (const auto& item : m) {
      if (item.value.isObject()) v->push_back(T::fromDictionary(item.value));
    }
  }
};

}  // namespace detail

/// A record whose fields are listed once, in `Derived::fields`, for both directions.
template <class Derived>
class AXRecord : public AXObject {
 public:
  [[nodiscard]] std::string_view className() const override { return Derived::kClassName; }

  [[nodiscard]] Value dictionary() const override {
    Value out = Value::object();
    // The storage of an ordered object copies, rather than moves, what it holds each time it
    // grows (its keys are const): room for every field is made first.
    auto& members = static_cast<Value::object_t::Container&>(out.get_ref<Value::object_t&>());
    detail::FieldCounter counter;
    Derived::fields(static_cast<const Derived&>(*this), counter);
    members.reserve(1 + counter.count);
    members.emplace_back("class", std::string(Derived::kClassName));
    detail::FieldWriter writer{members};
    Derived::fields(static_cast<const Derived&>(*this), writer);
    return out;
  }

  void writeJson(platform::JsonTextWriter& out) const override {
    // `{"class":"<name>"`, made in one step; the name is a plain identifier.
    static constexpr auto header = [] {
      constexpr std::string_view open = "{\"class\":\"";
      std::array<char, open.size() + Derived::kClassName.size() + 1> text{};
      std::copy(open.begin(), open.end(), text.begin());
      std::copy(Derived::kClassName.begin(), Derived::kClassName.end(), text.begin() + open.size());
      text.back() = '"';
      return text;
    }();
    out += std::string_view(header.data(), header.size());
    detail::FieldJsonWriter writer{out};
    Derived::fields(static_cast<const Derived&>(*this), writer);
    out += '}';
  }

  /// Fills `into` from a dictionary of this record's layout (a tree or a parsed document).
  static void readFields(Derived& into, platform::JsonView dictionary) {
    // All fields in one walk over the dictionary's members.
    const auto& keys = detail::FieldKeys<Derived>::get();
    std::array<platform::JsonView, detail::FieldKeys<Derived>::kMax> found;
    dictionary.members({keys.names.data(), keys.count}, {found.data(), keys.count});
    detail::FieldReader reader{found.data()};
    Derived::fields(into, reader);
  }

  [[nodiscard]] static std::shared_ptr<Derived> fromDictionary(platform::JsonView dictionary) {
    auto record = std::make_shared<Derived>();
    readFields(*record, dictionary);
    return record;
  }
  [[nodiscard]] static std::shared_ptr<Derived> fromDictionary(const Value& dictionary) {
    return fromDictionary(platform::JsonView(&dictionary));
  }
};

class AXEmail : public AXRecord<AXEmail> {
 public:
  static constexpr std::string_view kClassName = "AXEmail";
  std::optional<std::string> emailAddress;

  template <class Self, class V>
  static void fields(Self& s, V& v) {
    v("emailAddress", s.emailAddress);
  }
};

class AXPhone : public AXRecord<AXPhone> {
 public:
  static constexpr std::string_view kClassName = "AXPhone";
  std::optional<std::string> number;

  template <class Self, class V>
  static void fields(Self& s, V& v) {
    v("number", s.number);
  }
};

class AXPerson : public AXRecord<AXPerson> {
 public:
  static constexpr std::string_view kClassName = "AXPerson";
  std::optional<std::string> firstName;
  std::optional<std::string> lastName;
  std::optional<std::string> fullName;
  std::optional<std::string> identifier;  // a URL
  AXArray<AXEmail> emails;
  AXArray<AXPhone> phones;

  template <class Self, class V>
  static void fields(Self& s, V& v) {
    v("firstName", s.firstName);
    v("lastName", s.lastName);
    v("fullName", s.fullName);
    v("identifier", s.identifier);
    v("emails", s.emails);
    v("phones", s.phones);
  }
};

class AXPersonAttribute : public AXRecord<AXPersonAttribute> {
 public:
  static constexpr std::string_view kClassName = "AXPersonAttribute";
  std::shared_ptr<AXPerson> object;
  std::optional<std::string> data;  // the handle

  template <class Self, class V>
  static void fields(Self& s, V& v) {
    v("object", s.object);
    v("data", s.data);
  }
};

class AXLocation : public AXRecord<AXLocation> {
 public:
  static constexpr std::string_view kClassName = "AXLocation";
  std::optional<std::string> label;
  std::optional<std::string> street;
  std::optional<std::string> thoroughfare;
  std::optional<std::string> city;
  std::optional<std::string> stateCode;
  std::optional<std::string> postalCode;
  std::optional<std::string> countryCode;
  std::optional<double> latitude;
  std::optional<double> longitude;
  std::optional<double> accuracy;

  template <class Self, class V>
  static void fields(Self& s, V& v) {
    v("label", s.label);
    v("street", s.street);
    v("thoroughfare", s.thoroughfare);
    v("city", s.city);
    v("stateCode", s.stateCode);
    v("postalCode", s.postalCode);
    v("countryCode", s.countryCode);
    v("latitude", s.latitude);
    v("longitude", s.longitude);
    v("accuracy", s.accuracy);
  }
};

class AXKynLocation : public AXRecord<AXKynLocation> {
 public:
  static constexpr std::string_view kClassName = "AXKynLocation";
  std::shared_ptr<AXPersonAttribute> friend_;  // "friend"
  std::optional<double> distance;              // metres
  std::optional<std::string> city;
  std::optional<std::string> stateCode;
  std::optional<std::string> street;
  std::optional<double> latitude;
  std::optional<double> longitude;
  std::optional<double> accuracy;
  std::optional<double> locationDate;  // seconds since 1 January 2001 UTC
  std::optional<std::string> label;

  template <class Self, class V>
  static void fields(Self& s, V& v) {
    v("friend", s.friend_);
    v("distance", s.distance);
    v("city", s.city);
    v("stateCode", s.stateCode);
    v("street", s.street);
    v("latitude", s.latitude);
    v("longitude", s.longitude);
    v("accuracy", s.accuracy);
    v("locationDate", s.locationDate);
    v("label", s.label);
  }
};

class AXKynGeoFence : public AXRecord<AXKynGeoFence> {
 public:
  static constexpr std::string_view kClassName = "AXKynGeoFence";
  std::optional<std::string> trigger;
  std::shared_ptr<AXLocation> location;
  std::shared_ptr<AXPersonAttribute> friend_;  // "friend"

  template <class Self, class V>
  static void fields(Self& s, V& v) {
    v("trigger", s.trigger);
    v("location", s.location);
    v("friend", s.friend_);
  }
};

// ---- Commands -------------------------------------------------------------------------------

class AXKynSearch : public AXRecord<AXKynSearch> {
 public:
  static constexpr std::string_view kClassName = "AXKynSearch";
  AXArray<AXPerson> friends;
  std::shared_ptr<AXLocation> currentLocation;
  std::shared_ptr<AXLocation> requestedLocation;
  std::optional<std::string> proximity;

  template <class Self, class V>
  static void fields(Self& s, V& v) {
    v("friends", s.friends);
    v("currentLocation", s.currentLocation);
    v("requestedLocation", s.requestedLocation);
    v("proximity", s.proximity);
  }
};

class AXKynVisibilityStateSet : public AXRecord<AXKynVisibilityStateSet> {
 public:
  static constexpr std::string_view kClassName = "AXKynVisibilityStateSet";
  std::optional<bool> visible;

  template <class Self, class V>
  static void fields(Self& s, V& v) {
    v("visible", s.visible);
  }
};

class AXKynGeoFenceSet : public AXRecord<AXKynGeoFenceSet> {
 public:
  static constexpr std::string_view kClassName = "AXKynGeoFenceSet";
  std::shared_ptr<AXPerson> friend_;  // "friend"
  std::shared_ptr<AXLocation> requestedLocation;
  std::optional<std::string> geoFenceTrigger;
  std::optional<bool> oneTimeOnly;
  std::optional<std::string> fenceType;
  std::optional<bool> enable;

  template <class Self, class V>
  static void fields(Self& s, V& v) {
    v("friend", s.friend_);
    v("requestedLocation", s.requestedLocation);
    v("geoFenceTrigger", s.geoFenceTrigger);
    v("oneTimeOnly", s.oneTimeOnly);
    v("fenceType", s.fenceType);
    v("enable", s.enable);
  }
};

// ---- Replies --------------------------------------------------------------------------------

class AXCommandFailed : public AXRecord<AXCommandFailed> {
 public:
  static constexpr std::string_view kClassName = "AXCommandFailed";
  std::optional<std::int64_t> errorCode;
  std::optional<std::string> reason;

  [[nodiscard]] static std::shared_ptr<AXCommandFailed> commandFailedWithErrorCode(std::int64_t code);
  [[nodiscard]] static std::shared_ptr<AXCommandFailed> commandFailedWithReason(std::string reason);

  template <class Self, class V>
  static void fields(Self& s, V& v) {
    v("errorCode", s.errorCode);
    v("reason", s.reason);
  }
};

class AXKynSearchCompleted : public AXRecord<AXKynSearchCompleted> {
 public:
  static constexpr std::string_view kClassName = "AXKynSearchCompleted";
  AXArray<AXKynLocation> kynLocations;
  std::optional<bool> atRequestedLocation;
  std::optional<std::string> searchContext;  // a URL

  [[nodiscard]] static std::shared_ptr<AXKynSearchCompleted> searchCompleted() {
    return std::make_shared<AXKynSearchCompleted>();
  }

  template <class Self, class V>
  static void fields(Self& s, V& v) {
    v("kynLocations", s.kynLocations);
    v("atRequestedLocation", s.atRequestedLocation);
    v("searchContext", s.searchContext);
  }
};

class AXKynVisibilitySetCompleted : public AXRecord<AXKynVisibilitySetCompleted> {
 public:
  static constexpr std::string_view kClassName = "AXKynVisibilitySetCompleted";
  std::optional<std::string> searchContext;

  [[nodiscard]] static std::shared_ptr<AXKynVisibilitySetCompleted> visibilitySetCompleted() {
    return std::make_shared<AXKynVisibilitySetCompleted>();
  }

  template <class Self, class V>
  static void fields(Self& s, V& v) {
    v("searchContext", s.searchContext);
  }
};

class AXKynGeoFenceSetCompleted : public AXRecord<AXKynGeoFenceSetCompleted> {
 public:
  static constexpr std::string_view kClassName = "AXKynGeoFenceSetCompleted";
  std::shared_ptr<AXKynGeoFence> geoFence;
  std::optional<std::string> searchContext;

  [[nodiscard]] static std::shared_ptr<AXKynGeoFenceSetCompleted> geoFenceSetCompleted() {
    return std::make_shared<AXKynGeoFenceSetCompleted>();
  }

  template <class Self, class V>
  static void fields(Self& s, V& v) {
    v("geoFence", s.geoFence);
    v("searchContext", s.searchContext);
  }
};

/// A reply as the assistant receives it: a record, or a dictionary made some other way. A record's
/// text is written straight from its fields, and its dictionary is made only when asked for (once;
/// a reply belongs to one completion, on one thread).
class AXReply {
 public:
  template <class T, class = std::enable_if_t<std::is_base_of_v<AXObject, T>>>
  AXReply(std::shared_ptr<T> record) : record_(std::move(record)) {}  // NOLINT: a record is a reply
  AXReply(Value dictionary) : dictionary_(std::move(dictionary)) {}   // NOLINT: so is a dictionary

  [[nodiscard]] const Value& dictionary() const {
    if (!dictionary_) dictionary_ = record_ ? record_->dictionary() : Value();
    return *dictionary_;
  }
  operator const Value&() const { return dictionary(); }  // NOLINT: a reply reads as its dictionary

  /// The reply as JSON text, the same as `toJson(dictionary())`.
  [[nodiscard]] std::string json() const;

 private:
  std::shared_ptr<const AXObject> record_;
  mutable std::optional<Value> dictionary_;
};

/// The assistant's completion: called once with the reply.
using AXCompletion = std::function<void(const AXReply& reply)>;

}  // namespace kyn
