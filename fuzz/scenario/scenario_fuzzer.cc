// Feeds the time-service stand-in's scenario parser arbitrary texts. A text
// is either refused with a sentence saying why, or read into a scenario
// whose rendered answers are JSON.
#include <cjson/cJSON.h>

#include <cstdint>
#include <cstdlib>
#include <string>

#include "scenario.h"

namespace {

void check(bool condition) {
  if (!condition) std::abort();
}

void checkJson(const std::string& text) {
  cJSON* parsed = cJSON_Parse(text.c_str());
  check(parsed != nullptr);
  cJSON_Delete(parsed);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::string text(reinterpret_cast<const char*>(data), size);
  kopdmsim::Scenario scenario;
  std::string problem;
  if (!kopdmsim::parseScenario(text, &scenario, &problem)) {
    check(!problem.empty());
    return 0;
  }
  checkJson(scenario.pdmMetadataAnswer);
  for (const auto& [key, answer] : scenario.pdmAttrAnswers) checkJson(answer);
  for (const auto& [id, tr] : scenario.trs) {
    checkJson(tr.metadataAnswer);
    for (const auto& [key, answer] : tr.attrAnswers) checkJson(answer);
  }
  return 0;
}
