#include "unit_tests/failing_new.h"

#include <cstdlib>
#include <new>

int new_left = -1;

void* operator new(std::size_t size, const std::nothrow_t& /*tag*/) noexcept {
  if (new_left == 0) return nullptr;
  if (new_left > 0) --new_left;
  return std::malloc(size == 0 ? 1 : size);
}
void* operator new(std::size_t size) {
  if (void* const memory = operator new(size, std::nothrow)) return memory;
  throw std::bad_alloc();
}
void operator delete(void* memory) noexcept { std::free(memory); }
void operator delete(void* memory, std::size_t /*size*/) noexcept { std::free(memory); }
