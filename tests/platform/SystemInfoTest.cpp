#include "platform/fs/Files.h"
#include "platform/resources/Resources.h"
#include "platform/sysinfo/LinuxSystemInfo.h"
#include "support/PlatformTest.h"

#include <cstdlib>

namespace kyn::platform {
namespace {

namespace fs = std::filesystem;

class SystemInfoTest : public test::PlatformTest {
 protected:
  void SetUp() override {
    PlatformTest::SetUp();
    ::unsetenv("KYN_APP_TOKEN");
  }
  LinuxSystemInfo info() const {
    return LinuxSystemInfo(LinuxSystemInfo::Paths{configDir->path() / "account.json", configDir->path() / "token",
                                                  configDir->path() / "product_name", configDir->path() / "os-release"});
  }
  std::optional<std::string> token() { return info().ownerAccount()->tokenOfType(0); }
};

TEST_F(SystemInfoTest, AFullAccountFileGivesTheAccountAndItsToken) {
  configDir->write("account.json", R"({"personId":"P7","username":"ada@example.test",
                                       "serviceHost":"kyn.example.test:8443","provisioned":true})");
  configDir->write("token", "  tok-123\n", 0600);
  auto account = info().ownerAccount();
  ASSERT_TRUE(account);
  EXPECT_EQ(std::tuple(account->personId(), account->username(), account->tokenOfType(0), account->hostNameOfType(0)),
            std::tuple("P7", "ada@example.test", "tok-123", "kyn.example.test:8443"));
  EXPECT_FALSE(account->tokenOfType(1) || account->hostNameOfType(1));
  EXPECT_FALSE(log->contains("tok-123"));
}

TEST_F(SystemInfoTest, AccountFilesThatNameNoOne) {
  AccountFileSession fileSession(configDir->path() / "account.json");
  EXPECT_FALSE(info().ownerAccount());  // missing: no error
  EXPECT_FALSE(fileSession.isProvisionedForLocationSharing() || fileSession.isRestricted());
  EXPECT_TRUE(log->messages(LogLevel::Error).empty());
  const std::string tooLarge = R"({"personId":"P7","pad":")" + std::string(64 * 1024, ' ') + "\"}";
  for (const char* text : {"", "{", "[]", "null", "{\"personId\": 12", tooLarge.c_str()}) {
    configDir->write("account.json", text);
    EXPECT_FALSE(info().ownerAccount()) << text;
  }
  // Fields of the wrong type read as absent: the file parses, yet names no one.
  configDir->write("account.json", R"({"personId":42,"username":["a"],"serviceHost":null,"provisioned":"yes"})");
  auto account = info().ownerAccount();
  ASSERT_TRUE(account);
  EXPECT_FALSE(account->personId() || account->username() || account->hostNameOfType(0));
  EXPECT_FALSE(fileSession.isProvisionedForLocationSharing());
  EXPECT_EQ(log->messages(LogLevel::Error).size(), 6u + 3u);  // each bad file, each field of the wrong type

  // The session flags default to provisioned and unrestricted.
  configDir->write("account.json", R"({"personId":"P7"})");
  EXPECT_TRUE(fileSession.isProvisionedForLocationSharing());
  EXPECT_FALSE(fileSession.isRestricted());
  configDir->write("account.json", R"({"personId":"P7","provisioned":false,"restricted":true})");
  EXPECT_FALSE(fileSession.isProvisionedForLocationSharing());
  EXPECT_TRUE(fileSession.isRestricted());
}

TEST_F(SystemInfoTest, OnlyAPrivateRegularTokenFileIsRead) {
  configDir->write("account.json", R"({"personId":"P7"})");
  for (unsigned mode : {0644u, 0640u, 0604u, 0620u}) {
    configDir->write("token", "tok-123", mode);
    EXPECT_FALSE(token()) << std::oct << mode;
  }
  configDir->write("token", "tok-123", 0400);
  EXPECT_EQ(token(), "tok-123");
  configDir->write("token", " \n", 0600);
  EXPECT_FALSE(token());  // an empty token is none
  log->clear();
  configDir->write("token", std::string(4097, 't'), 0600);
  EXPECT_TRUE(!token() && !log->messages(LogLevel::Error).empty());  // too large: refused, and reported
  ::setenv("KYN_APP_TOKEN", "env-token", 1);
  EXPECT_EQ(token(), "env-token");  // the environment wins
  ::unsetenv("KYN_APP_TOKEN");

  fs::remove(configDir->path() / "token");
  log->clear();
  EXPECT_TRUE(!token() && log->messages(LogLevel::Error).empty());  // no file: signed out, nothing to report
  fs::create_symlink(configDir->write("real-token", "tok-456", 0600), configDir->path() / "token");
  EXPECT_TRUE(!token() && !log->messages(LogLevel::Error).empty());  // a link in its place is reported
  fs::remove(configDir->path() / "token");
  fs::create_directory(configDir->path() / "token");
  EXPECT_TRUE(!token() && log->contains("is not a regular file"));
  EXPECT_FALSE(log->contains("tok-123") || log->contains("tok-456"));
}

