#include "host/Process.h"

#include <fcntl.h>
#include <pthread.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <fstream>
#include <stdexcept>
#include <utility>

extern char** environ;

namespace kyn::host {
namespace {

/// This process's environment with `extra` entries added or replaced.
std::vector<std::string> environmentWith(const std::vector<std::string>& extra) {
  std::vector<std::string> out;
  for (char** e = environ; *e != nullptr; ++e) {
    const std::string_view entry(*e);
    const auto name = entry.substr(0, entry.find('=') + 1);
    bool replaced = false;
    for (const auto& x : extra) replaced = replaced || std::string_view(x).substr(0, x.find('=') + 1) == name;
    if (!replaced) out.emplace_back(entry);
  }
  out.insert(out.end(), extra.begin(), extra.end());
  return out;
}

std::vector<char*> pointers(std::vector<std::string>& texts) {
  std::vector<char*> out;
  for (auto& t : texts) out.push_back(t.data());
  out.push_back(nullptr);
  return out;
}

void closeFd(int& fd) {
  if (fd >= 0) ::close(fd);
  fd = -1;
}

}  // namespace

Process::Process(const std::vector<std::string>& argv, const SpawnOptions& options) {
  if (argv.empty()) throw std::runtime_error("no program to start");
  // Everything the child needs is prepared before fork: after it, only async-signal-safe calls.
  std::vector<std::string> args = argv;
  std::vector<std::string> env = environmentWith(options.environment);
  auto argp = pointers(args);
  auto envp = pointers(env);

  int out[2] = {-1, -1};
  int in[2] = {-1, -1};
  if (options.captureOutput && ::pipe2(out, O_CLOEXEC) != 0) throw std::runtime_error("pipe failed");
  if (options.input && ::pipe2(in, O_CLOEXEC) != 0) {
    closeFd(out[0]);
    closeFd(out[1]);
    throw std::runtime_error("pipe failed");
  }
  int errors = -1;
  if (options.errorFile) errors = ::open(options.errorFile->c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);

  const pid_t parent = ::getpid();
  pid_ = ::fork();
  if (pid_ == 0) {
    if (options.endWithParent) {
      ::prctl(PR_SET_PDEATHSIG, SIGTERM);
      if (::getppid() != parent) ::_exit(127);
    }
    if (out[1] >= 0) ::dup2(out[1], STDOUT_FILENO);
    if (in[0] >= 0) ::dup2(in[0], STDIN_FILENO);
    if (errors >= 0) ::dup2(errors, STDERR_FILENO);
    ::execve(argp[0], argp.data(), envp.data());
    ::_exit(127);
  }
  closeFd(out[1]);
  closeFd(in[0]);
  if (errors >= 0) ::close(errors);
  if (pid_ < 0) {
    closeFd(out[0]);
    closeFd(in[1]);
    throw std::runtime_error("cannot start " + argv[0]);
  }
  output_ = out[0];
  if (in[1] >= 0) {
    // A child that ends without reading must not kill us with SIGPIPE: block it for this thread
    // while writing, and take back the one our write raised.
    sigset_t pipeSignal;
    sigset_t previous;
    sigemptyset(&pipeSignal);
    sigaddset(&pipeSignal, SIGPIPE);
    ::pthread_sigmask(SIG_BLOCK, &pipeSignal, &previous);
    std::string_view rest = *options.input;
    while (!rest.empty()) {
      const ssize_t n = ::write(in[1], rest.data(), rest.size());
      if (n < 0 && errno == EINTR) continue;
      if (n < 0 && errno == EPIPE) {
        const timespec now{};
        ::sigtimedwait(&pipeSignal, nullptr, &now);
      }
      if (n <= 0) break;
      rest.remove_prefix(static_cast<std::size_t>(n));
    }
    ::pthread_sigmask(SIG_SETMASK, &previous, nullptr);
    closeFd(in[1]);
  }
}

Process::~Process() {
  stop();
  closeFd(output_);
}

std::optional<std::string> Process::readLine() {
  for (;;) {
    if (const auto end = buffered_.find('\n'); end != std::string::npos) {
      std::string line = buffered_.substr(0, end);
      buffered_.erase(0, end + 1);
      return line;
    }
    char chunk[4096];
    const ssize_t n = output_ >= 0 ? ::read(output_, chunk, sizeof chunk) : 0;
    if (n < 0 && errno == EINTR) continue;
    if (n <= 0) {
      if (buffered_.empty()) return std::nullopt;
      return std::exchange(buffered_, std::string());
    }
    buffered_.append(chunk, static_cast<std::size_t>(n));
  }
}

std::string Process::readAll() {
  std::string all = std::exchange(buffered_, std::string());
  char chunk[4096];
  for (;;) {
    const ssize_t n = output_ >= 0 ? ::read(output_, chunk, sizeof chunk) : 0;
    if (n < 0 && errno == EINTR) continue;
    if (n <= 0) break;
    all.append(chunk, static_cast<std::size_t>(n));
  }
  return all;
}

int Process::wait() {
  if (status_) return *status_;
  if (pid_ <= 0) return -1;
  int raw = 0;
  while (::waitpid(pid_, &raw, 0) < 0) {
    if (errno != EINTR) return -1;
  }
  status_ = WIFEXITED(raw) ? WEXITSTATUS(raw) : WIFSIGNALED(raw) ? 128 + WTERMSIG(raw) : -1;
  return *status_;
}

int Process::stop() {
  if (!status_ && pid_ > 0) ::kill(pid_, SIGTERM);
  return wait();
}

ProgramResult runProgram(const std::vector<std::string>& argv, const SpawnOptions& options) {
  SpawnOptions capture = options;
  capture.captureOutput = true;
  Process process(argv, capture);
  ProgramResult result;
  result.output = process.readAll();
  result.status = process.wait();
  return result;
}

TempDir::TempDir(std::string_view prefix) {
  std::string pattern = (std::filesystem::temp_directory_path() / (std::string(prefix) + "-XXXXXX")).string();
  if (::mkdtemp(pattern.data()) == nullptr) throw std::runtime_error("cannot make a temporary directory");
  path_ = pattern;
}

TempDir::~TempDir() {
  std::error_code ec;
  std::filesystem::remove_all(path_, ec);
}

std::filesystem::path TempDir::write(const std::string& name, std::string_view text, unsigned mode) const {
  const auto file = path_ / name;
  std::filesystem::create_directories(file.parent_path());
  {
    std::ofstream out(file, std::ios::binary | std::ios::trunc);
    out.write(text.data(), static_cast<std::streamsize>(text.size()));
    if (!out) throw std::runtime_error("cannot write " + file.string());
  }
  ::chmod(file.c_str(), mode);
  return file;
}

}  // namespace kyn::host
