#pragma once

#include <functional>
#include <optional>
#include <string>

namespace kyn::platform {

/// A postal address, filled field by field; every field may be absent.
struct PostalAddress {
  std::optional<std::string> street;      ///< street and house number; may hold several lines
  std::optional<std::string> city;
  std::optional<std::string> state;       ///< state, province or county, as a code or a name
  std::optional<std::string> postalCode;
  std::optional<std::string> country;     ///< ISO 3166-1 alpha-2 code ("US", "de")
};

/// How an address is laid out.
enum class PostalAddressStyle {
  /// As on an envelope, by the conventions of the address's country.
  MailingAddress,
};

/// Turns postal addresses into text. Thread-safe.
class PostalAddressFormatter {
 public:
  virtual ~PostalAddressFormatter() = default;
  /// The address in `style`: its lines joined with "\n", no empty line, valid UTF-8 whatever the
  /// input; "" for an address without any field.
  [[nodiscard]] virtual std::string stringFromPostalAddress(
      const PostalAddress& address, PostalAddressStyle style = PostalAddressStyle::MailingAddress) const = 0;
};

/// The mailing-address layouts that postal administrations publish, one per country, and a default
/// layout for countries without one. The rules:
/// - the country's layout orders the fields and puts in its own text ("CH-8001 Zürich"); a country
///   that writes addresses in its own script has a second layout for Latin-script addresses, used
///   when every letter of the address is Latin;
/// - an absent, empty or blank field leaves no line and no separator: a field goes out together with
///   the text between it and the field before it on its line;
/// - fields that the country's post wants in capitals are upper-cased (the city and state in the US);
/// - an address without a country is laid out by the conventions of the system's region;
/// - the country's name, in the assistant's language, is the last line when the country differs from
///   the system's region (a country text that is no ISO code is shown as it is);
/// - whitespace runs become one space, line breaks in the street start new lines, ill-formed UTF-8
///   reads as U+FFFD, and each field is cut at 64 KiB.
class TablePostalAddressFormatter final : public PostalAddressFormatter {
 public:
  /// Asked on every call: the system's region (a country code) and the assistant's language (a BCP 47
  /// tag); either may be absent.
  using TextSource = std::function<std::optional<std::string>()>;

  TablePostalAddressFormatter(TextSource systemRegion, TextSource language);
  std::string stringFromPostalAddress(const PostalAddress& address, PostalAddressStyle style) const override;

 private:
  TextSource systemRegion_;
  TextSource language_;
};

}  // namespace kyn::platform
