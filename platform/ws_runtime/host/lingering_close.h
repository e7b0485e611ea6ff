// Closes connections the way RFC 9112 9.6 asks of a server that closes
// while its client may still be sending: the sending side is shut first, so
// the answer is followed by an orderly end, and what the client still sends
// is read and dropped for a bounded time and size before the socket is
// closed. Closing at once would make the system answer the client's unread
// bytes with a reset, which can destroy the answer before the client reads
// it. The same thread runs a periodic task for the host (its eviction check).
//
// Thread-safety: adopt() from any thread; start() and stop() from one
// controlling thread.
#ifndef WS_RUNTIME_HOST_LINGERING_CLOSE_H_
#define WS_RUNTIME_HOST_LINGERING_CLOSE_H_

#include <chrono>
#include <cstddef>
#include <functional>
#include <mutex>
#include <thread>
#include <unordered_map>

namespace ws::host {

struct LingerLimits {
  std::chrono::milliseconds time;  // after the answer, at most
  size_t bytes;                    // read and dropped, at most
  size_t sockets;                  // lingering at once, at most
};

class LingeringClose {
 public:
  LingeringClose(const LingerLimits& limits, std::function<void()> tick,
                 std::chrono::milliseconds tickEvery)
      : limits_(limits), tick_(std::move(tick)), tickEvery_(tickEvery) {}
  ~LingeringClose() { stop(); }
  LingeringClose(const LingeringClose&) = delete;
  LingeringClose& operator=(const LingeringClose&) = delete;

  // False when the thread cannot be started.
  [[nodiscard]] bool start();
  // Takes `fd` over: shuts its sending side and closes it once the client
  // has ended, or the limits are reached. When too many linger already, it
  // is closed at once.
  void adopt(int fd);
  // Closes every socket still lingering and joins the thread.
  void stop();

 private:
  struct Lingering {
    std::chrono::steady_clock::time_point deadline;
    size_t dropped = 0;
  };
  void run();
  // Reads what is there; true when the socket is done with.
  bool drain(int fd, Lingering& lingering);
  void closeLocked(int fd);

  const LingerLimits limits_;
  const std::function<void()> tick_;
  const std::chrono::milliseconds tickEvery_;
  int epoll_ = -1;
  int wake_ = -1;  // an eventfd that ends run()
  std::thread thread_;
  std::mutex lock_;
  std::unordered_map<int, Lingering> sockets_;  // guarded by lock_
};

}  // namespace ws::host

#endif  // WS_RUNTIME_HOST_LINGERING_CLOSE_H_
