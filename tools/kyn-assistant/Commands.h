#pragma once

#include "Host.h"

#include <memory>
#include <string>
#include <vector>

namespace kyn::cli {

/// `search`: where are my friends (and are they at a place)?
class SearchCommand final : public AssistantCommand {
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
class RawCommand final : public AssistantCommand {
 public:
  explicit RawCommand(CLI::App& app);
  [[nodiscard]] bool chosen() const override { return sub_->parsed(); }
  [[nodiscard]] Json build(Session& session) override;

 private:
  CLI::App* sub_;
  std::string file_;
};

/// `account login|show|logout`: signs an account in (the token read from standard input), shows it
/// without its token, or signs out.
class AccountCommand final : public HostCommand {
 public:
  explicit AccountCommand(CLI::App& app);
  [[nodiscard]] bool chosen() const override { return sub_->parsed(); }
  [[nodiscard]] bool makesConfigDirectory() const override { return login_->parsed(); }
  int run(Session& session) override;

 private:
  CLI::App* sub_;
  CLI::App* login_;
  CLI::App* show_;
  std::string personId_, username_, host_;
};

/// `visibility show|hide`: shows my location to my friends again, or hides it from them.
class VisibilityCommand final : public AssistantCommand {
 public:
  explicit VisibilityCommand(CLI::App& app);
  [[nodiscard]] bool chosen() const override { return sub_->parsed(); }
  [[nodiscard]] Json build(Session& session) override;

 private:
  CLI::App* sub_;
  std::string state_;
};

}  // namespace kyn::cli
