// Block scaling against its definition: blocks of two or three samples as operands, of which the
// first few are the block, so that those behind it must stay.
#include <gtest/gtest.h>

#include <algorithm>
#include <span>

#include "basic_op.h"
#include "expect_operator.h"

namespace orvalis::test {
namespace {

using definition::Flags;
using definition::Wide;

/// Samples and what was returned, in one word that a test can compare.
template <class Sample>
int64_t folded(std::span<const Sample> samples, int64_t returned = 0) {
  auto word = static_cast<uint64_t>(returned);
  for (const Sample x : samples) word = word * 65599 + static_cast<uint64_t>(x);
  return static_cast<int64_t>(word);
}

Wide largest(Flags &f, std::span<const Wide> x, Wide length) {
  Wide peak = 0;
  for (Wide i = 0; i < length; ++i) peak = std::max(peak, definition::abs_s(f, x[i]));
  return peak;
}

template <int16_t (*normalise)(int16_t *, int16_t, int16_t)>
int64_t normalised(int16_t a, int16_t b, int16_t c, int16_t length, int16_t headroom) {
  int16_t x[] = {a, b, c};
  const int16_t shift = normalise(x, length % 4, headroom);
  return folded<int16_t>(x, shift);
}

template <int16_t (*normalise)(int16_t *, int16_t *, int16_t, int16_t)>
int64_t two_normalised(int16_t a, int16_t b, int16_t c, int16_t d, int16_t length,
                       int16_t headroom) {
  int16_t x[] = {a, b, c, d};
  const int16_t shift = normalise(x, x + 2, length % 3, headroom);
  return folded<int16_t>(x, shift);
}

template <void (*denormalise)(int16_t *, int16_t, int16_t)>
int64_t denormalised(int16_t a, int16_t b, int16_t c, int16_t length, int16_t shift) {
  int16_t x[] = {a, b, c};
  denormalise(x, length % 4, shift);
  return folded<int16_t>(x);
}

TEST(BlockScaling, NormaliseOneBlock) {
  const auto define = [](Flags &f, Wide a, Wide b, Wide c, Wide length, Wide headroom) {
    Wide x[] = {a, b, c};
    const Wide peak = largest(f, x, std::max<Wide>(length % 4, 1));
    const Wide shift = definition::sub(f, definition::norm_s(f, peak), headroom);
    for (Wide i = 0; i < length % 4; ++i) x[i] = definition::shift_r(f, x[i], shift);
    return folded<Wide>(x, shift);
  };
  expect_operator("block_norm", PLAIN, normalised<block_norm_AL>, define);
  expect_operator("block_norm", NS, normalised<ns_cblock_norm>, define);
}

TEST(BlockScaling, NormaliseTwoBlocksWithOneShift) {
  const auto define = [](Flags &f, Wide a, Wide b, Wide c, Wide d, Wide length, Wide headroom) {
    Wide x[] = {a, b, c, d};
    const Wide peak =
        std::max(largest(f, x, length % 3), largest(f, std::span(x).last(2), length % 3));
    const Wide shift = definition::sub(f, definition::norm_s(f, peak), headroom);
    for (Wide i = 0; i < length % 3; ++i) x[i] = definition::shl(f, x[i], shift);
    for (Wide i = 0; i < length % 3; ++i) x[i + 2] = definition::shl(f, x[i + 2], shift);
    return folded<Wide>(x, shift);
  };
  expect_operator("block_norm2", PLAIN, two_normalised<block_norm2>, define);
  expect_operator("block_norm2", NS, two_normalised<ns_cblock_norm2>, define);
}

TEST(BlockScaling, DenormaliseTruncatesTowardZero) {
  const auto define = [](Flags &f, Wide a, Wide b, Wide c, Wide length, Wide shift) {
    Wide x[] = {a, b, c};
    for (Wide i = 0; i < length % 4; ++i) {
      const Wide magnitude = definition::shr(f, definition::abs_s(f, x[i]), shift);
      x[i] = x[i] < 0 ? -magnitude : magnitude;
    }
    return folded<Wide>(x);
  };
  expect_operator("block_denorm", PLAIN, denormalised<block_denorm_AL>, define);
  expect_operator("block_denorm", NS, denormalised<ns_block_denorm>, define);
}

}  // namespace
}  // namespace orvalis::test
