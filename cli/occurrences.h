// How often something was met, and where first.
#pragma once

#include <cstdint>

namespace orvalis::cli {

struct Occurrences {
  std::int64_t count = 0;
  std::int64_t first = 0;  ///< Position in samples; of meaning if there are any

  void note(std::int64_t position) {
    if (count++ == 0) first = position;
  }
};

}  // namespace orvalis::cli
