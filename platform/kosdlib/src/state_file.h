// One small file whose content is replaced as a whole and survives a crash
// or a power cut at any point: the file holds either the old content or the
// new one, never a mix, and a replacement reported done is on disk.
//
// Thread-safety: none; the owner serialises its calls.
#ifndef KOSDLIB_SRC_STATE_FILE_H_
#define KOSDLIB_SRC_STATE_FILE_H_

#include <memory>
#include <optional>
#include <string>

#include "file_system.h"

namespace kosdlib {

// The system call that failed, its errno, and the file it was about.
struct FileFailure {
  const char* call = nullptr;
  int error = 0;
  std::string file;
};

class StateFile {
 public:
  StateFile(std::shared_ptr<FileSystemInterface> files, std::string path);

  const std::string& path() const { return path_; }

  enum class Found { kNothing, kContent, kUnreadable };
  // The whole file; kNothing when it does not exist.
  Found read(std::string* content, FileFailure* failure);

  // Writes a temporary file beside it, fsyncs it, renames it over the file
  // and fsyncs the directory. On failure the previous content is put back
  // where the rename had already happened, and the first failure is told.
  [[nodiscard]] bool replace(const std::string& content, FileFailure* failure);

  // Renames the file to "<path>.unusable.<n>" with the first n not taken,
  // never replacing anything, and tells that name.
  [[nodiscard]] bool moveAside(std::string* aside, FileFailure* failure);

 private:
  bool writeAndRename(const std::string& content, FileFailure* failure);
  bool writeAll(int fd, const std::string& content);
  bool syncDirectory(FileFailure* failure);
  bool fail(const char* call, const std::string& file, FileFailure* failure);
  void restore();

  std::shared_ptr<FileSystemInterface> files_;
  std::string path_;
  std::string directory_;
  std::optional<std::string> held_;  // what the file holds; none: no file
};

}  // namespace kosdlib

#endif  // KOSDLIB_SRC_STATE_FILE_H_
