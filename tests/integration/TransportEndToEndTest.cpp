// The HTTPS transport against kyn-sim: why each failed exchange failed, which redirects count, and
// on which thread a command is answered. The transport is driven directly where the test needs to
// see the command, and through the loaded plug-in where the test needs the stored host or the reply.
#include "Harness.h"

#include "platform/net/ServerInteractionController.h"
#include "platform/notify/NotificationCenter.h"

#include <gtest/gtest.h>

#include <atomic>
#include <thread>

namespace kyn::itest {
namespace {

using platform::KYTransferError;
using namespace std::chrono_literals;

constexpr const char* kPath = "/kytrservice/friends/va/getlocations";
const Json kNoFriends = Json::parse(R"({"friends": {}})");

std::string localhost(int port) { return "localhost:" + std::to_string(port); }
// A privileged port on which nothing listens: connections to it are refused.
const std::string kNothingListens = localhost(1);

/// A get-locations request with the test account's credentials, for the transport alone.
class Probe final : public platform::KYJSONCommand {
 public:
  explicit Probe(std::string host) {
    setHost(std::move(host));
    setUsername(kPersonId);
    setPassword(kToken);
  }
  [[nodiscard]] std::string path() const override { return kPath; }
  [[nodiscard]] kyn::Value jsonBodyDictionary() const override {
    return {{"clientContext", kyn::Value::object()}};
  }
};

/// What one exchange ended with, as its completion saw it.
struct Ended {
  std::shared_ptr<Probe> command;
  int completions = 0, redirectNotices = 0;
  bool answeredOnCallerThread = false;
  bool answeredBeforeShutdown = false;  // not only when the controller went, which answers everything
};

/// Sends one command with a controller of its own. With `waitForAnswer`, waits for the completion
/// before the controller goes; otherwise the controller goes at once, taking the exchange with it.
Ended exchange(const std::string& host, const platform::TransportSettings& settings, bool waitForAnswer = true) {
  Ended ended{std::make_shared<Probe>(host)};
  std::mutex mutex;
  std::condition_variable answered;
  auto& center = platform::NotificationCenter::defaultCenter();
  const auto observer = center.addObserver(std::string(platform::KYCommandRedirectedNotification),
                                           [&](const platform::Notification& n) {
                                             std::lock_guard lock(mutex);
                                             if (n.object == ended.command) ++ended.redirectNotices;
                                           });
  {
    auto controller = platform::makeServerInteractionController(settings);
    const auto caller = std::this_thread::get_id();
    controller->sendCommand(ended.command, [&] {
      std::lock_guard lock(mutex);
      ++ended.completions;
      ended.answeredOnCallerThread = std::this_thread::get_id() == caller;
      answered.notify_all();
    });
    if (waitForAnswer) {
      std::unique_lock lock(mutex);
      ended.answeredBeforeShutdown = answered.wait_for(lock, 60s, [&] { return ended.completions > 0; });
    }
  }  // the controller ends its network thread: every completion there will be has run
  center.removeObserver(observer);
  ended.command->setCompletionBlock(nullptr);
  return ended;
}

// Behind every "service not available" there is a reason that tells a wrong host from an expired
// certificate. Each is answered on the network thread, also when no exchange took place.
TEST(TransportEndToEnd, EachFailedExchangeSaysWhy) {
  struct Case {
    const char* name;
    std::vector<std::string> simArgs = {};
    KYTransferError expected;
    std::optional<std::int64_t> http = {};
    std::optional<std::string> host = {};  // instead of the simulator's
    const char* detail = "";                // in curl's own words, which say more than its error code
    bool trustSim = true;
    bool cutShort = false;  // the controller goes while the exchange runs
    std::size_t maxResponseBytes = 1u << 20;
    std::chrono::milliseconds totalTimeout = 15s;
  };
  test::TempDir bodies;  // gzip packs 4 KiB of blanks into a few dozen bytes: the limit is on what is unpacked
  const auto packed = bodies.write("packed.json", std::string(4096, ' ') + "{}");
  const std::vector<Case> cases = {
      {.name = "no host", .expected = KYTransferError::NoHost, .host = ""},
      {.name = "nothing listens", .expected = KYTransferError::Refused, .host = kNothingListens, .detail = "port"},
      // 0 ms would be no limit at all to curl: the slow answer would come after 20 s.
      {.name = "a limit of 0 ms", .simArgs = {"--fault", "slow:20000"}, .expected = KYTransferError::TimedOut,
       .totalTimeout = 0ms},
      {.name = "untrusted certificate", .expected = KYTransferError::TLS, .trustSim = false},
      {.name = "kyn-sim's 99 bytes, 98 allowed", .expected = KYTransferError::ResponseTooLarge, .maxResponseBytes = 98},
      {.name = "kyn-sim's 99 bytes, 99 allowed", .expected = KYTransferError::None, .http = 200, .maxResponseBytes = 99},
      {.name = "too large unpacked", .simArgs = {"--fault", "body:" + packed.string()},
       .expected = KYTransferError::ResponseTooLarge, .maxResponseBytes = 1024},
      {.name = "server error", .simArgs = {"--fault", "status:503"}, .expected = KYTransferError::HTTPStatus,
       .http = 503},
      {.name = "shut down", .simArgs = {"--fault", "slow:20000"}, .expected = KYTransferError::Cancelled,
       .cutShort = true},
  };
  const auto log = std::make_shared<platform::CaptureLogSink>();
  const auto previousSink = platform::Log::shared().setSink(log);
  for (const auto& c : cases) {
    log->clear();
    test::TempDir dir;
    Sim sim(dir.path(), kNoFriends, c.simArgs);
    platform::TransportSettings settings;
    if (c.trustSim) settings.caFile = sim.caFile();
    settings.maxResponseBytes = c.maxResponseBytes;
    settings.totalTimeout = c.totalTimeout;
    const auto ended = exchange(c.host.value_or(localhost(sim.port())), settings, !c.cutShort);
    const auto& command = *ended.command;
    EXPECT_EQ(ended.completions, 1) << c.name;
    EXPECT_FALSE(ended.answeredOnCallerThread) << c.name;
    EXPECT_EQ(ended.answeredBeforeShutdown, !c.cutShort) << c.name;
    EXPECT_EQ(command.transferError(), c.expected) << c.name << ": " << command.transferErrorDetail();
    EXPECT_NE(command.transferErrorDetail().find(c.detail), std::string::npos) << c.name;
    EXPECT_EQ(command.wasSuccessful(), c.expected == KYTransferError::None) << c.name;
    if (c.http) {
      EXPECT_EQ(command.response() ? command.response()->statusCode : 0, *c.http) << c.name;
    }
    EXPECT_FALSE(command.wasRedirected()) << c.name;
    EXPECT_EQ(log->contains("failed: " + std::string(describeTransferError(c.expected))), c.expected != KYTransferError::None) << c.name;
  }
  platform::Log::shared().setSink(previousSink);
}

// The host a server redirects to is stored and serves every later command, so a redirect counts (and
// is announced) only when that host answered over verified TLS.
TEST(TransportEndToEnd, ARedirectCountsOnlyWhenTheNewHostAnswered) {
  test::TempDir targetDir;
  Sim target(targetDir.path(), kNoFriends);  // answers every request: "no friends"
  const std::string toTarget = "https://" + localhost(target.port()) + kPath;
  struct Case {
    const char* name;
    std::vector<std::string> simArgs = {};
    KYTransferError expected;
    bool counts = false;
    bool trustTarget = true;
    long maxRedirects = 5;
  };
  const std::vector<Case> cases = {
      {.name = "moved for good (301), the POST kept", .simArgs = {"--fault", "moved:" + toTarget},
       .expected = KYTransferError::None, .counts = true},
      {.name = "to a closed port",
       .simArgs = {"--fault", "redirect:https://" + kNothingListens + kPath},
       .expected = KYTransferError::Refused},
      {.name = "to plain http", .simArgs = {"--fault", "redirect:http://" + localhost(target.port()) + kPath},
       .expected = KYTransferError::RedirectRefused},
      {.name = "to an untrusted certificate", .simArgs = {"--fault", "redirect:" + toTarget},
       .expected = KYTransferError::TLS, .trustTarget = false},
      // Off to 127.0.0.1, which answers with a redirect to itself, again and again.
      {.name = "in a loop", .simArgs = {"--canonical-host", "127.0.0.1", "--fault", std::string("redirect:") + kPath},
       .expected = KYTransferError::RedirectRefused},
      {.name = "more often than allowed",
       .simArgs = {"--canonical-host", "127.0.0.1", "--fault", "redirect:" + toTarget},
       .expected = KYTransferError::RedirectRefused, .maxRedirects = 1},
  };
  for (const auto& c : cases) {
    test::TempDir simDir;
    test::TempDir configDir;
    Sim sim(simDir.path(), kNoFriends, c.simArgs);
    const std::string targetCa = c.trustTarget ? test::readFile(target.caFile()) : "";
    platform::TransportSettings settings;
    settings.caFile = configDir.write("trusted.pem", test::readFile(sim.caFile()) + targetCa);
    settings.maxRedirects = c.maxRedirects;
    const auto ended = exchange(localhost(sim.port()), settings);
    const auto& command = *ended.command;
    EXPECT_EQ(ended.completions, 1) << c.name;
    EXPECT_EQ(command.transferError(), c.expected) << c.name << ": " << command.transferErrorDetail();
    EXPECT_EQ(command.wasRedirected(), c.counts) << c.name;
    EXPECT_EQ(ended.redirectNotices, c.counts ? 1 : 0) << c.name;
    if (c.counts) {
      EXPECT_EQ(command.redirectedHostname(), localhost(target.port())) << c.name;
    }

  }
}

// A host may wait on a lock inside its reply callback that it holds around kyn_plugin_perform: a
// command that reaches the data source must be answered on the network thread, after the call.
TEST(TransportEndToEnd, ACommandSentOnIsAnsweredAfterPerformReturns) {
  struct Box {
    std::mutex mutex;
    std::condition_variable changed;
    bool performReturned = false, replied = false, afterReturn = false;
    std::thread::id thread;
    Json reply;
  };
  auto receive = [](const char* json, void* context) {
    auto* box = static_cast<Box*>(context);
    std::unique_lock lock(box->mutex);
    // Answered inside the call, this wait would give up: the caller cannot return meanwhile.
    box->afterReturn = box->changed.wait_for(lock, 10s, [&] { return box->performReturned; });
    box->thread = std::this_thread::get_id();
    box->reply = Json::parse(json);
    box->replied = true;
    box->changed.notify_all();
  };
  for (const std::string& host : {std::string(), kNothingListens}) {
    test::TempDir configDir;
    Account(configDir.path()).write(host, std::nullopt);
    Plugin plugin;
    plugin.configure(configDir.path());
    Box box;
    ASSERT_EQ(plugin.library().perform(searchFor({"ada@example.com"}).c_str(), receive, &box), 0);
    std::unique_lock lock(box.mutex);
    box.performReturned = true;
    box.changed.notify_all();
    ASSERT_TRUE(box.changed.wait_for(lock, 30s, [&] { return box.replied; })) << host;
    EXPECT_TRUE(box.afterReturn) << host;
    EXPECT_NE(box.thread, std::this_thread::get_id()) << host;
    EXPECT_EQ(box.reply["errorCode"], 1005) << host;
  }
}

// A command that ends while it is sent (curl cannot read its host) must wake the network thread,
// idle after an answer, to be answered.
TEST(TransportEndToEnd, ACommandThatEndsAsItIsSentIsAnswered) {
  test::TempDir dir;
  Sim sim(dir.path(), kNoFriends);
  platform::TransportSettings settings;
  settings.caFile = sim.caFile();
  std::mutex mutex;
  std::condition_variable answered;
  int completions = 0;
  const auto controller = platform::makeServerInteractionController(settings);  // goes first
  for (const std::string& host : {localhost(sim.port()), std::string("bad host")}) {
    const auto command = std::make_shared<Probe>(host);
    controller->sendCommand(command, [&] {
      std::lock_guard lock(mutex);
      ++completions;
      answered.notify_all();
    });
    std::unique_lock lock(mutex);
    ASSERT_TRUE(answered.wait_for(lock, 30s, [&] { return completions == (host == "bad host" ? 2 : 1); })) << host;
    EXPECT_EQ(command->wasSuccessful(), host != "bad host") << host;
  }
}

// The time limit ends an exchange that stalls on a kept-alive connection, where no socket wakes
// the network thread: only the timer can.
TEST(TransportEndToEnd, TheTimeLimitEndsAStalledExchange) {
  test::TempDir simDir, configDir;
  Sim sim(simDir.path(), kNoFriends, {"--fault", "slow:60000", "--fault-path", "getlocations"});
  // Room enough for the first exchange and its handshake, under the sanitizers too.
  Account(configDir.path()).write(localhost(sim.port()), sim.caFile(), {{"totalTimeoutMs", 2000}});
  Plugin plugin;
  plugin.configure(configDir.path());
  const auto shown = plugin.performAndWait(R"({"class":"AXKynVisibilityStateSet","visible":true})");
  ASSERT_TRUE(shown);
  EXPECT_EQ((*shown)["class"], "AXKynVisibilitySetCompleted") << shown->dump();
  const auto search = plugin.performAndWait(searchFor({"ada@example.com"}));
  ASSERT_TRUE(search);
  EXPECT_EQ((*search)["errorCode"], 1005);
}

// Host threads may call perform at once (the thread sanitizer build watches this one): every
// command gets exactly its own one reply, whether it is refused in the call or answered on the
// network thread (nothing listens at the account's host).
TEST(TransportEndToEnd, SeveralHostThreadsPerformAtOnce) {
  test::TempDir configDir;
  Account(configDir.path()).write(kNothingListens, std::nullopt);
  Plugin plugin;
  plugin.configure(configDir.path());
  const std::pair<std::string, std::string> commands[] = {
      {searchFor({"ada@example.com"}), R"({"class":"AXCommandFailed","errorCode":1005})"},
      {R"({"class":"AXKynVisibilityStateSet","visible":false})", R"({"class":"AXCommandFailed","errorCode":1005})"},
      {R"({"class":"AXKynSearch"})",
       R"({"class":"AXCommandFailed","reason":"Need at least emails or current location"})"},
  };
  constexpr int kThreads = 4, kEach = 3;
  std::vector<std::unique_ptr<host::Reply>> boxes;
  for (int i = 0; i < kThreads * kEach; ++i) boxes.push_back(std::make_unique<host::Reply>());
  std::vector<std::thread> hosts;
  for (int t = 0; t < kThreads; ++t) {
    hosts.emplace_back([&, t] {
      for (int i = 0; i < kEach; ++i) {
        auto* box = boxes[t * kEach + i].get();
        EXPECT_EQ(plugin.library().perform(commands[i].first.c_str(), &host::Reply::receive, box), 0);
      }
    });
  }
  for (auto& h : hosts) h.join();
  for (int i = 0; i < kThreads * kEach; ++i) {
    EXPECT_EQ(Json::parse(boxes[i]->wait(30s).value_or("null")), Json::parse(commands[i % kEach].second)) << i;
  }
  plugin.shutdown();
  for (const auto& box : boxes) EXPECT_EQ(box->count(), 1);
}

}  // namespace
}  // namespace kyn::itest
