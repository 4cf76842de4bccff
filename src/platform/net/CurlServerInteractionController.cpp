// The HTTPS transport: libcurl's multi interface with one network thread per controller. Requests are
// built on the caller's thread and, once a server has answered, started there too, which on the
// kept-alive connection sends the request at once; the network thread carries the exchange on,
// fills in the command and runs its completion. Every command sent is answered there, also one that
// cannot be sent at all, so a caller never sees its completion run on its own thread. Connections
// are kept alive and reused between commands.
#include "platform/log/Log.h"
#include "platform/net/ServerInteractionController.h"
#include "platform/net/Url.h"
#include "platform/notify/NotificationCenter.h"

#include <curl/curl.h>
#include <sys/epoll.h>
#include <sys/eventfd.h>
#include <sys/timerfd.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <charconv>
#include <cerrno>
#include <climits>
#include <cstdint>
#include <condition_variable>
#include <deque>
#include <filesystem>
#include <list>
#include <mutex>
#include <thread>
#include <unordered_map>

namespace kyn::platform {
namespace {

struct EasyCleanup {
  void operator()(CURL* easy) const noexcept { curl_easy_cleanup(easy); }
};
struct MultiCleanup {
  void operator()(CURLM* multi) const noexcept { curl_multi_cleanup(multi); }
};
struct ListCleanup {
  void operator()(curl_slist* list) const noexcept { curl_slist_free_all(list); }
};
using EasyHandle = std::unique_ptr<CURL, EasyCleanup>;
using MultiHandle = std::unique_ptr<CURLM, MultiCleanup>;
using HeaderList = std::unique_ptr<curl_slist, ListCleanup>;

/// A command with its request, built on the sender's thread.
struct Request {
  std::shared_ptr<KYJSONCommand> command;
  std::string url;
  std::string body;
  std::vector<std::string> headers;
  std::optional<std::string> username;
  std::optional<std::string> password;
  std::string host;
  /// Why the request cannot be sent at all; the network thread answers it with this.
  KYTransferError refusal = KYTransferError::None;
  std::string refusalDetail;
};

/// What an ended exchange leaves for its command: read off the transfer while curl is held, and
/// handed to the command afterwards, when curl is free for other senders.
struct Outcome {
  Request request;
  bool cancelled = false;  // the transport shut down while it ran
  CURLcode code = CURLE_OK;
  long status = 0;
  long connects = 0;
  std::size_t cap = 0;
  bool overflowed = false;
  std::string response;
  std::string finalUrl;
  std::string answeredUrl;
  std::string errorText;
};

/// Idle easy handles, so that a transfer need not build one afresh. Used with the engine's curl held.
class HandlePool {
 public:
  /// An idle handle, else a new one; empty when curl cannot make one.
  EasyHandle take() {
    if (idle_.empty()) return EasyHandle(curl_easy_init());
    EasyHandle easy = std::move(idle_.back());
    idle_.pop_back();
    return easy;
  }
  /// Takes a handle back, its options cleared so that it points at nothing of its last transfer.
  void give(EasyHandle easy) noexcept {
    if (!easy) return;
    curl_easy_reset(easy.get());
    try {
      idle_.push_back(std::move(easy));
    } catch (...) {
      // No room to keep it: `easy` frees the handle.
    }
  }

 private:
  std::vector<EasyHandle> idle_;
};

/// One exchange on the wire. It owns everything curl was given for it: the easy handle (attached to
/// the multi handle while the exchange runs), the header list, the error buffer and the buffers the
/// callbacks fill. However the exchange ends, destroying the transfer detaches the handle, gives it
/// back to the pool and frees the rest.
class Transfer {
 public:
  Transfer(Request&& what, EasyHandle easy, HandlePool& pool, std::size_t responseCap)
      : request(std::move(what)), cap(responseCap), easy_(std::move(easy)), pool_(pool) {}
  ~Transfer() {
    if (multi_ != nullptr) curl_multi_remove_handle(multi_, easy_.get());
    pool_.give(std::move(easy_));
  }
  Transfer(const Transfer&) = delete;
  Transfer& operator=(const Transfer&) = delete;

