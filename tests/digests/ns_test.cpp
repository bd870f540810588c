// Both noise suppressors and dynamics control, bit by bit.
#include "Voice_Engine/drc/dynamics_control.h"
#include "Voice_Engine/ns/s1chns.h"
#include "Voice_Engine/ns/s2chns.h"
#include "jni/orvalis.h"
#include "tests/support/digest.h"
#include "tests/support/noise.h"
#include "tests/support/recordings.h"

namespace orvalis::test {
namespace {

/// One digest for each whole frame that `digest_frame` is given.
template <class DigestFrame>
Digests each_frame(Pcm pcm, std::size_t frame, DigestFrame digest_frame) {
  Digests digests;
  for (std::size_t at = 0; at + frame <= pcm.size(); at += frame) {
    Digest digest;
    digest_frame(digest, &pcm[at]);
    digests.push_back(digest.value());
  }
  return digests;
}

Digests of_one_microphone(const Pcm &pcm, Word16 mode) {
  S1chnsState state{};
  NsFlags flags;
  S1CHNSInit(&state, mode);
  return each_frame(pcm, 160, [&](Digest &digest, Word16 *frame) {
    s1chns_C(flags, &state, frame, frame);
    for (int i = 0; i < 160; ++i) digest.take(frame[i]);
    digest.take(flags.overflow, flags.carry, state.ch_noise, state.bin_gain_q15);
  });
}

Digests of_dynamics_control(const Pcm &pcm) {
  DrcInstance *drc = create_drc(16000, 0);
  PlainFlags flags;
  auto digests = each_frame(pcm, 160, [&](Digest &digest, Word16 *frame) {
    digest.take(EnvBasedDynamicsControl(flags, drc, frame), flags.overflow, flags.carry,
                drc->gainEnvelope, drc->loudRing);
    for (int i = 0; i < 160; ++i) digest.take(frame[i]);
  });
  freeMemory_DRC(drc);
  return digests;
}

Digests of_two_microphones(const Pcm &pairs) {
  const auto state = std::make_unique<S2chnsState>();
  return each_frame(pairs, 2 * kHop, [&](Digest &digest, Word16 *frame) {
    process_s2chns(*state, frame, frame, kHop);
    for (int i = 0; i < 2 * kHop; ++i) digest.take(frame[i]);
    digest.take(state->overlap_tail, state->spp_prev, state->Phi_yy.re, state->Phi_yy.im,
                state->Phi_vv.re, state->Phi_vv.im);
  });
}

/// Speech that reaches the second microphone later and weaker, under noise of their own.
Pcm two_microphones(const Pcm &speech) {
  const auto noise = unit_noise(2 * speech.size(), NoiseColour::kPink, 7);
  Pcm pairs;
  for (std::size_t i = 0; i < speech.size(); ++i) {
    const double second = i < 3 ? 0 : 0.8 * speech[i - 3];
    pairs.push_back(to_sample(speech[i] + 200 * noise[2 * i]));
    pairs.push_back(to_sample(second + 200 * noise[2 * i + 1]));
  }
  return pairs;
}

TEST(Digests, OfSuppressionAndDynamicsAreTheSameEverywhere) {
  SetLogSink([](int, const char *, const char *, void *) {}, nullptr);
  ExpectedDigests file("ns.txt");
  const Pcm sentence = speech_16k(kSentences[1]);
  file.expect("one-microphone", of_one_microphone(speech_16k(kSentences[4]), 0));
  file.expect("one-microphone-strong", of_one_microphone(sentence, 2));
  file.expect("dynamics-control", of_dynamics_control(sentence));
  // The exponential alone comes from the C library; rounded to float it is the same wherever it
  // was tried.
  file.expect("two-microphones", of_two_microphones(two_microphones(sentence)));
  SetLogSink(nullptr, nullptr);
}

}  // namespace
}  // namespace orvalis::test
