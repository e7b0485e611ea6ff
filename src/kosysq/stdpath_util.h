// Where the system's shared data lives, and whole-file reads. Failures come
// back in the caller's error record, never as exceptions.
//
// Thread-safety: no shared state; the marker file is read anew on each call.
#ifndef QUILLON_KOSYSQ_STDPATH_UTIL_H_
#define QUILLON_KOSYSQ_STDPATH_UTIL_H_

#include <string>

#include "error_record/status.h"

namespace kosysq {

// The marker file whose whole content names the shared-data directory.
inline constexpr const char* kShareDirMarkerFile = "/etc/korvane/share/share.dir";
// When set and not empty, names the marker file instead (tests, `make run`).
inline constexpr const char* kShareDirMarkerEnv = "KOSYSQ_SHARE_DIR_FILE";
// The directory used when the marker file cannot be read.
inline constexpr const char* kDefaultSharedDataDirectory = "/usr/local/korvane/share";

// The marker file that sharedDataDirectory reads.
std::string shareDirMarkerPath();

// Sets `directory` to the marker file's content without trailing white
// space, '/' or NUL and without leading white space; an unreadable marker
// gives kDefaultSharedDataDirectory and leaves `status` untouched.
void sharedDataDirectory(std::string& directory, koerr::Status& status);

// Replaces `content` with the whole file. On failure `content` is left empty
// and `status` takes -52006 "koapalerr_resourceNotFound" (cannot open),
// -52008 "koapalerr_osFault" (short read) or -52000 "koapalerr_memoryFull".
void readWholeFile(const std::string& path, std::string& content, koerr::Status& status);

}  // namespace kosysq

#endif  // QUILLON_KOSYSQ_STDPATH_UTIL_H_
