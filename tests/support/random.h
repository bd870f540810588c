// Random operands from a seed that a failing test prints.
#pragma once

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <random>

namespace orvalis::test {

/// A generator seeded from ORVALIS_SEED or at random; prints the command that repeats the test.
inline std::mt19937_64 seeded_generator() {
  const char *given = std::getenv("ORVALIS_SEED");
  const std::uint64_t seed = given ? std::strtoull(given, nullptr, 0) : std::random_device{}();
  std::printf("repeat with ORVALIS_SEED=%llu\n", static_cast<unsigned long long>(seed));
  return std::mt19937_64(seed);
}

}  // namespace orvalis::test
