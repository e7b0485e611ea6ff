#include "support/host_process.h"

#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <stdexcept>
#include <thread>

extern char** environ;

namespace quillon::test_support {

namespace {

using Clock = std::chrono::steady_clock;
constexpr auto kPollInterval = std::chrono::milliseconds(5);
constexpr auto kTimeout = std::chrono::seconds(30);
constexpr const char* kListeningMarker = "listening on ";
constexpr const char* kLogName = "host.log";

int decodeWaitStatus(int status) {
  if (WIFEXITED(status)) return WEXITSTATUS(status);
  if (WIFSIGNALED(status)) return 128 + WTERMSIG(status);
  return -1;
}

// Starts `args` with stdout and stderr appended to `logPath`.
pid_t spawn(const std::vector<std::string>& args, const Environment& env,
            const std::string& logPath) {
  // The child's lookups find the first definition: the test's own come first.
  std::vector<std::string> envText;
  for (const auto& [name, value] : env) envText.push_back(name + "=" + value);
  std::vector<char*> envp;
  for (std::string& entry : envText) envp.push_back(entry.data());
  for (char** entry = environ; *entry != nullptr; ++entry) envp.push_back(*entry);
  envp.push_back(nullptr);
  std::vector<char*> argv;
  for (const std::string& arg : args) argv.push_back(const_cast<char*>(arg.c_str()));
  argv.push_back(nullptr);

  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, logPath.c_str(),
                                   O_WRONLY | O_APPEND | O_CREAT, 0600);
  posix_spawn_file_actions_adddup2(&actions, STDERR_FILENO, STDOUT_FILENO);
  posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
  // The child must not inherit blocked stop signals from a test thread.
  posix_spawnattr_t attributes;
  posix_spawnattr_init(&attributes);
  sigset_t none;
  sigemptyset(&none);
  posix_spawnattr_setsigmask(&attributes, &none);
  posix_spawnattr_setflags(&attributes, POSIX_SPAWN_SETSIGMASK);
  pid_t pid = -1;
  const int error = posix_spawn(&pid, argv[0], &actions, &attributes, argv.data(), envp.data());
  posix_spawn_file_actions_destroy(&actions);
  posix_spawnattr_destroy(&attributes);
  if (error != 0) {
    throw std::runtime_error("posix_spawn " + args[0] + ": " + std::strerror(error));
  }
  return pid;
}

// The port announced in the log, or 0 while there is none.
uint16_t announcedPort(const std::string& log) {
  const auto marker = log.find(kListeningMarker);
  const auto space = log.find(' ', marker + std::strlen(kListeningMarker));
  const auto colon = log.rfind(':', space);
  if (marker == std::string::npos || space == std::string::npos || colon == std::string::npos ||
      colon < marker) {
    return 0;
  }
  return static_cast<uint16_t>(std::stoi(log.substr(colon + 1, space - colon - 1)));
}

}  // namespace

HostProcess::HostProcess(const std::vector<std::string>& args, const Environment& env) {
  std::vector<std::string> argv = {kWsRuntimePath, "--listen", "127.0.0.1:0"};
  argv.insert(argv.end(), args.begin(), args.end());
  pid_ = spawn(argv, env, scratch_.file(kLogName));
  const auto deadline = Clock::now() + kTimeout;
  while (port_ == 0) {
    int status = 0;
    if (::waitpid(pid_, &status, WNOHANG) == pid_) {
      exitCode_ = decodeWaitStatus(status);
      pid_ = -1;
      throw std::runtime_error("ws-runtime exited with " + std::to_string(exitCode_) +
                               " before serving:\n" + log());
    }
    port_ = announcedPort(log());
    if (port_ == 0 && Clock::now() > deadline) {
      const std::string text = log();
      stop(SIGKILL);
      throw std::runtime_error("ws-runtime did not come up within 30 s:\n" + text);
    }
    if (port_ == 0) std::this_thread::sleep_for(kPollInterval);
  }
}

HostProcess::~HostProcess() {
  if (pid_ > 0) stop(SIGKILL);
}

void HostProcess::signal(int signal) {
  if (pid_ > 0) ::kill(pid_, signal);
}

int HostProcess::wait() {
  if (pid_ <= 0) return exitCode_;
  int status = 0;
  while (::waitpid(pid_, &status, 0) < 0 && errno == EINTR) {
  }
  exitCode_ = decodeWaitStatus(status);
  pid_ = -1;
  return exitCode_;
}

int HostProcess::stop(int signal) {
  this->signal(signal);
  return wait();
}

std::string HostProcess::log() const { return scratch_.read(kLogName); }

bool HostProcess::waitForLog(const std::string& text) const {
  const auto deadline = Clock::now() + kTimeout;
  while (log().find(text) == std::string::npos) {
    if (Clock::now() > deadline) return false;
    std::this_thread::sleep_for(kPollInterval);
  }
  return true;
}

HostRun runHostToExit(const std::vector<std::string>& args) {
  const answers_test::ScratchDir scratch;
  std::vector<std::string> argv = {kWsRuntimePath};
  argv.insert(argv.end(), args.begin(), args.end());
  const pid_t pid = spawn(argv, {}, scratch.file(kLogName));
  int status = 0;
  for (const auto deadline = Clock::now() + kTimeout; ::waitpid(pid, &status, WNOHANG) != pid;) {
    if (Clock::now() > deadline) ::kill(pid, SIGKILL);  // reaped on the next turn
    std::this_thread::sleep_for(kPollInterval);
  }
  return {decodeWaitStatus(status), scratch.read(kLogName)};
}

}  // namespace quillon::test_support
