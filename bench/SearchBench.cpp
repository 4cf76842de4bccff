// The three commands (search, visibility, geofence), side by side in one run:
//   - a warm exchange through the plug-in (loaded with dlopen, through its C interface) over
//     loopback HTTPS to kyn-sim, against a bare libcurl POST of the same bytes to the same endpoint
//     on a kept-alive connection in the same iterations, and against a Python client (Debian's
//     requests) that does the same exchange and the same decode;
//   - the plug-in's own cost per command without the network: a controller that answers at once
//     with the answer kyn-sim gave;
//   - decoding 10 to 10,000 friend entries, the own-location record and the geofence result;
//   - the first command after loading the plug-in;
//   - what waking a host thread costs on this machine, which a reply through the plug-in pays and
//     the bare client does not.
// The summary at the end sets each figure beside its target.
#include "Harness.h"
#include "commands/GetLocationsCmd.h"
#include "commands/SetGeoFenceCmd.h"
#include "commands/ShowHideLocationCmd.h"
#include "datasource/KYNAXDataSource.h"
#include "handlers/KYNAXSearch.h"
#include "handlers/KYNAXSetGeoFence.h"
#include "handlers/KYNAXVisibility.h"
#include "platform/Services.h"
#include "platform/log/Log.h"
#include "platform/value/Json.h"

#include <benchmark/benchmark.h>
#include <curl/curl.h>
#include <pthread.h>
#include <sched.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <deque>
#include <fstream>
#include <map>
#include <memory>
#include <sstream>
#include <thread>
#include <vector>

