#include "ptp_management/shared_uds_client.h"

#include <poll.h>
#include <sys/eventfd.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <system_error>

namespace ptpmgmt {
namespace {

// Larger than any management answer ptp4l sends (the longest carries a
// 255-byte interface name), so a cut datagram is a malformed one.
constexpr size_t kDatagramCapacity = 1024;
// A management message carries its sequence id in bytes 30-31.
constexpr size_t kSequenceEnd = 32;
// A socket that keeps failing is not polled in a busy loop.
constexpr std::chrono::milliseconds kFailurePause{10};

uint16_t sequenceCounter() {
  static std::atomic<uint16_t> next{static_cast<uint16_t>(::getpid())};
  return next.fetch_add(1, std::memory_order_relaxed);
}

uint16_t sequenceIdOf(const std::vector<uint8_t>& datagram) {
  return static_cast<uint16_t>((datagram[30] << 8) | datagram[31]);
}

bool matches(const PendingGet& get, const Answer& answer) {
  return !get.answered && answer.sequenceId == get.request.sequenceId &&
         answer.transportSpecific == get.request.transportSpecific &&
         answer.action == static_cast<uint8_t>(Action::kResponse) &&
         answer.managementId == static_cast<uint16_t>(get.request.id) &&
         answer.target == get.request.source;
}

// Files the datagram under the request it answers; false when it answers none.
bool file(std::vector<PendingGet>& gets, std::vector<uint8_t>& datagram, ExchangeOutcome* outcome) {
  Answer answer;
  const DecodeError error = decodeAnswer(datagram.data(), datagram.size(), &answer);
  if (error == DecodeError::kNone) {
    for (PendingGet& get : gets) {
      if (!matches(get, answer)) continue;
      get.answered = true;
      get.datagram.swap(datagram);
      // Decoded again over the bytes' final home, so that `data` points there.
      (void)decodeAnswer(get.datagram.data(), get.datagram.size(), &get.answer);
      return true;
    }
    return false;
  }
  // Too broken to trust its identifiers, but it may still carry the
  // sequence id of a request, which then failed.
  if (datagram.size() >= kSequenceEnd) {
    const uint16_t sequenceId = sequenceIdOf(datagram);
    for (PendingGet& get : gets) {
      if (get.answered || get.request.sequenceId != sequenceId) continue;
      get.answered = true;
      get.malformed = error;
      return true;
    }
  }
  outcome->unmatchedMalformed = error;
  return false;
}

bool satisfied(const std::vector<PendingGet>& gets, Until until) {
  for (const PendingGet& get : gets) {
    if (get.answered == (until == Until::kAnyAnswer)) return until == Until::kAnyAnswer;
  }
  return until == Until::kEveryAnswer;
}

}  // namespace

SharedUdsClient::SharedUdsClient(std::string directory) : directory_(std::move(directory)) {}

SharedUdsClient::~SharedUdsClient() {
  if (receiver_.joinable()) {
    const uint64_t one = 1;
    (void)!::write(stopFd_, &one, sizeof one);
    receiver_.join();
  }
  if (stopFd_ >= 0) ::close(stopFd_);
}

bool SharedUdsClient::open(SystemFailure* failure) {
  std::lock_guard<std::mutex> lock(mutex_);
  if (receiver_.joinable()) return true;
  if (stopFd_ < 0) {
    stopFd_ = ::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK);
    if (stopFd_ < 0) {
      *failure = {"eventfd", errno};
      return false;
    }
  }
  if (!client_) {
    client_ = UdsClient::open(directory_, failure);
    if (!client_) return false;
  }
  try {
    receiver_ = std::thread(&SharedUdsClient::receiveLoop, this);
  } catch (const std::system_error& error) {
    *failure = {"pthread_create", error.code().value()};
    return false;
  }
  return true;
}

std::string SharedUdsClient::path() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return client_ ? client_->path() : std::string();
}

