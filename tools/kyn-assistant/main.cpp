// kyn-assistant: a command-line assistant for the Kyn plug-in. It turns its options into an
// assistant command, loads the plug-in with dlopen as an assistant does, performs the command,
// waits for the one reply and prints it for a person to read (or as JSON).
#include "plugin/kyn_plugin.h"

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>

#include <dlfcn.h>
#include <unistd.h>

#include <chrono>
#include <cctype>
#include <condition_variable>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <mutex>
#include <optional>
#include <sstream>
#include <cstring>
#include <string>
#include <vector>

namespace {

using Json = nlohmann::ordered_json;

enum ExitCode { kSuccess = 0, kCommandFailed = 1, kUsage = 2, kNoAnswer = 3 };

/// The plug-in's entry points, resolved with dlsym.
struct Plugin {
  void* handle = nullptr;
  decltype(&kyn_plugin_version) version = nullptr;
  decltype(&kyn_plugin_configure) configure = nullptr;
  decltype(&kyn_plugin_set_log_level) setLogLevel = nullptr;
  decltype(&kyn_plugin_set_log_callback) setLogCallback = nullptr;
  decltype(&kyn_plugin_perform) perform = nullptr;
  decltype(&kyn_plugin_describe_location) describeLocation = nullptr;
  decltype(&kyn_plugin_find_people) findPeople = nullptr;
  decltype(&kyn_plugin_free) free = nullptr;
  decltype(&kyn_plugin_shutdown) shutdown = nullptr;

  bool load(const std::string& path, std::string& error) {
    handle = dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
    if (handle == nullptr) {
      error = dlerror();
      return false;
    }
    bool ok = true;
    auto resolve = [&](auto& fn, const char* name) {
      fn = reinterpret_cast<std::remove_reference_t<decltype(fn)>>(dlsym(handle, name));
      if (fn == nullptr) {
        error = std::string("the plug-in lacks ") + name;
        ok = false;
      }
    };
    resolve(version, "kyn_plugin_version");
    resolve(configure, "kyn_plugin_configure");
    resolve(setLogLevel, "kyn_plugin_set_log_level");
    resolve(setLogCallback, "kyn_plugin_set_log_callback");
    resolve(perform, "kyn_plugin_perform");
    resolve(describeLocation, "kyn_plugin_describe_location");
    resolve(findPeople, "kyn_plugin_find_people");
    resolve(free, "kyn_plugin_free");
    resolve(shutdown, "kyn_plugin_shutdown");
    return ok;
  }

  void unload() {
    if (handle == nullptr) return;
    if (shutdown) shutdown();
    dlclose(handle);
    handle = nullptr;
  }

  /// A text returned by the plug-in, parsed; nothing for NULL.
  std::optional<Json> take(char* text) const {
    if (text == nullptr) return std::nullopt;
    Json value = Json::parse(text, nullptr, /*allow_exceptions=*/false);
    free(text);
    if (value.is_discarded()) return std::nullopt;
    return value;
  }
};

/// The plug-in beside this program (../lib), else the system's loader path.
std::string defaultPluginPath() {
  std::error_code ec;
  const auto self = std::filesystem::read_symlink("/proc/self/exe", ec);
  if (!ec) {
    const auto candidate = self.parent_path().parent_path() / "lib" / "libkyn-assistant.so";
    if (std::filesystem::exists(candidate, ec)) return candidate.string();
  }
  return "libkyn-assistant.so";
}

/// One reply, waited for.
struct ReplyBox {
  std::mutex mutex;
  std::condition_variable arrived;
  std::optional<std::string> reply;
  int count = 0;

  static void receive(const char* json, void* context) {
    auto* box = static_cast<ReplyBox*>(context);
    std::lock_guard lock(box->mutex);
    ++box->count;
    if (!box->reply) box->reply = json;
    box->arrived.notify_all();
  }

