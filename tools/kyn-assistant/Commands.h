#pragma once

#include "Host.h"

#include <memory>
#include <string>
#include <vector>

namespace kyn::cli {

/// `search`: where are my friends (and are they at a place)?
class SearchCommand final : public HostCommand {
 public:
  explicit SearchCommand(CLI::App& app);
  [[nodiscard]] bool chosen() const override { return sub_->parsed(); }
  [[nodiscard]] Json build(Session& session) override;

 private:
  CLI::App* sub_;
  std::vector<std::string> friends_;
  std::string here_, place_, placeAt_, proximity_;
};

/// `command FILE`: an assistant command given as JSON, performed as it stands.
class RawCommand final : public HostCommand {
 public:
  explicit RawCommand(CLI::App& app);
  [[nodiscard]] bool chosen() const override { return sub_->parsed(); }
  [[nodiscard]] Json build(Session& session) override;

 private:
  CLI::App* sub_;
  std::string file_;
};

}  // namespace kyn::cli
