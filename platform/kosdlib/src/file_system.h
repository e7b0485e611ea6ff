// The file-system calls that keep a device's state on disk, behind one
// narrow interface so that tests can make any one of them fail. Each call
// behaves as its POSIX namesake: -1 with errno set on failure.
//
// Thread-safety: the POSIX implementation holds no state; substitutes used
// in tests are driven from one thread.
#ifndef KOSDLIB_SRC_FILE_SYSTEM_H_
#define KOSDLIB_SRC_FILE_SYSTEM_H_

#include <sys/types.h>

#include <cstddef>

namespace kosdlib {

class FileSystemInterface {
 public:
  virtual ~FileSystemInterface() = default;
  virtual int open(const char* path, int flags, mode_t mode) = 0;
  virtual ssize_t read(int fd, void* buffer, size_t size) = 0;
  virtual ssize_t write(int fd, const void* data, size_t size) = 0;
  virtual int fsync(int fd) = 0;
  virtual int close(int fd) = 0;
  virtual int rename(const char* from, const char* to) = 0;
  // rename that fails with EEXIST rather than replace `to`.
  virtual int renameNoReplace(const char* from, const char* to) = 0;
  virtual int unlink(const char* path) = 0;
};

class PosixFileSystem : public FileSystemInterface {
 public:
  int open(const char* path, int flags, mode_t mode) override;
  ssize_t read(int fd, void* buffer, size_t size) override;
  ssize_t write(int fd, const void* data, size_t size) override;
  int fsync(int fd) override;
  int close(int fd) override;
  int rename(const char* from, const char* to) override;
  int renameNoReplace(const char* from, const char* to) override;
  int unlink(const char* path) override;
};

}  // namespace kosdlib

#endif  // KOSDLIB_SRC_FILE_SYSTEM_H_
