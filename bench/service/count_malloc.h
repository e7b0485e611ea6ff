// The number of allocations (malloc, calloc, realloc, aligned forms; operator
// new included, as it ends in malloc) made by the process so far, counted by
// the interposer in count_malloc.cc.
//
// Thread-safety: meant for one thread; counts from others may be lost.
#ifndef BENCH_SERVICE_COUNT_MALLOC_H_
#define BENCH_SERVICE_COUNT_MALLOC_H_

#include <cstdint>

namespace bench {
uint64_t allocationCount();
}  // namespace bench

#endif  // BENCH_SERVICE_COUNT_MALLOC_H_
