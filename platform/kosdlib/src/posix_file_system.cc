#include <fcntl.h>
#include <stdio.h>
#include <unistd.h>

#include "file_system.h"

namespace kosdlib {

int PosixFileSystem::open(const char* path, int flags, mode_t mode) {
  return ::open(path, flags, mode);
}

ssize_t PosixFileSystem::read(int fd, void* buffer, size_t size) {
  return ::read(fd, buffer, size);
}

ssize_t PosixFileSystem::write(int fd, const void* data, size_t size) {
  return ::write(fd, data, size);
}

int PosixFileSystem::fsync(int fd) { return ::fsync(fd); }

int PosixFileSystem::close(int fd) { return ::close(fd); }

int PosixFileSystem::rename(const char* from, const char* to) { return ::rename(from, to); }

int PosixFileSystem::renameNoReplace(const char* from, const char* to) {
  return ::renameat2(AT_FDCWD, from, AT_FDCWD, to, RENAME_NOREPLACE);
}

int PosixFileSystem::unlink(const char* path) { return ::unlink(path); }

}  // namespace kosdlib
