#pragma once

#include "sim/Json.h"
#include "sim/Router.h"

#include <chrono>
#include <filesystem>
#include <fstream>
#include <mutex>

namespace kyn::sim {

/// The log record of one request: time, method, path, Host header, whether it was authorised and
/// as whom, the request's "handles", the HTTP status sent (null when the connection was reset), the
/// two protocol headers, and the scripted fault. Never the credentials.
[[nodiscard]] Json requestLogLine(const Call& call, const Outcome& outcome, std::chrono::system_clock::time_point time);

/// An append-only file of JSON lines (requests, notifications), each flushed at once so that a
/// test that has its answer finds the line. Thread-safe.
class JsonLinesFile {
 public:
  /// Opens for appending; throws std::runtime_error naming the path when it cannot.
  explicit JsonLinesFile(const std::filesystem::path& path);

  void record(const Json& line);

 private:
  std::mutex mutex_;
  std::ofstream out_;
};

/// A time as "2025-11-21T16:00:00.123Z".
[[nodiscard]] std::string isoTime(std::chrono::system_clock::time_point time);

}  // namespace kyn::sim
