#include "platform/log/Format.h"

#include "platform/text/StringEscapes.h"
#include "platform/value/Json.h"

#include <cmath>
#include <cstdio>

namespace kyn::platform {

FormatArg::FormatArg(const Value& value) : FormatArg(JsonView(&value)) {}

FormatArg::FormatArg(const Value* value) : FormatArg(JsonView(value)) {}

FormatArg::FormatArg(JsonView value)
    : v_(!value ? std::string("(null)") : value.isString() ? std::string(*value.string()) : toJson(value)) {}

void FormatArg::appendText(std::string& out) const {
  if (const auto* s = std::get_if<std::string>(&v_)) out += *s;
  else out += text();
}

std::size_t FormatArg::sizeHint() const noexcept {
  const auto* s = std::get_if<std::string>(&v_);
  return s ? s->size() : 24;
}

std::string FormatArg::text() const {
  if (const auto* s = std::get_if<std::string>(&v_)) return *s;
  if (const auto* i = std::get_if<std::int64_t>(&v_)) return std::to_string(*i);
  return numberDescription(std::get<double>(v_));
}

std::int64_t FormatArg::integer() const {
  if (const auto* i = std::get_if<std::int64_t>(&v_)) return *i;
  if (const auto* d = std::get_if<double>(&v_)) {
    if (!std::isfinite(*d) || std::fabs(*d) >= 9.2e18) return 0;
    return static_cast<std::int64_t>(*d);
  }
  return leadingInteger64(std::get<std::string>(v_));
}

double FormatArg::floating() const {
  if (const auto* d = std::get_if<double>(&v_)) return *d;
  if (const auto* i = std::get_if<std::int64_t>(&v_)) return static_cast<double>(*i);
  return static_cast<double>(leadingInteger64(std::get<std::string>(v_)));
}

std::string formatArgs(std::string_view format, std::span<const FormatArg> args) {
  std::string out;
  std::size_t room = format.size();
  for (const FormatArg& arg : args) room += arg.sizeHint();
  out.reserve(room);
  std::size_t nextArg = 0;
  std::size_t i = 0;
  while (i < format.size()) {
    const char c = format[i];
    if (c != '%') {
      out.push_back(c);
      ++i;
      continue;
    }
    const std::size_t start = i++;
    if (i < format.size() && format[i] == '%') {
      out.push_back('%');
      ++i;
      continue;
    }
    // Optional position "N$".
    std::size_t position = 0;
    std::size_t j = i;
    while (j < format.size() && format[j] >= '0' && format[j] <= '9') {
      position = position * 10 + static_cast<std::size_t>(format[j] - '0');
      if (position > 99) break;
      ++j;
    }
    if (j > i && j < format.size() && format[j] == '$' && position > 0) {
      i = j + 1;
    } else {
      position = 0;
    }
    // Length modifiers are accepted and ignored: every integer is rendered at 64 bits.
    while (i < format.size() && (format[i] == 'l' || format[i] == 'h' || format[i] == 'q' || format[i] == 'z')) ++i;
    if (i >= format.size()) {
      out.append(format.substr(start));
      break;
    }
    const char conversion = format[i++];
    const std::size_t index = position > 0 ? position - 1 : nextArg++;
    const FormatArg* arg = index < args.size() ? &args[index] : nullptr;
    switch (conversion) {
      case '@':
      case 's':
        if (arg) arg->appendText(out);
        break;
      case 'd':
      case 'i':
        if (arg) out += std::to_string(arg->integer());
        break;
      case 'u':
        if (arg) out += std::to_string(static_cast<std::uint64_t>(arg->integer()));
        break;
      case 'f':
        if (arg) {
          char buffer[64];
          std::snprintf(buffer, sizeof buffer, "%f", arg->floating());
          out += buffer;
        }
        break;
      default:
        // Not a placeholder of ours: keep it as written and do not consume an argument.
        if (position == 0) --nextArg;
        out.append(format.substr(start, i - start));
        break;
    }
  }
  return out;
}

}  // namespace kyn::platform
