#include "tests/channel/channel_model.h"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <numbers>
#include <numeric>

namespace orvalis::test {
namespace {

using std::numbers::pi;

/// "10 log10": the engine's factor is 10270 in Q10.
constexpr double kDecibels = 10270.0 / 1024;

double clip16(double x) { return std::clamp(x, -32768.0, 32767.0); }

/// Left shift that leaves two spare bits above the largest magnitude; -2 for silence.
int block_shift(const std::int16_t *frame, int samples) {
  int peak = 0;
  for (int i = 0; i < samples; ++i) peak = std::max(peak, std::abs(int{frame[i]}));
  return peak == 0 ? -2 : 14 - std::ilogb(std::min(peak, 32767)) - 2;
}

/// e^(-2 pi i k / size) for all k.
std::vector<std::complex<double>> phases(int size) {
  std::vector<std::complex<double>> table;
  for (int k = 0; k < size; ++k) table.push_back(std::polar(1.0, -2 * pi * k / size));
  return table;
}

/// In steps of 3/8 dB.
int snr_index(double energy, double noise) {
  // The engine keeps four fractional bits of the ratio.
  const double ratio = std::max(std::floor(16 * energy / noise), 1.0) / 16;
  const double decibels = std::max(kDecibels * std::log10(ratio), 0.0);
  return static_cast<int>(std::floor(decibels / 0.375 + 0.5));
}

/// Weight of the past in the long-term levels.
double long_term_alpha(const ModelPlan &plan, double total) {
  const double below_q10 = 32 * (plan.alpha_high_level_q5 - model_level_q5(total));
  const double alpha_q10 = 1023 - 803.0 / 32768 * clip16(below_q10);
  if (alpha_q10 >= 1024) return 0.99;
  return alpha_q10 <= 510 ? 0.5 : alpha_q10 / 1024;
}

}  // namespace

// Frame, overlap, size; energy floor, initial noise frames; saturate_then_smooth; level of the
// maximum alpha; metric, energy and deviation of the decision; remember_reset.
const ModelPlan kWideModel = {
    {{0, 1},   {2, 3},   {4, 5},   {6, 7},   {8, 9},   {10, 11},  {12, 13},
     {14, 16}, {17, 19}, {20, 22}, {23, 26}, {27, 30}, {31, 35},  {36, 41},
     {42, 48}, {49, 55}, {56, 63}, {64, 73}, {74, 85}, {86, 109}, {110, 127}},
    160,
    48,
    256,
    12,
    10,
    false,
    1638,
    68,
    252,
    2000,
    false};

const ModelPlan kNarrowModel = {{{2, 3},
                                 {4, 5},
                                 {6, 7},
                                 {8, 9},
                                 {10, 11},
                                 {12, 13},
                                 {14, 16},
                                 {17, 19},
                                 {20, 22},
                                 {23, 26},
                                 {27, 30},
                                 {31, 35},
                                 {36, 41},
                                 {42, 48},
                                 {49, 55},
                                 {56, 63}},
                                80,
                                24,
                                128,
                                16,
                                10,
                                false,
                                1600,
                                45,
                                256,
                                896,
                                false};

const ModelPlan kSuppressorModel = {
    {{0, 1},   {2, 3},   {4, 5},   {6, 7},   {8, 10},   {11, 13},  {14, 16},
     {17, 19}, {20, 22}, {23, 26}, {27, 30}, {31, 34},  {35, 39},  {40, 45},
     {46, 52}, {53, 61}, {62, 72}, {73, 87}, {88, 104}, {105, 125}},
    160,
    48,
    256,
    16,
    4,
    true,
    1920,
    42,
    320,
    896,
    true};

double ModelPlan::width(std::size_t channel) const {
  const int count = bins[channel][1] - bins[channel][0] + 1;
  return count == 24 ? 14 : count;  // the detector weighs its widest channel but one up
}

ModelSpectrum model_spectrum(const ModelPlan &plan, ModelState &state, const std::int16_t *frame) {
  ModelSpectrum spectrum{
      .shift = block_shift(frame, plan.frame), .peak = 0, .bins = {}, .power = {}};
  const double scale = std::ldexp(1.0, spectrum.shift);
  // The memories of a louder frame may saturate in the scale of a quieter one.
  const auto rescaled = [scale](double x) { return clip16(x * scale) / scale; };

  std::vector<double> samples(plan.size);
  std::ranges::transform(state.overlap, samples.begin(), rescaled);
  double previous = rescaled(state.last_sample);
  for (int i = 0; i < plan.frame; ++i) {
    samples[plan.overlap + i] = rescaled(frame[i] - 0.8 * previous);
    previous = frame[i];
  }
  state.last_sample = previous;
  std::copy_n(&samples[plan.frame], plan.overlap, state.overlap.begin());
  for (int i = 0; i < plan.overlap; ++i) {
    const double edge = std::pow(std::sin(pi * (i + 0.5) / (2 * plan.overlap)), 2);
    samples[i] *= edge;
    samples[plan.overlap + plan.frame - 1 - i] *= edge;
  }

  for (int i = 0; i < plan.size; i += 2)
    spectrum.peak = std::max(spectrum.peak, scale * std::hypot(samples[i], samples[i + 1]));

  const auto phase = phases(plan.size);
  const auto bin = [&](int k) {
    std::complex<double> sum = 0;
    for (int n = 0; n < plan.size; ++n) sum += samples[n] * phase[k * n % plan.size];
    return sum / (plan.size / 2.0);
  };
  spectrum.bins.emplace_back(bin(0).real(), bin(plan.size / 2).real());
  for (int k = 1; k < plan.size / 2; ++k) spectrum.bins.push_back(bin(k));
  for (std::size_t i = 0; i < plan.channels(); ++i) {
    double sum = 0;
    for (int k = plan.bins[i][0]; k <= plan.bins[i][1]; ++k) sum += std::norm(spectrum.bins[k]);
    spectrum.power.push_back(256 * sum / plan.width(i));
  }
  return spectrum;
}

std::vector<double> model_inverse(int size, const std::vector<std::complex<double>> &bins) {
  const auto phase = phases(size);
  std::vector<double> samples(size);
  for (int n = 0; n < size; ++n) {
    double sum = bins[0].real() + (n % 2 ? -1 : 1) * bins[0].imag();
    for (int k = 1; k < size / 2; ++k) sum += 2 * (bins[k] * std::conj(phase[k * n % size])).real();
    samples[n] = sum / 2;
  }
  return samples;
}

double model_energies(const ModelPlan &plan, ModelState &state, const std::vector<double> &power) {
  const auto full_scale = [](double x) { return std::min(x, kMaxWord32); };
  double total = 0;
  for (std::size_t i = 0; i < plan.channels(); ++i) {
    double &energy = state.energy[i];
    if (state.frame_cnt == 1) {
      energy = full_scale(power[i]);
    } else {
      const double taken =
          plan.saturate_then_smooth ? 0.55 * full_scale(power[i]) : full_scale(0.55 * power[i]);
      energy = full_scale(0.45 * energy + taken);
    }
    total += energy;
    energy = std::max(energy, plan.energy_floor);
  }
  return total;
}

int model_metric(int snr) {
  static constexpr int kTable[] = {
      2,  2,  2,  2,  2,  2,  2,  2,  2,  2,  2,  3,  3,  3,  3,  3,  4,  4,  4,  5,  5,  5,  6,
      6,  7,  7,  7,  8,  8,  9,  9,  10, 10, 11, 12, 12, 13, 13, 14, 15, 15, 16, 17, 17, 18, 19,
      20, 20, 21, 22, 23, 24, 24, 25, 26, 27, 28, 28, 29, 30, 31, 32, 33, 34, 35, 36, 37, 37, 38,
      39, 40, 41, 42, 43, 44, 45, 46, 47, 48, 49, 50, 50, 50, 50, 50, 50, 50, 50, 50, 50};
  return kTable[std::min(snr, 89)];
}

double model_level_q5(double energy) { return 32 * kDecibels * std::log10(energy / 256); }

ModelFindings model_findings(const ModelPlan &plan, ModelState &state) {
  ModelFindings found;
  found.total =
      std::min(std::accumulate(state.energy.begin(), state.energy.end(), 0.0), kMaxWord32);
  const double share = long_term_alpha(plan, found.total);
  for (std::size_t i = 0; i < plan.channels(); ++i) {
    if (state.frame_cnt <= plan.initial_noise_frames)
      state.noise[i] = std::max(state.energy[i], 4096.0);
    found.snr.push_back(snr_index(state.energy[i], state.noise[i]));
    found.metric += model_metric(found.snr[i]);
    const double level = model_level_q5(state.energy[i]);
    double &long_term = state.long_term_q5[i];
    if (state.frame_cnt == 1) long_term = level;
    found.distance_q5.push_back(std::abs(long_term - level));
    found.deviation_q5 += found.distance_q5[i];
    long_term = share * long_term + (1 - share) * level;
  }
  return found;
}

bool model_decision(const ModelPlan &plan, ModelState &state, const ModelFindings &found) {
  constexpr int kMaxCount = 32767;
  const auto count = [=](int &counter) { counter = std::min(counter + 1, kMaxCount); };
  bool is_noise = false;
  if (found.metric <= plan.metric_noise) {
    is_noise = true;
    state.update_cnt = 0;
  } else if (found.total > plan.silent_energy && found.deviation_q5 < plan.deviation_voice) {
    count(state.update_cnt);
    is_noise = state.update_cnt > 49;
  }
  const int before_reset = state.update_cnt;
  if (state.update_cnt != state.last_update_cnt) {
    state.hyster_cnt = 0;
  } else {
    count(state.hyster_cnt);
    if (state.hyster_cnt > 6) state.update_cnt = 0;
  }
  state.last_update_cnt = plan.remember_reset ? state.update_cnt : before_reset;
  return is_noise;
}

void model_track_noise(const ModelPlan &plan, ModelState &state) {
  for (std::size_t i = 0; i < plan.channels(); ++i)
    state.noise[i] = std::max(0.9 * state.noise[i] + 0.1 * state.energy[i], plan.energy_floor);
}

}  // namespace orvalis::test
