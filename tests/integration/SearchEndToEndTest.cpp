// Host → plug-in → libcurl → kyn-sim over real HTTPS on loopback, and back.
#include "Harness.h"

#include <gtest/gtest.h>

#include <algorithm>

namespace kyn::itest {
namespace {

const Json kFriends = Json::parse(R"({"friends": {
    "ada@example.com": {"ageSeconds": 300, "location": {"latitude": 45.5152, "longitude": -122.6784,
        "horizontalAccuracy": 65.0, "labels": [{"label": "Work"}], "address": {"locality": "Portland", "stateCode": "OR"}}},
    "+15035550102": {"ageSeconds": 4000, "location": {"latitude": 43.6532, "longitude": -79.3832,
        "horizontalAccuracy": 20.0, "address": {"locality": "Toronto", "stateCode": "ON"}}},
    "chloe@example.org": {"pending": true}},
  "serverContext": {"minCallbackIntervalInMS": 5000}})");

// Ada's card carries a 2x1 grey picture.
const char* kAdaPicture = "P5\n2 1\n255\n\x10\xF0";
const char* kAdaCard =
    "BEGIN:VCARD\r\nVERSION:3.0\r\nUID:ada-1\r\nFN:Ada Marlowe\r\nN:Marlowe;Ada;;;\r\n"
    "EMAIL;TYPE=HOME:ada@example.com\r\nPHOTO;ENCODING=b;TYPE=PGM:UDUKMiAxCjI1NQoQ8A==\r\nEND:VCARD\r\n";
const char* kBramCard =
    "BEGIN:VCARD\r\nVERSION:3.0\r\nUID:bram-1\r\nFN:Bram Tolliver\r\nN:Tolliver;Bram;;;\r\n"
    "TEL;TYPE=CELL:(503) 555-0102\r\nEND:VCARD\r\n";

class SearchEndToEnd : public ::testing::Test {
 protected:
  void SetUp() override {
    account.addCard("ada.vcf", kAdaCard);
    account.addCard("bram.vcf", kBramCard);
  }
  /// Starts kyn-sim, points the account at it and loads the plug-in.
  void start(std::vector<std::string> simArgs = {}, const Json& config = Json::object()) {
    sim = std::make_unique<Sim>(simDir.path(), kFriends, std::move(simArgs));
    account.write("localhost:" + std::to_string(sim->port()), sim->caFile(), config);
    plugin = std::make_unique<Plugin>();
    plugin->configure(configDir.path());
  }
  void TearDown() override {
    if (plugin) {
      for (const auto& line : plugin->logLines()) {
        EXPECT_EQ(line.find(kToken), std::string::npos) << "the token was logged: " << line;
      }
    }
    plugin.reset();
  }
  /// One search, answered exactly once.
  Json search(const std::vector<std::string>& handles) {
    const auto outcome = plugin->perform(searchFor(handles));
    EXPECT_EQ(outcome.replies, 1);
    return outcome.reply.value_or(Json());
  }

  test::TempDir simDir;
  test::TempDir configDir;
  Account account{configDir.path()};
  std::unique_ptr<Sim> sim;
  std::unique_ptr<Plugin> plugin;
};

TEST_F(SearchEndToEnd, FriendsAreFoundAndNamedFromTheContacts) {
  start();
  Json reply = search({"ada@example.com", "(503) 555-0102"});
  ASSERT_EQ(reply.value("class", ""), "AXKynSearchCompleted") << reply.dump();
  Json locations = reply["kynLocations"];
  ASSERT_EQ(locations.size(), 2u);
  // Ada's handle is the one the assistant sent: its own person stands for her, as it was given.
  EXPECT_EQ(locations[0]["friend"]["object"], Json::parse(R"({"class":"AXPerson",
      "emails":[{"class":"AXEmail","emailAddress":"ada@example.com"}]})"));
  // The server keys Bram by his canonical number, which is not how the assistant held it: he is
  // named from the contacts instead.
  EXPECT_EQ(locations[1]["friend"]["data"], "+15035550102");
  EXPECT_EQ(locations[1]["friend"]["object"]["fullName"], "Bram Tolliver");

  const auto requests = sim->requests();
  ASSERT_EQ(requests.size(), 1u);
  EXPECT_EQ(requests[0]["handles"], Json::parse(R"(["ada@example.com","+15035550102"])"));
  EXPECT_EQ(requests[0]["apiVersion"], "4.0");
}

