/*
 * libkosslinit.so.13: brings up and releases the TLS library that the
 * platform's URL-transfer library uses, so that a process initialises it
 * once, before any transfer, from one known place.
 *
 * Thread-safety: both functions may be called from any thread; calls are
 * counted, so every successful KOSSLINIT_Init is paired with one
 * KOSSLINIT_Uninit.
 */
#ifndef KOSSLINIT_KOSSLINIT_H_
#define KOSSLINIT_KOSSLINIT_H_

#ifdef __cplusplus
extern "C" {
#endif

/* Loads the TLS library's configuration, error texts and algorithms.
 * Answers non-zero when the TLS library is ready, 0 when it failed (the
 * failure stays in the TLS library's error queue). */
int KOSSLINIT_Init(void);

/* Releases one KOSSLINIT_Init; the last one frees the calling thread's TLS
 * state. Calls without a matching Init are ignored. The TLS library's
 * process-wide state is released by the TLS library itself at exit, because
 * it cannot be brought up again once released. */
void KOSSLINIT_Uninit(void);

#ifdef __cplusplus
}
#endif

#endif /* KOSSLINIT_KOSSLINIT_H_ */
