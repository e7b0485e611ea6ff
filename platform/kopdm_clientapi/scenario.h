// A scenario: the state the simulated time-sync manager serves, read from a
// JSON text. Every answer is rendered once, when the scenario is read or an
// attribute is set, so that serving a call is a lookup and a copy.
//
// Thread-safety: plain values; the service guards the one it serves.
#ifndef KOPDM_CLIENTAPI_SCENARIO_H_
#define KOPDM_CLIENTAPI_SCENARIO_H_

#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "answer_text.h"

namespace kopdmsim {

// The library calls, by the names that fault entries use.
enum class Call {
  kGetApiVersion, kGetSelectedTrId, kGetSelectedTrOffsetNanos, kGetPdmAttrJson,
  kGetPdmMetadataJson, kGetTrAttrJson, kGetTrMetadataJson, kSetTrAttr, kRestartService,
  kBringDownService, kBringUpService, kPersistConfig, kUpdateTrFromConfig, kAdjustTime,
};
const char* callName(Call call);

// Attribute key -> its answer {"<key>":<value>}.
using AnswerMap = std::map<std::string, std::string, LookupLess>;

struct TimeReference {
  AnswerMap attrAnswers;
  std::string metadataAnswer;
};
using TimeReferences = std::map<std::string, TimeReference, LookupLess>;

struct Fault {
  Call call = Call::kGetApiVersion;
  std::size_t index = 0;  // position in the scenario's "faults", for the record
  bool matchesTrId = false;
  std::string trId;
  bool matchesKey = false;
  std::string key;
  int32_t code = 0;  // 0: none; negative fails the call, positive warns
  bool replacesAnswer = false;
  std::string answer;

  bool matches(Call call, std::string_view trId, std::string_view key) const;
};

struct Scenario {
  int32_t apiVersion = 1;
  bool hasSelectedTr = false;
  std::string selectedTrId;
  int64_t selectedTrOffsetNanos = 0;
  std::string pdmMetadataAnswer = "{}";
  AnswerMap pdmAttrAnswers;
  TimeReferences trs;
  std::vector<Fault> faults;

  // The first fault entry for this call and these arguments, or null.
  const Fault* findFault(Call call, std::string_view trId = {}, std::string_view key = {}) const;
};

// Reads a scenario text. False, with a sentence saying what is wrong (and
// where, for a syntax error), when it is not a usable scenario.
bool parseScenario(const std::string& text, Scenario* out, std::string* problem);

// The compact JSON of a value given as text: itself when it is JSON, else the
// text as a JSON string.
std::string valueFromText(const char* text);

}  // namespace kopdmsim

#endif  // KOPDM_CLIENTAPI_SCENARIO_H_