  [[nodiscard]] CURL* easy() const noexcept { return easy_.get(); }
  [[nodiscard]] char* errorBuffer() noexcept { return error_; }
  /// curl's own words on why the transfer failed.
  [[nodiscard]] std::string errorText(CURLcode code) const {
    return error_[0] != '\0' ? std::string(error_) : std::string(curl_easy_strerror(code));
  }

  /// Builds the header list and hands it to the handle; false when curl has no memory for it.
  bool setHeaders() {
    for (const auto& header : request.headers) {
      curl_slist* longer = curl_slist_append(headers_.get(), header.c_str());
      if (longer == nullptr) return false;
      (void)headers_.release();  // `longer` is the same list, one entry longer
      headers_.reset(longer);
    }
    curl_easy_setopt(easy_.get(), CURLOPT_HTTPHEADER, headers_.get());
    return true;
  }

  /// Starts the exchange on `multi`.
  bool attach(CURLM* multi) {
    if (curl_multi_add_handle(multi, easy_.get()) != CURLM_OK) return false;
    multi_ = multi;
    return true;
  }

  Request request;
  std::size_t cap;
  std::string response;
  bool overflowed = false;
  /// The URL that the last final (non-1xx) HTTP response came from.
  std::string answeredUrl;
  /// Room for the outcome, made when the transfer starts so that ending it cannot fail.
  std::list<Outcome> ending;

