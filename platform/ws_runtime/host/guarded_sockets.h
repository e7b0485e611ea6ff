// Puts each of the host's connections behind its StreamGuard. The HTTP
// library reads its sockets with recv(); this host defines recv() itself,
// which the dynamic linker then binds every library's calls to (a program's
// own symbols are searched first), and reads a registered descriptor through
// its guard. Any other descriptor (the plug-in's, a library's) is read as
// recv() always reads.
//
// The registry has one slot per possible descriptor, sized once from the
// process's descriptor limit before the first connection.
//
// Thread-safety: attach() and detach() from the thread that owns the
// connection, before its first read and after its last; recv() from any
// thread.
#ifndef WS_RUNTIME_HOST_GUARDED_SOCKETS_H_
#define WS_RUNTIME_HOST_GUARDED_SOCKETS_H_

#include <sys/types.h>

#include <cstddef>

#include "stream_guard.h"

namespace ws::host::guarded_sockets {

// Sizes the registry for descriptors below `limit`; call once, before the
// HTTP daemon starts.
void reserve(size_t limit);
// False when `fd` is past the registry: such a connection cannot be guarded.
[[nodiscard]] bool attach(int fd, StreamGuard& guard);
void detach(int fd);
// recv() with the registered descriptors read through their guard.
ssize_t guardedRecv(int fd, void* buffer, size_t size, int flags);

}  // namespace ws::host::guarded_sockets

#endif  // WS_RUNTIME_HOST_GUARDED_SOCKETS_H_
