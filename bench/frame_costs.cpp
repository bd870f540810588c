#include "bench/frame_costs.h"

#include <benchmark/benchmark.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <memory>
#include <vector>

#include "Voice_Engine/MCRAvad/MCRAvad.h"
#include "Voice_Engine/MCRAvad/Math_baseop.h"
#include "Voice_Engine/MCRAvad/noscale_fft_512p.h"
#include "Voice_Engine/drc/dynamics_control.h"
#include "Voice_Engine/epd/epd_instance.h"
#include "Voice_Engine/epd/fixed_fft.h"
#include "Voice_Engine/ns/float_fft.h"
#include "Voice_Engine/ns/s2chns.h"
#include "bench/table.h"
#include "jni/orvalis.h"
#include "tests/support/recordings.h"

namespace orvalis::bench {
namespace {

using test::Pcm;

/// Whole frames of speech, one rate.
struct Speech {
  Pcm pcm;
  int frame_samples;

  std::size_t frames() const { return pcm.size() / static_cast<std::size_t>(frame_samples); }
  const Word16 *frame(std::size_t number) const {
    return &pcm[number * static_cast<std::size_t>(frame_samples)];
  }
};

Speech wide_speech() {
  Speech speech{{}, 160};
  for (const char *name : test::kSentences) {
    const Pcm sentence = test::speech_16k(name);
    speech.pcm.insert(speech.pcm.end(), sentence.begin(), sentence.end());
  }
  return speech;
}

Speech narrow_speech() {
  Speech speech{test::speech_8k("raw/hts1a.raw"), 80};
  const Pcm more = test::speech_8k("wav/vk5qi.wav");
  speech.pcm.insert(speech.pcm.end(), more.begin(), more.end());
  return speech;
}

// Each subject has start(), which makes it as new, and process() for a frame.

class Detection {
public:
  static constexpr std::size_t kBytes = sizeof(EpdInstance);

  explicit Detection(Word32 mode) : mode_(mode) {}
  Detection(const Detection &other) : mode_(other.mode_) {}
  ~Detection() { FreeMemoryEPD(epd_); }
  Detection &operator=(const Detection &) = delete;

  void start() {
    FreeMemoryEPD(epd_);
    epd_ = InitializeEPD(mode_, 0);
  }
  void process(const Word16 *frame, int samples) {
    benchmark::DoNotOptimize(ProcessEPDFrame(epd_, frame, samples));
  }

private:
  Word32 mode_;
  EpdInstance *epd_ = nullptr;
};

class Suppression {
public:
  static constexpr std::size_t kBytes = sizeof(S1chnsState);

  void start() {
    state_ = {};
    S1CHNSInit(&state_, 2);
  }
  void process(const Word16 *frame, int samples) {
    Flags flags;
    std::copy_n(frame, samples, buffer_);
    s1chns_C(flags, &state_, buffer_, buffer_);
    benchmark::DoNotOptimize(buffer_);
  }

private:
  S1chnsState state_{};
  Word16 buffer_[kMaxFrameSamples] = {};
};

class VoiceDetection {
public:
  static constexpr std::size_t kBytes = sizeof(VelmoraVadState);

  explicit VoiceDetection(Word32 band) : band_(band) {}

  void start() {
    state_ = {};
    VelmoraVadState *state = &state_;
    VelmoraVADInit(&state, band_);
  }
  void process(const Word16 *frame, int /*samples*/) {
    Flags flags;
    VelmoraVadState *state = &state_;
    EpdReasons reasons;
    benchmark::DoNotOptimize(VelmoraVAD(flags, &state, frame, band_, reasons));
  }

private:
  Word32 band_;
  VelmoraVadState state_{};
};

class McraDetection {
public:
  static constexpr std::size_t kBytes = sizeof(VADINFO);

  void start() {
    VADINFO *record = record_.get();
    *record = {};
    initialVADINFO(&record);
  }
  void process(const Word16 *frame, int samples) {
    VADINFO *record = record_.get();
    std::copy_n(frame, samples, buffer_);
    benchmark::DoNotOptimize(processVAD(&record, buffer_, samples, 0.84F));
  }

private:
  std::shared_ptr<VADINFO> record_ = std::make_shared<VADINFO>();
  Word16 buffer_[MCRA_FRAME_SAMPLES] = {};
};

/// Two microphones: the second receives the speech three samples later, and noise of its own.
class TwoMicrophones {
public:
  static constexpr std::size_t kBytes = sizeof(S2chnsState);

  void start() { S2CHNSInit(*state_); }
  void process(const Word16 *frame, int samples) {
    for (int i = 0; i < samples; ++i) {
      pairs_[2 * i] = frame[i];
      pairs_[2 * i + 1] = static_cast<Word16>(frame[std::max(0, i - 3)] / 2 + (i * 7919 % 41 - 20));
    }
    S2CHNSProcessNSFrame(*state_, pairs_, pairs_, kHop);
    benchmark::DoNotOptimize(pairs_);
  }

private:
  std::shared_ptr<S2chnsState> state_ = std::make_shared<S2chnsState>();
  Word16 pairs_[2 * kHop] = {};
};

class Leveling {
public:
  static constexpr std::size_t kBytes = sizeof(DrcInstance);

  void start() { drc_.reset(create_drc(16000, 0), freeMemory_DRC); }
  void process(const Word16 *frame, int samples) {
    std::copy_n(frame, samples, buffer_);
    benchmark::DoNotOptimize(process_drc(drc_.get(), buffer_, samples));
  }

private:
  std::shared_ptr<DrcInstance> drc_;
  Word16 buffer_[kMaxFrameSamples] = {};
};

/// `Transform` runs in place over a frame followed by zeros.
template <class Transform, class Sample = Word16, std::size_t kSize = kMaxTransformSize>
class Transformation {
public:
  static constexpr std::size_t kBytes = 0;

