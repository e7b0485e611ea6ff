// The record handed to one device-library call, and what happens after it:
// an error becomes a thrown koerr::Exception with the library's record, unless
// another exception is already unwinding; warnings and success leave nothing.
//
// Thread-safety: one guard per call, on the calling thread.
#ifndef QUILLON_SYNCABLE_DEVICE_CALL_GUARD_H_
#define QUILLON_SYNCABLE_DEVICE_CALL_GUARD_H_

#include "error_record/status.h"

namespace kosdlib {
namespace wrapper {

class CallGuard {
 public:
  CallGuard() = default;
  CallGuard(const CallGuard&) = delete;
  CallGuard& operator=(const CallGuard&) = delete;
  ~CallGuard();

  koerr::Status* record() { return &status_; }
  // Throws the library's record when its code is negative and nothing is
  // unwinding; otherwise clears the code and frees the text.
  void check();

 private:
  koerr::Status status_;
};

}  // namespace wrapper
}  // namespace kosdlib

#endif  // QUILLON_SYNCABLE_DEVICE_CALL_GUARD_H_
