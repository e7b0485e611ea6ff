// The open connections, so that a crowd of clients that hold connections
// without completing a request (idle, or sending their head a byte at a
// time) cannot take every connection the host allows: once more than a high
// mark are open, a new connection makes the table shut the ones that have
// waited longest for a request head, until a low mark is reached. A
// connection whose head is complete (its request is being read or run) is
// never chosen.
//
// Thread-safety: every operation may be called from any thread. A closed
// connection's descriptor is shut only while the connection is registered,
// so a descriptor number the system has given to another file is never
// touched.
#ifndef WS_RUNTIME_HOST_CONNECTION_TABLE_H_
#define WS_RUNTIME_HOST_CONNECTION_TABLE_H_

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <mutex>
#include <vector>

namespace ws::host {

class ConnectionTable {
 public:
  // One connection's entry, kept inside the caller's connection state.
  class Entry {
   public:
    // The connection has completed a request head; it is not evictable
    // until waiting() is called.
    void busy() noexcept { waitingSince_.store(kBusy, std::memory_order_relaxed); }
    // The connection waits for a request head from now on.
    void waiting() noexcept;

   private:
    friend class ConnectionTable;
    static constexpr int64_t kBusy = -1;
    int fd_ = -1;
    std::atomic<int64_t> waitingSince_{0};  // milliseconds, or kBusy
    size_t index_ = 0;                      // in entries_
  };

  // Eviction starts when a connection arrives with more than `highMark`
  // open, and shuts the longest-waiting ones down to `lowMark`.
  ConnectionTable(size_t highMark, size_t lowMark) : highMark_(highMark), lowMark_(lowMark) {}

  // Registers the connection on descriptor `fd` as waiting for its first
  // head; evicts first when the table is crowded. Returns the number of
  // connections shut.
  size_t add(Entry& entry, int fd);
  void remove(Entry& entry);
  size_t size() const;

 private:
  size_t evictLocked(size_t count);

  const size_t highMark_;
  const size_t lowMark_;
  mutable std::mutex lock_;
  std::vector<Entry*> entries_;  // guarded by lock_
};

}  // namespace ws::host

#endif  // WS_RUNTIME_HOST_CONNECTION_TABLE_H_
