// Replaces the C allocation functions of the process with counting ones that
// forward to the C library's own, so that allocations made with malloc (the
// JSON parser's) are counted with those of operator new, which ends in
// malloc. Linked into the benchmark executable, whose definitions take
// precedence over the C library's for every shared library of the process.
#include <cstddef>
#include <cstdint>

#include "count_malloc.h"

extern "C" {
void* __libc_malloc(std::size_t size);
void* __libc_calloc(std::size_t count, std::size_t size);
void* __libc_realloc(void* pointer, std::size_t size);
void* __libc_memalign(std::size_t alignment, std::size_t size);
void __libc_free(void* pointer);
}

namespace {
// Counted without atomics: the driver runs its requests on one thread, and
// a relaxed count from any other thread only blurs the figure it prints.
uint64_t allocations = 0;
}  // namespace

namespace bench {
uint64_t allocationCount() { return allocations; }
}  // namespace bench

extern "C" {

void* malloc(std::size_t size) {
  ++allocations;
  return __libc_malloc(size);
}

void* calloc(std::size_t count, std::size_t size) {
  ++allocations;
  return __libc_calloc(count, size);
}

void* realloc(void* pointer, std::size_t size) {
  ++allocations;
  return __libc_realloc(pointer, size);
}

void* memalign(std::size_t alignment, std::size_t size) {
  ++allocations;
  return __libc_memalign(alignment, size);
}

void* aligned_alloc(std::size_t alignment, std::size_t size) {
  ++allocations;
  return __libc_memalign(alignment, size);
}

int posix_memalign(void** out, std::size_t alignment, std::size_t size) {
  ++allocations;
  void* pointer = __libc_memalign(alignment, size);
  if (pointer == nullptr) return 12;  // ENOMEM
  *out = pointer;
  return 0;
}

void free(void* pointer) { __libc_free(pointer); }

}  // extern "C"
