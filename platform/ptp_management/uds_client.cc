#include "ptp_management/uds_client.h"

#include <dirent.h>
#include <fcntl.h>
#include <signal.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdlib>
#include <cstring>

namespace ptpmgmt {
namespace {

constexpr const char* kNamePrefix = "kopdm.";

std::atomic<uint32_t> nextClientNumber{0};

bool fillAddress(const std::string& path, sockaddr_un* address, socklen_t* length) {
  std::memset(address, 0, sizeof *address);
  address->sun_family = AF_UNIX;
  if (path.empty() || path.size() >= sizeof address->sun_path) return false;
  std::memcpy(address->sun_path, path.data(), path.size());
  *length = static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + path.size() + 1);
  return true;
}

// "<pid>" of "kopdm.<pid>.<n>", or 0 for a name of another form.
pid_t ownerOf(const char* name) {
  const size_t prefixLength = std::strlen(kNamePrefix);
  if (std::strncmp(name, kNamePrefix, prefixLength) != 0) return 0;
  char* end = nullptr;
  const long pid = std::strtol(name + prefixLength, &end, 10);
  if (end == name + prefixLength || *end != '.' || pid <= 0) return 0;
  return static_cast<pid_t>(pid);
}

// Client paths of processes that died without removing them. A process that
// runs under another user (EPERM) still runs, so its paths stay. Clients
// open rarely (once per daemon and configuration), so each open sweeps.
void sweepStalePaths(const std::string& directory) {
  DIR* dir = ::opendir(directory.c_str());
  if (dir == nullptr) return;
  while (const dirent* entry = ::readdir(dir)) {
    const pid_t owner = ownerOf(entry->d_name);
    if (owner == 0 || owner == ::getpid()) continue;
    if (::kill(owner, 0) == 0 || errno != ESRCH) continue;
    ::unlinkat(::dirfd(dir), entry->d_name, 0);
  }
  ::closedir(dir);
}

}  // namespace

namespace {

// Room for "/kopdm.<pid>.<n>" in a socket path of 107 bytes.
bool fitsSocketPaths(const std::string& directory) {
  return !directory.empty() && directory[0] == '/' && directory.size() <= 64;
}

// A service's own runtime directory (RuntimeDirectory=, the first one when
// there are several): private to it, so no other user can squat its paths,
// writable under ProtectSystem=strict, and seen by the daemons, which a
// PrivateTmp /tmp is not. "" when there is none this process can use.
std::string serviceRuntimeDirectory() {
  const char* listed = std::getenv("RUNTIME_DIRECTORY");
  if (listed == nullptr) return "";
  const char* colon = std::strchr(listed, ':');
  const std::string first = colon ? std::string(listed, colon) : std::string(listed);
  const bool usable = fitsSocketPaths(first) && ::access(first.c_str(), W_OK | X_OK) == 0;
  return usable ? first : "";
}

}  // namespace

std::string UdsClient::defaultDirectory() {
  const std::string runtime = serviceRuntimeDirectory();
  if (!runtime.empty()) return runtime;
  const char* tmp = std::getenv("TMPDIR");
  if (tmp != nullptr && fitsSocketPaths(tmp)) return tmp;
  return "/tmp";
}

std::unique_ptr<UdsClient> UdsClient::open(const std::string& directory,
                                           SystemFailure* failure) {
  sweepStalePaths(directory);
  const std::string path = directory + "/" + kNamePrefix + std::to_string(::getpid()) + "." +
                           std::to_string(nextClientNumber.fetch_add(1));
  sockaddr_un address;
  socklen_t length = 0;
  if (!fillAddress(path, &address, &length)) {
    *failure = {"bind", ENAMETOOLONG};
    return nullptr;
  }
  const int fd = ::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
  if (fd < 0) {
    *failure = {"socket", errno};
    return nullptr;
  }
  // A path of this process that a forked child or an earlier client left.
  ::unlink(path.c_str());
  if (::bind(fd, reinterpret_cast<const sockaddr*>(&address), length) != 0) {
    *failure = {"bind", errno};
    ::close(fd);
    return nullptr;
  }
  return std::unique_ptr<UdsClient>(new UdsClient(fd, path));
}

UdsClient::~UdsClient() {
  ::close(fd_);
  ::unlink(path_.c_str());
}

SystemFailure UdsClient::send(const std::string& serverPath, const uint8_t* bytes, size_t size) {
  sockaddr_un address;
  socklen_t length = 0;
  if (!fillAddress(serverPath, &address, &length)) return {"sendto", ENAMETOOLONG};
  // Never blocks: a daemon that stopped reading fills its queue of ten
  // datagrams, and a blocking send would then wait for it forever.
  while (::sendto(fd_, bytes, size, MSG_NOSIGNAL | MSG_DONTWAIT,
                  reinterpret_cast<const sockaddr*>(&address), length) < 0) {
    if (errno != EINTR) return {"sendto", errno};
  }
  return {};
}

ssize_t UdsClient::receiveQueued(uint8_t* buffer, size_t capacity, std::string* from,
                                 SystemFailure* failure) {
  for (;;) {
    sockaddr_un address;
    socklen_t length = sizeof address;
    const ssize_t size = ::recvfrom(fd_, buffer, capacity, MSG_TRUNC | MSG_DONTWAIT,
                                    reinterpret_cast<sockaddr*>(&address), &length);
    if (size < 0) {
      if (errno == EINTR) continue;
      *failure = errno == EAGAIN || errno == EWOULDBLOCK ? SystemFailure{}
                                                         : SystemFailure{"recvfrom", errno};
      return -1;
    }
    const size_t pathLength = length > offsetof(sockaddr_un, sun_path)
                                  ? length - offsetof(sockaddr_un, sun_path)
                                  : 0;
    from->assign(address.sun_path, ::strnlen(address.sun_path, pathLength));
    return size;
  }
}

}  // namespace ptpmgmt
