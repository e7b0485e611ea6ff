#include "kocurl/kocurl.h"

#define KOCURL_EXPORT __attribute__((visibility("default")))

/* The variadic functions read their argument with va_arg of the type the
 * option's range implies, so each value must be passed as exactly that type. */
#define KOCURL_FORWARD_BY_RANGE(call, handle, option, value)       \
  do {                                                              \
    if ((option) < CURLOPTTYPE_OBJECTPOINT)                         \
      return call(handle, option, (value).number);                  \
    if ((option) < CURLOPTTYPE_FUNCTIONPOINT)                       \
      return call(handle, option, (value).pointer);                 \
    if ((option) < CURLOPTTYPE_OFF_T)                               \
      return call(handle, option, (value).function);                \
    if ((option) < CURLOPTTYPE_BLOB)                                \
      return call(handle, option, (value).offset);                  \
    return call(handle, option, (value).pointer);                   \
  } while (0)

KOCURL_EXPORT CURLcode kocurl_easy_setopt(CURL* handle, CURLoption option, kocurl_optval value) {
  KOCURL_FORWARD_BY_RANGE(curl_easy_setopt, handle, option, value);
}

KOCURL_EXPORT CURLcode kocurl_easy_getinfo(CURL* handle, CURLINFO info, void* out) {
  return curl_easy_getinfo(handle, info, out);
}

KOCURL_EXPORT CURLMcode kocurl_multi_setopt(CURLM* handle, CURLMoption option,
                                            kocurl_optval value) {
  KOCURL_FORWARD_BY_RANGE(curl_multi_setopt, handle, option, value);
}

KOCURL_EXPORT CURLSHcode kocurl_share_setopt(CURLSH* handle, CURLSHoption option,
                                             kocurl_optval value) {
  switch (option) {
    case CURLSHOPT_SHARE:
    case CURLSHOPT_UNSHARE:
      return curl_share_setopt(handle, option, (int)value.number);
    case CURLSHOPT_LOCKFUNC:
    case CURLSHOPT_UNLOCKFUNC:
      return curl_share_setopt(handle, option, value.function);
    case CURLSHOPT_USERDATA:
      return curl_share_setopt(handle, option, value.pointer);
    default:
      return CURLSHE_BAD_OPTION;
  }
}

KOCURL_EXPORT CURLFORMcode kocurl_formadd(struct curl_httppost** first,
                                          struct curl_httppost** last,
                                          const struct curl_forms* forms) {
  return curl_formadd(first, last, CURLFORM_ARRAY, forms, CURLFORM_END);
}
