// Counts the requests in progress, so that a stop can wait for them to be
// answered. Every request enters and leaves the count, on every pool thread:
// a single shared counter would move its cache line between cores twice per
// request, so each thread counts in a line of its own and only a waiting
// stop adds the lines up.
//
// Thread-safety: enter() and leave() from any thread, a request leaving on
// the thread it entered on; waitForNone() from one controlling thread.
#ifndef WS_RUNTIME_HOST_IN_FLIGHT_H_
#define WS_RUNTIME_HOST_IN_FLIGHT_H_

#include <array>
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <mutex>

namespace ws::host {

class InFlight {
 public:
  void enter() noexcept;
  void leave() noexcept;
  // Blocks until no request is in progress or `grace` has passed; true when
  // none is. Every leave() from now on wakes it.
  bool waitForNone(std::chrono::milliseconds grace);

 private:
  // More threads than lines only makes some of them share a line: the
  // counts stay exact because each line is updated atomically.
  static constexpr size_t kLines = 64;
  struct alignas(64) Line {
    std::atomic<int64_t> count{0};
  };

  std::atomic<int64_t>& ownLine() noexcept;
  int64_t total() const noexcept;

  std::array<Line, kLines> lines_;
  std::atomic<bool> waiting_{false};
  std::mutex lock_;
  std::condition_variable none_;
};

}  // namespace ws::host

#endif  // WS_RUNTIME_HOST_IN_FLIGHT_H_
