// An assistant command handed to the plug-in, its one reply waited for and printed.
#include "Host.h"
#include "host/Reply.h"

#include <cstdio>
#include <iostream>

namespace kyn::cli {

int AssistantCommand::run(Session& session) {
  const Json command = build(session);
  host::Reply box;
  const std::string commandText = command.is_string() ? command.get<std::string>() : command.dump();
  session.plugin.perform(commandText.c_str(), &host::Reply::receive, &box);
  const auto reply = box.wait(std::chrono::duration<double>(session.options.timeout));
  if (!reply) {
    char seconds[32];
    std::snprintf(seconds, sizeof seconds, "%g", session.options.timeout);
    std::cerr << "kyn-assistant: " << session.texts.format(Text::NoAnswer, seconds) << "\n";
    return kNoAnswer;
  }
  const Json parsed = Json::parse(*reply, nullptr, false);
  if (session.options.json) std::cout << parsed.dump(2) << "\n";
  else printReply(session, command, parsed, std::cout);
  if (!session.options.picturesDir.empty()) {
    savePictures(session, parsed, session.options.picturesDir, session.options.json ? nullptr : &std::cout, std::cerr);
  }
  if (parsed.value("class", "") != "AXCommandFailed") return kSuccess;
  if (!session.options.json && !session.options.verbose) std::cerr << session.texts[Text::SeeVerbose] << "\n";
  return kCommandFailed;
}

}  // namespace kyn::cli
