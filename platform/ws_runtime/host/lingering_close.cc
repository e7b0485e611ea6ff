#include "lingering_close.h"

#include <sys/epoll.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>
#include <vector>

namespace ws::host {

bool LingeringClose::start() {
  epoll_ = ::epoll_create1(EPOLL_CLOEXEC);
  wake_ = ::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK);
  epoll_event event{};
  event.events = EPOLLIN;
  event.data.fd = wake_;
  if (epoll_ < 0 || wake_ < 0 || ::epoll_ctl(epoll_, EPOLL_CTL_ADD, wake_, &event) != 0) {
    stop();
    return false;
  }
  try {
    thread_ = std::thread([this] { run(); });
  } catch (const std::system_error&) {
    stop();
    return false;
  }
  return true;
}

void LingeringClose::stop() {
  if (thread_.joinable()) {
    const uint64_t one = 1;
    [[maybe_unused]] const ssize_t written = ::write(wake_, &one, sizeof one);
    thread_.join();
  }
  std::lock_guard<std::mutex> hold(lock_);
  for (const auto& entry : sockets_) ::close(entry.first);
  sockets_.clear();
  if (epoll_ >= 0) ::close(epoll_);
  if (wake_ >= 0) ::close(wake_);
  epoll_ = wake_ = -1;
}

void LingeringClose::adopt(int fd) {
  ::shutdown(fd, SHUT_WR);
  std::lock_guard<std::mutex> hold(lock_);
  epoll_event event{};
  event.events = EPOLLIN | EPOLLRDHUP;
  event.data.fd = fd;
  if (epoll_ < 0 || sockets_.size() >= limits_.sockets ||
      ::epoll_ctl(epoll_, EPOLL_CTL_ADD, fd, &event) != 0) {
    ::close(fd);
    return;
  }
  sockets_[fd] = Lingering{std::chrono::steady_clock::now() + limits_.time, 0};
}

void LingeringClose::closeLocked(int fd) {
  ::epoll_ctl(epoll_, EPOLL_CTL_DEL, fd, nullptr);
  ::close(fd);
  sockets_.erase(fd);
}

bool LingeringClose::drain(int fd, Lingering& lingering) {
  char scratch[4096];
  for (;;) {
    const ssize_t got = ::recv(fd, scratch, sizeof scratch, MSG_DONTWAIT);
    if (got > 0) {
      lingering.dropped += static_cast<size_t>(got);
      if (lingering.dropped > limits_.bytes) return true;
      continue;
    }
    return got == 0 || (errno != EAGAIN && errno != EWOULDBLOCK && errno != EINTR);
  }
}

void LingeringClose::run() {
  std::vector<epoll_event> events(64);
  auto nextTick = std::chrono::steady_clock::now() + tickEvery_;
  for (;;) {
    const int ready = ::epoll_wait(epoll_, events.data(), static_cast<int>(events.size()),
                                   static_cast<int>(tickEvery_.count()));
    const auto now = std::chrono::steady_clock::now();
    {
      std::lock_guard<std::mutex> hold(lock_);
      for (int i = 0; i < ready; ++i) {
        const int fd = events[static_cast<size_t>(i)].data.fd;
        if (fd == wake_) return;
        const auto found = sockets_.find(fd);
        if (found != sockets_.end() && drain(fd, found->second)) closeLocked(fd);
      }
      std::vector<int> expired;
      for (const auto& entry : sockets_) {
        if (entry.second.deadline <= now) expired.push_back(entry.first);
      }
      for (const int fd : expired) closeLocked(fd);
    }
    if (now >= nextTick) {
      nextTick = now + tickEvery_;
      if (tick_) tick_();
    }
  }
}

}  // namespace ws::host
