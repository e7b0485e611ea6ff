#include "kosslinit/kosslinit.h"

#include <openssl/crypto.h>
#include <openssl/ssl.h>
#include <stdatomic.h>

#define KOSSLINIT_EXPORT __attribute__((visibility("default")))

static atomic_int initialised;

KOSSLINIT_EXPORT int KOSSLINIT_Init(void) {
  const uint64_t options =
      OPENSSL_INIT_LOAD_SSL_STRINGS | OPENSSL_INIT_LOAD_CRYPTO_STRINGS | OPENSSL_INIT_LOAD_CONFIG;
  if (OPENSSL_init_ssl(options, NULL) != 1) {
    return 0;
  }
  atomic_fetch_add(&initialised, 1);
  return 1;
}

KOSSLINIT_EXPORT void KOSSLINIT_Uninit(void) {
  int count = atomic_load(&initialised);
  while (count > 0 && !atomic_compare_exchange_weak(&initialised, &count, count - 1)) {
  }
  if (count == 1) {
    OPENSSL_thread_stop();
  }
}
