#include "koxlator/directory.h"

#include <dirent.h>
#include <sys/stat.h>

#include <cerrno>
#include <cstring>
#include <new>

#include "error_record/constants.h"

namespace koxlator {
namespace {

constexpr const char* kFile = "koxlator/koxlator_internal";
constexpr int kMemoryLine = 35;
constexpr int kOpenLine = 63;

}  // namespace

void addErrnoDetails(koerr::Report& report, int error) {
  char text[256] = "";
  // The GNU variant may return a static text instead of filling ours.
  const char* systemText = strerror_r(error, text, sizeof text);
  report.open("internal_error")
      .add("api", "errno")
      .addInt("code", error)
      .add("string", systemText)
      .close();
}

std::unique_ptr<Directory> Directory::open(const std::string& path, koerr::Status& status) {
  std::unique_ptr<Directory> directory(new (std::nothrow) Directory());
  if (!directory) {
    koerr::Report(status, koerr::koapalerr_memoryFull, kFile, kMemoryLine)
        .open("koxlator_debug")
        .add("koxlator", "failed to allocate memory")
        .close();
    return nullptr;
  }
  int error = ENAMETOOLONG;
  if (path.size() < kMaxPathLength) {
    directory->stream_ = opendir(path.c_str());
    error = errno;
  }
  if (directory->stream_ == nullptr) {
    koerr::Report report(status, koerr::koapalerr_resourceNotFound, kFile, kOpenLine);
    addErrnoDetails(report, error);
    report.open("koxlator_debug").add("debug", "open dir failed").add("path", path).close();
    return nullptr;
  }
  return directory;
}

Directory::~Directory() {
  if (stream_ != nullptr) {
    closedir(stream_);
  }
}

const char* Directory::next() {
  const dirent* entry = readdir(stream_);
  return entry != nullptr ? entry->d_name : nullptr;
}

bool queryRegularFile(const std::string& path, bool& regular, int& error) {
  struct stat info;
  if (stat(path.c_str(), &info) != 0) {
    error = errno;
    return false;
  }
  regular = S_ISREG(info.st_mode);
  return true;
}

}  // namespace koxlator
