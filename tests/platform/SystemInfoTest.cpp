#include "platform/sysinfo/LinuxSystemInfo.h"
#include "support/PlatformTest.h"

#include <unistd.h>

#include <cstdlib>
#include <fstream>

namespace kyn::platform {
namespace {

class SystemInfoTest : public test::PlatformTest {
 protected:
  void SetUp() override {
    PlatformTest::SetUp();
    ::unsetenv("KYN_APP_TOKEN");
  }
  void TearDown() override {
    ::unsetenv("KYN_APP_TOKEN");
    PlatformTest::TearDown();
  }
  LinuxSystemInfo info() const {
    return LinuxSystemInfo(LinuxSystemInfo::Paths{configDir->path() / "account.json", configDir->path() / "token",
                                                  configDir->path() / "product_name", configDir->path() / "os-release"});
  }
};

TEST_F(SystemInfoTest, AFullAccountFileGivesTheAccountAndItsToken) {
  configDir->write("account.json",
                   R"({"personId":"P7","username":"ada@example.test","serviceHost":"kyn.example.test:8443",
                       "provisioned":true,"restricted":false})");
  configDir->write("token", "  tok-123\n", 0600);
  auto account = info().ownerAccount();
  ASSERT_TRUE(account);
  EXPECT_EQ(account->personId(), "P7");
  EXPECT_EQ(account->username(), "ada@example.test");
  EXPECT_EQ(account->tokenOfType(0), "tok-123");
  EXPECT_EQ(account->hostNameOfType(0), "kyn.example.test:8443");
  EXPECT_FALSE(account->tokenOfType(1));
  EXPECT_FALSE(account->hostNameOfType(1));
  EXPECT_FALSE(log->contains("tok-123"));
}

TEST_F(SystemInfoTest, MissingEmptyOrMalformedAccountFilesMeanNoAccount) {
  EXPECT_FALSE(info().ownerAccount());  // missing: no log line
  EXPECT_TRUE(logMessages().empty());
  for (const char* text : {"", "{", "[]", "\"text\"", "null", "{\"personId\": 12"}) {
    configDir->write("account.json", text);
    EXPECT_FALSE(info().ownerAccount()) << text;
  }
  EXPECT_TRUE(log->contains("is not a JSON object"));
}

TEST_F(SystemInfoTest, FieldsOfTheWrongTypeReadAsAbsent) {
  configDir->write("account.json", R"({"personId":42,"username":["a"],"serviceHost":null,"provisioned":"yes"})");
  auto account = info().ownerAccount();
  ASSERT_TRUE(account);  // the file exists and parses; it just names no one
  EXPECT_FALSE(account->personId());
  EXPECT_FALSE(account->username());
  EXPECT_FALSE(account->hostNameOfType(0));
  EXPECT_TRUE(log->contains("field personId has the wrong type"));
  AccountFileSession fileSession(configDir->path() / "account.json");
  EXPECT_FALSE(fileSession.isProvisionedForLocationSharing());  // no person, nothing provisioned
}

TEST_F(SystemInfoTest, ATokenFileThatOthersCanReadIsRefused) {
  configDir->write("account.json", R"({"personId":"P7"})");
  for (unsigned mode : {0644u, 0640u, 0604u, 0620u}) {
    configDir->write("token", "tok-123", mode);
    EXPECT_FALSE(info().ownerAccount()->tokenOfType(0)) << std::oct << mode;
  }
  EXPECT_TRUE(log->contains("may be read by others"));
  EXPECT_FALSE(log->contains("tok-123"));
  configDir->write("token", "tok-123", 0400);
  EXPECT_EQ(info().ownerAccount()->tokenOfType(0), "tok-123");
}

TEST_F(SystemInfoTest, TokenFromTheEnvironmentWinsAndEmptyTokensAreNone) {
  configDir->write("account.json", R"({"personId":"P7"})");
  configDir->write("token", " \n", 0600);
  EXPECT_FALSE(info().ownerAccount()->tokenOfType(0));
  ::setenv("KYN_APP_TOKEN", "env-token", 1);
  EXPECT_EQ(info().ownerAccount()->tokenOfType(0), "env-token");
}

TEST_F(SystemInfoTest, ATokenThatIsADirectoryOrASymlinkIsRefused) {
  configDir->write("account.json", R"({"personId":"P7"})");
  const auto real = configDir->write("real-token", "tok", 0600);
  std::filesystem::create_symlink(real, configDir->path() / "token");
  EXPECT_FALSE(info().ownerAccount()->tokenOfType(0));
  std::filesystem::remove(configDir->path() / "token");
  std::filesystem::create_directory(configDir->path() / "token");
  EXPECT_FALSE(info().ownerAccount()->tokenOfType(0));
}

TEST_F(SystemInfoTest, SessionFlagsDefaultToProvisionedAndUnrestricted) {
  AccountFileSession fileSession(configDir->path() / "account.json");
  EXPECT_FALSE(fileSession.isProvisionedForLocationSharing());
  EXPECT_FALSE(fileSession.isRestricted());
  configDir->write("account.json", R"({"personId":"P7"})");
  EXPECT_TRUE(fileSession.isProvisionedForLocationSharing());
  EXPECT_FALSE(fileSession.isRestricted());
  configDir->write("account.json", R"({"personId":"P7","provisioned":false,"restricted":true})");
  EXPECT_FALSE(fileSession.isProvisionedForLocationSharing());
  EXPECT_TRUE(fileSession.isRestricted());
}

TEST_F(SystemInfoTest, DeviceFacts) {
  configDir->write("product_name", "ThinkStation P3\n");
  configDir->write("os-release", "NAME=\"Debian GNU/Linux\"\nVERSION_ID=\"12\"\nBUILD_ID=rolling\n");
  auto facts = info();
  EXPECT_EQ(facts.productType(), "ThinkStation P3");
  EXPECT_EQ(facts.osVersion(), "12");
  EXPECT_EQ(facts.osBuildVersion(), "rolling");
  configDir->write("product_name", "  \n");
  EXPECT_FALSE(facts.productType());
  if (auto udid = facts.deviceUDID()) {  // needs a machine id
    EXPECT_EQ(udid->size(), 36u);
    EXPECT_EQ(*udid, facts.deviceUDID());
    std::ifstream machine("/etc/machine-id");
    std::string raw;
    machine >> raw;
    std::string compact;
    for (char c : *udid) {
      if (c != '-') compact += static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
    }
    EXPECT_NE(compact, raw) << "the raw machine id must not leave the machine";
  }
}

TEST(OsRelease, Fields) {
  const char* text = "A=1\nVERSION_ID='10.15.7'\nEMPTY=\"\"\nVERSION_IDX=9\n";
  EXPECT_EQ(osReleaseField(text, "VERSION_ID"), "10.15.7");
  EXPECT_FALSE(osReleaseField(text, "EMPTY"));
  EXPECT_FALSE(osReleaseField(text, "VERSION"));
  EXPECT_EQ(osReleaseField(text, "A"), "1");
}

}  // namespace
}  // namespace kyn::platform
