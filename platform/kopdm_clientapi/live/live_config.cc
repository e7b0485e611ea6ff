#include "live/live_config.h"

#include <cjson/cJSON.h>
#include <sys/un.h>

#include <cmath>
#include <cstdio>
#include <memory>
#include <set>
#include <string_view>

#include "answer_text.h"
#include "live/attributes.h"

namespace kopdmlive {
namespace {

// Reported in the selected-TR buffer of 256 bytes, with its terminator.
constexpr size_t kMaxIdBytes = 255;
// The plug-in reads the manager's answers into 1024-byte buffers, with
// their terminator; a longer "timeReferences" answer would reach it cut.
constexpr size_t kMaxAnswerBytes = 1023;
// What a "\u0000" escape is read as: cJSON would end the string there, and
// an id or path cut short would be served as if it were the whole. U+10FFFF
// is a noncharacter, which no configuration has a use for.
constexpr const char* kNulEscape = "\\uDBFF\\uDFFF";
constexpr std::string_view kNulMarker = "\xF4\x8F\xBF\xBF";
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

// Identifiers become a segment of the plug-in's URIs and a string of its
// JSON, which it writes without escaping: only RFC 3986's unreserved
// characters (section 2.3) need no escape in either.
bool isSafeIdCharacter(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '-' ||
         c == '.' || c == '_' || c == '~';
}

void checkId(const std::string& id, const std::string& prefix) {
  for (size_t i = 0; i < id.size(); ++i) {
    if (isSafeIdCharacter(id[i])) continue;
    char hex[8];
    std::snprintf(hex, sizeof hex, "0x%02X", static_cast<unsigned char>(id[i]));
    invalid(prefix + "\"id\" holds the byte " + hex + " at offset " + std::to_string(i) +
            ": only letters A-Z and a-z, digits and \"-._~\" may be used");
  }
  // "." and ".." are path steps, which clients resolve away.
  if (id == "." || id == ".." || id.size() > kMaxIdBytes) {
    invalid(prefix + "\"id\" must not be \".\" or \"..\" nor be longer than 255 bytes");
  }
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
  checkId(tr.id, prefix);
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
  // Measured as the service renders it.
  const size_t answerBytes = kopdmsim::renderMember("timeReferences", trIdList(config)).size();
  if (answerBytes > kMaxAnswerBytes) {
    invalid("\"timeReferences\" lists more than the plug-in can read: the answer naming them "
            "would be " + std::to_string(answerBytes) + " bytes, more than 1023");
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

bool holdsNul(const char* text) {
  return text != nullptr && std::string_view(text).find(kNulMarker) != std::string_view::npos;
}

// Where the first text in the tree that holds a NUL is, in the form the
// other problems name members; empty when none does.
std::string findNul(const cJSON* node, const std::string& where) {
  size_t index = 0;
  for (const cJSON* child = node->child; child != nullptr; child = child->next, ++index) {
    if (holdsNul(child->string)) return where + (where.empty() ? "" : ": ") + "a member name";
    const std::string path =
        child->string != nullptr ? where + (where.empty() ? "" : ".") + quoted(child->string)
                                 : where + "[" + std::to_string(index) + "]";
    if (cJSON_IsString(child) && holdsNul(child->valuestring)) return path;
    std::string found = findNul(child, path);
    if (!found.empty()) return found;
  }
  return "";
}

void readConfig(const cJSON* root, LiveConfig& config) {
  if (!cJSON_IsObject(root)) invalid("the configuration must be an object");
  const std::string withNul = findNul(root, "");
  if (!withNul.empty()) invalid(withNul + " must not contain NUL (\\u0000)");
  refuseUnknownMembers(root, {"timeReferences", "selectedTr", "timeoutMillis", "maxAgeMillis"},
                       "");
  readTimeReferences(root, config);
  readSelection(root, config);
  config.timeoutMillis =
      readInteger(root, "timeoutMillis", "", 1, kMaxTimeoutMillis, config.timeoutMillis);
  config.maxAgeMillis =
      readInteger(root, "maxAgeMillis", "", 0, kMaxAgeLimitMillis, config.maxAgeMillis);
}

// `text` with every "\u0000" escape in a string replaced by kNulEscape.
std::string markNulEscapes(const std::string& text) {
  std::string marked;
  marked.reserve(text.size());
  bool inString = false;
  for (size_t i = 0; i < text.size(); ++i) {
    const char c = text[i];
    if (inString && c == '\\' && i + 1 < text.size()) {
      if (text.compare(i, 6, "\\u0000") == 0) {
        marked += kNulEscape;
        i += 5;
      } else {
        marked.append(text, i, 2);
        ++i;
      }
      continue;
    }
    if (c == '"') inString = !inString;
    marked += c;
  }
  return marked;
}

}  // namespace

std::string trIdList(const LiveConfig& config) {
  std::string list = "[";
  for (const TrConfig& tr : config.trs) {
    if (list.size() > 1) list += ',';
    list += jsonString(tr.id);
  }
  return list + "]";
}

bool parseLiveConfig(const std::string& text, LiveConfig* out, std::string* problem) {
  // A NUL byte would end the text for the parser, unseen.
  if (const size_t nul = text.find('\0'); nul != std::string::npos) {
    *problem = "the text holds a NUL byte at offset " + std::to_string(nul);
    return false;
  }
  const std::string marked = markNulEscapes(text);
  const char* end = nullptr;
  std::unique_ptr<cJSON, JsonDeleter> root(cJSON_ParseWithOpts(marked.c_str(), &end, 1));
  if (!root) {
    *problem = kopdmsim::syntaxProblem(marked, end);
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
