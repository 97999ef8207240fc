#ifndef QVTESTER_TESTS_LED_TOUCH_MALLOC_ARRAY_H_
#define QVTESTER_TESTS_LED_TOUCH_MALLOC_ARRAY_H_

#include <cstddef>
#include <cstdlib>
#include <memory>
#include <new>

struct FreeArray {
  void operator()(void* array) const { std::free(array); }
};

/// An array that ErrorAreaClustering takes and gives: from malloc, all zero.
template <typename T>
std::unique_ptr<T[], FreeArray> MallocArray(std::size_t count) {
  void* const array = std::calloc(count, sizeof(T));
  if (array == nullptr) throw std::bad_alloc();
  return std::unique_ptr<T[], FreeArray>(static_cast<T*>(array));
}

#endif  // QVTESTER_TESTS_LED_TOUCH_MALLOC_ARRAY_H_
