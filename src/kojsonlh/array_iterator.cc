#include "kojsonlh/array_iterator.h"

#include <cjson/cJSON.h>

#include "error_record/error.h"
#include "kojsonlh/cjson_utils.h"

ArrayIterator::ArrayIterator(const cJSON* array) : array_(array), next_(nullptr) {
  cJSONUtils::requireArray(array);
  next_ = array->child;
}

const cJSON* ArrayIterator::next() {
  if (next_ == nullptr) raiseOutOfBounds();
  const cJSON* current = next_;
  next_ = next_->next;
  return current;
}

const cJSON* ArrayIterator::at(std::size_t position) const {
  const cJSON* element = array_->child;
  for (std::size_t i = 0; element != nullptr && i < position; ++i) element = element->next;
  if (element == nullptr) raiseOutOfBounds();
  return element;
}

void ArrayIterator::raiseOutOfBounds() {
  koerr::Error(koerr::jsonErrorsArrayItemOutOfBounds, "kojsonlh/ArrayIterator", 47).raise();
}
