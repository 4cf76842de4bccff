#include "platform/config/Configuration.h"
#include "platform/net/Url.h"
#include "support/PlatformTest.h"

namespace kyn::platform {
namespace {

// The stored redirect host must name the port the server answered on, and never the scheme's
// default, which a command's host leaves out.
TEST(AuthorityOf, KeepsOnlyAPortThatIsNotTheDefault) {
  const std::vector<std::pair<std::string, std::optional<std::string>>> cases = {
      {"https://kyn.example.test:8443/kytrservice/friends/va/getlocations", "kyn.example.test:8443"},
      {"https://kyn.example.test:443/x", "kyn.example.test"},
      {"https://kyn.example.test/x", "kyn.example.test"},
      {"https://[::1]:8443/", "[::1]:8443"},
      {"not a url", std::nullopt},
  };
  for (const auto& [url, authority] : cases) EXPECT_EQ(authorityOf(url), authority) << url;
}

class TransportConfigurationTest : public test::PlatformTest {};

// libcurl reads a time limit of 0 ms as no limit at all.
TEST_F(TransportConfigurationTest, TimeLimitsBelowAMillisecondRoundUpAndNegativeOnesAreRefused) {
  configDir->write("config.json", R"({"connectTimeoutMs": 0, "totalTimeoutMs": 0.4})");
  const auto rounded = Configuration::load(configDir->path()).transport();
  EXPECT_EQ(rounded.connectTimeout, std::chrono::milliseconds(1));
  EXPECT_EQ(rounded.totalTimeout, std::chrono::milliseconds(1));
  EXPECT_TRUE(log->messages(LogLevel::Error).empty());

  configDir->write("config.json", R"({"totalTimeoutMs": -5})");
  EXPECT_EQ(Configuration::load(configDir->path()).transport().totalTimeout, TransportSettings{}.totalTimeout);
  EXPECT_FALSE(log->messages(LogLevel::Error).empty());
}

}  // namespace
}  // namespace kyn::platform