  std::optional<std::string> wait(std::chrono::duration<double> timeout) {
    std::unique_lock lock(mutex);
    arrived.wait_for(lock, timeout, [&] { return reply.has_value(); });
    return reply;
  }
};

void printLog(int level, const char* message, void* /*context*/) {
  static const char* names[] = {"debug", "info", "default", "error"};
  std::fprintf(stderr, "[plug-in %s] %s\n", (level >= 0 && level <= 3) ? names[level] : "log", message);
}

/// "LAT,LON" or "LAT,LON,ACCURACY" as an assistant location.
std::optional<Json> parseCoordinate(const std::string& text, bool allowAccuracy) {
  std::vector<double> parts;
  std::stringstream in(text);
  std::string item;
  while (std::getline(in, item, ',')) {
    try {
      std::size_t used = 0;
      parts.push_back(std::stod(item, &used));
      if (used != item.size()) return std::nullopt;
    } catch (...) {
      return std::nullopt;
    }
  }
  if (parts.size() < 2 || parts.size() > (allowAccuracy ? 3u : 2u)) return std::nullopt;
  if (parts[0] < -90 || parts[0] > 90 || parts[1] < -180 || parts[1] > 180) return std::nullopt;
  Json location = {{"class", "AXLocation"}, {"latitude", parts[0]}, {"longitude", parts[1]}};
  if (parts.size() == 3) location["accuracy"] = parts[2];
  return location;
}

bool looksLikePhoneNumber(const std::string& text) {
  int digits = 0;
  for (unsigned char c : text) {
    if (std::isdigit(c)) ++digits;
    else if (!std::strchr("+()-. /", c)) return false;
  }
  return digits >= 3;
}

std::string lower(std::string s) {
  for (char& c : s) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return s;
}

/// A friend as the assistant would hand it over: an e-mail address, a phone number, or the person
/// of the address book with that name.
std::optional<Json> resolveFriend(const Plugin& plugin, const std::string& who, std::string& error) {
  if (who.find('@') != std::string::npos) {
    return Json{{"class", "AXPerson"}, {"emails", Json::array({{{"class", "AXEmail"}, {"emailAddress", who}}})}};
  }
  if (looksLikePhoneNumber(who)) {
    return Json{{"class", "AXPerson"}, {"phones", Json::array({{{"class", "AXPhone"}, {"number", who}}})}};
  }
  const auto people = plugin.take(plugin.findPeople(who.c_str()));
  if (!people || !people->is_array() || people->empty()) {
    error = "No one named \"" + who + "\" in your contacts; give an e-mail address or a phone number instead.";
    return std::nullopt;
  }
  if (people->size() == 1) return people->front();
  for (const auto& person : *people) {
    if (lower(person.value("fullName", "")) == lower(who)) return person;
  }
  error = "\"" + who + "\" could mean several people:";
  for (const auto& person : *people) error += "\n  " + person.value("fullName", std::string("(no name)"));
  error += "\nSay which one with more of the name, an e-mail address or a phone number.";
  return std::nullopt;
}

std::string failureInWords(const Json& reply) {
  if (reply.contains("reason")) return reply.value("reason", std::string());
  switch (reply.value("errorCode", 0LL)) {
    case 1001: return "You are not signed in to Kyn, or the server did not accept the sign-in.";
    case 1002: return "Kyn is not offered in your region.";
    case 1003: return "Your account is not set up for location sharing.";
    case 1004: return "Your Kyn sign-in is locked: the application token cannot be read.";
    case 1005: return "The Kyn service is not available right now. Try again later.";
    case 1006: return "That person does not share a location with you.";
    case 1007: return "None of your friends share their location with you.";
    case 1008: return "The notification could not be set up.";
    case 1009: return "That place label is not known.";
    case 1010: return "That address could not be found.";
    default: return "The command failed (code " + std::to_string(reply.value("errorCode", 0LL)) + ").";
  }
}

void printReply(const Plugin& plugin, const Json& reply, const std::optional<std::string>& askedPlace) {
  const std::string kind = reply.value("class", "");
  if (kind == "AXCommandFailed") {
    std::cout << failureInWords(reply) << "\n";
    return;
  }
  if (kind != "AXKynSearchCompleted") {
    std::cout << reply.dump(2) << "\n";
    return;
  }
  const Json locations = reply.value("kynLocations", Json::array());
  if (locations.empty()) std::cout << "No location came back for the friends you asked about.\n";
  for (const auto& location : locations) {
    const auto text = plugin.take(plugin.describeLocation(location.dump().c_str(), 1, nullptr));
    const Json described = text.value_or(Json::object());
    std::string line = described.value("name", std::string("(unknown)"));
    line += " — " + described.value("place", std::string("?"));
    if (location.contains("latitude") && location.contains("longitude")) {
      char coordinates[96];
      std::snprintf(coordinates, sizeof coordinates, " · %.5f, %.5f", location["latitude"].get<double>(),
                    location["longitude"].get<double>());
      line += coordinates;
      if (location.contains("accuracy")) {
        char accuracy[32];
        std::snprintf(accuracy, sizeof accuracy, " ±%.0f m", location["accuracy"].get<double>());
        line += accuracy;
      }
    }
    if (described.contains("age")) line += " · " + described.value("age", std::string());
    if (location.contains("distance")) {
      char distance[48];
      std::snprintf(distance, sizeof distance, " · %.1f km away", location["distance"].get<double>() / 1000.0);
      line += distance;
    }
    std::cout << line << "\n";
  }
  if (askedPlace && reply.contains("atRequestedLocation")) {
    std::cout << "At " << *askedPlace << ": " << (reply["atRequestedLocation"].get<bool>() ? "yes" : "no") << "\n";
  }
}

}  // namespace

