#pragma once

#include "platform/Services.h"
#include "platform/assistant/Model.h"

#include <exception>
#include <functional>
#include <memory>
#include <optional>
#include <utility>

namespace kyn {

/// The "service not available" failure, built once; the reply of last resort.
[[nodiscard]] inline const Value& serviceNotAvailableReply() {
  static const Value reply = AXCommandFailed::commandFailedWithErrorCode(AXKynServiceNotAvailableErrorCode)->dictionary();
  return reply;
}

/// The completion callback of a server command sent for an assistant command. When the exchange has
/// ended it maps the command to the assistant's reply with `mapping`, hands the reply's dictionary to
/// `completion` exactly once, and as its last act clears the command's completion block, which
/// breaks the cycle between the command and this callback. A mapping that throws (out of memory, say)
/// still ends in one reply, "service not available", made before the command is sent so that the
/// fallback cannot fail in turn.
template <class Command, class Mapping>
[[nodiscard]] std::function<void()> replyCallback(std::shared_ptr<Command> command, AXCompletion completion,
                                                  Mapping mapping) {
  (void)serviceNotAvailableReply();
  return [command = std::move(command), completion = std::move(completion), mapping = std::move(mapping)] {
    struct ClearOnExit {
      Command& command;
      ~ClearOnExit() { command.setCompletionBlock(nullptr); }
    } clear{*command};
    std::shared_ptr<AXObject> reply;
    try {
      reply = mapping(*command);
    } catch (const std::exception& e) {
      platform::services().log().error("The reply to %@ could not be made: %@", command->description(), e.what());
    } catch (...) {
      platform::services().log().error("The reply to %@ could not be made", command->description());
    }
    if (!completion) return;
    if (reply) completion(AXReply(std::move(reply)));
    else completion(AXReply(serviceNotAvailableReply()));
  };
}

}  // namespace kyn
