#include "sim/Certificates.h"

#include <gtest/gtest.h>

#include <openssl/bio.h>
#include <openssl/ec.h>
#include <openssl/pem.h>
#include <openssl/x509_vfy.h>
#include <openssl/x509v3.h>

namespace kyn::sim {
namespace {

class CertificatesTest : public ::testing::Test {
 protected:
  static void SetUpTestSuite() {
    std::vector<std::string> names = defaultServerNames();
    names.push_back("sim.example.org");
    names.push_back("::1");
    identity_ = new ServerIdentity(makeServerIdentity(names));
  }
  static void TearDownTestSuite() { delete identity_; }

  // Verifies the server certificate against a store that trusts only the CA (read back from PEM).
  static int verify(X509* server, X509* caFromPem) {
    std::unique_ptr<X509_STORE, decltype(&X509_STORE_free)> store(X509_STORE_new(), X509_STORE_free);
    X509_STORE_add_cert(store.get(), caFromPem);
    std::unique_ptr<X509_STORE_CTX, decltype(&X509_STORE_CTX_free)> ctx(X509_STORE_CTX_new(), X509_STORE_CTX_free);
    X509_STORE_CTX_init(ctx.get(), store.get(), server, nullptr);
    X509_STORE_CTX_set_purpose(ctx.get(), X509_PURPOSE_SSL_SERVER);
    X509_verify_cert(ctx.get());
    return X509_STORE_CTX_get_error(ctx.get());
  }

  static inline ServerIdentity* identity_ = nullptr;
};

X509Ptr fromPem(const std::string& pem) {
  std::unique_ptr<BIO, decltype(&BIO_free)> bio(BIO_new_mem_buf(pem.data(), static_cast<int>(pem.size())), BIO_free);
  return X509Ptr(PEM_read_bio_X509(bio.get(), nullptr, nullptr, nullptr));
}

TEST_F(CertificatesTest, TheServerCertificateChainsToTheWrittenCA) {
  const std::string pem = toPem(identity_->caCertificate.get());
  EXPECT_EQ(pem.rfind("-----BEGIN CERTIFICATE-----\n", 0), 0u);
  const X509Ptr ca = fromPem(pem);
  ASSERT_TRUE(ca);
  EXPECT_EQ(verify(identity_->serverCertificate.get(), ca.get()), X509_V_OK);
  EXPECT_EQ(X509_check_private_key(identity_->serverCertificate.get(), identity_->serverKey.get()), 1);

  // A CA of another run is no good: every start makes its own.
  const ServerIdentity other = makeServerIdentity(defaultServerNames());
  EXPECT_NE(verify(identity_->serverCertificate.get(), other.caCertificate.get()), X509_V_OK);
}

TEST_F(CertificatesTest, TheServerCertificateNamesTheLoopbackHostsAndTheExtraOnes) {
  X509* cert = identity_->serverCertificate.get();
  EXPECT_EQ(X509_check_host(cert, "localhost", 0, 0, nullptr), 1);
  EXPECT_EQ(X509_check_host(cert, "sim.example.org", 0, 0, nullptr), 1);
  EXPECT_EQ(X509_check_host(cert, "other.example.org", 0, 0, nullptr), 0);
  EXPECT_EQ(X509_check_ip_asc(cert, "127.0.0.1", 0), 1);
  EXPECT_EQ(X509_check_ip_asc(cert, "127.0.0.2", 0), 1);
  EXPECT_EQ(X509_check_ip_asc(cert, "::1", 0), 1);
  EXPECT_EQ(X509_check_ip_asc(cert, "127.0.0.3", 0), 0);
}

TEST_F(CertificatesTest, KeysAreP256AndSignaturesSha256) {
  for (X509* cert : {identity_->caCertificate.get(), identity_->serverCertificate.get()}) {
    EXPECT_EQ(X509_get_signature_nid(cert), NID_ecdsa_with_SHA256);
    EVP_PKEY* key = X509_get0_pubkey(cert);
    char group[32] = {};
    EVP_PKEY_get_group_name(key, group, sizeof group, nullptr);
    EXPECT_STREQ(group, "prime256v1");
  }
  EXPECT_EQ(X509_check_ca(identity_->caCertificate.get()), 1);
  EXPECT_EQ(X509_check_ca(identity_->serverCertificate.get()), 0);
}

TEST_F(CertificatesTest, NamesThatAreNeitherHostNorAddressAreRefused) {
  EXPECT_THROW((void)makeServerIdentity({}), std::invalid_argument);
  EXPECT_THROW((void)makeServerIdentity({"localhost,IP:10.0.0.1"}), std::invalid_argument);
  EXPECT_THROW((void)makeServerIdentity({"bad host"}), std::invalid_argument);
}

}  // namespace
}  // namespace kyn::sim
