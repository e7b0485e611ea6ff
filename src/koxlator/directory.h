// The explanations reader's narrow view of directories: list the names in
// one directory and tell whether a path is a regular file. Nothing else of
// the file system is touched through here.
//
// Thread-safety: one Directory per thread; the free functions are reentrant.
#ifndef QUILLON_KOXLATOR_DIRECTORY_H_
#define QUILLON_KOXLATOR_DIRECTORY_H_

#include <dirent.h>

#include <memory>
#include <string>

#include "error_record/error.h"
#include "error_record/status.h"

namespace koxlator {

// Longest directory or entry path accepted, and longest entry name, both
// exclusive.
inline constexpr size_t kMaxPathLength = 4096;
inline constexpr size_t kMaxNameLength = 256;

class Directory {
 public:
  // Opens `path` for listing. On failure the result is empty and `status`
  // takes -52006 "koapalerr_resourceNotFound" with the system's errno text and
  // "open dir failed", or -52000 "koapalerr_memoryFull".
  static std::unique_ptr<Directory> open(const std::string& path, koerr::Status& status);
  ~Directory();
  Directory(const Directory&) = delete;
  Directory& operator=(const Directory&) = delete;

  // The next entry name in the order the file system gives them, "." and
  // ".." included; null at the end. Valid until the next call.
  const char* next();

 private:
  Directory() = default;
  DIR* stream_ = nullptr;
};

// Whether `path` names a regular file (symbolic links followed). False with
// `error` set to the errno value when its status cannot be read.
bool queryRegularFile(const std::string& path, bool& regular, int& error);

// Adds the object "internal_error" naming the errno value and its system text.
void addErrnoDetails(koerr::Report& report, int error);

}  // namespace koxlator

#endif  // QUILLON_KOXLATOR_DIRECTORY_H_
