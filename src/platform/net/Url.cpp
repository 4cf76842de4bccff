#include "platform/net/Url.h"

#include <curl/curl.h>

#include <memory>

namespace kyn::platform {
namespace {

/// One part of a parsed URL, or nothing.
std::unique_ptr<char, decltype(&curl_free)> part(CURLU* url, CURLUPart which, unsigned flags) {
  char* text = nullptr;
  if (curl_url_get(url, which, &text, flags) != CURLUE_OK) text = nullptr;
  return {text, &curl_free};
}

}  // namespace

std::optional<std::string> authorityOf(const std::string& url) {
  const std::unique_ptr<CURLU, decltype(&curl_url_cleanup)> parsed(curl_url(), &curl_url_cleanup);
  if (!parsed || curl_url_set(parsed.get(), CURLUPART_URL, url.c_str(), 0) != CURLUE_OK) return std::nullopt;
  const auto host = part(parsed.get(), CURLUPART_HOST, 0);
  if (!host) return std::nullopt;
  std::string authority(host.get());
  if (const auto port = part(parsed.get(), CURLUPART_PORT, CURLU_NO_DEFAULT_PORT)) {
    authority += ":";
    authority += port.get();
  }
  return authority;
}

}  // namespace kyn::platform
