#pragma once

// The host's own texts, in the assistant's language (English, German, French).

#include <string>
#include <string_view>

namespace kyn::cli {

enum class Text {
  NotLoggedIn,
  RestrictedInRegion,
  RestrictedInAccount,
  Locked,
  NotAvailable,
  NotAFriend,
  NoFriends,
  GeoFenceNotCreated,
  LabelNotFound,
  AddressNotFound,
  FailedWithCode,  // %s: the code
  NeedTarget,      // the plug-in's reason when a command names no one and nowhere
  NoLocations,
  AtPlaceYes,  // %s: the place
  AtPlaceNo,   // %s: the place
  Unknown,
  NoName,
  NoOneNamed,        // %s: the name
  SeveralPeople,     // %s: the name
  SayWhichOne,
  SeeVerbose,
  CannotLoad,        // %s: the path, %s: why
  NoAnswer,          // %s: seconds
  NoConfigDirectory, // %s: the directory
  BadHere,           // %s: the text given
  BadPlaceAt,        // %s: the text given
  CannotRead,        // %s: the file
  CannotWrite,       // %s: the file
  PictureSaved,      // %s: the friend's name, %s: the file
  TokenPrompt,
  SignedIn,          // %s: person id, %s: host
  BadPersonId,       // %s: what was given
  BadUsername,       // %s: what was given
  BadHost,           // %s: what was given
  BadToken,
  NotWritten,
  NoOneSignedIn,
  SignedOut,
  AccountPerson,     // %s
  AccountUsername,   // %s
  AccountHost,       // %s
  TokenReadable,
  TokenUnreadable,
  AccountProvisioned,  // %s: yes or no
  AccountRestricted,   // %s: yes or no
  Yes,
  No,
  // visibility
  LocationHidden,
  LocationShown,
  // geofence: whom, where (%s: the friend's name, %s: the place)
  FenceMeArrives,
  FenceMeLeaves,
  FenceMeNow,
  FenceThemArrives,
  FenceThemLeaves,
  FenceThemNow,
  FenceOffMeArrives,
  FenceOffMeLeaves,
  FenceOffMeNow,
  FenceOffThemArrives,
  FenceOffThemLeaves,
  FenceOffThemNow,
  FenceSet,          // a trigger the host does not know
  FenceOff,          // the same, switched off
  FenceOnce,
  BadAddress,        // %s: the text given
  Count
};

/// The host's string tables for one language: German for "de…", French for "fr…", else English.
class Texts {
 public:
  explicit Texts(std::string_view languageTag);

  [[nodiscard]] std::string_view operator[](Text text) const;
  /// The text with each "%s" replaced by the next argument, in order.
  template <class... Args>
  [[nodiscard]] std::string format(Text text, const Args&... args) const {
    return fill((*this)[text], {std::string_view(args)...});
  }
  [[nodiscard]] std::string_view language() const noexcept { return language_; }

 private:
  static std::string fill(std::string_view pattern, std::initializer_list<std::string_view> args);
  std::string_view language_;
  int column_ = 0;
};

}  // namespace kyn::cli
