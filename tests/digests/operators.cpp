// The operators of all three copies, with all flags that they leave, their tables, and block
// scaling.
#include "basic_op.h"
#include "tests/digests/observe.h"
#include "tests/digests/sweep.h"

namespace orvalis::test {
namespace {

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

#define BOTH(op, ns_op)  \
  sweep(judge, #op, op); \
  sweep(judge, #ns_op, ns_op)

TEST(Digests, Operators) {
  Judge judge("operators");
  BOTH(abs_s, ns_abs_s);
  BOTH(negate, ns_negate);
  BOTH(sature, ns_sature);
  BOTH(add, ns_add);
  BOTH(sub, ns_sub);
  BOTH(mult, ns_mult);
  BOTH(mult_r, ns_mult_r);
  BOTH(shl, ns_shl);
  BOTH(shr, ns_shr);
  BOTH(shr_r, ns_shr_r);
  BOTH(shift_r, ns_shift_r);
  BOTH(extract_h, ns_extract_h);
  BOTH(extract_l, ns_extract_l);
  BOTH(L_deposit_h, ns_L_deposit_h);
  BOTH(L_deposit_l, ns_L_deposit_l);
  BOTH(L_abs, ns_L_abs);
  BOTH(L_negate, L_ns_negate);
  BOTH(L_add, L_ns_add);
  BOTH(L_sub, L_ns_sub);
  BOTH(L_mult, L_ns_mult);
  BOTH(L_mac, ns_L_mac);
  BOTH(L_msu, ns_L_msu);
  BOTH(round_BOP, ns_round);
  BOTH(mac_r, ns_mac_r);
  BOTH(msu_r, ns_msu_r);
  BOTH(L_add_c, L_ns_add_c);
  BOTH(L_sub_c, L_ns_sub_c);
  BOTH(L_macNs, ns_L_macNs);
  BOTH(L_msuNs, ns_L_msuNs);
  BOTH(L_sat, ns_L_sat);
  BOTH(L_shl, L_ns_shl);
  BOTH(L_shr, L_ns_shr);
  BOTH(L_shr_r, L_ns_shr_r);
  BOTH(norm_s, ns_norm_s);
  BOTH(norm_l, ns_norm_l);
  BOTH(div_s, ns_div_s);
  BOTH(L_mpy_ll, ns_L_mpy_ll);
  BOTH(L_mpy_ls, ns_L_mpy_ls);
  BOTH(L_divide, ns_L_divide);
  BOTH(C2PREAL_SS, NS_C2PREAL_SS);
  BOTH(C2PIMAG_SS, NS_C2PIMAG_SS);
  BOTH(C2PREAL_LS, NS_C2PREAL_LS);
  BOTH(C2PIMAG_LS, NS_C2PIMAG_LS);
  BOTH(C3PREAL, NS_C3PREAL);
  BOTH(C3PIMAG, NS_C3PIMAG);
  BOTH(fnLog2, ns_fnLog2);
  BOTH(fnLog10, ns_fnLog10);
  BOTH(fnExp2, ns_fnExp2);
  BOTH(fnExp10, ns_fnExp10);
  BOTH(sqroot, ns_sqroot);
  BOTH(L_Comp, ns_L_Comp);
  sweep(judge, "Log2", Log2_both);
  sweep(judge, "L_Extract", L_Extract_both);
  sweep(judge, "Mpy_32", Mpy_32);
  sweep(judge, "Mpy_32_16", Mpy_32_16);
  sweep(judge, "Div_32", Div_32);

#define ZOLT(op, ...) sweep(judge, "ZOLT_" #op, ZOLT_##op __VA_OPT__(, ) __VA_ARGS__)
  ZOLT(add);
  ZOLT(sub);
  ZOLT(abs_s);
  ZOLT(negate);
  ZOLT(shr);
  ZOLT(extract_h);
  ZOLT(extract_l);
  ZOLT(S_round);
  ZOLT(mult_r);
  ZOLT(mac_r);
  ZOLT(msu_r);
  ZOLT(L_mac);
  ZOLT(L_msu);
  ZOLT(L_macNs);
  ZOLT(L_msuNs);
  ZOLT(L_sub);
  ZOLT(L_add_c);
  ZOLT(L_sub_c);
  ZOLT(L_sat);
  ZOLT(L_negate);
  ZOLT(L_abs);
  ZOLT(L_deposit_h);
  ZOLT(L_deposit_l);
  ZOLT(L_mls);
  ZOLT(norm_s);
  ZOLT(norm_l);
  ZOLT(expadj_s);
  ZOLT(short_sat);
  ZOLT(i_mult);
  // Elsewhere they end the process.
  ZOLT(div_s, [](int a, int b) { return a >= 0 && a <= b && b > 0; });
  ZOLT(div_l, [](int a, int b) { return a >= 0 && b > 0; });

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
  const Pcm speech = speech_16k(kSentences[2]);
  const auto each_block = [&](const char *name, auto scale) {
    judge.sequence(name, [&] {
      Random random(11);
      const Pcm audio = hostile_signal(500, 60000, speech);
      for (std::size_t at = 0; at + 320 <= audio.size(); at += 160) {
        Pcm block(audio.begin() + static_cast<long>(at),
                  audio.begin() + static_cast<long>(at + 320));
        const auto length = static_cast<std::int16_t>(pick(random, {160, 160, 80, 1, 2, 0, -1}));
        const auto standing = static_cast<int>(draw(random, 0, 3));
        write_flags({standing & 1, standing >> 1, standing & 1, standing >> 1, 0, 0});
        judge.take(scale(block, length, static_cast<std::int16_t>(draw(random, -3, 17))));
        judge.take(block, read_flags());
        judge.call();
      }
    });
  };
  each_block("block_norm_AL",
             [](Pcm &x, std::int16_t n, std::int16_t h) { return block_norm_AL(x.data(), n, h); });
  each_block("ns_cblock_norm",
             [](Pcm &x, std::int16_t n, std::int16_t h) { return ns_cblock_norm(x.data(), n, h); });
  each_block("block_norm2", [](Pcm &x, std::int16_t n, std::int16_t h) {
    return block_norm2(x.data(), &x[160], n, h);
  });
  each_block("ns_cblock_norm2", [](Pcm &x, std::int16_t n, std::int16_t h) {
    return ns_cblock_norm2(x.data(), &x[160], n, h);
  });
  each_block("block_denorm_AL", [](Pcm &x, std::int16_t n, std::int16_t h) {
    return block_denorm_AL(x.data(), n, h), 0;
  });
  each_block("ns_block_denorm", [](Pcm &x, std::int16_t n, std::int16_t h) {
    return ns_block_denorm(x.data(), n, h), 0;
  });
}

}  // namespace
}  // namespace orvalis::test
