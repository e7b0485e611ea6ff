// A management-socket relay that makes a ptp4l daemon slow: it listens at a
// socket path of its own, forwards every datagram a client sends to the
// daemon at once (through a socket bound for that client, so the daemon's
// answers can be told apart), and hands each answer back to its client a
// fixed delay after it came, from the listening socket, as the daemon
// itself would have answered.
//
//   ptp-delay-relay LISTEN_PATH DAEMON_PATH DELAY_MS
//
// SIGUSR1 prints "requests answers in_flight_max" (counts since the start,
// the most requests in flight since the previous report) on stdout; SIGTERM
// and SIGINT end it. A request is in flight from its forwarding until its
// answer is handed back, or for at most a second (a request the daemon
// ignores, such as a probe with the other transportSpecific).
#include <poll.h>
#include <signal.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstddef>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <deque>
#include <map>
#include <string>
#include <vector>

namespace {

using Clock = std::chrono::steady_clock;
constexpr auto kInFlightLimit = std::chrono::seconds(1);

volatile sig_atomic_t reportWanted = 0;
volatile sig_atomic_t stopWanted = 0;

sockaddr_un addressOf(const std::string& path, socklen_t* length) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  std::strncpy(address.sun_path, path.c_str(), sizeof address.sun_path - 1);
  *length = static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + path.size() + 1);
  return address;
}

int boundSocket(const std::string& path) {
  const int fd = ::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
  socklen_t length = 0;
  const sockaddr_un address = addressOf(path, &length);
  ::unlink(path.c_str());
  if (fd < 0 || ::bind(fd, reinterpret_cast<const sockaddr*>(&address), length) != 0) {
    std::fprintf(stderr, "ptp-delay-relay: cannot bind %s: %s\n", path.c_str(),
                 std::strerror(errno));
    std::exit(1);
  }
  return fd;
}

void sendTo(int fd, const std::string& path, const std::vector<uint8_t>& bytes) {
  socklen_t length = 0;
  const sockaddr_un address = addressOf(path, &length);
  ::sendto(fd, bytes.data(), bytes.size(), MSG_DONTWAIT,
           reinterpret_cast<const sockaddr*>(&address), length);
}

// One datagram and the path it came from; false when none was queued.
bool receive(int fd, std::vector<uint8_t>* bytes, std::string* from) {
  bytes->resize(2048);
  sockaddr_un address{};
  socklen_t length = sizeof address;
  const ssize_t size = ::recvfrom(fd, bytes->data(), bytes->size(), MSG_DONTWAIT,
                                  reinterpret_cast<sockaddr*>(&address), &length);
  if (size < 0) return false;
  bytes->resize(static_cast<size_t>(size));
  *from = length > offsetof(sockaddr_un, sun_path) ? address.sun_path : "";
  return true;
}

uint16_t sequenceIdOf(const std::vector<uint8_t>& datagram) {
  return datagram.size() >= 32 ? static_cast<uint16_t>((datagram[30] << 8) | datagram[31]) : 0;
}

struct Held {
  Clock::time_point due;
  std::string client;
  std::vector<uint8_t> bytes;
};

class Relay {
 public:
  Relay(std::string listenPath, std::string daemonPath, std::chrono::milliseconds delay)
      : listenPath_(std::move(listenPath)),
        daemonPath_(std::move(daemonPath)),
        delay_(delay),
        listenFd_(boundSocket(listenPath_)) {}

  ~Relay() {
    for (const auto& [fd, client] : clients_) {
      ::close(fd);
      ::unlink(sideOf(client).c_str());
    }
    ::close(listenFd_);
    ::unlink(listenPath_.c_str());
  }

