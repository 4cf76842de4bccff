#include "sim/Faults.h"

#include <charconv>
#include <stdexcept>

namespace kyn::sim {

namespace {

constexpr const char* kForms = "status:CODE, slow:MS, reset, garbage, body:PATH, truncate, redirect:URL or moved:URL";

long number(std::string_view digits, std::string_view fault) {
  long value = 0;
  const auto [end, ec] = std::from_chars(digits.data(), digits.data() + digits.size(), value);
  if (digits.empty() || ec != std::errc{} || end != digits.data() + digits.size()) {
    throw std::invalid_argument("fault \"" + std::string(fault) + "\": expected a whole number");
  }
  return value;
}

}  // namespace

std::string Fault::describe() const {
  switch (kind) {
    case Kind::None: return {};
    case Kind::Status: return "status:" + std::to_string(status);
    case Kind::Slow: return "slow:" + std::to_string(delay.count());
    case Kind::Reset: return "reset";
    case Kind::Garbage: return "garbage";
    case Kind::Body: return "body:" + bodyPath.string();
    case Kind::Truncate: return "truncate";
    case Kind::Redirect: return (status == 301 ? "moved:" : "redirect:") + location;
  }
  return {};
}

Fault parseFault(std::string_view text) {
  const auto colon = text.find(':');
  const std::string_view kind = text.substr(0, colon);
  const std::string_view argument = colon == std::string_view::npos ? std::string_view{} : text.substr(colon + 1);
  const bool hasArgument = colon != std::string_view::npos;

  Fault f;
  if (kind == "status" && hasArgument) {
    f.kind = Fault::Kind::Status;
    const long code = number(argument, text);
    // 1xx would leave the client waiting for a final answer; that is not a fault of this kind.
    if (code < 200 || code > 599) throw std::invalid_argument("fault \"" + std::string(text) + "\": status 200 to 599");
    f.status = static_cast<int>(code);
  } else if (kind == "slow" && hasArgument) {
    f.kind = Fault::Kind::Slow;
    const long ms = number(argument, text);
    if (ms < 0) throw std::invalid_argument("fault \"" + std::string(text) + "\": negative delay");
    f.delay = std::chrono::milliseconds(ms);
  } else if (kind == "body" && hasArgument && !argument.empty()) {
    f.kind = Fault::Kind::Body;
    f.bodyPath = std::filesystem::path(std::string(argument));
  } else if ((kind == "redirect" || kind == "moved") && hasArgument && !argument.empty()) {
    f.kind = Fault::Kind::Redirect;
    f.status = kind == "moved" ? 301 : 307;
    f.location = std::string(argument);
  } else if (!hasArgument && kind == "reset") {
    f.kind = Fault::Kind::Reset;
  } else if (!hasArgument && kind == "garbage") {
    f.kind = Fault::Kind::Garbage;
  } else if (!hasArgument && kind == "truncate") {
    f.kind = Fault::Kind::Truncate;
  } else {
    throw std::invalid_argument("unknown fault \"" + std::string(text) + "\"; use " + kForms);
  }
  return f;
}

}  // namespace kyn::sim
