#pragma once

#include "platform/core/Object.h"

namespace kyn {

/// Root of the plug-in's model records.
class KYNAXBaseModel : public platform::Object {
 public:
  KYNAXBaseModel() = default;
  ~KYNAXBaseModel() override = default;
  [[nodiscard]] std::string description() const override { return "<KYNAXBaseModel>"; }
};

}  // namespace kyn
