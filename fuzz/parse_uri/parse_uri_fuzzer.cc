// Feeds parseUri arbitrary URIs and key lists and checks what it promises:
// either an error record of the parser's own kinds, or every key bound to a
// non-empty segment that, joined again, gives back the URI.
#include <cjson/cJSON.h>

#include <cstdint>
#include <cstdlib>
#include <set>
#include <string>
#include <unordered_map>
#include <vector>

#include "error_record/error.h"
#include "kosdtools_curl/web_helper_functions.h"

namespace {

void check(bool condition) {
  if (!condition) std::abort();
}

void checkRecord(const koerr::Exception& e) {
  check(e.code() == -52005);
  cJSON* record = cJSON_Parse(e.what());
  check(record != nullptr);
  const cJSON* line = cJSON_GetObjectItemCaseSensitive(record, "line");
  check(cJSON_IsNumber(line));
  const int value = line->valueint;
  check(value == 176 || value == 194 || value == 207 || value == 223);
  cJSON_Delete(record);
}

}  // namespace

// Byte 0: number of keys (low 3 bits) and whether two keys share a name (bit 3).
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size == 0) return 0;
  const unsigned keyCount = data[0] & 7u;
  const bool repeatName = (data[0] & 8u) != 0;
  std::vector<std::string> keys;
  for (unsigned i = 0; i < keyCount; ++i) {
    keys.push_back("k" + std::to_string(repeatName && i == keyCount - 1 ? 0 : i));
  }
  const std::string uri(reinterpret_cast<const char*>(data + 1), size - 1);
  std::unordered_map<std::string, std::string> out;
  try {
    kosdtools::curl::parseUri(uri, keys, out);
  } catch (const koerr::Exception& e) {
    checkRecord(e);
    return 0;
  }
  const std::set<std::string> distinct(keys.begin(), keys.end());
  // A repeated last name can end the walk early, leaving later keys unbound.
  check(distinct.size() == keys.size() ? out.size() == keys.size() : out.size() <= distinct.size());
  for (const auto& pair : out) check(!pair.second.empty() && pair.second.find('/') == std::string::npos);
  if (distinct.size() == keys.size()) {
    std::string joined;
    for (const std::string& key : keys) joined += (joined.empty() ? "" : "/") + out[key];
    std::string bare = uri.substr(uri[0] == '/' ? 1 : 0);
    if (!bare.empty() && bare.back() == '/') bare.pop_back();
    check(joined == bare);
  }
  return 0;
}
