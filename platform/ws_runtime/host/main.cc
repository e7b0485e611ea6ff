// ws-runtime: serves one plug-in over HTTP until SIGINT, SIGTERM or SIGQUIT
// (signals.h says what the others mean to it).
//
// Exit status: 0 after a clean stop, 1 when the plug-in cannot be loaded,
// 2 on a command-line error, 3 when the address cannot be served.
#include <sys/resource.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "access_log.h"
#include "http_server.h"
#include "options.h"
#include "plugin.h"
#include "signals.h"

namespace {

constexpr int kExitPlugin = 1;
constexpr int kExitUsage = 2;
constexpr int kExitListen = 3;
// How long requests in progress at a stop may take to finish.
constexpr std::chrono::seconds kStopGrace{10};

void say(const std::string& line) { std::fprintf(stderr, "ws-runtime: %s\n", line.c_str()); }

// Besides one descriptor per connection, the daemon takes two per pool
// thread (its epoll set and its wake-up), and the rest of the process
// needs a few more (the listening socket, the access log when it is
// reopened, the plug-in's own).
constexpr rlim_t kSpareDescriptors = 16;

// The descriptors open now: connections can only use what is left.
rlim_t descriptorsInUse() {
  std::error_code error;
  rlim_t count = 0;
  for (std::filesystem::directory_iterator it("/proc/self/fd", error), end; !error && it != end;
       it.increment(error)) {
    ++count;
  }
  return error || count == 0 ? 3 : count - 1;  // the iterator's own descriptor
}

// Raises the descriptor limit so that the connection limit can be reached,
// with room for connections being closed in an orderly way; when the system
// does not allow that many, the connection limit comes down instead.
void fitDescriptorLimit(ws::host::Options& options) {
  rlimit limit{};
  if (getrlimit(RLIMIT_NOFILE, &limit) != 0) return;
  const rlim_t fixed = descriptorsInUse() + kSpareDescriptors + 2 * rlim_t{options.threads};
  const rlim_t lingering = std::max<rlim_t>(16, options.maxConnections / 16);
  const rlim_t wanted = fixed + options.maxConnections + lingering;
  if (limit.rlim_cur < wanted) {
    limit.rlim_cur = limit.rlim_max == RLIM_INFINITY || limit.rlim_max >= wanted ? wanted
                                                                                : limit.rlim_max;
    setrlimit(RLIMIT_NOFILE, &limit);
    getrlimit(RLIMIT_NOFILE, &limit);
  }
  if (limit.rlim_cur >= wanted) {
    options.lingeringSockets = static_cast<unsigned>(lingering);
    return;
  }
  const rlim_t left = limit.rlim_cur > fixed + 2 ? limit.rlim_cur - fixed : 2;
  const rlim_t fits = left - std::max<rlim_t>(1, left / 16);
  say("at most " + std::to_string(fits) + " connections: the descriptor limit is " +
      std::to_string(limit.rlim_cur));
  options.maxConnections = static_cast<unsigned>(fits);
  options.lingeringSockets = static_cast<unsigned>(left - fits);
}

// Answers signals until one asks for a stop; returns its name.
std::string serveSignals(const ws::host::HostSignals& signals, ws::host::AccessLog& log) {
  for (;;) {
    const int number = signals.next();
    const std::string name = ws::host::HostSignals::name(number);
    switch (ws::host::HostSignals::meaning(number)) {
      case ws::host::SignalMeaning::kStop:
        return name;
      case ws::host::SignalMeaning::kReopenLog: {
        std::string error;
        if (log.reopen(error)) {
          say("access log reopened on " + name);
        } else {
          say(error);
        }
        break;
      }
      case ws::host::SignalMeaning::kIgnore:
        say("ignoring " + name);
        break;
    }
  }
}

}  // namespace

int main(int argc, char** argv) {
  std::string error;
  auto options = ws::host::parseOptions(std::vector<std::string>(argv + 1, argv + argc), error);
  if (!options) {
    say(error);
    std::fputs(ws::host::usage().c_str(), stderr);
    return kExitUsage;
  }
  if (options->help) {
    std::fputs(ws::host::usage().c_str(), stdout);
    return 0;
  }
  const ws::host::HostSignals signals = ws::host::HostSignals::block();
  fitDescriptorLimit(*options);
  ws::host::AccessLog log(!options->quiet);
  if (!options->accessLog.empty() && !options->quiet && !log.openFile(options->accessLog, error)) {
    say(error);
    return kExitUsage;
  }

  std::unique_ptr<ws::host::Plugin> plugin =
      ws::host::Plugin::load(options->pluginPath, options->service, error);
  if (!plugin) {
    say(error);
    return kExitPlugin;
  }
  plugin->init();

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
      const std::string stopSignal = serveSignals(signals, log);
      server.beginStop();
      say("stopping on " + stopSignal);
      server.finishStop(kStopGrace);
    }
  }
  // The daemon's threads are joined: no Run is active any more.
  plugin->finalize();
  plugin.reset();
  if (status == 0) say("stopped");
  return status;
}
