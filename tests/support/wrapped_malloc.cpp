#include "tests/support/wrapped_malloc.h"

#include <cstring>

namespace orvalis::test {

MallocControl malloc_control;

}  // namespace orvalis::test

extern "C" void *__real_malloc(std::size_t size);

extern "C" void *__wrap_malloc(std::size_t size) {
  auto &control = orvalis::test::malloc_control;
  if (control.calls_until_failure == 0) return nullptr;
  if (control.calls_until_failure > 0) --control.calls_until_failure;
  void *memory = __real_malloc(size);
  if (memory != nullptr && control.fill >= 0) std::memset(memory, control.fill, size);
  return memory;
}
