// The errors of a function over a sweep of its arguments.
#pragma once

#include <algorithm>

namespace orvalis::test {

struct ErrorRange {
  double least = 0;
  double most = 0;

  void take(double error) {
    least = std::min(least, error);
    most = std::max(most, error);
  }
};

/// Holds both ends, and that the sweep came near them: a bound much too wide is not a statement.
#define EXPECT_ERRORS(range, lower, upper)   \
  do {                                       \
    EXPECT_GE((range).least, (lower));       \
    EXPECT_LE((range).most, (upper));        \
    EXPECT_LE((range).least, 0.8 * (lower)); \
    EXPECT_GE((range).most, 0.8 * (upper));  \
  } while (false)

}  // namespace orvalis::test
