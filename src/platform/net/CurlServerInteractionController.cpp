// The HTTPS transport: libcurl's multi interface on one network thread per controller. Requests are
// built on the caller's thread; the network thread only moves bytes, fills in the command and runs
// its completion. Connections are kept alive and reused between commands.
#include "platform/log/Log.h"
#include "platform/net/ServerInteractionController.h"
#include "platform/notify/NotificationCenter.h"

#include <curl/curl.h>

#include <atomic>
#include <condition_variable>
#include <deque>
#include <filesystem>
#include <mutex>
#include <thread>
#include <unordered_map>

namespace kyn::platform {
namespace {

/// host[:port] of a URL, the port only when it is not the scheme's default.
std::optional<std::string> authorityOf(const char* url) {
  CURLU* u = curl_url();
  if (u == nullptr) return std::nullopt;
  std::optional<std::string> authority;
  char* host = nullptr;
  char* port = nullptr;
  if (curl_url_set(u, CURLUPART_URL, url, 0) == CURLUE_OK && curl_url_get(u, CURLUPART_HOST, &host, 0) == CURLUE_OK) {
    authority = host;
    if (curl_url_get(u, CURLUPART_PORT, &port, CURLU_NO_DEFAULT_PORT) == CURLUE_OK && port != nullptr) {
      *authority += ":";
      *authority += port;
    }
  }
  curl_free(host);
  curl_free(port);
  curl_url_cleanup(u);
  return authority;
}

/// A command with its request, built on the sender's thread.
struct Request {
  std::shared_ptr<KYJSONCommand> command;
  std::string url;
  std::string body;
  std::vector<std::string> headers;
  std::optional<std::string> username;
  std::optional<std::string> password;
  std::string host;
};

/// One exchange on the wire.
struct Transfer {
  Request request;
  CURL* easy = nullptr;
  curl_slist* headers = nullptr;
  std::string response;
  std::size_t cap = 0;
  bool overflowed = false;
  char error[CURL_ERROR_SIZE] = {};
};

std::size_t collectBody(char* data, std::size_t size, std::size_t count, void* user) {
  auto* transfer = static_cast<Transfer*>(user);
  const std::size_t bytes = size * count;
  if (transfer->response.size() + bytes > transfer->cap) {
    transfer->overflowed = true;
    return 0;  // makes curl stop with a write error
  }
  transfer->response.append(data, bytes);
  return bytes;
}

/// The state shared by a controller and its network thread; the thread keeps it alive until it ends.
class Engine : public std::enable_shared_from_this<Engine> {
 public:
  explicit Engine(TransportSettings settings) : settings_(std::move(settings)) {
    static std::once_flag global;
    std::call_once(global, [] { curl_global_init(CURL_GLOBAL_DEFAULT); });
    multi_ = curl_multi_init();
    std::error_code ec;
    if (std::filesystem::is_directory("/etc/ssl/certs", ec)) systemCaPath_ = "/etc/ssl/certs";
  }

  ~Engine() {
    for (CURL* easy : idle_) curl_easy_cleanup(easy);
    if (multi_ != nullptr) curl_multi_cleanup(multi_);
  }

  void send(Request request) {
    {
      std::lock_guard lock(mutex_);
      if (!stopping_ && multi_ != nullptr) {
        queue_.push_back(std::move(request));
        if (!thread_.joinable()) thread_ = std::thread([self = shared_from_this()] { self->run(); });
        curl_multi_wakeup(multi_);
        return;
      }
    }
    Log::shared().notice("Request %@ not sent: the transport is shutting down", request.command->description());
    complete(request.command);
  }

  /// Fails whatever is queued or in flight, then ends the network thread. Joins it unless called on it.
  void stop() {
    std::thread thread;
    {
      std::lock_guard lock(mutex_);
      stopping_ = true;
      if (multi_ != nullptr) curl_multi_wakeup(multi_);
      thread = std::move(thread_);
    }
    if (!thread.joinable()) return;
    if (thread.get_id() == std::this_thread::get_id()) thread.detach();  // it ends on its own
    else thread.join();
  }

 private:
  /// Announces a redirect and runs the completion: the command's last step, exactly once.
  static void complete(const std::shared_ptr<KYJSONCommand>& command) {
    if (command->wasRedirected()) {
      NotificationCenter::defaultCenter().post({std::string(KYCommandRedirectedNotification), command});
    }
    command->runCompletionBlock();
  }

  void run() {
    std::unordered_map<CURL*, std::unique_ptr<Transfer>> active;
    for (;;) {
      std::deque<Request> incoming;
      bool stopping;
      {
        std::lock_guard lock(mutex_);
        incoming.swap(queue_);
        stopping = stopping_;
      }
      if (stopping) {
        for (auto& [easy, transfer] : active) {
          curl_multi_remove_handle(multi_, easy);
          Log::shared().notice("Request to %@ cancelled: the transport is shutting down", transfer->request.url);
          release(*transfer);
          complete(transfer->request.command);
        }
        for (auto& request : incoming) complete(request.command);
        return;
      }
      for (auto& request : incoming) begin(std::move(request), active);

      int running = 0;
      curl_multi_perform(multi_, &running);
      int left = 0;
      while (CURLMsg* message = curl_multi_info_read(multi_, &left)) {
        if (message->msg != CURLMSG_DONE) continue;
        CURL* easy = message->easy_handle;
        const CURLcode code = message->data.result;
        curl_multi_remove_handle(multi_, easy);
        auto node = active.extract(easy);
        if (node.empty()) continue;
        finish(*node.mapped(), code);
      }
      curl_multi_poll(multi_, nullptr, 0, 1000, nullptr);
    }
  }

