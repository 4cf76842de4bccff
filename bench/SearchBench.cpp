// Searches, side by side in one run:
//   - a warm search through the plug-in (loaded with dlopen, through its C interface) over loopback
//     HTTPS to kyn-sim, against a bare libcurl POST of the same bytes to the same endpoint on a kept-
//     alive connection, and their ratio;
//   - the plug-in's own cost per search without the network (a controller that answers at once);
//   - decoding 10 to 10,000 friend entries of a get-locations answer;
//   - the first command after loading the plug-in.
#include "Harness.h"
#include "commands/GetLocationsCmd.h"
#include "account/Common.h"
#include "datasource/KYNAXDataSource.h"
#include "handlers/KYNAXSearch.h"
#include "platform/Services.h"
#include "platform/value/Json.h"
#include "utils/KYNAXUtils.h"

#include <benchmark/benchmark.h>
#include <curl/curl.h>

#include <cstdio>
#include <map>
#include <memory>

namespace {

using namespace kyn;
using itest::Json;

const std::vector<std::string> kHandles = {"ada@example.com", "+15035550102"};

Json friendsDataSet(int count) {
  Json friends = Json::object();
  for (int i = 0; i < count; ++i) {
    const std::string handle = i == 0 ? "ada@example.com" : i == 1 ? "+15035550102" : "friend" + std::to_string(i) + "@example.com";
    friends[handle] = {{"location",
                        {{"latitude", 45.5 + i * 0.001},
                         {"longitude", -122.6 - i * 0.001},
                         {"horizontalAccuracy", 30.0},
                         {"streetAddress", std::to_string(i) + " Example Way"},
                         {"labels", Json::array({{{"label", "Work"}}})},
                         {"address", {{"locality", "Portland"}, {"stateCode", "OR"}}}}},
                       {"ageSeconds", 60 + i}};
  }
  return Json{{"friends", friends}};
}

/// kyn-sim with a configured account, shared by the network benchmarks.
struct World {
  test::TempDir simDir;
  test::TempDir configDir;
  std::unique_ptr<itest::Sim> sim;
  std::string host;

  World() {
    sim = std::make_unique<itest::Sim>(simDir.path(), friendsDataSet(2));
    host = "127.0.0.1:" + std::to_string(sim->port());
    itest::Account account(configDir.path());
    account.write(host, sim->caFile());
  }
  static World& get() {
    static World world;
    return world;
  }
};

void BM_WarmSearchThroughPlugin(benchmark::State& state) {
  World& world = World::get();
  itest::Plugin plugin(/*captureLog=*/false);
  plugin.configure(world.configDir.path());
  const std::string command = itest::searchFor(kHandles);
  (void)plugin.performAndWait(command);  // connect once: the loop measures warm searches
  for (auto _ : state) {
    auto reply = plugin.performAndWait(command);
    if (!reply || (*reply)["class"] != "AXKynSearchCompleted") state.SkipWithError("the search failed");
  }
}
BENCHMARK(BM_WarmSearchThroughPlugin)->UseRealTime()->MinTime(2.0)->Unit(benchmark::kMicrosecond);

/// The request the plug-in sends, built by the same code in this process.
struct PluginRequest {
  std::string url;
  std::string body;
  std::vector<std::string> headers;
};

PluginRequest pluginRequest(const World& world) {
  platform::services().configure(world.configDir.path());
  platform::services().log().setMinimumLevel(platform::LogLevel::Off);
  Common::sharedInstance().clearKYNAccount();
  GetLocationsCmd command;
  auto search = AXKynSearch::fromDictionary(kyn::platform::parseJson(itest::searchFor(kHandles)).value());
  command.friends = search->friends;
  command.currentLocation = KYNAXUtils::coreLocationForAXLocation(search->currentLocation);
  PluginRequest request{*command.url(), platform::toJson(command.jsonBodyDictionary()), {}};
  const Value headers = command.headers();
  for (const auto& [name, value] : headers.items()) request.headers.push_back(name + ": " + value.get<std::string>());
  request.headers.emplace_back("Content-Type: application/json");
  request.headers.emplace_back("Accept: application/json");
  request.headers.emplace_back("Expect:");
  return request;
}

// The bare client takes the answer's bytes and leaves them: decoding is the plug-in's own work.
std::size_t acceptBody(char*, std::size_t size, std::size_t count, void*) { return size * count; }

void BM_BareCurlPost(benchmark::State& state) {
  World& world = World::get();
  const PluginRequest request = pluginRequest(world);
  CURL* curl = curl_easy_init();
  curl_slist* headers = nullptr;
  for (const auto& h : request.headers) headers = curl_slist_append(headers, h.c_str());
  const std::string ca = world.sim->caFile().string();
  curl_easy_setopt(curl, CURLOPT_URL, request.url.c_str());
  curl_easy_setopt(curl, CURLOPT_POSTFIELDS, request.body.c_str());
  curl_easy_setopt(curl, CURLOPT_POSTFIELDSIZE_LARGE, static_cast<curl_off_t>(request.body.size()));
  curl_easy_setopt(curl, CURLOPT_HTTPHEADER, headers);
  curl_easy_setopt(curl, CURLOPT_HTTPAUTH, static_cast<long>(CURLAUTH_BASIC));
  curl_easy_setopt(curl, CURLOPT_USERNAME, itest::kPersonId);
  curl_easy_setopt(curl, CURLOPT_PASSWORD, itest::kToken);
  curl_easy_setopt(curl, CURLOPT_CAINFO, ca.c_str());
  curl_easy_setopt(curl, CURLOPT_ACCEPT_ENCODING, "");
  curl_easy_setopt(curl, CURLOPT_WRITEFUNCTION, &acceptBody);
  curl_easy_perform(curl);  // connect once
  for (auto _ : state) {
    long status = 0;
    if (curl_easy_perform(curl) != CURLE_OK) state.SkipWithError("the POST failed");
    curl_easy_getinfo(curl, CURLINFO_RESPONSE_CODE, &status);
    if (status != 200) state.SkipWithError("the POST was refused");
  }
  curl_slist_free_all(headers);
  curl_easy_cleanup(curl);
}
BENCHMARK(BM_BareCurlPost)->UseRealTime()->MinTime(2.0)->Unit(benchmark::kMicrosecond);

/// Answers every command at once with a fixed body, after building its request as the real
/// controller does: what is left is the plug-in's own work.
class AnsweringController final : public platform::KYServerInteractionController {
 public:
  explicit AnsweringController(std::string body) : body_(std::move(body)) {}
  void sendCommand(std::shared_ptr<platform::KYJSONCommand> command, std::function<void()> completion) override {
    command->setCompletionBlock(std::move(completion));
    benchmark::DoNotOptimize(platform::toJson(command->jsonBodyDictionary()));
    benchmark::DoNotOptimize(command->headers());
    command->setTransferResult(true, platform::HTTPResponse{200});
    command->setResponseBody(body_);
    command->runCompletionBlock();
  }