int main(int argc, char** argv) {
  CLI::App app{"kyn-assistant: asks the Kyn plug-in where your friends are, as a voice assistant would."};
  app.set_help_all_flag("--help-all", "Show the help of every command");
  std::string pluginPath = defaultPluginPath();
  std::string configDir;
  std::string language;
  bool asJson = false;
  bool verbose = false;
  double timeout = 60.0;
  app.add_option("--plugin", pluginPath, "The plug-in to load (default: ../lib/libkyn-assistant.so beside this program)")
      ->envname("KYN_PLUGIN");
  app.add_option("--config", configDir,
                 "The plug-in's configuration directory, holding account.json, token, config.json and contacts/ "
                 "(default: $XDG_CONFIG_HOME/kyn-assistant)");
  app.add_option("--language", language, "The assistant's language, a BCP 47 tag such as en-US, de or fr");
  app.add_flag("--json", asJson, "Print the reply dictionary as JSON instead of text");
  app.add_flag("-v,--verbose", verbose, "Show the plug-in's log on standard error");
  app.add_option("--timeout", timeout, "Seconds to wait for the reply")->default_val(60.0)->check(CLI::PositiveNumber);

  auto* search = app.add_subcommand("search", "Where are my friends? Asks for their locations.");
  std::vector<std::string> friends;
  std::string here, place, placeAt, proximity;
  search->add_option("-f,--friend", friends,
                     "A friend to locate: an e-mail address, a phone number, or a name from your contacts. "
                     "Repeat it for several friends.");
  search->add_option("--here", here, "Your own location: LAT,LON or LAT,LON,ACCURACY (metres)");
  search->add_option("--place", place, "The name of a place you ask about (\"Is Ada at Home?\")");
  search->add_option("--place-at", placeAt, "Where that place is: LAT,LON");
  search->add_option("--proximity", proximity, "How near counts as there: at, near, ...");

  auto* raw = app.add_subcommand("command", "Performs an assistant command given as JSON and prints the reply.");
  std::string commandFile;
  raw->add_option("file", commandFile, "A file holding the command JSON, or - for standard input")->required();
  app.require_subcommand(1);
  app.footer(
      "Exit status: 0 the command succeeded, 1 it failed (the reply says why), 2 the options are wrong,\n"
      "3 the plug-in could not be loaded or did not answer in time.\n"
      "Example: kyn-assistant search --friend ada@example.com --friend \"Bruno\" --here 45.52,-122.68,65");

  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& e) {
    return app.exit(e) == 0 ? kSuccess : kUsage;
  }

  Plugin plugin;
  std::string error;
  if (!plugin.load(pluginPath, error)) {
    std::cerr << "kyn-assistant: cannot load the plug-in " << pluginPath << ": " << error << "\n";
    return kNoAnswer;
  }
  plugin.setLogLevel(verbose ? "debug" : "off");
  if (verbose) plugin.setLogCallback(&printLog, nullptr);
  if (plugin.configure(configDir.empty() ? nullptr : configDir.c_str(), language.empty() ? nullptr : language.c_str()) !=
      0) {
    std::cerr << "kyn-assistant: the configuration directory " << configDir << " does not exist\n";
    plugin.unload();
    return kUsage;
  }

  // Ends the program for wrong options, after unloading the plug-in.
  auto usageError = [&](const std::string& message) {
    std::cerr << "kyn-assistant: " << message << "\n";
    plugin.unload();
    return kUsage;
  };

  Json command;
  std::optional<std::string> askedPlace;
  if (search->parsed()) {
    command = {{"class", "AXKynSearch"}, {"friends", Json::array()}};
    for (const auto& who : friends) {
      auto person = resolveFriend(plugin, who, error);
      if (!person) return usageError(error);
      command["friends"].push_back(*person);
    }
    if (!here.empty()) {
      auto location = parseCoordinate(here, true);
      if (!location) return usageError("--here wants LAT,LON or LAT,LON,ACCURACY, not \"" + here + "\"");
      command["currentLocation"] = *location;
    }
    if (!place.empty() || !placeAt.empty()) {
      Json requested = {{"class", "AXLocation"}};
      if (!placeAt.empty()) {
        auto location = parseCoordinate(placeAt, false);
        if (!location) return usageError("--place-at wants LAT,LON, not \"" + placeAt + "\"");
        requested = *location;
      }
      if (!place.empty()) {
        requested["label"] = place;
        askedPlace = place;
      }
      command["requestedLocation"] = requested;
    }
    if (!proximity.empty()) command["proximity"] = proximity;
  } else {
    std::stringstream text;
    if (commandFile == "-") {
      text << std::cin.rdbuf();
    } else {
      std::ifstream in(commandFile, std::ios::binary);
      if (!in) return usageError("cannot read " + commandFile);
      text << in.rdbuf();
    }
    command = Json::parse(text.str(), nullptr, false);
    if (command.is_discarded()) command = text.str();  // let the plug-in refuse it in its own words
  }

  ReplyBox box;
  const std::string commandText = command.is_string() ? command.get<std::string>() : command.dump();
  plugin.perform(commandText.c_str(), &ReplyBox::receive, &box);
  const auto reply = box.wait(std::chrono::duration<double>(timeout));
  if (!reply) {
    std::cerr << "kyn-assistant: no answer from the plug-in within " << timeout << " s\n";
    plugin.unload();
    return kNoAnswer;
  }
  const Json parsed = Json::parse(*reply, nullptr, false);
  if (asJson) std::cout << parsed.dump(2) << "\n";
  else printReply(plugin, parsed, askedPlace);
  plugin.unload();
  if (parsed.value("class", "") == "AXCommandFailed") {
    if (!asJson && !verbose) std::cerr << "(run with --verbose to see the plug-in's log)\n";
    return kCommandFailed;
  }
  return kSuccess;
}
