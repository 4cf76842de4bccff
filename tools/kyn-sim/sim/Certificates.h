#pragma once

#include <memory>
#include <string>
#include <vector>

#include <openssl/evp.h>
#include <openssl/x509.h>

namespace kyn::sim {

struct X509Deleter {
  void operator()(X509* x) const noexcept { X509_free(x); }
};
struct PKeyDeleter {
  void operator()(EVP_PKEY* k) const noexcept { EVP_PKEY_free(k); }
};
using X509Ptr = std::unique_ptr<X509, X509Deleter>;
using PKeyPtr = std::unique_ptr<EVP_PKEY, PKeyDeleter>;

/// A throw-away certificate authority and a server certificate that it signed; made at each start,
/// so no key ever lands on disk. EC P-256 keys, SHA-256 signatures.
struct ServerIdentity {
  X509Ptr caCertificate;
  X509Ptr serverCertificate;
  PKeyPtr serverKey;
};

/// The subject alternative names every server certificate carries.
[[nodiscard]] std::vector<std::string> defaultServerNames();

/// Makes the CA and a server certificate for `names` (host names become DNS names, IPv4 and IPv6
/// literals IP addresses). Throws std::runtime_error with the crypto library's reason on failure and
/// std::invalid_argument for a name that can be neither.
[[nodiscard]] ServerIdentity makeServerIdentity(const std::vector<std::string>& names);

/// A certificate in PEM form.
[[nodiscard]] std::string toPem(X509* certificate);

}  // namespace kyn::sim