// A connection cut off or an answer cut short is "service not available", never an empty result;
// the limits of config.json reach the transport.
TEST_F(SearchEndToEnd, EveryFailedExchangeIsServiceNotAvailable) {
  const std::pair<std::vector<std::string>, Json> cases[] = {{{"--fault", "reset"}, Json::object()},
                                                             {{"--fault", "truncate"}, Json::object()},
                                                             {{"--fault", "slow:20000"}, {{"totalTimeoutMs", 700}}},
                                                             {{}, {{"maxResponseBytes", 64}}}};
  for (const auto& [simArgs, config] : cases) {
    start(simArgs, config);
    EXPECT_EQ(search({"ada@example.com"})["errorCode"], 1005) << config.dump();
    plugin.reset();
    sim.reset();
  }
}

TEST_F(SearchEndToEnd, AfterARedirectEveryCommandAndEveryNewProcessGoesToTheNewHost) {
  start({"--canonical-host", "127.0.0.1"});
  for (int command = 0; command < 2; ++command) {
    const auto reply = plugin->performAndWait(searchFor({"ada@example.com"}));
    ASSERT_TRUE(reply) << command;
    EXPECT_EQ((*reply)["class"], "AXKynSearchCompleted") << reply->dump();
  }
  plugin->shutdown();
  EXPECT_EQ(plugin->replyCounts(), (std::vector<int>{1, 1}));

  // A new process with the same configuration.
  const auto cli = runHost(configDir.path(), {"--json", "search", "--friend", "ada@example.com"});
  EXPECT_EQ(cli.status, 0) << cli.output;

  std::vector<std::string> hosts;
  for (const auto& r : sim->requests()) hosts.push_back(r.value("host", ""));
  const std::string port = std::to_string(sim->port());
  EXPECT_EQ(hosts, (std::vector<std::string>{"localhost:" + port, "127.0.0.1:" + port, "127.0.0.1:" + port,
                                             "127.0.0.1:" + port}));
  const auto prefs = Json::parse(test::readFile(configDir.path() / "preferences" / "com.zanto.tessel.kyn.assistant.json"));
  EXPECT_EQ(prefs["RedirectedHostKey"], "127.0.0.1:" + port);
}

TEST_F(SearchEndToEnd, ACommandThatDoesNotParseIsAnsweredOnceAtOnce) {
  start();
  // A visibility or geofence command without its flag would hide the user or switch a fence off.
  const std::string tooLong = searchFor({"ada@example.com"}) + std::string(1u << 20, ' ');
  const std::string notJson = "The command is not a JSON object";
  for (const auto& [bad, reason] : std::vector<std::pair<std::string, std::string>>{
           {"{\"class\":", notJson}, {"[]", notJson}, {"\xFF\xFE", notJson}, {tooLong, notJson},
           {"{\"class\":\"AXKynNothing\"}", "Unknown command class: AXKynNothing"}, {"{}", "The command names no class"},
           {R"({"class":"AXKynVisibilityStateSet"})", R"(The visibility command needs "visible": true or false)"},
           {R"({"class":"AXKynVisibilityStateSet","visible":"yes"})", R"(The visibility command needs "visible": true or false)"},
           {R"({"class":"AXKynGeoFenceSet","geoFenceTrigger":"OnArrival",)"
            R"("friend":{"class":"AXPerson","emails":[{"emailAddress":"ada@example.com"}]}})",
            R"(The geofence command needs "enable": true or false)"}}) {
    const auto outcome = plugin->perform(bad, std::chrono::seconds(1));
    EXPECT_EQ(outcome.replies, 1) << bad.substr(0, 80);
    EXPECT_EQ(outcome.reply, (Json{{"class", "AXCommandFailed"}, {"reason", reason}})) << bad.substr(0, 80);
    EXPECT_TRUE(std::ranges::any_of(plugin->logLines(), [&](const auto& l) { return l.find(reason) != l.npos; }));
  }
  EXPECT_TRUE(sim->requests().empty());
}

