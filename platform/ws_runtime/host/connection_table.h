// The open connections, so that a crowd of clients that hold connections
// without making progress (idle, or sending a head or a body a few bytes at
// a time) cannot take every connection the host allows: once a high mark is
// reached, each new connection, and a periodic check, make the table shut
// the connections that are slower than a minimum pace, those that have
// waited longest first, until a low mark is reached. A connection whose
// request is complete (being run or answered) is never chosen, nor one whose
// current head or body began less than a grace period ago.
//
// Thread-safety: every operation may be called from any thread. A closed
// connection's descriptor is shut only while the connection is registered,
// so a descriptor number the system has given to another file is never
// touched.
//
// The table also times out idle connections itself (no byte received for
// the idle time, whatever the connection's phase), which spares the HTTP
// library a clock read and a relink of its timeout list on every request.
#ifndef WS_RUNTIME_HOST_CONNECTION_TABLE_H_
#define WS_RUNTIME_HOST_CONNECTION_TABLE_H_

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <mutex>
#include <vector>

namespace ws::host {

// The slowest a connection may be while the host is crowded.
struct Pace {
  uint64_t minBytesPerSecond;
  int64_t graceMillis;
  int64_t idleMillis;  // shut after this long without a byte received
};

class ConnectionTable {
 public:
  // One connection's entry, kept inside the caller's connection state.
  class Entry {
   public:
    // The request is complete: not evictable until waiting() or reading().
    void busy() noexcept { since_.store(kBusy, std::memory_order_relaxed); }
    // The connection waits for, or is receiving, a request head.
    void waiting() noexcept { begin(); }
    // The head is complete and the body is arriving.
    void reading() noexcept { begin(); }

   private:
    friend class ConnectionTable;
    static constexpr int64_t kBusy = -1;
    void begin() noexcept;
    uint64_t progress() const noexcept {
      return progress_ != nullptr ? progress_->load(std::memory_order_relaxed) : 0;
    }
    int fd_ = -1;
    const std::atomic<uint64_t>* progress_ = nullptr;
    std::atomic<int64_t> since_{0};  // milliseconds, or kBusy
    std::atomic<uint64_t> mark_{0};  // progress when the phase began
    size_t index_ = 0;               // in entries_
    // Guarded by the table's lock: progress at the last check, and when it
    // last changed.
    uint64_t seen_ = 0;
    int64_t seenChange_ = 0;
  };

  ConnectionTable(size_t highMark, size_t lowMark, Pace pace)
      : highMark_(highMark), lowMark_(lowMark), pace_(pace) {}

  // Registers the connection on descriptor `fd` as waiting for its first
  // head; `progress`, when given, counts the bytes received on it. Evicts
  // first when the table is crowded. Returns the number of connections shut.
  size_t add(Entry& entry, int fd, const std::atomic<uint64_t>* progress = nullptr);
  void remove(Entry& entry);
  // The periodic check: shuts idle connections, and evicts when crowded.
  // Returns the number shut.
  size_t check();
  size_t size() const;

 private:
  size_t evictLocked();

  const size_t highMark_;
  const size_t lowMark_;
  const Pace pace_;
  mutable std::mutex lock_;
  std::vector<Entry*> entries_;  // guarded by lock_
};

}  // namespace ws::host

#endif  // WS_RUNTIME_HOST_CONNECTION_TABLE_H_
