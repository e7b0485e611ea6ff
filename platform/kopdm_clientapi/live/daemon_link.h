// One time reference's ptp4l daemon as the live time service sees it: the
// data sets it last answered, asked again over its management socket when
// they are older than the configured age.
//
// One exchange asks for every data set at once, and answers are reused for
// the configured age counted from their arrival, so a burst of calls costs at
// most one exchange per age period however slow the daemon is. At most one
// exchange is in flight. When the answers are due again but younger than
// kServeLimit, the call that notices starts the exchange on a thread of its
// own and, like every call until it ends, is served the previous answers;
// only calls with nothing that recent wait, for that one exchange, which ends
// within the timeout.
//
// Thread-safety: every operation may run on several threads at once.
#ifndef KOPDM_CLIENTAPI_LIVE_DAEMON_LINK_H_
#define KOPDM_CLIENTAPI_LIVE_DAEMON_LINK_H_

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "live/live_config.h"
#include "ptp_management/codec.h"
#include "ptp_management/shared_uds_client.h"

namespace kopdmlive {

using ptpmgmt::Clock;

// No state older than this is ever served.
inline constexpr std::chrono::milliseconds kServeLimit{950};

enum class FailureKind {
  kUnreachable,      // no socket, refused, no permission, or no client socket
  kTimedOut,         // no answer in time, or the daemon's queue is full
  kManagementError,  // the daemon answered MANAGEMENT_ERROR_STATUS
  kMalformed,        // the answer does not decode
};

struct Failure {
  FailureKind kind = FailureKind::kTimedOut;
  uint16_t managementId = 0;       // what was asked
  ptpmgmt::SystemFailure system;   // the failed call, when a system call failed
  uint16_t managementErrorId = 0;  // with kManagementError
  ptpmgmt::DecodeError decodeError = ptpmgmt::DecodeError::kNone;  // with kMalformed
  bool probedTransports = false;   // asked with transportSpecific 0 and 1
  uint8_t transportSpecific = 0;   // what was asked with, when not probing
};

template <typename DataSet>
struct Fetched {
  bool ok = false;
  DataSet value;
  Failure failure;  // when not ok
};

struct DaemonState {
  Clock::time_point takenAt;     // when it was asked for (failures: when they were known)
  Clock::time_point answeredAt;  // when the exchange ended
  bool reusable = true;       // false: the next call asks again at once
  uint8_t transportSpecific = 0;
  Fetched<ptpmgmt::DefaultDataSet> defaults;
  Fetched<ptpmgmt::CurrentDataSet> current;
  Fetched<ptpmgmt::ParentDataSet> parent;
  Fetched<ptpmgmt::TimePropertiesDataSet> timeProperties;
  Fetched<ptpmgmt::PortDataSet> port;
  Fetched<ptpmgmt::TimeStatusNp> timeStatus;
  Fetched<ptpmgmt::PortPropertiesNp> portProperties;
};

class DaemonLink {
 public:
  // Exchanges go through `client`, the process's one client socket.
  DaemonLink(TrConfig tr, std::chrono::milliseconds timeout, std::chrono::milliseconds maxAge,
             std::shared_ptr<ptpmgmt::SharedUdsClient> client);
  // Waits for an exchange in flight (at most the timeout).
  ~DaemonLink();
  DaemonLink(const DaemonLink&) = delete;
  DaemonLink& operator=(const DaemonLink&) = delete;

  const TrConfig& tr() const { return tr_; }
  std::chrono::milliseconds timeout() const { return timeout_; }

  // The daemon's data sets, none older than kServeLimit; blocks at most the
  // timeout, and only when nothing that recent is known. Never null:
  // failures are inside.
  std::shared_ptr<const DaemonState> state();

 private:
  bool fresh(const DaemonState& state, Clock::time_point now) const;
  // Starts an exchange on a thread of its own; false when no thread could
  // be made. mutex_ held, asking_ set.
  bool refreshInBackground();
  // Ends the exchange in flight with what it learnt (null: nothing, the
  // previous state stays); mutex_ held.
  void finish(std::shared_ptr<const DaemonState> asked);
  // Asks the daemon; only while asking_ is set by this thread's caller.
  std::shared_ptr<const DaemonState> ask();
  bool ensureClient(DaemonState& state);
  enum class Probe {
    kNotNeeded,     // the transportSpecific is known
    kFailed,        // every data set failed
    kDefaultsOnly,  // an IEEE 802.1AS daemon: the other data sets are still to ask
    kComplete,      // every data set answered or failed
  };
  Probe probeTransport(DaemonState& state, Clock::time_point deadline);
  // The GETs of every data set, the default one aside when `haveDefaults`.
  std::vector<ptpmgmt::PendingGet> requests(uint8_t transportSpecific, bool haveDefaults) const;
  void fill(DaemonState& state, const std::vector<ptpmgmt::PendingGet>& gets,
            const ptpmgmt::ExchangeOutcome& outcome, bool haveDefaults) const;
  void askRest(DaemonState& state, Clock::time_point deadline, bool haveDefaults);
  ptpmgmt::PendingGet pendingGet(ptpmgmt::ManagementId id, uint8_t transportSpecific) const;

  const TrConfig tr_;
  const std::chrono::milliseconds timeout_;
  const std::chrono::milliseconds maxAge_;
  const std::shared_ptr<ptpmgmt::SharedUdsClient> client_;
  const ptpmgmt::PortIdentity self_;

  // Used only by the one thread that asks (asking_ hands it over).
  int transportSpecific_ = -1;  // -1: unknown

  std::mutex mutex_;
  std::condition_variable answered_;          // an exchange ended
  std::shared_ptr<const DaemonState> state_;  // guarded by mutex_
  bool asking_ = false;                       // guarded by mutex_
  uint64_t exchanges_ = 0;                    // ended so far; guarded by mutex_
  std::thread refresher_;                     // guarded by mutex_
};

}  // namespace kopdmlive

#endif  // KOPDM_CLIENTAPI_LIVE_DAEMON_LINK_H_
