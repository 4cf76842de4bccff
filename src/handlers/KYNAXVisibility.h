#pragma once

#include "platform/assistant/Model.h"

#include <memory>

namespace kyn {

/// The handler of the assistant's "show or hide my location": checks that the service may be used
/// and the account can be, then hands the command to the data source.
class KYNAXVisibility : public AXKynVisibilityStateSet {
 public:
  [[nodiscard]] std::string_view className() const override { return "KYNAXVisibility"; }

  /// Nothing when the command may go ahead, otherwise the failure that answers it.
  [[nodiscard]] std::shared_ptr<AXCommandFailed> _validate();
  /// Answers exactly once: at once with a validation failure, otherwise when the server has answered.
  void performWithCompletion(AXCompletion completion);
};

}  // namespace kyn
