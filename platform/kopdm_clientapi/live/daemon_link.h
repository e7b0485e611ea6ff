// One time reference's ptp4l daemon as the live time service sees it: the
// data sets it last answered, asked again over its management socket when
// they are older than the configured age.
//
// One exchange asks for every data set at once, so a burst of calls costs at
// most one management round trip per data set. While one thread asks, the
// others are served the previous answers when those are younger than
// kServeLimit, or wait for the exchange, which ends within the timeout.
//
// Thread-safety: every operation may run on several threads at once.
#ifndef KOPDM_CLIENTAPI_LIVE_DAEMON_LINK_H_
#define KOPDM_CLIENTAPI_LIVE_DAEMON_LINK_H_

#include <chrono>
#include <cstdint>
#include <memory>
#include <mutex>
#include <string>

#include "live/live_config.h"
#include "ptp_management/codec.h"
#include "ptp_management/uds_client.h"

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
  Clock::time_point takenAt;  // when it was asked for (failures: when they were known)
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
  DaemonLink(TrConfig tr, std::chrono::milliseconds timeout, std::chrono::milliseconds maxAge,
             std::string clientDirectory);
  DaemonLink(const DaemonLink&) = delete;
  DaemonLink& operator=(const DaemonLink&) = delete;

  const TrConfig& tr() const { return tr_; }
  std::chrono::milliseconds timeout() const { return timeout_; }

  // The daemon's data sets, none older than kServeLimit; blocks at most the
  // timeout. Never null: failures are inside.
  std::shared_ptr<const DaemonState> state();

 private:
  std::shared_ptr<const DaemonState> load() const;
  void store(std::shared_ptr<const DaemonState> state);
  bool fresh(const DaemonState& state, Clock::time_point now) const;
  // Asks the daemon; exchangeMutex_ held.
  std::shared_ptr<const DaemonState> ask();
  bool ensureClient(DaemonState& state);
  bool probeTransport(DaemonState& state, Clock::time_point deadline);
  void askRest(DaemonState& state, Clock::time_point deadline, bool haveDefaults);
  ptpmgmt::PendingGet pendingGet(ptpmgmt::ManagementId id, uint8_t transportSpecific) const;

  const TrConfig tr_;
  const std::chrono::milliseconds timeout_;
  const std::chrono::milliseconds maxAge_;
  const std::string clientDirectory_;
  const ptpmgmt::PortIdentity self_;

  std::mutex exchangeMutex_;                   // held for one exchange
  std::unique_ptr<ptpmgmt::UdsClient> client_;  // guarded by exchangeMutex_
  int transportSpecific_ = -1;                 // guarded by exchangeMutex_; -1: unknown

  mutable std::mutex stateMutex_;
  std::shared_ptr<const DaemonState> state_;  // guarded by stateMutex_
};

}  // namespace kopdmlive

#endif  // KOPDM_CLIENTAPI_LIVE_DAEMON_LINK_H_
