// The channel analysis on real speech against the same in double precision, without the engine's
// rounding: energies from the model's own transform, SNR and levels from the engine's energies.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <numbers>

#include "Voice_Engine/channel/channel_plans.h"
#include "tests/support/fourier.h"
#include "tests/support/noise.h"

namespace orvalis::test {
namespace {

/// Window, transform and mean powers of a frame behind the last samples before it.
struct ModelFrame {
  ModelFrame(const ChannelPlan &plan, const Word16 *frame, double scale) {
    std::vector<double> x(static_cast<std::size_t>(plan.transform->size));
    const int samples = plan.overlap + plan.frame_samples;
    for (int i = 0; i < samples; ++i) {
      const int edge = std::min(i, samples - 1 - i);
      const double sine = std::sin(std::numbers::pi * (edge + 0.5) / (2 * plan.overlap));
      const Word16 *sample = frame + i - plan.overlap;
      x[i] = (edge < plan.overlap ? sine * sine : 1) * (sample[0] - 0.8 * sample[-1]);
    }
    for (std::size_t i = 0; i < x.size(); i += 2)
      peak = std::max(peak, scale * std::hypot(x[i], x[i + 1]));
    const Spectrum bins = packed_bins(x);
    for (int c = 0; c < plan.channels; ++c) {
      const auto [first, last] = plan.bins[c];
      double sum = 0;
      for (int k = first; k <= last; ++k) sum += std::norm(bins[k]);
      const int width = last - first + 1;
      power[c] = 256 * sum / (width == 24 ? 14 : width);  // one channel is weighed up on purpose
    }
  }
  double peak = 0;  ///< largest pair of samples in the scale of the normalised frame
  double power[kMaxChannels];
};

TEST(ChannelAnalysis, EnergiesSnrAndLevelsAreThoseOfDoublePrecision) {
  for (const ChannelPlan *plan : {&kWideBandDetection, &kNarrowBandDetection, &kSuppression}) {
    Pcm audio =
        plan == &kNarrowBandDetection ? speech_8k("raw/hts1.raw") : speech_16k("numbers.raw");
    // Its level jumps, so that the block shift of a frame and the scale of its memories do, too.
    for (std::size_t i = 0; i < audio.size(); ++i)
      audio[i] = to_sample(audio[i] * (i / 8000 % 2 == 0 ? 1 : i / 16000 % 2 == 0 ? 4 : 0.25));
    Word32 energy[kMaxChannels] = {}, noise[kMaxChannels] = {};
    Word16 long_term[kMaxChannels] = {}, overlap[kMaxOverlap] = {}, memory = 0, shift = 0,
           count = 0, hysteresis = 0, last = 0;
    ChannelState state{energy, noise,      long_term, overlap, memory, shift,
                       count,  hysteresis, last,      0,       true};
    Flags flags;
    int frames = 0, crowded = 0, differs = 0;
    for (int at = plan->frame_samples; at + plan->frame_samples <= std::ssize(audio);
         at += plan->frame_samples) {
      state.frame_cnt = ++frames;
      Word32 before[kMaxChannels];
      std::ranges::copy(energy, before);
      const ChannelFindings found = analyse_frame(flags, *plan, state, &audio[at]);
      const double unit = std::ldexp(1.0, -found.shift);
      const ModelFrame model(*plan, &audio[at], 1 / unit);
      // The first frame has no past; and where that of a louder frame leaves the transform no
      // headroom, it saturates, as full scale does.
      const bool clear = model.peak < 16384 && frames > 1;
      crowded += !clear;
      for (int i = 0; i < plan->channels; ++i) {
        const double expected =
            std::max<double>(0.45 * before[i] + 0.55 * model.power[i], plan->energy_floor);
        // In the normalised scale the transform's error is 2 in strong bins, 6 in weak ones.
        const double bound = 256 * unit * (4 * std::sqrt(model.power[i] / 256) + 36 * unit) +
                             std::ldexp(expected, -13) + 4;
        ASSERT_NEAR(energy[i], std::min(expected, 0x1p31),
                    clear && model.power[i] < 0x1p30 ? bound : INFINITY)
            << frames;
        const double snr_db = 10.03 * std::log10(std::max(1.0 * energy[i] / noise[i], 1.0));
        ASSERT_NEAR(found.snr[i], snr_db / 0.375, 1.2) << energy[i] << ' ' << noise[i];
        differs += std::abs(found.snr[i] - snr_db / 0.375) > 0.7;
        ASSERT_NEAR(level_q5(flags, energy[i]), 32 * 10.03 * std::log10(energy[i] / 256.0), 3);
      }
      if (found.is_noise) track_noise(*plan, state);
      state.first_frame = false;
    }
    EXPECT_GT(frames, 300);
    EXPECT_LT(crowded, frames / 50);
    EXPECT_LT(differs, frames * plan->channels / 50);
  }
}

}  // namespace
}  // namespace orvalis::test
