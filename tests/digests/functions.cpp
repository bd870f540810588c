// The operators of all three copies, block scaling and the extended mathematics over their range,
// with all flags that they leave, and their tables. All of the range of one 16-bit operand, else
// every edge against every edge, a walk through the range, and operands of all sizes drawn at
// random.
#include <algorithm>
#include <limits>
#include <tuple>
#include <type_traits>
#include <vector>

#include "Math_baseop.h"
#include "basic_op.h"
#include "tests/digests/observe.h"

namespace orvalis::test {
namespace {

/// Small numbers (shift counts), powers of two and their neighbours, the ends of the range.
template <class Word>
std::vector<Word> edge_values(int reach) {
  using Limits = std::numeric_limits<Word>;
  std::vector<Word> values{Limits::min(), Limits::max()};
  for (int n = -reach; n <= reach; ++n) values.push_back(static_cast<Word>(n));
  for (int bit = 2; bit < Limits::digits; ++bit) {
    for (const int near : {-1, 0, 1}) {
      const auto x = static_cast<Word>((Word{1} << bit) + near);
      values.push_back(x);
      values.push_back(static_cast<Word>(Word{} - x));
    }
  }
  return values;
}

/// The edges that as many operands can be crossed over.
template <class Word>
std::vector<Word> crossed_values(std::size_t operands) {
  using Limits = std::numeric_limits<Word>;
  if (operands > 4) return {Limits::min(), Word{1}, Limits::max(), static_cast<Word>(-5)};
  if (operands > 2)
    return {Limits::min(), Limits::min() / 2,     static_cast<Word>(-1), Word{0},
            Word{1},       Limits::max() / 2 + 1, Limits::max()};
  return edge_values<Word>(33);
}

/// All sizes of number, not only the large ones that plain random bits give.
template <class Word>
Word random_word(Random &random) {
  const std::uint64_t bits = random();
  return static_cast<Word>(static_cast<Word>(bits) >> (bits >> 40) % (8 * sizeof(Word)));
}

constexpr auto kEverywhere = [](auto...) { return true; };

/// Folds a function's results, and all flags that it leaves from standing ones of 0 and 1, into a
/// sequence. `defined` says which operands it may be called with.
template <class Result, class... Words, class Defined = decltype(kEverywhere)>
void sweep(Judge &judge, const std::string &name, Result (*function)(Words...),
           Defined defined = kEverywhere) {
  judge.sequence(name, [&] {
    constexpr int kBlock = 4096;
    int calls = 0;
    std::string block;
    const auto visit = [&](int standing, Words... operands) {
      if (!defined(operands...)) return;
      if (calls == 0) {
        block = "from operands";
        ((block += ' ' + std::to_string(operands)), ...);
      }
      const int overflow = standing & 1, carry = standing >> 1;
      write_flags({overflow, carry, overflow, carry, overflow, carry});
      judge.take(function(operands...));
      std::uint64_t flags = 0;
      for (const int word : read_flags()) flags = 8 * flags + static_cast<unsigned>(word);
      judge.take(flags);
      if (++calls < kBlock) return;
      judge.call(block);
      calls = 0;
    };
    cross(
        [&](Words... operands) {
          for (const int standing : {0, 1, 2, 3}) visit(standing, operands...);
        },
        crossed_values<Words>(sizeof...(Words))...);
    if constexpr (sizeof...(Words) == 1) {
      using Word = std::tuple_element_t<0, std::tuple<Words...>>;
      using Unsigned = std::make_unsigned_t<Word>;
      constexpr auto kSteps = std::uint64_t{1} << (sizeof(Word) == 2 ? 16 : 17);
      constexpr auto kStep = std::numeric_limits<Unsigned>::max() / (kSteps - 1);
      for (std::uint64_t i = 0; i < kSteps; ++i)
        visit(i % 4, static_cast<Word>(static_cast<Unsigned>(i * kStep)));
    }
    Random random(2026);
    for (int i = 0; i < 1 << 16; ++i) {
      const std::tuple<Words...> operands{random_word<Words>(random)...};
      std::apply([&](Words... drawn) { visit(i % 4, drawn...); }, operands);
    }
    judge.call(block);
  });
}

// Two results in one.
std::int32_t Log2_both(std::int32_t x) {
  std::int16_t exponent, fraction;
  Log2(x, &exponent, &fraction);
  return exponent * 65536 + fraction;
}
std::int32_t L_Extract_both(std::int32_t x) {
  std::int16_t hi, lo;
  L_Extract(x, &hi, &lo);
  return hi * 65536 + lo;
}

template <class Function, class... More>
void sweep_each(Judge &judge, const char *name, Function function, More... more) {
  sweep(judge, name, function);
  if constexpr (sizeof...(more) > 0) sweep_each(judge, more...);
}

#define NAMED(function) #function, function
#define BOTH(op, ns_op) NAMED(op), NAMED(ns_op)
#define ZOLT(op)        NAMED(ZOLT_##op)

TEST(Digests, Operators) {
  Judge judge("operators");
  sweep_each(judge, BOTH(abs_s, ns_abs_s), BOTH(negate, ns_negate), BOTH(sature, ns_sature),
             BOTH(add, ns_add), BOTH(sub, ns_sub), BOTH(mult, ns_mult), BOTH(mult_r, ns_mult_r),
             BOTH(shl, ns_shl), BOTH(shr, ns_shr), BOTH(shr_r, ns_shr_r), BOTH(shift_r, ns_shift_r),
             BOTH(extract_h, ns_extract_h), BOTH(extract_l, ns_extract_l),
             BOTH(L_deposit_h, ns_L_deposit_h), BOTH(L_deposit_l, ns_L_deposit_l),
             BOTH(L_abs, ns_L_abs), BOTH(L_negate, L_ns_negate), BOTH(L_add, L_ns_add),
             BOTH(L_sub, L_ns_sub), BOTH(L_mult, L_ns_mult), BOTH(L_mac, ns_L_mac),
             BOTH(L_msu, ns_L_msu), BOTH(round_BOP, ns_round), BOTH(mac_r, ns_mac_r),
             BOTH(msu_r, ns_msu_r), BOTH(L_add_c, L_ns_add_c), BOTH(L_sub_c, L_ns_sub_c),
             BOTH(L_macNs, ns_L_macNs), BOTH(L_msuNs, ns_L_msuNs), BOTH(L_sat, ns_L_sat),
             BOTH(L_shl, L_ns_shl), BOTH(L_shr, L_ns_shr), BOTH(L_shr_r, L_ns_shr_r),
             BOTH(norm_s, ns_norm_s), BOTH(norm_l, ns_norm_l), BOTH(div_s, ns_div_s),
             BOTH(L_mpy_ll, ns_L_mpy_ll), BOTH(L_mpy_ls, ns_L_mpy_ls), BOTH(L_divide, ns_L_divide),
             BOTH(C2PREAL_SS, NS_C2PREAL_SS), BOTH(C2PIMAG_SS, NS_C2PIMAG_SS),
             BOTH(C2PREAL_LS, NS_C2PREAL_LS), BOTH(C2PIMAG_LS, NS_C2PIMAG_LS),
             BOTH(C3PREAL, NS_C3PREAL), BOTH(C3PIMAG, NS_C3PIMAG), BOTH(fnLog2, ns_fnLog2),
             BOTH(fnLog10, ns_fnLog10), BOTH(fnExp2, ns_fnExp2), BOTH(fnExp10, ns_fnExp10),
             BOTH(sqroot, ns_sqroot), BOTH(L_Comp, ns_L_Comp), ZOLT(add), ZOLT(sub), ZOLT(abs_s),
             ZOLT(negate), ZOLT(shr), ZOLT(extract_h), ZOLT(extract_l), ZOLT(S_round), ZOLT(mult_r),
             ZOLT(mac_r), ZOLT(msu_r), ZOLT(L_mac), ZOLT(L_msu), ZOLT(L_macNs), ZOLT(L_msuNs),
             ZOLT(L_sub), ZOLT(L_add_c), ZOLT(L_sub_c), ZOLT(L_sat), ZOLT(L_negate), ZOLT(L_abs),
             ZOLT(L_deposit_h), ZOLT(L_deposit_l), ZOLT(L_mls), ZOLT(norm_s), ZOLT(norm_l),
             ZOLT(expadj_s), ZOLT(short_sat), ZOLT(i_mult), "Log2", Log2_both, "L_Extract",
             L_Extract_both, NAMED(Mpy_32), NAMED(Mpy_32_16), NAMED(Div_32));
  // Elsewhere they end the process.
  sweep(judge, NAMED(ZOLT_div_s), [](int a, int b) { return a >= 0 && a <= b && b > 0; });
  sweep(judge, NAMED(ZOLT_div_l), [](int a, int b) { return a >= 0 && b > 0; });
  judge.sequence("ZOLT-divisions-out-of-range", [&] {
    for (const int a : {-1, 0, 1, 5}) {
      for (const int b : {-1, 0, 1, 3}) {
        const auto divisor = static_cast<std::int16_t>(b);
        judge.take(last_words([&] { ZOLT_div_s(static_cast<std::int16_t>(a), divisor); }));
        judge.take(last_words([&] { ZOLT_div_l(a, divisor); }));
        judge.call();
      }
    }
  });
  judge.sequence("tablog", [&] {
    judge.take(tablog);
    judge.call();
  });
}

TEST(Digests, BlockScaling) {
  Judge judge("block_scaling");
  const Pcm audio = hostile_signal(500, 60000, speech_16k(kSentences[2]));
  using Word = std::int16_t;
  const auto each_block = [&](const char *name, auto scale) {
    judge.sequence(name, [&] {
      Random random(11);
      for (std::size_t at = 0; at + 320 <= audio.size(); at += 160) {
        Pcm block = cut(audio, at, 320);
        const auto length = static_cast<Word>(pick(random, {160, 160, 80, 1, 2, 0, -1}));
        const auto standing = static_cast<int>(draw(random, 0, 3));
        write_flags({standing & 1, standing >> 1, standing & 1, standing >> 1, 0, 0});
        judge.take(scale(block.data(), length, static_cast<Word>(draw(random, -3, 17))));
        judge.take(block, read_flags());
        judge.call();
      }
    });
  };
  each_block("block_norm_AL", block_norm_AL);
  each_block("ns_cblock_norm", ns_cblock_norm);
  const auto both = [](auto norm) {
    return [norm](Word *x, Word n, Word headroom) { return norm(x, x + 160, n, headroom); };
  };
  each_block("block_norm2", both(block_norm2));
  each_block("ns_cblock_norm2", both(ns_cblock_norm2));
  const auto silent = [](auto denorm) {
    return [denorm](Word *x, Word n, Word shift) { return denorm(x, n, shift), 0; };
  };
  each_block("block_denorm_AL", silent(block_denorm_AL));
  each_block("ns_block_denorm", silent(ns_block_denorm));
}

/// Whether 2^(x / 2^q) has an exponent that the function takes.
bool has_power(std::int32_t x, std::int16_t q) {
  if (x < 0 || q >= 31) return x >= 0;
  return q > -32 && (q >= 0 ? x >> q : static_cast<std::int64_t>(x) << -q) < 32768;
}

std::int64_t polynomial(std::int64_t seed, std::int32_t x, std::int16_t n) {
  Random random(static_cast<std::uint64_t>(seed));
  std::int64_t coefficients[9];
  for (std::int64_t &coefficient : coefficients) coefficient = random_word<std::int64_t>(random);
  return ZOLT_POLYVALFix(coefficients, x, n);
}

TEST(Digests, Functions) {
  Judge judge("functions");
  sweep_each(judge, NAMED(ZOLT_L_log), NAMED(ZOLT_S_log), NAMED(ZOLT_L_exp), NAMED(L_exp_plus),
             NAMED(L_exp_mius), NAMED(ZOLT_L_pow), NAMED(ZOLT_expintFix), NAMED(polynomial),
             NAMED(ZOLT_L64_mult), NAMED(ZOLT_LL_mult_64a32), NAMED(ZOLT_L64_abs),
             NAMED(ZOLT_get_gcd), NAMED(ZOLT_L_sin), NAMED(ZOLT_L_cos), NAMED(ZOLT_L_atan),
             NAMED(ZOLT_L_atan2), NAMED(ZOLT_L_cuberoot), NAMED(ZOLT_L_root15));

  sweep(judge, NAMED(ZOLT_L_pow2_plus),
        [](std::int32_t x, std::int16_t q, auto, auto) { return has_power(x, q); });
  sweep(judge, NAMED(ZOLT_L64_div), [](auto, std::int64_t b) { return b != 0; });
  sweep(judge, NAMED(ZOLT_L64_sqrt_Q0), [](std::int64_t x) { return x >= 0; });
  judge.sequence("ZOLT_abs_double", [&] {
    for (const double x : {0.0, -0.0, 1.5, -1.5, 1e300, -1e300, -5e-324})
      judge.take(ZOLT_abs_double(x));
    judge.call();
  });
  judge.sequence("out-of-range", [&] {
    for (const std::int64_t x : {-2, -1, 0, 1}) {
      judge.take(last_words([&] { ZOLT_L64_div(5, x); }));
      judge.take(last_words([&] { ZOLT_L64_sqrt_Q0(x); }));
      for (const std::int16_t q : {-40, -32, -31, -15, 0, 14, 15, 16, 31, 40})
        for (const std::int32_t value : {static_cast<std::int32_t>(x), 32767, 32768, INT32_MAX})
          judge.take(last_words([&] { ZOLT_L_pow2_plus(value, q, 0, 1); }));
      judge.call();
    }
  });
  judge.sequence("windows", [&] {
    Random random(12);
    for (const std::int32_t n : {160, 41, 9, 1, 0, -1}) {
      std::int16_t shorts[160], short_weights[160];
      std::int32_t words[160], weights[160];
      std::int64_t longs[160];
      for (int i = 0; i < 160; ++i) {
        shorts[i] = random_word<std::int16_t>(random);
        short_weights[i] = random_word<std::int16_t>(random);
        words[i] = random_word<std::int32_t>(random);
        weights[i] = random_word<std::int32_t>(random);
        longs[i] = random_word<std::int64_t>(random);
      }
      ZOLT_S_addHamFix(n, shorts, short_weights);
      ZOLT_I_addHamFix(n, words, weights);
      ZOLT_L64_addHamFix(n, longs, weights);
      judge.take(shorts, words, longs);
      judge.call();
    }
  });
  judge.sequence("tables", [&] {
    const auto take_each = [&](const auto &...tables) {
      ((judge.take(tables), judge.call()), ...);
    };
    take_each(ZOLT_ln_coeffs, ZOLT_LPow2PlusFr1, ZOLT_LPow2PlusFr2, LPow2PlusFr1, LPow2PlusFr2,
              exp_coef_plus, exp_coef_minus, ZOLT_atanList, ZOLT_sinList, ZOLT_cuberoot_coeffs,
              ZOLT_cuberoot_fraction, ZOLT_root15_fraction, ZOLT_root15_coeffs, ZOLT_root15_const1,
              ZOLT_root15_const2, ZOLT_vadHamTable1, ZOLT_vadHamTable2, ZOLT_vadHamTable3);
  });
}

}  // namespace
}  // namespace orvalis::test
