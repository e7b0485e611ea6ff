#include "state_file.h"

#include <fcntl.h>

#include <cerrno>
#include <utility>

namespace kosdlib {
namespace {

// A state file is a few hundred bytes; anything far larger is not ours.
constexpr size_t kLargestState = 16u << 20;
constexpr int kMaxAsideNumber = 1000;

std::string directoryOf(const std::string& path) {
  const size_t slash = path.rfind('/');
  if (slash == std::string::npos) return ".";
  return slash == 0 ? "/" : path.substr(0, slash);
}

}  // namespace

StateFile::StateFile(std::shared_ptr<FileSystemInterface> files, std::string path)
    : files_(std::move(files)), path_(std::move(path)), directory_(directoryOf(path_)) {}

bool StateFile::fail(const char* call, const std::string& file, FileFailure* failure) {
  failure->call = call;
  failure->error = errno;
  failure->file = file;
  return false;
}

StateFile::Found StateFile::read(std::string* content, FileFailure* failure) {
  const int fd = files_->open(path_.c_str(), O_RDONLY | O_CLOEXEC, 0);
  if (fd < 0) {
    if (errno == ENOENT) {
      held_.reset();
      return Found::kNothing;
    }
    fail("open", path_, failure);
    return Found::kUnreadable;
  }
  std::string text;
  char chunk[4096];
  for (;;) {
    const ssize_t got = files_->read(fd, chunk, sizeof chunk);
    if (got < 0 && errno == EINTR) continue;
    if (got < 0 || text.size() + static_cast<size_t>(got) > kLargestState) {
      if (got >= 0) errno = EFBIG;
      fail("read", path_, failure);
      files_->close(fd);
      return Found::kUnreadable;
    }
    if (got == 0) break;
    text.append(chunk, static_cast<size_t>(got));
  }
  files_->close(fd);
  held_ = text;
  *content = std::move(text);
  return Found::kContent;
}

bool StateFile::writeAll(int fd, const std::string& content) {
  size_t done = 0;
  while (done < content.size()) {
    const ssize_t wrote = files_->write(fd, content.data() + done, content.size() - done);
    if (wrote < 0 && errno == EINTR) continue;
    if (wrote < 0) return false;
    done += static_cast<size_t>(wrote);
  }
  return true;
}

bool StateFile::writeAndRename(const std::string& content, FileFailure* failure) {
  const std::string temporary = path_ + ".new";
  const int fd = files_->open(temporary.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
  if (fd < 0) return fail("open", temporary, failure);
  const char* failedCall = nullptr;
  if (!writeAll(fd, content)) {
    failedCall = "write";
  } else if (files_->fsync(fd) != 0) {
    failedCall = "fsync";
  }
  if (failedCall != nullptr) {
    fail(failedCall, temporary, failure);
    files_->close(fd);
  } else if (files_->close(fd) != 0) {
    fail("close", temporary, failure);
    failedCall = "close";
  } else if (files_->rename(temporary.c_str(), path_.c_str()) != 0) {
    fail("rename", path_, failure);
    failedCall = "rename";
  }
  if (failedCall != nullptr) {
    files_->unlink(temporary.c_str());
    return false;
  }
  return true;
}

bool StateFile::syncDirectory(FileFailure* failure) {
  const int fd = files_->open(directory_.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC, 0);
  if (fd < 0) return fail("open", directory_, failure);
  const bool synced = files_->fsync(fd) == 0;
  if (!synced) fail("fsync", directory_, failure);
  files_->close(fd);
  return synced;
}

// The rename happened but may not last: make the old content the one that
// lasts, so that disk and the owner's memory agree again.
void StateFile::restore() {
  FileFailure ignored;
  if (held_) {
    if (writeAndRename(*held_, &ignored)) syncDirectory(&ignored);
  } else if (files_->unlink(path_.c_str()) == 0) {
    syncDirectory(&ignored);
  }
}

bool StateFile::replace(const std::string& content, FileFailure* failure) {
  if (!writeAndRename(content, failure)) return false;
  if (!syncDirectory(failure)) {
    restore();
    return false;
  }
  held_ = content;
  return true;
}

bool StateFile::moveAside(std::string* aside, FileFailure* failure) {
  for (int number = 1; number <= kMaxAsideNumber; ++number) {
    const std::string candidate = path_ + ".unusable." + std::to_string(number);
    if (files_->renameNoReplace(path_.c_str(), candidate.c_str()) == 0) {
      held_.reset();
      *aside = candidate;
      FileFailure ignored;
      syncDirectory(&ignored);
      return true;
    }
    if (errno != EEXIST) return fail("rename", path_, failure);
  }
  errno = EEXIST;
  return fail("rename", path_, failure);
}

}  // namespace kosdlib
