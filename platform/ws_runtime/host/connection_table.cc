#include "connection_table.h"

#include <sys/socket.h>
#include <time.h>

#include <algorithm>

namespace ws::host {

namespace {

// The coarse clock costs a memory read, not a system call: it is read on
// every request.
int64_t nowMillis() noexcept {
  timespec now{};
  clock_gettime(CLOCK_MONOTONIC_COARSE, &now);
  return static_cast<int64_t>(now.tv_sec) * 1000 + now.tv_nsec / 1000000;
}

}  // namespace

void ConnectionTable::Entry::waiting() noexcept {
  waitingSince_.store(nowMillis(), std::memory_order_relaxed);
}

size_t ConnectionTable::add(Entry& entry, int fd) {
  entry.fd_ = fd;
  entry.waiting();
  std::lock_guard<std::mutex> hold(lock_);
  size_t evicted = 0;
  if (entries_.size() >= highMark_) evicted = evictLocked(entries_.size() + 1 - lowMark_);
  entry.index_ = entries_.size();
  entries_.push_back(&entry);
  return evicted;
}

void ConnectionTable::remove(Entry& entry) {
  std::lock_guard<std::mutex> hold(lock_);
  if (entry.index_ >= entries_.size() || entries_[entry.index_] != &entry) return;
  entries_[entry.index_] = entries_.back();
  entries_[entry.index_]->index_ = entry.index_;
  entries_.pop_back();
}

size_t ConnectionTable::size() const {
  std::lock_guard<std::mutex> hold(lock_);
  return entries_.size();
}

size_t ConnectionTable::evictLocked(size_t count) {
  std::vector<std::pair<int64_t, Entry*>> waiting;
  waiting.reserve(entries_.size());
  for (Entry* entry : entries_) {
    const int64_t since = entry->waitingSince_.load(std::memory_order_relaxed);
    if (since != Entry::kBusy) waiting.emplace_back(since, entry);
  }
  count = std::min(count, waiting.size());
  std::partial_sort(waiting.begin(), waiting.begin() + static_cast<ptrdiff_t>(count), waiting.end(),
                    [](const auto& a, const auto& b) { return a.first < b.first; });
  // Shutting the socket makes the daemon's own thread see the end of the
  // stream and close the connection its usual way; the entry leaves the
  // table then.
  for (size_t i = 0; i < count; ++i) {
    ::shutdown(waiting[i].second->fd_, SHUT_RDWR);
    // Not chosen again while its thread has yet to notice.
    waiting[i].second->busy();
  }
  return count;
}

}  // namespace ws::host
