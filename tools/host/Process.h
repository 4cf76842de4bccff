#pragma once

// Helper processes: started, read from, stopped and reaped; and temporary directories.

#include <sys/types.h>

#include <filesystem>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace kyn::host {

struct SpawnOptions {
  /// Keep the program's standard output readable through `readLine`/`readAll`.
  bool captureOutput = false;
  /// Where its standard error goes (truncated first); inherited when absent.
  std::optional<std::filesystem::path> errorFile;
  /// Text written to its standard input, which is then closed; inherited when absent.
  std::optional<std::string> input;
  /// "NAME=value" entries added to (or replacing in) this process's environment.
  std::vector<std::string> environment;
  /// The program gets SIGTERM when this process ends, even by a crash.
  bool endWithParent = false;
};

/// A running program. Destroying it stops it (SIGTERM) and reaps it.
class Process {
 public:
  /// Starts `argv[0]` (a path) with `argv`; throws std::runtime_error when it cannot be started.
  Process(const std::vector<std::string>& argv, const SpawnOptions& options = {});
  ~Process();
  Process(const Process&) = delete;
  Process& operator=(const Process&) = delete;

  [[nodiscard]] pid_t pid() const noexcept { return pid_; }
  /// The next line of its output, without the newline; nothing at the end of the output.
  [[nodiscard]] std::optional<std::string> readLine();
  /// Everything it still writes, until it closes its output.
  [[nodiscard]] std::string readAll();
  /// Waits for it to end: its exit status, or 128 + the signal that ended it.
  int wait();
  /// Sends SIGTERM (unless it already ended) and waits for it.
  int stop();

 private:
  pid_t pid_ = -1;
  int output_ = -1;
  std::string buffered_;
  std::optional<int> status_;
};

struct ProgramResult {
  int status = -1;     ///< exit status, or 128 + signal
  std::string output;  ///< its standard output
};
/// Runs a program to its end.
[[nodiscard]] ProgramResult runProgram(const std::vector<std::string>& argv, const SpawnOptions& options = {});

/// A new directory under the system's temporary folder, removed with all it holds at the end of
/// the scope.
class TempDir {
 public:
  explicit TempDir(std::string_view prefix = "kyn");
  ~TempDir();
  TempDir(const TempDir&) = delete;
  TempDir& operator=(const TempDir&) = delete;
  [[nodiscard]] const std::filesystem::path& path() const noexcept { return path_; }
  /// Writes `text` to `name` inside the directory (creating folders, with the given mode) and
  /// returns its path.
  std::filesystem::path write(const std::string& name, std::string_view text, unsigned mode = 0600) const;

 private:
  std::filesystem::path path_;
};

}  // namespace kyn::host
