#pragma once

// The pieces of kyn-assistant: a command of the command line turns its options into an assistant
// command; the plug-in performs it; the reply is printed for a person (or as JSON).

#include "Texts.h"
#include "host/PluginLibrary.h"

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>

#include <filesystem>
#include <optional>
#include <ostream>
#include <stdexcept>
#include <string>

namespace kyn::cli {

using Json = nlohmann::ordered_json;

enum ExitCode { kSuccess = 0, kCommandFailed = 1, kUsage = 2, kNoAnswer = 3 };

/// Options that do not fit, found after parsing; the message is for the user (exit status 2).
class UsageError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// The options every command shares.
struct Options {
  std::string pluginPath;
  std::string configDir;
  std::string language;
  bool json = false;
  bool verbose = false;
  double timeout = 60.0;
  std::string picturesDir;  // where friends' pictures are written; empty: nowhere
};

/// What a command needs while it runs: the loaded, configured plug-in and the host's texts.
struct Session {
  host::PluginLibrary& plugin;
  const Texts& texts;
  const Options& options;
};

/// One command of the command line (search, account, ...).
class HostCommand {
 public:
  virtual ~HostCommand() = default;
  /// Whether the user chose this command.
  [[nodiscard]] virtual bool chosen() const = 0;
  /// Whether the configuration directory is made when it is missing (signing in).
  [[nodiscard]] virtual bool makesConfigDirectory() const { return false; }
  /// Runs the command; returns the exit status. Throws UsageError for options that do not fit.
  virtual int run(Session& session) = 0;
};

/// A command that hands the plug-in one assistant command and prints its reply.
class AssistantCommand : public HostCommand {
 public:
  int run(Session& session) final;
  /// The assistant command to perform; throws UsageError for options that do not fit.
  [[nodiscard]] virtual Json build(Session& session) = 0;
};

/// A friend as an assistant hands it over: the person of the address book who holds the e-mail
/// address or phone number (or the handle alone when no contact holds it), or the one person whose
/// name holds `who`. Throws UsageError when no one or several people match a name.
[[nodiscard]] Json resolveFriend(Session& session, const std::string& who);

/// "LAT,LON" (or "LAT,LON,ACCURACY" when `allowAccuracy`) as an assistant location; nothing for a
/// text that is no coordinate.
[[nodiscard]] std::optional<Json> parseCoordinate(const std::string& text, bool allowAccuracy);

/// A place the user named, as an assistant location: its label (when not empty) and its coordinate
/// "LAT,LON" (when not empty). Throws UsageError for a coordinate that does not read.
[[nodiscard]] Json namedPlace(Session& session, const std::string& label, const std::string& coordinate);

/// A command's flag as the plug-in reads it: a boolean, or a number other than zero (a raw command
/// may say 1).
[[nodiscard]] bool flagOf(const Json& command, const char* key);

/// Prints the reply to `command` for a person, in the assistant's language.
void printReply(Session& session, const Json& command, const Json& reply, std::ostream& out);

/// Writes the contact picture of every friend of a search reply that has one into `directory`, as
/// the address book stores it, named after the friend's handle ("ada@example.com.jpg"). Says where
/// each went on `report` (when given) and what could not be written on `errors`.
void savePictures(Session& session, const Json& reply, const std::filesystem::path& directory, std::ostream* report,
                  std::ostream& errors);

}  // namespace kyn::cli
