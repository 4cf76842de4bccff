#include "Commands.h"

#include <fstream>
#include <iostream>
#include <sstream>

namespace kyn::cli {

SearchCommand::SearchCommand(CLI::App& app)
    : sub_(app.add_subcommand("search", "Where are my friends? Asks for their locations.")) {
  sub_->add_option("-f,--friend", friends_,
                   "A friend to locate: an e-mail address, a phone number, or a name from your contacts. "
                   "Repeat it for several friends.");
  sub_->add_option("--here", here_, "Your own location: LAT,LON or LAT,LON,ACCURACY (metres)");
  sub_->add_option("--place", place_, "The name of a place you ask about (\"Is Ada at Home?\")");
  sub_->add_option("--place-at", placeAt_, "Where that place is: LAT,LON");
  sub_->add_option("--proximity", proximity_, "How near counts as there: at, near, ...");
}

Json SearchCommand::build(Session& session) {
  Json command = {{"class", "AXKynSearch"}, {"friends", Json::array()}};
  for (const auto& who : friends_) command["friends"].push_back(resolveFriend(session, who));
  if (!here_.empty()) {
    auto location = parseCoordinate(here_, true);
    if (!location) throw UsageError(session.texts.format(Text::BadHere, here_));
    command["currentLocation"] = *location;
  }
  if (!place_.empty() || !placeAt_.empty()) command["requestedLocation"] = namedPlace(session, place_, placeAt_);
  if (!proximity_.empty()) command["proximity"] = proximity_;
  return command;
}

RawCommand::RawCommand(CLI::App& app)
    : sub_(app.add_subcommand("command", "Performs an assistant command given as JSON and prints the reply.")) {
  sub_->add_option("file", file_, "A file holding the command JSON, or - for standard input")->required();
}

Json RawCommand::build(Session& session) {
  std::stringstream text;
  if (file_ == "-") {
    text << std::cin.rdbuf();
  } else {
    std::ifstream in(file_, std::ios::binary);
    if (!in) throw UsageError(session.texts.format(Text::CannotRead, file_));
    text << in.rdbuf();
  }
  Json command = Json::parse(text.str(), nullptr, false);
  // A text that is no JSON goes to the plug-in as it is, to be refused in the plug-in's own words.
  return command.is_discarded() ? Json(text.str()) : command;
}

}  // namespace kyn::cli
