// Feeds the host's URL mapping arbitrary request targets: the query split as
// the daemon would, then the path and parameters mapped for the service
// "quillon". Checks that a mapping is all or nothing and repeatable.
#include <cstdint>
#include <cstdlib>
#include <string>
#include <vector>

#include "url_mapping.h"
#include "ws_runtime/exchange.h"

namespace {

void check(bool condition) {
  if (!condition) std::abort();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::string target(reinterpret_cast<const char*>(data), size);
  const size_t mark = target.find('?');
  const std::string path = target.substr(0, mark);
  std::string query = mark == std::string::npos ? "" : target.substr(mark + 1);
  std::vector<ws::host::RawParameter> parameters;
  ws::host::splitQuery(query, parameters);
  for (const auto& parameter : parameters) check(parameter.key.find('&') == std::string_view::npos);

  ws::runtime::ExchangeRequest first, second;
  first.command = U"untouched";
  const ws::host::Mapping mapping = ws::host::mapUrl("quillon", path, parameters, first);
  if (mapping != ws::host::Mapping::kMapped) {
    check(first.command == U"untouched" && first.variables.empty());
    return 0;
  }
  check(!first.command.empty());
  check(ws::host::mapUrl("quillon", path, parameters, second) == mapping);
  check(first.command == second.command && first.path == second.path &&
        first.variables == second.variables);
  for (const char32_t c : first.path) check(c <= 0x10FFFF && (c < 0xD800 || c > 0xDFFF));
  return 0;
}
