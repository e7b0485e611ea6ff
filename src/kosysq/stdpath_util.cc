#include "kosysq/stdpath_util.h"

#include <sys/stat.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <new>

#include "error_record/constants.h"
#include "error_record/error.h"

namespace kosysq {
namespace {

constexpr const char* kFile = "kosysq/stdpath_util";
constexpr int kOpenLine = 224;
constexpr int kReadLine = 249;

struct FileCloser {
  void operator()(std::FILE* file) const { std::fclose(file); }
};
using File = std::unique_ptr<std::FILE, FileCloser>;

// `path` is named only for a file that would not open: once it is open, the
// failure lies in reading, not in which file was meant.
void reportFileFailure(koerr::Status& status, const koerr::ErrorConstant& constant, int line,
                       int error, const char* message, const std::string* path = nullptr) {
  char text[256] = "";
  // The GNU variant may return a static text instead of filling ours.
  const char* systemText = strerror_r(error, text, sizeof text);
  koerr::Report report(status, constant, kFile, line);
  report.open("internal_error")
      .add("api", "errno")
      .addInt("code", error)
      .add("string", systemText)
      .close()
      .open("kosysq_debug")
      .add("message", message);
  if (path != nullptr) {
    report.add("path", *path);
  }
  report.close();
}

// Size by seeking to the end; a directory opens fine for reading on Linux but
// has no content to give, so it is turned away as a failed read.
bool fileSize(std::FILE* file, long& size, int& error) {
  struct stat info;
  if (fstat(fileno(file), &info) != 0) {
    error = errno;
    return false;
  }
  if (S_ISDIR(info.st_mode)) {
    error = EISDIR;
    return false;
  }
  if (std::fseek(file, 0, SEEK_END) != 0 || (size = std::ftell(file)) < 0 ||
      std::fseek(file, 0, SEEK_SET) != 0) {
    error = errno;
    return false;
  }
  return true;
}

bool isTrailingJunk(char c) {
  return c == '\0' || c == '/' || c == ' ' || c == '\t' || c == '\n' || c == '\v' || c == '\f' ||
         c == '\r';
}

bool isSpace(char c) {
  return c == ' ' || c == '\t' || c == '\n' || c == '\v' || c == '\f' || c == '\r';
}

void trimDirectory(std::string& text) {
  size_t end = text.size();
  while (end > 0 && isTrailingJunk(text[end - 1])) {
    --end;
  }
  size_t begin = 0;
  while (begin < end && isSpace(text[begin])) {
    ++begin;
  }
  text = text.substr(begin, end - begin);
}

}  // namespace

std::string shareDirMarkerPath() {
  const char* overridden = std::getenv(kShareDirMarkerEnv);
  return overridden != nullptr && overridden[0] != '\0' ? overridden : kShareDirMarkerFile;
}

void sharedDataDirectory(std::string& directory, koerr::Status& status) {
  (void)status;  // a missing marker is normal and never the caller's error
  koerr::Status privateStatus;
  readWholeFile(shareDirMarkerPath(), directory, privateStatus);
  const bool failed = privateStatus.code < 0;
  koerr::releaseText(privateStatus);
  if (failed) {
    directory = kDefaultSharedDataDirectory;
    return;
  }
  trimDirectory(directory);
}

void readWholeFile(const std::string& path, std::string& content, koerr::Status& status) {
  content.clear();
  File file(std::fopen(path.c_str(), "rb"));
  if (!file) {
    reportFileFailure(status, koerr::koapalerr_resourceNotFound, kOpenLine, errno,
                      "error opening file", &path);
    return;
  }
  long size = 0;
  int error = 0;
  if (!fileSize(file.get(), size, error)) {
    reportFileFailure(status, koerr::koapalerr_osFault, kReadLine, error,
                      "didn't read full content of file");
    return;
  }
  try {
    content.resize(static_cast<size_t>(size));
  } catch (const std::exception&) {
    koerr::Report(status, koerr::koapalerr_memoryFull, "kohtl/err/Allocator", 32);
    return;
  }
  errno = 0;
  const size_t got = std::fread(content.data(), 1, content.size(), file.get());
  if (got != content.size()) {
    // A file that shrank since the seek reads short without any errno.
    error = std::ferror(file.get()) && errno != 0 ? errno : EIO;
    content.clear();
    reportFileFailure(status, koerr::koapalerr_osFault, kReadLine, error,
                      "didn't read full content of file");
  }
}

}  // namespace kosysq
