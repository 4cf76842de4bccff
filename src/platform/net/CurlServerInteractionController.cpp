// The HTTPS transport: libcurl's multi interface on one network thread per controller. Requests are
// built on the caller's thread; the network thread moves the bytes, fills in the command and runs
// its completion. Every command sent is answered there, also one that cannot be sent at all, so a
// caller never sees its completion run before `sendCommand` has returned. Connections are kept alive
// and reused between commands.
#include "platform/log/Log.h"
#include "platform/net/ServerInteractionController.h"
#include "platform/net/Url.h"
#include "platform/notify/NotificationCenter.h"

#include <curl/curl.h>

#include <algorithm>
#include <charconv>
#include <climits>
#include <condition_variable>
#include <deque>
#include <filesystem>
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

/// Idle easy handles, so that a transfer need not build one afresh. Network thread only.
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
  Transfer(Request what, EasyHandle easy, HandlePool& pool, std::size_t responseCap)
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

/// The state shared by a controller and its network thread; the thread keeps it alive until it ends.
/// The controller is the only sender and stops the engine only from its destructor, so nothing is
/// sent after `stop`.
class Engine : public std::enable_shared_from_this<Engine> {
 public:
  explicit Engine(TransportSettings settings) : settings_(std::move(settings)) {
    static std::once_flag global;
    std::call_once(global, [] { curl_global_init(CURL_GLOBAL_DEFAULT); });
    multi_.reset(curl_multi_init());
    std::error_code ec;
    if (std::filesystem::is_directory("/etc/ssl/certs", ec)) systemCaPath_ = "/etc/ssl/certs";
  }

  ~Engine() {
    // `stop` leaves no thread behind; should one have been started after it, it ends on its own.
    if (thread_.joinable()) thread_.detach();
  }

  void send(Request request) {
    std::unique_lock lock(mutex_);
    queue_.push_back(std::move(request));
    if (!thread_.joinable()) {
      try {
        thread_ = std::thread([self = shared_from_this()] { self->run(); });
      } catch (...) {
        // Without a network thread nothing would ever answer: answer here, as the one exception.
        Request failed = std::move(queue_.back());
        queue_.pop_back();
        lock.unlock();
        fail(failed, KYTransferError::NotSent, "no network thread");
        return;
      }
    }
    wake();
  }

  /// Fails whatever is queued or in flight, then ends the network thread. Joins it unless called on it.
  void stop() {
    std::thread thread;
    {
      std::lock_guard lock(mutex_);
      stopping_ = true;
      wake();
      thread = std::move(thread_);
    }
    if (!thread.joinable()) return;
    if (thread.get_id() == std::this_thread::get_id()) thread.detach();  // it ends on its own
    else thread.join();
  }

 private:
  using Active = std::unordered_map<CURL*, std::unique_ptr<Transfer>>;

  void wake() {
    if (multi_) curl_multi_wakeup(multi_.get());
    wakeup_.notify_one();
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
    Active active;
    for (;;) {
      std::deque<Request> incoming;
      bool stopping;
      {
        std::lock_guard lock(mutex_);
        incoming.swap(queue_);
        stopping = stopping_;
      }
      for (auto& request : incoming) {
        if (request.refusal != KYTransferError::None) fail(request, request.refusal, request.refusalDetail);
        else if (stopping) fail(request, KYTransferError::Cancelled, "the transport shut down");
        else begin(std::move(request), active);
      }
      if (stopping) {
        for (auto& [easy, transfer] : active) {
          const auto command = transfer->request.command;
          const std::string url = std::move(transfer->request.url);
          transfer.reset();
          fail(command, url, KYTransferError::Cancelled, "the transport shut down");
        }
        return;
      }
      if (multi_) {
        int running = 0;
        curl_multi_perform(multi_.get(), &running);
        int left = 0;
        while (CURLMsg* message = curl_multi_info_read(multi_.get(), &left)) {
          if (message->msg != CURLMSG_DONE) continue;
          const CURLcode code = message->data.result;
          auto node = active.extract(message->easy_handle);
          if (!node.empty()) finish(std::move(node.mapped()), code);
        }
      }
      waitForWork(!active.empty());
    }
  }

