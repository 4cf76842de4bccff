#pragma once

#include "sim/Certificates.h"
#include "sim/Faults.h"
#include "sim/Router.h"

#include <condition_variable>
#include <filesystem>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace httplib {
class SSLServer;
struct Request;
struct Response;
}  // namespace httplib

namespace kyn::sim {

/// Everything the command line can set.
struct Options {
  std::string listen = "127.0.0.1";
  int port = 0;
  std::vector<std::string> hosts;  ///< extra names for the server certificate
  std::optional<std::filesystem::path> caOut;
  std::optional<std::filesystem::path> portFile;
  std::string personId;
  std::string token;  ///< secret: never printed or logged
  /// Person id and token of each further account of the data set; the tokens are secrets too.
  std::vector<std::pair<std::string, std::string>> accounts;
  std::filesystem::path dataPath;
  std::optional<std::string> canonicalHost;
  Fault fault;
  std::optional<long> faultCount;
  std::vector<std::string> faultPaths;  ///< endpoint paths the fault shapes; all when empty
  std::optional<std::filesystem::path> logFile;
  std::optional<std::filesystem::path> notificationsFile;
  std::optional<std::filesystem::path> controlFile;
};

/// A start-up problem the user has to fix (bad option, data set, file); main exits with status 2.
class StartupError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// The application token from a file: its content without trailing white space. Throws StartupError
/// (naming the file, never the content) when it cannot be read or is empty.
[[nodiscard]] std::string readTokenFile(const std::filesystem::path& path);

/// The person id and token of an --account value "ID:TOKENFILE". Throws StartupError.
[[nodiscard]] std::pair<std::string, std::string> readAccountOption(std::string_view value);

/// The names the server certificate carries: localhost, 127.0.0.1, 127.0.0.2, the extra hosts and
/// the canonical host, each once.
[[nodiscard]] std::vector<std::string> certificateNames(const Options& options);

/// The HTTPS server: builds its identity and router from the options, binds, serves until stopped.
class Simulator {
 public:
  /// Loads the data set, checks the options and makes the certificates; writes the CA certificate
  /// to `caOut`. Throws StartupError.
  explicit Simulator(Options options);
  ~Simulator();
  Simulator(const Simulator&) = delete;
  Simulator& operator=(const Simulator&) = delete;

  /// Binds the listening socket (connections queue from then on) and writes the port file and the
  /// control file. Returns the port. Throws StartupError.
  int bind();

  /// Serves until `stop()`; returns when every connection thread has ended.
  void run();

  /// Stops serving and cuts short any scripted delay. From any thread, at any time, repeatedly.
  void stop();

  /// Calls `observer` with each request's log record as the request arrives (after the decision,
  /// before any scripted delay). Set before run(); called on connection threads.
  void observeRequests(std::function<void(const Json&)> observer) { observer_ = std::move(observer); }

  [[nodiscard]] int port() const noexcept { return port_; }
  [[nodiscard]] const std::string& caPem() const noexcept { return caPem_; }
  [[nodiscard]] const Options& options() const noexcept { return options_; }

 private:
  void serve(const httplib::Request& request, httplib::Response& response);
  /// Waits for `delay` unless the server stops first.
  void pause(std::chrono::milliseconds delay);

  Options options_;
  std::string caPem_;
  std::unique_ptr<Router> router_;
  std::unique_ptr<class JsonLinesFile> log_;
  std::unique_ptr<class JsonLinesFile> notifications_;
  std::string controlSecret_;  ///< until the control file has it
  std::unique_ptr<httplib::SSLServer> server_;
  std::function<void(const Json&)> observer_;
  int port_ = 0;

  std::mutex mutex_;
  std::condition_variable changed_;
  bool stopping_ = false;
  bool running_ = false;
};

}  // namespace kyn::sim
