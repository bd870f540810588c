// Every bit of a state after every frame, folded into one number a frame and held against a file of
// expected values: the same on every processor, with every compiler and optimisation.
//
// A change that is meant to alter answers renews the files: ORVALIS_WRITE_DIGESTS=<folder> makes
// the tests write them there instead.
#pragma once

#include <gtest/gtest.h>

#include <bit>
#include <cstdint>
#include <cstdlib>
#include <fstream>
#include <string>
#include <type_traits>
#include <vector>

namespace orvalis::test {

/// FNV-1a over the bytes of numbers, low byte first.
class Digest {
public:
  template <class... Values>
  void take(const Values &...values) {
    (take_one(values), ...);
  }
  std::uint32_t value() const { return value_; }

private:
  template <class Value>
  void take_one(const Value &value) {
    if constexpr (std::is_array_v<Value>) {
      for (const auto &element : value) take_one(element);
    } else if constexpr (std::is_same_v<Value, float>) {
      take_one(std::bit_cast<std::uint32_t>(value));
    } else if constexpr (std::is_same_v<Value, double>) {
      take_one(std::bit_cast<std::uint64_t>(value));
    } else {
      auto rest = static_cast<std::uint64_t>(value);
      for (std::size_t i = 0; i < sizeof value; ++i, rest >>= 8)
        value_ = (value_ ^ (rest & 0xFF)) * 16777619U;
    }
  }

  std::uint32_t value_ = 2166136261U;
};

using Digests = std::vector<std::uint32_t>;

/// One file of expected digests, for cases in the order in which it holds them.
class ExpectedDigests {
public:
  explicit ExpectedDigests(const std::string &name) : expected_(ORVALIS_DIGESTS "/" + name) {
    if (const char *folder = std::getenv("ORVALIS_WRITE_DIGESTS"))
      written_.open(std::string(folder) + "/" + name);
  }

  void expect(const std::string &name, const Digests &digests) {
    if (written_.is_open()) return write(name, digests);
    std::string expected_name;
    std::size_t frames = 0;
    expected_ >> expected_name >> std::dec >> frames >> std::hex;
    ASSERT_EQ(name, expected_name);
    ASSERT_EQ(digests.size(), frames);
    for (std::size_t i = 0; i < frames; ++i) {
      std::uint32_t digest = 0;
      expected_ >> digest;
      ASSERT_EQ(digests[i], digest) << name << ", frame " << i;
    }
  }

private:
  void write(const std::string &name, const Digests &digests) {
    written_ << name << ' ' << std::dec << digests.size();
    for (std::size_t i = 0; i < digests.size(); ++i)
      written_ << (i % 10 == 0 ? '\n' : ' ') << std::hex << digests[i];
    ASSERT_TRUE(written_ << std::endl);
  }

  std::ifstream expected_;
  std::ofstream written_;
};

}  // namespace orvalis::test
