#include "unit_tests/failing_new.h"

#include <cstdlib>
#include <new>

int new_left = -1;

void* operator new(std::size_t size) {
  if (new_left == 0) throw std::bad_alloc();
  if (new_left > 0) --new_left;
  if (void* const memory = std::malloc(size == 0 ? 1 : size)) return memory;
  throw std::bad_alloc();
}
void operator delete(void* memory) noexcept { std::free(memory); }
void operator delete(void* memory, std::size_t /*size*/) noexcept { std::free(memory); }
