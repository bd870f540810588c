// One frame of the engine against one frame of the double-precision model. The model starts from
// the engine's own state, so that errors do not accumulate and decisions stay comparable.
#pragma once

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <map>
#include <string>

#include "Voice_Engine/channel/channel_plans.h"
#include "tests/channel/channel_model.h"

namespace orvalis::test {

/// The maximum error of each quantity in multiples of its bound, checked at the end.
class Bounds {
public:
  void hold(const std::string &quantity, double error, double bound) {
    double &worst = worst_[quantity];
    worst = std::max(worst, std::isnan(error) ? INFINITY : std::abs(error) / bound);
  }
  ~Bounds() {
    for (const auto &[quantity, worst] : worst_) EXPECT_LE(worst, 1) << quantity;
  }

private:
  std::map<std::string, double> worst_;
};

/// A user of the channel analysis: its plans, and the fields of its record with other names.
template <class State>
struct Subject {
  const ChannelPlan &plan;
  const ModelPlan &model;
  Word16 (State::*overlap)[kMaxOverlap];
  Word32 State::*frame_cnt;
  int frames = 0, crowded = 0;  ///< frames held, and those without headroom
  int snr_differs = 0;          ///< SNR indices off by one

  /// The engine's state in the model's units, after the frame was counted.
  ModelState model_of(const State &s) const {
    const double scale = std::ldexp(1.0, -s.prev_shift);
    const auto n = model.channels();
    ModelState state{.frame_cnt = s.*frame_cnt,
                     .last_sample = s.pre_emp_mem * scale,
                     .overlap = {s.*overlap, s.*overlap + model.overlap},
                     .energy = {s.ch_enrg, s.ch_enrg + n},
                     .noise = {s.ch_noise, s.ch_noise + n},
                     .long_term_q5 = {s.ch_enrg_long_db, s.ch_enrg_long_db + n},
                     .update_cnt = s.update_cnt,
                     .hyster_cnt = s.hyster_cnt,
                     .last_update_cnt = s.last_update_cnt};
    for (double &sample : state.overlap) sample *= scale;
    return state;
  }

  /// What the engine's analysis finds in a frame. `s` becomes the state before the noise update.
  ChannelFindings findings(State &s, const Word16 *frame) const {
    Flags flags;
    ChannelState channels = channels_of(s, s.*overlap, s.*frame_cnt);
    return analyse_frame(flags, plan, channels, frame);
  }

  struct Step {
    ChannelFindings found;
    ModelSpectrum spectrum;
    std::vector<double> noise;  ///< before its update
  };

  /// Compares one frame, from `before` to `after`, with the model.
  Step hold(Bounds &bounds, State before, const State &after, const Word16 *frame) {
    before.*frame_cnt = after.*frame_cnt;
    ModelState state = model_of(before);
    const ModelSpectrum spectrum = model_spectrum(model, state, frame);
    const ChannelFindings found = findings(before, frame);
    const ModelState engine = model_of(after);

    const double unit = std::ldexp(1.0, -spectrum.shift);
    bounds.hold("block shift", after.prev_shift - spectrum.shift, 0.5);
    bounds.hold("last sample", engine.last_sample - state.last_sample, unit);
    for (int i = 0; i < model.overlap; ++i)
      bounds.hold("overlap", engine.overlap[i] - state.overlap[i], 2 * unit);

    // Where the memory of a louder frame leaves the transform no headroom, it saturates.
    const bool clear = spectrum.peak < 16384;
    frames += 1;
    crowded += !clear;
    // Otherwise its error is in units of the normalised scale: 2 in strong channels, 6 in weak
    // ones.
    const double total = model_energies(model, state, spectrum.power);
    double total_bound = 0;
    for (std::size_t i = 0; i < model.channels(); ++i) {
      const double amplitude = std::sqrt(spectrum.power[i] / 256);
      const double bound =
          256 * unit * (4 * amplitude + 36 * unit) + std::ldexp(state.energy[i], -13) + 4;
      if (clear) bounds.hold("channel energy", engine.energy[i] - state.energy[i], bound);
      total_bound += bound;
    }
    if (clear) bounds.hold("energy before the floor", found.unclamped_energy - total, total_bound);

    // From here on the model of each quantity starts from the engine's own inputs.
    state.energy = engine.energy;
    ModelFindings expected = model_findings(model, state);
    bounds.hold("total", found.total_energy - expected.total, 0.5);
    int metric = 0;
    for (std::size_t i = 0; i < model.channels(); ++i) {
      bounds.hold("SNR index", found.snr[i] - expected.snr[i], 1);
      snr_differs += found.snr[i] != expected.snr[i];
      metric += model_metric(found.snr[i]);
      bounds.hold("long-term level", engine.long_term_q5[i] - state.long_term_q5[i],
                  3 + 0.0125 * expected.distance_q5[i]);
    }
    bounds.hold("voice metric", found.voice_metric - metric, 0.5);
    bounds.hold("deviation", found.deviation_q5 - expected.deviation_q5, 3.0 * model.channels());

    const Step step{found, spectrum, state.noise};
    expected.metric = found.voice_metric;
    expected.deviation_q5 = found.deviation_q5;
    expected.total = found.total_energy;
    const bool is_noise = model_decision(model, state, expected);
    bounds.hold("decision", found.is_noise - is_noise, 0.5);
    bounds.hold("update count", engine.update_cnt - state.update_cnt, 0.5);
    bounds.hold("hysteresis count", engine.hyster_cnt - state.hyster_cnt, 0.5);
    bounds.hold("last update count", engine.last_update_cnt - state.last_update_cnt, 0.5);
    if (is_noise) model_track_noise(model, state);
    for (std::size_t i = 0; i < model.channels(); ++i) {
      const double bound = std::ldexp(state.noise[i] + state.energy[i], -13) + 2;
      bounds.hold("noise energy", engine.noise[i] - state.noise[i], bound);
    }
    return step;
  }

  /// To be called after a recording: exceptions must be rare.
  void expect_rare_exceptions() const {
    EXPECT_GT(frames, 300);
    EXPECT_LT(crowded, frames / 50);
    EXPECT_LT(snr_differs, frames * static_cast<int>(model.channels()) / 50);
  }
};

}  // namespace orvalis::test
