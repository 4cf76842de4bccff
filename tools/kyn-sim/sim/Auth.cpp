#include "sim/Auth.h"

#include <cctype>
#include <stdexcept>

#include <openssl/crypto.h>
#include <openssl/evp.h>

namespace kyn::sim {

namespace {

int base64Value(char c) noexcept {
  if (c >= 'A' && c <= 'Z') return c - 'A';
  if (c >= 'a' && c <= 'z') return c - 'a' + 26;
  if (c >= '0' && c <= '9') return c - '0' + 52;
  if (c == '+') return 62;
  if (c == '/') return 63;
  return -1;
}

bool startsWithIgnoringCase(std::string_view text, std::string_view prefix) noexcept {
  if (text.size() < prefix.size()) return false;
  for (std::size_t i = 0; i < prefix.size(); ++i) {
    if (std::tolower(static_cast<unsigned char>(text[i])) != std::tolower(static_cast<unsigned char>(prefix[i]))) {
      return false;
    }
  }
  return true;
}

}  // namespace

std::optional<std::string> decodeBase64(std::string_view text) {
  if (text.size() % 4 != 0) return std::nullopt;
  std::size_t padding = 0;
  if (!text.empty() && text.back() == '=') ++padding;
  if (text.size() >= 2 && text[text.size() - 2] == '=') ++padding;
  std::string out;
  out.reserve(text.size() / 4 * 3);
  unsigned int bits = 0;
  int count = 0;
  for (std::size_t i = 0; i < text.size() - padding; ++i) {
    const int v = base64Value(text[i]);
    if (v < 0) return std::nullopt;  // also a "=" that is not trailing padding
    bits = (bits << 6) | static_cast<unsigned int>(v);
    if (++count == 4) {
      out.push_back(static_cast<char>((bits >> 16) & 0xff));
      out.push_back(static_cast<char>((bits >> 8) & 0xff));
      out.push_back(static_cast<char>(bits & 0xff));
      bits = 0;
      count = 0;
    }
  }
  // Padding leaves 2 or 3 symbols; bits beyond the last whole byte must be zero (canonical form).
  if (count == 2) {
    if (bits & 0x0f) return std::nullopt;
    out.push_back(static_cast<char>((bits >> 4) & 0xff));
  } else if (count == 3) {
    if (bits & 0x03) return std::nullopt;
    out.push_back(static_cast<char>((bits >> 10) & 0xff));
    out.push_back(static_cast<char>((bits >> 2) & 0xff));
  }
  return out;
}

std::optional<BasicCredentials> parseBasicAuthorization(std::string_view header) {
  constexpr std::string_view scheme = "basic";
  if (!startsWithIgnoringCase(header, scheme)) return std::nullopt;
  header.remove_prefix(scheme.size());
  if (header.empty() || header.front() != ' ') return std::nullopt;
  while (!header.empty() && header.front() == ' ') header.remove_prefix(1);
  while (!header.empty() && header.back() == ' ') header.remove_suffix(1);
  const auto decoded = decodeBase64(header);
  if (!decoded || decoded->empty()) return std::nullopt;
  const auto colon = decoded->find(':');
  if (colon == std::string::npos) return std::nullopt;
  return BasicCredentials{decoded->substr(0, colon), decoded->substr(colon + 1)};
}

void Authoriser::add(std::string_view personId, std::optional<std::string_view> token) {
  accounts_.push_back({digest(personId), digest(token.value_or("")), token.has_value()});
}

Authoriser::Digest Authoriser::digest(std::string_view text) {
  Digest d{};
  unsigned int length = 0;
  if (EVP_Digest(text.data(), text.size(), d.data(), &length, EVP_sha256(), nullptr) != 1 || length != d.size()) {
    throw std::runtime_error("SHA-256 is not available");
  }
  return d;
}

std::optional<std::size_t> Authoriser::account(std::optional<std::string_view> authorization) const {
  if (!authorization) return std::nullopt;
  const auto credentials = parseBasicAuthorization(*authorization);
  if (!credentials) return std::nullopt;
  // Digests have one length whatever was sent, and every account is compared, so the time taken
  // tells nothing about any token.
  const Digest user = digest(credentials->user);
  const Digest password = digest(credentials->password);
  std::optional<std::size_t> found;
  for (std::size_t i = 0; i < accounts_.size(); ++i) {
    const bool personMatches = CRYPTO_memcmp(user.data(), accounts_[i].person.data(), user.size()) == 0;
    const bool tokenMatches = CRYPTO_memcmp(password.data(), accounts_[i].token.data(), password.size()) == 0;
    if (accounts_[i].enabled & personMatches & tokenMatches & !found.has_value()) found = i;
  }
  return found;
}

}  // namespace kyn::sim
