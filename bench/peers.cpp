// What a frame of 10 ms costs beside Debian's WebRTC audio processing and SpeexDSP: the same
// recordings, in the same run, everything through the libraries' public interfaces.
#include <speex/speex_preprocess.h>
#include <webrtc/modules/audio_processing/include/audio_processing.h>
#include <webrtc/modules/interface/module_common_types.h>

#include <cstdio>
#include <cstdlib>
#include <initializer_list>
#include <utility>

#include "bench/machine.h"
#include "bench/slots.h"

namespace orvalis::bench {
namespace {

void require(bool done, const char *what) {
  if (done) return;
  std::fprintf(stderr, "%s failed\n", what);
  std::exit(1);
}

struct WebRtcParts {
  bool suppression = false;
  bool detection = false;
  bool gain = false;
};

/// WebRTC with one microphone, a 16-bit frame at a time.
class WebRtc : public Service {
public:
  WebRtc(int rate_hz, WebRtcParts parts) : rate_hz_(rate_hz), parts_(parts) {}
  void start() override {
    webrtc::Config config;
    // The manager of an analogue gain, which would run beside the fixed one.
    config.Set<webrtc::ExperimentalAgc>(new webrtc::ExperimentalAgc(false));
    processing_.reset(webrtc::AudioProcessing::Create(config));
    const int failures =
        processing_->noise_suppression()->set_level(webrtc::NoiseSuppression::kHigh) +
        processing_->noise_suppression()->Enable(parts_.suppression) +
        processing_->voice_detection()->Enable(parts_.detection) +
        processing_->gain_control()->set_mode(webrtc::GainControl::kFixedDigital) +
        processing_->gain_control()->Enable(parts_.gain);
    require(failures == 0, "setting up WebRTC");
  }
  void process(const std::int16_t *frame) override {
    frame_.UpdateFrame(0, 0, frame, rate_hz_ / 100, rate_hz_, webrtc::AudioFrame::kNormalSpeech,
                       webrtc::AudioFrame::kVadUnknown);
    require(processing_->ProcessStream(&frame_) == 0, "WebRTC");
  }

private:
  int rate_hz_;
  WebRtcParts parts_;
  std::unique_ptr<webrtc::AudioProcessing> processing_;
  webrtc::AudioFrame frame_;
};

/// WebRTC's beamformer for two microphones at a distance of 5 cm; it takes floats.
class WebRtcBeamformer : public Service {
public:
  void start() override {
    webrtc::Config config;
    config.Set<webrtc::Beamforming>(
        new webrtc::Beamforming(true, {{-0.025F, 0, 0}, {0.025F, 0, 0}}));
    processing_.reset(webrtc::AudioProcessing::Create(config));
  }
  void process(const std::int16_t *pairs) override {
    for (int i = 0; i < 2 * kSamples; ++i)
      channels_[i % 2][i / 2] = static_cast<float>(pairs[i]) / 32768;
    const float *in[] = {channels_[0], channels_[1]};
    float *out[] = {channels_[0]};
    require(processing_->ProcessStream(in, {16000, 2}, {16000, 1}, out) == 0,
            "WebRTC's beamformer");
  }

private:
  static constexpr int kSamples = 160;
  std::unique_ptr<webrtc::AudioProcessing> processing_;
  float channels_[2][kSamples] = {};
};

struct SpeexParts {
  bool gain = false;
  bool detection = false;
};

/// Speex's preprocessor, which always suppresses noise here, with a state for each microphone.
template <int kMicrophones>
class Speex : public Service {
public:
  explicit Speex(SpeexParts parts) : parts_(parts) {}
  ~Speex() override { stop(); }
  void start() override {
    stop();
    for (SpeexPreprocessState *&state : states_) {
      state = speex_preprocess_state_init(kSamples, 16000);
      for (auto [part, wanted] : {std::pair{SPEEX_PREPROCESS_SET_DENOISE, true},
                                  {SPEEX_PREPROCESS_SET_AGC, parts_.gain},
                                  {SPEEX_PREPROCESS_SET_VAD, parts_.detection}}) {
        int on = 1;  // all but suppression are off at first
        require(!wanted || speex_preprocess_ctl(state, part, &on) == 0, "setting up Speex");
      }
    }
  }
  void process(const std::int16_t *frame) override {
    for (int microphone = 0; microphone < kMicrophones; ++microphone) {
      for (int i = 0; i < kSamples; ++i) frame_[i] = frame[i * kMicrophones + microphone];
      speex_preprocess_run(states_[microphone], frame_);
    }
  }

private:
  void stop() {
    for (SpeexPreprocessState *state : states_)
      if (state != nullptr) speex_preprocess_state_destroy(state);
  }

  static constexpr int kSamples = 160;
  SpeexParts parts_;
  SpeexPreprocessState *states_[kMicrophones] = {};
  std::int16_t frame_[kSamples] = {};
};

struct Peer {
  const char *name;
  std::unique_ptr<Service> (*create)();
};

struct Comparison {
  const ServiceKind *service;
  std::vector<Peer> peers;
};

std::vector<Comparison> comparisons() {
  constexpr WebRtcParts kSuppression{.suppression = true};
  constexpr WebRtcParts kDetection{.detection = true};
  constexpr WebRtcParts kSuppressionAndDetection{.suppression = true, .detection = true};
  constexpr WebRtcParts kGain{.gain = true};
  constexpr WebRtcParts kEverything{.suppression = true, .detection = true, .gain = true};
  return {
      {&kDetection16,
       {{"WebRTC suppression + detection", create<WebRtc, 16000, kSuppressionAndDetection>}}},
      {&kDetection8, {{"WebRTC detection, 8 kHz", create<WebRtc, 8000, kDetection>}}},
      {&kOneMicrophone,
       {{"WebRTC suppression", create<WebRtc, 16000, kSuppression>},
        {"Speex suppression", create<Speex<1>, SpeexParts{}>}}},
      {&kDynamicsControl, {{"WebRTC fixed gain control", create<WebRtc, 16000, kGain>}}},
      {&kAllInARow,
       {{"Speex suppression, gain, detection",
         create<Speex<1>, SpeexParts{.gain = true, .detection = true}>},
        {"WebRTC suppression, gain, detection", create<WebRtc, 16000, kEverything>}}},
      {&kTwoMicrophones,
       {{"two Speex suppressions", create<Speex<2>, SpeexParts{}>},
        {"WebRTC beamformer", create<WebRtcBeamformer>}}},
      {&kMcraDetection, {}},
  };
}

void print_table() {
  const std::vector<Comparison> all = comparisons();
  std::vector<Row> rows;
  for (const auto &[service, peers] : all) {
    rows.push_back({service->create(), speech_for(*service)});
    for (const Peer &peer : peers) rows.push_back({peer.create(), speech_for(*service)});
  }
  run_in_slots(rows);
  std::printf("%s\n\n%-38s %8s   %s\n", machine().c_str(), "frame of 10 ms", "ns",
              "Orvalis / peer (middle half of the slots)");
  auto row = rows.begin();
  for (const Comparison &comparison : all) {
    const Row &own = *row++;
    std::printf("%-38s %8.0f\n", comparison.service->name, spread(own.slots).median);
    for (const Peer &peer : comparison.peers) {
      const auto [low, median, high] = ratio(own, *row);
      std::printf("  %-36s %8.0f   %5.3f (%.3f to %.3f)\n", peer.name, spread(row++->slots).median,
                  median, low, high);
    }
  }
}

}  // namespace
}  // namespace orvalis::bench

int main() {
  SetLogSink(LogNothing, nullptr);
  orvalis::bench::print_table();
}
