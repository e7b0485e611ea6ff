// The client end of a ptp4l management socket: a UNIX-domain datagram socket
// bound to a path of its own (the daemon answers to the address it received
// from, so an unbound client would hear nothing), and what an exchange of
// GET requests and their answers is made of (shared_uds_client.h runs them).
//
// Client paths are "<directory>/kopdm.<pid>.<n>", unique in the process and
// removed when the client is destroyed; paths left by processes that no
// longer run are removed when the next client of any process opens.
//
// Thread-safety: one thread at a time per client.
#ifndef PTP_MANAGEMENT_UDS_CLIENT_H_
#define PTP_MANAGEMENT_UDS_CLIENT_H_

#include <sys/types.h>

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "ptp_management/codec.h"

namespace ptpmgmt {

using Clock = std::chrono::steady_clock;

// What a failed system call left behind.
struct SystemFailure {
  const char* call = nullptr;  // "socket", "bind", "sendto", "poll", "recvfrom"; null: none
  int error = 0;               // errno
};

class UdsClient {
 public:
  // Opens and binds a socket at a new path in `directory` (null result and
  // `*failure` set when the system refuses).
  static std::unique_ptr<UdsClient> open(const std::string& directory, SystemFailure* failure);
  // The directory for client sockets: the service's $RUNTIME_DIRECTORY when
  // it is there, writable and short enough for a socket path; else $TMPDIR
  // when that is short enough; else /tmp.
  static std::string defaultDirectory();

  ~UdsClient();  // closes the socket and removes its path
  UdsClient(const UdsClient&) = delete;
  UdsClient& operator=(const UdsClient&) = delete;

  const std::string& path() const { return path_; }

  // Sends one datagram to the socket at `serverPath` without waiting;
  // failure.call is null on success, error EAGAIN when the daemon's queue is
  // full.
  [[nodiscard]] SystemFailure send(const std::string& serverPath, const uint8_t* bytes,
                                   size_t size);
  // Takes one queued datagram without waiting, copying up to `capacity`
  // bytes of it and its sender's path. Returns its whole size (larger than
  // `capacity` when it was cut); -1 when none is queued (`failure->call`
  // null) or when the system failed (`*failure` set).
  [[nodiscard]] ssize_t receiveQueued(uint8_t* buffer, size_t capacity, std::string* from,
                                      SystemFailure* failure);
  // For waiting until a datagram is queued.
  int fd() const { return fd_; }

 private:
  UdsClient(int fd, std::string path) : fd_(fd), path_(std::move(path)) {}

  int fd_;
  std::string path_;
};

// One GET of an exchange and, once answered, its answer.
struct PendingGet {
  GetRequest request;
  bool answered = false;
  std::vector<uint8_t> datagram;  // the answer as received
  Answer answer;                  // decoded from `datagram`; valid while it is
  DecodeError malformed = DecodeError::kNone;  // an answer arrived but did not decode
};

enum class Until {
  kEveryAnswer,  // every request answered
  kAnyAnswer,    // one request answered (probing alternatives)
};

struct ExchangeOutcome {
  SystemFailure failure;  // a send or receive failure ended the exchange
  bool timedOut = false;  // the deadline passed before `until` was met
  // A datagram arrived that could not be matched to a request because it
  // did not decode far enough.
  DecodeError unmatchedMalformed = DecodeError::kNone;
};

}  // namespace ptpmgmt

#endif  // PTP_MANAGEMENT_UDS_CLIENT_H_
