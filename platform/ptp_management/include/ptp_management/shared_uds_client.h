// The one client socket of a process, shared by the exchanges of every
// thread with every daemon: descriptors do not grow with the number of time
// references. A thread of its own takes each datagram as it arrives and
// hands it to the exchange that sent the request it answers, told apart by
// sender and sequence id; that exchange then matches it to its request by
// sequence id, transportSpecific, management id and addressee. Late answers
// of exchanges that ended are dropped.
//
// Thread-safety: open() and any number of Exchanges may run on several
// threads at once; one Exchange belongs to one thread.
#ifndef PTP_MANAGEMENT_SHARED_UDS_CLIENT_H_
#define PTP_MANAGEMENT_SHARED_UDS_CLIENT_H_

#include <condition_variable>
#include <cstdint>
#include <list>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "ptp_management/uds_client.h"

namespace ptpmgmt {

class SharedUdsClient {
 public:
  // Opens nothing yet: client sockets are made in `directory`.
  explicit SharedUdsClient(std::string directory);
  // Stops the receiving thread, closes the socket and removes its path.
  ~SharedUdsClient();
  SharedUdsClient(const SharedUdsClient&) = delete;
  SharedUdsClient& operator=(const SharedUdsClient&) = delete;

  // Opens the socket and starts the receiving thread unless that is done;
  // false, with `*failure` set, when the system refuses (tried again on the
  // next call).
  [[nodiscard]] bool open(SystemFailure* failure);
  // The socket's path; empty until it is open.
  std::string path() const;

  // GET requests to one daemon and their answers, filed into `gets`. The
  // exchange hears its answers from its first send until it is destroyed,
  // so several rounds of collecting may follow one send. Needs open().
  class Exchange {
   public:
    Exchange(SharedUdsClient& client, std::string serverPath, std::vector<PendingGet>& gets);
    ~Exchange();
    Exchange(const Exchange&) = delete;
    Exchange& operator=(const Exchange&) = delete;

    // Sends every request without waiting; failure.call is null on
    // success, error EAGAIN when the daemon's queue is full.
    [[nodiscard]] SystemFailure send();
    // Files answers into the requests now in `gets` until `until` is met
    // or `deadline` passes; the outcome covers every round so far.
    ExchangeOutcome collect(Until until, Clock::time_point deadline);

   private:
    friend class SharedUdsClient;
    struct Datagram {
      std::vector<uint8_t> bytes;
      bool cut = false;  // larger than any answer: malformed
    };

    SharedUdsClient& client_;
    const std::string serverPath_;
    std::vector<PendingGet>& gets_;
    ExchangeOutcome outcome_;
    // Guarded by the client's mutex:
    std::vector<uint16_t> sequenceIds_;
    std::vector<Datagram> inbox_;
    SystemFailure receiveFailure_;
    std::condition_variable arrived_;
  };

 private:
  void receiveLoop();
  void dispatch(std::vector<uint8_t>& bytes, size_t size, const std::string& from);

  const std::string directory_;
  mutable std::mutex mutex_;
  std::unique_ptr<UdsClient> client_;  // guarded by mutex_ until open, then constant
  std::list<Exchange*> exchanges_;     // guarded by mutex_
  int stopFd_ = -1;
  std::thread receiver_;
};

}  // namespace ptpmgmt

#endif  // PTP_MANAGEMENT_SHARED_UDS_CLIENT_H_