// What a C entry point cannot use it refuses with its documented answer, and calls no callback.
TEST_F(SearchEndToEnd, TheEntryPointsRefuseWhatTheyCannotUse) {
  start();
  auto& lib = plugin->library();
  host::Reply box;
  EXPECT_EQ(lib.perform(nullptr, &host::Reply::receive, &box), -1);
  EXPECT_EQ(lib.perform(searchFor({"ada@example.com"}).c_str(), nullptr, &box), -1);
  EXPECT_EQ(lib.setLogLevel(nullptr), -1);
  EXPECT_EQ(lib.setLogLevel("loud"), -1);
  EXPECT_EQ(lib.setLogLevel("info"), 0);
  EXPECT_EQ(lib.configure((configDir.path() / "missing").c_str(), nullptr), -1);
  for (const char* notAnObject : {"[]", "42", "{", "\"x\""}) {
    EXPECT_EQ(lib.describeLocation(notAnObject, 1, nullptr), nullptr) << notAnObject;
    EXPECT_EQ(lib.friendPicture(notAnObject, nullptr, nullptr, nullptr), nullptr) << notAnObject;
  }
  EXPECT_EQ(lib.describeLocation(nullptr, 1, nullptr), nullptr);
  std::string deep = "{}";
  for (int level = 1; level < 65; ++level) deep = "{\"a\":" + deep + "}";  // one level past the limit
  EXPECT_EQ(lib.describeLocation(deep.c_str(), 1, nullptr), nullptr);
  EXPECT_EQ(lib.findPeople(nullptr), nullptr);
  EXPECT_EQ(lib.findPerson(nullptr), nullptr);
  EXPECT_EQ(lib.signIn(nullptr, "u", "h", "t"), KYN_SIGN_IN_BAD_PERSON_ID);
  EXPECT_EQ(lib.signIn("p", "u", nullptr, "t"), KYN_SIGN_IN_BAD_HOST);
  EXPECT_EQ(lib.signIn("p", "u", "h", nullptr), KYN_SIGN_IN_BAD_TOKEN);
  plugin->shutdown();
  EXPECT_EQ(box.count(), 0);
  EXPECT_TRUE(sim->requests().empty());
  // The refused configure left the plug-in as it was: the next command still reaches the server.
  EXPECT_EQ((*plugin->perform(searchFor({"ada@example.com"})).reply)["class"], "AXKynSearchCompleted");
}

TEST_F(SearchEndToEnd, ShuttingDownAnswersACommandInFlight) {
  start({"--fault", "slow:20000"});
  const auto started = std::chrono::steady_clock::now();
  const auto outcome = plugin->perform(searchFor({"ada@example.com"}), std::chrono::seconds(0));
  EXPECT_EQ(outcome.replies, 1);
  EXPECT_EQ((*outcome.reply)["errorCode"], 1005);
  EXPECT_LT(std::chrono::steady_clock::now() - started, std::chrono::seconds(10));
}

// A host may unload the plug-in and load it again in the same process; the libraries it uses (ICU,
// curl) stay loaded meanwhile and must not keep pointers into the unloaded plug-in. What a host shows
// beside a reply comes in the assistant's language: the distance from where the user is (none without
// both places) and the age of the fix; a stranger has no picture.
TEST(PluginReload, TheSecondLoadWorksLikeTheFirst) {
  test::TempDir configDir;
  Account account(configDir.path());
  account.write("localhost:1", std::nullopt);
  account.addCard("ada.vcf", kAdaCard);
  const double threeDaysAgo = std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count() -
                              978'307'200.0 - 3 * 86'400.0;
  Json location = Json::parse(R"({"class":"AXKynLocation","city":"Paris","stateCode":"IDF","latitude":45.5152,
      "longitude":-122.6784,"friend":{"class":"AXPersonAttribute","object":{"class":"AXPerson",
      "emails":[{"emailAddress":"ada@example.com"}]}}})");
  location["locationDate"] = threeDaysAgo;
  for (int load = 0; load < 2; ++load) {
    SCOPED_TRACE("load " + std::to_string(load));
    Plugin plugin;
    plugin.configure(configDir.path(), "de");
    auto& lib = plugin.library();
    auto described = [&](const char* here) {
      char* text = lib.describeLocation(location.dump().c_str(), 1, here);
      EXPECT_NE(text, nullptr);
      const Json out = text ? Json::parse(text) : Json();
      lib.free(text);
      return out;
    };
    const Json withHere = described(R"({"class":"AXLocation","latitude":45.5231,"longitude":-122.6765})");
    EXPECT_EQ(withHere["place"], "Paris, IDF");
    EXPECT_TRUE(withHere.value("distance", "").ends_with(" entfernt")) << withHere.dump();
    EXPECT_TRUE(withHere.value("age", "").starts_with("Vor ")) << withHere.dump();  // German, from ICU
    EXPECT_FALSE(withHere.value("time", "").empty()) << withHere.dump();
    EXPECT_FALSE(described(nullptr).contains("distance"));
    EXPECT_FALSE(described(R"({"class":"AXLocation"})").contains("distance"));  // no coordinate
    std::size_t size = 0;
    Json stranger = location;
    stranger["friend"]["object"]["emails"][0]["emailAddress"] = "stranger@example.net";
    EXPECT_EQ(lib.friendPicture(stranger.dump().c_str(), &size, nullptr, nullptr), nullptr);
    const auto outcome = plugin.perform(searchFor({"ada@example.com"}));  // nothing listens on port 1
    EXPECT_EQ(outcome.replies, 1);
    EXPECT_EQ((*outcome.reply)["errorCode"], 1005);
  }
}

