// The whole request path in-process: arbitrary bytes as the method, the
// Content-Type and Accept headers, the command, the URL variables and the
// body, handed to quillonRun through the runtime's request object, over the
// platform stand-ins (the built-in scenario, the simulated device).
//
// Input: fields separated by 0x01 in this order: method, content type,
// accept, command, variables, body. Within the variables 0x02 separates the
// pairs and the first '=' a name from its value. A field that starts with
// 0x03 is "not sent". Bytes widen to characters one to one; 0x04 followed
// by three bytes makes one character of that 24-bit value, so that values
// past U+10FFFF and surrogates reach the plug-in too.
#include <cjson/cJSON.h>

#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>
#include <vector>

#include "quillon/quillon.h"
#include "ws_runtime/exchange.h"

namespace {

void check(bool condition) {
  if (!condition) std::abort();
}

std::vector<std::string_view> split(std::string_view text, char separator, size_t most) {
  std::vector<std::string_view> parts;
  while (parts.size() + 1 < most) {
    const size_t at = text.find(separator);
    if (at == std::string_view::npos) break;
    parts.push_back(text.substr(0, at));
    text.remove_prefix(at + 1);
  }
  parts.push_back(text);
  return parts;
}

std::u32string widen(std::string_view bytes) {
  std::u32string out;
  for (size_t i = 0; i < bytes.size(); ++i) {
    const auto byte = static_cast<unsigned char>(bytes[i]);
    if (byte == 0x04 && i + 3 < bytes.size()) {
      out += static_cast<char32_t>((static_cast<unsigned char>(bytes[i + 1]) << 16) |
                                   (static_cast<unsigned char>(bytes[i + 2]) << 8) |
                                   static_cast<unsigned char>(bytes[i + 3]));
      i += 3;
    } else {
      out += static_cast<char32_t>(byte);
    }
  }
  return out;
}

bool sent(std::string_view field) { return field.empty() || field[0] != '\x03'; }

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  quillonInit();
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::string_view input(reinterpret_cast<const char*>(data), size);
  std::vector<std::string_view> fields = split(input, '\x01', 6);
  fields.resize(6);
  static ws::runtime::Exchange exchange;
  exchange.reset();
  ws::runtime::ExchangeRequest& request = exchange.request();
  request.method.assign(fields[0]);
  if (sent(fields[1])) request.setContentType(fields[1]);
  if (sent(fields[2])) request.setAccept(fields[2]);
  request.command = widen(fields[3]);
  if (!fields[4].empty()) {
    for (const std::string_view pair : split(fields[4], '\x02', 64)) {
      const size_t equals = pair.find('=');
      request.addVariable(widen(pair.substr(0, equals)),
                          equals == std::string_view::npos ? U"" : widen(pair.substr(equals + 1)));
    }
  }
  request.body.assign(fields[5]);
  quillonRun(exchange.info(), exchange.id());

  // Whatever was asked, the answer is one JSON object: the envelope, or,
  // when the request itself cannot be read (an unknown method, say), the
  // bare error record.
  const ws::runtime::ExchangeResponse& response = exchange.response();
  cJSON* answer = cJSON_ParseWithLength(response.body.data(), response.body.size());
  check(cJSON_IsObject(answer));
  const cJSON* error = cJSON_GetObjectItemCaseSensitive(answer, "error");
  const cJSON* constant = cJSON_GetObjectItemCaseSensitive(answer, "error_constant");
  check(cJSON_IsObject(error) ? cJSON_IsBool(cJSON_GetObjectItemCaseSensitive(error, "success"))
                              : cJSON_IsString(constant));
  cJSON_Delete(answer);
  return 0;
}
