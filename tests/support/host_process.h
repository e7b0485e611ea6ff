// Runs the ws-runtime host as a child process for end-to-end tests, its
// stdout and stderr captured in a log file.
// Thread-safety: one thread drives a HostProcess; log() and waitForLog() may
// be called from others.
#ifndef QUILLON_TESTS_SUPPORT_HOST_PROCESS_H_
#define QUILLON_TESTS_SUPPORT_HOST_PROCESS_H_

#include <sys/types.h>

#include <chrono>
#include <csignal>
#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include "support/scratch.h"

namespace quillon::test_support {

inline constexpr const char* kWsRuntimePath = QUILLON_WS_RUNTIME_PATH;
#ifdef QUILLON_PLUGIN_PATH
inline constexpr const char* kQuillonPluginPath = QUILLON_PLUGIN_PATH;
#endif

using Environment = std::vector<std::pair<std::string, std::string>>;

class HostProcess {
 public:
  // Starts ws-runtime with "--listen 127.0.0.1:0", then `args` (a later
  // --listen wins), `env` added to this process's environment, and returns
  // once it announces its port. Throws std::runtime_error with the host's
  // log when it exits or is not up within 30 s.
  explicit HostProcess(const std::vector<std::string>& args, const Environment& env = {});
  ~HostProcess();  // kills the host if it still runs
  HostProcess(const HostProcess&) = delete;
  HostProcess& operator=(const HostProcess&) = delete;

  uint16_t port() const { return port_; }
  // The exit code, or 128 + the signal number that ended the host.
  int stop(int signal = SIGTERM);
  void signal(int signal);
  int wait();

  std::string log() const;
  // False when the log does not show `text` within 30 s.
  bool waitForLog(const std::string& text) const;

 private:
  pid_t pid_ = -1;
  uint16_t port_ = 0;
  answers_test::ScratchDir scratch_;  // holds the log
  int exitCode_ = -1;
};

struct HostRun {
  int exitCode;  // as HostProcess::stop()
  std::string log;
};

// Runs ws-runtime with exactly `args` until it ends by itself (start-up
// failures); killed after 30 s.
HostRun runHostToExit(const std::vector<std::string>& args);

}  // namespace quillon::test_support

#endif  // QUILLON_TESTS_SUPPORT_HOST_PROCESS_H_
