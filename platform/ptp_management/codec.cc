#include "ptp_management/codec.h"

#include <cstdio>
#include <cstring>

namespace ptpmgmt {
namespace {

constexpr uint8_t kMessageTypeManagement = 0xD;
constexpr uint8_t kVersionPtp = 2;
constexpr uint8_t kControlManagement = 4;
constexpr uint8_t kLogMessageIntervalNone = 0x7F;
constexpr uint16_t kTlvManagement = 0x0001;
constexpr uint16_t kTlvManagementErrorStatus = 0x0002;
// Header (34), management body (14) and TLV type and length (4).
constexpr size_t kTlvValueOffset = 52;
constexpr size_t kManagementIdSize = 2;
// managementErrorId, managementId and four reserved bytes.
constexpr size_t kErrorStatusSize = 8;

// Reads big-endian fields from a span; a read past the end yields zeros and
// marks the reader as short, so a decoder checks once at the end.
class Reader {
 public:
  Reader(const uint8_t* bytes, size_t size) : bytes_(bytes), size_(size) {}

  bool complete() const { return !short_; }
  size_t remaining() const { return short_ ? 0 : size_ - position_; }

  uint8_t u8() { return static_cast<uint8_t>(take(1)); }
  int8_t i8() { return static_cast<int8_t>(u8()); }
  uint16_t u16() { return static_cast<uint16_t>(take(2)); }
  int16_t i16() { return static_cast<int16_t>(u16()); }
  uint32_t u32() { return static_cast<uint32_t>(take(4)); }
  int32_t i32() { return static_cast<int32_t>(u32()); }
  int64_t i64() { return static_cast<int64_t>(take(8)); }
  void skip(size_t count) {
    if (!fits(count)) return;
    position_ += count;
  }
  ClockIdentity clock() {
    ClockIdentity identity;
    if (!fits(identity.bytes.size())) return identity;
    std::memcpy(identity.bytes.data(), bytes_ + position_, identity.bytes.size());
    position_ += identity.bytes.size();
    return identity;
  }
  PortIdentity port() {
    PortIdentity identity;
    identity.clock = clock();
    identity.port = u16();
    return identity;
  }
  ClockQuality quality() {
    ClockQuality quality;
    quality.clockClass = u8();
    quality.clockAccuracy = u8();
    quality.offsetScaledLogVariance = u16();
    return quality;
  }
  // A PTPText: a length byte, then that many bytes.
  std::string text() {
    const size_t length = u8();
    if (!fits(length)) return {};
    std::string value(reinterpret_cast<const char*>(bytes_ + position_), length);
    position_ += length;
    return value;
  }

 private:
  bool fits(size_t count) {
    if (short_ || size_ - position_ < count) {
      short_ = true;
      return false;
    }
    return true;
  }
  uint64_t take(size_t count) {
    if (!fits(count)) return 0;
    uint64_t value = 0;
    for (size_t i = 0; i < count; ++i) value = (value << 8) | bytes_[position_ + i];
    position_ += count;
    return value;
  }

  const uint8_t* bytes_;
  size_t size_;
  size_t position_ = 0;
  bool short_ = false;
};

class Writer {
 public:
  explicit Writer(uint8_t* bytes) : bytes_(bytes) {}
  void u8(uint8_t value) { bytes_[position_++] = value; }
  void u16(uint16_t value) {
    u8(static_cast<uint8_t>(value >> 8));
    u8(static_cast<uint8_t>(value));
  }
  void zeros(size_t count) {
    std::memset(bytes_ + position_, 0, count);
    position_ += count;
  }
  void port(const PortIdentity& identity) {
    std::memcpy(bytes_ + position_, identity.clock.bytes.data(), identity.clock.bytes.size());
    position_ += identity.clock.bytes.size();
    u16(identity.port);
  }

