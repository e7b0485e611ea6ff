// The signals the host answers, and what each means to it:
//   SIGINT, SIGTERM, SIGQUIT   stop cleanly (Finalize runs)
//   SIGHUP                     reopen the access log file
//   SIGPIPE                    ignored (a client that went away)
//   SIGUSR1, SIGUSR2, SIGALRM, SIGVTALRM, SIGPROF, SIGIO, SIGPWR, SIGXCPU,
//   SIGXFSZ, SIGSTKFLT and the real-time signals
//                              ignored, with a line in the log
// All of them are blocked in every thread and taken by one waiting thread,
// so none can end the process by its default action. The signals a fault
// raises (SIGSEGV, ...) and those that stop the process (SIGTSTP, ...) keep
// their defaults.
//
// Thread-safety: block() once, before any thread starts; then next() from
// one thread.
#ifndef WS_RUNTIME_HOST_SIGNALS_H_
#define WS_RUNTIME_HOST_SIGNALS_H_

#include <signal.h>

#include <string>

namespace ws::host {

enum class SignalMeaning { kStop, kReopenLog, kIgnore };

class HostSignals {
 public:
  // Blocks the signals above in the calling thread, which every thread
  // started afterwards inherits.
  static HostSignals block();

  // Waits for the next one of them.
  int next() const;

  static SignalMeaning meaning(int signal);
  // "SIGTERM", "SIGRTMIN+2", ...
  static std::string name(int signal);

 private:
  sigset_t set_{};
};

}  // namespace ws::host

#endif  // WS_RUNTIME_HOST_SIGNALS_H_
