/* A TLS initialisation library that counts its initialisations, so that a
 * test can tell how often the binding loaded. */
#include <stdatomic.h>

#define EXPORT __attribute__((visibility("default")))

static atomic_int calls;

EXPORT int KOSSLINIT_Init(void) { return atomic_fetch_add(&calls, 1) + 1; }
EXPORT void KOSSLINIT_Uninit(void) {}
EXPORT int kosslinit_test_init_calls(void) { return atomic_load(&calls); }
