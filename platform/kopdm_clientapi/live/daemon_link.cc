#include "live/daemon_link.h"

#include <unistd.h>

#include <cerrno>
#include <system_error>
#include <vector>

namespace kopdmlive {
namespace {

using ptpmgmt::DecodeError;
using ptpmgmt::ExchangeOutcome;
using ptpmgmt::ManagementId;
using ptpmgmt::PendingGet;

// Calls `visit` with every data set of a state, in the order they are asked.
template <typename Visit>
void forEachDataSet(DaemonState& state, Visit&& visit) {
  visit(state.defaults);
  visit(state.current);
  visit(state.parent);
  visit(state.timeProperties);
  visit(state.port);
  visit(state.timeStatus);
  visit(state.portProperties);
}

bool isPortScope(ManagementId id) {
  return id == ManagementId::kPortDataSet || id == ManagementId::kPortPropertiesNp;
}

// The client's identity: pmc's convention of a zero clock and the pid as
// port, which no daemon uses for itself.
ptpmgmt::PortIdentity clientIdentity() {
  ptpmgmt::PortIdentity identity;
  identity.port = static_cast<uint16_t>(::getpid());
  return identity;
}

template <typename DataSet>
void fillFromAnswer(Fetched<DataSet>& out, const PendingGet& get, const ExchangeOutcome& outcome,
                    bool probed) {
  out.failure = Failure();
  out.failure.managementId = static_cast<uint16_t>(DataSet::kId);
  out.failure.probedTransports = probed;
  out.failure.transportSpecific = get.request.transportSpecific;
  if (!get.answered) {
    out.failure.kind = outcome.unmatchedMalformed != DecodeError::kNone ? FailureKind::kMalformed
                                                                        : FailureKind::kTimedOut;
    out.failure.decodeError = outcome.unmatchedMalformed;
    return;
  }
  if (get.malformed != DecodeError::kNone) {
    out.failure.kind = FailureKind::kMalformed;
    out.failure.decodeError = get.malformed;
    return;
  }
  if (get.answer.isErrorStatus) {
    out.failure.kind = FailureKind::kManagementError;
    out.failure.managementErrorId = get.answer.managementErrorId;
    return;
  }
  out.failure.decodeError = ptpmgmt::decodeDataSet(get.answer, &out.value);
  if (out.failure.decodeError != DecodeError::kNone) {
    out.failure.kind = FailureKind::kMalformed;
    return;
  }
  out.ok = true;
}

// Every data set failed the same way.
void failAll(DaemonState& state, FailureKind kind, const ptpmgmt::SystemFailure& system,
             DecodeError decodeError, bool probed) {
  const uint8_t transportSpecific = state.transportSpecific;
  forEachDataSet(state, [&](auto& fetched) {
    using DataSet = decltype(fetched.value);
    fetched.ok = false;
    fetched.failure = Failure();
    fetched.failure.kind = kind;
    fetched.failure.managementId = static_cast<uint16_t>(DataSet::kId);
    fetched.failure.system = system;
    fetched.failure.decodeError = decodeError;
    fetched.failure.probedTransports = probed;
    fetched.failure.transportSpecific = transportSpecific;
  });
}

// A failed send: a daemon that cannot take the request in is as good as one
// that does not answer.
void failSend(DaemonState& state, const ptpmgmt::SystemFailure& system, bool probed) {
  const bool queueFull = system.error == EAGAIN || system.error == EWOULDBLOCK;
  failAll(state, queueFull ? FailureKind::kTimedOut : FailureKind::kUnreachable, system,
          DecodeError::kNone, probed);
  // Asked again by the next call: a daemon that comes back is used at once.
  state.reusable = queueFull;
}

// The exchange gave up without a single answer.
void failSilent(DaemonState& state, const ExchangeOutcome& outcome, bool probed) {
  const bool malformed = outcome.unmatchedMalformed != DecodeError::kNone;
  failAll(state, malformed ? FailureKind::kMalformed : FailureKind::kTimedOut, {},
          outcome.unmatchedMalformed, probed);
}

bool anyAnswered(const std::vector<PendingGet>& gets) {
  for (const PendingGet& get : gets) {
    if (get.answered) return true;
  }
  return false;
}

}  // namespace

DaemonLink::DaemonLink(TrConfig tr, std::chrono::milliseconds timeout,
                       std::chrono::milliseconds maxAge,
                       std::shared_ptr<ptpmgmt::SharedUdsClient> client)
    : tr_(std::move(tr)),
      timeout_(timeout),
      maxAge_(maxAge),
      client_(std::move(client)),
      self_(clientIdentity()) {}

// No call runs any more; the refresher still needs mutex_ for its last step.
DaemonLink::~DaemonLink() {
  if (refresher_.joinable()) refresher_.join();
}

// Counted from the answers' arrival, not from the request: a daemon slower
// than the age would otherwise be asked again by the very next call, and a
// burst would cost an exchange per call instead of one.
bool DaemonLink::fresh(const DaemonState& state, Clock::time_point now) const {
  return state.reusable && now - state.answeredAt < maxAge_;
}

std::shared_ptr<const DaemonState> DaemonLink::state() {
  std::unique_lock<std::mutex> lock(mutex_);
  const Clock::time_point now = Clock::now();
  if (state_ && fresh(*state_, now)) return state_;
  const bool recent = state_ && now - state_->takenAt < kServeLimit;
  if (asking_) {
    if (recent) return state_;
    // What that exchange learns, rather than a second one.
    const uint64_t seen = exchanges_;
    answered_.wait(lock, [&] { return exchanges_ != seen; });
    return state_;
  }
  asking_ = true;
  // A daemon that could not be reached is asked again by this very call:
  // its answer (or its absence) comes at once.
  if (recent && state_->reusable && refreshInBackground()) return state_;
  lock.unlock();
  std::shared_ptr<const DaemonState> asked;
  try {
    asked = ask();
  } catch (...) {
    // Out of memory: the waiters must not wait for an exchange that ended.
    lock.lock();
    finish(nullptr);
    throw;
  }
  lock.lock();
  finish(asked);
  return asked;
}

bool DaemonLink::refreshInBackground() {
  // The previous refresher cleared asking_ as its last step under the lock.
  if (refresher_.joinable()) refresher_.join();
  try {
    refresher_ = std::thread([this] {
      std::shared_ptr<const DaemonState> asked;
      try {
        asked = ask();
      } catch (...) {
        // Out of memory: the previous answers stay, until they are too old.
      }
      std::lock_guard<std::mutex> lock(mutex_);
      finish(std::move(asked));
    });
  } catch (const std::system_error&) {
    return false;
  }
  return true;
}

void DaemonLink::finish(std::shared_ptr<const DaemonState> asked) {
  if (asked) state_ = std::move(asked);
  asking_ = false;
  ++exchanges_;
  answered_.notify_all();
}

PendingGet DaemonLink::pendingGet(ManagementId id, uint8_t transportSpecific) const {
  PendingGet get;
  get.request.transportSpecific = transportSpecific;
  get.request.domainNumber = tr_.domainNumber;
  get.request.source = self_;
  get.request.target = ptpmgmt::wildcardPort();
  if (isPortScope(id)) get.request.target.port = tr_.port;
  get.request.id = id;
  return get;
}

std::shared_ptr<const DaemonState> DaemonLink::ask() {
  auto state = std::make_shared<DaemonState>();
  state->takenAt = Clock::now();
  const Clock::time_point deadline = state->takenAt + timeout_;
  if (ensureClient(*state)) {
    const Probe probe =
        transportSpecific_ < 0 ? probeTransport(*state, deadline) : Probe::kNotNeeded;
    if (probe == Probe::kNotNeeded || probe == Probe::kDefaultsOnly) {
      askRest(*state, deadline, probe == Probe::kDefaultsOnly);
    } else if (probe == Probe::kFailed) {
      state->takenAt = Clock::now();
    }
  }
  state->answeredAt = Clock::now();
  return state;
}

bool DaemonLink::ensureClient(DaemonState& state) {
  ptpmgmt::SystemFailure failure;
  if (client_->open(&failure)) return true;
  failAll(state, FailureKind::kUnreachable, failure, DecodeError::kNone, false);
  state.reusable = false;
  return false;
}

std::vector<PendingGet> DaemonLink::requests(uint8_t transportSpecific, bool haveDefaults) const {
  std::vector<PendingGet> gets;
  DaemonState shape;
  forEachDataSet(shape, [&](auto& fetched) {
    using DataSet = decltype(fetched.value);
    if (DataSet::kId == ManagementId::kDefaultDataSet && haveDefaults) return;
    gets.push_back(pendingGet(DataSet::kId, transportSpecific));
  });
  return gets;
}

// `gets` as `requests` made them.
void DaemonLink::fill(DaemonState& state, const std::vector<PendingGet>& gets,
                      const ExchangeOutcome& outcome, bool haveDefaults) const {
  size_t next = 0;
  forEachDataSet(state, [&](auto& fetched) {
    using DataSet = decltype(fetched.value);
    if (DataSet::kId == ManagementId::kDefaultDataSet && haveDefaults) return;
    fillFromAnswer(fetched, gets[next++], outcome, false);
  });
}

// A daemon configured for IEEE 802.1AS answers only requests that carry its
// transportSpecific. The first exchange asks every data set with 0, the
// usual value, and the default data set with 1 as well: one round trip shows
// which kind the daemon is, and for the usual kind it is the only one. That
// is eight datagrams, within the ten a daemon's socket queues.
DaemonLink::Probe DaemonLink::probeTransport(DaemonState& state, Clock::time_point deadline) {
  std::vector<PendingGet> gets = requests(0, false);
  gets.push_back(pendingGet(ManagementId::kDefaultDataSet, 1));
  ptpmgmt::SharedUdsClient::Exchange exchange(*client_, tr_.uds, gets);
  if (const ptpmgmt::SystemFailure failure = exchange.send(); failure.call != nullptr) {
    failSend(state, failure, true);
    return Probe::kFailed;
  }
  const ExchangeOutcome outcome = exchange.collect(ptpmgmt::Until::kAnyAnswer, deadline);
  if (outcome.failure.call != nullptr) {
    failSend(state, outcome.failure, true);
    return Probe::kFailed;
  }
  if (!anyAnswered(gets)) {
    failSilent(state, outcome, true);
    return Probe::kFailed;
  }
  if (gets.back().answered) {
    transportSpecific_ = 1;
    state.transportSpecific = 1;
    fillFromAnswer(state.defaults, gets.back(), outcome, false);
    return Probe::kDefaultsOnly;
  }
  transportSpecific_ = 0;
  state.transportSpecific = 0;
  gets.pop_back();
  // The request with 1 stays unanswered: no longer waited for.
  const ExchangeOutcome rest = exchange.collect(ptpmgmt::Until::kEveryAnswer, deadline);
  if (rest.failure.call != nullptr) {
    failSend(state, rest.failure, false);
    return Probe::kFailed;
  }
  fill(state, gets, rest, false);
  return Probe::kComplete;
}

void DaemonLink::askRest(DaemonState& state, Clock::time_point deadline, bool haveDefaults) {
  const uint8_t transportSpecific = static_cast<uint8_t>(transportSpecific_);
  state.transportSpecific = transportSpecific;
  std::vector<PendingGet> gets = requests(transportSpecific, haveDefaults);
  ptpmgmt::SharedUdsClient::Exchange exchange(*client_, tr_.uds, gets);
  if (const ptpmgmt::SystemFailure failure = exchange.send(); failure.call != nullptr) {
    failSend(state, failure, false);
    return;
  }
  const ExchangeOutcome outcome = exchange.collect(ptpmgmt::Until::kEveryAnswer, deadline);
  if (outcome.failure.call != nullptr) {
    failSend(state, outcome.failure, false);
    return;
  }
  if (!anyAnswered(gets) && !haveDefaults) {
    // Silence from a daemon that answered before: it may have come back
    // with another transportSpecific, so the next exchange probes again.
    transportSpecific_ = -1;
    failSilent(state, outcome, false);
    state.takenAt = Clock::now();
    return;
  }
  fill(state, gets, outcome, haveDefaults);
}

}  // namespace kopdmlive