  void run() {
    while (stopWanted == 0) {
      if (reportWanted != 0) report();
      handBackDue();
      std::vector<pollfd> fds{{listenFd_, POLLIN, 0}};
      for (const auto& entry : clients_) fds.push_back({entry.first, POLLIN, 0});
      int wait = 100;
      if (!held_.empty()) {
        const auto left = std::chrono::ceil<std::chrono::milliseconds>(held_.front().due -
                                                                       Clock::now());
        wait = std::max(0, std::min(wait, static_cast<int>(left.count())));
      }
      if (::poll(fds.data(), fds.size(), wait) <= 0) continue;
      if (fds[0].revents != 0) forwardRequests();
      for (size_t i = 1; i < fds.size(); ++i) {
        if (fds[i].revents != 0) holdAnswers(fds[i].fd);
      }
    }
  }

 private:
  std::string sideOf(const std::string& client) const {
    return listenPath_ + ".c" + std::to_string(sides_.at(client));
  }

  int socketFor(const std::string& client) {
    for (const auto& [fd, known] : clients_) {
      if (known == client) return fd;
    }
    sides_[client] = sides_.size();
    const int fd = boundSocket(sideOf(client));
    clients_[fd] = client;
    return fd;
  }

  void forwardRequests() {
    std::vector<uint8_t> bytes;
    std::string from;
    while (receive(listenFd_, &bytes, &from)) {
      if (from.empty()) continue;
      ++requests_;
      expireInFlight();
      inFlight_.push_back({Clock::now(), sequenceIdOf(bytes)});
      if (inFlight_.size() > inFlightMax_) inFlightMax_ = inFlight_.size();
      sendTo(socketFor(from), daemonPath_, bytes);
    }
  }

  void holdAnswers(int fd) {
    std::vector<uint8_t> bytes;
    std::string from;
    while (receive(fd, &bytes, &from)) {
      held_.push_back({Clock::now() + delay_, clients_.at(fd), bytes});
    }
  }

  void handBackDue() {
    while (!held_.empty() && held_.front().due <= Clock::now()) {
      const Held& answer = held_.front();
      sendTo(listenFd_, answer.client, answer.bytes);
      ++answers_;
      const uint16_t sequenceId = sequenceIdOf(answer.bytes);
      for (auto it = inFlight_.begin(); it != inFlight_.end(); ++it) {
        if (it->sequenceId != sequenceId) continue;
        inFlight_.erase(it);
        break;
      }
      held_.pop_front();
    }
  }

  void expireInFlight() {
    while (!inFlight_.empty() && Clock::now() - inFlight_.front().since > kInFlightLimit) {
      inFlight_.pop_front();
    }
  }

  void report() {
    reportWanted = 0;
    std::printf("%llu %llu %zu\n", static_cast<unsigned long long>(requests_),
                static_cast<unsigned long long>(answers_), inFlightMax_);
    std::fflush(stdout);
    expireInFlight();
    inFlightMax_ = inFlight_.size();
  }

  struct InFlight {
    Clock::time_point since;
    uint16_t sequenceId;
  };

  const std::string listenPath_;
  const std::string daemonPath_;
  const std::chrono::milliseconds delay_;
  const int listenFd_;
  std::map<int, std::string> clients_;     // relay-side socket -> client path
  std::map<std::string, size_t> sides_;    // client path -> number of its socket
  std::deque<Held> held_;                  // in the order they fall due
  std::deque<InFlight> inFlight_;          // in the order they were forwarded
  size_t inFlightMax_ = 0;
  unsigned long long requests_ = 0;
  unsigned long long answers_ = 0;
};

}  // namespace

int main(int argc, char** argv) {
  if (argc != 4) {
    std::fprintf(stderr, "usage: ptp-delay-relay LISTEN_PATH DAEMON_PATH DELAY_MS\n");
    return 2;
  }
  struct sigaction action {};
  action.sa_handler = [](int signal) {
    if (signal == SIGUSR1) {
      reportWanted = 1;
    } else {
      stopWanted = 1;
    }
  };
  for (int signal : {SIGUSR1, SIGTERM, SIGINT}) ::sigaction(signal, &action, nullptr);
  Relay relay(argv[1], argv[2], std::chrono::milliseconds(std::atoi(argv[3])));
  relay.run();
  return 0;
}
