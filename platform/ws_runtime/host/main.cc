// ws-runtime: serves one plug-in over HTTP until SIGINT or SIGTERM.
//
// Exit status: 0 after a clean stop, 1 when the plug-in cannot be loaded,
// 2 on a command-line error, 3 when the address cannot be served.
#include <signal.h>

#include <chrono>
#include <cstdio>
#include <memory>
#include <string>
#include <vector>

#include "access_log.h"
#include "http_server.h"
#include "options.h"
#include "plugin.h"

namespace {

constexpr int kExitPlugin = 1;
constexpr int kExitUsage = 2;
constexpr int kExitListen = 3;
// How long requests in progress at a stop may take to finish.
constexpr std::chrono::seconds kStopGrace{10};

void say(const std::string& line) { std::fprintf(stderr, "ws-runtime: %s\n", line.c_str()); }

// Blocks the stop signals in every thread (the daemon's threads inherit the
// mask) so that only the main thread's sigwait() receives them.
sigset_t blockStopSignals() {
  sigset_t set;
  sigemptyset(&set);
  sigaddset(&set, SIGINT);
  sigaddset(&set, SIGTERM);
  pthread_sigmask(SIG_BLOCK, &set, nullptr);
  signal(SIGPIPE, SIG_IGN);
  return set;
}

}  // namespace

int main(int argc, char** argv) {
  std::string error;
  const auto options = ws::host::parseOptions(std::vector<std::string>(argv + 1, argv + argc), error);
  if (!options) {
    say(error);
    std::fputs(ws::host::usage().c_str(), stderr);
    return kExitUsage;
  }
  if (options->help) {
    std::fputs(ws::host::usage().c_str(), stdout);
    return 0;
  }
  const sigset_t stopSignals = blockStopSignals();

  std::unique_ptr<ws::host::Plugin> plugin =
      ws::host::Plugin::load(options->pluginPath, options->service, error);
  if (!plugin) {
    say(error);
    return kExitPlugin;
  }
  plugin->init();

  const ws::host::AccessLog log(!options->quiet);
  int status = 0;
  {
    ws::host::HttpServer server(*options, *plugin, log);
    if (!server.start(error)) {
      say(error);
      status = kExitListen;
    } else {
      say("listening on " + options->listen.substr(0, options->listen.rfind(':') + 1) +
          std::to_string(server.port()) + " (service /" + options->service + ", plug-in " +
          options->pluginPath + ", " + std::to_string(options->threads) + " threads)");
      int signalNumber = 0;
      sigwait(&stopSignals, &signalNumber);
      server.beginStop();
      say(std::string("stopping on ") + (signalNumber == SIGINT ? "SIGINT" : "SIGTERM"));
      server.finishStop(kStopGrace);
    }
  }
  // The daemon's threads are joined: no Run is active any more.
  plugin->finalize();
  plugin.reset();
  if (status == 0) say("stopped");
  return status;
}
