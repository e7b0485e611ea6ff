#include "support/ptp_fake.h"

#include <poll.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <stdexcept>

namespace quillon::test_support {
namespace {

void put16(Bytes& out, uint16_t value) {
  out.push_back(static_cast<uint8_t>(value >> 8));
  out.push_back(static_cast<uint8_t>(value));
}

void put64(Bytes& out, int64_t value) {
  for (int shift = 56; shift >= 0; shift -= 8) {
    out.push_back(static_cast<uint8_t>(static_cast<uint64_t>(value) >> shift));
  }
}

void putClock(Bytes& out, const ptpmgmt::ClockIdentity& clock) {
  for (uint8_t byte : clock.bytes) out.push_back(byte);
}

ptpmgmt::ClockIdentity grandmasterClock() {
  ptpmgmt::ClockIdentity clock{{0x02, 0x00, 0x00, 0xFF, 0xFE, 0x00, 0x00, 0x09}};
  return clock;
}

// The header and management body of an answer to `request`, up to the TLV.
Bytes answerHead(const ptpmgmt::Answer& request, uint16_t sourcePort, size_t tlvSize) {
  Bytes out;
  out.push_back(static_cast<uint8_t>(request.transportSpecific << 4 | 0x0D));
  out.push_back(0x02);
  put16(out, static_cast<uint16_t>(48 + tlvSize));
  out.push_back(request.domainNumber);
  out.insert(out.end(), 15, 0);
  putClock(out, fakeDaemonClock());
  put16(out, sourcePort);
  put16(out, request.sequenceId);
  out.push_back(0x04);
  out.push_back(0x7F);
  putClock(out, request.source.clock);
  put16(out, request.source.port);
  out.push_back(0);
  out.push_back(0);
  out.push_back(static_cast<uint8_t>(ptpmgmt::Action::kResponse));
  out.push_back(0);
  return out;
}

sockaddr_un addressOf(const std::string& path, socklen_t* length) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  if (path.size() >= sizeof address.sun_path) throw std::runtime_error("path too long: " + path);
  std::memcpy(address.sun_path, path.data(), path.size());
  *length = static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + path.size() + 1);
  return address;
}

}  // namespace

ptpmgmt::ClockIdentity fakeDaemonClock() {
  ptpmgmt::ClockIdentity clock{{0x02, 0x00, 0x00, 0xFF, 0xFE, 0x00, 0x00, 0x01}};
  return clock;
}

Bytes managementAnswer(const ptpmgmt::Answer& request, const Bytes& data, uint16_t sourcePort,
                       std::optional<uint16_t> id) {
  const size_t padded = data.size() + data.size() % 2;
  Bytes out = answerHead(request, sourcePort, 4 + 2 + padded);
  put16(out, 0x0001);
  put16(out, static_cast<uint16_t>(2 + padded));
  put16(out, id.value_or(request.managementId));
  out.insert(out.end(), data.begin(), data.end());
  if (padded != data.size()) out.push_back(0);
  return out;
}

Bytes errorStatusAnswer(const ptpmgmt::Answer& request, uint16_t errorId) {
  Bytes out = answerHead(request, 1, 4 + 8);
  put16(out, 0x0002);
  put16(out, 8);
  put16(out, errorId);
  put16(out, request.managementId);
  out.insert(out.end(), 4, 0);
  return out;
}

Bytes defaultDataSet(uint16_t numberPorts) {
  Bytes out{0x01, 0x00};
  put16(out, numberPorts);
  out.insert(out.end(), {128, 248, 0xFE, 0xFF, 0xFF, 128});
  putClock(out, fakeDaemonClock());
  out.insert(out.end(), {0, 0});
  return out;
}

Bytes portDataSet(uint8_t portState) {
  Bytes out;
  putClock(out, fakeDaemonClock());
  put16(out, 1);
  out.insert(out.end(), {portState, 0});
  put64(out, 0);
  out.insert(out.end(), {1, 3, 0, 1, 0, 2});
  return out;
}

Bytes parentDataSet() {
  Bytes out;
  putClock(out, grandmasterClock());
  put16(out, 1);
  out.insert(out.end(), {0, 0, 0xFF, 0xFF, 0x7F, 0xFF, 0xFF, 0xFF, 100, 248, 0xFE, 0xFF, 0xFF,
                         128});
  putClock(out, grandmasterClock());
  return out;
}

Bytes timeStatusNp(int64_t masterOffset, bool gmPresent) {
  Bytes out;
  put64(out, masterOffset);
  put64(out, 0);
  out.insert(out.end(), 4 + 4 + 2 + 12, 0);
  out.insert(out.end(), {0, 0, 0, static_cast<uint8_t>(gmPresent ? 1 : 0)});
  putClock(out, grandmasterClock());
  return out;
}

Bytes currentDataSet() {
  Bytes out;
  put16(out, 1);
  put64(out, 0x02030000);
  put64(out, -32768);
  return out;
}

Bytes timePropertiesDataSet() { return {0x00, 0x25, 0x0C, 0xA0}; }

Bytes portPropertiesNp(const std::string& interfaceName) {
  Bytes out;
  putClock(out, fakeDaemonClock());
  put16(out, 1);
  out.insert(out.end(), {9, 0, static_cast<uint8_t>(interfaceName.size())});
  out.insert(out.end(), interfaceName.begin(), interfaceName.end());
  return out;
}

