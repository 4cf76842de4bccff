#include "platform/net/JsonCommand.h"

#include "platform/log/Log.h"

namespace kyn::platform {

std::string_view describeTransferError(KYTransferError error) noexcept {
  switch (error) {
    case KYTransferError::None: return "succeeded";
    case KYTransferError::NotSent: return "not sent";
    case KYTransferError::NoHost: return "no server host";
    case KYTransferError::HostNotFound: return "host not found";
    case KYTransferError::Refused: return "connection refused";
    case KYTransferError::TimedOut: return "timed out";
    case KYTransferError::TLS: return "TLS failure";
    case KYTransferError::ResponseTooLarge: return "response too large";
    case KYTransferError::RedirectRefused: return "redirect refused";
    case KYTransferError::HTTPStatus: return "HTTP error status";
    case KYTransferError::ConnectionFailed: return "connection failed";
    case KYTransferError::Cancelled: return "cancelled at shutdown";
  }
  return "unknown failure";
}

KYJSONCommand::~KYJSONCommand() = default;

std::string KYJSONCommand::path() const { return "/"; }

Value KYJSONCommand::headers() const { return Value::object(); }

Value KYJSONCommand::jsonBodyDictionary() const { return Value::object(); }

std::string KYJSONCommand::jsonBody() const { return toJson(jsonBodyDictionary()); }

std::optional<std::string> KYJSONCommand::url() const {
  if (!host_ || host_->empty()) return std::nullopt;
  return scheme_ + "://" + *host_ + path();
}

JsonView KYJSONCommand::jsonResponse() { return parsedResponse_ ? parsedResponse_->root() : JsonView(); }

double KYJSONCommand::minCallbackInterval() { return 0.0; }

void KYJSONCommand::setResponseBody(std::string_view body, const JsonLimits& limits) {
  keepResponse(parseJsonDocument(body, limits));
}

void KYJSONCommand::setResponseBody(std::string& body, const JsonLimits& limits) {
  keepResponse(parseJsonDocumentInPlace(body, limits));
}

void KYJSONCommand::keepResponse(std::optional<JsonDocument> parsed) {
  if (parsed && parsed->root().isObject()) parsedResponse_ = std::make_shared<const JsonDocument>(std::move(*parsed));
  else parsedResponse_.reset();
}

void KYJSONCommand::runCompletionBlock() noexcept {
  try {
    const std::function<void()> block = completionBlock_;
    if (block) block();
  } catch (const std::exception& e) {
    Log::shared().error("Completion of %@ failed: %@", description(), e.what());
  } catch (...) {
    Log::shared().error("Completion of %@ failed", description());
  }
}

std::string KYJSONCommand::description() const {
  std::string out = "<" + std::string(commandName()) + " POST " + url().value_or("(no host)" + path());
  if (response_) out += " HTTP " + std::to_string(response_->statusCode);
  if (error_ != KYTransferError::None && error_ != KYTransferError::NotSent) {
    out += " ";
    out += describeTransferError(error_);
  }
  if (redirected_) out += " redirected to " + redirectedHost_.value_or("(null)");
  out += ">";
  return out;
}

}  // namespace kyn::platform
