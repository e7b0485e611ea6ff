#include "transfer_binding/curl_functions.h"

namespace ko::chronos::shared {

const void* CurlFunctions::entry(size_t index) const noexcept {
  size_t position = 0;
#define KO_CURL_ENTRY(member, symbol)                \
  if (position++ == index) {                         \
    return reinterpret_cast<const void*>(member);    \
  }
  KO_CURL_FUNCTION_TABLE(KO_CURL_ENTRY)
#undef KO_CURL_ENTRY
  return nullptr;
}

}  // namespace ko::chronos::shared
