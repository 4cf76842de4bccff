#pragma once

#include "platform/net/JsonCommand.h"

#include <optional>
#include <string>
#include <string_view>

namespace kyn {

/// Prefix of every command path of the service.
inline constexpr std::string_view KYNUrlBase = "/kytrservice/friends/va/";

/// Base of every request to the location-sharing server: scheme, host and credentials from the
/// account context, the two fixed headers, "clientContext" in every body, and the "statusCode" of
/// every response.
class KYNBaseCmd : public platform::KYJSONCommand {
 public:
  /// Takes the scheme, credentials and host (the redirected host when one is stored, else the
  /// account's) from the account context. A command is built even without an account.
  KYNBaseCmd();

  /// The base headers plus "X-Zanto-Vorn-API-Ver" = "4.0" and "X-Zanto-AuthScheme" = "Forever".
  [[nodiscard]] Value headers() const override;
  /// The base body plus "clientContext".
  [[nodiscard]] Value jsonBodyDictionary() const override;
  /// "minCallbackIntervalInMS" of the response's "serverContext", in seconds; 0 when absent.
  [[nodiscard]] double minCallbackInterval() override;

  /// The client context shared by every command of the process: built on first use, never rebuilt.
  [[nodiscard]] static const Value& staticClientContext();
  /// A client context built now: "deviceUDID", "productType", "osVersion", "buildVersion", "locale",
  /// each only when known.
  [[nodiscard]] static Value makeClientContext();

  /// "statusCode" of the last parsed response, as it came (a number or a numeric string); absent
  /// when missing or null.
  [[nodiscard]] platform::JsonView statusCodeValue() const noexcept {
    return responseDocument() ? responseDocument()->root().memberNotNull("statusCode") : platform::JsonView();
  }
  /// The server context of the last response as a context identifier URL.
  [[nodiscard]] const std::optional<std::string>& contextIdentifierURL() const noexcept { return contextIdentifierURL_; }
  void setContextIdentifierURL(std::optional<std::string> url) { contextIdentifierURL_ = std::move(url); }

  [[nodiscard]] std::string_view commandName() const override { return "KYNBaseCmd"; }

 protected:
  /// Sets `contextIdentifierURL` from the response's "serverContext" as a copy with the member
  /// `added` set in it would give; none when the response holds no such object, and then nothing is
  /// added. With `logged`, writes the context to the log first.
  void takeServerContext(platform::JsonView response, std::optional<platform::JsonEntry> added, bool logged);

 private:
  std::optional<std::string> contextIdentifierURL_;
};

}  // namespace kyn