 private:
  EasyHandle easy_;
  HandlePool& pool_;
  CURLM* multi_ = nullptr;
  HeaderList headers_;
  char error_[CURL_ERROR_SIZE] = {};
};

std::size_t collectBody(char* data, std::size_t size, std::size_t count, void* user) noexcept {
  auto* transfer = static_cast<Transfer*>(user);
  const std::size_t bytes = size * count;
  if (transfer->response.size() + bytes > transfer->cap) {
    transfer->overflowed = true;
    return 0;  // makes curl stop with a write error
  }
  try {
    transfer->response.append(data, bytes);
  } catch (...) {
    transfer->overflowed = true;
    return 0;
  }
  return bytes;
}

/// Notes which URL each HTTP response came from: a redirect counts only once the host it led to
/// has answered.
std::size_t noteResponse(char* data, std::size_t size, std::size_t count, void* user) noexcept {
  auto* transfer = static_cast<Transfer*>(user);
  const std::size_t bytes = size * count;
  const std::string_view line(data, bytes);
  if (!line.starts_with("HTTP/")) return bytes;
  // "HTTP/1.1 307 Temporary Redirect", "HTTP/2 200"; interim 1xx answers are not the answer.
  int status = 0;
  if (const auto space = line.find(' '); space != std::string_view::npos) {
    std::from_chars(line.data() + space + 1, line.data() + line.size(), status);
  }
  char* url = nullptr;
  if (status >= 200 && curl_easy_getinfo(transfer->easy(), CURLINFO_EFFECTIVE_URL, &url) == CURLE_OK && url) {
    try {
      transfer->answeredUrl = url;
    } catch (...) {
      return 0;
    }
  }
  return bytes;
}

KYTransferError classify(CURLcode code, long status, bool overflowed) noexcept {
  if (overflowed || code == CURLE_FILESIZE_EXCEEDED) return KYTransferError::ResponseTooLarge;
  switch (code) {
    case CURLE_OK:
      return status >= 200 && status < 300 ? KYTransferError::None : KYTransferError::HTTPStatus;
    case CURLE_COULDNT_RESOLVE_HOST:
      return KYTransferError::HostNotFound;
    case CURLE_COULDNT_CONNECT:
      return KYTransferError::Refused;
    case CURLE_OPERATION_TIMEDOUT:
      return KYTransferError::TimedOut;
    // Only https is sent, so another scheme can only have come from a redirect.
    case CURLE_TOO_MANY_REDIRECTS:
    case CURLE_UNSUPPORTED_PROTOCOL:
      return KYTransferError::RedirectRefused;
    case CURLE_SSL_CONNECT_ERROR:
    case CURLE_PEER_FAILED_VERIFICATION:
    case CURLE_SSL_CERTPROBLEM:
    case CURLE_SSL_CIPHER:
    case CURLE_SSL_CACERT_BADFILE:
    case CURLE_SSL_ISSUER_ERROR:
    case CURLE_SSL_PINNEDPUBKEYNOTMATCH:
    case CURLE_SSL_INVALIDCERTSTATUS:
    case CURLE_SSL_CRL_BADFILE:
    case CURLE_SSL_ENGINE_NOTFOUND:
    case CURLE_SSL_ENGINE_SETFAILED:
    case CURLE_SSL_ENGINE_INITFAILED:
    case CURLE_SSL_SHUTDOWN_FAILED:
      return KYTransferError::TLS;
    default:
      return KYTransferError::ConnectionFailed;
  }
}

/// curl's time limits in milliseconds; 0 would mean no limit at all, so the least is 1.
long curlMilliseconds(std::chrono::milliseconds limit) noexcept {
  return static_cast<long>(std::clamp<std::chrono::milliseconds::rep>(limit.count(), 1, LONG_MAX));
}

using Clock = std::chrono::steady_clock;

/// The state shared by a controller and its network thread; the thread keeps it alive until it ends.
/// The controller is the only sender and stops the engine only from its destructor, so nothing is
/// sent after `stop`.
///
/// curl's handles are used by one thread at a time, under `curl_`. Once a server has answered (so
/// that a kept-alive connection is likely), the sender's thread adds its transfer and runs it as far
/// as it goes at once, which on that connection sends the request; before that, the network thread
/// starts it, so that no sender waits for a name lookup, a connection or a handshake. The network
/// thread carries every transfer on as its sockets become ready or curl's timer expires. It sleeps
/// in epoll without holding curl, on the sockets curl watches and a timerfd set to curl's timer, so
/// a sender need not wake it: the server's answer or the timer does. It is woken only for work that
/// is its own: a request not started on the sender's thread, or a transfer that ended there.
class Engine : public std::enable_shared_from_this<Engine> {
 public:
  explicit Engine(TransportSettings settings) : settings_(std::move(settings)) {
    static std::once_flag global;
    std::call_once(global, [] { curl_global_init(CURL_GLOBAL_DEFAULT); });
    std::error_code ec;
    if (std::filesystem::is_directory("/etc/ssl/certs", ec)) systemCaPath_ = "/etc/ssl/certs";
    wakeFd_ = ::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK);
    timerFd_ = ::timerfd_create(CLOCK_MONOTONIC, TFD_CLOEXEC | TFD_NONBLOCK);  // steady_clock's clock
    epollFd_ = ::epoll_create1(EPOLL_CLOEXEC);
    const auto watch = [this](int fd) {
      epoll_event event{};
      event.events = EPOLLIN;
      event.data.fd = fd;
      return fd >= 0 && ::epoll_ctl(epollFd_, EPOLL_CTL_ADD, fd, &event) == 0;
    };
    if (epollFd_ < 0 || !watch(wakeFd_) || !watch(timerFd_)) return;
    multi_.reset(curl_multi_init());
    if (!multi_) return;
    curl_multi_setopt(multi_.get(), CURLMOPT_SOCKETFUNCTION, &Engine::watchSocket);
    curl_multi_setopt(multi_.get(), CURLMOPT_SOCKETDATA, this);
    curl_multi_setopt(multi_.get(), CURLMOPT_TIMERFUNCTION, &Engine::setTimer);
    curl_multi_setopt(multi_.get(), CURLMOPT_TIMERDATA, this);
  }

  ~Engine() {
    // `stop` leaves no thread behind; should one have been started after it, it ends on its own.
    if (thread_.joinable()) thread_.detach();
    // curl may still report sockets while its handles go, so the descriptors close last.
    active_.clear();
    pool_ = HandlePool();
    multi_.reset();
    for (const int fd : {epollFd_, timerFd_, wakeFd_}) {
      if (fd >= 0) ::close(fd);
    }
  }
  Engine(const Engine&) = delete;
  Engine& operator=(const Engine&) = delete;