// The command-line host: a name found in the contacts, and an exit status for each kind of failure.
TEST_F(SearchEndToEnd, TheHostNamesFriendsAndTellsFailuresApart) {
  start();
  const auto found = runHost(configDir.path(), {"search", "--friend", "ada marlowe", "--here", "45.5231,-122.6765,30"});
  EXPECT_EQ(found.status, 0) << found.output;
  EXPECT_NE(found.output.find("Ada Marlowe — Work · 45.51520, -122.67840 · "), std::string::npos) << found.output;
  EXPECT_NE(found.output.find(" away\n"), std::string::npos) << found.output;  // the plug-in's distance text
  EXPECT_EQ(sim->requests().back()["handles"], Json::parse(R"(["ada@example.com"])"));

  EXPECT_EQ(runHost(configDir.path(), {"search", "--friend", "Nobody Known"}).status, 2);
  EXPECT_EQ(runHost(configDir.path(), {"search", "--here", "95,1"}).status, 2);
  EXPECT_EQ(runHost(configDir.path() / "missing", {"search"}).status, 2);
  EXPECT_EQ(runHost(configDir.path(), {"--pictures", (configDir.path() / "missing").string(), "search"}).status, 2);

  // Pictures are written as the address book holds them, named after the handle.
  const test::TempDir pictures;
  const auto withPictures = runHost(configDir.path(), {"--pictures", pictures.path().string(), "search", "--friend",
                                                        "ada@example.com", "--friend", "+15035550102"});
  EXPECT_EQ(withPictures.status, 0) << withPictures.output;
  EXPECT_EQ(test::readFile(pictures.path() / "ada@example.com.pnm"), kAdaPicture);
  EXPECT_EQ(std::distance(std::filesystem::directory_iterator(pictures.path()), {}), 1);  // Bram has none

  std::filesystem::remove(configDir.path() / "account.json");
  const auto german = runHost(configDir.path(), {"--language", "de", "search", "--friend", "ada@example.com"});
  EXPECT_EQ(german.status, 1);
  EXPECT_EQ(german.output, "Du bist nicht bei Kyn angemeldet, oder der Server hat die Anmeldung nicht angenommen.\n");
}

// Signing in through the host: the token is read from the input, stored owner-only and never shown.
TEST_F(SearchEndToEnd, TheHostSignsInAndOut) {
  start();
  std::filesystem::remove(configDir.path() / "token");
  host::SpawnOptions input;
  input.input = std::string(kToken) + "\n";
  ASSERT_EQ(runHost(configDir.path(), {"account", "login", "--person-id", kPersonId, "--username", "sam@example.com",
                                       "--host", "localhost:" + std::to_string(sim->port())}, input).status, 0);
  const auto shown = runHost(configDir.path(), {"account", "show"});
  EXPECT_EQ(shown.status, 0);
  EXPECT_EQ(shown.output.find(kToken), std::string::npos);
  EXPECT_EQ(runHost(configDir.path(), {"search", "--friend", "ada@example.com"}).status, 0);
  EXPECT_EQ(runHost(configDir.path(), {"account", "logout"}).status, 0);
  EXPECT_EQ(runHost(configDir.path(), {"search", "--friend", "ada@example.com"}).status, 1);
}

}  // namespace
}  // namespace kyn::itest