  void waitForWork(bool transfersRunning) {
    if (multi_) {
      curl_multi_poll(multi_.get(), nullptr, 0, 1000, nullptr);
      return;
    }
    // Without a multi handle there is nothing to poll: wait for requests to turn down.
    std::unique_lock lock(mutex_);
    if (!transfersRunning) wakeup_.wait(lock, [this] { return stopping_ || !queue_.empty(); });
  }

  void begin(Request request, Active& active) noexcept {
    const auto command = request.command;
    try {
      EasyHandle easy = multi_ ? pool_.take() : EasyHandle();
      if (!easy) return fail(request, KYTransferError::NotSent, "no transfer handle");
      auto transfer = std::make_unique<Transfer>(std::move(request), std::move(easy), pool_, settings_.maxResponseBytes);
      if (!configure(*transfer) || !transfer->attach(multi_.get())) {
        const std::string url = transfer->request.url;
        transfer.reset();
        return fail(command, url, KYTransferError::NotSent, "the transfer could not start");
      }
      CURL* key = transfer->easy();
      active.emplace(key, std::move(transfer));
    } catch (const std::exception& e) {
      fail(command, "(unsent)", KYTransferError::NotSent, e.what());
    }
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

  void finish(std::unique_ptr<Transfer> transfer, CURLcode code) noexcept {
    const std::shared_ptr<KYJSONCommand> command = transfer->request.command;
    try {
      long status = 0;
      long connects = 0;
      char* effective = nullptr;
      curl_easy_getinfo(transfer->easy(), CURLINFO_RESPONSE_CODE, &status);
      curl_easy_getinfo(transfer->easy(), CURLINFO_NUM_CONNECTS, &connects);
      curl_easy_getinfo(transfer->easy(), CURLINFO_EFFECTIVE_URL, &effective);
      const std::string finalUrl = effective != nullptr ? effective : "";

      const KYTransferError error = classify(code, status, transfer->overflowed);
      std::string detail;
      if (error == KYTransferError::HTTPStatus) detail = "HTTP " + std::to_string(status);
      else if (error == KYTransferError::ResponseTooLarge) detail = "over " + std::to_string(transfer->cap) + " bytes";
      else if (error == KYTransferError::RedirectRefused) {
        // Only the host: curl's effective URL may carry the credentials.
        detail = transfer->errorText(code) + ", at " + authorityOf(finalUrl).value_or("an unreadable URL");
      }
      else if (error != KYTransferError::None) detail = transfer->errorText(code);
      command->setTransferResult(error, status > 0 ? std::optional(HTTPResponse{status}) : std::nullopt,
                                 std::move(detail));
      if (code == CURLE_OK) {
        command->setResponseBody(transfer->response, JsonLimits{settings_.maxResponseBytes, JsonLimits{}.maxDepth});
      }
      Log::shared().log(LogLevel::Debug, "Request to %@ ended: HTTP %ld, %ld new connection(s)", transfer->request.url,
                        status, connects);
      if (error != KYTransferError::None) logFailure(transfer->request.url, *command);

      // A redirect counts only when the host it led to has answered with an HTTP response (over
      // https that means after a verified handshake) and the redirect itself was allowed. A
      // redirect that ended nowhere must not become the server of every later command.
      if (error != KYTransferError::RedirectRefused && !finalUrl.empty() && transfer->answeredUrl == finalUrl) {
        const auto from = authorityOf(transfer->request.url);
        if (auto to = authorityOf(finalUrl); to && from && *to != *from) {
          command->setRedirect(transfer->request.host, *to);
        }
      }
    } catch (const std::exception& e) {
      command->setTransferResult(KYTransferError::ConnectionFailed, std::nullopt);
      Log::shared().error("Request to %@ could not be read: %@", transfer->request.url, e.what());
    }
    transfer.reset();
    complete(command);
  }

  TransportSettings settings_;
  std::string systemCaPath_;
  MultiHandle multi_;
  HandlePool pool_;  // network thread only; its handles go before the multi handle does

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
