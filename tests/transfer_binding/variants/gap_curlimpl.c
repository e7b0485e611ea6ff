/* A transfer library that lacks kocurl_easy_getinfo (entry 18 of the table)
 * and everything bound after it would still resolve: the binding must stop
 * there. The two forms before it forward like the real library's. */
#include "kocurl/kocurl.h"

#define EXPORT __attribute__((visibility("default")))

EXPORT CURLcode kocurl_easy_setopt(CURL* handle, CURLoption option, kocurl_optval value) {
  return curl_easy_setopt(handle, option, value.pointer);
}

EXPORT CURLFORMcode kocurl_formadd(struct curl_httppost** first, struct curl_httppost** last,
                                   const struct curl_forms* forms) {
  return curl_formadd(first, last, CURLFORM_ARRAY, forms, CURLFORM_END);
}

EXPORT CURLMcode kocurl_multi_setopt(CURLM* handle, CURLMoption option, kocurl_optval value) {
  return curl_multi_setopt(handle, option, value.pointer);
}
