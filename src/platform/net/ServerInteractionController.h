#pragma once

#include "platform/config/Configuration.h"
#include "platform/net/JsonCommand.h"

#include <functional>
#include <memory>

namespace kyn::platform {

/// Sends JSON commands to their server.
class KYServerInteractionController {
 public:
  virtual ~KYServerInteractionController() = default;

  /// Sends `command` and returns at once. The command keeps `completion` as its completion block;
  /// when the exchange has ended, whatever happened on the wire (a command without a host ends at
  /// once), the command is filled in (result, HTTP response or why there is none, redirect facts), a
  /// redirect is announced on the default notification centre, and the completion block is called
  /// exactly once, on the controller's network thread, never within `sendCommand`. Destroying
  /// the controller ends what is in flight as cancelled, likewise on the network thread.
  virtual void sendCommand(std::shared_ptr<KYJSONCommand> command, std::function<void()> completion) = 0;
};

/// The HTTPS controller (libcurl) with the given transport settings.
[[nodiscard]] std::shared_ptr<KYServerInteractionController> makeServerInteractionController(
    const TransportSettings& settings);

}  // namespace kyn::platform
