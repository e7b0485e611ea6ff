// A stand-in ptp4l management socket for tests of the live time service's
// error paths, which real daemons cannot be made to take: answers refused,
// malformed, late, stray, or none at all. Answers are built from the
// requests as a daemon builds them.
// Thread-safety: a FakeDaemon's own thread answers; its counters and script
// may be read and changed from the test's thread.
#ifndef QUILLON_TESTS_SUPPORT_PTP_FAKE_H_
#define QUILLON_TESTS_SUPPORT_PTP_FAKE_H_

#include <atomic>
#include <chrono>
#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <mutex>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "ptp_management/codec.h"

namespace quillon::test_support {

using Bytes = std::vector<uint8_t>;

// The daemon's clock in the answers: 02:00:00:ff:fe:00:00:01.
ptpmgmt::ClockIdentity fakeDaemonClock();

// A RESPONSE to `request` carrying `data` under the request's management id
// (`id` when given), from port `sourcePort` of the fake daemon's clock.
Bytes managementAnswer(const ptpmgmt::Answer& request, const Bytes& data, uint16_t sourcePort = 0,
                       std::optional<uint16_t> id = std::nullopt);
// A MANAGEMENT_ERROR_STATUS answer to `request`.
Bytes errorStatusAnswer(const ptpmgmt::Answer& request, uint16_t errorId);

// The data sets of a one-port ordinary clock in state `portState`, slave to
// grandmaster 02:00:00:ff:fe:00:00:09 when it is SLAVE.
Bytes defaultDataSet(uint16_t numberPorts);
Bytes portDataSet(uint8_t portState);
Bytes parentDataSet();
Bytes timeStatusNp(int64_t masterOffset, bool gmPresent);
Bytes currentDataSet();
Bytes timePropertiesDataSet();
Bytes portPropertiesNp(const std::string& interfaceName);

// A datagram socket bound at a path, as a daemon's is.
class DatagramPeer {
 public:
  explicit DatagramPeer(std::string path);
  ~DatagramPeer();
  DatagramPeer(const DatagramPeer&) = delete;
  DatagramPeer& operator=(const DatagramPeer&) = delete;

  const std::string& path() const { return path_; }
  struct Received {
    Bytes bytes;
    std::string from;
  };
  // The next datagram, or nothing within `wait`.
  std::optional<Received> receive(std::chrono::milliseconds wait);
  void sendTo(const std::string& path, const Bytes& bytes);

 private:
  int fd_ = -1;
  std::string path_;
};

// A daemon that answers every request on its own thread through `script`:
// the datagrams to send back (none: stay silent).
class FakeDaemon {
 public:
  using Script = std::function<std::vector<Bytes>(const ptpmgmt::Answer& request)>;
  FakeDaemon(std::string path, Script script);
  ~FakeDaemon();

  const std::string& path() const { return peer_.path(); }
  void setScript(Script script);
  // Answers leave this long after their request came in (others are taken
  // in meanwhile), as from a daemon behind a slow link.
  void setDelay(std::chrono::milliseconds delay);
  // Requests received for management id `id`, and in all.
  int requests(ptpmgmt::ManagementId id) const;
  int requests() const;
  void resetCounts();

 private:
  void run();

  DatagramPeer peer_;
  mutable std::mutex mutex_;
  Script script_;                     // guarded by mutex_
  std::map<uint16_t, int> counts_;    // guarded by mutex_
  std::chrono::milliseconds delay_{0};  // guarded by mutex_
  std::atomic<bool> stop_{false};
  std::thread thread_;
};

// A script that answers like a healthy clock of `numberPorts` ports in
// `portState` with transportSpecific `transport`: requests with another
// transportSpecific stay unanswered, as a daemon ignores them, and unknown
// management ids get NO_SUCH_ID.
FakeDaemon::Script healthyDaemon(uint8_t portState, uint8_t transport = 0,
                                 uint16_t numberPorts = 1, int64_t masterOffset = -42);

}  // namespace quillon::test_support

#endif  // QUILLON_TESTS_SUPPORT_PTP_FAKE_H_
