// The channel analysis of the voice detector and the suppressor in double precision, without the
// engine's rounding. It shares no table and no function with the engine on purpose. It saturates or
// truncates only where the engine does so by design.
#pragma once

#include <array>
#include <complex>
#include <cstdint>
#include <vector>

namespace orvalis::test {

inline constexpr double kMaxWord32 = 2147483647.0;

/// Sizes, channels and thresholds of one user of the analysis.
struct ModelPlan {
  std::vector<std::array<int, 2>> bins;  ///< first and last bin of each channel
  int frame;
  int overlap;
  int size;  ///< samples of the transform
  double energy_floor;
  int initial_noise_frames;
  bool saturate_then_smooth;  ///< full scale limits the frame's energy before the product with 0.55
  double alpha_high_level_q5;
  int metric_noise;        ///< noise up to this voice metric
  double silent_energy;    ///< undecided up to this total energy
  double deviation_voice;  ///< voice from this deviation on
  bool remember_reset;

  std::size_t channels() const { return bins.size(); }
  /// Number of bins that a channel's power is divided by.
  double width(std::size_t channel) const;
};

extern const ModelPlan kWideModel;
extern const ModelPlan kNarrowModel;
extern const ModelPlan kSuppressorModel;

/// State between frames. Samples are in units of the input, whatever the block shift.
struct ModelState {
  int frame_cnt = 0;
  double last_sample = 0;
  std::vector<double> overlap;
  std::vector<double> energy, noise, long_term_q5;
  int update_cnt = 0, hyster_cnt = 0, last_update_cnt = 0;
};

/// One windowed frame and its spectrum, divided by half the transform size.
struct ModelSpectrum {
  int shift;                               ///< block normalisation, as the engine chooses it
  double peak;                             ///< largest pair of samples in that normalisation
  std::vector<std::complex<double>> bins;  ///< bin 0: real part at 0, imaginary part at Nyquist
  std::vector<double> power;               ///< of each channel, in units of an energy
};

/// What the analysis finds before it decides.
struct ModelFindings {
  std::vector<int> snr;  ///< in steps of 3/8 dB
  int metric = 0;
  std::vector<double> distance_q5;  ///< distance of each channel's level from its long-term level
  double deviation_q5 = 0;          ///< the sum of these
  double total = 0;
};

/// Window, transform and channel powers; moves the overlap and the last sample.
ModelSpectrum model_spectrum(const ModelPlan &plan, ModelState &state, const std::int16_t *frame);

/// The inverse of the transform, without a window: `size` samples.
std::vector<double> model_inverse(int size, const std::vector<std::complex<double>> &bins);

/// Smooths the channel energies; returns their sum before the floor.
double model_energies(const ModelPlan &plan, ModelState &state, const std::vector<double> &power);

/// Sets the noise in the first frames, compares energies with it, updates the long-term levels.
ModelFindings model_findings(const ModelPlan &plan, ModelState &state);

int model_metric(int snr);             ///< contribution of one channel to the voice metric
double model_level_q5(double energy);  ///< dB relative to 256

/// The noise update decision; updates the counters.
bool model_decision(const ModelPlan &plan, ModelState &state, const ModelFindings &found);

void model_track_noise(const ModelPlan &plan, ModelState &state);

}  // namespace orvalis::test
