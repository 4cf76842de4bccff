#pragma once

#include "platform/assistant/Model.h"

#include <memory>

namespace kyn {

/// The handler of the assistant's "where is my friend": checks that the request names someone or
/// somewhere and that the account can be used, then hands it to the data source.
class KYNAXSearch : public AXKynSearch {
 public:
  [[nodiscard]] std::string_view className() const override { return "KYNAXSearch"; }

  /// Nothing when the search may go ahead, otherwise the failure that answers it.
  [[nodiscard]] std::shared_ptr<AXCommandFailed> _validate();
  /// Answers exactly once: at once with a validation failure, otherwise when the server has answered.
  void performWithCompletion(AXCompletion completion);
};

}  // namespace kyn
