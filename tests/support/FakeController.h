#pragma once

#include "platform/net/ServerInteractionController.h"

#include <mutex>
#include <optional>
#include <string>
#include <vector>

namespace kyn::test {

/// What a fake exchange ends with.
struct FakeResponse {
  bool successful = true;
  std::optional<std::int64_t> http = 200;
  std::string body = "{}";
};

/// Completes the command as if the exchange had ended with `response`.
void completeCommand(const std::shared_ptr<platform::KYJSONCommand>& command, const FakeResponse& response);

/// Keeps every command sent; answers at once with `autoResponse` when set, otherwise when the test
/// calls `completeCommand`.
class FakeController final : public platform::KYServerInteractionController {
 public:
  void sendCommand(std::shared_ptr<platform::KYJSONCommand> command, std::function<void()> completion) override;
  [[nodiscard]] std::vector<std::shared_ptr<platform::KYJSONCommand>> sent() const;

  std::optional<FakeResponse> autoResponse;

 private:
  mutable std::mutex mutex_;
  std::vector<std::shared_ptr<platform::KYJSONCommand>> sent_;
};

}  // namespace kyn::test