namespace {

using namespace kyn;
using itest::Json;

constexpr int kFriends = 50;

std::string handleOf(int i) {
  return i % 2 == 0 ? "friend" + std::to_string(i) + "@example.com" : "+1503555" + std::to_string(1000 + i);
}

/// When the friends were located, fixed rather than now less an age, so that every run reads the
/// same answers (ms since 1970, 2026-11-25): with an age, the milliseconds of the moment kyn-sim
/// answered decided whether every time in the reply was a short decimal or none was, and with it
/// a twentieth of a search's own cost. Each friend's time has milliseconds of its own, as real fixes
/// have.
constexpr std::int64_t kLocatedAtMs = 1795600000000;

/// One friend location entry as the data set holds it.
Json friendEntry(int i) {
  Json location = {{"latitude", 45.5 + i * 0.001},
                   {"longitude", -122.6 - i * 0.001},
                   {"horizontalAccuracy", 30.0},
                   {"streetAddress", std::to_string(i) + " Example Way"},
                   {"address", {{"locality", "Portland"}, {"stateCode", "OR"}, {"administrativeArea", "Oregon"}}}};
  if (i % 3 == 0) location["labels"] = Json::array({{{"label", "Work"}}});
  return {{"location", location}, {"timestamp", kLocatedAtMs - (60 + i * 30) * 1000 - i * 37}};
}

Json dataSet() {
  Json friends = Json::object();
  for (int i = 0; i < kFriends; ++i) friends[handleOf(i)] = friendEntry(i);
  return {{"me",
           {{"handle", "sam@example.com"},
            {"location", friendEntry(0)["location"]},
            {"timestamp", kLocatedAtMs - 30'000},
            {"places",
             {{"Work",
               {{"latitude", 45.5231}, {"longitude", -122.6765}, {"streetAddress", "700 Sample Avenue"},
                {"locality", "Portland"}, {"stateCode", "OR"}, {"country", "US"}}}}}}},
          {"friends", friends}};
}

std::string cardOf(int i) {
  const std::string n = std::to_string(i);
  std::string card = "BEGIN:VCARD\r\nVERSION:3.0\r\nUID:friend-" + n + "\r\nFN:Friend Number " + n + "\r\nN:Number " + n +
                     ";Friend;;;\r\n";
  card += (i % 2 == 0 ? "EMAIL;TYPE=HOME:" : "TEL;TYPE=CELL:") + handleOf(i) + "\r\n";
  return card + "END:VCARD\r\n";
}

enum Kind { Search, Visibility, GeoFence, kKinds };
const char* const kKindNames[] = {"search", "visibility", "geofence"};

/// What a client sends for one command: the plug-in's own request, recorded in this process.
struct Request {
  std::string url;
  std::string body;
  std::vector<std::string> headers;
  std::string username;
  std::string password;
};

/// Keeps what the plug-in would send, answers with a given body (or nothing) at once: with an
/// answer, what is left is the plug-in's own work.
class AnsweringController final : public platform::KYServerInteractionController {
 public:
  void sendCommand(std::shared_ptr<platform::KYJSONCommand> command, std::function<void()> completion) override {
    command->setCompletionBlock(std::move(completion));
    last.url = command->url().value_or("");
    last.body = command->jsonBody();
    last.headers.clear();
    const Value headers = command->headers();
    for (const auto& [name, value] : headers.items()) last.headers.push_back(name + ": " + value.get<std::string>());
    last.headers.insert(last.headers.end(), {"Content-Type: application/json", "Accept: application/json", "Expect:"});
    last.username = command->username().value_or("");
    last.password = command->password().value_or("");
    command->setTransferResult(true, platform::HTTPResponse{200});
    command->setResponseBody(answer);
    command->runCompletionBlock();
  }
  std::string answer;
  Request last;
};

/// Performs a command in this process as the C interface does: parse, dispatch, reply as text.
std::string performHere(const std::string& commandJson) {
  std::string text;
  auto reply = [&](const AXReply& r) { text = r.json(); };
  const auto document = platform::parseJsonDocument(commandJson).value();
  const platform::JsonView command = document.root();
  const std::string className = platform::stringValue(command.member("class")).value();
  if (className == AXKynSearch::kClassName) {
    auto search = std::make_shared<KYNAXSearch>();
    AXKynSearch::readFields(*search, command);
    search->performWithCompletion(reply);
  } else if (className == AXKynVisibilityStateSet::kClassName) {
    auto visibility = std::make_shared<KYNAXVisibility>();
    AXKynVisibilityStateSet::readFields(*visibility, command);
    visibility->performWithCompletion(reply);
  } else {
    auto fence = std::make_shared<KYNAXSetGeoFence>();
    AXKynGeoFenceSet::readFields(*fence, command);
    fence->performWithCompletion(reply);
  }
  return text;
}

std::size_t appendBody(char* data, std::size_t size, std::size_t count, void* out) {
  static_cast<std::string*>(out)->append(data, size * count);
  return size * count;
}

/// A libcurl handle that posts one recorded request on a kept-alive connection, as bare as it gets.
class BarePost {
 public:
  BarePost(const Request& request, const std::string& caFile) : request_(request), ca_(caFile) {
    curl_ = curl_easy_init();
    for (const auto& h : request_.headers) headers_ = curl_slist_append(headers_, h.c_str());
    curl_easy_setopt(curl_, CURLOPT_URL, request_.url.c_str());
    curl_easy_setopt(curl_, CURLOPT_POSTFIELDS, request_.body.c_str());
    curl_easy_setopt(curl_, CURLOPT_POSTFIELDSIZE_LARGE, static_cast<curl_off_t>(request_.body.size()));
    curl_easy_setopt(curl_, CURLOPT_HTTPHEADER, headers_);
    curl_easy_setopt(curl_, CURLOPT_HTTPAUTH, static_cast<long>(CURLAUTH_BASIC));
    curl_easy_setopt(curl_, CURLOPT_USERNAME, request_.username.c_str());
    curl_easy_setopt(curl_, CURLOPT_PASSWORD, request_.password.c_str());
    curl_easy_setopt(curl_, CURLOPT_CAINFO, ca_.c_str());
    curl_easy_setopt(curl_, CURLOPT_ACCEPT_ENCODING, "");
    curl_easy_setopt(curl_, CURLOPT_WRITEFUNCTION, &appendBody);
    curl_easy_setopt(curl_, CURLOPT_WRITEDATA, &body_);
  }
  ~BarePost() {
    curl_slist_free_all(headers_);
    curl_easy_cleanup(curl_);
  }
  BarePost(const BarePost&) = delete;
  BarePost& operator=(const BarePost&) = delete;

  /// Posts; the answer's body (decoded), or nothing when the exchange failed.
  std::optional<std::string> post() {
    body_.clear();
    long status = 0;
    if (curl_easy_perform(curl_) != CURLE_OK) return std::nullopt;
    curl_easy_getinfo(curl_, CURLINFO_RESPONSE_CODE, &status);
    if (status != 200) return std::nullopt;
    return body_;
  }

 private:
  Request request_;
  std::string ca_;
  CURL* curl_ = nullptr;
  curl_slist* headers_ = nullptr;
  std::string body_;
};

/// kyn-sim with the data set, a configured account with the friends in its address book, the
/// three commands as a host builds them, the request the plug-in sends for each and kyn-sim's answer.
struct World {
  test::TempDir simDir;
  test::TempDir configDir;
  std::unique_ptr<itest::Sim> sim;
  std::string commands[kKinds];
  Request requests[kKinds];
  std::string answers[kKinds];
  std::shared_ptr<AnsweringController> controller = std::make_shared<AnsweringController>();

  World() {
    sim = std::make_unique<itest::Sim>(simDir.path(), dataSet());
    itest::Account account(configDir.path());
    account.write("127.0.0.1:" + std::to_string(sim->port()), sim->caFile());
    const auto written = std::chrono::steady_clock::now();
    for (int i = 0; i < kFriends; ++i) account.addCard("friend-" + std::to_string(i) + ".vcf", cardOf(i));

    // The friends as the host hands them over: looked up in the address book by the plug-in.
    Json friends = Json::array();
    {
      itest::Plugin plugin(/*captureLog=*/false);
      plugin.configure(configDir.path());
      for (int i = 0; i < kFriends; ++i) {
        friends.push_back(Json::parse(*plugin.library().take(plugin.library().findPerson(handleOf(i).c_str()))));
      }
    }
    Json search = {{"class", "AXKynSearch"},
                   {"friends", friends},
                   {"currentLocation", {{"latitude", 45.5231}, {"longitude", -122.6765}, {"accuracy", 30}}}};
    commands[Search] = search.dump();
    commands[Visibility] = Json{{"class", "AXKynVisibilityStateSet"}, {"visible", true}}.dump();
    commands[GeoFence] = Json{{"class", "AXKynGeoFenceSet"},
                              {"friend", friends[0]},
                              {"requestedLocation", {{"class", "AXLocation"}, {"label", "Work"}}},
                              {"geoFenceTrigger", "OnArrival"},
                              {"oneTimeOnly", false},
                              {"fenceType", "Me"},
                              {"enable", true}}
                             .dump();

    // This process's copy of the plug-in, configured alike, records each request; a bare client
    // fetches kyn-sim's answer to it.
    auto& services = platform::services();
    services.configure(configDir.path());
    services.assistantPreferences.get()->setLanguageCode("en-US");
    services.log().setMinimumLevel(platform::LogLevel::Off);
    KYNAXDataSource::dataSource().setServerInteractionController(controller);
    for (int kind = 0; kind < kKinds; ++kind) {
      (void)performHere(commands[kind]);
      requests[kind] = controller->last;
      answers[kind] = BarePost(requests[kind], sim->caFile().string()).post().value_or("");
      if (answers[kind].empty()) std::fprintf(stderr, "kyn-sim did not answer the %s request\n", kKindNames[kind]);
    }
    // The plug-in reads a file changed within the last second on every command, as its clock may
    // not show a second change in that time: the account is left to settle first, as it has for
    // any user, so that a run of one benchmark measures what a run of all of them does.
    std::this_thread::sleep_until(written + std::chrono::milliseconds(2100));
  }
  static World& get() {
    static World world;
    return world;
  }
};

const char* const kReplyClass[] = {"AXKynSearchCompleted", "AXKynVisibilitySetCompleted", "AXKynGeoFenceSetCompleted"};

/// The median of `samples` (reordered).
double median(std::vector<double>& samples) {
  if (samples.empty()) return 0;
  const auto middle = samples.begin() + static_cast<std::ptrdiff_t>(samples.size() / 2);
  std::nth_element(samples.begin(), middle, samples.end());
  return *middle;
}

/// Warm exchanges of one command's bytes, side by side: each iteration performs the command through
/// the plug-in and posts the same request with the bare client, each timed on its own and in turn
/// first, so that both meet the same state of the machine and of kyn-sim. The iteration's time is
/// the plug-in's; the counters give the medians of the plug-in's and the bare client's times and of
/// what the plug-in added to the bare client in the same iteration.
void BM_WarmSideBySide(benchmark::State& state) {
  using Clock = std::chrono::steady_clock;
  World& world = World::get();
  const auto kind = static_cast<Kind>(state.range(0));
  // A reply lands in a box that outlives the plug-in, so that one after a timeout has a place. A
  // box whose reply was read is done with, and goes: a host that kept every reply would add the
  // growth of its own memory to each command.
  std::deque<host::Reply> boxes;
  itest::Plugin plugin(/*captureLog=*/false);
  plugin.configure(world.configDir.path());
  BarePost bare(world.requests[kind], world.sim->caFile().string());
  // Both connect once: the loop measures warm exchanges.
  (void)plugin.performAndWait(world.commands[kind]);
  (void)bare.post();
  // The reply's text is what the host gets; reading it into a value would be the host's work.
  const std::string expected = std::string(R"("class":")") + kReplyClass[kind] + '"';
  const auto throughPlugin = [&] {
    host::Reply& box = boxes.emplace_back();
    if (plugin.library().perform(world.commands[kind].c_str(), &host::Reply::receive, &box) != 0) return false;
    const auto reply = box.wait(std::chrono::seconds(30));
    if (!reply || reply->find(expected) == std::string::npos) return false;
    boxes.pop_back();
    return true;
  };
  const auto timed = [](auto&& exchange, double& seconds) {
    const auto start = Clock::now();
    const bool ok = exchange();
    seconds = std::chrono::duration<double>(Clock::now() - start).count();
    return ok;
  };
  std::vector<double> pluginTimes, bareTimes, added;
  bool pluginFirst = true;
  for (auto _ : state) {
    double pluginSeconds = 0;
    double bareSeconds = 0;
    const auto barePost = [&] { return bare.post().has_value(); };
    const bool ok = pluginFirst ? timed(throughPlugin, pluginSeconds) && timed(barePost, bareSeconds)
                                : timed(barePost, bareSeconds) && timed(throughPlugin, pluginSeconds);
    if (!ok) {
      state.SkipWithError("an exchange failed");
      break;
    }
    pluginFirst = !pluginFirst;
    state.SetIterationTime(pluginSeconds);
    pluginTimes.push_back(pluginSeconds);
    bareTimes.push_back(bareSeconds);
    added.push_back(pluginSeconds - bareSeconds);
  }
  state.counters["plugin_us"] = median(pluginTimes) * 1e6;
  state.counters["bare_us"] = median(bareTimes) * 1e6;
  state.counters["added_us"] = median(added) * 1e6;
  state.SetLabel(kKindNames[kind]);
}
BENCHMARK(BM_WarmSideBySide)->DenseRange(0, kKinds - 1)->UseManualTime()->MinTime(2.0)->Unit(benchmark::kMicrosecond);

/// Runs the calling thread on `cpu` alone; false where it cannot.
bool runOn(int cpu) {
  cpu_set_t set;
  CPU_ZERO(&set);
  CPU_SET(cpu, &set);
  return pthread_setaffinity_np(pthread_self(), sizeof set, &set) == 0;
}

/// What waking a host costs by itself on this machine: a reply through the plug-in comes on its
/// network thread, and the host thread that waits for it must be woken; the bare client reads the
/// answer on its own thread. Here a host thread waits for a reply box (host::Reply, as the warm rows
/// do) on a processor of its own that has gone idle, as it does while a server answers; the time is
/// from the delivery of the reply to the moment the host thread runs again.
void BM_ReplyHandOffToAWaitingHost(benchmark::State& state) {
  using Clock = std::chrono::steady_clock;
  const bool twoCpus = std::thread::hardware_concurrency() >= 2;
  std::atomic<host::Reply*> box{nullptr};
  std::atomic<Clock::rep> wokeAt{0};
  std::atomic<bool> done{false};
  std::thread hostThread([&] {
    if (twoCpus) (void)runOn(1);
    for (;;) {
      host::Reply reply;
      box.store(&reply);
      (void)reply.wait(std::chrono::seconds(10));
      wokeAt.store(Clock::now().time_since_epoch().count());
      while (box.load() == &reply) std::this_thread::yield();  // until the delivering side is done with it
      if (done.load()) return;
    }
  });
  cpu_set_t allowed;
  const bool pinned = twoCpus && pthread_getaffinity_np(pthread_self(), sizeof allowed, &allowed) == 0 && runOn(0);
  for (auto _ : state) {
    host::Reply* reply = nullptr;
    while ((reply = box.load()) == nullptr) std::this_thread::yield();
    std::this_thread::sleep_for(std::chrono::microseconds(200));
    wokeAt.store(0);
    const auto delivered = Clock::now();
    host::Reply::receive("{}", reply);
    while (wokeAt.load() == 0) std::this_thread::yield();
    state.SetIterationTime(std::chrono::duration<double>(Clock::duration(wokeAt.load()) - delivered.time_since_epoch()).count());
    box.store(nullptr);
  }
  // The host thread waits for one more reply, which lets it see that it is done.
  done.store(true);
  host::Reply* last = nullptr;
  while ((last = box.load()) == nullptr) std::this_thread::yield();
  host::Reply::receive("{}", last);
  box.store(nullptr);
  hostThread.join();
  if (pinned) (void)pthread_setaffinity_np(pthread_self(), sizeof allowed, &allowed);
}
BENCHMARK(BM_ReplyHandOffToAWaitingHost)->UseManualTime()->Iterations(2000)->Unit(benchmark::kMicrosecond);

/// The Python client times its own loop (about two seconds) and prints microseconds per exchange;
/// the benchmark reports that figure as the time of one iteration.
void BM_PythonClient(benchmark::State& state) {
  World& world = World::get();
  const auto kind = static_cast<Kind>(state.range(0));
  const Request& r = world.requests[kind];
  const auto requestFile = world.simDir.write(std::string("python-") + kKindNames[kind] + ".json",
                                              Json{{"url", r.url},
                                                   {"headers", r.headers},
                                                   {"username", r.username},
                                                   {"password", r.password},
                                                   {"body", Json::parse(r.body)}}
                                                  .dump());
  for (auto _ : state) {
    const auto run = host::runProgram({KYN_BENCH_PYTHON, KYN_BENCH_PYTHON_CLIENT, kKindNames[kind], requestFile.string(),
                                       world.sim->caFile().string(), (world.configDir.path() / "contacts").string()});
    double microseconds = 0;
    if (run.status != 0 || std::sscanf(run.output.c_str(), "%lf", &microseconds) != 1) {
      state.SkipWithError(("the Python client failed: " + run.output).c_str());
      break;
    }
    state.SetIterationTime(microseconds / 1e6);
  }
  state.SetLabel(kKindNames[kind]);
}
BENCHMARK(BM_PythonClient)->DenseRange(0, kKinds - 1)->UseManualTime()->Iterations(1)->Unit(benchmark::kMicrosecond);

/// Performs the command of `state.range(0)` in this process, answered at once with kyn-sim's answer.
void performEachWithoutNetwork(benchmark::State& state) {
  World& world = World::get();
  const auto kind = static_cast<Kind>(state.range(0));
  world.controller->answer = world.answers[kind];
  for (auto _ : state) {
    const std::string reply = performHere(world.commands[kind]);
    if (reply.find(kReplyClass[kind]) == std::string::npos) state.SkipWithError("the command failed");
  }
  state.SetLabel(kKindNames[kind]);
}

void BM_PluginCostWithoutNetwork(benchmark::State& state) { performEachWithoutNetwork(state); }
BENCHMARK(BM_PluginCostWithoutNetwork)->DenseRange(0, kKinds - 1)->Unit(benchmark::kMicrosecond);

/// Takes log lines and drops them.
class DroppingSink final : public platform::LogSink {
 public:
  void write(const platform::LogRecord& record) noexcept override { benchmark::DoNotOptimize(record.message.data()); }
};

/// The same with the log at the level a user has by default, which writes the progress lines and
/// the server's payloads: here they are made and then dropped, as what writing them costs depends
/// on the system's log.
void BM_PluginCostWithTheDefaultLog(benchmark::State& state) {
  (void)World::get();
  auto& log = platform::services().log();
  const auto level = log.minimumLevel();
  const auto sink = log.setSink(std::make_shared<DroppingSink>());
  log.setMinimumLevel(platform::LogLevel::Info);
  performEachWithoutNetwork(state);
  log.setMinimumLevel(level);
  log.setSink(sink);
}
BENCHMARK(BM_PluginCostWithTheDefaultLog)->DenseRange(0, kKinds - 1)->Unit(benchmark::kMicrosecond);

/// A get-locations answer of `entries` friends, in kyn-sim's words.
std::string answerWith(int entries) {
  Json locations = Json::object();
  for (int i = 0; i < entries; ++i) {
    Json entry = {{"status", 200}, {"match", false}, {"distanceInMeters", "1523.4"}, {"location", friendEntry(i)["location"]}};
    entry["location"]["timestamp"] = 1763740500000.0 - i * 1000.0;
    locations[handleOf(i)] = entry;
  }
  return Json{{"statusCode", 200}, {"locations", locations}, {"serverContext", {{"minCallbackIntervalInMS", 5000}}}}.dump();
}

// The decoding benchmarks give one command answer after answer: making a command (which reads the
// account and the stored host) is part of the own cost per command, and measured on its own below.
void BM_DecodeFriendEntries(benchmark::State& state) {
  (void)World::get();
  const std::string body = answerWith(static_cast<int>(state.range(0)));
  const auto command = std::make_shared<GetLocationsCmd>();
  for (auto _ : state) {
    command->setResponseBody(body);
    auto locations = command->result();
    if (!locations || locations->size() != static_cast<std::size_t>(state.range(0))) state.SkipWithError("decode failed");
  }
  state.SetComplexityN(state.range(0));
  state.counters["per entry"] = benchmark::Counter(static_cast<double>(state.range(0)) * state.iterations(),
                                                   benchmark::Counter::kIsRate | benchmark::Counter::kInvert);
}
BENCHMARK(BM_DecodeFriendEntries)->Arg(10)->Arg(100)->Arg(1000)->Arg(10000)->Complexity(benchmark::oN)
    ->Unit(benchmark::kMicrosecond);

void BM_DecodeOwnLocation(benchmark::State& state) {
  World& world = World::get();
  const auto command = std::make_shared<ShowHideLocationCmd>();
  for (auto _ : state) {
    command->setResponseBody(world.answers[Visibility]);
    auto result = command->result();
    if (!result || !result->myLocation) state.SkipWithError("decode failed");
  }
}
BENCHMARK(BM_DecodeOwnLocation)->Unit(benchmark::kMicrosecond);

void BM_DecodeGeoFence(benchmark::State& state) {
  World& world = World::get();
  const auto command = platform::parseJson(world.commands[GeoFence]).value();
  const auto fence = AXKynGeoFenceSet::fromDictionary(command);
  const auto request = std::make_shared<SetGeoFenceCmd>();
  request->axPerson = fence->friend_;
  request->setLocation(fence->requestedLocation);
  request->trigger = fence->geoFenceTrigger;
  request->enable = true;
  for (auto _ : state) {
    request->setResponseBody(world.answers[GeoFence]);
    if (!request->result()) state.SkipWithError("decode failed");
  }
}
BENCHMARK(BM_DecodeGeoFence)->Unit(benchmark::kMicrosecond);

void BM_CommandCreation(benchmark::State& state) {
  (void)World::get();
  for (auto _ : state) benchmark::DoNotOptimize(std::make_shared<ShowHideLocationCmd>());
}
BENCHMARK(BM_CommandCreation)->Unit(benchmark::kMicrosecond);

void BM_FirstCommandAfterLoadingThePlugin(benchmark::State& state) {
  World& world = World::get();
  for (auto _ : state) {
    itest::Plugin plugin(/*captureLog=*/false);
    plugin.configure(world.configDir.path());
    auto reply = plugin.performAndWait(world.commands[Search]);
    if (!reply || (*reply)["class"] != kReplyClass[Search]) state.SkipWithError("the search failed");
  }
}
BENCHMARK(BM_FirstCommandAfterLoadingThePlugin)->UseRealTime()->Iterations(10)->Unit(benchmark::kMillisecond);

/// The console report, then each target beside its measured value.
class SummaryReporter final : public benchmark::ConsoleReporter {
 public:
  SummaryReporter() {
    double load[1] = {-1};
    (void)getloadavg(load, 1);
    startLoad_ = load[0];
  }

  void ReportRuns(const std::vector<Run>& runs) override {
    for (const auto& run : runs) {
      if (run.run_type != Run::RT_Iteration || run.error_occurred) continue;
      // Seconds per iteration, by benchmark name ("BM_WarmSideBySide/1/min_time:2.000/manual_time").
      const double seconds = (run.real_accumulated_time / static_cast<double>(run.iterations));
      times_[run.benchmark_name()] = seconds;
      for (const auto& [counter, value] : run.counters) counters_[run.benchmark_name()][counter] = value.value;
    }
    ConsoleReporter::ReportRuns(runs);
  }

  void Finalize() override {
    ConsoleReporter::Finalize();
    double load[3] = {-1, -1, -1};
    (void)getloadavg(load, 3);
    std::printf("\nSummary (load average %.2f at the start, %.2f at the end)\n", startLoad_, load[0]);
    std::printf("%-62s %12s  %-16s %s\n", "", "measured", "target", "");
    for (int kind = 0; kind < kKinds; ++kind) {
      const std::string name = "BM_WarmSideBySide/" + std::to_string(kind);
      const auto plugin = counter(name, "plugin_us");
      const auto bare = counter(name, "bare_us");
      const auto added = counter(name, "added_us");
      if (plugin && bare && added) {
        row(std::string("warm ") + kKindNames[kind] + " (medians): plug-in " + fixed(*plugin, 0) + " us, bare libcurl " +
                fixed(*bare, 0) + " us",
            "+" + fixed(*added, 0) + " us", "<= +100 us", *added <= 100);
      }
    }
    if (const auto handOff = find("BM_ReplyHandOffToAWaitingHost")) {
      row("  a reply's wake-up of a host asleep on another processor", fixed(*handOff * 1e6, 0) + " us", "", std::nullopt);
    }
    for (int kind = 0; kind < kKinds; ++kind) {
      const auto own = find("BM_PluginCostWithoutNetwork/" + std::to_string(kind));
      if (own) {
        row(std::string("plug-in's own cost per ") + kKindNames[kind] + (kind == Search ? " (50 friends)" : ""),
            fixed(*own * 1e6, 1) + " us", "<= 30 us", *own * 1e6 <= 30);
      }
    }
    for (int kind = 0; kind < kKinds; ++kind) {
      if (const auto logged = find("BM_PluginCostWithTheDefaultLog/" + std::to_string(kind))) {
        row(std::string("  the same with the default log (lines made, not written), ") + kKindNames[kind],
            fixed(*logged * 1e6, 1) + " us", "", std::nullopt);
      }
    }
    const auto small = find("BM_DecodeFriendEntries/100");
    const auto large = find("BM_DecodeFriendEntries/10000");
    if (large) {
      row("decode: per friend entry at 10,000 entries", fixed(*large / 10'000 * 1e6, 2) + " us", "<= 2 us",
          *large / 10'000 * 1e6 <= 2);
    }
    if (small && large) {
      const double growth = (*large / 10'000) / (*small / 100);
      row("decode: per-entry time at 10,000 over that at 100 (linear: ~1)", fixed(growth, 2), "<= 1.5", growth <= 1.5);
    }
    if (const auto own = find("BM_DecodeOwnLocation")) {
      row("decode: own-location record (visibility result)", fixed(*own * 1e6, 2) + " us", "<= 2 us", *own * 1e6 <= 2);
    }
    if (const auto fence = find("BM_DecodeGeoFence")) {
      row("decode: geofence result", fixed(*fence * 1e6, 2) + " us", "<= 2 us", *fence * 1e6 <= 2);
    }
    if (const auto creation = find("BM_CommandCreation")) {
      row("making a command (account, stored host; part of the own cost)", fixed(*creation * 1e6, 2) + " us", "",
          std::nullopt);
    }
    if (const auto first = find("BM_FirstCommandAfterLoadingThePlugin")) {
      row("first command after loading the plug-in (search)", fixed(*first * 1e3, 1) + " ms", "<= 30 ms", *first * 1e3 <= 30);
    }
    for (int kind = 0; kind < kKinds; ++kind) {
      const auto python = find("BM_PythonClient/" + std::to_string(kind));
      const auto plugin = counter("BM_WarmSideBySide/" + std::to_string(kind), "plugin_us");
      if (python && plugin) {
        row(std::string("Python client (requests) ") + micro(*python) + " / plug-in " + fixed(*plugin, 0) + " us, " +
                kKindNames[kind],
            fixed(*python * 1e6 / *plugin, 2) + "x", "", std::nullopt);
      }
    }
  }

 private:
  /// Whether `name` is the benchmark `base`, with or without further "/..." parts.
  static bool isRunOf(const std::string& name, const std::string& base) {
    return name == base || name.rfind(base + "/", 0) == 0;
  }
  /// The time per iteration of the benchmark `base`.
  std::optional<double> find(const std::string& base) const {
    for (const auto& [name, seconds] : times_) {
      if (isRunOf(name, base)) return seconds;
    }
    return std::nullopt;
  }
  /// A counter of the benchmark `base`.
  std::optional<double> counter(const std::string& base, const std::string& counterName) const {
    for (const auto& [name, values] : counters_) {
      if (!isRunOf(name, base)) continue;
      if (const auto it = values.find(counterName); it != values.end()) return it->second;
    }
    return std::nullopt;
  }
  static std::string fixed(double value, int decimals) {
    char text[64];
    std::snprintf(text, sizeof text, "%.*f", decimals, value);
    return text;
  }
  static std::string micro(double seconds) { return fixed(seconds * 1e6, 0) + " us"; }
  static void row(const std::string& what, const std::string& measured, const std::string& target, std::optional<bool> met) {
    std::printf("%-62s %12s  %-16s %s\n", what.c_str(), measured.c_str(), target.c_str(),
                !met ? "" : *met ? "met" : "MISSED");
  }

  double startLoad_ = -1;
  std::map<std::string, double> times_;
  std::map<std::string, std::map<std::string, double>> counters_;
};

}  // namespace

int main(int argc, char** argv) {
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;
  SummaryReporter reporter;
  benchmark::RunSpecifiedBenchmarks(&reporter);
  benchmark::Shutdown();
  return 0;
}
