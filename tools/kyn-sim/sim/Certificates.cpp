#include "sim/Certificates.h"

#include <stdexcept>

#include <arpa/inet.h>
#include <openssl/bio.h>
#include <openssl/bn.h>
#include <openssl/ec.h>
#include <openssl/err.h>
#include <openssl/pem.h>
#include <openssl/rand.h>
#include <openssl/x509v3.h>

namespace kyn::sim {

namespace {

constexpr long kValiditySeconds = 30L * 24 * 60 * 60;
constexpr long kClockSkewSeconds = 60L * 60;  // notBefore an hour back, in case of skewed clocks

[[noreturn]] void failure(const char* what) {
  const unsigned long code = ERR_get_error();
  char reason[256] = "unknown error";
  if (code != 0) ERR_error_string_n(code, reason, sizeof reason);
  ERR_clear_error();
  throw std::runtime_error(std::string("certificate generation: ") + what + ": " + reason);
}

void check(int result, const char* what) {
  if (result <= 0) failure(what);
}

PKeyPtr makeP256Key() {
  PKeyPtr key(EVP_EC_gen("P-256"));
  if (!key) failure("EC P-256 key");
  return key;
}

void setRandomSerial(X509* cert) {
  unsigned char bytes[16];
  check(RAND_bytes(bytes, sizeof bytes), "serial number");
  bytes[0] &= 0x7f;  // positive, as RFC 5280 asks
  bytes[0] |= 0x01;  // and never a leading zero byte
  std::unique_ptr<BIGNUM, decltype(&BN_free)> bn(BN_bin2bn(bytes, sizeof bytes, nullptr), BN_free);
  if (!bn || !BN_to_ASN1_INTEGER(bn.get(), X509_get_serialNumber(cert))) failure("serial number");
}

void setCommonName(X509_NAME* name, const char* cn) {
  check(X509_NAME_add_entry_by_txt(name, "O", MBSTRING_ASC, reinterpret_cast<const unsigned char*>("kyn-sim"), -1,
                                   -1, 0),
        "subject name");
  check(X509_NAME_add_entry_by_txt(name, "CN", MBSTRING_ASC, reinterpret_cast<const unsigned char*>(cn), -1, -1, 0),
        "subject name");
}

// Adds one extension given in the crypto library's configuration syntax ("critical,CA:TRUE").
void addExtension(X509* cert, X509* issuer, int nid, const std::string& value) {
  X509V3_CTX ctx;
  X509V3_set_ctx_nodb(&ctx);
  X509V3_set_ctx(&ctx, issuer, cert, nullptr, nullptr, 0);
  X509_EXTENSION* ext = X509V3_EXT_conf_nid(nullptr, &ctx, nid, value.c_str());
  if (!ext) failure(OBJ_nid2sn(nid));
  const int added = X509_add_ext(cert, ext, -1);
  X509_EXTENSION_free(ext);
  check(added, OBJ_nid2sn(nid));
}

X509Ptr newCertificate(EVP_PKEY* key, const char* commonName) {
  X509Ptr cert(X509_new());
  if (!cert) failure("certificate");
  check(X509_set_version(cert.get(), 2), "version");  // X.509 v3
  setRandomSerial(cert.get());
  if (!X509_gmtime_adj(X509_getm_notBefore(cert.get()), -kClockSkewSeconds) ||
      !X509_gmtime_adj(X509_getm_notAfter(cert.get()), kValiditySeconds)) {
    failure("validity");
  }
  check(X509_set_pubkey(cert.get(), key), "public key");
  setCommonName(X509_get_subject_name(cert.get()), commonName);
  return cert;
}

std::string subjectAltName(const std::vector<std::string>& names) {
  std::string san;
  for (const auto& name : names) {
    unsigned char address[16];
    const bool ip = inet_pton(AF_INET, name.c_str(), address) == 1 || inet_pton(AF_INET6, name.c_str(), address) == 1;
    if (!ip) {
      // Host names: letters, digits, "-", "." and a leading "*." wildcard; no room for config syntax.
      const bool plain = !name.empty() && name.find_first_not_of("abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ"
                                                                 "0123456789-.*") == std::string::npos;
      if (!plain) throw std::invalid_argument("not a host name or IP address: \"" + name + "\"");
    }
    if (!san.empty()) san += ',';
    san += (ip ? "IP:" : "DNS:") + name;
  }
  return san;
}

}  // namespace

std::vector<std::string> defaultServerNames() { return {"localhost", "127.0.0.1", "127.0.0.2"}; }

ServerIdentity makeServerIdentity(const std::vector<std::string>& names) {
  if (names.empty()) throw std::invalid_argument("a server certificate needs at least one name");
  const std::string san = subjectAltName(names);

  PKeyPtr caKey = makeP256Key();
  X509Ptr ca = newCertificate(caKey.get(), "kyn-sim throw-away CA");
  check(X509_set_issuer_name(ca.get(), X509_get_subject_name(ca.get())), "issuer");
  addExtension(ca.get(), ca.get(), NID_basic_constraints, "critical,CA:TRUE,pathlen:0");
  addExtension(ca.get(), ca.get(), NID_key_usage, "critical,keyCertSign,cRLSign");
  addExtension(ca.get(), ca.get(), NID_subject_key_identifier, "hash");
  check(X509_sign(ca.get(), caKey.get(), EVP_sha256()), "signing the CA");

  PKeyPtr serverKey = makeP256Key();
  X509Ptr server = newCertificate(serverKey.get(), names.front().c_str());
  check(X509_set_issuer_name(server.get(), X509_get_subject_name(ca.get())), "issuer");
  addExtension(server.get(), ca.get(), NID_basic_constraints, "critical,CA:FALSE");
  addExtension(server.get(), ca.get(), NID_key_usage, "critical,digitalSignature");
  addExtension(server.get(), ca.get(), NID_ext_key_usage, "serverAuth");
  addExtension(server.get(), ca.get(), NID_subject_key_identifier, "hash");
  addExtension(server.get(), ca.get(), NID_authority_key_identifier, "keyid:always");
  addExtension(server.get(), ca.get(), NID_subject_alt_name, san);
  check(X509_sign(server.get(), caKey.get(), EVP_sha256()), "signing the server certificate");

  return ServerIdentity{std::move(ca), std::move(server), std::move(serverKey)};
}

std::string toPem(X509* certificate) {
  std::unique_ptr<BIO, decltype(&BIO_free)> bio(BIO_new(BIO_s_mem()), BIO_free);
  if (!bio || PEM_write_bio_X509(bio.get(), certificate) != 1) failure("PEM");
  char* data = nullptr;
  const long length = BIO_get_mem_data(bio.get(), &data);
  return std::string(data, static_cast<std::size_t>(length));
}

}  // namespace kyn::sim
