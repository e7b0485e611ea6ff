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

void ConnectionTable::Entry::begin() noexcept {
  mark_.store(progress(), std::memory_order_relaxed);
  since_.store(nowMillis(), std::memory_order_relaxed);
}

size_t ConnectionTable::add(Entry& entry, int fd, const std::atomic<uint64_t>* progress) {
  entry.fd_ = fd;
  entry.progress_ = progress;
  entry.waiting();
  std::lock_guard<std::mutex> hold(lock_);
  const size_t evicted = entries_.size() >= highMark_ ? evictLocked() : 0;
  entry.seen_ = entry.progress();
  entry.seenChange_ = nowMillis();
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

size_t ConnectionTable::check() {
  std::lock_guard<std::mutex> hold(lock_);
  const int64_t now = nowMillis();
  size_t shut = 0;
  for (Entry* entry : entries_) {
    const uint64_t progress = entry->progress();
    if (progress != entry->seen_) {
      entry->seen_ = progress;
      entry->seenChange_ = now;
    } else if (now - entry->seenChange_ >= pace_.idleMillis) {
      ::shutdown(entry->fd_, SHUT_RDWR);
      entry->seenChange_ = now;  // not shut twice while its thread has yet to notice
      ++shut;
    }
  }
  return shut + (entries_.size() >= highMark_ ? evictLocked() : 0);
}

size_t ConnectionTable::size() const {
  std::lock_guard<std::mutex> hold(lock_);
  return entries_.size();
}

size_t ConnectionTable::evictLocked() {
  // Room for the one arriving, down to the low mark.
  size_t count = entries_.size() + 1 - std::min(entries_.size() + 1, lowMark_);
  const int64_t now = nowMillis();
  std::vector<std::pair<int64_t, Entry*>> slow;
  slow.reserve(entries_.size());
  for (Entry* entry : entries_) {
    const int64_t since = entry->since_.load(std::memory_order_relaxed);
    if (since == Entry::kBusy) continue;
    const int64_t elapsed = now - since;
    if (elapsed < pace_.graceMillis) continue;
    const uint64_t moved = entry->progress() - entry->mark_.load(std::memory_order_relaxed);
    if (moved * 1000 < pace_.minBytesPerSecond * static_cast<uint64_t>(std::max<int64_t>(elapsed, 0)) ||
        moved == 0) {
      slow.emplace_back(since, entry);
    }
  }
  count = std::min(count, slow.size());
  std::partial_sort(slow.begin(), slow.begin() + static_cast<ptrdiff_t>(count), slow.end(),
                    [](const auto& a, const auto& b) { return a.first < b.first; });
  // Shutting the socket makes the daemon's own thread see the end of the
  // stream and close the connection its usual way; the entry leaves the
  // table then.
  for (size_t i = 0; i < count; ++i) {
    ::shutdown(slow[i].second->fd_, SHUT_RDWR);
    // Not chosen again while its thread has yet to notice.
    slow[i].second->busy();
  }
  return count;
}

}  // namespace ws::host
