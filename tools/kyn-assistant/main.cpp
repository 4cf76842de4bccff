// kyn-assistant: a command-line assistant for the Kyn plug-in. It turns its options into an
// assistant command, loads the plug-in with dlopen as an assistant does, performs the command,
// waits for the one reply and prints it for a person to read (or as JSON).
#include "Commands.h"

#include <cstdio>
#include <filesystem>
#include <iostream>
#include <memory>

namespace {

using namespace kyn::cli;

void printLog(int level, const char* message, void* /*context*/) {
  static const char* const names[] = {"debug", "info", "default", "error"};
  std::fprintf(stderr, "[plug-in %s] %s\n", (level >= 0 && level <= 3) ? names[level] : "log", message);
}

void defineOptions(CLI::App& app, Options& options) {
  app.set_help_all_flag("--help-all", "Show the help of every command");
  app.add_option("--plugin", options.pluginPath,
                 "The plug-in to load (default: ../lib/libkyn-assistant.so beside this program)")
      ->envname("KYN_PLUGIN");
  app.add_option("--config", options.configDir,
                 "The plug-in's configuration directory, holding account.json, token, config.json and contacts/ "
                 "(default: $XDG_CONFIG_HOME/kyn-assistant)");
  app.add_option("--language", options.language, "The assistant's language, a BCP 47 tag such as en-US, de or fr");
  app.add_flag("--json", options.json, "Print the reply dictionary as JSON instead of text");
  app.add_flag("-v,--verbose", options.verbose, "Show the plug-in's log on standard error");
  app.add_option("--pictures", options.picturesDir,
                 "A directory to write each found friend's contact picture into, named after the friend's handle")
      ->check(CLI::ExistingDirectory);
  app.add_option("--timeout", options.timeout, "Seconds to wait for the reply")
      ->default_val(60.0)
      ->check(CLI::PositiveNumber);
  app.require_subcommand(1);
  app.footer(
      "Exit status: 0 the command succeeded, 1 it failed (the reply says why), 2 the options are wrong,\n"
      "3 the plug-in could not be loaded or did not answer in time.\n"
      "Example: kyn-assistant search --friend ada@example.com --friend \"Bruno\" --here 45.52,-122.68,65");
}

/// Loads and configures the plug-in, performs the chosen command and prints its reply.
int run(const Options& options, HostCommand& chosen) {
  if (chosen.makesConfigDirectory() && !options.configDir.empty()) {
    std::error_code ec;
    std::filesystem::create_directories(options.configDir, ec);
    std::filesystem::permissions(options.configDir, std::filesystem::perms::owner_all, ec);
  }
  std::unique_ptr<kyn::host::PluginLibrary> plugin;
  try {
    plugin = std::make_unique<kyn::host::PluginLibrary>(options.pluginPath);
  } catch (const kyn::host::LoadError& e) {
    std::cerr << "kyn-assistant: " << Texts(options.language).format(Text::CannotLoad, options.pluginPath, e.what())
              << "\n";
    return kNoAnswer;
  }
  plugin->setLogLevel(options.verbose ? "debug" : "off");
  if (options.verbose) plugin->setLogCallback(&printLog, nullptr);
  if (plugin->configure(options.configDir.empty() ? nullptr : options.configDir.c_str(),
                        options.language.empty() ? nullptr : options.language.c_str()) != 0) {
    std::cerr << "kyn-assistant: " << Texts(options.language).format(Text::NoConfigDirectory, options.configDir)
              << "\n";
    return kUsage;
  }
  // The host speaks the language the plug-in settled on (the option, config.json's or the system's).
  const Texts texts(plugin->take(plugin->language()).value_or(options.language));
  Session session{*plugin, texts, options};
  try {
    return chosen.run(session);
  } catch (const UsageError& e) {
    std::cerr << "kyn-assistant: " << e.what() << "\n";
    return kUsage;
  }
}

}  // namespace

int main(int argc, char** argv) {
  CLI::App app{
      "kyn-assistant: asks the Kyn plug-in, as a voice assistant would, where your friends are; shows or hides "
      "your location; tells you (or them) when a friend arrives at or leaves a place; signs you in."};
  Options options;
  options.pluginPath = kyn::host::defaultPluginPath().string();
  defineOptions(app, options);
  std::vector<std::unique_ptr<HostCommand>> commands;
  commands.push_back(std::make_unique<SearchCommand>(app));
  commands.push_back(std::make_unique<RawCommand>(app));
  commands.push_back(std::make_unique<AccountCommand>(app));
  commands.push_back(std::make_unique<VisibilityCommand>(app));
  commands.push_back(std::make_unique<NotifyCommand>(app));
  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& e) {
    return app.exit(e) == 0 ? kSuccess : kUsage;
  }
  for (auto& command : commands) {
    if (command->chosen()) return run(options, *command);
  }
  return kUsage;
}