TEST_F(SystemInfoTest, ATokenReadOnceIsReadAgainWhenItsFileChanges) {
  const auto file = configDir->write("token", "tok-1", 0600);
  const std::time_t later = std::time(nullptr) + 10;  // as if the file had not changed for a while
  EXPECT_EQ(readApplicationToken(file, later), "tok-1");
  configDir->write("token", "tok-2", 0600);
  EXPECT_EQ(readApplicationToken(file, later), "tok-2");
  fs::permissions(file, fs::perms::group_read, fs::perm_options::add);
  EXPECT_FALSE(readApplicationToken(file, later));
}

TEST_F(SystemInfoTest, AReadOnceScopeKeepsItsFirstReadingOfTheAccountAndNoLonger) {
  const auto file = configDir->write("account.json", R"({"personId":"P1"})");
  const auto other = configDir->write("other.json", "{}");
  {
    const AccountFileReadOnce scope;
    EXPECT_EQ(readAccountFile(file)->personId, "P1");
    configDir->write("account.json", R"({"personId":"P2"})");
    {
      const AccountFileReadOnce inner;
    }  // an inner scope's end does not end the outer one
    EXPECT_EQ(readAccountFile(file)->personId, "P1");
    configDir->write("other.json", R"({"personId":"Q2"})");
    EXPECT_EQ(readAccountFile(other)->personId, "Q2");  // another file is read as it is
    EXPECT_EQ(readAccountFile(file)->personId, "P1");
  }
  EXPECT_EQ(readAccountFile(file)->personId, "P2");
}

TEST_F(SystemInfoTest, AFileStampShowsEachChangeOnceSettled) {
  const auto file = configDir->write("f", "one");
  fs::last_write_time(file, fs::file_time_type::clock::now() - std::chrono::hours(1));  // changes its ctime
  EXPECT_FALSE(FileStamp::of(file).settled);  // just changed: a change within the same tick could hide
  const std::time_t later = std::time(nullptr) + 2;
  const auto first = FileStamp::of(file, later);
  EXPECT_TRUE(FileStamp::of(file, later).unchangedSince(first));
  configDir->write("f", "three");
  EXPECT_FALSE(FileStamp::of(file, later).unchangedSince(first));
  fs::last_write_time(file, fs::file_time_type::clock::now() + std::chrono::hours(1));
  const std::time_t modified = FileStamp::of(file).modified();
  EXPECT_FALSE(FileStamp::of(file, modified + 1).settled);  // one second after its last change is not enough
}

TEST_F(SystemInfoTest, DeviceFacts) {
  configDir->write("product_name", "ThinkStation P3\n");
  configDir->write("os-release", "NAME=\"Debian\"\nVERSION_IDX=9\nVERSION_ID='12'\nEMPTY=\"\"\nBUILD_ID=2022-2\n");
  auto facts = info();
  EXPECT_EQ(facts.productType(), "ThinkStation P3");
  EXPECT_EQ(facts.osVersion(), "12");
  EXPECT_EQ(facts.osBuildVersion(), "2022-2");  // no quotes to strip
  EXPECT_FALSE(osReleaseField("EMPTY=\"\"\n", "EMPTY"));
  configDir->write("product_name", "  \n");
  EXPECT_FALSE(facts.productType());
  configDir->write("product_name", std::string(256, 'p'));
  EXPECT_EQ(facts.productType(), std::string(256, 'p'));
  configDir->write("product_name", std::string(257, 'p'));  // longer than any product name: not read
  EXPECT_FALSE(facts.productType());
  configDir->write("os-release", "BUILD_ID=b\n#" + std::string(64 * 1024 - 12, ' '));
  EXPECT_EQ(facts.osBuildVersion(), "b");  // 64 KiB is still read, one byte more is not
  configDir->write("os-release", "BUILD_ID=b\n#" + std::string(64 * 1024 - 11, ' '));
  EXPECT_NE(facts.osBuildVersion().value_or("b"), "b");  // the kernel's release instead
  // An identifier exactly when the machine has an id (a bare chroot may have none).
  ASSERT_EQ(facts.deviceUDID().has_value(), test::readFile("/etc/machine-id").size() >= 32);
  if (auto udid = facts.deviceUDID()) {
    EXPECT_EQ(udid->size(), 36u);
    EXPECT_EQ(*udid, facts.deviceUDID());
    std::string compact;
    for (char c : *udid) {
      if (c != '-') compact += static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
    }
    EXPECT_EQ(test::readFile("/etc/machine-id").find(compact), std::string::npos)
        << "the raw machine id must not leave the machine";
  }
}

