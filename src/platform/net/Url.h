#pragma once

#include <optional>
#include <string>

namespace kyn::platform {

/// The host[:port] of an absolute URL, in the form a command's host takes: the port only when it is
/// not the scheme's default, an IPv6 address in brackets. Nothing for a text that is no URL.
[[nodiscard]] std::optional<std::string> authorityOf(const std::string& url);

}  // namespace kyn::platform
