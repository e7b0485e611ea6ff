#include "ptp_management/uds_client.h"

#include <dirent.h>
#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdlib>
#include <cstring>

namespace ptpmgmt {
namespace {

constexpr const char* kNamePrefix = "kopdm.";
// Larger than any management answer ptp4l sends (the longest carries a
// 255-byte interface name), so a cut datagram is a malformed one.
constexpr size_t kDatagramCapacity = 1024;

std::atomic<uint32_t> nextClientNumber{0};

bool fillAddress(const std::string& path, sockaddr_un* address, socklen_t* length) {
  std::memset(address, 0, sizeof *address);
  address->sun_family = AF_UNIX;
  if (path.empty() || path.size() >= sizeof address->sun_path) return false;
  std::memcpy(address->sun_path, path.data(), path.size());
  *length = static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + path.size() + 1);
  return true;
}

// "<pid>" of "kopdm.<pid>.<n>", or 0 for a name of another form.
pid_t ownerOf(const char* name) {
  const size_t prefixLength = std::strlen(kNamePrefix);
  if (std::strncmp(name, kNamePrefix, prefixLength) != 0) return 0;
  char* end = nullptr;
  const long pid = std::strtol(name + prefixLength, &end, 10);
  if (end == name + prefixLength || *end != '.' || pid <= 0) return 0;
  return static_cast<pid_t>(pid);
}

// Client paths of processes that died without removing them. A process that
// runs under another user (EPERM) still runs, so its paths stay. Clients
// open rarely (once per daemon and configuration), so each open sweeps.
void sweepStalePaths(const std::string& directory) {
  DIR* dir = ::opendir(directory.c_str());
  if (dir == nullptr) return;
  while (const dirent* entry = ::readdir(dir)) {
    const pid_t owner = ownerOf(entry->d_name);
    if (owner == 0 || owner == ::getpid()) continue;
    if (::kill(owner, 0) == 0 || errno != ESRCH) continue;
    ::unlinkat(::dirfd(dir), entry->d_name, 0);
  }
  ::closedir(dir);
}

uint16_t sequenceCounter() {
  static std::atomic<uint16_t> next{static_cast<uint16_t>(::getpid())};
  return next.fetch_add(1, std::memory_order_relaxed);
}

bool matches(const PendingGet& get, const Answer& answer) {
  return !get.answered && answer.sequenceId == get.request.sequenceId &&
         answer.transportSpecific == get.request.transportSpecific &&
         answer.action == static_cast<uint8_t>(Action::kResponse) &&
         answer.managementId == static_cast<uint16_t>(get.request.id) &&
         answer.target == get.request.source;
}

// Files the datagram under the request it answers; false when it answers none.
bool file(std::vector<PendingGet>& gets, std::vector<uint8_t>& datagram, ExchangeOutcome* outcome) {
  Answer answer;
  const DecodeError error = decodeAnswer(datagram.data(), datagram.size(), &answer);
  if (error == DecodeError::kNone) {
    for (PendingGet& get : gets) {
      if (!matches(get, answer)) continue;
      get.answered = true;
      get.datagram.swap(datagram);
      // Decoded again over the bytes' final home, so that `data` points there.
      (void)decodeAnswer(get.datagram.data(), get.datagram.size(), &get.answer);
      return true;
    }
    return false;
  }
  // Too broken to trust its identifiers, but it may still carry the
  // sequence id of a request (bytes 30-31), which then failed.
  constexpr size_t kSequenceEnd = 32;
  if (datagram.size() >= kSequenceEnd) {
    const uint16_t sequenceId = static_cast<uint16_t>((datagram[30] << 8) | datagram[31]);
    for (PendingGet& get : gets) {
      if (get.answered || get.request.sequenceId != sequenceId) continue;
      get.answered = true;
      get.malformed = error;
      return true;
    }
  }
  outcome->unmatchedMalformed = error;
  return false;
}

bool satisfied(const std::vector<PendingGet>& gets, Until until) {
  for (const PendingGet& get : gets) {
    if (get.answered == (until == Until::kAnyAnswer)) return until == Until::kAnyAnswer;
  }
  return until == Until::kEveryAnswer;
}

}  // namespace

std::string UdsClient::defaultDirectory() {
  const char* tmp = std::getenv("TMPDIR");
  // Room for "/kopdm.<pid>.<n>" in a socket path of 107 bytes.
  if (tmp != nullptr && tmp[0] == '/' && std::strlen(tmp) <= 64) return tmp;
  return "/tmp";
}