TEST(Resources, AreLookedUpBesideTheBinaryThatHoldsTheCode) {
  EXPECT_EQ(resourceDirectory(), fs::canonical("/proc/self/exe").parent_path() / "resources");
}

TEST(SignInCheck, EachFieldIsCheckedInTurn) {
  const SignIn good{"P-1", "sam@example.com", "kyn.example.test:8443", "tok-5f1c"};
  const std::string longText(257, 'a');
  const struct {
    SignIn signIn;
    SignInProblem problem;
  } cases[] = {
      {good, SignInProblem::None},
      {{"", "u", "h", "t"}, SignInProblem::PersonId}, {{" P-1", "u", "h", "t"}, SignInProblem::PersonId},
      {{"P-1 ", "u", "h", "t"}, SignInProblem::PersonId}, {{"P\x01", "u", "h", "t"}, SignInProblem::PersonId},
      {{longText, "u", "h", "t"}, SignInProblem::PersonId}, {{"P-1", "a\x7f", "h", "t"}, SignInProblem::Username},
      {{"P-1", "u", "h", "two words"}, SignInProblem::Token}, {{"P-1", "u", "h", "tab\there"}, SignInProblem::Token},
      {{"P-1", "u", "h", ""}, SignInProblem::Token}, {{"P-1", "u", "h", std::string(4097, 't')}, SignInProblem::Token},
      {{"P-1", "u", "h", std::string(4096, 't')}, SignInProblem::None}};
  for (const auto& c : cases) EXPECT_EQ(checkSignIn(c.signIn), c.problem) << c.signIn.personId << c.signIn.token;

  for (const char* host : {"kyn.example.test", "a-b.example:65535", "127.0.0.1:1", "[::1]:8443", "[::1]", "x"}) {
    EXPECT_EQ(checkSignIn({"P", "u", host, "t"}), SignInProblem::None) << host;
  }
  for (const char* host : {"", "https://x", "x:", "x:0", "x:65536", "x:123456", "x:8a", ":80", ".x", "-x", "x y",
                           "x_y", "[::1", "[]", "[::1]:", "[::1]x", "[g::1]", "[::1]:0"}) {
    EXPECT_EQ(checkSignIn({"P", "u", host, "t"}), SignInProblem::ServiceHost) << host;
  }
  EXPECT_EQ(checkSignIn({"P", "u", std::string(253, 'h'), "t"}), SignInProblem::None);
  EXPECT_EQ(checkSignIn({"P", "u", std::string(254, 'h'), "t"}), SignInProblem::ServiceHost);
}

TEST_F(SystemInfoTest, SigningInWritesBothFilesWholeAndSigningOutRemovesThem) {
  const fs::path dir = configDir->path() / "new" / "config";
  ASSERT_TRUE(writeSignIn(dir, {"P-1", "sam@example.com", "kyn.example.test", "tok-1"}));
  EXPECT_EQ(fs::status(dir).permissions() & fs::perms::all, fs::perms::owner_all);
  EXPECT_EQ(fs::status(dir / "token").permissions() & fs::perms::all, fs::perms::owner_read | fs::perms::owner_write);
  EXPECT_EQ(readApplicationToken(dir / "token"), "tok-1");
  EXPECT_EQ(readAccountFile(dir / "account.json")->serviceHost, "kyn.example.test");

  // Wrong input, or an account file that cannot be replaced, leaves the old account whole.
  EXPECT_FALSE(writeSignIn(dir, {"P-2", "ada@example.com", "https://x", "tok-2"}));
  fs::create_directory(dir / "account.json.new");  // no file can be staged there
  EXPECT_FALSE(writeSignIn(dir, {"P-2", "ada@example.com", "h", "tok-2"}));
  EXPECT_FALSE(log->messages(LogLevel::Error).empty());  // the log says why
  EXPECT_FALSE(fs::exists(dir / "token.new"));
  EXPECT_EQ(readApplicationToken(dir / "token"), "tok-1");
  EXPECT_EQ(readAccountFile(dir / "account.json")->personId, "P-1");
  EXPECT_FALSE(log->contains("tok-"));

  log->clear();  // a folder that cannot be made is reported
  EXPECT_TRUE(!writeSignIn(dir / "token" / "sub", {"P-2", "u", "h", "t"}) && !log->messages(LogLevel::Error).empty());
  EXPECT_TRUE(removeSignIn(dir));
  EXPECT_FALSE(fs::exists(dir / "account.json") || fs::exists(dir / "token"));
  EXPECT_FALSE(removeSignIn(dir));
  configDir->write("new/config/token", "tok-3", 0600);  // half an account is still signed out
  EXPECT_TRUE(removeSignIn(dir));
}

}  // namespace
}  // namespace kyn::platform
