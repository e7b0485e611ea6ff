// A recursive mutex that uses priority inheritance on real-time kernels, and
// keeps its owner and nesting count so that only the holder can release it.
// Meets BasicLockable, so std::lock_guard and std::unique_lock work with it.
//
// Thread-safety: lock() and unlock() from any thread; owner() and count() are
// exact only when read by the holder.
#ifndef QUILLON_KO_DSC_OSDEP_RECURSIVE_MUTEX_H_
#define QUILLON_KO_DSC_OSDEP_RECURSIVE_MUTEX_H_

#include <pthread.h>

#include <atomic>
#include <cstdint>

#include "ko/dsc/osdep/realtime_kernel.h"

namespace ko::dsc::osdep {

class RecursiveMutex {
 public:
  // Raises PosixError when the platform refuses to create the mutex.
  explicit RecursiveMutex(const RealtimeKernel& kernel = RealtimeKernel::system());
  RecursiveMutex(const RecursiveMutex&) = delete;
  RecursiveMutex& operator=(const RecursiveMutex&) = delete;
  ~RecursiveMutex();

  // Blocks until held; raises PosixError when the platform lock fails (for
  // example when the nesting limit is reached), leaving the state unchanged.
  void lock();
  // Releases one level. A call from a thread that does not hold the mutex is
  // ignored, so a stray unlock can never release another thread's hold.
  void unlock() noexcept;

  // The holder's thread identifier, 0 when free.
  pthread_t owner() const noexcept { return owner_.load(std::memory_order_relaxed); }
  int32_t count() const noexcept { return count_; }
  bool inheritsPriority() const noexcept { return inheritsPriority_; }

 private:
  // Written only while the platform mutex is held; atomic because a foreign
  // unlock reads it without holding anything.
  std::atomic<pthread_t> owner_{0};
  pthread_mutex_t mutex_;
  int32_t count_ = 0;
  bool inheritsPriority_;
};

}  // namespace ko::dsc::osdep

#endif  // QUILLON_KO_DSC_OSDEP_RECURSIVE_MUTEX_H_
