#include "signals.h"

#include <pthread.h>

#include <cstring>

namespace ws::host {

namespace {

constexpr int kStopSignals[] = {SIGINT, SIGTERM, SIGQUIT};
// Signals whose default action ends the process but that nothing here
// sends on purpose: a stray kill must not end the host without Finalize.
constexpr int kIgnoredSignals[] = {SIGUSR1, SIGUSR2, SIGALRM, SIGVTALRM, SIGPROF, SIGIO,
                                   SIGPWR,  SIGXCPU, SIGXFSZ, SIGSTKFLT};

}  // namespace

HostSignals HostSignals::block() {
  HostSignals signals;
  sigemptyset(&signals.set_);
  for (const int s : kStopSignals) sigaddset(&signals.set_, s);
  for (const int s : kIgnoredSignals) sigaddset(&signals.set_, s);
  sigaddset(&signals.set_, SIGHUP);
  for (int s = SIGRTMIN; s <= SIGRTMAX; ++s) sigaddset(&signals.set_, s);
  pthread_sigmask(SIG_BLOCK, &signals.set_, nullptr);
  ::signal(SIGPIPE, SIG_IGN);
  return signals;
}

int HostSignals::next() const {
  int number = 0;
  while (sigwait(&set_, &number) != 0) {
  }
  return number;
}

SignalMeaning HostSignals::meaning(int signal) {
  for (const int s : kStopSignals) {
    if (s == signal) return SignalMeaning::kStop;
  }
  return signal == SIGHUP ? SignalMeaning::kReopenLog : SignalMeaning::kIgnore;
}

std::string HostSignals::name(int signal) {
  if (signal >= SIGRTMIN && signal <= SIGRTMAX) {
    return signal == SIGRTMIN ? "SIGRTMIN" : "SIGRTMIN+" + std::to_string(signal - SIGRTMIN);
  }
  const char* abbreviation = sigabbrev_np(signal);
  return abbreviation != nullptr ? std::string("SIG") + abbreviation
                                 : "signal " + std::to_string(signal);
}

}  // namespace ws::host
