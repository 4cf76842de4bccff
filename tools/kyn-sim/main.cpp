// kyn-sim: the reference location-sharing server over HTTPS, for the demo and integration tests.
#include "sim/Control.h"
#include "sim/Faults.h"
#include "sim/Files.h"
#include "sim/Router.h"
#include "sim/Simulator.h"

#include <CLI/CLI.hpp>

#include <atomic>
#include <csignal>
#include <cstdlib>
#include <iostream>
#include <optional>
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
    "once it accepts connections. Requests authenticate with HTTP Basic: a person id and its token\n"
    "(--person with --token-file or $KYN_SIM_TOKEN; each further account of the data set with\n"
    "--account ID:TOKENFILE). It serves POST /kytrservice/friends/va/getlocations, showHideLocation\n"
    "and geoFence from the data set, keeps who hides and the fences, and stops with exit status 0 on\n"
    "SIGTERM or SIGINT. Start-up errors exit with status 2.\n"
    "\n"
    "Data set (--data), JSON; tools/kyn-sim/README.md describes every member:\n"
    "  {\"me\": {\"handle\": \"sam@example.com\",\n"
    "          \"places\": {\"Work\": {\"latitude\": 45.52, \"longitude\": -122.68}}},\n"
    "   \"friends\": {\"ada@example.com\": {\"location\": {\"latitude\": 45.5152, \"longitude\": -122.6784,\n"
    "                 \"address\": {\"locality\": \"Portland\", \"stateCode\": \"OR\"}}, \"ageSeconds\": 300},\n"
    "               \"+15035550102\": {\"pending\": true}},\n"
    "   \"accounts\": {\"1000000002\": {\"me\": {\"handle\": \"ada@example.com\"},\n"
    "                               \"friends\": {\"sam@example.com\": {}}}},\n"
    "   \"gazetteer\": [{\"streetAddress\": \"1 Example Way\", \"locality\": \"Portland\",\n"
    "                  \"latitude\": 45.5152, \"longitude\": -122.6784}],\n"
    "   \"serverContext\": {\"minCallbackIntervalInMS\": 5000}}\n"
    "\n"
    "Faults (--fault) shape the answers of the service's endpoints (or those of --fault-path):\n"
    "status:CODE, slow:MS, reset (TCP reset, no answer), garbage (200 with random bytes), body:PATH\n"
    "(200 with the bytes of PATH, read at each request), truncate (Content-Length of the whole\n"
    "answer, half of it sent, connection dropped), redirect:URL (307 to URL, whatever it names),\n"
    "moved:URL (the same as a 301).\n"
    "\n"
    "Log (--log-file): one JSON object per request and line. Notifications (--notifications-file):\n"
    "one JSON object per fence that fires. Credentials are never logged.\n"
    "\n"
    "Control: with --control-file, `kyn-sim move --control FILE HANDLE LATITUDE LONGITUDE` moves a\n"
    "person while the server runs; fences about them fire as they cross.\n";

// The token comes from a file or the environment, never from the command line, which
// every user's process list shows.
std::string tokenFrom(const std::string& tokenFile) {
  if (!tokenFile.empty()) return kyn::sim::readTokenFile(tokenFile);
  if (const char* env = std::getenv("KYN_SIM_TOKEN"); env && *env) return env;
  throw kyn::sim::StartupError("no token: give --token-file or set KYN_SIM_TOKEN");
}

// `kyn-sim move`: a client of the running server's control path.
int runMove(const std::string& controlFile, const std::string& handle, double latitude, double longitude,
         std::optional<double> accuracy) {
  kyn::sim::ControlAccess access;
  try {
    access = kyn::sim::parseControlFile(kyn::sim::readFile(controlFile));
  } catch (const std::exception& e) {
    std::cerr << "kyn-sim move: " << e.what() << '\n';
    return kStartupFailure;
  }
  kyn::sim::Json body = {{"handle", handle}, {"latitude", latitude}, {"longitude", longitude}};
  if (accuracy) body["horizontalAccuracy"] = *accuracy;
  const auto result = kyn::sim::postControl(access, kyn::sim::kMovePath, body);
  if (result.status == 200) {
    std::cout << result.body << '\n';
    return 0;
  }
  const std::string why =
      result.status == 0 ? result.error : "HTTP " + std::to_string(result.status) + " " + result.body;
  std::cerr << "kyn-sim move: " << why << '\n';
  return 1;
}

}  // namespace

