#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace kyn::sim {

/// Answers shorter than this go out as they are: below about one TCP segment compression saves
/// the client nothing and costs the server time.
inline constexpr std::size_t kCompressFrom = 1024;

/// Whether an Accept-Encoding header value admits gzip ("gzip", "x-gzip" or "*", not with q=0).
[[nodiscard]] bool acceptsGzip(std::string_view acceptEncoding);

/// `body` gzip-compressed at zlib's fastest level, as a web server's front end compresses dynamic
/// answers; nothing when zlib fails.
[[nodiscard]] std::optional<std::string> gzip(std::string_view body);

}  // namespace kyn::sim
