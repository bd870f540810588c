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
      body(block.data(), random);
      judge.take(block, read_flags());
      judge.call();
    }
  });
}

std::int16_t direction(Random &random) { return pick<std::int16_t>(random, {1, 1, -1, 0, 2}); }

TEST(Digests, FixedFft) {
  Judge judge("fixed_fft");
  const auto each = [&](const std::string &name, std::size_t size, auto transform, auto... band) {
    each_block<std::int16_t>(judge, name, size, [&](std::int16_t *block, Random &random) {
      transform(block, direction(random), band...);
    });
  };
  for (const std::int32_t band : {0, 1, 2}) {
    each("c_fft_epd-" + std::to_string(band), band == 0 ? 256 : 128, c_fft_epd, band);
    each("r_fft_epd-" + std::to_string(band), band == 0 ? 256 : 128, r_fft_epd, band);
  }
  each("c_fft_ns", 256, c_fft_ns);
  each("r_fft_ns", 256, r_fft_ns);
  judge.sequence("tables", [&] {
    judge.take(phs_tbl_WB, phs_tbl_NB, phs_tbl_256, ii_table_WB, ii_table_NB, ii_table_256);
    for (int i = 0; i < 128; ++i) judge.take(phs_tbl[0][i], phs_tbl[1][i]);
    for (int i = 0; i < 6; ++i) judge.take(ii_table[0][i], ii_table[1][i]);
    judge.call();
  });
}

TEST(Digests, FloatFft) {
  Judge judge("float_fft");
  const auto each = [&](const char *name, auto transform) {
    each_block<float>(judge, name, 512, [&](float *block, Random &random) {
      const float scale = pick(random, {1.0F, 0.001F, 1e30F, 1e-40F});
      for (int i = 0; i < 512; ++i) block[i] *= scale;
      transform(block, direction(random));
    });
  };
  each("c_fft", c_fft);
  each("r_fft", r_fft);
  fill_tbl();
}

TEST(Digests, UnscaledFft) {
  Judge judge("unscaled_fft");
  const auto widen = [](auto *block, int count, std::int64_t shift) {
    for (int i = 0; i < count; ++i) block[i] *= std::int64_t{1} << shift;
  };
  const auto transform = [&](const char *name, std::int32_t n, auto function) {
    each_block<std::int64_t>(judge, name, static_cast<std::size_t>(2 * n),
                             [&](std::int64_t *block, Random &random) {
                               widen(block, 2 * n, draw(random, 0, 47));
                               judge.take(function(n * direction(random), block, block + n));
                             });
  };
  transform("FFT_dit2_noscale_512", 512, FFT_dit2_noscale_512);
  transform("FFT_dit2_noscale_256_64bit", 256, FFT_dit2_noscale_256_64bit);
  const auto frame = [&](const char *name, std::size_t n, auto function,
                         std::initializer_list<std::int32_t> lengths) {
    each_block<std::int16_t>(judge, name, n, [&](std::int16_t *block, Random &random) {
      std::vector<std::int32_t> re(n), im(n);
      judge.take(function(block, pick(random, lengths), re.data(), im.data()), re, im);
    });
  };
  frame("Noscale_FFT_512p_Frame", 512, Noscale_FFT_512p_Frame, {512, 320, 160, 1});
  frame("Noscale_FFT_256p_Frame_64bit", 256, Noscale_FFT_256p_Frame_64bit, {256, 160, 100, 1});
  each_block<std::int32_t>(
      judge, "Noscale_FFT_256p_Frame_64bit_be", 512, [&](std::int32_t *block, Random &random) {
        widen(block, 512, draw(random, 0, 16));
        judge.take(Noscale_FFT_256p_Frame_64bit_be(256 * direction(random), block, block + 256));
      });
  each_block<std::int64_t>(judge, "int_bitrev", 1024, [&](std::int64_t *block, Random &) {
    int_bitrev(512, block, block + 512, fix_bitrev_512);
  });
  each_block<std::int32_t>(judge, "int_bitrev_32bit", 512, [&](std::int32_t *block, Random &) {
    int_bitrev_32bit(256, block, block + 256, fix_bitrev_256);
  });
  judge.sequence("refusals", [&] {
    std::int16_t in[512] = {};
    std::int32_t re[512], im[512];
    for (const auto call : {Noscale_FFT_512p_Frame, Noscale_FFT_256p_Frame_64bit}) {
      for (const std::int32_t length : {-1, 0, 1, 256, 257, 512, 513})
        judge.take(last_words([&] { std::exit(1 + call(in, length, re, im)); }));
      judge.take(last_words([&] { std::exit(1 + call(nullptr, 160, re, im)); }));
      judge.take(last_words([&] { std::exit(1 + call(in, 160, nullptr, im)); }));
      judge.take(last_words([&] { std::exit(1 + call(in, 160, re, nullptr)); }));
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
  each_block<std::int16_t>(judge, "computeEnergy", 4000, [&](auto *block, Random &random) {
    judge.take(computeEnergy(block, pick(random, {160, 80, 320, 4000, 1, 2, 0, -1})));
  });
  each_block<std::int16_t>(judge, "ComputeEnergy", 4000, [&](auto *block, Random &random) {
    // The last block is read whole.
    const auto rate_hz = pick(random, {16000, 8000, 44100, 48000, 100, 50, 49, 0, -8000});
    judge.take(ComputeEnergy(block, pick(random, {160, 3000, 1600, 2001, 1, 0, -1}), rate_hz));
  });
  for (const std::int32_t rate_hz : {16000, 8000, 0})
    each_block<std::int16_t>(judge, "getSpectrum-" + std::to_string(rate_hz), 160,
                             [&](auto *block, Random &) {
                               std::int32_t spectrum[130] = {};
                               judge.take(getSpectrum(block, spectrum, rate_hz), spectrum);
                             });
  judge.sequence("long", [&] {  // squares are added in order: beside a large one small ones vanish
    Pcm block(3500001, 5);
    for (std::size_t i = 1; i < block.size(); i += 2) block[i] = -5;
    for (const std::size_t loud : {std::size_t{0}, block.size() - 1}) {
      block[loud] = 32767;
      judge.take(computeEnergy(block.data(), 3500001), computeEnergy(&block[loud], 1));
      block[loud] = 5;
    }
    judge.call();
  });
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
