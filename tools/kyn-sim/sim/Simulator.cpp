#include "sim/Simulator.h"

#include "sim/Compression.h"
#include "sim/Control.h"
#include "sim/DataSet.h"
#include "sim/Files.h"
#include "sim/Http.h"
#include "sim/RequestLog.h"

#include <algorithm>
#include <cctype>
#include <csignal>

#include <sys/socket.h>
#include <openssl/ssl.h>

namespace kyn::sim {

namespace {

std::optional<std::string> header(const httplib::Request& request, const char* name) {
  if (!request.has_header(name)) return std::nullopt;
  return request.get_header_value(name);
}

std::int64_t millisecondsSince1970(std::chrono::system_clock::time_point time) {
  return std::chrono::duration_cast<std::chrono::milliseconds>(time.time_since_epoch()).count();
}

// Aborts the TCP connection under a TLS session at once, with a reset and no HTTP answer.
// Disconnecting with AF_UNSPEC makes the kernel send the RST now while the descriptor stays valid, so
// the library's later write fails harmlessly and its close() touches no reused descriptor; the
// zero linger makes that close() send a RST too should the disconnect not have.
void resetConnection(const httplib::Request& request) {
  const int fd = request.ssl ? SSL_get_fd(request.ssl) : -1;
  if (fd < 0) return;
  const linger abort{1, 0};
  ::setsockopt(fd, SOL_SOCKET, SO_LINGER, &abort, sizeof abort);
  sockaddr unspecified{};
  unspecified.sa_family = AF_UNSPEC;
  ::connect(fd, &unspecified, sizeof unspecified);
}

void wipe(std::string& secret) {
  secret.assign(secret.size(), '\0');
  secret.clear();
}

}  // namespace

std::string readTokenFile(const std::filesystem::path& path) {
  std::string token;
  try {
    token = readFile(path);
  } catch (const std::exception& e) {
    throw StartupError(std::string("token file: ") + e.what());
  }
  while (!token.empty() && std::isspace(static_cast<unsigned char>(token.back()))) token.pop_back();
  if (token.empty()) throw StartupError("token file " + path.string() + " is empty");
  return token;
}

std::pair<std::string, std::string> readAccountOption(std::string_view value) {
  const auto colon = value.find(':');
  if (colon == 0 || colon == std::string_view::npos || colon + 1 == value.size()) {
    throw StartupError("--account takes ID:TOKENFILE, not \"" + std::string(value) + "\"");
  }
  return {std::string(value.substr(0, colon)), readTokenFile(std::string(value.substr(colon + 1)))};
}

std::vector<std::string> certificateNames(const Options& options) {
  std::vector<std::string> names = defaultServerNames();
  auto add = [&](const std::string& name) {
    if (std::find(names.begin(), names.end(), name) == names.end()) names.push_back(name);
  };
  for (const auto& h : options.hosts) add(h);
  if (options.canonicalHost) add(*options.canonicalHost);
  return names;
}

Simulator::Simulator(Options options) : options_(std::move(options)) {
  if (options_.personId.empty()) throw StartupError("no person id: give --person");
  if (options_.token.empty()) throw StartupError("no token: give --token-file or set KYN_SIM_TOKEN");
  if (options_.port < 0 || options_.port > 65535) throw StartupError("--port must be 0 to 65535");
  if (options_.faultCount && *options_.faultCount < 0) throw StartupError("--fault-count must not be negative");
  if (options_.fault.kind == Fault::Kind::Body) {
    // Read again for every request, so that a test may swap it; but it must exist now.
    try {
      (void)readFile(options_.fault.bodyPath);
    } catch (const std::exception& e) {
      throw StartupError(std::string("--fault body: ") + e.what());
    }
  }

  DataSet data;
  try {
    data = parseDataSet(readFile(options_.dataPath));
  } catch (const std::exception& e) {
    throw StartupError("data set " + options_.dataPath.string() + ": " + e.what());
  }
  // Account 0 is --person's; the data set numbers the others, which sign in once given a token.
  data.accounts[0].personId = options_.personId;
  Authoriser authoriser(options_.personId, options_.token);
  for (std::size_t i = 1; i < data.accounts.size(); ++i) {
    const std::string& id = data.accounts[i].personId;
    if (id == options_.personId) throw StartupError("data set: accounts." + id + " is the --person account");
    const auto given = std::find_if(options_.accounts.begin(), options_.accounts.end(),
                                    [&](const auto& account) { return account.first == id; });
    authoriser.add(id, given == options_.accounts.end() ? std::nullopt
                                                         : std::optional<std::string_view>(given->second));
  }
  for (const auto& [id, token] : options_.accounts) {
    const auto known = std::find_if(data.accounts.begin() + 1, data.accounts.end(),
                                    [&](const Account& account) { return account.personId == id; });
    if (known == data.accounts.end()) throw StartupError("--account " + id + ": the data set has no such account");
    if (std::count_if(options_.accounts.begin(), options_.accounts.end(),
                      [&](const auto& account) { return account.first == id; }) > 1) {
      throw StartupError("--account " + id + " is given twice");
    }
  }

  ServerIdentity identity;
  try {
    identity = makeServerIdentity(certificateNames(options_));
  } catch (const std::invalid_argument& e) {
    throw StartupError(e.what());
  }
  caPem_ = toPem(identity.caCertificate.get());
  if (options_.caOut) {
    try {
      writeFileAtomically(*options_.caOut, caPem_);
    } catch (const std::exception& e) {
      throw StartupError(std::string("--ca-out: ") + e.what());
    }
  }
  const auto open = [](const std::optional<std::filesystem::path>& path, const char* option) {
    try {
      return path ? std::make_unique<JsonLinesFile>(*path) : nullptr;
    } catch (const std::exception& e) {
      throw StartupError(std::string(option) + ": " + e.what());
    }
  };
  log_ = open(options_.logFile, "--log-file");
  notifications_ = open(options_.notificationsFile, "--notifications-file");

  RouterOptions routing{options_.canonicalHost, options_.fault, options_.faultCount, options_.faultPaths, {}};
  if (options_.controlFile) {
    controlSecret_ = makeControlSecret();
    routing.control = Authoriser(kControlUser, controlSecret_);
  }
  World::Sink notify;
  if (notifications_) notify = [file = notifications_.get()](const Json& line) { file->record(line); };
  router_ = std::make_unique<Router>(std::move(data), std::move(authoriser), std::move(routing), std::move(notify));
  // Only the router's digests are needed from here on.
  wipe(options_.token);
  for (auto& account : options_.accounts) wipe(account.second);

  // The library takes its own references to the certificate and key.
  server_ = std::make_unique<httplib::SSLServer>(identity.serverCertificate.get(), identity.serverKey.get());
  if (!server_->is_valid()) throw StartupError("the TLS server could not be set up");
  // Connections stay open for reuse, but idle ones close soon, which also bounds how long stop() waits.
  server_->set_keep_alive_max_count(1000);
  server_->set_keep_alive_timeout(2);
  // An answer leaves in more than one write; without this, Nagle's algorithm holds the last one back
  // until the client's delayed acknowledgement, some 40 ms per request on a kept-alive connection.
  server_->set_tcp_nodelay(true);
  const auto handler = [this](const httplib::Request& request, httplib::Response& response) {
    serve(request, response);
  };
  server_->Get(".*", handler);
  server_->Post(".*", handler);
  server_->Put(".*", handler);
  server_->Patch(".*", handler);
  server_->Delete(".*", handler);
  server_->Options(".*", handler);
}

Simulator::~Simulator() { stop(); }

int Simulator::bind() {
  const int port = options_.port == 0 ? server_->bind_to_any_port(options_.listen)
                                      : (server_->bind_to_port(options_.listen, options_.port) ? options_.port : -1);
  if (port <= 0) {
    throw StartupError("cannot listen on " + options_.listen + " port " + std::to_string(options_.port));
  }
  port_ = port;
  router_->setPort(port);
  if (options_.portFile) {
    try {
      writeFileAtomically(*options_.portFile, std::to_string(port) + "\n");
    } catch (const std::exception& e) {
      throw StartupError(std::string("--port-file: ") + e.what());
    }
  }
  if (options_.controlFile) {
    // A wildcard address is reached on loopback.
    std::string host = options_.listen;
    if (host == "0.0.0.0") host = "127.0.0.1";
    if (host == "::") host = "::1";
    try {
      writeFileAtomically(*options_.controlFile, controlFileText({host, port, caPem_, controlSecret_}), 0600);
    } catch (const std::exception& e) {
      throw StartupError(std::string("--control-file: ") + e.what());
    }
    wipe(controlSecret_);
  }
  return port;
}

void Simulator::run() {
  // A peer that goes away while TLS writes to it must not kill the process.
  std::signal(SIGPIPE, SIG_IGN);
  {
    std::lock_guard lock(mutex_);
    if (stopping_ || port_ == 0) return;
    running_ = true;
  }
  server_->listen_after_bind();
  {
    std::lock_guard lock(mutex_);
    running_ = false;
  }
  changed_.notify_all();
}

void Simulator::stop() {
  std::unique_lock lock(mutex_);
  stopping_ = true;
  changed_.notify_all();
  // The library ignores stop() until its accept loop has begun, so repeat until run() returned.
  while (running_) {
    lock.unlock();
    server_->stop();
    lock.lock();
    changed_.wait_for(lock, std::chrono::milliseconds(10), [this] { return !running_; });
  }
}

void Simulator::pause(std::chrono::milliseconds delay) {
  std::unique_lock lock(mutex_);
  changed_.wait_for(lock, delay, [this] { return stopping_; });
}

void Simulator::serve(const httplib::Request& request, httplib::Response& response) {
  Call call;
  call.method = request.method;
  call.target = request.target;
  call.path = request.path;
  call.host = request.get_header_value("Host");
  call.authorization = header(request, "Authorization");
  call.apiVersion = header(request, "X-Zanto-Vorn-API-Ver");
  call.authScheme = header(request, "X-Zanto-AuthScheme");
  call.body = request.body;

  const auto now = std::chrono::system_clock::now();
  Outcome outcome = router_->handle(call, millisecondsSince1970(now));
  // Recorded before the answer leaves, so a client that has its answer finds the line.
  if (log_ || observer_) {
    const Json line = requestLogLine(call, outcome, now);
    if (log_) log_->record(line);
    if (observer_) observer_(line);
  }
  if (outcome.reply.delay.count() > 0) pause(outcome.reply.delay);

  Reply& reply = outcome.reply;
  if (reply.delivery == Reply::Delivery::Reset) {
    resetConnection(request);
    response.status = 500;  // never sent: the connection is gone
    return;
  }
  response.status = reply.status;
  for (const auto& [name, value] : reply.headers) response.set_header(name, value);
  if (reply.delivery == Reply::Delivery::Truncate) {
    // Content-Length announces the whole body; the provider sends the first half and then fails,
    // which makes the library drop the connection without a TLS close.
    auto body = std::make_shared<std::string>(std::move(reply.body));
    auto sent = std::make_shared<bool>(false);
    response.set_content_provider(body->size(), reply.contentType,
                                  [body, sent](std::size_t, std::size_t, httplib::DataSink& sink) {
                                    if (*sent) return false;
                                    *sent = true;
                                    return sink.write(body->data(), body->size() / 2);
                                  });
    return;
  }
  if (reply.body.empty()) {
    response.set_content("", reply.contentType);
    return;
  }
  // Left to itself the library compresses every answer with brotli at its top quality, which costs
  // milliseconds per answer. A body handed over with its length goes out as it is, so the server
  // decides here as a service's front end does: short answers plain, longer ones gzip at the
  // fastest level for a client that takes gzip.
  auto body = std::make_shared<std::string>(std::move(reply.body));
  if (body->size() >= kCompressFrom) {
    response.set_header("Vary", "Accept-Encoding");
    if (acceptsGzip(request.get_header_value("Accept-Encoding"))) {
      if (auto packed = gzip(*body)) {
        *body = std::move(*packed);
        response.set_header("Content-Encoding", "gzip");
      }
    }
  }
  response.set_content_provider(body->size(), reply.contentType,
                                [body](std::size_t offset, std::size_t length, httplib::DataSink& sink) {
                                  return sink.write(body->data() + offset, length);
                                });
}

}  // namespace kyn::sim
