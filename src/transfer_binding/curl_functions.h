// The function table of the run-time bound transfer library: 43 typed
// pointers in a fixed order, each bound by name.
//
// Thread-safety: a table is filled once, under the binding's lock, and read
// afterwards.
#ifndef QUILLON_TRANSFER_BINDING_CURL_FUNCTIONS_H_
#define QUILLON_TRANSFER_BINDING_CURL_FUNCTIONS_H_

#include <cstddef>

#include "kocurl/kocurl.h"

namespace ko::chronos::shared {

// X(member, symbol) for every entry, in table order. The types come from the
// declarations of the same names; nothing here links against them.
#define KO_CURL_FUNCTION_TABLE(X)                          \
  X(easy_pause, curl_easy_pause)                           \
  X(easy_strerror, curl_easy_strerror)                     \
  X(easy_escape, curl_easy_escape)                         \
  X(easy_unescape, curl_easy_unescape)                     \
  X(formadd, kocurl_formadd)                               \
  X(formfree, curl_formfree)                               \
  X(free, curl_free)                                       \
  X(getdate, curl_getdate)                                 \
  X(global_init_mem, curl_global_init_mem)                 \
  X(slist_append, curl_slist_append)                       \
  X(slist_free_all, curl_slist_free_all)                   \
  X(version, curl_version)                                 \
  X(version_info, curl_version_info)                       \
  X(easy_init, curl_easy_init)                             \
  X(easy_setopt, kocurl_easy_setopt)                       \
  X(easy_perform, curl_easy_perform)                       \
  X(easy_cleanup, curl_easy_cleanup)                       \
  X(easy_getinfo, kocurl_easy_getinfo)                     \
  X(easy_duphandle, curl_easy_duphandle)                   \
  X(easy_reset, curl_easy_reset)                           \
  X(easy_recv, curl_easy_recv)                             \
  X(easy_send, curl_easy_send)                             \
  X(global_init, curl_global_init)                         \
  X(global_cleanup, curl_global_cleanup)                   \
  X(multi_init, curl_multi_init)                           \
  X(multi_add_handle, curl_multi_add_handle)               \
  X(multi_remove_handle, curl_multi_remove_handle)         \
  X(multi_fdset, curl_multi_fdset)                         \
  X(multi_wait, curl_multi_wait)                           \
  X(multi_perform, curl_multi_perform)                     \
  X(multi_cleanup, curl_multi_cleanup)                     \
  X(multi_info_read, curl_multi_info_read)                 \
  X(multi_strerror, curl_multi_strerror)                   \
  X(multi_socket, curl_multi_socket)                       \
  X(multi_socket_action, curl_multi_socket_action)         \
  X(multi_socket_all, curl_multi_socket_all)               \
  X(multi_timeout, curl_multi_timeout)                     \
  X(multi_setopt, kocurl_multi_setopt)                     \
  X(multi_assign, curl_multi_assign)                       \
  X(share_init, curl_share_init)                           \
  X(share_setopt, kocurl_share_setopt)                     \
  X(share_cleanup, curl_share_cleanup)                     \
  X(share_strerror, curl_share_strerror)

// Null entries were not bound.
struct CurlFunctions {
#define KO_CURL_MEMBER(member, symbol) decltype(&::symbol) member = nullptr;
  KO_CURL_FUNCTION_TABLE(KO_CURL_MEMBER)
#undef KO_CURL_MEMBER

  static constexpr const char* kSymbols[] = {
#define KO_CURL_SYMBOL(member, symbol) #symbol,
      KO_CURL_FUNCTION_TABLE(KO_CURL_SYMBOL)
#undef KO_CURL_SYMBOL
  };
  static constexpr size_t kSize = sizeof kSymbols / sizeof kSymbols[0];

  // Entry `index` in table order, as an untyped address (for inspection).
  const void* entry(size_t index) const noexcept;
};

static_assert(CurlFunctions::kSize == 43);

}  // namespace ko::chronos::shared

#endif  // QUILLON_TRANSFER_BINDING_CURL_FUNCTIONS_H_