 private:
  uint8_t* bytes_;
  size_t position_ = 0;
};

// Reads a data set's fields with `read`, which returns what it found wrong
// beyond length (kNone when nothing), when the answer carries that data set.
template <typename DataSet, typename Read>
DecodeError decodeFields(const Answer& answer, DataSet* out, Read&& read) {
  if (answer.isErrorStatus || answer.managementId != static_cast<uint16_t>(DataSet::kId)) {
    return DecodeError::kNotThisDataSet;
  }
  Reader in(answer.data, answer.dataSize);
  const DecodeError verdict = read(in, *out);
  if (verdict != DecodeError::kNone) return verdict;
  return in.complete() ? DecodeError::kNone : DecodeError::kDataTooShort;
}

DecodeError checkPortState(const Reader& in, uint8_t state) {
  if (!in.complete()) return DecodeError::kDataTooShort;
  return portStateName(state) != nullptr ? DecodeError::kNone : DecodeError::kInvalidPortState;
}

}  // namespace

const char* managementIdName(uint16_t id) {
  switch (static_cast<ManagementId>(id)) {
    case ManagementId::kNullManagement: return "NULL_MANAGEMENT";
    case ManagementId::kClockDescription: return "CLOCK_DESCRIPTION";
    case ManagementId::kDefaultDataSet: return "DEFAULT_DATA_SET";
    case ManagementId::kCurrentDataSet: return "CURRENT_DATA_SET";
    case ManagementId::kParentDataSet: return "PARENT_DATA_SET";
    case ManagementId::kTimePropertiesDataSet: return "TIME_PROPERTIES_DATA_SET";
    case ManagementId::kPortDataSet: return "PORT_DATA_SET";
    case ManagementId::kTimeStatusNp: return "TIME_STATUS_NP";
    case ManagementId::kPortDataSetNp: return "PORT_DATA_SET_NP";
    case ManagementId::kSubscribeEventsNp: return "SUBSCRIBE_EVENTS_NP";
    case ManagementId::kPortPropertiesNp: return "PORT_PROPERTIES_NP";
  }
  return nullptr;
}

const char* managementErrorName(uint16_t id) {
  switch (id) {
    case 0x0001: return "RESPONSE_TOO_BIG";
    case 0x0002: return "NO_SUCH_ID";
    case 0x0003: return "WRONG_LENGTH";
    case 0x0004: return "WRONG_VALUE";
    case 0x0005: return "NOT_SETABLE";
    case 0x0006: return "NOT_SUPPORTED";
    case 0x0007: return "UNPOPULATED";
    case 0xFFFE: return "GENERAL_ERROR";
    default: return nullptr;
  }
}

const char* portStateName(uint8_t state) {
  static constexpr const char* kNames[] = {
      "INITIALIZING", "FAULTY", "DISABLED", "LISTENING", "PRE_MASTER",
      "MASTER",       "PASSIVE", "UNCALIBRATED", "SLAVE"};
  if (state < 1 || state > 9) return nullptr;
  return kNames[state - 1];
}

const char* timestampingName(uint8_t kind) {
  static constexpr const char* kNames[] = {"SOFTWARE", "HARDWARE", "LEGACY_HW", "ONESTEP",
                                           "P2P1STEP"};
  return kind < 5 ? kNames[kind] : nullptr;
}

const char* delayMechanismName(uint8_t mechanism) {
  switch (mechanism) {
    case 0x01: return "E2E";
    case 0x02: return "P2P";
    case 0x03: return "COMMON_P2P";
    case 0x04: return "SPECIAL";
    case 0xFE: return "NO_MECHANISM";
    default: return nullptr;
  }
}

const char* describe(DecodeError error) {
  switch (error) {
    case DecodeError::kNone: return "no error";
    case DecodeError::kShorterThanHeader:
      return "the datagram is shorter than a management message header";
    case DecodeError::kNotManagement: return "the datagram is not a management message";
    case DecodeError::kWrongVersion: return "the datagram is not of PTP version 2";
    case DecodeError::kLengthBeyondDatagram:
      return "the message length is larger than the datagram";
    case DecodeError::kLengthTooSmall:
      return "the message length is smaller than a management message header";
    case DecodeError::kOddTlvLength: return "the TLV length is odd";
    case DecodeError::kTlvBeyondMessage: return "the TLV runs past the end of the message";
    case DecodeError::kUnknownTlv: return "the TLV is neither a management nor an error status";
    case DecodeError::kTlvTooShort: return "the TLV is too short for its identifiers";
    case DecodeError::kNotThisDataSet: return "the answer carries another management identifier";
    case DecodeError::kDataTooShort: return "the data set is shorter than its fields";
    case DecodeError::kTextBeyondData: return "a text field runs past the data set";
    case DecodeError::kInvalidPortState: return "the port state is not one of 1 to 9";
  }
  return "unknown decoding error";
}

PortIdentity wildcardPort() {
  PortIdentity identity;
  identity.clock.bytes.fill(0xFF);
  identity.port = 0xFFFF;
  return identity;
}

std::string formatClockIdentity(const ClockIdentity& identity) {
  static constexpr char kHex[] = "0123456789ABCDEF";
  std::string text;
  text.reserve(3 * identity.bytes.size());
  for (uint8_t byte : identity.bytes) {
    if (!text.empty()) text += '-';
    text += kHex[byte >> 4];
    text += kHex[byte & 0x0F];
  }
  return text;
}

std::string formatScaledNanoseconds(int64_t scaled) {
  // Work on the magnitude as unsigned, so that INT64_MIN has one too.
  const bool negative = scaled < 0;
  const uint64_t magnitude = negative ? 0 - static_cast<uint64_t>(scaled)
                                      : static_cast<uint64_t>(scaled);
  const uint64_t whole = magnitude >> 16;
  // fraction / 2^16 == fraction * 5^16 / 10^16, exactly.
  const uint64_t fraction = (magnitude & 0xFFFF) * 152587890625ULL;
  char text[48];
  int length = std::snprintf(text, sizeof text, "%s%llu", negative ? "-" : "",
                             static_cast<unsigned long long>(whole));
  if (fraction != 0) {
    char digits[17];
    std::snprintf(digits, sizeof digits, "%016llu", static_cast<unsigned long long>(fraction));
    int last = 15;
    while (digits[last] == '0') --last;
    digits[last + 1] = '\0';
    std::snprintf(text + length, sizeof text - static_cast<size_t>(length), ".%s", digits);
  }
  return text;
}

std::array<uint8_t, kGetRequestSize> encodeGet(const GetRequest& request) {
  std::array<uint8_t, kGetRequestSize> bytes{};
  Writer out(bytes.data());
  out.u8(static_cast<uint8_t>((request.transportSpecific << 4) | kMessageTypeManagement));
  out.u8(kVersionPtp);
  out.u16(kGetRequestSize);
  out.u8(request.domainNumber);
  out.zeros(1 + 2 + 8 + 4);  // reserved, flags, correction, reserved
  out.port(request.source);
  out.u16(request.sequenceId);
  out.u8(kControlManagement);
  out.u8(kLogMessageIntervalNone);
  out.port(request.target);
  out.u8(0);  // startingBoundaryHops
  out.u8(0);  // boundaryHops
  out.u8(static_cast<uint8_t>(Action::kGet));
  out.u8(0);
  out.u16(kTlvManagement);
  out.u16(kManagementIdSize);
  out.u16(static_cast<uint16_t>(request.id));
  return bytes;
}

DecodeError decodeAnswer(const uint8_t* datagram, size_t size, Answer* out) {
  if (size < kTlvValueOffset) return DecodeError::kShorterThanHeader;
  Reader in(datagram, size);
  const uint8_t typeByte = in.u8();
  if ((typeByte & 0x0F) != kMessageTypeManagement) return DecodeError::kNotManagement;
  if ((in.u8() & 0x0F) != kVersionPtp) return DecodeError::kWrongVersion;
  const uint16_t messageLength = in.u16();
  if (messageLength > size) return DecodeError::kLengthBeyondDatagram;
  if (messageLength < kTlvValueOffset) return DecodeError::kLengthTooSmall;
  out->transportSpecific = static_cast<uint8_t>(typeByte >> 4);
  out->domainNumber = in.u8();
  in.skip(1 + 2 + 8 + 4);
  out->source = in.port();
  out->sequenceId = in.u16();
  in.skip(2);  // controlField, logMessageInterval
  out->target = in.port();
  out->startingBoundaryHops = in.u8();
  out->boundaryHops = in.u8();
  out->action = in.u8() & 0x0F;
  in.skip(1);
  const uint16_t tlvType = in.u16();
  const uint16_t tlvLength = in.u16();
  if (tlvLength % 2 != 0) return DecodeError::kOddTlvLength;
  if (tlvLength > messageLength - kTlvValueOffset) return DecodeError::kTlvBeyondMessage;
  if (tlvType == kTlvManagement) {
    if (tlvLength < kManagementIdSize) return DecodeError::kTlvTooShort;
    out->isErrorStatus = false;
    out->managementId = in.u16();
    out->managementErrorId = 0;
    out->data = datagram + kTlvValueOffset + kManagementIdSize;
    out->dataSize = tlvLength - kManagementIdSize;
  } else if (tlvType == kTlvManagementErrorStatus) {
    if (tlvLength < kErrorStatusSize) return DecodeError::kTlvTooShort;
    out->isErrorStatus = true;
    out->managementErrorId = in.u16();
    out->managementId = in.u16();
    out->data = nullptr;
    out->dataSize = 0;
  } else {
    return DecodeError::kUnknownTlv;
  }
  return DecodeError::kNone;
}

DecodeError decodeDataSet(const Answer& answer, DefaultDataSet* out) {
  return decodeFields(answer, out, [](Reader& in, DefaultDataSet& set) {
    const uint8_t flags = in.u8();
    set.twoStep = (flags & 0x01) != 0;
    set.slaveOnly = (flags & 0x02) != 0;
    in.skip(1);
    set.numberPorts = in.u16();
    set.priority1 = in.u8();
    set.quality = in.quality();
    set.priority2 = in.u8();
    set.clockIdentity = in.clock();
    set.domainNumber = in.u8();
    in.skip(1);
    return DecodeError::kNone;
  });
}

DecodeError decodeDataSet(const Answer& answer, CurrentDataSet* out) {
  return decodeFields(answer, out, [](Reader& in, CurrentDataSet& set) {
    set.stepsRemoved = in.u16();
    set.offsetFromMaster = in.i64();
    set.meanPathDelay = in.i64();
    return DecodeError::kNone;
  });
}

DecodeError decodeDataSet(const Answer& answer, ParentDataSet* out) {
  return decodeFields(answer, out, [](Reader& in, ParentDataSet& set) {
    set.parentPortIdentity = in.port();
    set.parentStats = in.u8();
    in.skip(1);
    set.observedParentOffsetScaledLogVariance = in.u16();
    set.observedParentClockPhaseChangeRate = in.i32();
    set.grandmasterPriority1 = in.u8();
    set.grandmasterQuality = in.quality();
    set.grandmasterPriority2 = in.u8();
    set.grandmasterIdentity = in.clock();
    return DecodeError::kNone;
  });
}

DecodeError decodeDataSet(const Answer& answer, TimePropertiesDataSet* out) {
  return decodeFields(answer, out, [](Reader& in, TimePropertiesDataSet& set) {
    set.currentUtcOffset = in.i16();
    set.flags = in.u8();
    set.timeSource = in.u8();
    return DecodeError::kNone;
  });
}

DecodeError decodeDataSet(const Answer& answer, PortDataSet* out) {
  return decodeFields(answer, out, [](Reader& in, PortDataSet& set) {
    set.portIdentity = in.port();
    set.portState = in.u8();
    set.logMinDelayReqInterval = in.i8();
    set.peerMeanPathDelay = in.i64();
    set.logAnnounceInterval = in.i8();
    set.announceReceiptTimeout = in.u8();
    set.logSyncInterval = in.i8();
    set.delayMechanism = in.u8();
    set.logMinPdelayReqInterval = in.i8();
    set.versionNumber = in.u8() & 0x0F;
    return checkPortState(in, set.portState);
  });
}

DecodeError decodeDataSet(const Answer& answer, TimeStatusNp* out) {
  return decodeFields(answer, out, [](Reader& in, TimeStatusNp& set) {
    set.masterOffset = in.i64();
    set.ingressTime = in.i64();
    set.cumulativeScaledRateOffset = in.i32();
    set.scaledLastGmPhaseChange = in.i32();
    set.gmTimeBaseIndicator = in.u16();
    // lastGmPhaseChange: linuxptp 3.1 fills it wrongly, so it is not offered.
    in.skip(12);
    set.gmPresent = in.i32() != 0;
    set.gmIdentity = in.clock();
    return DecodeError::kNone;
  });
}

DecodeError decodeDataSet(const Answer& answer, PortPropertiesNp* out) {
  return decodeFields(answer, out, [](Reader& in, PortPropertiesNp& set) {
    set.portIdentity = in.port();
    set.portState = in.u8();
    set.timestamping = in.u8();
    if (!in.complete() || in.remaining() < 1) return DecodeError::kDataTooShort;
    set.interfaceName = in.text();
    if (!in.complete()) return DecodeError::kTextBeyondData;
    return checkPortState(in, set.portState);
  });
}

}  // namespace ptpmgmt
