#include "sim/Compression.h"

#include "sim/DataSet.h"

#include <zlib.h>

#include <algorithm>
#include <cctype>

namespace kyn::sim {
namespace {

std::string_view trim(std::string_view s) {
  while (!s.empty() && (s.front() == ' ' || s.front() == '\t')) s.remove_prefix(1);
  while (!s.empty() && (s.back() == ' ' || s.back() == '\t')) s.remove_suffix(1);
  return s;
}

/// A q parameter of 0 (0, 0.0, 0.00, 0.000) refuses the coding.
bool refused(std::string_view parameters) {
  while (!parameters.empty()) {
    const auto semicolon = parameters.find(';');
    const std::string_view parameter = trim(parameters.substr(0, semicolon));
    parameters = semicolon == std::string_view::npos ? std::string_view() : parameters.substr(semicolon + 1);
    if (parameter.size() < 2 || std::tolower(static_cast<unsigned char>(parameter[0])) != 'q' || parameter[1] != '=') continue;
    const std::string_view q = trim(parameter.substr(2));
    return !q.empty() && q.find_first_not_of("0.") == std::string_view::npos;
  }
  return false;
}

}  // namespace

bool acceptsGzip(std::string_view acceptEncoding) {
  while (!acceptEncoding.empty()) {
    const auto comma = acceptEncoding.find(',');
    const std::string_view item = acceptEncoding.substr(0, comma);
    acceptEncoding = comma == std::string_view::npos ? std::string_view() : acceptEncoding.substr(comma + 1);
    const auto semicolon = item.find(';');
    const std::string_view coding = trim(item.substr(0, semicolon));
    if (equalsIgnoringCase(coding, "gzip") || equalsIgnoringCase(coding, "x-gzip") || coding == "*") {
      if (!refused(semicolon == std::string_view::npos ? std::string_view() : item.substr(semicolon + 1))) return true;
    }
  }
  return false;
}

std::optional<std::string> gzip(std::string_view body) {
  z_stream stream{};
  // 15 window bits plus 16: a gzip header and trailer rather than zlib's own.
  if (deflateInit2(&stream, Z_BEST_SPEED, Z_DEFLATED, 15 + 16, 8, Z_DEFAULT_STRATEGY) != Z_OK) return std::nullopt;
  std::string out(deflateBound(&stream, static_cast<uLong>(body.size())), '\0');
  stream.next_in = reinterpret_cast<Bytef*>(const_cast<char*>(body.data()));
  stream.avail_in = static_cast<uInt>(body.size());
  stream.next_out = reinterpret_cast<Bytef*>(out.data());
  stream.avail_out = static_cast<uInt>(out.size());
  const int result = deflate(&stream, Z_FINISH);
  out.resize(stream.total_out);
  deflateEnd(&stream);
  if (result != Z_STREAM_END) return std::nullopt;
  return out;
}

}  // namespace kyn::sim
