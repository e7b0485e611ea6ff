// The PTP management message codec: GET requests as a ptp4l daemon takes
// them on its UNIX-domain socket, and the decoding of its answers (a
// management TLV with one data set, or a management error status).
//
// Layouts are IEEE 1588-2008 clause 15, version 2, all integers big-endian.
// Decoding never reads outside the bytes it is given: every length in a
// datagram is checked against the datagram before it is used, and a data set
// is decoded only from a TLV that holds all of its fields.
//
// Thread-safety: pure functions over caller-owned bytes.
#ifndef PTP_MANAGEMENT_CODEC_H_
#define PTP_MANAGEMENT_CODEC_H_

#include <array>
#include <cstddef>
#include <cstdint>
#include <string>

namespace ptpmgmt {

// The management identifiers this codec knows by name.
enum class ManagementId : uint16_t {
  kNullManagement = 0x0000,
  kClockDescription = 0x0001,
  kDefaultDataSet = 0x2000,
  kCurrentDataSet = 0x2001,
  kParentDataSet = 0x2002,
  kTimePropertiesDataSet = 0x2003,
  kPortDataSet = 0x2004,
  kTimeStatusNp = 0xC000,
  kPortDataSetNp = 0xC002,
  kSubscribeEventsNp = 0xC003,
  kPortPropertiesNp = 0xC004,
};

// "PORT_DATA_SET" and the like; null for an identifier without a name here.
const char* managementIdName(uint16_t id);
// "WRONG_VALUE" and the like; null for an unknown error identifier.
const char* managementErrorName(uint16_t id);
// "SLAVE" and the like for the states 1..9; null otherwise.
const char* portStateName(uint8_t state);
// "SOFTWARE", "HARDWARE", ...; null for an unknown time-stamping kind.
const char* timestampingName(uint8_t kind);
// "E2E", "P2P", ...; null for an unknown delay mechanism.
const char* delayMechanismName(uint8_t mechanism);

inline constexpr uint8_t kPortStateSlave = 9;

struct ClockIdentity {
  std::array<uint8_t, 8> bytes{};
  bool operator==(const ClockIdentity& other) const { return bytes == other.bytes; }
};

struct PortIdentity {
  ClockIdentity clock;
  uint16_t port = 0;
  bool operator==(const PortIdentity& other) const {
    return clock == other.clock && port == other.port;
  }
};

// Every clock and every port.
PortIdentity wildcardPort();

// "00-80-2F-FF-FE-12-34-56": eight upper-case hex bytes joined by "-".
std::string formatClockIdentity(const ClockIdentity& identity);

// Nanoseconds scaled by 2^16 (a TimeInterval) as an exact decimal number:
// "515", "-0.5", "1924.0000152587890625".
std::string formatScaledNanoseconds(int64_t scaled);

struct GetRequest {
  uint8_t transportSpecific = 0;  // 0 for IEEE 1588, 1 for IEEE 802.1AS
  uint8_t domainNumber = 0;
  PortIdentity source;  // the client's own identity; answers are addressed to it
  uint16_t sequenceId = 0;
  PortIdentity target = wildcardPort();
  ManagementId id = ManagementId::kNullManagement;
};

inline constexpr size_t kGetRequestSize = 54;

// The GET without data: 54 bytes, boundary hops 0, so that only the local
// daemon answers.
std::array<uint8_t, kGetRequestSize> encodeGet(const GetRequest& request);

enum class Action : uint8_t { kGet = 0, kSet = 1, kResponse = 2, kCommand = 3, kAcknowledge = 4 };

// Why a datagram is not a usable management answer.
enum class DecodeError {
  kNone,
  kShorterThanHeader,     // fewer bytes than header, body and TLV header
  kNotManagement,         // messageType is not 0xD
  kWrongVersion,          // versionPTP is not 2
  kLengthBeyondDatagram,  // messageLength says more than arrived
  kLengthTooSmall,        // messageLength shorter than header, body and TLV header
  kOddTlvLength,          // a TLV length must be even
  kTlvBeyondMessage,      // the TLV runs past messageLength
  kUnknownTlv,            // neither MANAGEMENT nor MANAGEMENT_ERROR_STATUS
  kTlvTooShort,           // the TLV cannot hold its identifiers
  kNotThisDataSet,        // the TLV carries another management identifier
  kDataTooShort,          // the TLV has fewer bytes than the data set needs
  kTextBeyondData,        // a text field runs past the TLV
  kInvalidPortState,      // a port state outside 1..9
};
const char* describe(DecodeError error);

// A decoded management message. `data` points into the decoded datagram and
// is valid as long as those bytes are.
struct Answer {
  uint8_t transportSpecific = 0;
  uint8_t domainNumber = 0;
  PortIdentity source;
  uint16_t sequenceId = 0;
  PortIdentity target;
  uint8_t startingBoundaryHops = 0;
  uint8_t boundaryHops = 0;
  uint8_t action = 0;
  bool isErrorStatus = false;       // MANAGEMENT_ERROR_STATUS rather than MANAGEMENT
  uint16_t managementId = 0;
  uint16_t managementErrorId = 0;   // with isErrorStatus
  const uint8_t* data = nullptr;    // the data set after managementId (pad included)
  size_t dataSize = 0;
};

// Decodes the header, the management body and the one TLV of a datagram.
// kNone and `*out` filled, or the first problem found (`*out` then undefined).
[[nodiscard]] DecodeError decodeAnswer(const uint8_t* datagram, size_t size, Answer* out);

struct ClockQuality {
  uint8_t clockClass = 0;
  uint8_t clockAccuracy = 0;
  uint16_t offsetScaledLogVariance = 0;
};

struct DefaultDataSet {
  static constexpr ManagementId kId = ManagementId::kDefaultDataSet;
  bool twoStep = false;
  bool slaveOnly = false;
  uint16_t numberPorts = 0;
  uint8_t priority1 = 0;
  ClockQuality quality;
  uint8_t priority2 = 0;
  ClockIdentity clockIdentity;
  uint8_t domainNumber = 0;
};

struct CurrentDataSet {
  static constexpr ManagementId kId = ManagementId::kCurrentDataSet;
  uint16_t stepsRemoved = 0;
  int64_t offsetFromMaster = 0;  // nanoseconds * 2^16
  int64_t meanPathDelay = 0;     // nanoseconds * 2^16
};

struct ParentDataSet {
  static constexpr ManagementId kId = ManagementId::kParentDataSet;
  PortIdentity parentPortIdentity;
  uint8_t parentStats = 0;
  uint16_t observedParentOffsetScaledLogVariance = 0;
  int32_t observedParentClockPhaseChangeRate = 0;
  uint8_t grandmasterPriority1 = 0;
  ClockQuality grandmasterQuality;
  uint8_t grandmasterPriority2 = 0;
  ClockIdentity grandmasterIdentity;
};

struct TimePropertiesDataSet {
  static constexpr ManagementId kId = ManagementId::kTimePropertiesDataSet;
  int16_t currentUtcOffset = 0;
  uint8_t flags = 0;  // bit 0 leap61 ... bit 5 frequencyTraceable
  uint8_t timeSource = 0;
};

struct PortDataSet {
  static constexpr ManagementId kId = ManagementId::kPortDataSet;
  PortIdentity portIdentity;
  uint8_t portState = 0;
  int8_t logMinDelayReqInterval = 0;
  int64_t peerMeanPathDelay = 0;  // nanoseconds * 2^16
  int8_t logAnnounceInterval = 0;
  uint8_t announceReceiptTimeout = 0;
  int8_t logSyncInterval = 0;
  uint8_t delayMechanism = 0;
  int8_t logMinPdelayReqInterval = 0;
  uint8_t versionNumber = 0;
};

// linuxptp's own clock status.
struct TimeStatusNp {
  static constexpr ManagementId kId = ManagementId::kTimeStatusNp;
  int64_t masterOffset = 0;  // plain nanoseconds
  int64_t ingressTime = 0;
  int32_t cumulativeScaledRateOffset = 0;
  int32_t scaledLastGmPhaseChange = 0;
  uint16_t gmTimeBaseIndicator = 0;
  bool gmPresent = false;
  ClockIdentity gmIdentity;
};

struct PortPropertiesNp {
  static constexpr ManagementId kId = ManagementId::kPortPropertiesNp;
  PortIdentity portIdentity;
  uint8_t portState = 0;
  uint8_t timestamping = 0;
  std::string interfaceName;
};

// Decodes the data set of an answer that carries it: kNotThisDataSet for an
// error status or another identifier, kDataTooShort or kTextBeyondData when
// the TLV cannot hold it.
[[nodiscard]] DecodeError decodeDataSet(const Answer& answer, DefaultDataSet* out);
[[nodiscard]] DecodeError decodeDataSet(const Answer& answer, CurrentDataSet* out);
[[nodiscard]] DecodeError decodeDataSet(const Answer& answer, ParentDataSet* out);
[[nodiscard]] DecodeError decodeDataSet(const Answer& answer, TimePropertiesDataSet* out);
[[nodiscard]] DecodeError decodeDataSet(const Answer& answer, PortDataSet* out);
[[nodiscard]] DecodeError decodeDataSet(const Answer& answer, TimeStatusNp* out);
[[nodiscard]] DecodeError decodeDataSet(const Answer& answer, PortPropertiesNp* out);

}  // namespace ptpmgmt

#endif  // PTP_MANAGEMENT_CODEC_H_
