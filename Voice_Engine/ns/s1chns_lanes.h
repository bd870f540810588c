// The single-channel suppressor in lanes. What it does: s1chns.h.
//
// Of all its flags only the last one stays, that of the last de-emphasis.
#pragma once

#include <algorithm>

#include "Voice_Engine/channel/channel_analysis_lanes.h"
#include "Voice_Engine/channel/channel_plans.h"
#include "Voice_Engine/ns/s1chns.h"

namespace orvalis::ORVALIS_BODY {

/// IS-127's SNR modification: lowers the SNR indices of a frame in which few channels hold speech,
/// so that single channels do not sound as musical noise.
inline void modify_snr(Word16 *snr, Word16 voice_metric) {
  constexpr Word16 kIndexThreshold = 12;
  constexpr int kIndexCountThreshold = 5;
  constexpr Word16 kMetricThreshold = 56;
  constexpr Word16 kSetbackThreshold = 13;
  const auto index_count = std::count_if(snr, snr + kSuppressionChannels,
                                         [](Word16 index) { return index >= kIndexThreshold; });
  if (index_count >= kIndexCountThreshold) return;
  for (int i = 0; i < kSuppressionChannels; ++i) {
    if (voice_metric < kMetricThreshold || snr[i] < kSetbackThreshold) snr[i] = 1;
  }
}

/// Gain of a channel in Q15: the overall gain in dB, Q21, and 0.454 dB for each step of the SNR
/// index above 6, at most 0 dB.
inline Words channel_gain(Words snr, Words base_q21, Word16 slope_q15) {
  constexpr Word32 kMinSnr = 6;
  constexpr Word32 kGainPerStep = 14879;  // 0.454 in Q15; times 2 and shifted by 5 it is Q21
  const Words steps = larger(snr, broadcast_words(kMinSnr)) - kMinSnr;
  const Words gain_q21 = smaller(steps * (2 * kGainPerStep * 32) + base_q21, Words{});
  const Words exponent_q26 = L_mpy_ls(gain_q21, broadcast_words(slope_q15)) * 32;
  return fnExp10(smaller(exponent_q26, broadcast_words(-1))) >> 16;  // fnExp10(0) is one half
}

/// The gains of all bins. The overall gain is the reciprocal of the noise, but not below the
/// floor.
template <class L>
inline void compute_gains(S1chnsState &ns, ChannelFindings &found) {
  Flags unseen;
  const Word32 noise = sum_energies(unseen, ns.ch_noise, kSuppressionChannels);
  const Word32 noise_level = orvalis::L_negate(log10_energy(unseen, noise));
  const Word32 base_q21 =
      std::max(orvalis::L_mpy_ls(unseen, noise_level, kDecibels), ns.min_gain_q21);
  modify_snr(found.snr, found.voice_metric);
  PerChannel gain;
  for (int i = 0; i < kSuppressionChannels; ++i) gain.of[i] = found.snr[i];
  for (int i = 0; i < kSuppressionChannels; i += kWords)
    gain.store(i, channel_gain(gain.load(i), broadcast_words(base_q21), ns.gain_slope_q15));

  // Whole vectors: each channel overwrites what the one before wrote beyond its own bins.
  alignas(64) Word16 of_bin[kMaxTransformSize / 2 + L::kWidth];
  for (int i = 0; i < kSuppressionChannels; ++i) {
    const V<L> of_channel = L::broadcast(static_cast<Word16>(gain.of[i]));
    for (int k = kSuppression.bins[i].first; k <= kSuppression.bins[i].last; k += L::kWidth)
      L::store(of_bin + k, of_channel);
  }
  constexpr int kUnused = 126;  // bins from here on belong to no channel
  std::copy_n(of_bin, kUnused, ns.bin_gain_q15);
}

template <class L>
inline void apply_gains(const Word16 *gain_q15, SplitBuffer &spectrum) {
  for (int k = 0; k < kMaxTransformSize / 2; k += L::kWidth) {
    const V<L> gain = L::load(gain_q15 + k);
    L::store(spectrum.re + k, L::mult(L::load(spectrum.re + k), gain));
    L::store(spectrum.im + k, L::mult(L::load(spectrum.im + k), gain));
  }
}

/// Transforms a spectrum back to samples and undoes its block shift.
template <class L>
inline void synthesise(SplitBuffer &x, Word16 shift, Word16 *samples) {
  // The inverse transform adds up without scaling; impulses may saturate even so.
  constexpr Word16 kHeadroom = 4;
  constexpr int kBins = kMaxTransformSize / 2;
  const Word16 largest =
      std::max(largest_magnitude<L>(x.re, kBins), largest_magnitude<L>(x.im, kBins));
  const auto spectrum_shift = static_cast<Word16>(orvalis::norm_s(largest) - kHeadroom);
  for (Word16 *part : {x.re, x.im}) {
    for (int k = 0; k < kBins; k += L::kWidth)
      L::store(part + k, normalise<L>(L::load(part + k), spectrum_shift));
  }
  Flags unseen;
  real_transform<L, kBins, Direction::kInverse>(unseen, *kSuppression.transform, x);
  for (Word16 *part : {x.re, x.im}) {
    for (int k = 0; k < kBins; k += L::kWidth)
      L::store(part + k, shift_magnitude<L>(L::load(part + k), -(shift + spectrum_shift)));
  }
  interleave<L>(x, kMaxTransformSize, samples);
}

template <class L>
inline void overlap_add(Word16 *samples, Word16 *tail) {
  constexpr int kOverlap = 96;
  for (int i = 0; i < kOverlap; i += L::kWidth) {
    L::store(samples + i, L::add(L::load(samples + i), L::load(tail + i)));
    L::store(tail + i, L::load(samples + kMaxFrameSamples + i));
  }
}

/// Undoes the pre-emphasis. The first product truncates, the others round. Returns whether the last
/// sum saturated.
inline bool de_emphasise(const Word16 *x, Word16 &memory, Word16 *out) {
  constexpr Word16 kDeEmphasis = 26214;  // 0.8 in Q15
  constexpr int kLast = kMaxFrameSamples - 1;
  Flags flags;
  out[0] = orvalis::add(flags, x[0], orvalis::mult(flags, kDeEmphasis, memory));
  // Each sample waits for the one before: what counts is how long a step takes.
  if constexpr (Lanes8::kMultipliesInOneStep) {
    const V<Lanes8> factor = Lanes8::broadcast(kDeEmphasis);
    V<Lanes8> past = Lanes8::broadcast(out[0]);
    for (int i = 1; i < kLast; ++i) {
      past = Lanes8::add(Lanes8::broadcast(x[i]), Lanes8::mult_r(past, factor));
      out[i] = Lanes8::first(past);
    }
  } else {
    Word32 past = out[0];
    for (int i = 1; i < kLast; ++i) {
      past = (kDeEmphasis * past + (x[i] * 32768 + 0x4000)) >> 15;  // one shift for both
      if (past != static_cast<Word16>(past)) [[unlikely]]
        past = past > 0 ? MAX_16 : MIN_16;
      out[i] = static_cast<Word16>(past);
    }
  }
  memory = orvalis::add(flags, x[kLast], orvalis::mult_r(flags, kDeEmphasis, out[kLast - 1]));
  out[kLast] = memory;
  return flags.overflow != 0;
}

inline void s1chns_C(Flags &flags, S1chnsState *state, Word16 *in, Word16 *out) {
  S1chnsState &ns = *state;
  const ChannelPlan &plan = kSuppression;
  if (ns.frame_cnt != MAX_16) ns.frame_cnt += 1;

  ChannelState channels = channels_of(ns, ns.analysis_overlap, ns.frame_cnt);
  SplitBuffer spectrum;
  Flags unseen;
  ChannelFindings found = analyse_frame_of<Wide, 256>(unseen, plan, channels, in, spectrum);
  compute_gains<Wide>(ns, found);
  apply_gains<Wide>(ns.bin_gain_q15, spectrum);
  alignas(64) Word16 samples[kMaxTransformSize];
  synthesise<Wide>(spectrum, found.shift, samples);
  overlap_add<Wide>(samples, ns.synthesis_overlap);
  flags.overflow = de_emphasise(samples, ns.de_emp_mem, out);
  if (in != out) std::copy_n(out, kMaxFrameSamples, in);
  // Nothing above depends on this, so that it fills the time in which the de-emphasis waits.
  if (found.is_noise) ORVALIS_BODY::track_noise(plan, channels);
  ns.first_frame = 0;
}

}  // namespace orvalis::ORVALIS_BODY
