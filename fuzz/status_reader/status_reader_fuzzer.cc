// Feeds arbitrary texts to the in-place reader: it must never read past the
// terminator, and whatever it accepts as a value, cJSON must accept too.
#include <cjson/cJSON.h>

#include <cstdint>
#include <cstdlib>
#include <string>

#include "kojsonz/status_reader.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::string text(reinterpret_cast<const char*>(data), size);
  const std::string key = size > 0 ? text.substr(0, data[0] % 8) : "";
  const char* value = kojsonz::findMember(text.c_str(), key.c_str());
  if (value != nullptr) {
    const char* end = kojsonz::skipValue(value);
    if (end != nullptr) {
      const std::string token(value, static_cast<size_t>(end - value));
      // cJSON refuses lone surrogates, which the reader decodes leniently.
      if (token.find("\\u") != std::string::npos) return 0;
      cJSON* parsed = cJSON_Parse(token.c_str());
      if (parsed == nullptr) std::abort();
      cJSON_Delete(parsed);
    }
    int32_t integer;
    double number;
    std::string decoded;
    kojsonz::readInteger(value, &integer);
    kojsonz::readNumber(value, &number);
    kojsonz::readString(value, &decoded);
  }
  const char* end = kojsonz::skipValue(text.c_str());
  if (end != nullptr && end > text.c_str() + text.size()) std::abort();
  return 0;
}
