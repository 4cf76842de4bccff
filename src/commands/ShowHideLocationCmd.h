#pragma once

#include "commands/KYNBaseCmd.h"
#include "model/KYNAXMyLocation.h"
#include "platform/location/Location.h"

#include <memory>
#include <optional>
#include <string>
#include <string_view>

namespace kyn {

/// What a show/hide request gives back, in this order: the server's whole response, then the
/// user's own location record as friends now see it.
struct ShowHideLocationResult final : platform::Object {
  std::shared_ptr<const platform::JsonDocument> responseDocument;
  /// The response, read in place in `responseDocument`.
  [[nodiscard]] platform::JsonView response() const noexcept {
    return responseDocument ? responseDocument->root() : platform::JsonView();
  }
  std::shared_ptr<KYNAXMyLocation> myLocation;

  /// "(response, record)"
  [[nodiscard]] std::string description() const override;
};

/// The request behind "show or hide my location": one flag goes out; the user's own record and the
/// server's context come back.
class ShowHideLocationCmd : public KYNBaseCmd {
 public:
  [[nodiscard]] std::string path() const override;
  /// "clientContext" (the shared client context, plus "location" when there is a current location)
  /// and "prefs" with the one key "hideLocation" = "Yes" or "No".
  [[nodiscard]] Value jsonBodyDictionary() const override;

  /// The response and the user's record, built as visible exactly when the location was not to be
  /// hidden; sets `contextIdentifierURL` from the server's context with the preferred e-mail
  /// address folded in. Nothing without a parsed response.
  [[nodiscard]] std::shared_ptr<ShowHideLocationResult> result();

  [[nodiscard]] std::optional<Value> currentLocationDictionary() const;

  [[nodiscard]] std::string_view commandName() const override { return "ShowHideLocationCmd"; }

  bool hideLocation = false;
  /// Immutable and shared; nothing here sets it.
  std::shared_ptr<const platform::Location> currentLocation;
};

}  // namespace kyn
