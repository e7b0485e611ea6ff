// The one way records are written: the standard members in their fixed order
// ("error_constant", "file", "line", "component"), then debug objects of
// key/value lines. No layer writes that sequence by hand.
//
//   koerr::Error(koerr::koapalerr_resourceNotFound, "quillon/ResourceManager", 75)
//       .open("kosyncdomain_debug")
//       .add("message", "Requested syncableDeviceUri does not exist on this host.")
//       .add("localDeviceUri", uri)
//       .raise();
//
//   koerr::Report(status, koerr::koapalerr_invalidParameter, "kodynlib/dynload", 64)
//       .open("kodynlib_debug").add("debug", "failed to get symbol").close()
//       .open("internal_error").add("api", "dlerror").close();
//
// Thread-safety: values owned by one thread.
#ifndef QUILLON_ERROR_RECORD_ERROR_H_
#define QUILLON_ERROR_RECORD_ERROR_H_

#include <cstdint>
#include <string>

#include "error_record/constants.h"
#include "error_record/exception.h"
#include "error_record/status.h"

namespace koerr {

// Writes one error into an existing record. When the record refuses the code
// (precedence rule) every call is a no-op and taken() is false.
class Report {
 public:
  // Takes the code only; no members.
  Report(Status& status, int32_t code);
  // Takes the code and, when taken, writes "error_constant", "file", "line"
  // and "component".
  Report(Status& status, const ErrorConstant& constant, const char* file, int32_t line);
  Report(Status& status, int32_t code, const char* constantName, const char* file, int32_t line);

  bool taken() const { return taken_; }

  // "file", "line", "component", without an "error_constant".
  Report& location(const char* file, int32_t line);
  // Opens a nested object; the following members go inside until close().
  Report& open(const char* key);
  // Leaves the innermost open object; with none open it does nothing.
  Report& close();
  Report& add(const char* key, const char* value);
  Report& add(const char* key, const std::string& value);
  Report& addInt(const char* key, int32_t value);
  Report& addUInt(const char* key, uint32_t value);
  Report& addBool(const char* key, bool value);
  Report& addRaw(const char* key, const char* json);
  Report& addRaw(const char* key, const std::string& json);
  // Keeps `caught` inside this record under "nested_error", at the root: any
  // open objects count as closed afterwards.
  Report& nest(Status& caught);

 private:
  void writeHeader(const char* constantName, const char* file, int32_t line);
  // The writing position, at the root's closing brace on first use.
  char* start();

  Status& status_;
  bool taken_;
  bool started_ = false;
  char* cursor_ = nullptr;
  int openObjects_ = 0;
};

// Builds a fresh record and throws it. The channel object, when named, is
// opened at once.
class Error {
 public:
  Error(const ErrorConstant& constant, const char* file, int32_t line,
        const char* channel = nullptr);
  Error(int32_t code, const char* constantName, const char* file, int32_t line,
        const char* channel = nullptr);
  Error(const Error&) = delete;
  Error& operator=(const Error&) = delete;

  Error& open(const char* key) { report_.open(key); return *this; }
  Error& close() { report_.close(); return *this; }
  Error& add(const char* key, const char* value) { report_.add(key, value); return *this; }
  Error& add(const char* key, const std::string& value) { report_.add(key, value); return *this; }
  Error& addInt(const char* key, int32_t value) { report_.addInt(key, value); return *this; }
  Error& addUInt(const char* key, uint32_t value) { report_.addUInt(key, value); return *this; }
  Error& addBool(const char* key, bool value) { report_.addBool(key, value); return *this; }
  Error& addRaw(const char* key, const char* json) { report_.addRaw(key, json); return *this; }
  Error& addRaw(const char* key, const std::string& json) { report_.addRaw(key, json); return *this; }
  Error& nest(Status& caught) { report_.nest(caught); return *this; }

  // Throws a koerr::Exception that carries the record.
  [[noreturn]] void raise();
  // Hands the record over without throwing (for callers that discard it or
  // store it elsewhere).
  Exception take();

 private:
  Exception exception_;
  Report report_;
};

}  // namespace koerr

#endif  // QUILLON_ERROR_RECORD_ERROR_H_