  explicit Transformation(Transform transform) : transform_(transform) {}

  void start() {}
  void process(const Word16 *frame, int samples) {
    std::fill(std::copy_n(frame, samples, buffer_), std::end(buffer_), Sample{0});
    transform_(buffer_);
    benchmark::DoNotOptimize(buffer_);
  }

private:
  Transform transform_;
  Sample buffer_[kSize] = {};
};

/// `function` of as many samples as a spectrum has bins.
template <class Function>
auto of_every_bin(Function function) {
  return [function](const Word16 *x) {
    for (int bin = 0; bin < 128; ++bin) benchmark::DoNotOptimize(function(x[bin]));
  };
}

template <int kPoints, class FrameSpectrum>
auto spectrum_by(FrameSpectrum frame_spectrum) {
  return [frame_spectrum](const Word16 *x) {
    Word32 re[kPoints];
    Word32 im[kPoints];
    frame_spectrum(x, 160, re, im);
    benchmark::DoNotOptimize(re);
    benchmark::DoNotOptimize(im);
  };
}

/// The slowest frame by the median of several passes, which leaves interruptions out.
template <class Subject>
double worst_frame_ns(Subject &subject, const Speech &speech) {
  using Clock = std::chrono::steady_clock;
  constexpr std::size_t kPasses = 9;
  std::vector<std::array<Clock::duration, kPasses>> times(speech.frames());
  for (std::size_t pass = 0; pass < kPasses; ++pass) {
    subject.start();
    for (std::size_t i = 0; i < speech.frames(); ++i) {
      const Clock::time_point before = Clock::now();
      subject.process(speech.frame(i), speech.frame_samples);
      times[i][pass] = Clock::now() - before;
    }
  }
  Clock::duration worst{};
  for (auto &passes : times) {
    std::ranges::nth_element(passes, passes.begin() + kPasses / 2);
    worst = std::max(worst, passes[kPasses / 2]);
  }
  return std::chrono::duration<double, std::nano>(worst).count();
}

template <class Subject>
void measure(const char *name, const Speech &speech, Subject subject) {
  benchmark::RegisterBenchmark(name,
                               [subject, &speech](benchmark::State &state) mutable {
                                 state.counters[kFrames] = static_cast<double>(speech.frames());
                                 state.counters[kInstanceBytes] =
                                     static_cast<double>(Subject::kBytes);
                                 state.counters[kWorstFrame] = worst_frame_ns(subject, speech);
                                 for (auto _ : state) {
                                   subject.start();
                                   for (std::size_t i = 0; i < speech.frames(); ++i)
                                     subject.process(speech.frame(i), speech.frame_samples);
                                 }
                               })
      ->Repetitions(9)
      ->MinTime(0.2);
}

}  // namespace

void register_frame_costs() {
  static const Speech wide = wide_speech();
  static const Speech narrow = narrow_speech();
  measure("ProcessEPDFrame, 16 kHz", wide, Detection(0));
  measure("ProcessEPDFrame, 8 kHz", narrow, Detection(1000));
  measure("s1chns_C", wide, Suppression());
  measure("S2CHNSProcessNSFrame", wide, TwoMicrophones());
  measure("process_drc", wide, Leveling());
  measure("VelmoraVAD, 16 kHz", wide, VoiceDetection(0));
  measure("VelmoraVAD, 8 kHz", narrow, VoiceDetection(1));
  measure("processVAD", wide, McraDetection());
  measure("c_fft_epd, band 0", wide, Transformation([](Word16 *x) { c_fft_epd(x, 1, 0); }));
  measure("c_fft_epd, band 1", narrow, Transformation([](Word16 *x) { c_fft_epd(x, 1, 1); }));
  measure("r_fft_epd, band 0", wide, Transformation([](Word16 *x) { r_fft_epd(x, 1, 0); }));
  measure("r_fft_epd, band 1", narrow, Transformation([](Word16 *x) { r_fft_epd(x, 1, 1); }));
  measure("c_fft_ns", wide, Transformation([](Word16 *x) { c_fft_ns(x, 1); }));
  measure("r_fft_ns", wide, Transformation([](Word16 *x) { r_fft_ns(x, 1); }));
  const auto float_fft = [](float *x) { r_fft(x, 1); };
  measure("r_fft", wide, Transformation<decltype(float_fft), float, 512>(float_fft));
  measure("Noscale_FFT, 256 points", wide,
          Transformation(spectrum_by<256>(Noscale_FFT_256p_Frame_64bit)));
  measure("Noscale_FFT, 512 points", wide,
          Transformation(spectrum_by<512>(Noscale_FFT_512p_Frame)));
  measure("ZOLT_L_log, 128 times", wide,
          Transformation(of_every_bin([](Word16 x) { return ZOLT_L_log(x & 0xFFFF); })));
  measure("ZOLT_L_exp, 128 times", wide,
          Transformation(of_every_bin([](Word16 x) { return ZOLT_L_exp(-0x8000 * x); })));
  measure("ZOLT_L64_div, 128 times", wide, Transformation(of_every_bin([](Word16 x) {
            return ZOLT_L64_div(int64_t{x} << 40, 0x12345678);
          })));
  measure("ZOLT_expintFix, 128 times", wide, Transformation(of_every_bin(ZOLT_expintFix)));
}

}  // namespace orvalis::bench
