/*
 * libcurlimpl.so.13: the platform's URL-transfer library.
 *
 * Its plain curl_* names are the transfer library's own functions (see
 * curl/curl.h). The five functions below are the non-variadic forms of the
 * variadic ones, for callers that bind the library at run time through
 * function pointers and so cannot rely on a variadic call's promotions:
 * each takes the option value as one argument of type kocurl_optval, and
 * which member is read follows the option's type range exactly as the
 * variadic function would read its argument.
 *
 * Thread-safety: that of the forwarded functions.
 */
#ifndef KOCURL_KOCURL_H_
#define KOCURL_KOCURL_H_

#ifndef CURL_DISABLE_DEPRECATION
#define CURL_DISABLE_DEPRECATION /* the form functions are part of the interface */
#endif
#include <curl/curl.h>

#ifdef __cplusplus
extern "C" {
#endif

/* One option value. Member read, by the option's number:
 *   below 10000 (long options) ........................ number
 *   10000-19999 (objects, strings, lists, data) ........ pointer
 *   20000-29999 (callbacks) ............................ function
 *   30000-39999 (curl_off_t sizes) ..................... offset
 *   40000 and above (struct curl_blob*) ................ pointer
 * For kocurl_share_setopt: CURLSHOPT_SHARE and CURLSHOPT_UNSHARE read
 * number (a curl_lock_data), LOCKFUNC and UNLOCKFUNC read function, and
 * USERDATA reads pointer. */
typedef union kocurl_optval {
  long number;
  void* pointer;
  void (*function)(void);
  curl_off_t offset;
} kocurl_optval;

/* curl_easy_setopt(handle, option, value); answers its result. */
CURLcode kocurl_easy_setopt(CURL* handle, CURLoption option, kocurl_optval value);

/* curl_easy_getinfo(handle, info, out): `out` points at the variable of the
 * type that `info` fills (long, double, char*, curl_off_t, struct curl_slist*...). */
CURLcode kocurl_easy_getinfo(CURL* handle, CURLINFO info, void* out);

/* curl_multi_setopt(handle, option, value), read as for kocurl_easy_setopt. */
CURLMcode kocurl_multi_setopt(CURLM* handle, CURLMoption option, kocurl_optval value);

/* curl_share_setopt(handle, option, value), read as described above;
 * CURLSHE_BAD_OPTION for an option it does not know. */
CURLSHcode kocurl_share_setopt(CURLSH* handle, CURLSHoption option, kocurl_optval value);

/* curl_formadd(first, last, CURLFORM_ARRAY, forms, CURLFORM_END): `forms` is
 * an array of curl_forms ended by an entry whose option is CURLFORM_END. */
CURLFORMcode kocurl_formadd(struct curl_httppost** first, struct curl_httppost** last,
                            const struct curl_forms* forms);

#ifdef __cplusplus
}
#endif

#endif /* KOCURL_KOCURL_H_ */
