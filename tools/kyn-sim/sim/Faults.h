#pragma once

#include <chrono>
#include <filesystem>
#include <string>
#include <string_view>

namespace kyn::sim {

/// A scripted misbehaviour of the get-locations endpoint.
struct Fault {
  enum class Kind {
    None,      ///< answer normally
    Status,    ///< answer HTTP `status` with a small JSON body
    Slow,      ///< wait `delay`, then answer normally
    Reset,     ///< drop the connection with a TCP reset instead of answering
    Garbage,   ///< HTTP 200 with random bytes that are no JSON
    Body,      ///< HTTP 200 with the bytes of `bodyPath`, read afresh for every request
    Truncate,  ///< announce more body bytes than are sent, then drop the connection
    Redirect,  ///< `status` (307, or 301 for "moved") to `location`, whatever it names
  };
  Kind kind = Kind::None;
  int status = 0;
  std::chrono::milliseconds delay{0};
  std::filesystem::path bodyPath;
  std::string location;

  /// The fault as written on the command line ("status:500"); empty for none.
  [[nodiscard]] std::string describe() const;
};

/// Parses "status:CODE" (200 to 599), "slow:MS", "reset", "garbage", "body:PATH", "truncate",
/// "redirect:URL" or "moved:URL".
/// Throws std::invalid_argument with the accepted forms on anything else.
[[nodiscard]] Fault parseFault(std::string_view text);

}  // namespace kyn::sim
