// The relocation library: tells where a standard installation directory
// really is on this system when it is not at its default.
//
// This is a stand-in for tests. Its answers come from the environment
// variable KORELOCATIONS_ANSWERS, read on every call, a list of entries
// separated by ';':
//   name=/some/path   answer > 0 with /some/path written to the buffer
//   name=!            answer -1 (the lookup failed)
// Names not listed are answered with 0 (the default stands).
//
// Thread-safety: reentrant as long as the environment is not changed
// concurrently.
#ifndef QUILLON_KORELOCATIONS_KORELOCATIONS_H_
#define QUILLON_KORELOCATIONS_KORELOCATIONS_H_

#include <stddef.h>

#ifdef __cplusplus
extern "C" {
#endif

// Writes the relocated path of directory `name` into `buffer` of `size`
// bytes, NUL-terminated. Returns the path's length (> 0) when relocated, 0
// when the default stands, -1 on failure (also when the path does not fit or
// an argument is null).
__attribute__((visibility("default"))) int get_relocated_dir(const char* name, char* buffer,
                                                             size_t size);

#ifdef __cplusplus
}
#endif

#endif  // QUILLON_KORELOCATIONS_KORELOCATIONS_H_
