#include "Harness.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <signal.h>
#include <sys/prctl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <fstream>
#include <sstream>
#include <stdexcept>

extern char** environ;

namespace kyn::itest {
namespace {

std::vector<char*> argvOf(std::vector<std::string>& args) {
  std::vector<char*> argv;
  for (auto& a : args) argv.push_back(a.data());
  argv.push_back(nullptr);
  return argv;
}

void writeFile(const std::filesystem::path& path, const std::string& text, unsigned mode) {
  std::filesystem::create_directories(path.parent_path());
  {
    std::ofstream out(path, std::ios::binary | std::ios::trunc);
    out << text;
  }
  std::filesystem::permissions(path, static_cast<std::filesystem::perms>(mode));
}

}  // namespace

Sim::Sim(const std::filesystem::path& dir, const Json& dataSet, std::vector<std::string> extraArgs) : dir_(dir) {
  writeFile(dir_ / "sim-token", kToken, 0600);
  writeFile(dir_ / "friends.json", dataSet.dump(2), 0644);
  std::vector<std::string> args = {KYN_SIM_PATH,          "--port",         "0",
                                   "--person",            kPersonId,        "--token-file",
                                   (dir_ / "sim-token"),  "--data",         (dir_ / "friends.json"),
                                   "--ca-out",            (dir_ / "ca.pem"), "--log-file",
                                   (dir_ / "requests.jsonl")};
  args.insert(args.end(), extraArgs.begin(), extraArgs.end());

  int out[2];
  if (pipe2(out, O_CLOEXEC) != 0) throw std::runtime_error("pipe failed");
  const int errors = open((dir_ / "sim.err").c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
  auto argv = argvOf(args);
  const pid_t parent = getpid();
  pid_ = fork();
  if (pid_ == 0) {
    // The server must not outlive the test, even one that crashes; and it must not hold the test's
    // own output open, or the test runner would wait for it.
    prctl(PR_SET_PDEATHSIG, SIGTERM);
    if (getppid() != parent) _exit(1);
    dup2(out[1], STDOUT_FILENO);
    if (errors >= 0) dup2(errors, STDERR_FILENO);
    execv(argv[0], argv.data());
    _exit(127);
  }
  close(out[1]);
  if (errors >= 0) close(errors);
  if (pid_ < 0) {
    close(out[0]);
    throw std::runtime_error("cannot start kyn-sim");
  }
  // The one line "kyn-sim listening on https://ADDRESS:PORT" says it is ready; reading blocks until
  // it comes (or the process ends).
  std::string line;
  char c;
  while (read(out[0], &c, 1) == 1 && c != '\n') line.push_back(c);
  close(out[0]);
  const auto colon = line.rfind(':');
  if (line.find("listening on https://") == std::string::npos || colon == std::string::npos) {
    stop();
    std::ifstream err(dir_ / "sim.err");
    std::stringstream text;
    text << err.rdbuf();
    throw std::runtime_error("kyn-sim did not start: " + line + " " + text.str());
  }
  port_ = std::stoi(line.substr(colon + 1));
}

Sim::~Sim() { stop(); }

void Sim::stop() {
  if (pid_ <= 0) return;
  kill(pid_, SIGTERM);
  int status = 0;
  while (waitpid(pid_, &status, 0) < 0 && errno == EINTR) {
  }
  pid_ = -1;
}

std::vector<Json> Sim::requests() const {
  std::vector<Json> out;
  std::ifstream in(dir_ / "requests.jsonl");
  std::string line;
  while (std::getline(in, line)) {
    if (!line.empty()) out.push_back(Json::parse(line));
  }
  return out;
}

void Account::write(const std::string& host, const std::optional<std::filesystem::path>& caFile,
                    const Json& extraConfig) const {
  writeFile(dir / "account.json",
            Json{{"personId", kPersonId}, {"username", "ada@example.com"}, {"serviceHost", host}}.dump(), 0644);
  writeFile(dir / "token", std::string(kToken) + "\n", 0600);
  Json config = {{"connectTimeoutMs", 5000}, {"totalTimeoutMs", 15000}};
  if (caFile) config["caFile"] = caFile->string();
  for (const auto& [k, v] : extraConfig.items()) config[k] = v;
  writeFile(dir / "config.json", config.dump(), 0644);
  std::filesystem::create_directories(dir / "contacts");
}

void Account::addCard(const std::string& fileName, const std::string& card) const {
  writeFile(dir / "contacts" / fileName, card, 0644);
}

Plugin::Plugin(bool captureLog) {
  handle_ = dlopen(KYN_PLUGIN_PATH, RTLD_NOW | RTLD_LOCAL);
  if (handle_ == nullptr) throw std::runtime_error(std::string("cannot load the plug-in: ") + dlerror());
  performFn = reinterpret_cast<decltype(performFn)>(dlsym(handle_, "kyn_plugin_perform"));
  configure_ = reinterpret_cast<decltype(configure_)>(dlsym(handle_, "kyn_plugin_configure"));
  shutdown_ = reinterpret_cast<decltype(shutdown_)>(dlsym(handle_, "kyn_plugin_shutdown"));
  auto setLevel = reinterpret_cast<decltype(&kyn_plugin_set_log_level)>(dlsym(handle_, "kyn_plugin_set_log_level"));
  auto setCallback =
      reinterpret_cast<decltype(&kyn_plugin_set_log_callback)>(dlsym(handle_, "kyn_plugin_set_log_callback"));
  if (!performFn || !configure_ || !shutdown_ || !setLevel || !setCallback) throw std::runtime_error("entry point missing");
  if (captureLog) {
    setLevel("debug");
    setCallback(&Plugin::onLog, this);
  } else {
    setLevel("off");
  }
}

Plugin::~Plugin() {
  if (handle_ == nullptr) return;
  shutdown_();
  auto setCallback =
      reinterpret_cast<decltype(&kyn_plugin_set_log_callback)>(dlsym(handle_, "kyn_plugin_set_log_callback"));
  setCallback(nullptr, nullptr);
  dlclose(handle_);
}

void Plugin::onLog(int /*level*/, const char* message, void* context) {
  auto* self = static_cast<Plugin*>(context);
  std::lock_guard lock(self->logMutex_);
  self->log_.emplace_back(message);
}

void* Plugin::symbol(const char* name) const { return dlsym(handle_, name); }

std::vector<std::string> Plugin::logLines() const {
  std::lock_guard lock(logMutex_);
  return log_;
}

void Plugin::configure(const std::filesystem::path& configDir, const char* language) {
  if (configure_(configDir.c_str(), language) != 0) throw std::runtime_error("configure failed");
}

void Plugin::shutdown() { shutdown_(); }

std::vector<int> Plugin::replyCounts() {
  std::vector<int> counts;
  for (const auto& box : boxes_) {
    std::lock_guard lock(box->mutex);
    counts.push_back(box->count);
  }
  return counts;
}

void Plugin::ReplyBox::receive(const char* json, void* context) {
  auto* box = static_cast<ReplyBox*>(context);
  std::lock_guard lock(box->mutex);
  if (++box->count == 1) box->first = Json::parse(json, nullptr, false);
  box->arrived.notify_all();
}

Plugin::Outcome Plugin::perform(const std::string& commandJson, std::chrono::seconds timeout) {
  ReplyBox box;
  if (performFn(commandJson.c_str(), &ReplyBox::receive, &box) != 0) throw std::runtime_error("command refused");
  {
    std::unique_lock lock(box.mutex);
    box.arrived.wait_for(lock, timeout, [&] { return box.count > 0; });
  }
  shutdown_();  // joins the network thread: every reply there will be has come
  std::lock_guard lock(box.mutex);
  return {box.first, box.count};
}

std::optional<Json> Plugin::performAndWait(const std::string& commandJson, std::chrono::seconds timeout) {
  // The box lives as long as this object, which shuts the plug-in down before letting it go, so a
  // reply that comes after the wait gave up still has somewhere to land.
  boxes_.push_back(std::make_unique<ReplyBox>());
  ReplyBox& box = *boxes_.back();
  if (performFn(commandJson.c_str(), &ReplyBox::receive, &box) != 0) throw std::runtime_error("command refused");
  std::unique_lock lock(box.mutex);
  if (!box.arrived.wait_for(lock, timeout, [&] { return box.count > 0; })) return std::nullopt;
  return box.first;
}

std::string searchFor(const std::vector<std::string>& handles, bool withMyLocation) {
  Json command = {{"class", "AXKynSearch"}, {"friends", Json::array()}};
  for (const auto& h : handles) {
    Json person = {{"class", "AXPerson"}};
    if (h.find('@') != std::string::npos) person["emails"] = Json::array({{{"emailAddress", h}}});
    else person["phones"] = Json::array({{{"number", h}}});
    command["friends"].push_back(person);
  }
  if (withMyLocation) command["currentLocation"] = {{"latitude", 45.5231}, {"longitude", -122.6765}, {"accuracy", 30}};
  return command.dump();
}

ProgramResult runProgram(const std::vector<std::string>& args) {
  std::vector<std::string> copy = args;
  auto argv = argvOf(copy);
  int out[2];
  if (pipe2(out, O_CLOEXEC) != 0) return {};
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_adddup2(&actions, out[1], STDOUT_FILENO);
  pid_t pid = -1;
  const int spawned = posix_spawn(&pid, argv[0], &actions, nullptr, argv.data(), environ);
  posix_spawn_file_actions_destroy(&actions);
  close(out[1]);
  ProgramResult result;
  if (spawned != 0) {
    close(out[0]);
    return result;
  }
  char buffer[4096];
  ssize_t n;
  while ((n = read(out[0], buffer, sizeof buffer)) > 0) result.output.append(buffer, static_cast<std::size_t>(n));
  close(out[0]);
  int status = 0;
  while (waitpid(pid, &status, 0) < 0 && errno == EINTR) {
  }
  result.status = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  return result;
}

}  // namespace kyn::itest
