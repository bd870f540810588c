// A digest of many values (FNV-1a), where a test holds them to what they were.
#pragma once

#include <cstdint>

namespace orvalis::test {

template <class Values>
std::uint64_t fold(const Values &values) {
  std::uint64_t fold = 0;
  for (const auto value : values) fold = (fold ^ static_cast<std::uint64_t>(value)) * 0x100000001b3;
  return fold;
}

}  // namespace orvalis::test
