#pragma once

#include <array>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

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

/// Decides which account, if any, a request's "Authorization" value signs in: the one whose person
/// id and token it carries. Keeps only digests of the two, and compares every account's digests in
/// constant time.
class Authoriser {
 public:
  Authoriser() = default;
  Authoriser(std::string_view personId, std::string_view token) { add(personId, token); }

  /// Adds the next account; accounts are numbered from 0 in the order they are added. Without a
  /// token the account keeps its number but cannot sign in.
  void add(std::string_view personId, std::optional<std::string_view> token);

  /// The number of the account signed in, or nothing.
  [[nodiscard]] std::optional<std::size_t> account(std::optional<std::string_view> authorization) const;
  [[nodiscard]] bool authorises(std::optional<std::string_view> authorization) const {
    return account(authorization).has_value();
  }

 private:
  using Digest = std::array<unsigned char, 32>;
  static Digest digest(std::string_view text);

  struct Credentials {
    Digest person;
    Digest token;
    bool enabled;
  };
  std::vector<Credentials> accounts_;
};

}  // namespace kyn::sim