  void begin(Request request, std::unordered_map<CURL*, std::unique_ptr<Transfer>>& active) {
    CURL* easy = nullptr;
    if (!idle_.empty()) {
      easy = idle_.back();
      idle_.pop_back();
      curl_easy_reset(easy);
    } else {
      easy = curl_easy_init();
    }
    if (easy == nullptr) {
      Log::shared().error("Request to %@ not sent: no transfer handle", request.url);
      complete(request.command);
      return;
    }
    auto transfer = std::make_unique<Transfer>();
    transfer->request = std::move(request);
    transfer->easy = easy;
    transfer->cap = settings_.maxResponseBytes;
    for (const auto& header : transfer->request.headers) {
      transfer->headers = curl_slist_append(transfer->headers, header.c_str());
    }
    const Request& r = transfer->request;
    curl_easy_setopt(easy, CURLOPT_PRIVATE, transfer.get());
    curl_easy_setopt(easy, CURLOPT_URL, r.url.c_str());
    curl_easy_setopt(easy, CURLOPT_PROTOCOLS_STR, "https");
    curl_easy_setopt(easy, CURLOPT_NOSIGNAL, 1L);
    curl_easy_setopt(easy, CURLOPT_POST, 1L);
    curl_easy_setopt(easy, CURLOPT_POSTFIELDS, r.body.c_str());
    curl_easy_setopt(easy, CURLOPT_POSTFIELDSIZE_LARGE, static_cast<curl_off_t>(r.body.size()));
    curl_easy_setopt(easy, CURLOPT_HTTPHEADER, transfer->headers);
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
    curl_easy_setopt(easy, CURLOPT_CONNECTTIMEOUT_MS, static_cast<long>(settings_.connectTimeout.count()));
    curl_easy_setopt(easy, CURLOPT_TIMEOUT_MS, static_cast<long>(settings_.totalTimeout.count()));
    curl_easy_setopt(easy, CURLOPT_MAXFILESIZE_LARGE, static_cast<curl_off_t>(settings_.maxResponseBytes));
    curl_easy_setopt(easy, CURLOPT_WRITEFUNCTION, &collectBody);
    curl_easy_setopt(easy, CURLOPT_WRITEDATA, transfer.get());
    curl_easy_setopt(easy, CURLOPT_ERRORBUFFER, transfer->error);
    curl_easy_setopt(easy, CURLOPT_ACCEPT_ENCODING, "");

    if (curl_multi_add_handle(multi_, easy) != CURLM_OK) {
      Log::shared().error("Request to %@ not sent: the transfer could not start", r.url);
      release(*transfer);
      complete(transfer->request.command);
      return;
    }
    active.emplace(easy, std::move(transfer));
  }

  void finish(Transfer& transfer, CURLcode code) {
    const std::shared_ptr<KYJSONCommand> shared = transfer.request.command;
    KYJSONCommand& command = *shared;
    long status = 0;
    long redirects = 0;
    long connects = 0;
    char* effective = nullptr;
    curl_easy_getinfo(transfer.easy, CURLINFO_RESPONSE_CODE, &status);
    curl_easy_getinfo(transfer.easy, CURLINFO_NUM_CONNECTS, &connects);
    curl_easy_getinfo(transfer.easy, CURLINFO_REDIRECT_COUNT, &redirects);
    curl_easy_getinfo(transfer.easy, CURLINFO_EFFECTIVE_URL, &effective);

    const bool successful = code == CURLE_OK && status >= 200 && status < 300;
    command.setTransferResult(successful, status > 0 ? std::optional<HTTPResponse>(HTTPResponse{status}) : std::nullopt);
    if (code == CURLE_OK && !transfer.overflowed) {
      command.setResponseBody(transfer.response, JsonLimits{settings_.maxResponseBytes, JsonLimits{}.maxDepth});
    }
    Log::shared().log(LogLevel::Debug, "Request to %@ ended: HTTP %ld, %ld new connection(s)", transfer.request.url,
                      status, connects);
    if (code != CURLE_OK) {
      const char* reason = transfer.overflowed ? "the response is larger than allowed"
                           : transfer.error[0] != '\0' ? transfer.error
                                                       : curl_easy_strerror(code);
      Log::shared().notice("Request to %@ failed: %@", transfer.request.url, reason);
    }
    // A redirect counts once the new host has answered over verified TLS.
    if (redirects > 0 && status > 0 && effective != nullptr) {
      if (auto host = authorityOf(effective); host && *host != transfer.request.host) {
        command.setRedirect(transfer.request.host, *host);
      }
    }
    release(transfer);
    complete(shared);
  }

  void release(Transfer& transfer) {
    curl_slist_free_all(transfer.headers);
    transfer.headers = nullptr;
    if (transfer.easy != nullptr) idle_.push_back(transfer.easy);
    transfer.easy = nullptr;
  }

  TransportSettings settings_;
  std::string systemCaPath_;
  CURLM* multi_ = nullptr;
  std::vector<CURL*> idle_;  // network thread only

  std::mutex mutex_;
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
    if (auto url = command->url()) {
      request.url = std::move(*url);
    } else {
      Log::shared().notice("Request %@ not sent: no server host", command->description());
      command->setTransferResult(false, std::nullopt);
      command->runCompletionBlock();
      return;
    }
    request.body = toJson(command->jsonBodyDictionary());
    const Value headers = command->headers();  // iterated below: must outlive the loop
    for (const auto& [name, value] : headers.items()) {
      request.headers.push_back(name + ": " + (value.is_string() ? value.get<std::string>() : toJson(value)));
    }
    request.headers.emplace_back("Content-Type: application/json");
    request.headers.emplace_back("Accept: application/json");
    request.headers.emplace_back("Expect:");
    request.username = command->username();
    request.password = command->password();
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
