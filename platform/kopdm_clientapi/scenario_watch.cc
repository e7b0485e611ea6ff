#include "scenario_watch.h"

#include <poll.h>
#include <sys/eventfd.h>
#include <sys/inotify.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstring>
#include <thread>

namespace kopdmsim {
namespace {

// How long a file that does not read well must stay as read before it is
// served as unusable.
constexpr std::chrono::milliseconds kBrokenFileSettling{50};
// How often, and for how long at most, a verdict held back because a
// program has the file open is sought again: a program may keep it open
// without ever writing it (a pager, tail -f).
constexpr std::chrono::milliseconds kHeldBackRetry{100};
constexpr std::chrono::milliseconds kHeldOpenLimit{1000};

// Writes in place are watched too (IN_MODIFY, truncation included), only to
// know that the file is incomplete until its writer closes it; openings and
// closings, to know whether anyone has it open.
constexpr uint32_t kEvents = IN_CLOSE_WRITE | IN_MOVED_TO | IN_MOVED_FROM | IN_DELETE | IN_ATTRIB |
                             IN_MODIFY | IN_OPEN | IN_CLOSE_NOWRITE;

std::string directoryOf(const std::string& path) {
  const std::size_t slash = path.rfind('/');
  if (slash == std::string::npos) return ".";
  return slash == 0 ? "/" : path.substr(0, slash);
}

std::string nameOf(const std::string& path) {
  const std::size_t slash = path.rfind('/');
  return slash == std::string::npos ? path : path.substr(slash + 1);
}

}  // namespace

bool ScenarioWatch::unchanged() { return !drainEvents() && !writing_ && !pending_; }

bool ScenarioWatch::settle(bool readWell, const std::function<bool()>& sameAsRead) {
  if (!sameAsRead() || !unchanged()) return false;
  // A rename puts a whole file in place: there is no write to wait for.
  if (readWell || replaced_) return true;
  // The kernel reports a truncation a moment after it happened: a file read
  // empty or cut short that a program still has open, or that changes
  // within a moment, may be a write just begun.
  // Held back while a program has it open, but not for longer than the limit.
  const auto heldOpen = [this] {
    if (opened_ == 0 || (heldSince_ && Clock::now() - *heldSince_ >= kHeldOpenLimit)) return false;
    holdBack();
    return true;
  };
  if (heldOpen()) return false;
  std::this_thread::sleep_for(kBrokenFileSettling);
  if (!sameAsRead() || !unchanged() || heldOpen()) return false;
  heldSince_.reset();
  return true;
}

void ScenarioWatch::holdBack() {
  heldBack_ = true;
  if (!heldSince_) heldSince_ = Clock::now();
  retryAt_ = Clock::now() + kHeldBackRetry;
}

int ScenarioWatch::msUntilRetry() const {
  if (!retryAt_) return -1;
  const auto left = std::chrono::ceil<std::chrono::milliseconds>(*retryAt_ - Clock::now());
  return left.count() < 0 ? 0 : static_cast<int>(left.count());
}

ScenarioWatch::ScenarioWatch(const std::string& path, OnChange onChange)
    : name_(nameOf(path)), onChange_(std::move(onChange)) {
  inotifyFd_ = inotify_init1(IN_CLOEXEC | IN_NONBLOCK);
  stopFd_ = eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK);
  if (inotifyFd_ < 0 || stopFd_ < 0) {
    problem_ = std::string("inotify_init1/eventfd: ") + std::strerror(errno);
    return;
  }
  if (inotify_add_watch(inotifyFd_, directoryOf(path).c_str(), kEvents) < 0) {
    problem_ = "inotify_add_watch(" + directoryOf(path) + "): " + std::strerror(errno);
    return;
  }
  thread_ = std::thread(&ScenarioWatch::run, this);
}

ScenarioWatch::~ScenarioWatch() {
  if (thread_.joinable()) {
    const uint64_t one = 1;
    (void)!write(stopFd_, &one, sizeof one);
    thread_.join();
  }
  if (inotifyFd_ >= 0) close(inotifyFd_);
  if (stopFd_ >= 0) close(stopFd_);
}

void ScenarioWatch::run() {
  const Settling settling(*this);
  for (;;) {
    pollfd fds[2] = {{inotifyFd_, POLLIN, 0}, {stopFd_, POLLIN, 0}};
    if (poll(fds, 2, msUntilRetry()) < 0) {
      if (errno == EINTR) continue;
      return;
    }
    if (fds[1].revents != 0) return;
    drainEvents();
    if (retryAt_ && Clock::now() >= *retryAt_) {
      retryAt_.reset();
      pending_ = true;
    }
    // What happened while the callback read the file is in the flags by
    // now, so a dropped read is followed by another once the file settles.
    while (pending_ && !writing_) {
      pending_ = false;
      // The callback's own opening and closing of the file must not count
      // as the close that a held-back verdict waits for.
      heldBack_ = false;
      retryAt_.reset();
      onChange_(settling);
    }
  }
}

bool ScenarioWatch::drainEvents() {
  alignas(struct inotify_event) char events[4096];
  bool changed = false;
  for (;;) {
    const ssize_t length = read(inotifyFd_, events, sizeof events);
    if (length <= 0) return changed;
    for (ssize_t offset = 0; offset < length;) {
      const auto* event = reinterpret_cast<const struct inotify_event*>(events + offset);
      if ((event->mask & IN_Q_OVERFLOW) != 0 || (event->len > 0 && name_ == event->name)) {
        changed = apply(event->mask) || changed;
      }
      offset += static_cast<ssize_t>(sizeof(struct inotify_event) + event->len);
    }
  }
}

bool ScenarioWatch::closed() {
  if (opened_ > 0) --opened_;
  if (opened_ > 0 || (!heldBack_ && !writing_)) return false;
  writing_ = false;
  pending_ = true;
  return true;
}

bool ScenarioWatch::apply(uint32_t mask) {
  if ((mask & IN_OPEN) != 0) {
    ++opened_;
    return false;
  }
  // A close of an opening made before the watch began is not counted.
  if ((mask & IN_CLOSE_NOWRITE) != 0) return closed();
  replaced_ = false;
  heldSince_.reset();
  if ((mask & IN_MODIFY) != 0) {
    // With no opening seen, the change was made by path (truncate) or by a
    // program that opened the file before the watch began: no close of a
    // writer will follow to wait for.
    if (opened_ > 0) {
      writing_ = true;
    } else {
      pending_ = true;
    }
    return true;
  }
  if ((mask & IN_CLOSE_WRITE) != 0) {
    closed();
    writing_ = false;
  }
  // A rename or a removal puts another file (or none) under the name, and a
  // lost event leaves nothing known: whoever had the old one open no longer
  // counts.
  if ((mask & (IN_MOVED_TO | IN_MOVED_FROM | IN_DELETE | IN_Q_OVERFLOW)) != 0) {
    writing_ = false;
    opened_ = 0;
    replaced_ = (mask & IN_MOVED_TO) != 0;
  }
  pending_ = true;
  return true;
}

}  // namespace kopdmsim
