// The standard installation directories ("bindir", "datadir", ...): fixed
// defaults, corrected once per process through the optional relocation
// library. A relocation failure stays with the table and is handed to every
// user of it.
//
// Thread-safety: the process-wide table is built once, on first use, under
// the runtime's guarded static initialisation; afterwards it is only read.
// Separately built tables are plain values.
#ifndef QUILLON_KOSYSQ_STDPATH_H_
#define QUILLON_KOSYSQ_STDPATH_H_

#include <map>
#include <string>
#include <utility>
#include <vector>

#include "error_record/status.h"

namespace kosysq {

// The relocation library and its one function; it answers a directory name
// with > 0 (relocated path written to the buffer), 0 (default stands) or < 0
// (failure).
inline constexpr const char* kRelocationLibrary = "libkorelocations.so.0";
inline constexpr const char* kRelocationFunction = "get_relocated_dir";
using GetRelocatedDirFn = int (*)(const char* name, char* buffer, size_t size);
inline constexpr size_t kRelocationBufferSize = 255;
// Immediate binding, global visibility.
inline constexpr int kRelocationLoadFlags = 258;

// The nineteen names with their defaults, in table order.
const std::vector<std::pair<std::string, std::string>>& standardDirectoryDefaults();

class StandardDirectories {
 public:
  // Inserts the defaults, then asks `relocationLibrary` for each name in
  // table order; a library that cannot be loaded or lacks the function leaves
  // the defaults and no error. A negative answer records -52006 and skips the
  // remaining names.
  explicit StandardDirectories(const char* relocationLibrary = kRelocationLibrary);
  ~StandardDirectories();
  StandardDirectories(const StandardDirectories&) = delete;
  StandardDirectories& operator=(const StandardDirectories&) = delete;

  // The table; copies the table's own record into `status` first, so every
  // user learns of a relocation failure.
  const std::map<std::string, std::string>& directories(koerr::Status& status) const;
  // The path of `name`, or "" when the table has no such entry.
  std::string lookup(const std::string& name, koerr::Status& status) const;

 private:
  void relocate(GetRelocatedDirFn relocatedDir);

  std::map<std::string, std::string> directories_;
  koerr::Status status_;
};

// The process-wide table, built on first use.
const StandardDirectories& standardDirectories();

}  // namespace kosysq

#endif  // QUILLON_KOSYSQ_STDPATH_H_
