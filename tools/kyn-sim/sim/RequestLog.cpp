#include "sim/RequestLog.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <stdexcept>

namespace kyn::sim {

std::string isoTime(std::chrono::system_clock::time_point time) {
  const auto ms = std::chrono::duration_cast<std::chrono::milliseconds>(time.time_since_epoch()).count();
  const std::time_t seconds = static_cast<std::time_t>(ms / 1000);
  std::tm utc{};
  gmtime_r(&seconds, &utc);
  char text[80];
  std::snprintf(text, sizeof text, "%04d-%02d-%02dT%02d:%02d:%02d.%03dZ", utc.tm_year + 1900, utc.tm_mon + 1,
                utc.tm_mday, utc.tm_hour, utc.tm_min, utc.tm_sec, static_cast<int>(ms % 1000));
  return text;
}

Json requestLogLine(const Call& call, const Outcome& outcome, std::chrono::system_clock::time_point time) {
  Json line = Json::object();
  line["time"] = isoTime(time);
  line["method"] = call.method;
  line["path"] = call.path;
  line["host"] = call.host;
  line["authorised"] = outcome.authorised;
  line["account"] = outcome.account ? Json(*outcome.account) : Json(nullptr);
  line["handles"] = outcome.handles ? *outcome.handles : Json(nullptr);
  line["status"] = outcome.reply.delivery == Reply::Delivery::Reset ? Json(nullptr) : Json(outcome.reply.status);
  line["apiVersionHeader"] = call.apiVersion.has_value();
  line["apiVersion"] = call.apiVersion ? Json(*call.apiVersion) : Json(nullptr);
  line["authScheme"] = call.authScheme ? Json(*call.authScheme) : Json(nullptr);
  line["fault"] = outcome.fault.empty() ? Json(nullptr) : Json(outcome.fault);
  return line;
}

JsonLinesFile::JsonLinesFile(const std::filesystem::path& path) : out_(path, std::ios::app | std::ios::binary) {
  if (!out_) throw std::runtime_error("cannot open " + path.string() + ": " + std::strerror(errno));
}

void JsonLinesFile::record(const Json& line) {
  // Replace invalid UTF-8 rather than throw: handles come from clients and may be anything.
  const std::string text = line.dump(-1, ' ', false, Json::error_handler_t::replace);
  std::lock_guard lock(mutex_);
  out_ << text << '\n';
  out_.flush();
}

}  // namespace kyn::sim
