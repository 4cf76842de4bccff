#include "platform/config/Configuration.h"
#include "platform/net/Url.h"
#include "support/PlatformTest.h"

#include <cstdlib>

namespace kyn::platform {
namespace {

using std::chrono::milliseconds;

class ConfigurationTest : public test::PlatformTest {
 protected:
  Configuration withFile(const char* json) {
    configDir->write("config.json", json);
    return Configuration::load(configDir->path());
  }
  std::size_t errors() const { return log->messages(LogLevel::Error).size(); }
};

TEST_F(ConfigurationTest, WithoutAFileEverythingHasItsDefault) {
  const auto c = Configuration::load(configDir->path());
  const auto& dir = configDir->path();
  EXPECT_EQ(std::tuple(c.accountFile(), c.tokenFile(), c.preferencesDirectory(), c.contactsPath()),
            std::tuple(dir / "account.json", dir / "token", dir / "preferences", dir / "contacts"));
  EXPECT_FALSE(c.language() || c.transport().caFile);
  EXPECT_EQ(errors(), 0u);
}

TEST_F(ConfigurationTest, EveryFieldIsReadRelativePathsStartAtTheDirectoryAndTimeLimitsRoundUp) {
  auto c = withFile(R"({"caFile":"certs/ca.pem","contacts":"/srv/book.vcf","language":"de-CH","connectTimeoutMs":250,
                        "totalTimeoutMs":1500.2,"maxResponseBytes":4096,"maxRedirects":0})");
  EXPECT_EQ(c.transport().caFile, configDir->path() / "certs/ca.pem");
  EXPECT_EQ(c.contactsPath(), "/srv/book.vcf");
  EXPECT_EQ(c.language(), "de-CH");
  const auto& t = c.transport();
  EXPECT_EQ(std::tuple(t.connectTimeout, t.totalTimeout, t.maxResponseBytes, t.maxRedirects),
            std::tuple(milliseconds(250), milliseconds(1501), std::size_t{4096}, 0));
  c = withFile(R"({"caFile":"/etc/ca.pem","contacts":"book","maxRedirects":50})");
  EXPECT_EQ(c.transport().caFile, "/etc/ca.pem");
  EXPECT_EQ(c.contactsPath(), configDir->path() / "book");
  EXPECT_EQ(c.transport().maxRedirects, 50);
  c = withFile(R"({"connectTimeoutMs": 0, "totalTimeoutMs": 0.4})");  // curl reads 0 ms as no limit at all
  EXPECT_EQ(std::tuple(c.transport().connectTimeout, c.transport().totalTimeout), std::tuple(milliseconds(1), milliseconds(1)));
  EXPECT_EQ(errors(), 0u);
}

TEST_F(ConfigurationTest, AFieldOfTheWrongTypeOrOutOfRangeKeepsItsDefaultAndIsLogged) {
  const TransportSettings defaults;
  const auto c = withFile(R"({"caFile":7,"contacts":["a"],"language":null,"connectTimeoutMs":"250",
                              "totalTimeoutMs":-5,"maxResponseBytes":0,"maxRedirects":51})");
  EXPECT_FALSE(c.transport().caFile || c.language());
  EXPECT_EQ(c.contactsPath(), configDir->path() / "contacts");
  const auto& t = c.transport();
  EXPECT_EQ(std::tuple(t.connectTimeout, t.totalTimeout, t.maxResponseBytes, t.maxRedirects),
            std::tuple(defaults.connectTimeout, defaults.totalTimeout, defaults.maxResponseBytes, defaults.maxRedirects));
  EXPECT_EQ(errors(), 7u);
  for (const char* text : {R"({"maxRedirects":-1})", R"({"maxResponseBytes":1e13})", R"({"connectTimeoutMs":1e12})"}) {
    (void)withFile(text);
  }
  EXPECT_EQ(errors(), 10u);
  EXPECT_EQ(withFile("[1]").transport().maxRedirects, defaults.maxRedirects);
  EXPECT_EQ(withFile("{\"language\":").contactsPath(), configDir->path() / "contacts");
  EXPECT_EQ(errors(), 12u);
  const std::string large = R"({"language":"de","padding":")" + std::string(1u << 20, ' ') + "\"}";
  EXPECT_FALSE(withFile(large.c_str()).language());  // over 1 MiB: not read, and said so
  EXPECT_EQ(errors(), 13u);
}

// A host that configures another directory must not keep writing into the first one, nor keep
// reading the first one's contacts.
TEST_F(ConfigurationTest, AnotherDirectoryBringsItsOwnPreferencesAndContacts) {
  services().preferences.get()->setValue("d", "k", Value("first"));
  services().preferences.get()->synchronize("d");
  test::TempDir second;
  second.write("contacts/s.vcf", test::vcard("UID:s\r\nEMAIL:s@example.com\r\n"));
  services().configure(second.path());
  EXPECT_FALSE(services().preferences.get()->value("d", "k"));
  EXPECT_EQ(services().contactStore.get()->unifiedContactsMatchingEmailAddress("s@example.com", {}, nullptr).size(), 1u);
  services().configure(configDir->path());
  EXPECT_EQ(services().preferences.get()->value("d", "k"), Value("first"));
}

TEST(ConfigurationDirectory, XdgThenHomeThenTheWorkingDirectory) {
  const auto saved = [](const char* name) -> std::optional<std::string> {
    const char* v = std::getenv(name);
    return v ? std::optional<std::string>(v) : std::nullopt;
  };
  const auto xdg = saved("XDG_CONFIG_HOME"), home = saved("HOME");
  ::setenv("XDG_CONFIG_HOME", "/x/config", 1);
  ::setenv("HOME", "/home/sam", 1);
  EXPECT_EQ(Configuration::defaultDirectory(), "/x/config/kyn-assistant");
  ::setenv("XDG_CONFIG_HOME", "relative", 1);  // only an absolute path counts
  EXPECT_EQ(Configuration::defaultDirectory(), "/home/sam/.config/kyn-assistant");
  ::unsetenv("XDG_CONFIG_HOME");
  ::unsetenv("HOME");
  EXPECT_EQ(Configuration::defaultDirectory(), "kyn-assistant");
  for (const auto& [name, value] : {std::pair{"XDG_CONFIG_HOME", xdg}, std::pair{"HOME", home}}) {
    if (value) ::setenv(name, value->c_str(), 1);
  }
}

// The stored redirect host must name the port the server answered on, and never the scheme's
// default, which a command's host leaves out.
TEST(AuthorityOf, KeepsOnlyAPortThatIsNotTheDefault) {
  const std::pair<const char*, std::optional<std::string>> cases[] = {
      {"https://kyn.example.test:8443/kytrservice/friends/va/getlocations", "kyn.example.test:8443"},
      {"https://kyn.example.test:443/x", "kyn.example.test"},
      {"https://kyn.example.test/x", "kyn.example.test"},
      {"https://[::1]:8443/", "[::1]:8443"},
      {"not a url", std::nullopt},
  };
  for (const auto& [url, authority] : cases) EXPECT_EQ(authorityOf(url), authority) << url;
}

}  // namespace
}  // namespace kyn::platform
