// The one exception type every layer throws, and the guard that turns a status
// record back into that exception at the end of a scope.
//
// Thread-safety: values owned by one thread; no shared state.
#ifndef QUILLON_ERROR_RECORD_EXCEPTION_H_
#define QUILLON_ERROR_RECORD_EXCEPTION_H_

#include <exception>

#include "error_record/status.h"

namespace koerr {

// Holds one record; what() is the record's JSON text, or "" without one.
// Catch sites catch ExceptionBase& to read the code.
class ExceptionBase {
 public:
  ExceptionBase() = default;
  // Takes the record's buffer; `status` is left empty.
  explicit ExceptionBase(Status&& status) noexcept;
  // Copying moves the record: exceptions carry their buffer, never copy it.
  ExceptionBase(const ExceptionBase& other) noexcept;
  ExceptionBase& operator=(const ExceptionBase&) = delete;
  virtual ~ExceptionBase();
  virtual const char* what() const noexcept;

  int32_t code() const noexcept { return status_.code; }
  Status& status() const noexcept { return status_; }

 private:
  mutable Status status_;
};

class Exception : public virtual ExceptionBase, public virtual std::exception {
 public:
  Exception() = default;
  explicit Exception(Status&& status) noexcept : ExceptionBase(std::move(status)) {}
  // Takes code and text of a record filled by someone else (a library call's
  // record): the buffer moves when the reallocate functions agree.
  static Exception fromStatus(Status& status);
  Exception(const Exception& other) noexcept : ExceptionBase(other), std::exception(other) {}
  const char* what() const noexcept override { return ExceptionBase::what(); }
};

// A record that throws its error when it leaves scope: when its code is
// negative and no exception is in flight, the record moves into an Exception
// that is thrown; otherwise its text is freed.
class StatusGuard : public Status {
 public:
  StatusGuard() = default;
  StatusGuard(const StatusGuard&) = delete;
  StatusGuard& operator=(const StatusGuard&) = delete;
  ~StatusGuard() noexcept(false);
};

}  // namespace koerr

#endif  // QUILLON_ERROR_RECORD_EXCEPTION_H_