  void send(Request request) {
    {
      std::unique_lock lock(mutex_);
      if (!thread_.joinable()) {
        try {
          thread_ = std::thread([self = shared_from_this()] { self->run(); });
        } catch (...) {
          // Without a network thread nothing would ever answer: answer here, as the one exception.
          lock.unlock();
          fail(request, KYTransferError::NotSent, "no network thread");
          return;
        }
      }
    }
    if (request.refusal == KYTransferError::None && usable()) {
      std::unique_lock curl(curl_);
      std::string_view why;
      if (answered_ && start(request, why)) {
        armTimer();
        const bool wake = !done_.empty();  // ended already: answering it is the thread's
        curl.unlock();
        if (wake) wakeThread();
        return;
      }
    }
    // Refused, not to be started here, or not startable here: the network thread answers it (or
    // starts it, or says why it cannot).
    {
      std::lock_guard lock(mutex_);
      queue_.push_back(std::move(request));
    }
    wakeThread();
  }

  /// Fails whatever is queued or in flight, then ends the network thread. Joins it unless called on it.
  void stop() {
    std::thread thread;
    {
      std::lock_guard lock(mutex_);
      stopping_ = true;
      thread = std::move(thread_);
    }
    wakeThread();
    if (!thread.joinable()) return;
    if (thread.get_id() == std::this_thread::get_id()) thread.detach();  // it ends on its own
    else thread.join();
  }

 private:
  using Active = std::unordered_map<CURL*, std::unique_ptr<Transfer>>;
  using Deadline = std::optional<Clock::time_point>;

  [[nodiscard]] bool usable() const noexcept { return multi_ != nullptr; }

  void wakeThread() noexcept {
    if (usable()) {
      const std::uint64_t one = 1;
      [[maybe_unused]] const auto written = ::write(wakeFd_, &one, sizeof one);
    } else {
      std::lock_guard lock(mutex_);  // a waiter between its test and its wait must not miss this
      wakeup_.notify_one();
    }
  }

