#pragma once

#include "platform/assistant/Model.h"

#include <memory>

namespace kyn {

/// The handler of the assistant's "tell me when my friend arrives or leaves": checks that the
/// request names a friend or a place and that the account can be used, then hands it to the data
/// source.
class KYNAXSetGeoFence : public AXKynGeoFenceSet {
 public:
  [[nodiscard]] std::string_view className() const override { return "KYNAXSetGeoFence"; }

  /// Nothing when the fence may be set, otherwise the failure that answers it. Logs nothing.
  [[nodiscard]] std::shared_ptr<AXCommandFailed> _validate();
  /// Answers exactly once: at once with a validation failure, otherwise when the server has answered.
  void performWithCompletion(AXCompletion completion);
};

}  // namespace kyn
