#include "scenario.h"

#include <cjson/cJSON.h>

#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <set>

#include "error_record/json_text.h"

namespace kopdmsim {
namespace {

constexpr const char* kCallNames[] = {
    "getApiVersion",     "getSelectedTrId",     "getSelectedTrOffsetNanos", "getPdmAttrJson",
    "getPdmMetadataJson", "getTrAttrJson",      "getTrMetadataJson",        "setTrAttr",
    "restartService",    "bringDownService",    "bringUpService",           "persistConfig",
    "updateTrFromConfig", "adjustTime",
};

struct JsonDeleter {
  void operator()(cJSON* node) const { cJSON_Delete(node); }
};
using JsonTree = std::unique_ptr<cJSON, JsonDeleter>;
struct TextDeleter {
  void operator()(char* text) const { cJSON_free(text); }
};

// Thrown inside the parser only; parseScenario turns it into `problem`.
struct Invalid {
  std::string problem;
};

[[noreturn]] void invalid(std::string problem) { throw Invalid{std::move(problem)}; }

std::string compact(const cJSON* value) {
  std::unique_ptr<char, TextDeleter> text(cJSON_PrintUnformatted(value));
  if (!text) invalid("out of memory while rendering a value");
  return text.get();
}

std::string quoted(const char* name) { return std::string("\"") + name + "\""; }

bool isIntegral(const cJSON* node, double low, double high) {
  return cJSON_IsNumber(node) && std::isfinite(node->valuedouble) &&
         std::floor(node->valuedouble) == node->valuedouble && node->valuedouble >= low &&
         node->valuedouble <= high;
}

const cJSON* optionalMember(const cJSON* object, const char* name) {
  return cJSON_GetObjectItemCaseSensitive(object, name);
}

void requireObject(const cJSON* node, const std::string& what) {
  if (!cJSON_IsObject(node)) invalid(what + " must be an object");
}

void readSelection(const cJSON* root, Scenario& scenario) {
  const cJSON* selected = optionalMember(root, "selectedTrId");
  if (selected != nullptr && !cJSON_IsNull(selected)) {
    if (!cJSON_IsString(selected)) invalid("\"selectedTrId\" must be a string or null");
    scenario.hasSelectedTr = true;
    scenario.selectedTrId = selected->valuestring;
  }
  const cJSON* offset = optionalMember(root, "selectedTrOffsetNanos");
  if (offset != nullptr) {
    // Beyond 2^53 a JSON number no longer holds every integer exactly.
    if (!isIntegral(offset, -9007199254740992.0, 9007199254740992.0)) {
      invalid("\"selectedTrOffsetNanos\" must be an integer within +/-2^53");
    }
    scenario.selectedTrOffsetNanos = static_cast<int64_t>(offset->valuedouble);
  }
}

AnswerMap readAttrs(const cJSON* attrs, const std::string& where) {
  AnswerMap answers;
  if (attrs == nullptr) return answers;
  requireObject(attrs, where);
  for (const cJSON* attr = attrs->child; attr != nullptr; attr = attr->next) {
    if (!answers.emplace(attr->string, renderMember(attr->string, compact(attr))).second) {
      invalid(where + " names the attribute \"" + attr->string + "\" twice");
    }
  }
  return answers;
}

std::string trListAnswer(const cJSON* trs) {
  std::string list = "[";
  for (const cJSON* tr = trs->child; tr != nullptr; tr = tr->next) {
    if (list.size() > 1) list += ',';
    list += '"';
    koerr::appendJsonEscaped(list, tr->string);
    list += '"';
  }
  list += ']';
  return renderMember("timeReferences", list);
}

void readTimeReferences(const cJSON* root, Scenario& scenario) {
  const cJSON* trs = optionalMember(root, "trs");
  if (trs == nullptr) invalid("\"trs\" is missing");
  requireObject(trs, "\"trs\"");
  for (const cJSON* tr = trs->child; tr != nullptr; tr = tr->next) {
    const std::string where = "\"trs\"." + quoted(tr->string);
    requireObject(tr, where);
    TimeReference reference;
    reference.attrAnswers = readAttrs(optionalMember(tr, "attrs"), where + ".\"attrs\"");
    const cJSON* metadata = optionalMember(tr, "metadata");
    reference.metadataAnswer = metadata != nullptr ? compact(metadata) : "{}";
    if (!scenario.trs.emplace(tr->string, std::move(reference)).second) {
      invalid("\"trs\" names the time reference \"" + std::string(tr->string) + "\" twice");
    }
  }
  scenario.pdmAttrAnswers = readAttrs(optionalMember(root, "pdmAttrs"), "\"pdmAttrs\"");
  scenario.pdmAttrAnswers.emplace("timeReferences", trListAnswer(trs));
}

Call callFromName(const cJSON* name, const std::string& where) {
  if (cJSON_IsString(name)) {
    for (std::size_t i = 0; i < std::size(kCallNames); ++i) {
      if (std::string_view(kCallNames[i]) == name->valuestring) return static_cast<Call>(i);
    }
  }
  invalid(where + ".\"call\" must name a library call such as \"getTrAttrJson\"");
}

bool answersText(Call call) {
  return call == Call::kGetSelectedTrId || call == Call::kGetPdmAttrJson ||
         call == Call::kGetPdmMetadataJson || call == Call::kGetTrAttrJson ||
         call == Call::kGetTrMetadataJson;
}

bool readOptionalString(const cJSON* entry, const char* name, const std::string& where,
                        std::string* out) {
  const cJSON* member = optionalMember(entry, name);
  if (member == nullptr) return false;
  if (!cJSON_IsString(member)) invalid(where + "." + quoted(name) + " must be a string");
  *out = member->valuestring;
  return true;
}

Fault readFault(const cJSON* entry, std::size_t index) {
  const std::string where = "\"faults\"[" + std::to_string(index) + "]";
  requireObject(entry, where);
  Fault fault;
  fault.call = callFromName(optionalMember(entry, "call"), where);
  fault.index = index;
  fault.matchesTrId = readOptionalString(entry, "trId", where, &fault.trId);
  fault.matchesKey = readOptionalString(entry, "key", where, &fault.key);
  fault.replacesAnswer = readOptionalString(entry, "answer", where, &fault.answer);
  if (const cJSON* code = optionalMember(entry, "code")) {
    if (!isIntegral(code, INT32_MIN, INT32_MAX) || code->valuedouble == 0) {
      invalid(where + ".\"code\" must be a non-zero 32-bit integer");
    }
    fault.code = static_cast<int32_t>(code->valuedouble);
  }
  if (fault.code == 0 && !fault.replacesAnswer) invalid(where + " needs \"code\" or \"answer\"");
  if (fault.replacesAnswer && !answersText(fault.call)) {
    invalid(where + ".\"answer\" is given for a call that answers no text");
  }
  return fault;
}

void readFaults(const cJSON* root, Scenario& scenario) {
  const cJSON* faults = optionalMember(root, "faults");
  if (faults == nullptr) return;
  if (!cJSON_IsArray(faults)) invalid("\"faults\" must be an array");
  std::size_t index = 0;
  for (const cJSON* entry = faults->child; entry != nullptr; entry = entry->next) {
    scenario.faults.push_back(readFault(entry, index++));
  }
}

const std::set<std::string_view>& knownMembers() {
  static const std::set<std::string_view> kKnown = {
      "apiVersion", "selectedTrId", "selectedTrOffsetNanos", "pdmMetadata", "pdmAttrs", "trs",
      "faults"};
  return kKnown;
}

void readScenario(const cJSON* root, Scenario& scenario) {
  requireObject(root, "the scenario");
  // A misspelt member would otherwise be ignored without a word.
  for (const cJSON* member = root->child; member != nullptr; member = member->next) {
    if (knownMembers().count(member->string) == 0) {
      invalid("unknown member \"" + std::string(member->string) + "\"");
    }
  }
  if (const cJSON* version = optionalMember(root, "apiVersion")) {
    if (!isIntegral(version, 0, INT32_MAX)) invalid("\"apiVersion\" must be a non-negative integer");
    scenario.apiVersion = static_cast<int32_t>(version->valuedouble);
  }
  readSelection(root, scenario);
  if (const cJSON* metadata = optionalMember(root, "pdmMetadata")) {
    scenario.pdmMetadataAnswer = compact(metadata);
  }
  readTimeReferences(root, scenario);
  readFaults(root, scenario);
}

}  // namespace

const char* callName(Call call) { return kCallNames[static_cast<std::size_t>(call)]; }

bool Fault::matches(Call wanted, std::string_view wantedTrId, std::string_view wantedKey) const {
  return call == wanted && (!matchesTrId || trId == wantedTrId) &&
         (!matchesKey || key == wantedKey);
}

const Fault* Scenario::findFault(Call call, std::string_view trId, std::string_view key) const {
  for (const Fault& fault : faults) {
    if (fault.matches(call, trId, key)) return &fault;
  }
  return nullptr;
}

bool parseScenario(const std::string& text, Scenario* out, std::string* problem) {
  const char* end = nullptr;
  JsonTree root(cJSON_ParseWithOpts(text.c_str(), &end, 1));
  if (!root) {
    *problem = syntaxProblem(text, end);
    return false;
  }
  try {
    Scenario scenario;
    readScenario(root.get(), scenario);
    *out = std::move(scenario);
    return true;
  } catch (const Invalid& error) {
    *problem = error.problem;
    return false;
  }
}

std::string valueFromText(const char* text) {
  JsonTree parsed(cJSON_ParseWithOpts(text, nullptr, 1));
  if (parsed) {
    std::unique_ptr<char, TextDeleter> printed(cJSON_PrintUnformatted(parsed.get()));
    if (printed) return printed.get();
  }
  std::string value = "\"";
  koerr::appendJsonEscaped(value, text);
  value += '"';
  return value;
}

}  // namespace kopdmsim