int main(int argc, char** argv) {
  kyn::sim::Options options;
  std::string caOut, portFile, tokenFile, dataPath, canonicalHost, fault, logFile, notificationsFile, controlFile;
  std::vector<std::string> accounts, faultPaths;
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
  app.add_option("--person", options.personId, "Person id of the data set's main account (required)")
      ->type_name("ID");
  app.add_option("--token-file", tokenFile, "File holding its application token (else $KYN_SIM_TOKEN)")
      ->type_name("PATH");
  app.add_option("--account", accounts, "Person id and token file of a further account of the data set (repeatable)")
      ->type_name("ID:TOKENFILE");
  app.add_option("--data", dataPath, "Data set: accounts, friends, places, server context (JSON; required)")
      ->type_name("PATH");
  app.add_option("--canonical-host", canonicalHost,
                 "Redirect (307) every request whose Host is not this name to https://NAME:PORT")
      ->type_name("NAME");
  auto* faultOption = app.add_option("--fault", fault, "Scripted fault (see above)")->type_name("KIND");
  app.add_option("--fault-count", faultCount, "Apply the fault to the first N requests it may shape only")
      ->type_name("N")
      ->needs(faultOption);
  app.add_option("--fault-path", faultPaths,
                 "Shape only this endpoint's answers: getlocations, showHideLocation or geoFence (repeatable)")
      ->type_name("WORD")
      ->needs(faultOption);
  app.add_option("--log-file", logFile, "Append one JSON line per request here")->type_name("PATH");
  app.add_option("--notifications-file", notificationsFile, "Append one JSON line per fence notification here")
      ->type_name("PATH");
  app.add_option("--control-file", controlFile, "Write the address, CA and secret for `kyn-sim move` here")
      ->type_name("PATH");

  std::string moveControl, moveHandle;
  double moveLatitude = 0, moveLongitude = 0;
  std::optional<double> moveAccuracy;
  auto* moveCommand = app.add_subcommand("move", "Move a person of the running server's data set");
  moveCommand->add_option("--control", moveControl, "The server's --control-file")->type_name("PATH")->required();
  moveCommand->add_option("handle", moveHandle, "The person's handle")->type_name("HANDLE")->required();
  moveCommand->add_option("latitude", moveLatitude, "Degrees")->type_name("LATITUDE")->required();
  moveCommand->add_option("longitude", moveLongitude, "Degrees")->type_name("LONGITUDE")->required();
  moveCommand->add_option("--accuracy", moveAccuracy, "Horizontal accuracy of the fix, metres")->type_name("METRES");

  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& e) {
    const int status = app.exit(e);
    return status == 0 ? 0 : kStartupFailure;
  }
  if (moveCommand->parsed()) return runMove(moveControl, moveHandle, moveLatitude, moveLongitude, moveAccuracy);

  // Signals are taken by sigwait below; block them before any thread starts so none inherits them.
  sigset_t stopSignals;
  sigemptyset(&stopSignals);
  sigaddset(&stopSignals, SIGTERM);
  sigaddset(&stopSignals, SIGINT);
  pthread_sigmask(SIG_BLOCK, &stopSignals, nullptr);

  std::unique_ptr<kyn::sim::Simulator> simulator;
  try {
    if (options.personId.empty()) throw kyn::sim::StartupError("no person id: give --person");
    if (dataPath.empty()) throw kyn::sim::StartupError("no data set: give --data");
    options.token = tokenFrom(tokenFile);
    for (const auto& account : accounts) options.accounts.push_back(kyn::sim::readAccountOption(account));
    for (const auto& word : faultPaths) {
      const auto path = kyn::sim::servicePath(word);
      if (!path) {
        throw kyn::sim::StartupError("--fault-path " + word + ": use getlocations, showHideLocation or geoFence");
      }
      options.faultPaths.push_back(*path);
    }
    options.dataPath = dataPath;
    if (!caOut.empty()) options.caOut = caOut;
    if (!portFile.empty()) options.portFile = portFile;
    if (!canonicalHost.empty()) options.canonicalHost = canonicalHost;
    if (!logFile.empty()) options.logFile = logFile;
    if (!notificationsFile.empty()) options.notificationsFile = notificationsFile;
    if (!controlFile.empty()) options.controlFile = controlFile;
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
  std::cout << "kyn-sim listening on https://" << kyn::sim::urlHost(simulator->options().listen) << ':' << simulator->port()
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
