#pragma once

#include "Host.h"

#include <memory>
#include <optional>
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

/// `notify`: tell me when a friend arrives at, leaves or is now at a place (or tell the friend when
/// I do); sets, changes or switches off that notification.
class NotifyCommand final : public AssistantCommand {
 public:
  explicit NotifyCommand(CLI::App& app);
  [[nodiscard]] bool chosen() const override { return sub_->parsed(); }
  [[nodiscard]] Json build(Session& session) override;

 private:
  CLI::App* sub_;
  std::string friend_, place_, placeAt_, address_;
  bool arrives_ = false, leaves_ = false, now_ = false, once_ = false, them_ = false, off_ = false;
};

/// A geofence set or switched off, in words: "I'll tell you when Ada Marlowe arrives at Work."
void printGeoFence(Session& session, const Json& command, const Json& reply, std::ostream& out);

/// "street, city[, state][, postal code][, country code]" as the address fields of an assistant
/// location; nothing when the text does not fit that shape.
[[nodiscard]] std::optional<Json> parseAddress(const std::string& text);

}  // namespace kyn::cli
