// Feeds the management answer decoder arbitrary datagrams, as a daemon, a
// stray sender or a broken socket might deliver them, and checks what it
// promises: a decoded answer lies inside the datagram, and every data set
// decodes or is refused without reading past it.
#include <cstdint>
#include <cstdlib>
#include <string>
#include <vector>

#include "ptp_management/codec.h"

namespace {

void check(bool condition) {
  if (!condition) std::abort();
}

template <typename DataSet>
void decodeAs(const ptpmgmt::Answer& answer) {
  DataSet value;
  const ptpmgmt::DecodeError error = ptpmgmt::decodeDataSet(answer, &value);
  check(error == ptpmgmt::DecodeError::kNone || ptpmgmt::describe(error)[0] != '\0');
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  // A copy of exactly `size` bytes, so that any read past it is caught.
  const std::vector<uint8_t> datagram(data, data + size);
  ptpmgmt::Answer answer;
  if (ptpmgmt::decodeAnswer(datagram.data(), datagram.size(), &answer) !=
      ptpmgmt::DecodeError::kNone) {
    return 0;
  }
  if (answer.isErrorStatus) {
    check(answer.data == nullptr && answer.dataSize == 0);
  } else {
    check(answer.data >= datagram.data() &&
          answer.data + answer.dataSize <= datagram.data() + datagram.size());
  }
  decodeAs<ptpmgmt::DefaultDataSet>(answer);
  decodeAs<ptpmgmt::CurrentDataSet>(answer);
  decodeAs<ptpmgmt::ParentDataSet>(answer);
  decodeAs<ptpmgmt::TimePropertiesDataSet>(answer);
  decodeAs<ptpmgmt::TimeStatusNp>(answer);
  ptpmgmt::PortDataSet port;
  if (ptpmgmt::decodeDataSet(answer, &port) == ptpmgmt::DecodeError::kNone) {
    check(ptpmgmt::portStateName(port.portState) != nullptr);
    check(!ptpmgmt::formatScaledNanoseconds(port.peerMeanPathDelay).empty());
  }
  ptpmgmt::PortPropertiesNp properties;
  if (ptpmgmt::decodeDataSet(answer, &properties) == ptpmgmt::DecodeError::kNone) {
    check(properties.interfaceName.size() < answer.dataSize);
  }
  return 0;
}
