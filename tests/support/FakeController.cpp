#include "support/FakeController.h"

namespace kyn::test {

void completeCommand(const std::shared_ptr<platform::KYJSONCommand>& command, const FakeResponse& response) {
  command->setTransferResult(response.successful,
                             response.http ? std::optional(platform::HTTPResponse{*response.http}) : std::nullopt);
  command->setResponseBody(response.body);
  command->runCompletionBlock();
}

void FakeController::sendCommand(std::shared_ptr<platform::KYJSONCommand> command, std::function<void()> completion) {
  command->setCompletionBlock(std::move(completion));
  {
    std::lock_guard lock(mutex_);
    sent_.push_back(command);
  }
  if (autoResponse) completeCommand(command, *autoResponse);
}

std::vector<std::shared_ptr<platform::KYJSONCommand>> FakeController::sent() const {
  std::lock_guard lock(mutex_);
  return sent_;
}

}  // namespace kyn::test
