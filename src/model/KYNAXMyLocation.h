#pragma once

#include "model/KYNAXLocation.h"

#include <memory>
#include <optional>
#include <string>

namespace kyn {

/// The user's own location as the user's friends see it, and whether it is shown to them. The
/// friend of the record is the user, named by the preferred e-mail address or the account's name.
class KYNAXMyLocation : public KYNAXLocation {
 public:
  /// A record whose friend is the user; `avixLocation`, when given, replaces the decoded one as it
  /// is (the user's contact is looked up all the same).
  KYNAXMyLocation(bool visible, std::shared_ptr<AXKynLocation> avixLocation, const std::optional<std::string>& preferredEmail);
  /// A record decoded from `entry` (a friend location entry, or nothing) for the user.
  KYNAXMyLocation(bool visible, platform::JsonView entry, const std::optional<std::string>& preferredEmail);

  [[nodiscard]] static std::shared_ptr<KYNAXMyLocation> myLocation(bool visible, std::shared_ptr<AXKynLocation> avixLocation,
                                                                   const std::optional<std::string>& preferredEmail);
  [[nodiscard]] static std::shared_ptr<KYNAXMyLocation> myLocation(bool visible, platform::JsonView entry,
                                                                   const std::optional<std::string>& preferredEmail);

  /// The base record's place text while visible; the localised "HIDDEN_LOCATION" otherwise, whatever
  /// the entry carried.
  [[nodiscard]] std::optional<std::string> friendLocation(bool located) const override;
  /// Never a time for the user's own location.
  [[nodiscard]] std::optional<std::string> prettyTimestamp() const override { return std::nullopt; }

  [[nodiscard]] std::string description() const override;

  bool isVisible = false;
  /// The account name, for a caller to set; nothing here sets it.
  std::optional<std::string> username;

 private:
  /// The preferred e-mail address, else the account's user name.
  [[nodiscard]] static std::optional<std::string> handleFor(const std::optional<std::string>& preferredEmail);
};

}  // namespace kyn
