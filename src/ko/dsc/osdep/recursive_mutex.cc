#include "ko/dsc/osdep/recursive_mutex.h"

#include "ko/dsc/osdep/os_exception.h"

namespace ko::dsc::osdep {
namespace {

constexpr const char* kFile = "ko/dsc/osdep/Mutex";

// Owns the attribute object for the length of the mutex creation.
class MutexAttributes {
 public:
  MutexAttributes() {
    if (const int rc = pthread_mutexattr_init(&attr_); rc != 0) {
      throw PosixError(kFile, __LINE__, "pthread_mutexattr_init", rc);
    }
  }
  ~MutexAttributes() { pthread_mutexattr_destroy(&attr_); }
  MutexAttributes(const MutexAttributes&) = delete;
  MutexAttributes& operator=(const MutexAttributes&) = delete;

  void set(int (*setter)(pthread_mutexattr_t*, int), int value, const char* call) {
    if (const int rc = setter(&attr_, value); rc != 0) {
      throw PosixError(kFile, __LINE__, call, rc);
    }
  }
  const pthread_mutexattr_t* get() const { return &attr_; }

 private:
  pthread_mutexattr_t attr_;
};

}  // namespace

RecursiveMutex::RecursiveMutex(const RealtimeKernel& kernel)
    : inheritsPriority_(kernel.isRealtime()) {
  MutexAttributes attributes;
  attributes.set(pthread_mutexattr_settype, PTHREAD_MUTEX_RECURSIVE, "pthread_mutexattr_settype");
  if (inheritsPriority_) {
    attributes.set(pthread_mutexattr_setprotocol, PTHREAD_PRIO_INHERIT,
                   "pthread_mutexattr_setprotocol");
  }
  if (const int rc = pthread_mutex_init(&mutex_, attributes.get()); rc != 0) {
    throw PosixError(kFile, __LINE__, "pthread_mutex_init", rc);
  }
}

RecursiveMutex::~RecursiveMutex() { pthread_mutex_destroy(&mutex_); }

void RecursiveMutex::lock() {
  if (const int rc = pthread_mutex_lock(&mutex_); rc != 0) {
    throw PosixError(kFile, __LINE__, "pthread_mutex_lock", rc);
  }
  owner_.store(pthread_self(), std::memory_order_relaxed);
  ++count_;
}

void RecursiveMutex::unlock() noexcept {
  if (!pthread_equal(owner_.load(std::memory_order_relaxed), pthread_self())) {
    return;
  }
  if (count_ > 0) {
    --count_;
  }
  if (count_ == 0) {
    owner_.store(0, std::memory_order_relaxed);
  }
  pthread_mutex_unlock(&mutex_);
}

}  // namespace ko::dsc::osdep
