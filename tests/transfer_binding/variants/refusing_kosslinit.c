/* A TLS initialisation library whose initialisation always fails. */
#define EXPORT __attribute__((visibility("default")))

EXPORT int KOSSLINIT_Init(void) { return 0; }
EXPORT void KOSSLINIT_Uninit(void) {}