void SharedUdsClient::receiveLoop() {
  std::vector<uint8_t> bytes(kDatagramCapacity);
  std::string from;
  for (;;) {
    pollfd fds[2] = {{client_->fd(), POLLIN, 0}, {stopFd_, POLLIN, 0}};
    SystemFailure failure;
    if (::poll(fds, 2, -1) < 0) {
      if (errno == EINTR) continue;
      failure = {"poll", errno};
    } else if (fds[1].revents != 0) {
      return;
    }
    while (failure.call == nullptr) {
      const ssize_t size = client_->receiveQueued(bytes.data(), bytes.size(), &from, &failure);
      if (size < 0) break;
      dispatch(bytes, static_cast<size_t>(size), from);
    }
    if (failure.call == nullptr) continue;
    {
      std::lock_guard<std::mutex> lock(mutex_);
      for (Exchange* exchange : exchanges_) {
        exchange->receiveFailure_ = failure;
        exchange->arrived_.notify_one();
      }
    }
    std::this_thread::sleep_for(kFailurePause);
  }
}

void SharedUdsClient::dispatch(std::vector<uint8_t>& bytes, size_t size, const std::string& from) {
  const bool hasSequenceId = size >= kSequenceEnd;
  std::lock_guard<std::mutex> lock(mutex_);
  Exchange* addressee = nullptr;
  for (Exchange* exchange : exchanges_) {
    if (exchange->serverPath_ != from) continue;
    // What cannot be told apart goes to the first exchange with that daemon,
    // which reports it as malformed or ignores it.
    if (addressee == nullptr) addressee = exchange;
    const auto& ids = exchange->sequenceIds_;
    if (hasSequenceId && std::find(ids.begin(), ids.end(), sequenceIdOf(bytes)) != ids.end()) {
      addressee = exchange;
      break;
    }
  }
  if (addressee == nullptr) return;  // a stray, or a late answer
  Exchange::Datagram datagram;
  datagram.cut = size > bytes.size();
  datagram.bytes.assign(bytes.begin(), bytes.begin() + std::min(size, bytes.size()));
  addressee->inbox_.push_back(std::move(datagram));
  addressee->arrived_.notify_one();
}

SharedUdsClient::Exchange::Exchange(SharedUdsClient& client, std::string serverPath,
                                    std::vector<PendingGet>& gets)
    : client_(client), serverPath_(std::move(serverPath)), gets_(gets) {
  std::lock_guard<std::mutex> lock(client_.mutex_);
  client_.exchanges_.push_back(this);
}

SharedUdsClient::Exchange::~Exchange() {
  std::lock_guard<std::mutex> lock(client_.mutex_);
  client_.exchanges_.remove(this);
}

SystemFailure SharedUdsClient::Exchange::send() {
  {
    // Known to the receiving thread before any answer can come.
    std::lock_guard<std::mutex> lock(client_.mutex_);
    for (PendingGet& get : gets_) {
      get.request.sequenceId = sequenceCounter();
      sequenceIds_.push_back(get.request.sequenceId);
    }
  }
  for (const PendingGet& get : gets_) {
    const auto bytes = encodeGet(get.request);
    const SystemFailure failure = client_.client_->send(serverPath_, bytes.data(), bytes.size());
    if (failure.call != nullptr) return failure;
  }
  return {};
}

ExchangeOutcome SharedUdsClient::Exchange::collect(Until until, Clock::time_point deadline) {
  outcome_.timedOut = false;
  std::unique_lock<std::mutex> lock(client_.mutex_);
  for (;;) {
    if (receiveFailure_.call != nullptr) {
      outcome_.failure = receiveFailure_;
      return outcome_;
    }
    std::vector<Datagram> arrived;
    arrived.swap(inbox_);
    lock.unlock();
    for (Datagram& datagram : arrived) {
      if (datagram.cut) {
        outcome_.unmatchedMalformed = DecodeError::kLengthBeyondDatagram;
      } else {
        file(gets_, datagram.bytes, &outcome_);
      }
    }
    if (satisfied(gets_, until)) return outcome_;
    lock.lock();
    if (inbox_.empty() && receiveFailure_.call == nullptr &&
        arrived_.wait_until(lock, deadline) == std::cv_status::timeout && inbox_.empty()) {
      outcome_.timedOut = true;
      return outcome_;
    }
  }
}

}  // namespace ptpmgmt
