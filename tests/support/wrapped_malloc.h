// A malloc that tests control. The program must be linked with -Wl,--wrap=malloc.
#pragma once

#include <cstddef>

namespace orvalis::test {

/// What the wrapped malloc does to the code under test.
struct MallocControl {
  int calls_until_failure = -1;  ///< 0 fails the next call; negative never fails
  int fill = -1;                 ///< byte that fresh memory is filled with, or -1
};

extern MallocControl malloc_control;

}  // namespace orvalis::test
