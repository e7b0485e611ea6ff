// The management codec against answers a ptp4l 3.1 daemon sent (written out
// byte for byte from the data set layouts), and against every way of cutting
// them short.
#include "ptp_management/codec.h"

#include <gtest/gtest.h>

#include <cctype>
#include <cstdint>
#include <string>
#include <vector>

namespace ptpmgmt {
namespace {

using Bytes = std::vector<uint8_t>;

// Hex digits; spaces and '|' separate fields for the reader.
Bytes hex(const std::string& text) {
  Bytes bytes;
  int high = -1;
  for (char c : text) {
    if (!std::isxdigit(static_cast<unsigned char>(c))) continue;
    const int digit = std::isdigit(static_cast<unsigned char>(c)) ? c - '0'
                                                                   : std::tolower(c) - 'a' + 10;
    if (high < 0) {
      high = digit;
    } else {
      bytes.push_back(static_cast<uint8_t>(high << 4 | digit));
      high = -1;
    }
  }
  return bytes;
}

// The header of a local reply from clock d2ae4a.fffe.dd5635 to client port
// `target`, message length `length`.
std::string header(const char* length, const char* sourcePort, const char* target) {
  return std::string("0d 02 ") + length + " 00 00 0000 0000000000000000 00000000 |" +
         " d2ae4afffedd5635 " + sourcePort + " | 0000 04 7f | 0000000000000000 " + target +
         " | 00 00 02 00 ";
}

const Bytes kDefault = hex(header("004a", "0000", "6218") +
                           "0001 0016 2000 | 01 00 0002 80 f8 fe ffff 80 d2ae4afffedd5635 00 00");
const Bytes kCurrent = hex(header("0048", "0000", "6246") +
                           "0001 0014 2001 | 0001 0000000002030000 0000000007840000");
const Bytes kParent = hex(header("0056", "0000", "6274") +
                          "0001 0022 2002 | 1e214dfffe25f8f8 0001 00 00 ffff 7fffffff 64 f8 fe "
                          "ffff 80 1e214dfffe25f8f8");
const Bytes kTimeProperties = hex(header("003a", "0000", "62a2") + "0001 0006 2003 | 0025 00 a0");
const Bytes kPort = hex(header("0050", "0001", "62d0") +
                        "0001 001c 2004 | d2ae4afffedd5635 0001 08 00 0000000000000000 01 03 00 "
                        "01 00 02");
const Bytes kTimeStatus = hex(header("0068", "0000", "6306") +
                              "0001 0034 c000 | fffffffffffffc8a 18eab54c15b018b8 00000000 "
                              "00000000 0000 0000 0000000000000000 0000 00000001 "
                              "1e214dfffe25f8f8");
const Bytes kPortProperties = hex(header("0048", "0001", "6334") +
                                  "0001 0014 c004 | d2ae4afffedd5635 0001 08 00 04 76706131 00");
const Bytes kNoSuchId = hex(header("003c", "0001", "6334") + "0002 0008 0002 1234 00000000");

ClockIdentity clock(const char* text) {
  ClockIdentity identity;
  const Bytes bytes = hex(text);
  std::copy(bytes.begin(), bytes.end(), identity.bytes.begin());
  return identity;
}

Answer decoded(const Bytes& datagram) {
  Answer answer;
  EXPECT_EQ(decodeAnswer(datagram.data(), datagram.size(), &answer), DecodeError::kNone);
  return answer;
}

TEST(Codec, GetRequestIsTheFiftyFourBytesADaemonTakes) {
  GetRequest request;
  request.source.port = 0x5EF5;
  request.sequenceId = 1;
  request.id = ManagementId::kDefaultDataSet;
  const auto bytes = encodeGet(request);
  EXPECT_EQ(Bytes(bytes.begin(), bytes.end()),
            hex("0d 02 0036 00 00 0000 0000000000000000 00000000 | 0000000000000000 5ef5 | 0001 "
                "04 7f ffffffffffffffff ffff | 00 00 00 00 | 0001 0002 2000"));
  request.transportSpecific = 1;
  request.domainNumber = 24;
  request.target.port = 2;
  request.id = ManagementId::kPortDataSet;
  const auto gptp = encodeGet(request);
  EXPECT_EQ(gptp[0], 0x1D);
  EXPECT_EQ(gptp[4], 24);
  EXPECT_EQ(gptp[42], 0x00);
  EXPECT_EQ(gptp[43], 0x02);
  EXPECT_EQ(gptp[52], 0x20);
  EXPECT_EQ(gptp[53], 0x04);
}

TEST(Codec, HeaderAndEveryDataSetDecodeToTheDaemonsValues) {
  const Answer port = decoded(kPort);
  EXPECT_EQ(port.transportSpecific, 0);
  EXPECT_EQ(port.source, (PortIdentity{clock("d2ae4afffedd5635"), 1}));
  EXPECT_EQ(port.target, (PortIdentity{ClockIdentity{}, 0x62d0}));
  EXPECT_EQ(port.action, static_cast<uint8_t>(Action::kResponse));
  EXPECT_FALSE(port.isErrorStatus);
  EXPECT_EQ(port.managementId, 0x2004);
  EXPECT_EQ(port.dataSize, 26u);

  DefaultDataSet defaults;
  ASSERT_EQ(decodeDataSet(decoded(kDefault), &defaults), DecodeError::kNone);
  EXPECT_TRUE(defaults.twoStep);
  EXPECT_FALSE(defaults.slaveOnly);
  EXPECT_EQ(defaults.numberPorts, 2);
  EXPECT_EQ(defaults.priority1, 128);
  EXPECT_EQ(defaults.quality.clockClass, 248);
  EXPECT_EQ(defaults.quality.clockAccuracy, 0xFE);
  EXPECT_EQ(defaults.quality.offsetScaledLogVariance, 0xFFFF);
  EXPECT_EQ(defaults.priority2, 128);
  EXPECT_EQ(formatClockIdentity(defaults.clockIdentity), "D2-AE-4A-FF-FE-DD-56-35");
  EXPECT_EQ(defaults.domainNumber, 0);

  CurrentDataSet current;
  ASSERT_EQ(decodeDataSet(decoded(kCurrent), &current), DecodeError::kNone);
  EXPECT_EQ(current.stepsRemoved, 1);
  EXPECT_EQ(formatScaledNanoseconds(current.offsetFromMaster), "515");
  EXPECT_EQ(formatScaledNanoseconds(current.meanPathDelay), "1924");

  ParentDataSet parent;
  ASSERT_EQ(decodeDataSet(decoded(kParent), &parent), DecodeError::kNone);
  EXPECT_EQ(parent.parentPortIdentity, (PortIdentity{clock("1e214dfffe25f8f8"), 1}));
  EXPECT_EQ(parent.observedParentOffsetScaledLogVariance, 0xFFFF);
  EXPECT_EQ(parent.observedParentClockPhaseChangeRate, 0x7FFFFFFF);
  EXPECT_EQ(parent.grandmasterPriority1, 100);
  EXPECT_EQ(parent.grandmasterQuality.clockClass, 248);
  EXPECT_EQ(parent.grandmasterPriority2, 128);
  EXPECT_EQ(formatClockIdentity(parent.grandmasterIdentity), "1E-21-4D-FF-FE-25-F8-F8");

  TimePropertiesDataSet properties;
  ASSERT_EQ(decodeDataSet(decoded(kTimeProperties), &properties), DecodeError::kNone);
  EXPECT_EQ(properties.currentUtcOffset, 37);
  EXPECT_EQ(properties.flags, 0);
  EXPECT_EQ(properties.timeSource, 0xA0);

  PortDataSet portSet;
  ASSERT_EQ(decodeDataSet(port, &portSet), DecodeError::kNone);
  EXPECT_EQ(portStateName(portSet.portState), std::string("UNCALIBRATED"));
  EXPECT_EQ(portSet.logAnnounceInterval, 1);
  EXPECT_EQ(portSet.announceReceiptTimeout, 3);
  EXPECT_EQ(portSet.delayMechanism, 1);
  EXPECT_EQ(portSet.versionNumber, 2);

  TimeStatusNp status;
  ASSERT_EQ(decodeDataSet(decoded(kTimeStatus), &status), DecodeError::kNone);
  EXPECT_EQ(status.masterOffset, -886);
  EXPECT_EQ(status.ingressTime, 1795446739846568120);
  EXPECT_TRUE(status.gmPresent);
  EXPECT_EQ(status.gmIdentity, clock("1e214dfffe25f8f8"));

  PortPropertiesNp properties2;
  ASSERT_EQ(decodeDataSet(decoded(kPortProperties), &properties2), DecodeError::kNone);
  EXPECT_EQ(properties2.interfaceName, "vpa1");
  EXPECT_EQ(timestampingName(properties2.timestamping), std::string("SOFTWARE"));

  const Answer refused = decoded(kNoSuchId);
  EXPECT_TRUE(refused.isErrorStatus);
  EXPECT_EQ(managementErrorName(refused.managementErrorId), std::string("NO_SUCH_ID"));
  EXPECT_EQ(refused.managementId, 0x1234);
  EXPECT_EQ(managementIdName(refused.managementId), nullptr);
  EXPECT_EQ(decodeDataSet(refused, &defaults), DecodeError::kNotThisDataSet);
  EXPECT_EQ(decodeDataSet(decoded(kCurrent), &defaults), DecodeError::kNotThisDataSet);
}

// Every prefix of every answer is refused by the header checks.
TEST(Codec, EveryTruncationOfAnAnswerIsRefused) {
  for (const Bytes* answer : {&kDefault, &kCurrent, &kParent, &kTimeProperties, &kPort,
                              &kTimeStatus, &kPortProperties, &kNoSuchId}) {
    for (size_t size = 0; size < answer->size(); ++size) {
      SCOPED_TRACE(std::to_string(answer->size()) + " bytes cut to " + std::to_string(size));
      // A copy of exactly `size` bytes, so that a read past it is caught.
      const Bytes prefix(answer->begin(), answer->begin() + static_cast<long>(size));
      Answer out;
      EXPECT_EQ(decodeAnswer(prefix.data(), prefix.size(), &out),
                size < 52 ? DecodeError::kShorterThanHeader : DecodeError::kLengthBeyondDatagram);
    }
  }
}

// A consistent message whose TLV holds only the first `dataSize` bytes of
// the data set.
Bytes withData(const Bytes& answer, size_t dataSize) {
  Bytes cut(answer.begin(), answer.begin() + 54 + static_cast<long>(dataSize));
  const size_t tlvLength = 2 + dataSize;
  cut[2] = static_cast<uint8_t>(cut.size() >> 8);
  cut[3] = static_cast<uint8_t>(cut.size());
  cut[50] = static_cast<uint8_t>(tlvLength >> 8);
  cut[51] = static_cast<uint8_t>(tlvLength);
  return cut;
}

template <typename DataSet>
void expectShortDataRefused(const Bytes& answer, size_t textStart = SIZE_MAX) {
  const size_t full = answer.size() - 54;
  for (size_t size = 0; size < full; size += 2) {
    SCOPED_TRACE(std::string(managementIdName(static_cast<uint16_t>(DataSet::kId))) + " with " +
                 std::to_string(size) + " of " + std::to_string(full) + " bytes");
    const Bytes cut = withData(answer, size);
    DataSet out;
    EXPECT_EQ(decodeDataSet(decoded(cut), &out),
              size > textStart ? DecodeError::kTextBeyondData : DecodeError::kDataTooShort);
  }
}

// Data sets cut at every even length (the only ones a TLV can have) inside
// an otherwise well-formed message.
TEST(Codec, EveryDataSetShorterThanItsFieldsIsRefused) {
  expectShortDataRefused<DefaultDataSet>(kDefault);
  expectShortDataRefused<CurrentDataSet>(kCurrent);
  expectShortDataRefused<ParentDataSet>(kParent);
  expectShortDataRefused<TimePropertiesDataSet>(kTimeProperties);
  expectShortDataRefused<PortDataSet>(kPort);
  expectShortDataRefused<TimeStatusNp>(kTimeStatus);
  // Fields end at 12, the text's length byte at 13: shorter text is cut text.
  expectShortDataRefused<PortPropertiesNp>(kPortProperties, 13);
}

TEST(Codec, MalformedHeadersAndTlvsAreNamed) {
  struct Case {
    const char* what;
    size_t offset;
    std::vector<uint8_t> bytes;  // written over kDefault at `offset`
    DecodeError expected;
  } cases[] = {
      {"a sync message", 0, {0x00}, DecodeError::kNotManagement},
      {"PTP version 1", 1, {0x01}, DecodeError::kWrongVersion},
      {"minor version 1 is still version 2", 1, {0x12}, DecodeError::kNone},
      {"a length beyond the datagram", 2, {0x00, 0x4b}, DecodeError::kLengthBeyondDatagram},
      {"a length below the TLV", 2, {0x00, 0x33}, DecodeError::kLengthTooSmall},
      {"an odd TLV length", 50, {0x00, 0x15}, DecodeError::kOddTlvLength},
      {"a TLV past the message", 50, {0x00, 0x18}, DecodeError::kTlvBeyondMessage},
      {"an unknown TLV", 48, {0x00, 0x03}, DecodeError::kUnknownTlv},
      {"a TLV without its identifier", 50, {0x00, 0x00}, DecodeError::kTlvTooShort},
      {"an error status without its identifiers", 48, {0x00, 0x02, 0x00, 0x06},
       DecodeError::kTlvTooShort},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    Bytes datagram = kDefault;
    std::copy(c.bytes.begin(), c.bytes.end(), datagram.begin() + static_cast<long>(c.offset));
    Answer out;
    EXPECT_EQ(decodeAnswer(datagram.data(), datagram.size(), &out), c.expected);
  }
  // Port states outside 1..9 are no state at all.
  for (uint8_t state : {0, 10, 255}) {
    SCOPED_TRACE(static_cast<int>(state));
    Bytes datagram = kPort;
    datagram[64] = state;
    PortDataSet out;
    EXPECT_EQ(decodeDataSet(decoded(datagram), &out), DecodeError::kInvalidPortState);
  }
}

TEST(Codec, ScaledNanosecondsAreWrittenExactly) {
  const struct {
    int64_t scaled;
    const char* text;
  } cases[] = {
      {0, "0"},
      {0x02030000, "515"},
      {-32768, "-0.5"},
      {1, "0.0000152587890625"},
      {-65537, "-1.0000152587890625"},
      {INT64_MAX, "140737488355327.9999847412109375"},
      {INT64_MIN, "-140737488355328"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.scaled);
    EXPECT_EQ(formatScaledNanoseconds(c.scaled), c.text);
  }
}

}  // namespace
}  // namespace ptpmgmt
