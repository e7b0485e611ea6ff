#include "live/live_config.h"

#include <cjson/cJSON.h>
#include <sys/un.h>

#include <cmath>
#include <memory>
#include <set>
#include <string_view>

#include "answer_text.h"

namespace kopdmlive {
namespace {

// Reported in the selected-TR buffer of 256 bytes, with its terminator.
constexpr size_t kMaxIdBytes = 255;
constexpr uint32_t kMaxTimeoutMillis = 10000;
// Older state is never served, so the refresh age stays well below.
constexpr uint32_t kMaxAgeLimitMillis = 900;

const char* const kKnownTypes[] = {"IEEE 1588-2008", "IEEE 1588-2008 BC", "IEEE 802.1AS-2011",
                                   "IEEE 802.1AS-2011 TAB"};

struct JsonDeleter {
  void operator()(cJSON* node) const { cJSON_Delete(node); }
};

// Thrown inside the parser only; parseLiveConfig turns it into `problem`.
struct Invalid {
  std::string problem;
};

[[noreturn]] void invalid(std::string problem) { throw Invalid{std::move(problem)}; }

std::string quoted(std::string_view name) { return "\"" + std::string(name) + "\""; }

void refuseUnknownMembers(const cJSON* object, const std::set<std::string_view>& known,
                          const std::string& where) {
  // A misspelt member would otherwise be ignored without a word.
  for (const cJSON* member = object->child; member != nullptr; member = member->next) {
    if (known.count(member->string) == 0) {
      invalid(where + "unknown member " + quoted(member->string));
    }
  }
}

uint32_t readInteger(const cJSON* object, const char* name, const std::string& where,
                     uint32_t low, uint32_t high, uint32_t fallback) {
  const cJSON* member = cJSON_GetObjectItemCaseSensitive(object, name);
  if (member == nullptr) return fallback;
  if (!cJSON_IsNumber(member) || !std::isfinite(member->valuedouble) ||
      std::floor(member->valuedouble) != member->valuedouble || member->valuedouble < low ||
      member->valuedouble > high) {
    invalid(where + quoted(name) + " must be an integer from " + std::to_string(low) + " to " +
            std::to_string(high));
  }
  return static_cast<uint32_t>(member->valuedouble);
}

std::string readString(const cJSON* object, const char* name, const std::string& where) {
  const cJSON* member = cJSON_GetObjectItemCaseSensitive(object, name);
  if (member == nullptr) invalid(where + quoted(name) + " is missing");
  if (!cJSON_IsString(member) || member->valuestring[0] == '\0') {
    invalid(where + quoted(name) + " must be a non-empty string");
  }
  return member->valuestring;
}

bool isKnownType(const std::string& type) {
  for (const char* known : kKnownTypes) {
    if (type == known) return true;
  }
  return false;
}

TrConfig readTimeReference(const cJSON* entry, size_t index) {
  const std::string where = "\"timeReferences\"[" + std::to_string(index) + "]";
  if (!cJSON_IsObject(entry)) invalid(where + " must be an object");
  refuseUnknownMembers(entry, {"id", "uds", "port", "domainNumber", "type"}, where + ": ");
  const std::string prefix = where + ".";
  TrConfig tr;
  tr.id = readString(entry, "id", prefix);
  // The identifier becomes one segment of a timescale URI.
  if (tr.id.find('/') != std::string::npos || tr.id.size() > kMaxIdBytes) {
    invalid(prefix + "\"id\" must not contain \"/\" nor be longer than 255 bytes");
  }
  tr.uds = readString(entry, "uds", prefix);
  if (tr.uds.size() >= sizeof(sockaddr_un::sun_path)) {
    invalid(prefix + "\"uds\" is longer than a socket path may be (107 bytes)");
  }
  // 0 is the daemon's own socket port and 0xFFFF addresses every port.
  tr.port = static_cast<uint16_t>(readInteger(entry, "port", prefix, 1, 0xFFFE, 1));
  tr.domainNumber = static_cast<uint8_t>(readInteger(entry, "domainNumber", prefix, 0, 255, 0));
  if (cJSON_GetObjectItemCaseSensitive(entry, "type") != nullptr) {
    tr.type = readString(entry, "type", prefix);
    if (!isKnownType(tr.type)) {
      invalid(prefix + "\"type\" must be \"IEEE 1588-2008\", \"IEEE 1588-2008 BC\", "
                       "\"IEEE 802.1AS-2011\" or \"IEEE 802.1AS-2011 TAB\"");
    }
  }
  return tr;
}

void readTimeReferences(const cJSON* root, LiveConfig& config) {
  const cJSON* trs = cJSON_GetObjectItemCaseSensitive(root, "timeReferences");
  if (trs == nullptr) invalid("\"timeReferences\" is missing");
  if (!cJSON_IsArray(trs)) invalid("\"timeReferences\" must be an array");
  std::set<std::string> ids;
  size_t index = 0;
  for (const cJSON* entry = trs->child; entry != nullptr; entry = entry->next) {
    TrConfig tr = readTimeReference(entry, index++);
    if (!ids.insert(tr.id).second) {
      invalid("\"timeReferences\" names the time reference " + quoted(tr.id) + " twice");
    }
    config.trs.push_back(std::move(tr));
  }
}

void readSelection(const cJSON* root, LiveConfig& config) {
  const cJSON* selected = cJSON_GetObjectItemCaseSensitive(root, "selectedTr");
  if (selected == nullptr || cJSON_IsNull(selected)) return;
  if (!cJSON_IsString(selected)) invalid("\"selectedTr\" must be a string or null");
  for (const TrConfig& tr : config.trs) {
    if (tr.id == selected->valuestring) {
      config.automaticSelection = false;
      config.selectedTr = tr.id;
      return;
    }
  }
  invalid("\"selectedTr\" names " + quoted(selected->valuestring) +
          ", which is not in \"timeReferences\"");
}

void readConfig(const cJSON* root, LiveConfig& config) {
  if (!cJSON_IsObject(root)) invalid("the configuration must be an object");
  refuseUnknownMembers(root, {"timeReferences", "selectedTr", "timeoutMillis", "maxAgeMillis"},
                       "");
  readTimeReferences(root, config);
  readSelection(root, config);
  config.timeoutMillis =
      readInteger(root, "timeoutMillis", "", 1, kMaxTimeoutMillis, config.timeoutMillis);
  config.maxAgeMillis =
      readInteger(root, "maxAgeMillis", "", 0, kMaxAgeLimitMillis, config.maxAgeMillis);
}

}  // namespace

bool parseLiveConfig(const std::string& text, LiveConfig* out, std::string* problem) {
  const char* end = nullptr;
  std::unique_ptr<cJSON, JsonDeleter> root(cJSON_ParseWithOpts(text.c_str(), &end, 1));
  if (!root) {
    *problem = kopdmsim::syntaxProblem(text, end);
    return false;
  }
  try {
    LiveConfig config;
    readConfig(root.get(), config);
    *out = std::move(config);
    return true;
  } catch (const Invalid& error) {
    *problem = error.problem;
    return false;
  }
}

}  // namespace kopdmlive
