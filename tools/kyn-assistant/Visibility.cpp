// `visibility`: show or hide my location from my friends.
#include "Commands.h"

namespace kyn::cli {

VisibilityCommand::VisibilityCommand(CLI::App& app)
    : sub_(app.add_subcommand("visibility", "Shows your location to your friends, or hides it from them.")) {
  sub_->add_option("state", state_, "show: your friends see your location; hide: they do not")
      ->required()
      ->check(CLI::IsMember({"show", "hide"}));
}

Json VisibilityCommand::build(Session& /*session*/) {
  return {{"class", "AXKynVisibilityStateSet"}, {"visible", state_ == "show"}};
}

}  // namespace kyn::cli
