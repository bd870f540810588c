// The three transforms in both directions, with the flags and tables of the fixed-point one, and
// the queries.
#include "fixed_fft.h"
#include "float_fft.h"
#include "noscale_fft_512p.h"
#include "orvalis.h"
#include "tests/digests/observe.h"

namespace orvalis::test {
namespace {

/// Runs `body` on `count` numbers from every part of a hostile signal.
template <class Value, class Body>
void each_block(Judge &judge, const std::string &name, std::size_t count, Body body) {
  judge.sequence(name, [&] {
    Random random(13);
    const Pcm audio = hostile_signal(600, 120000, speech_16k(kSentences[2]));
    for (std::size_t at = 0; at + count <= audio.size(); at += 509) {
      const Pcm samples = cut(audio, at, count);
      std::vector<Value> block(samples.begin(), samples.end());
      const auto standing = static_cast<int>(draw(random, 0, 3));
      write_flags({standing & 1, standing >> 1, standing & 1, standing >> 1, 7, 7});
      body(block, random);
      judge.take(block, read_flags());
      judge.call();
    }
  });
}

std::int16_t direction(Random &random) { return pick<std::int16_t>(random, {1, 1, -1, 0, 2}); }

TEST(Digests, FixedFft) {
  Judge judge("fixed_fft");
  for (const std::int32_t band : {0, 1, 2}) {
    const std::size_t size = band == 0 ? 256 : 128;
    const std::string name = std::to_string(band);
    each_block<std::int16_t>(judge, "c_fft_epd-" + name, size, [&](auto &block, Random &random) {
      c_fft_epd(block.data(), direction(random), band);
    });
    each_block<std::int16_t>(judge, "r_fft_epd-" + name, size, [&](auto &block, Random &random) {
      r_fft_epd(block.data(), direction(random), band);
    });
  }
  each_block<std::int16_t>(judge, "c_fft_ns", 256, [&](auto &block, Random &random) {
    c_fft_ns(block.data(), direction(random));
  });
  each_block<std::int16_t>(judge, "r_fft_ns", 256, [&](auto &block, Random &random) {
    r_fft_ns(block.data(), direction(random));
  });
  judge.sequence("tables", [&] {
    judge.take(phs_tbl_WB, phs_tbl_NB, phs_tbl_256, ii_table_WB, ii_table_NB, ii_table_256);
    for (int i = 0; i < 128; ++i) judge.take(phs_tbl[0][i], phs_tbl[1][i]);
    for (int i = 0; i < 6; ++i) judge.take(ii_table[0][i], ii_table[1][i]);
    judge.call();
  });
}

TEST(Digests, FloatFft) {
  Judge judge("float_fft");
  const auto scaled = [](auto &block, Random &random) {
    const float scale = pick(random, {1.0F, 0.001F, 1e30F, 1e-40F});
    for (float &value : block) value *= scale;
  };
  each_block<float>(judge, "c_fft", 512, [&](auto &block, Random &random) {
    scaled(block, random);
    c_fft(block.data(), direction(random));
  });
  each_block<float>(judge, "r_fft", 512, [&](auto &block, Random &random) {
    scaled(block, random);
    r_fft(block.data(), direction(random));
  });
  fill_tbl();
}

TEST(Digests, UnscaledFft) {
  Judge judge("unscaled_fft");
  const auto widened = [](auto &block, Random &random) {
    const auto shift = draw(random, 0, 47);
    for (std::int64_t &value : block)
      value = static_cast<std::int64_t>(static_cast<std::uint64_t>(value) << shift);
  };
  each_block<std::int64_t>(judge, "FFT_dit2_noscale_512", 1024, [&](auto &block, Random &random) {
    widened(block, random);
    judge.take(FFT_dit2_noscale_512(512 * direction(random), block.data(), &block[512]));
  });
  each_block<std::int64_t>(
      judge, "FFT_dit2_noscale_256_64bit", 512, [&](auto &block, Random &random) {
        widened(block, random);
        judge.take(FFT_dit2_noscale_256_64bit(256 * direction(random), block.data(), &block[256]));
      });
  each_block<std::int16_t>(judge, "Noscale_FFT_512p_Frame", 512, [&](auto &block, Random &random) {
    std::int32_t re[512], im[512];
    judge.take(Noscale_FFT_512p_Frame(block.data(), pick(random, {512, 320, 160, 1}), re, im), re,
               im);
  });
  each_block<std::int16_t>(
      judge, "Noscale_FFT_256p_Frame_64bit", 256, [&](auto &block, Random &random) {
        std::int32_t re[256], im[256];
        judge.take(
            Noscale_FFT_256p_Frame_64bit(block.data(), pick(random, {256, 160, 100, 1}), re, im),
            re, im);
      });
  each_block<std::int32_t>(
      judge, "Noscale_FFT_256p_Frame_64bit_be", 512, [&](auto &block, Random &random) {
        const auto shift = draw(random, 0, 16);
        for (std::int32_t &value : block)
          value = static_cast<std::int32_t>(static_cast<std::uint32_t>(value) << shift);
        judge.take(
            Noscale_FFT_256p_Frame_64bit_be(256 * direction(random), block.data(), &block[256]));
      });
  each_block<std::int64_t>(judge, "int_bitrev", 1024, [&](auto &block, Random &) {
    int_bitrev(512, block.data(), &block[512], fix_bitrev_512);
  });
  each_block<std::int32_t>(judge, "int_bitrev_32bit", 512, [&](auto &block, Random &) {
    int_bitrev_32bit(256, block.data(), &block[256], fix_bitrev_256);
  });
  judge.sequence("refusals", [&] {
    std::int16_t in[512] = {};
    std::int32_t re[512], im[512];
    for (const auto frame : {Noscale_FFT_512p_Frame, Noscale_FFT_256p_Frame_64bit}) {
      for (const std::int32_t length : {-1, 0, 1, 256, 257, 512, 513})
        judge.take(last_words([&] { std::exit(1 + frame(in, length, re, im)); }));
      judge.take(last_words([&] { std::exit(1 + frame(nullptr, 160, re, im)); }));
      judge.take(last_words([&] { std::exit(1 + frame(in, 160, nullptr, im)); }));
      judge.take(last_words([&] { std::exit(1 + frame(in, 160, re, nullptr)); }));
      judge.call();
    }
  });
  judge.sequence("tables", [&] {
    judge.take(sin_table_fft_512_noscale, sin_table_fft_256_noscale, fix_bitrev_512,
               fix_bitrev_256);
    judge.take(FFT_dit2_noscale_512(512, nullptr, nullptr),
               FFT_dit2_noscale_256_64bit(256, nullptr, nullptr));
    judge.call();
  });
}

TEST(Digests, Queries) {
  Judge judge("queries");
  each_block<std::int16_t>(judge, "computeEnergy", 4000, [&](auto &block, Random &random) {
    judge.take(computeEnergy(block.data(), pick(random, {160, 80, 320, 4000, 1, 2, 0, -1})));
  });
  each_block<std::int16_t>(judge, "ComputeEnergy", 4000, [&](auto &block, Random &random) {
    // The last block is read whole.
    const auto rate_hz = pick(random, {16000, 8000, 44100, 48000, 100, 50, 49, 0, -8000});
    judge.take(
        ComputeEnergy(block.data(), pick(random, {160, 3000, 1600, 2001, 1, 0, -1}), rate_hz));
  });
  for (const std::int32_t rate_hz : {16000, 8000, 0}) {
    each_block<std::int16_t>(judge, "getSpectrum-" + std::to_string(rate_hz), 160,
                             [&](auto &block, Random &) {
                               std::int32_t spectrum[130] = {};
                               judge.take(getSpectrum(block.data(), spectrum, rate_hz), spectrum);
                             });
  }
  judge.sequence("extremes", [&] {
    for (const std::int16_t level : {INT16_MIN, -1, 0, 1, INT16_MAX}) {
      Pcm block(80000, level);
      judge.take(computeEnergy(block.data(), 80000));
      for (std::size_t i = 0; i < block.size(); i += 2)
        block[i] = static_cast<std::int16_t>(-level - 1);
      judge.take(computeEnergy(block.data(), 80000), ComputeEnergy(block.data(), 80000, 4000000));
      judge.call();
    }
    std::int32_t spectrum[128];
    const Pcm block(160, 1);
    judge.take(computeEnergy(nullptr, 160), ComputeEnergy(nullptr, 160, 16000));
    judge.take(getSpectrum(nullptr, spectrum, 16000), getSpectrum(block.data(), nullptr, 16000));
    judge.call();
  });
}

}  // namespace
}  // namespace orvalis::test
