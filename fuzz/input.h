// What the fuzz targets make of their bytes: numbers and audio.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <vector>

namespace orvalis::fuzz {

/// Ends the program with what was expected, in every build.
inline void require(bool holds, const char *expectation) {
  if (holds) return;
  std::fprintf(stderr, "not true: %s\n", expectation);
  std::abort();
}

using Samples = std::vector<std::int16_t>;

class Input {
public:
  Input(const std::uint8_t *bytes, std::size_t size) : at_(bytes), end_(bytes + size) {}

  bool is_empty() const { return at_ == end_; }

  /// The next byte, 0 after the end.
  std::uint8_t byte() { return is_empty() ? 0 : *at_++; }

  std::int16_t word() {
    const int low = byte();
    return static_cast<std::int16_t>(low | byte() << 8);
  }

  /// Mostly 0..254, and now and then any 32 bits.
  std::int32_t number() {
    const std::uint8_t small = byte();
    if (small != 255) return small;
    const auto low = static_cast<std::uint16_t>(word());
    return static_cast<std::int32_t>(static_cast<std::uint32_t>(word()) << 16 | low);
  }

  /// A chunk of audio in a buffer of exactly its size, so that reading beyond it is noticed.
  /// Speech is long and inputs are short: all kinds but the literal one grow from a few bytes.
  Samples audio() {
    enum Kind { kLiteral, kConstant, kNoise, kPulses };
    const auto kind = static_cast<Kind>(byte() % 4);
    const std::size_t length = byte();
    Samples samples(kind == kLiteral ? length : 40 * (length + 1));
    const std::int32_t level = kind == kLiteral ? 0 : word();
    const std::uint32_t period = kind == kPulses ? byte() + 1U : 1;
    for (std::size_t i = 0; i < samples.size(); ++i) {
      if (kind == kLiteral) {
        samples[i] = word();
      } else if (kind == kConstant) {
        samples[i] = static_cast<std::int16_t>(level);
      } else {
        if (i % period == 0) pulse_ = level * noise() / 32768;
        samples[i] = static_cast<std::int16_t>(pulse_);
        if (kind == kPulses) pulse_ = -7 * pulse_ / 8;
      }
    }
    return samples;
  }

private:
  std::int32_t noise() {
    seed_ = seed_ * 1664525U + 1013904223U;
    return static_cast<std::int16_t>(seed_ >> 16);
  }

  const std::uint8_t *at_;
  const std::uint8_t *end_;
  std::uint32_t seed_ = 1;
  std::int32_t pulse_ = 0;
};

}  // namespace orvalis::fuzz
