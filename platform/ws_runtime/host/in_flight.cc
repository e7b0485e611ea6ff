#include "in_flight.h"

namespace ws::host {

namespace {

// Threads take lines in the order they first count a request, so the
// pool's few threads each get a line of their own.
size_t threadNumber() noexcept {
  static std::atomic<size_t> next{0};
  thread_local const size_t number = next.fetch_add(1, std::memory_order_relaxed);
  return number;
}

}  // namespace

std::atomic<int64_t>& InFlight::ownLine() noexcept {
  return lines_[threadNumber() % kLines].count;
}

int64_t InFlight::total() const noexcept {
  int64_t sum = 0;
  for (const Line& line : lines_) sum += line.count.load();
  return sum;
}

void InFlight::enter() noexcept { ownLine().fetch_add(1); }

void InFlight::leave() noexcept {
  ownLine().fetch_sub(1);
  // Sequentially consistent with the waiter's flag and its reading of the
  // lines: a leave that misses the flag is seen by the waiter's sum, and one
  // that sees it wakes the waiter under the lock, so no wake-up is lost.
  if (waiting_.load()) {
    std::lock_guard<std::mutex> guard(lock_);
    none_.notify_all();
  }
}

bool InFlight::waitForNone(std::chrono::milliseconds grace) {
  std::unique_lock<std::mutex> guard(lock_);
  waiting_.store(true);
  return none_.wait_for(guard, grace, [this] { return total() == 0; });
}

}  // namespace ws::host