std::unique_ptr<UdsClient> UdsClient::open(const std::string& directory,
                                           SystemFailure* failure) {
  sweepStalePaths(directory);
  const std::string path = directory + "/" + kNamePrefix + std::to_string(::getpid()) + "." +
                           std::to_string(nextClientNumber.fetch_add(1));
  sockaddr_un address;
  socklen_t length = 0;
  if (!fillAddress(path, &address, &length)) {
    *failure = {"bind", ENAMETOOLONG};
    return nullptr;
  }
  const int fd = ::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
  if (fd < 0) {
    *failure = {"socket", errno};
    return nullptr;
  }
  // A path of this process that a forked child or an earlier client left.
  ::unlink(path.c_str());
  if (::bind(fd, reinterpret_cast<const sockaddr*>(&address), length) != 0) {
    *failure = {"bind", errno};
    ::close(fd);
    return nullptr;
  }
  return std::unique_ptr<UdsClient>(new UdsClient(fd, path));
}

UdsClient::~UdsClient() {
  ::close(fd_);
  ::unlink(path_.c_str());
}

SystemFailure UdsClient::send(const std::string& serverPath, const uint8_t* bytes, size_t size) {
  sockaddr_un address;
  socklen_t length = 0;
  if (!fillAddress(serverPath, &address, &length)) return {"sendto", ENAMETOOLONG};
  // Never blocks: a daemon that stopped reading fills its queue of ten
  // datagrams, and a blocking send would then wait for it forever.
  while (::sendto(fd_, bytes, size, MSG_NOSIGNAL | MSG_DONTWAIT,
                  reinterpret_cast<const sockaddr*>(&address), length) < 0) {
    if (errno != EINTR) return {"sendto", errno};
  }
  return {};
}

ssize_t UdsClient::receive(const std::string& serverPath, uint8_t* buffer, size_t capacity,
                           Clock::time_point deadline, SystemFailure* failure) {
  for (;;) {
    const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(
        deadline - Clock::now() + std::chrono::microseconds(999));
    if (left.count() <= 0) return 0;
    pollfd ready{fd_, POLLIN, 0};
    const int polled = ::poll(&ready, 1, static_cast<int>(left.count()));
    if (polled < 0) {
      if (errno == EINTR) continue;
      *failure = {"poll", errno};
      return -1;
    }
    if (polled == 0) continue;  // the loop's first check ends it
    sockaddr_un from;
    socklen_t fromLength = sizeof from;
    const ssize_t size = ::recvfrom(fd_, buffer, capacity, MSG_TRUNC | MSG_DONTWAIT,
                                    reinterpret_cast<sockaddr*>(&from), &fromLength);
    if (size < 0) {
      if (errno == EINTR || errno == EAGAIN) continue;
      *failure = {"recvfrom", errno};
      return -1;
    }
    const size_t pathLength = fromLength > offsetof(sockaddr_un, sun_path)
                                  ? fromLength - offsetof(sockaddr_un, sun_path)
                                  : 0;
    // The daemon's answers come from its own socket; anything else is a stray.
    if (pathLength >= serverPath.size() &&
        std::memcmp(from.sun_path, serverPath.data(), serverPath.size()) == 0 &&
        (pathLength == serverPath.size() || from.sun_path[serverPath.size()] == '\0')) {
      return size;
    }
  }
}

void UdsClient::drain() {
  uint8_t discard[1];
  while (::recv(fd_, discard, sizeof discard, MSG_DONTWAIT | MSG_TRUNC) >= 0) {
  }
}

ExchangeOutcome exchange(UdsClient& client, const std::string& serverPath,
                         std::vector<PendingGet>& gets, Until until,
                         Clock::time_point deadline) {
  ExchangeOutcome outcome;
  client.drain();
  for (PendingGet& get : gets) {
    get.request.sequenceId = sequenceCounter();
    const auto bytes = encodeGet(get.request);
    outcome.failure = client.send(serverPath, bytes.data(), bytes.size());
    if (outcome.failure.call != nullptr) return outcome;
  }
  return collect(client, serverPath, gets, until, deadline);
}

ExchangeOutcome collect(UdsClient& client, const std::string& serverPath,
                        std::vector<PendingGet>& gets, Until until, Clock::time_point deadline) {
  ExchangeOutcome outcome;
  std::vector<uint8_t> datagram(kDatagramCapacity);
  while (!satisfied(gets, until)) {
    datagram.resize(kDatagramCapacity);
    const ssize_t size =
        client.receive(serverPath, datagram.data(), datagram.size(), deadline, &outcome.failure);
    if (size < 0) return outcome;
    if (size == 0) {
      outcome.timedOut = true;
      return outcome;
    }
    if (static_cast<size_t>(size) > kDatagramCapacity) {
      outcome.unmatchedMalformed = DecodeError::kLengthBeyondDatagram;
      continue;
    }
    datagram.resize(static_cast<size_t>(size));
    // A filed datagram was moved to its request.
    if (file(gets, datagram, &outcome)) datagram.assign(kDatagramCapacity, 0);
  }
  return outcome;
}

}  // namespace ptpmgmt
