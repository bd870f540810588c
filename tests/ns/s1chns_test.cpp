#include "Voice_Engine/ns/s1chns.h"

#include <gtest/gtest.h>

#include <numbers>
#include <numeric>
#include <random>

#include "tests/channel/one_step.h"
#include "tests/support/level_jumps.h"

namespace orvalis::test {
namespace {

constexpr int kFrame = 160;
constexpr int kTail = 96;

class Suppressor {
public:
  explicit Suppressor(Word16 mode) { EXPECT_EQ(S1CHNSInit(&state, mode), 0); }
  std::vector<Word16> frame(const Word16 *input) {
    std::vector<Word16> in(input, input + kFrame), out(kFrame);
    s1chns_C(flags, &state, in.data(), out.data());
    EXPECT_EQ(in, out) << "the input is overwritten with the output";
    return out;
  }
  std::vector<Word16> run(const std::vector<Word16> &input) {
    std::vector<Word16> output;
    for (std::size_t at = 0; at + kFrame <= input.size(); at += kFrame)
      for (Word16 sample : frame(&input[at])) output.push_back(sample);
    return output;
  }

  S1chnsState state{};
  Flags flags;
};

std::vector<Word16> speech() { return with_level_jumps(speech_16k("numbers.raw"), 8000); }

Subject<S1chnsState> subject() {
  return {.plan = kSuppression,
          .model = kSuppressorModel,
          .overlap = &S1chnsState::analysis_overlap,
          .frame_cnt = &S1chnsState::frame_cnt};
}

double level_db(const Word16 *samples, std::size_t count) {
  double sum = 0;
  for (std::size_t i = 0; i < count; ++i) sum += 1.0 * samples[i] * samples[i];
  return 10 * std::log10(sum / count + 1e-9);
}

/// Channel gains by their definition: the reciprocal of the noise, a floor, and 0.454 dB for each
/// step of the SNR index above 6. If few channels hold speech, none does.
std::vector<double> model_gains(const ChannelFindings &found, double noise, double floor_db) {
  std::vector<int> snr(found.snr, found.snr + kSuppressionChannels);
  if (std::ranges::count_if(snr, [](int index) { return index >= 12; }) < 5)
    for (int &index : snr)
      if (found.voice_metric < 56 || index < 13) index = 1;
  const double base_db = std::max(-model_level_q5(noise) / 32, floor_db);
  std::vector<double> gains;
  for (int index : snr) {
    const double gain_db = std::min(0.45407 * (std::max(index, 6) - 6) + base_db, 0.0);
    gains.push_back(std::pow(10, gain_db / 20));
  }
  return gains;
}

struct ModelOutput {
  std::vector<double> samples;
  bool clear;   ///< the inverse transform, which does not scale, stays far from saturation
  double unit;  ///< of the coarsest scale on the way
};

/// Spectrum times gains, back to samples, overlapped, de-emphasised.
ModelOutput model_output(const S1chnsState &before, const ModelSpectrum &spectrum,
                         const Word16 *bin_gain_q15) {
  std::vector<std::complex<double>> bins = spectrum.bins;
  double largest_part = 0;
  for (std::size_t k = 0; k < bins.size(); ++k) {
    bins[k] *= bin_gain_q15[k] / 32768.0;
    largest_part = std::max({largest_part, std::abs(bins[k].real()), std::abs(bins[k].imag())});
  }
  std::vector<double> samples = model_inverse(256, bins);
  const double peak =
      std::abs(*std::ranges::max_element(samples, {}, [](double x) { return std::abs(x); }));
  // The largest part is brought to 1024..2047 before the transform, with a loss if that is less.
  const int shift = 10 - std::ilogb(largest_part);
  const bool clear = std::ldexp(peak, shift) < 16384;
  const double unit = std::ldexp(1.0, -std::min(shift, spectrum.shift));
  double memory = before.de_emp_mem;
  for (int i = 0; i < kFrame; ++i) {
    if (i < kTail) samples[i] += before.synthesis_overlap[i];
    memory = samples[i] = std::clamp(samples[i] + 0.8 * memory, -32768.0, 32767.0);
  }
  return {samples, clear, unit};
}

TEST(S1chns, FollowsTheModelFrameByFrame) {
  const std::vector<Word16> audio = speech();
  for (const auto &[mode, floor_db] : {std::pair<Word16, double>{0, -13}, {2, -18.4}, {3, -6}}) {
    Suppressor suppressor(mode);
    Bounds bounds;
    auto engine = subject();
    int clear = 0;
    double min_gain = 1;
    for (std::size_t at = 0; at + kFrame <= audio.size(); at += kFrame) {
      const S1chnsState before = suppressor.state;
      const std::vector<Word16> output = suppressor.frame(&audio[at]);
      const S1chnsState &after = suppressor.state;
      const auto step = engine.hold(bounds, before, after, &audio[at]);

      const auto gains = model_gains(
          step.found, std::accumulate(step.noise.begin(), step.noise.end(), 0.0), floor_db);
      for (std::size_t i = 0; i < gains.size(); ++i) {
        min_gain = std::min(min_gain, gains[i]);
        for (int k = kSuppressorModel.bins[i][0]; k <= kSuppressorModel.bins[i][1]; ++k)
          bounds.hold("gain", after.bin_gain_q15[k] / 32768.0 - gains[i], gains[i] / 200);
      }
      bounds.hold("gain above bin 125", after.bin_gain_q15[126] | after.bin_gain_q15[127], 0.5);

      const ModelOutput expected = model_output(before, step.spectrum, after.bin_gain_q15);
      if (!expected.clear) continue;
      clear += 1;
      double square_error = 0;
      for (int i = 0; i < kFrame; ++i)
        square_error += std::pow(output[i] - expected.samples[i], 2) / kFrame;
      // Both transforms and the products with the gains truncate.
      const double bound = 3 + 45 * expected.unit;
      bounds.hold("output", std::sqrt(square_error), bound);
    }
    EXPECT_GT(clear, engine.frames * 3 / 4);
    engine.expect_rare_exceptions();
    EXPECT_NEAR(20 * std::log10(min_gain), floor_db, 0.01) << "the floor is never reached";
  }
}

TEST(S1chns, WhiteNoiseIsLoweredToTheFloor) {
  for (const auto &[mode, floor_db] : {std::pair<Word16, double>{0, -13}, {2, -18.4}, {3, -6}}) {
    for (double rms : {300.0, 800.0, 2000.0}) {
      std::mt19937 generator(1);
      std::normal_distribution<double> normal(0, rms);
      std::vector<Word16> noise(5 * 16000);
      for (Word16 &sample : noise) sample = static_cast<Word16>(std::lround(normal(generator)));
      const std::vector<Word16> output = Suppressor(mode).run(noise);
      const std::size_t settled = 16000, count = noise.size() - settled;
      const double change_db = level_db(&output[settled], count) - level_db(&noise[settled], count);
      EXPECT_NEAR(change_db, floor_db, 1) << "mode " << mode << ", rms " << rms;
    }
  }
}

TEST(S1chns, NothingPassesAboveBin125) {
  // Far above the noise that was learnt, a tone opens its channels; after a second it is noise.
  const auto loss_db = [](double tone_hz, std::size_t from) {
    std::mt19937 generator(1);
    std::vector<Word16> audio(3 * 16000);
    for (std::size_t i = 0; i < audio.size(); ++i) {
      const double tone = i < 8000 ? 0 : std::sin(2 * std::numbers::pi * tone_hz * i / 16000);
      audio[i] = static_cast<Word16>(8000 * tone + generator() % 21 - 10.0);
    }
    const std::vector<Word16> output = Suppressor(2).run(audio);
    return level_db(&audio[from], 800) - level_db(&output[from], 800);
  };
  EXPECT_LT(loss_db(7700, 8800), 1);
  EXPECT_GT(loss_db(7900, 8800), 17) << "more than what the window leaks into other bins";
  EXPECT_GT(loss_db(7900, 45000), 34);
}

TEST(S1chns, CountsItsFramesWithoutWrapping) {
  Suppressor suppressor(0);
  const std::vector<Word16> silence(kFrame);
  suppressor.state.frame_cnt = 32765;
  for (int expected : {32766, 32767, 32767}) {
    suppressor.frame(silence.data());
    EXPECT_EQ(suppressor.state.frame_cnt, expected);
  }
}

}  // namespace
}  // namespace orvalis::test
