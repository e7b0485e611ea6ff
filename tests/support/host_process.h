// Runs the ws-runtime host as a child process for end-to-end tests: on a free
// loopback port (the host picks it and announces it), with the given
// arguments and environment, its stderr captured in a file.
//
//   quillon::test_support::HostProcess host({"--plugin", kEchoPlugin, "--service", "echo"});
//   auto answer = quillon::test_support::httpRequest(host.port(), "GET", "/echo/x");
//   EXPECT_EQ(host.stop(), 0);
//
// Thread-safety: one HostProcess is driven by one thread; log() and
// waitForLog() may be called from others.
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

// The built binaries.
inline constexpr const char* kWsRuntimePath = QUILLON_WS_RUNTIME_PATH;
#ifdef QUILLON_PLUGIN_PATH
inline constexpr const char* kQuillonPluginPath = QUILLON_PLUGIN_PATH;
#endif

using Environment = std::vector<std::pair<std::string, std::string>>;

class HostProcess {
 public:
  // Starts ws-runtime with "--listen 127.0.0.1:0" followed by `args` (a later
  // --listen overrides it) and `env` added to this process's environment.
  // Returns once the host accepts connections. Throws std::runtime_error,
  // carrying the host's log, when it exits or is not up within 30 s.
  explicit HostProcess(const std::vector<std::string>& args, const Environment& env = {});
  // Kills the host if it still runs, and removes its log.
  ~HostProcess();
  HostProcess(const HostProcess&) = delete;
  HostProcess& operator=(const HostProcess&) = delete;

  uint16_t port() const { return port_; }

  // Sends `signal` and waits for the host to end. Returns its exit code, or
  // 128 + the signal number when a signal ended it.
  int stop(int signal = SIGTERM);
  // Sends `signal` without waiting.
  void signal(int signal);
  // Waits for the host to end; the same result as stop().
  int wait();

  // Everything the host has written to stderr so far.
  std::string log() const;
  // Waits until the log contains `text`; false after `timeout`.
  bool waitForLog(const std::string& text,
                  std::chrono::milliseconds timeout = std::chrono::seconds(30)) const;

 private:
  pid_t pid_ = -1;
  uint16_t port_ = 0;
  answers_test::ScratchDir scratch_;  // holds the log
  int exitCode_ = -1;
};

struct HostRun {
  int exitCode;     // as HostProcess::stop()
  std::string log;  // stderr and stdout
};

// Runs ws-runtime with exactly `args` until it ends by itself (for start-up
// failures and --help); killed after `timeout`, which yields 128 + SIGKILL.
HostRun runHostToExit(const std::vector<std::string>& args, const Environment& env = {},
                      std::chrono::milliseconds timeout = std::chrono::seconds(30));

}  // namespace quillon::test_support

#endif  // QUILLON_TESTS_SUPPORT_HOST_PROCESS_H_
