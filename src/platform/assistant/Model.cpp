#include "platform/assistant/Model.h"

#include "platform/value/Json.h"

#include <algorithm>
#include <atomic>

namespace kyn {
namespace {

/// Room made for a reply's text at once: at least this much, and as much as the last reply took,
/// up to the cap, as a user asks much the same thing again and a large text grows by copying.
constexpr std::size_t kReplyTextReserve = 4096;
constexpr std::size_t kReplyTextReserveCap = 1u << 20;
std::atomic<std::size_t> lastReplyTextSize{0};

}  // namespace

std::optional<std::string_view> errorCodeName(std::int64_t code) noexcept {
  switch (code) {
    case AXKynNotLoggedInErrorCode: return "AXKynNotLoggedInErrorCode";
    case AXKynServiceRestrictedInRegionErrorCode: return "AXKynServiceRestrictedInRegionErrorCode";
    case AXKynServiceRestrictedInAccountErrorCode: return "AXKynServiceRestrictedInAccountErrorCode";
    case AXKynLockedErrorCode: return "AXKynLockedErrorCode";
    case AXKynServiceNotAvailableErrorCode: return "AXKynServiceNotAvailableErrorCode";
    case AXKynNotAFriendErrorCode: return "AXKynNotAFriendErrorCode";
    case AXKynNoFriendsErrorCode: return "AXKynNoFriendsErrorCode";
    case AXKynGeoFenceNotCreatedErrorCode: return "AXKynGeoFenceNotCreatedErrorCode";
    case AXKynLabelNotFoundErrorCode: return "AXKynLabelNotFoundErrorCode";
    case AXKynAddressNotFoundErrorCode: return "AXKynAddressNotFoundErrorCode";
    default: return std::nullopt;
  }
}

std::string AXObject::description() const {
  std::string text;
  appendDescription(text);
  return text;
}

void AXObject::appendDescription(std::string& out) const {
  out += '<';
  out += className();
  out += ' ';
  appendJson(out);
  out += '>';
}

std::string AXReply::json() const {
  if (dictionary_ || !record_) return platform::toJson(dictionary());
  std::string text;
  const std::size_t last = lastReplyTextSize.load(std::memory_order_relaxed);
  text.reserve(std::clamp(last + last / 8, kReplyTextReserve, kReplyTextReserveCap));
  record_->appendJson(text);
  lastReplyTextSize.store(text.size(), std::memory_order_relaxed);
  return text;
}

std::shared_ptr<AXCommandFailed> AXCommandFailed::commandFailedWithErrorCode(std::int64_t code) {
  auto failed = std::make_shared<AXCommandFailed>();
  failed->errorCode = code;
  return failed;
}

std::shared_ptr<AXCommandFailed> AXCommandFailed::commandFailedWithReason(std::string reason) {
  auto failed = std::make_shared<AXCommandFailed>();
  failed->reason = std::move(reason);
  return failed;
}

}  // namespace kyn
