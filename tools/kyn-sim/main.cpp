// kyn-sim: the reference location-sharing server over HTTPS, for the demo and integration tests.
#include "sim/Faults.h"
#include "sim/Simulator.h"

#include <CLI/CLI.hpp>

#include <atomic>
#include <csignal>
#include <cstdlib>
#include <iostream>
#include <thread>

#include <pthread.h>
#include <unistd.h>

namespace {

constexpr int kStartupFailure = 2;

const char* const kDescription =
    "kyn-sim: a location-sharing server for tests and demos, over HTTPS.\n"
    "\n"
    "At start it makes a throw-away CA and a server certificate for localhost, 127.0.0.1, 127.0.0.2,\n"
    "every --host and the --canonical-host, writes the CA to --ca-out, and prints\n"
    "  kyn-sim listening on https://ADDRESS:PORT\n"
    "once it accepts connections. Requests authenticate with HTTP Basic: the person id and the token.\n"
    "It answers POST /kytrservice/friends/va/getlocations from the data set, and stops with exit\n"
    "status 0 on SIGTERM or SIGINT. Start-up errors exit with status 2.\n"
    "\n"
    "Data set (--data), JSON:\n"
    "  {\"friends\": {\"ada@example.com\": {\"location\": {\"latitude\": 45.5152, \"longitude\": -122.6784,\n"
    "                 \"horizontalAccuracy\": 65.0, \"streetAddress\": \"1 Example Way\",\n"
    "                 \"labels\": [{\"label\": \"Work\"}],\n"
    "                 \"address\": {\"locality\": \"Portland\", \"stateCode\": \"OR\"}},\n"
    "               \"ageSeconds\": 300},\n"
    "               \"+15035550102\": {\"pending\": true}},\n"
    "   \"serverContext\": {\"minCallbackIntervalInMS\": 5000}}\n"
    "  Friends are keyed by e-mail address or E.164 phone number. A friend's fix is \"ageSeconds\" old\n"
    "  at each request, or has the fixed \"timestamp\" (ms since 1970). \"comment\" members are ignored.\n"
    "\n"
    "Faults (--fault) shape answers of getlocations: status:CODE, slow:MS, reset (TCP reset, no\n"
    "answer), garbage (200 with random bytes), body:PATH (200 with the bytes of PATH, read at each\n"
    "request), truncate (Content-Length of the whole answer, half of it sent, connection dropped),\n"
    "redirect:URL (307 to URL, whatever it names).\n"
    "\n"
    "Log (--log-file): one JSON object per request and line, with time, method, path, host (the Host\n"
    "header), authorised, handles, status (null after a reset), apiVersionHeader, apiVersion,\n"
    "authScheme and fault. Credentials are never logged.\n";

// The token comes from a file or the environment, never from the command line, which
// every user's process list shows.
std::string tokenFrom(const std::string& tokenFile) {
  if (!tokenFile.empty()) return kyn::sim::readTokenFile(tokenFile);
  if (const char* env = std::getenv("KYN_SIM_TOKEN"); env && *env) return env;
  throw kyn::sim::StartupError("no token: give --token-file or set KYN_SIM_TOKEN");
}

std::string urlHost(const std::string& address) {
  return address.find(':') != std::string::npos ? "[" + address + "]" : address;
}

}  // namespace

int main(int argc, char** argv) {
  kyn::sim::Options options;
  std::string caOut, portFile, tokenFile, dataPath, canonicalHost, fault, logFile;
  long faultCount = -1;

  CLI::App app(kDescription, "kyn-sim");
  app.get_formatter()->column_width(30);
  app.add_option("--listen", options.listen, "Address to listen on")
      ->type_name("ADDRESS")
      ->capture_default_str();
  app.add_option("--port", options.port, "Port to listen on; 0 picks a free one")
      ->type_name("PORT")
      ->capture_default_str();
  app.add_option("--host", options.hosts, "Extra host name or IP address for the server certificate (repeatable)")
      ->type_name("NAME");
  app.add_option("--ca-out", caOut, "Write the CA certificate (PEM) here, for clients to trust")->type_name("PATH");
  app.add_option("--port-file", portFile, "Write the port number here once listening")->type_name("PATH");
  app.add_option("--person", options.personId, "Person id that requests must authenticate as")
      ->type_name("ID")
      ->required();
  app.add_option("--token-file", tokenFile, "File holding the application token (else $KYN_SIM_TOKEN)")
      ->type_name("PATH");
  app.add_option("--data", dataPath, "Data set: the user's friends and the server context (JSON)")
      ->type_name("PATH")
      ->required();
  app.add_option("--canonical-host", canonicalHost,
                 "Redirect (307) every request whose Host is not this name to https://NAME:PORT")
      ->type_name("NAME");
  auto* faultOption = app.add_option("--fault", fault, "Scripted fault for getlocations (see above)")
                          ->type_name("KIND");
  app.add_option("--fault-count", faultCount, "Apply the fault to the first N getlocations requests only")
      ->type_name("N")
      ->needs(faultOption);
  app.add_option("--log-file", logFile, "Append one JSON line per request here")->type_name("PATH");

  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& e) {
    const int status = app.exit(e);
    return status == 0 ? 0 : kStartupFailure;
  }

  // Signals are taken by sigwait below; block them before any thread starts so none inherits them.
  sigset_t stopSignals;
  sigemptyset(&stopSignals);
  sigaddset(&stopSignals, SIGTERM);
  sigaddset(&stopSignals, SIGINT);
  pthread_sigmask(SIG_BLOCK, &stopSignals, nullptr);

  std::unique_ptr<kyn::sim::Simulator> simulator;
  try {
    options.token = tokenFrom(tokenFile);
    options.dataPath = dataPath;
    if (!caOut.empty()) options.caOut = caOut;
    if (!portFile.empty()) options.portFile = portFile;
    if (!canonicalHost.empty()) options.canonicalHost = canonicalHost;
    if (!logFile.empty()) options.logFile = logFile;
    if (!fault.empty()) options.fault = kyn::sim::parseFault(fault);
    if (faultCount >= 0) options.faultCount = faultCount;
    simulator = std::make_unique<kyn::sim::Simulator>(std::move(options));
    simulator->bind();
  } catch (const std::exception& e) {
    std::cerr << "kyn-sim: " << e.what() << '\n';
    return kStartupFailure;
  }

  // The server ends only through stop(); should it end on its own, wake the main thread with a
  // signal and report the failure.
  std::atomic<bool> stopRequested{false};
  std::atomic<bool> failed{false};
  std::thread server([&] {
    simulator->run();
    if (!stopRequested) {
      failed = true;
      ::kill(::getpid(), SIGTERM);
    }
  });
  std::cout << "kyn-sim listening on https://" << urlHost(simulator->options().listen) << ':' << simulator->port()
            << std::endl;

  int signal = 0;
  while (sigwait(&stopSignals, &signal) != 0) {
  }
  stopRequested = true;
  simulator->stop();
  server.join();
  if (failed) {
    std::cerr << "kyn-sim: the server stopped unexpectedly\n";
    return 1;
  }
  return 0;
}
