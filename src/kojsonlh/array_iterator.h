// Walks the elements of a cJSON array in order through the child and next
// links, and addresses an element by its position.
//
// Thread-safety: a view over a caller-owned tree; the tree must outlive it and
// stay unchanged while it is used.
#ifndef QUILLON_KOJSONLH_ARRAY_ITERATOR_H_
#define QUILLON_KOJSONLH_ARRAY_ITERATOR_H_

#include <cstddef>

struct cJSON;

class ArrayIterator {
 public:
  // Raises "jsonErrorsNotAnArray" (-52004) when `array` is not an array.
  explicit ArrayIterator(const cJSON* array);

  // False once every element was visited.
  bool hasNext() const noexcept { return next_ != nullptr; }
  // The next element in array order; raises "jsonErrorsArrayItemOutOfBounds"
  // (-52004) past the end.
  const cJSON* next();
  // The element at `position`; raises "jsonErrorsArrayItemOutOfBounds" at or
  // past the end (so an empty array has no element 0).
  const cJSON* at(std::size_t position) const;

 private:
  [[noreturn]] static void raiseOutOfBounds();

  const cJSON* array_;
  const cJSON* next_;
};

#endif  // QUILLON_KOJSONLH_ARRAY_ITERATOR_H_
