// What led a detector to its answer to a frame: values by name.
#pragma once

#include <cstdint>
#include <variant>
#include <vector>

namespace orvalis::cli {

struct TraceValue {
  const char *name;
  std::variant<std::int64_t, float> value;
};

using Trace = std::vector<TraceValue>;

}  // namespace orvalis::cli
