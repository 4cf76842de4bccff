#include "sim/Certificates.h"

#include <gtest/gtest.h>

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

  static inline ServerIdentity* identity_ = nullptr;
};

TEST_F(CertificatesTest, TheServerCertificateNamesTheLoopbackHostsAndTheExtraOnes) {
  X509* cert = identity_->serverCertificate.get();
  for (const auto& [host, named] : {std::pair{"localhost", 1}, {"sim.example.org", 1}, {"other.example.org", 0}}) {
    EXPECT_EQ(X509_check_host(cert, host, 0, 0, nullptr), named) << host;
  }
  for (const auto& [ip, named] : {std::pair{"127.0.0.1", 1}, {"127.0.0.2", 1}, {"::1", 1}, {"127.0.0.3", 0}}) {
    EXPECT_EQ(X509_check_ip_asc(cert, ip, 0), named) << ip;
  }
}

TEST_F(CertificatesTest, NamesThatAreNeitherHostNorAddressAreRefused) {
  EXPECT_THROW((void)makeServerIdentity({}), std::invalid_argument);
  EXPECT_THROW((void)makeServerIdentity({"localhost,IP:10.0.0.1"}), std::invalid_argument);
  EXPECT_THROW((void)makeServerIdentity({"bad host"}), std::invalid_argument);
}

}  // namespace
}  // namespace kyn::sim
