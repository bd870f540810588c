// Block scaling against its definition, sample by sample.
#include <gtest/gtest.h>

#include <algorithm>
#include <vector>

#include "basic_op.h"
#include "expect_operator.h"

namespace orvalis::test {
namespace {

using definition::Flags;
using definition::Wide;
using Block = std::vector<int16_t>;

constexpr int16_t LENGTH = 24, GUARD = 2;

Wide loudest(const Block &block, int length) {
  Wide peak = 0;
  for (int i = 0; i < length; ++i) peak = std::max<Wide>(peak, std::abs(int{block[i]}));
  return std::min(peak, definition::max16);
}

/// Random blocks of every loudness, a silent one and full-scale ones; two samples of guard behind.
std::vector<Block> blocks() {
  std::vector<Block> all{Block(LENGTH + GUARD, 0), Block(LENGTH + GUARD, INT16_MIN),
                         Block(LENGTH + GUARD, INT16_MAX)};
  std::mt19937_64 random = seeded_generator();
  for (int shift = 0; shift < 16; ++shift)
    for (int i = 0; i < 20; ++i) {
      Block &block = all.emplace_back(LENGTH + GUARD);
      for (int16_t &x : block) x = static_cast<int16_t>(static_cast<int16_t>(random()) >> shift);
    }
  return all;
}

/// Hands every block, length, shift or headroom and standing flag of both copies to `check`.
template <class Check>
void for_each_case(Check check) {
  for (const Copy copy : {PLAIN, NS})
    for (const Block &block : blocks())
      for (const int length : {-1, 0, 1, 7, int{LENGTH}})
        for (int amount = -3; amount <= 4; ++amount)
          for (int overflow = 0; overflow < 2; ++overflow) {
            SCOPED_TRACE(testing::Message()
                         << "copy " << copy << ", length " << length << ", amount " << amount
                         << ", block " << testing::PrintToString(block));
            write_flags(flags_of(copy, overflow, 1));
            check(copy, block, static_cast<int16_t>(length), static_cast<int16_t>(amount),
                  Flags{overflow, 1});
            if (testing::Test::HasFailure()) return;
          }
}

TEST(BlockScaling, NormaliseOneBlock) {
  for_each_case([](Copy copy, const Block &block, int16_t length, int16_t headroom, Flags flags) {
    Block got = block, expected = block;
    const int16_t shift =
        (copy == NS ? ns_cblock_norm : block_norm_AL)(got.data(), length, headroom);
    EXPECT_EQ(shift,
              definition::norm_s(flags, loudest(block, std::max<int>(length, 1))) - headroom);
    flags.overflow = 0;
    for (int i = 0; i < length; ++i)
      expected[i] = static_cast<int16_t>(definition::shift_r(flags, block[i], shift));
    EXPECT_EQ(got, expected);
    EXPECT_EQ(read_flags(), flags_of(copy, flags.overflow, flags.carry));
  });
  Block silent(LENGTH, 0);
  EXPECT_EQ(block_norm_AL(silent.data(), LENGTH, 2), -2);
}

TEST(BlockScaling, NormaliseTwoBlocksWithOneShift) {
  for_each_case([](Copy copy, const Block &block, int16_t length, int16_t headroom, Flags flags) {
    Block a = block, b(block.rbegin(), block.rend());
    for (int16_t &x : b) x = static_cast<int16_t>(x / 3);
    const Block a_before = a, b_before = b;
    if (headroom % 2) std::swap(a, b);
    const Wide peak = std::max(loudest(a_before, length), loudest(b_before, length));
    const int16_t shift =
        (copy == NS ? ns_cblock_norm2 : block_norm2)(a.data(), b.data(), length, headroom);
    if (headroom % 2) std::swap(a, b);
    EXPECT_EQ(shift, definition::norm_s(flags, peak) - headroom);
    flags.overflow = 0;
    Block a_expected = a_before, b_expected = b_before;
    for (int i = 0; i < length; ++i) {
      a_expected[i] = static_cast<int16_t>(definition::shl(flags, a_before[i], shift));
      b_expected[i] = static_cast<int16_t>(definition::shl(flags, b_before[i], shift));
    }
    EXPECT_EQ(a, a_expected);
    EXPECT_EQ(b, b_expected);
    EXPECT_EQ(read_flags(), flags_of(copy, flags.overflow, flags.carry));
  });
}

TEST(BlockScaling, DenormaliseTruncatesTowardZero) {
  for_each_case([](Copy copy, const Block &block, int16_t length, int16_t shift, Flags flags) {
    Block got = block, expected = block;
    (copy == NS ? ns_block_denorm : block_denorm_AL)(got.data(), length, shift);
    for (int i = 0; i < length; ++i) {
      const Wide magnitude = definition::shr(flags, definition::abs_s(flags, block[i]), shift);
      expected[i] = static_cast<int16_t>(block[i] < 0 ? -magnitude : magnitude);
    }
    EXPECT_EQ(got, expected);
    EXPECT_EQ(read_flags(), flags_of(copy, flags.overflow, flags.carry));
  });
  Block odd{-3, 3};
  block_denorm_AL(odd.data(), 2, 1);
  EXPECT_EQ(odd, (Block{-1, 1}));
}

}  // namespace
}  // namespace orvalis::test
