/* A TLS initialisation library without its release entry point. */
#define EXPORT __attribute__((visibility("default")))

static int calls;

EXPORT int KOSSLINIT_Init(void) { return ++calls; }
EXPORT int kosslinit_test_init_calls(void) { return calls; }