 private:
  std::string body_;
};

std::string answerWith(int entries) {
  Json locations = Json::object();
  const Json friends = friendsDataSet(entries)["friends"];
  for (const auto& [handle, friendEntry] : friends.items()) {
    Json entry = {{"status", 200}, {"match", false}, {"distanceInMeters", "1523.4"}, {"location", friendEntry["location"]}};
    entry["location"]["timestamp"] = 1763740500000.0;
    locations[handle] = entry;
  }
  return Json{{"statusCode", 200}, {"locations", locations}, {"serverContext", {{"clientId", "bench"}}}}.dump();
}

void BM_PluginCostWithoutNetwork(benchmark::State& state) {
  World& world = World::get();
  (void)pluginRequest(world);  // configures this process's copy of the plug-in
  KYNAXDataSource::dataSource().setServerInteractionController(std::make_shared<AnsweringController>(answerWith(2)));
  auto search = std::make_shared<KYNAXSearch>();
  AXKynSearch::readFields(*search, kyn::platform::parseJson(itest::searchFor(kHandles)).value());
  for (auto _ : state) {
    std::string reply;
    search->performWithCompletion([&](const Value& r) { reply = platform::toJson(r); });
    if (reply.find("AXKynSearchCompleted") == std::string::npos) state.SkipWithError("the search failed");
  }
}
BENCHMARK(BM_PluginCostWithoutNetwork)->Unit(benchmark::kMicrosecond);

void BM_DecodeFriendEntries(benchmark::State& state) {
  World& world = World::get();
  (void)pluginRequest(world);
  const std::string body = answerWith(static_cast<int>(state.range(0)));
  for (auto _ : state) {
    auto command = std::make_shared<GetLocationsCmd>();
    command->setResponseBody(body);
    auto locations = command->result();
    if (!locations || locations->size() != static_cast<std::size_t>(state.range(0))) state.SkipWithError("decode failed");
  }
  state.SetComplexityN(state.range(0));
  state.counters["entries/s"] = benchmark::Counter(static_cast<double>(state.range(0)) * state.iterations(),
                                                   benchmark::Counter::kIsRate);
}
BENCHMARK(BM_DecodeFriendEntries)->Arg(10)->Arg(100)->Arg(1000)->Arg(10000)->Complexity(benchmark::oN)
    ->Unit(benchmark::kMicrosecond);

void BM_FirstCommandAfterLoadingThePlugin(benchmark::State& state) {
  World& world = World::get();
  for (auto _ : state) {
    itest::Plugin plugin(/*captureLog=*/false);
    plugin.configure(world.configDir.path());
    auto reply = plugin.performAndWait(itest::searchFor(kHandles));
    if (!reply || (*reply)["class"] != "AXKynSearchCompleted") state.SkipWithError("the search failed");
  }
}
BENCHMARK(BM_FirstCommandAfterLoadingThePlugin)->UseRealTime()->Iterations(10)->Unit(benchmark::kMillisecond);

/// The console report, plus the ratio of the warm plug-in search to the bare POST.
class RatioReporter final : public benchmark::ConsoleReporter {
 public:
  void ReportRuns(const std::vector<Run>& runs) override {
    for (const auto& run : runs) {
      if (run.run_type == Run::RT_Iteration && !run.error_occurred) perIteration_[run.run_name.function_name] = run.GetAdjustedRealTime();
    }
    ConsoleReporter::ReportRuns(runs);
  }
  void Finalize() override {
    ConsoleReporter::Finalize();
    const auto plugin = perIteration_.find("BM_WarmSearchThroughPlugin");
    const auto bare = perIteration_.find("BM_BareCurlPost");
    if (plugin != perIteration_.end() && bare != perIteration_.end() && bare->second > 0) {
      std::printf("\nWarm search through the plug-in / bare libcurl POST of the same bytes: %.3f (target at most 1.15)\n",
                  plugin->second / bare->second);
    }
  }

 private:
  std::map<std::string, double> perIteration_;
};

}  // namespace

int main(int argc, char** argv) {
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;
  RatioReporter reporter;
  benchmark::RunSpecifiedBenchmarks(&reporter);
  benchmark::Shutdown();
  return 0;
}
