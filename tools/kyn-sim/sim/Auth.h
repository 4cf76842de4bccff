#pragma once

#include <array>
#include <optional>
#include <string>
#include <string_view>

namespace kyn::sim {

struct BasicCredentials {
  std::string user;
  std::string password;
};

/// The user and password of an HTTP Basic "Authorization" value ("Basic " + base64 of
/// "user:password"). Nothing for any other scheme or a malformed value.
[[nodiscard]] std::optional<BasicCredentials> parseBasicAuthorization(std::string_view header);

/// Strict base64 (standard alphabet, padded); nothing for anything else.
[[nodiscard]] std::optional<std::string> decodeBase64(std::string_view text);

/// Decides whether a request's "Authorization" value carries the account's person id and token.
/// Keeps only digests of the two, and compares digests in constant time.
class Authoriser {
 public:
  Authoriser(std::string_view personId, std::string_view token);

  [[nodiscard]] bool authorises(std::optional<std::string_view> authorization) const;

 private:
  using Digest = std::array<unsigned char, 32>;
  static Digest digest(std::string_view text);

  Digest person_;
  Digest token_;
};

}  // namespace kyn::sim
