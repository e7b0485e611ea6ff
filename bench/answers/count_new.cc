// Replaces the global allocation functions with counting ones. Kept in a
// translation unit of its own so that no caller sees them inlined.
#include <atomic>
#include <cstdlib>
#include <new>

std::atomic<long> gNews{0};

void* operator new(std::size_t size) {
  gNews.fetch_add(1, std::memory_order_relaxed);
  if (void* p = std::malloc(size == 0 ? 1 : size)) {
    return p;
  }
  throw std::bad_alloc();
}
void operator delete(void* p) noexcept { std::free(p); }
void operator delete(void* p, std::size_t) noexcept { std::free(p); }