  /// Sets the timerfd to curl's timer, so that the sleeping network thread wakes when it is due.
  /// Called with `curl_` held.
  void armTimer() noexcept {
    if (deadline_ == armed_) return;
    itimerspec when{};  // all zero disarms it
    if (deadline_) {
      const auto since = std::chrono::duration_cast<std::chrono::nanoseconds>(deadline_->time_since_epoch()).count();
      when.it_value.tv_sec = static_cast<time_t>(since / 1'000'000'000);
      when.it_value.tv_nsec = static_cast<long>(since % 1'000'000'000);
      if (since <= 0) when.it_value.tv_nsec = 1;  // long due, and zero would disarm it
    }
    if (::timerfd_settime(timerFd_, TFD_TIMER_ABSTIME, &when, nullptr) == 0) armed_ = deadline_;
  }

  /// curl's socket callback: keeps the epoll set as curl wants it. Called with `curl_` held.
  static int watchSocket(CURL*, curl_socket_t socket, int what, void* engine, void*) noexcept {
    const int epoll = static_cast<Engine*>(engine)->epollFd_;
    if (what == CURL_POLL_REMOVE) {
      ::epoll_ctl(epoll, EPOLL_CTL_DEL, socket, nullptr);  // a closed socket has left the set already
      return 0;
    }
    epoll_event event{};
    event.events = ((what & CURL_POLL_IN) != 0 ? EPOLLIN : 0u) | ((what & CURL_POLL_OUT) != 0 ? EPOLLOUT : 0u);
    event.data.fd = socket;
    if (::epoll_ctl(epoll, EPOLL_CTL_MOD, socket, &event) == 0) return 0;
    if (errno == ENOENT && ::epoll_ctl(epoll, EPOLL_CTL_ADD, socket, &event) == 0) return 0;
    return -1;  // a socket nobody watches would stall its transfer: curl fails it instead
  }

  /// curl's timer callback: when curl wants to be called with no socket ready. Called with `curl_` held.
  static int setTimer(CURLM*, long milliseconds, void* engine) noexcept {
    auto* self = static_cast<Engine*>(engine);
    if (milliseconds < 0) self->deadline_.reset();
    else self->deadline_ = Clock::now() + std::chrono::milliseconds(milliseconds);
    return 0;
  }

  /// Runs curl's timer while it is due (adding a transfer makes it due at once), then collects the
  /// transfers that ended. Called with `curl_` held.
  void runDueTimer() noexcept {
    // A bounded number of rounds: a timer still due afterwards is the network thread's.
    for (int round = 0; round < 4 && deadline_ && *deadline_ <= Clock::now(); ++round) {
      deadline_.reset();  // the timer fires once; curl sets it again if it wants
      int running = 0;
      curl_multi_socket_action(multi_.get(), CURL_SOCKET_TIMEOUT, 0, &running);
    }
    collectEnded();
  }

  /// Takes the ended transfers off curl into `done_`. Called with `curl_` held.
  void collectEnded() noexcept {
    int left = 0;
    while (CURLMsg* message = curl_multi_info_read(multi_.get(), &left)) {
      if (message->msg != CURLMSG_DONE) continue;
      auto node = active_.extract(message->easy_handle);
      if (!node.empty()) end(*node.mapped(), message->data.result, false);
    }  // the node frees its transfer: the handle leaves curl and goes back to the pool
  }

  /// Reads what the transfer left into its outcome and moves that to `done_`. Called with `curl_` held.
  void end(Transfer& transfer, CURLcode code, bool cancelled) noexcept {
    Outcome& outcome = transfer.ending.front();
    outcome.cancelled = cancelled;
    outcome.code = code;
    outcome.cap = transfer.cap;
    outcome.overflowed = transfer.overflowed;
    curl_easy_getinfo(transfer.easy(), CURLINFO_RESPONSE_CODE, &outcome.status);
    curl_easy_getinfo(transfer.easy(), CURLINFO_NUM_CONNECTS, &outcome.connects);
    outcome.response = std::move(transfer.response);
    outcome.answeredUrl = std::move(transfer.answeredUrl);
    try {
      char* effective = nullptr;
      curl_easy_getinfo(transfer.easy(), CURLINFO_EFFECTIVE_URL, &effective);
      if (effective != nullptr) outcome.finalUrl = effective;
      if (code != CURLE_OK) outcome.errorText = transfer.errorText(code);
    } catch (...) {
      // No memory for the words: the outcome says less, and no redirect counts without its URL.
      outcome.answeredUrl.clear();
    }
    outcome.request = std::move(transfer.request);
    if (outcome.status > 0) answered_ = true;
    done_.splice(done_.end(), transfer.ending);
  }

  /// Starts `request` and runs it as far as it goes at once. False, with `request` as it was and
  /// `why` saying why, when it cannot start. Called with `curl_` held.
  bool start(Request& request, std::string_view& why) noexcept {
    std::unique_ptr<Transfer> transfer;
    why = "the transfer could not start";
    try {
      EasyHandle easy = pool_.take();
      if (!easy) {
        why = "no transfer handle";
        return false;
      }
      transfer = std::make_unique<Transfer>(std::move(request), std::move(easy), pool_, settings_.maxResponseBytes);
      if (attach(transfer)) {
        runDueTimer();
        return true;
      }
    } catch (...) {
      // No memory: `request` moved only if the transfer was made, and comes back from it below.
    }
    if (transfer) request = std::move(transfer->request);
    return false;
  }

  /// Configures the transfer and adds it to curl; on success the engine owns it. Called with
  /// `curl_` held.
  bool attach(std::unique_ptr<Transfer>& transfer) {
    if (!configure(*transfer)) return false;
    transfer->ending.emplace_back();
    auto [slot, added] = active_.try_emplace(transfer->easy());
    if (!added) return false;
    if (!transfer->attach(multi_.get())) {
      active_.erase(slot);
      return false;
    }
    slot->second = std::move(transfer);
    return true;
  }

  /// Starts a request on the network thread, answering it when it cannot start.
  void startOnThread(Request request) noexcept {
    std::string_view why;
    bool started;
    {
      std::lock_guard curl(curl_);
      started = start(request, why);
    }
    if (!started) fail(request, KYTransferError::NotSent, why);
  }

  /// Announces a redirect and runs the completion: the command's last step, exactly once.
  static void complete(const std::shared_ptr<KYJSONCommand>& command) noexcept {
    if (command->wasRedirected()) {
      try {
        NotificationCenter::defaultCenter().post({std::string(KYCommandRedirectedNotification), command});
      } catch (...) {
        Log::shared().error("The redirect of %@ could not be announced", command->redirectedHostname());
      }
    }
    command->runCompletionBlock();
  }

  /// Logs why the exchange failed (never the credentials: they are not part of the URL).
  static void logFailure(const std::string& url, const KYJSONCommand& command) noexcept {
    const auto words = describeTransferError(command.transferError());
    if (command.transferErrorDetail().empty()) Log::shared().notice("Request to %@ failed: %@", url, words);
    else Log::shared().notice("Request to %@ failed: %@ (%@)", url, words, command.transferErrorDetail());
  }

  /// Answers a command whose request ends without an exchange.
  static void fail(const std::shared_ptr<KYJSONCommand>& command, const std::string& url, KYTransferError error,
                   std::string_view detail) noexcept {
    try {
      command->setTransferResult(error, std::nullopt, std::string(detail));
    } catch (...) {
      command->setTransferResult(error, std::nullopt);
    }
    logFailure(url, *command);
    complete(command);
  }
  static void fail(const Request& request, KYTransferError error, std::string_view detail) noexcept {
    fail(request.command, request.url, error, detail);
  }

  void run() noexcept {
    std::deque<Request> incoming;
    std::list<Outcome> ended;
    for (;;) {
      bool stopping;
      {
        std::lock_guard lock(mutex_);
        incoming.swap(queue_);
        stopping = stopping_;
      }
      for (auto& request : incoming) {
        if (request.refusal != KYTransferError::None) fail(request, request.refusal, request.refusalDetail);
        else if (stopping) fail(request, KYTransferError::Cancelled, "the transport shut down");
        else if (!usable()) fail(request, KYTransferError::NotSent, "no transfer handle");
        else startOnThread(std::move(request));
      }
      incoming.clear();
      if (stopping) return cancelAll();
      if (!usable()) {
        std::unique_lock lock(mutex_);
        wakeup_.wait(lock, [this] { return stopping_ || !queue_.empty(); });
        continue;
      }
      int timeout;
      {
        std::lock_guard curl(curl_);
        ended.splice(ended.end(), done_);
        // A timer that cannot be set would never wake the thread: then it sleeps at most 100 ms.
        if (ended.empty()) armTimer();
        timeout = deadline_ == armed_ ? -1 : 100;
      }
      if (!ended.empty()) {
        for (auto& outcome : ended) finish(outcome);
        ended.clear();
        continue;
      }
      waitAndRun(timeout);
    }
  }

  /// Sleeps until a watched socket is ready, curl's timer is due or a sender wakes the thread (or
  /// `timeout` milliseconds have passed), and lets curl carry the transfers on.
  void waitAndRun(int timeout) noexcept {
    std::array<epoll_event, 16> events;
    const int ready = ::epoll_wait(epollFd_, events.data(), static_cast<int>(events.size()), timeout);
    std::lock_guard curl(curl_);
    int running = 0;
    for (int i = 0; i < ready; ++i) {
      const int fd = events[i].data.fd;
      if (fd == wakeFd_ || fd == timerFd_) {  // read, so that they stop being ready
        std::uint64_t count = 0;
        [[maybe_unused]] const auto read = ::read(fd, &count, sizeof count);
        continue;
      }
      const std::uint32_t what = events[i].events;
      const int mask = ((what & EPOLLIN) != 0 ? CURL_CSELECT_IN : 0) | ((what & EPOLLOUT) != 0 ? CURL_CSELECT_OUT : 0) |
                       ((what & (EPOLLERR | EPOLLHUP)) != 0 ? CURL_CSELECT_ERR : 0);
      curl_multi_socket_action(multi_.get(), fd, mask, &running);
    }
    runDueTimer();
  }

  /// Ends whatever is still in flight as cancelled; what has ended is answered as it ended.
  void cancelAll() noexcept {
    std::list<Outcome> ended;
    {
      std::lock_guard curl(curl_);
      for (auto& [easy, transfer] : active_) end(*transfer, CURLE_OK, true);
      active_.clear();
      ended.splice(ended.end(), done_);
    }
    for (auto& outcome : ended) finish(outcome);
  }

  bool configure(Transfer& transfer) {
    CURL* easy = transfer.easy();
    const Request& r = transfer.request;
    if (!transfer.setHeaders()) return false;
    curl_easy_setopt(easy, CURLOPT_URL, r.url.c_str());
    curl_easy_setopt(easy, CURLOPT_PROTOCOLS_STR, "https");
    curl_easy_setopt(easy, CURLOPT_NOSIGNAL, 1L);
    curl_easy_setopt(easy, CURLOPT_POST, 1L);
    curl_easy_setopt(easy, CURLOPT_POSTFIELDS, r.body.c_str());
    curl_easy_setopt(easy, CURLOPT_POSTFIELDSIZE_LARGE, static_cast<curl_off_t>(r.body.size()));
    if (r.username) {
      curl_easy_setopt(easy, CURLOPT_HTTPAUTH, static_cast<long>(CURLAUTH_BASIC));
      curl_easy_setopt(easy, CURLOPT_USERNAME, r.username->c_str());
      curl_easy_setopt(easy, CURLOPT_PASSWORD, r.password ? r.password->c_str() : "");
    }
    // Redirects: https only, a bounded number, the POST and its body kept. The credentials go along
    // to the new host: the server names another host of the same service, and every later request
    // goes there anyway.
    curl_easy_setopt(easy, CURLOPT_FOLLOWLOCATION, 1L);
    curl_easy_setopt(easy, CURLOPT_MAXREDIRS, settings_.maxRedirects);
    curl_easy_setopt(easy, CURLOPT_REDIR_PROTOCOLS_STR, "https");
    curl_easy_setopt(easy, CURLOPT_POSTREDIR, static_cast<long>(CURL_REDIR_POST_ALL));
    curl_easy_setopt(easy, CURLOPT_UNRESTRICTED_AUTH, 1L);
    // TLS is always verified: the system's authorities plus the configured extra file.
    curl_easy_setopt(easy, CURLOPT_SSL_VERIFYPEER, 1L);
    curl_easy_setopt(easy, CURLOPT_SSL_VERIFYHOST, 2L);
    if (settings_.caFile) {
      curl_easy_setopt(easy, CURLOPT_CAINFO, settings_.caFile->c_str());
      if (!systemCaPath_.empty()) curl_easy_setopt(easy, CURLOPT_CAPATH, systemCaPath_.c_str());
    }
    curl_easy_setopt(easy, CURLOPT_CONNECTTIMEOUT_MS, curlMilliseconds(settings_.connectTimeout));
    curl_easy_setopt(easy, CURLOPT_TIMEOUT_MS, curlMilliseconds(settings_.totalTimeout));
    curl_easy_setopt(easy, CURLOPT_MAXFILESIZE_LARGE, static_cast<curl_off_t>(settings_.maxResponseBytes));
    curl_easy_setopt(easy, CURLOPT_WRITEFUNCTION, &collectBody);
    curl_easy_setopt(easy, CURLOPT_WRITEDATA, &transfer);
    // A proxy's answer to CONNECT is no answer of the server.
    curl_easy_setopt(easy, CURLOPT_SUPPRESS_CONNECT_HEADERS, 1L);
    curl_easy_setopt(easy, CURLOPT_HEADERFUNCTION, &noteResponse);
    curl_easy_setopt(easy, CURLOPT_HEADERDATA, &transfer);
    curl_easy_setopt(easy, CURLOPT_ERRORBUFFER, transfer.errorBuffer());
    curl_easy_setopt(easy, CURLOPT_ACCEPT_ENCODING, "");
    return true;
  }

  /// Hands an ended exchange to its command and completes it. Network thread, without `curl_`.
  void finish(Outcome& outcome) noexcept {
    if (outcome.cancelled) return fail(outcome.request, KYTransferError::Cancelled, "the transport shut down");
    const std::shared_ptr<KYJSONCommand> command = outcome.request.command;
    const std::string& url = outcome.request.url;
    try {
      const KYTransferError error = classify(outcome.code, outcome.status, outcome.overflowed);
      std::string detail;
      if (error == KYTransferError::HTTPStatus) detail = "HTTP " + std::to_string(outcome.status);
      else if (error == KYTransferError::ResponseTooLarge) detail = "over " + std::to_string(outcome.cap) + " bytes";
      else if (error == KYTransferError::RedirectRefused) {
        // Only the host: curl's effective URL may carry the credentials.
        detail = outcome.errorText + ", at " + authorityOf(outcome.finalUrl).value_or("an unreadable URL");
      }
      else if (error != KYTransferError::None) detail = outcome.errorText;
      command->setTransferResult(error, outcome.status > 0 ? std::optional(HTTPResponse{outcome.status}) : std::nullopt,
                                 std::move(detail));
      if (outcome.code == CURLE_OK) {
        command->setResponseBody(outcome.response, JsonLimits{settings_.maxResponseBytes, JsonLimits{}.maxDepth});
      }
      Log::shared().log(LogLevel::Debug, "Request to %@ ended: HTTP %ld, %ld new connection(s)", url, outcome.status,
                        outcome.connects);
      if (error != KYTransferError::None) logFailure(url, *command);

      // A redirect counts only when the host it led to has answered with an HTTP response (over
      // https that means after a verified handshake) and the redirect itself was allowed. A
      // redirect that ended nowhere must not become the server of every later command. An
      // exchange that ended where it began was not redirected.
      if (error != KYTransferError::RedirectRefused && !outcome.finalUrl.empty() && outcome.finalUrl != url &&
          outcome.answeredUrl == outcome.finalUrl) {
        const auto from = authorityOf(url);
        if (auto to = authorityOf(outcome.finalUrl); to && from && *to != *from) {
          command->setRedirect(outcome.request.host, *to);
        }
      }
    } catch (const std::exception& e) {
      command->setTransferResult(KYTransferError::ConnectionFailed, std::nullopt);
      Log::shared().error("Request to %@ could not be read: %@", url, e.what());
    }
    complete(command);
  }

  TransportSettings settings_;
  std::string systemCaPath_;
  int wakeFd_ = -1;   // written to wake the network thread
  int timerFd_ = -1;  // expires when curl's timer is due
  int epollFd_ = -1;  // those two and the sockets curl wants watched

  // curl and what it reaches, used by one thread at a time.
  std::mutex curl_;
  MultiHandle multi_;  // none when the engine could not be set up: every request is then refused
  HandlePool pool_;    // its handles go before the multi handle does
  Active active_;
  std::list<Outcome> done_;    // ended, for the network thread to answer
  Deadline deadline_;          // when curl wants to be called with no socket ready
  Deadline armed_;             // what the timerfd is set to
  bool answered_ = false;      // a server has answered: senders start their own transfers

  std::mutex mutex_;
  std::condition_variable wakeup_;  // only needed without a multi handle
  std::deque<Request> queue_;
  bool stopping_ = false;
  std::thread thread_;
};

class CurlServerInteractionController final : public KYServerInteractionController {
 public:
  explicit CurlServerInteractionController(TransportSettings settings)
      : engine_(std::make_shared<Engine>(std::move(settings))) {}
  ~CurlServerInteractionController() override { engine_->stop(); }

  void sendCommand(std::shared_ptr<KYJSONCommand> command, std::function<void()> completion) override {
    command->setCompletionBlock(std::move(completion));
    Request request;
    request.command = command;
    request.host = command->host().value_or("");
    if (auto url = command->url()) request.url = std::move(*url);
    if (request.url.empty()) {
      request.refusal = KYTransferError::NoHost;
      request.url = "(no host)" + command->path();
    } else if (command->scheme() != "https") {
      request.refusal = KYTransferError::NotSent;
      request.refusalDetail = "only https is sent";
    } else {
      try {
        request.body = command->jsonBody();
        const Value headers = command->headers();  // iterated below: must outlive the loop
        for (const auto& [name, value] : headers.items()) {
          request.headers.push_back(name + ": " + (value.is_string() ? value.get<std::string>() : toJson(value)));
        }
        request.headers.emplace_back("Content-Type: application/json");
        request.headers.emplace_back("Accept: application/json");
        request.headers.emplace_back("Expect:");
        request.username = command->username();
        request.password = command->password();
      } catch (const std::exception& e) {
        // The command could not say what to send: it is still answered, from the network thread.
        request.refusal = KYTransferError::NotSent;
        request.refusalDetail = e.what();
      }
    }
    engine_->send(std::move(request));
  }

 private:
  std::shared_ptr<Engine> engine_;
};

}  // namespace

std::shared_ptr<KYServerInteractionController> makeServerInteractionController(const TransportSettings& settings) {
  return std::make_shared<CurlServerInteractionController>(settings);
}

}  // namespace kyn::platform
