#include "Harness.h"

#include <fstream>
#include <stdexcept>

namespace kyn::itest {
namespace {

void writeFile(const std::filesystem::path& path, const std::string& text, unsigned mode) {
  std::filesystem::create_directories(path.parent_path());
  std::ofstream(path, std::ios::binary | std::ios::trunc) << text;  // closed at the end of the statement
  std::filesystem::permissions(path, static_cast<std::filesystem::perms>(mode));
}

std::optional<Json> parse(const std::optional<std::string>& text) {
  if (!text) return std::nullopt;
  return Json::parse(*text, nullptr, false);
}

}  // namespace

Sim::Sim(const std::filesystem::path& dir, const Json& dataSet, std::vector<std::string> extraArgs) : dir_(dir) {
  writeFile(dir_ / "sim-token", kToken, 0600);
  writeFile(dir_ / "friends.json", dataSet.dump(2), 0644);
  std::vector<std::string> args = {KYN_SIM_PATH, "--port", "0", "--person", kPersonId, "--token-file", dir_ / "sim-token",
                                   "--data", dir_ / "friends.json", "--ca-out", dir_ / "ca.pem",
                                   "--log-file", dir_ / "requests.jsonl"};
  args.insert(args.end(), extraArgs.begin(), extraArgs.end());
  // The server must not outlive the test, even one that crashes.
  host::SpawnOptions options;
  options.captureOutput = true;
  options.errorFile = dir_ / "sim.err";
  options.endWithParent = true;
  process_ = std::make_unique<host::Process>(args, options);
  // The one line "kyn-sim listening on https://ADDRESS:PORT" says it is ready.
  const std::string line = process_->readLine().value_or("");
  const auto colon = line.rfind(':');
  if (line.find("listening on https://") == std::string::npos || colon == std::string::npos) {
    process_.reset();
    throw std::runtime_error("kyn-sim did not start: " + line + " " + test::readFile(dir_ / "sim.err"));
  }
  port_ = std::stoi(line.substr(colon + 1));
}

std::vector<Json> Sim::requests() const { return readJsonLines(dir_ / "requests.jsonl"); }

std::vector<Json> readJsonLines(const std::filesystem::path& file) {
  std::vector<Json> out;
  std::ifstream in(file);
  for (std::string line; std::getline(in, line);) {
    if (!line.empty()) out.push_back(Json::parse(line));
  }
  return out;
}

ProgramResult runHost(const std::filesystem::path& config, std::vector<std::string> args,
                      const host::SpawnOptions& options) {
  args.insert(args.begin(), {KYN_CLI_PATH, "--config", config.string()});
  return runProgram(args, options);
}

void Account::write(const std::string& host, const std::optional<std::filesystem::path>& caFile, const Json& extraConfig,
                    const char* personId, const char* token) const {
  writeFile(dir / "account.json",
            Json{{"personId", personId}, {"username", "ada@example.com"}, {"serviceHost", host}}.dump(), 0644);
  writeFile(dir / "token", std::string(token) + "\n", 0600);
  Json config = {{"connectTimeoutMs", 5000}, {"totalTimeoutMs", 15000}};
  if (caFile) config["caFile"] = caFile->string();
  for (const auto& [k, v] : extraConfig.items()) config[k] = v;
  writeFile(dir / "config.json", config.dump(), 0644);
  std::filesystem::create_directories(dir / "contacts");
}

void Account::addCard(const std::string& fileName, const std::string& card) const {
  writeFile(dir / "contacts" / fileName, card, 0644);
}

Plugin::Plugin(bool captureLog) : library_(KYN_PLUGIN_PATH) {
  library_.setLogLevel(captureLog ? "debug" : "off");
  if (captureLog) library_.setLogCallback(&Plugin::onLog, this);
}

Plugin::~Plugin() = default;

void Plugin::onLog(int /*level*/, const char* message, void* context) {
  auto* self = static_cast<Plugin*>(context);
  std::lock_guard lock(self->logMutex_);
  self->log_.emplace_back(message);
}

std::vector<std::string> Plugin::logLines() const {
  std::lock_guard lock(logMutex_);
  return log_;
}

void Plugin::configure(const std::filesystem::path& configDir, const char* language) {
  if (library_.configure(configDir.c_str(), language) != 0) throw std::runtime_error("configure failed");
}

void Plugin::shutdown() { library_.shutdown(); }

std::vector<int> Plugin::replyCounts() {
  std::vector<int> counts;
  for (const auto& box : boxes_) counts.push_back(box->count());
  return counts;
}

Plugin::Outcome Plugin::perform(const std::string& commandJson, std::chrono::seconds timeout) {
  host::Reply box;
  if (library_.perform(commandJson.c_str(), &host::Reply::receive, &box) != 0) throw std::runtime_error("command refused");
  (void)box.wait(timeout);
  library_.shutdown();  // joins the network thread: every reply there will be has come
  return {parse(box.wait(std::chrono::seconds(0))), box.count()};
}

std::optional<Json> Plugin::performAndWait(const std::string& commandJson, std::chrono::seconds timeout) {
  // The box lives as long as this object, which shuts the plug-in down before letting it go, so a
  // reply that comes after the wait gave up still has somewhere to land.
  boxes_.push_back(std::make_unique<host::Reply>());
  host::Reply& box = *boxes_.back();
  if (library_.perform(commandJson.c_str(), &host::Reply::receive, &box) != 0) throw std::runtime_error("command refused");
  return parse(box.wait(timeout));
}

std::string searchFor(const std::vector<std::string>& handles) {
  Json command = {{"class", "AXKynSearch"}, {"friends", Json::array()}};
  for (const auto& h : handles) {
    Json person = {{"class", "AXPerson"}};
    if (h.find('@') != std::string::npos) person["emails"] = Json::array({{{"emailAddress", h}}});
    else person["phones"] = Json::array({{{"number", h}}});
    command["friends"].push_back(person);
  }
  command["currentLocation"] = {{"latitude", 45.5231}, {"longitude", -122.6765}, {"accuracy", 30}};
  return command.dump();
}

}  // namespace kyn::itest
