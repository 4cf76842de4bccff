#pragma once

#include "platform/core/Object.h"
#include "platform/value/Json.h"

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>

namespace kyn::platform {

/// Name of the notification posted on the default centre, with the command as its object, whenever
/// the server redirected a command to another host.
inline constexpr std::string_view KYCommandRedirectedNotification = "KYCommandRedirectedNotification";

/// The HTTP response of an exchange.
struct HTTPResponse {
  std::int64_t statusCode = 0;
};

/// Why an exchange did not end with a 2xx answer.
enum class KYTransferError {
  None,              ///< a 2xx answer arrived
  NotSent,           ///< the request never left: not sent yet, or no transfer could be started
  NoHost,            ///< there is no server host to send to
  HostNotFound,      ///< the host name does not resolve
  Refused,           ///< the host refused the connection: nothing listens on that port
  TimedOut,          ///< the connect or the total time limit ran out
  TLS,               ///< the TLS handshake failed: an untrusted, expired or mismatched certificate
  ResponseTooLarge,  ///< the answer is larger than the transport accepts
  RedirectRefused,   ///< a redirect to a scheme other than https, a loop, or more redirects than allowed
  HTTPStatus,        ///< the server answered with a status other than 2xx
  ConnectionFailed,  ///< the connection broke: reset, an answer cut short, a protocol error
  Cancelled,         ///< the transport shut down before the exchange ended
};

/// The error in a few words ("connection refused"), for log lines and descriptions.
[[nodiscard]] std::string_view describeTransferError(KYTransferError error) noexcept;

/// A JSON request to a server and, once sent, its outcome. Subclasses supply the path, headers and
/// body and read the parsed response. A command is used by one thread at a time: built on the
/// caller's thread, filled in by the transport, read in its completion.
class KYJSONCommand : public Object {
 public:
  KYJSONCommand() = default;
  ~KYJSONCommand() override;
  KYJSONCommand(const KYJSONCommand&) = delete;
  KYJSONCommand& operator=(const KYJSONCommand&) = delete;

  // ---- Request ----
  [[nodiscard]] const std::string& scheme() const noexcept { return scheme_; }
  void setScheme(std::string scheme) { scheme_ = std::move(scheme); }
  /// host[:port]; nothing until set.
  [[nodiscard]] const std::optional<std::string>& host() const noexcept { return host_; }
  void setHost(std::optional<std::string> host) { host_ = std::move(host); }
  [[nodiscard]] const std::optional<std::string>& username() const noexcept { return username_; }
  void setUsername(std::optional<std::string> username) { username_ = std::move(username); }
  /// The password; a secret that `description` never shows.
  [[nodiscard]] const std::optional<std::string>& password() const noexcept { return password_; }
  void setPassword(std::optional<std::string> password) { password_ = std::move(password); }

  /// The request path ("/" unless overridden).
  [[nodiscard]] virtual std::string path() const;
  /// HTTP header names to values (a JSON object of strings); empty unless overridden.
  [[nodiscard]] virtual Value headers() const;
  /// The JSON object that becomes the request body; empty unless overridden.
  [[nodiscard]] virtual Value jsonBodyDictionary() const;
  /// The request body as sent: `toJson(jsonBodyDictionary())`, which a command may write directly.
  [[nodiscard]] virtual std::string jsonBody() const;
  /// scheme://host + path, or nothing without a host.
  [[nodiscard]] std::optional<std::string> url() const;

  // ---- Outcome ----
  /// The response body parsed as a JSON object, read in place; absent when there is no body, it is
  /// not JSON, or not an object. Valid until the next `setResponseBody` or the command's end.
  [[nodiscard]] virtual JsonView jsonResponse();
  /// The document `jsonResponse` reads, for results that keep the response beyond the command.
  [[nodiscard]] const std::shared_ptr<const JsonDocument>& responseDocument() const noexcept { return parsedResponse_; }
  /// The minimum interval, in seconds, the server asked for between calls; 0 unless overridden.
  [[nodiscard]] virtual double minCallbackInterval();
  /// The exchange completed with an HTTP 2xx status.
  [[nodiscard]] bool wasSuccessful() const noexcept { return error_ == KYTransferError::None; }
  /// Why the exchange failed (`None` when it succeeded), and the transport's own words on it.
  [[nodiscard]] KYTransferError transferError() const noexcept { return error_; }
  [[nodiscard]] const std::string& transferErrorDetail() const noexcept { return errorDetail_; }
  /// The HTTP response, when one arrived.
  [[nodiscard]] const std::optional<HTTPResponse>& response() const noexcept { return response_; }
  [[nodiscard]] bool wasRedirected() const noexcept { return redirected_; }
  [[nodiscard]] const std::optional<std::string>& originalHostname() const noexcept { return originalHost_; }
  [[nodiscard]] const std::optional<std::string>& redirectedHostname() const noexcept { return redirectedHost_; }

  // ---- Filled in by the transport (and by tests) ----
  void setTransferResult(KYTransferError error, std::optional<HTTPResponse> response, std::string detail = {}) {
    error_ = error;
    response_ = response;
    errorDetail_ = std::move(detail);
  }
  /// A success, or a failure taken as an HTTP error when there is a response.
  void setTransferResult(bool successful, std::optional<HTTPResponse> response) {
    setTransferResult(successful  ? KYTransferError::None
                      : response ? KYTransferError::HTTPStatus
                                 : KYTransferError::ConnectionFailed,
                      response);
  }
  /// Keeps the response body, parsed within `limits`; a body that is not a JSON object reads as none.
  void setResponseBody(std::string_view body, const JsonLimits& limits = {});
  /// The same for a body that may be given room after its end, which saves a copy of it: its text
  /// stays as it is, its capacity may grow.
  void setResponseBody(std::string& body, const JsonLimits& limits = {});
  void setRedirect(std::string originalHost, std::string redirectedHost) {
    redirected_ = true;
    originalHost_ = std::move(originalHost);
    redirectedHost_ = std::move(redirectedHost);
  }

  // ---- Completion ----
  /// The callback given to the controller; kept here until the callback itself clears it.
  [[nodiscard]] const std::function<void()>& completionBlock() const noexcept { return completionBlock_; }
  void setCompletionBlock(std::function<void()> block) { completionBlock_ = std::move(block); }
  /// Runs the completion block, if any. A copy runs, because the block may clear itself; what it
  /// throws is caught and logged, so that it cannot reach the controller's thread.
  void runCompletionBlock() noexcept;

  /// The command's class name, for descriptions.
  [[nodiscard]] virtual std::string_view commandName() const { return "KYJSONCommand"; }
  /// "<Name POST https://host/path>" plus the outcome once known; never the credentials.
  [[nodiscard]] std::string description() const override;

 private:
  /// Keeps a parsed body that is a JSON object; anything else reads as none.
  void keepResponse(std::optional<JsonDocument> parsed);

  std::string scheme_ = "https";
  std::optional<std::string> host_;
  std::optional<std::string> username_;
  std::optional<std::string> password_;

  KYTransferError error_ = KYTransferError::NotSent;
  std::string errorDetail_;
  std::optional<HTTPResponse> response_;
  std::shared_ptr<const JsonDocument> parsedResponse_;
  bool redirected_ = false;
  std::optional<std::string> originalHost_;
  std::optional<std::string> redirectedHost_;

  std::function<void()> completionBlock_;
};

}  // namespace kyn::platform
