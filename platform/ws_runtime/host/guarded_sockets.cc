#include "guarded_sockets.h"

#include <sys/socket.h>

#include <atomic>
#include <memory>

namespace ws::host::guarded_sockets {

namespace {

// Process-wide by nature: recv() has no context argument to carry it.
struct Registry {
  std::unique_ptr<std::atomic<StreamGuard*>[]> slots;
  size_t size = 0;
};

Registry& registry() {
  static Registry instance;
  return instance;
}

struct Socket {
  int fd;
  int flags;
};

ssize_t readSocket(void* context, char* buffer, size_t size) {
  const auto* socket = static_cast<const Socket*>(context);
  return ::recvfrom(socket->fd, buffer, size, socket->flags, nullptr, nullptr);
}

}  // namespace

void reserve(size_t limit) {
  Registry& r = registry();
  if (r.slots) return;
  r.slots = std::make_unique<std::atomic<StreamGuard*>[]>(limit);
  r.size = limit;
}

bool attach(int fd, StreamGuard& guard) {
  Registry& r = registry();
  if (fd < 0 || static_cast<size_t>(fd) >= r.size) return false;
  r.slots[static_cast<size_t>(fd)].store(&guard, std::memory_order_release);
  return true;
}

void detach(int fd) {
  Registry& r = registry();
  if (fd < 0 || static_cast<size_t>(fd) >= r.size) return;
  r.slots[static_cast<size_t>(fd)].store(nullptr, std::memory_order_release);
}

ssize_t guardedRecv(int fd, void* buffer, size_t size, int flags) {
  Registry& r = registry();
  StreamGuard* guard = fd >= 0 && static_cast<size_t>(fd) < r.size
                           ? r.slots[static_cast<size_t>(fd)].load(std::memory_order_acquire)
                           : nullptr;
  if (guard == nullptr) return ::recvfrom(fd, buffer, size, flags, nullptr, nullptr);
  Socket socket{fd, flags};
  return guard->read(static_cast<char*>(buffer), size, &readSocket, &socket);
}

}  // namespace ws::host::guarded_sockets

// Exported whatever the build's default visibility, or the libraries would
// keep binding to the C library's.
extern "C" __attribute__((visibility("default"))) ssize_t recv(int fd, void* buffer, size_t size, int flags) {
  return ws::host::guarded_sockets::guardedRecv(fd, buffer, size, flags);
}
