#pragma once

// The pieces of an end-to-end test: a kyn-sim process on loopback, a configuration directory for
// the plug-in, and the plug-in itself loaded with dlopen as an assistant loads it.

#include "host/PluginLibrary.h"
#include "host/Process.h"
#include "host/Reply.h"
#include "support/Fakes.h"

#include <nlohmann/json.hpp>

#include <chrono>
#include <filesystem>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

namespace kyn::itest {

using Json = nlohmann::ordered_json;
using host::ProgramResult;
using host::runProgram;

inline constexpr const char* kPersonId = "P-1000001";
inline constexpr const char* kToken = "tok-5f1c2e9a-integration";

/// A running kyn-sim. Stopped (SIGTERM, then reaped) when destroyed.
class Sim {
 public:
  /// Starts kyn-sim in `dir` with the data set and any further options; returns once it listens.
  Sim(const std::filesystem::path& dir, const Json& dataSet, std::vector<std::string> extraArgs = {});
  Sim(const Sim&) = delete;
  Sim& operator=(const Sim&) = delete;

  [[nodiscard]] int port() const noexcept { return port_; }
  [[nodiscard]] std::filesystem::path caFile() const { return dir_ / "ca.pem"; }
  /// The request log, one object per request.
  [[nodiscard]] std::vector<Json> requests() const;

 private:
  std::filesystem::path dir_;
  std::unique_ptr<host::Process> process_;
  int port_ = 0;
};

/// The plug-in's configuration directory: account, token, config.json and an address book.
struct Account {
  explicit Account(std::filesystem::path directory) : dir(std::move(directory)) {}
  /// Writes account.json naming `host`, the token file and config.json (trusting `caFile` when given).
  void write(const std::string& host, const std::optional<std::filesystem::path>& caFile,
             const Json& extraConfig = Json::object(), const char* personId = kPersonId, const char* token = kToken) const;
  void addCard(const std::string& fileName, const std::string& card) const;
  std::filesystem::path dir;
};

/// The plug-in, loaded with dlopen; every log line is kept.
class Plugin {
 public:
  /// Loads the plug-in; with `captureLog`, every log line down to debug is kept, else none is made.
  explicit Plugin(bool captureLog = true);
  ~Plugin();
  Plugin(const Plugin&) = delete;
  Plugin& operator=(const Plugin&) = delete;

  void configure(const std::filesystem::path& configDir, const char* language = "en-US");

  struct Outcome {
    std::optional<Json> reply;  // the first reply
    int replies = 0;            // how many came, counted after the plug-in shut down
  };
  /// Performs a command and waits for its reply (at most `timeout`); then shuts the network thread
  /// down, so that any further reply would have arrived, and reports how many came.
  Outcome perform(const std::string& commandJson, std::chrono::seconds timeout = std::chrono::seconds(30));
  /// Performs without shutting down afterwards (for a later command on the same connection).
  std::optional<Json> performAndWait(const std::string& commandJson,
                                     std::chrono::seconds timeout = std::chrono::seconds(30));
  void shutdown();
  /// How many replies each command of `performAndWait` got; read it after `shutdown`.
  [[nodiscard]] std::vector<int> replyCounts();

  [[nodiscard]] std::vector<std::string> logLines() const;
  [[nodiscard]] host::PluginLibrary& library() noexcept { return library_; }

 private:
  static void onLog(int level, const char* message, void* context);

  mutable std::mutex logMutex_;
  std::vector<std::string> log_;
  std::vector<std::unique_ptr<host::Reply>> boxes_;
  // Last, so that it is unloaded first: shutting down may still deliver replies and log lines.
  host::PluginLibrary library_;
};

/// The objects of a file that holds one JSON object a line.
[[nodiscard]] std::vector<Json> readJsonLines(const std::filesystem::path& file);

/// Runs the command-line host on the configuration directory `config` with these arguments.
ProgramResult runHost(const std::filesystem::path& config, std::vector<std::string> args,
                      const host::SpawnOptions& options = {});

/// A search command for friends given by e-mail address or phone number.
[[nodiscard]] std::string searchFor(const std::vector<std::string>& handles);

}  // namespace kyn::itest