DatagramPeer::DatagramPeer(std::string path) : path_(std::move(path)) {
  fd_ = ::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
  socklen_t length = 0;
  const sockaddr_un address = addressOf(path_, &length);
  ::unlink(path_.c_str());
  if (fd_ < 0 || ::bind(fd_, reinterpret_cast<const sockaddr*>(&address), length) != 0) {
    throw std::runtime_error("cannot bind " + path_ + ": " + std::strerror(errno));
  }
}

DatagramPeer::~DatagramPeer() {
  ::close(fd_);
  ::unlink(path_.c_str());
}

std::optional<DatagramPeer::Received> DatagramPeer::receive(std::chrono::milliseconds wait) {
  pollfd ready{fd_, POLLIN, 0};
  if (::poll(&ready, 1, static_cast<int>(wait.count())) <= 0) return std::nullopt;
  Received received;
  received.bytes.resize(2048);
  sockaddr_un from{};
  socklen_t fromLength = sizeof from;
  const ssize_t size = ::recvfrom(fd_, received.bytes.data(), received.bytes.size(), 0,
                                  reinterpret_cast<sockaddr*>(&from), &fromLength);
  if (size < 0) return std::nullopt;
  received.bytes.resize(static_cast<size_t>(size));
  if (fromLength > offsetof(sockaddr_un, sun_path)) received.from = from.sun_path;
  return received;
}

void DatagramPeer::sendTo(const std::string& path, const Bytes& bytes) {
  socklen_t length = 0;
  const sockaddr_un address = addressOf(path, &length);
  ::sendto(fd_, bytes.data(), bytes.size(), MSG_DONTWAIT,
           reinterpret_cast<const sockaddr*>(&address), length);
}

FakeDaemon::FakeDaemon(std::string path, Script script)
    : peer_(std::move(path)), script_(std::move(script)), thread_([this] { run(); }) {}

FakeDaemon::~FakeDaemon() {
  stop_ = true;
  thread_.join();
}

void FakeDaemon::setScript(Script script) {
  std::lock_guard<std::mutex> lock(mutex_);
  script_ = std::move(script);
}

int FakeDaemon::requests(ptpmgmt::ManagementId id) const {
  std::lock_guard<std::mutex> lock(mutex_);
  const auto found = counts_.find(static_cast<uint16_t>(id));
  return found != counts_.end() ? found->second : 0;
}

int FakeDaemon::requests() const {
  std::lock_guard<std::mutex> lock(mutex_);
  int total = 0;
  for (const auto& entry : counts_) total += entry.second;
  return total;
}

void FakeDaemon::resetCounts() {
  std::lock_guard<std::mutex> lock(mutex_);
  counts_.clear();
}

void FakeDaemon::setDelay(std::chrono::milliseconds delay) {
  std::lock_guard<std::mutex> lock(mutex_);
  delay_ = delay;
}

void FakeDaemon::run() {
  using std::chrono::steady_clock;
  struct Due {
    steady_clock::time_point at;
    std::string to;
    Bytes bytes;
  };
  std::deque<Due> due;  // in the order they fall due: the delay changes seldom
  while (!stop_) {
    while (!due.empty() && due.front().at <= steady_clock::now()) {
      peer_.sendTo(due.front().to, due.front().bytes);
      due.pop_front();
    }
    auto wait = std::chrono::milliseconds(20);
    if (!due.empty()) {
      wait = std::min(wait, std::chrono::ceil<std::chrono::milliseconds>(due.front().at -
                                                                          steady_clock::now()));
    }
    const auto received = peer_.receive(std::max(wait, std::chrono::milliseconds(0)));
    if (!received) continue;
    ptpmgmt::Answer request;
    if (ptpmgmt::decodeAnswer(received->bytes.data(), received->bytes.size(), &request) !=
        ptpmgmt::DecodeError::kNone) {
      continue;
    }
    std::vector<Bytes> replies;
    steady_clock::time_point at;
    {
      std::lock_guard<std::mutex> lock(mutex_);
      ++counts_[request.managementId];
      replies = script_(request);
      at = steady_clock::now() + delay_;
    }
    for (Bytes& reply : replies) due.push_back({at, received->from, std::move(reply)});
  }
}

FakeDaemon::Script healthyDaemon(uint8_t portState, uint8_t transport, uint16_t numberPorts,
                                 int64_t masterOffset) {
  return [=](const ptpmgmt::Answer& request) -> std::vector<Bytes> {
    if (request.transportSpecific != transport) return {};
    using ptpmgmt::ManagementId;
    switch (static_cast<ManagementId>(request.managementId)) {
      case ManagementId::kDefaultDataSet:
        return {managementAnswer(request, defaultDataSet(numberPorts))};
      case ManagementId::kCurrentDataSet: return {managementAnswer(request, currentDataSet())};
      case ManagementId::kParentDataSet: return {managementAnswer(request, parentDataSet())};
      case ManagementId::kTimePropertiesDataSet:
        return {managementAnswer(request, timePropertiesDataSet())};
      case ManagementId::kPortDataSet:
        return {managementAnswer(request, portDataSet(portState), 1)};
      case ManagementId::kTimeStatusNp:
        return {managementAnswer(request, timeStatusNp(masterOffset, portState == 9))};
      case ManagementId::kPortPropertiesNp:
        return {managementAnswer(request, portPropertiesNp("veth0"), 1)};
      default: return {errorStatusAnswer(request, 0x0002)};
    }
  };
}

}  // namespace quillon::test_support
