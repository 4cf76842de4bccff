#include "sim/Control.h"

#include "sim/GetLocations.h"
#include "sim/Http.h"

#include <array>
#include <charconv>
#include <memory>
#include <stdexcept>

#include <openssl/bio.h>
#include <openssl/pem.h>
#include <openssl/rand.h>
#include <openssl/x509.h>

namespace kyn::sim {

namespace {

// A store that trusts the certificates of a PEM text and nothing else.
X509_STORE* storeOf(const std::string& pem) {
  std::unique_ptr<BIO, decltype(&BIO_free)> bio(BIO_new_mem_buf(pem.data(), static_cast<int>(pem.size())), BIO_free);
  std::unique_ptr<X509_STORE, decltype(&X509_STORE_free)> store(X509_STORE_new(), X509_STORE_free);
  if (!bio || !store) return nullptr;
  int added = 0;
  while (X509* certificate = PEM_read_bio_X509(bio.get(), nullptr, nullptr, nullptr)) {
    added += X509_STORE_add_cert(store.get(), certificate);
    X509_free(certificate);
  }
  return added > 0 ? store.release() : nullptr;
}

}  // namespace

std::string urlHost(const std::string& host) {
  return host.find(':') != std::string::npos ? "[" + host + "]" : host;
}

std::string controlUrl(const ControlAccess& access) {
  return "https://" + urlHost(access.host) + ":" + std::to_string(access.port);
}

std::string makeControlSecret() {
  std::array<unsigned char, 32> bytes{};
  if (RAND_bytes(bytes.data(), static_cast<int>(bytes.size())) != 1) {
    throw std::runtime_error("no random bytes for the control secret");
  }
  static constexpr char kHex[] = "0123456789abcdef";
  std::string secret;
  for (const unsigned char b : bytes) {
    secret.push_back(kHex[b >> 4]);
    secret.push_back(kHex[b & 0x0f]);
  }
  return secret;
}

std::string controlFileText(const ControlAccess& access) {
  const Json file = {{"url", controlUrl(access)},
                     {"ca", access.caPem},
                     {"secret", access.secret}};
  return file.dump(2) + "\n";
}

ControlAccess parseControlFile(std::string_view text) {
  const Json file = Json::parse(text, nullptr, false);
  const auto member = [&](const char* key) {
    if (!file.is_object() || !file.contains(key) || !file[key].is_string()) {
      throw std::invalid_argument(std::string("not a control file of kyn-sim: no \"") + key + "\"");
    }
    return file[key].get<std::string>();
  };
  ControlAccess access;
  const std::string url = member("url");
  access.caPem = member("ca");
  access.secret = member("secret");
  constexpr std::string_view scheme = "https://";
  const auto colon = url.rfind(':');
  if (url.rfind(scheme, 0) != 0 || colon == std::string::npos || colon < scheme.size()) {
    throw std::invalid_argument("control file: \"url\" is not https://HOST:PORT");
  }
  access.host = url.substr(scheme.size(), colon - scheme.size());
  if (access.host.size() > 2 && access.host.front() == '[' && access.host.back() == ']') {
    access.host = access.host.substr(1, access.host.size() - 2);
  }
  const std::string_view port = std::string_view(url).substr(colon + 1);
  const auto [end, ec] = std::from_chars(port.data(), port.data() + port.size(), access.port);
  if (ec != std::errc{} || end != port.data() + port.size() || access.port <= 0 || access.port > 65535) {
    throw std::invalid_argument("control file: \"url\" has no valid port");
  }
  return access;
}

std::optional<Json> answerMove(World& world, const Json& request, std::int64_t nowMs) {
  const auto number = [&](const char* key) { return request.contains(key) && request[key].is_number(); };
  if (!request.is_object() || !request.contains("handle") || !request["handle"].is_string() || !number("latitude") ||
      !number("longitude")) {
    throw BadRequest("a move needs \"handle\", \"latitude\" and \"longitude\"");
  }
  const Coordinate to{request["latitude"].get<double>(), request["longitude"].get<double>()};
  if (to.latitude < -90 || to.latitude > 90 || to.longitude < -180 || to.longitude > 180) {
    throw BadRequest("latitude -90 to 90 and longitude -180 to 180, please");
  }
  std::optional<double> accuracy;
  if (request.contains("horizontalAccuracy")) {
    if (!number("horizontalAccuracy") || request["horizontalAccuracy"].get<double>() < 0) {
      throw BadRequest("\"horizontalAccuracy\" must be a number of metres");
    }
    accuracy = request["horizontalAccuracy"].get<double>();
  }
  return world.move(request["handle"].get<std::string>(), to, accuracy, nowMs);
}

ControlResult postControl(const ControlAccess& access, std::string_view path, const Json& body) {
  ControlResult result;
  httplib::SSLClient client(access.host, access.port);
  X509_STORE* store = storeOf(access.caPem);
  if (!store) {
    result.error = "the control file holds no CA certificate";
    return result;
  }
  client.set_ca_cert_store(store);  // the client owns it from here
  client.enable_server_certificate_verification(true);
  client.set_basic_auth(std::string(kControlUser).c_str(), access.secret.c_str());
  client.set_connection_timeout(std::chrono::seconds(10));
  client.set_read_timeout(std::chrono::seconds(30));
  auto response = client.Post(std::string(path).c_str(), body.dump(), "application/json");
  if (!response) {
    result.error = "no answer from " + controlUrl(access) + ": " +
                   httplib::to_string(response.error());
    return result;
  }
  result.status = response->status;
  result.body = response->body;
  return result;
}

}  // namespace kyn::sim
