// The utterance stream: any settings, cuts and order of calls. Voice is what the detector hears or,
// to reach its rarer answers with few bytes, what a script says. Linked with --wrap for the voice
// decision.
#include "stream/utterance_stream.h"

#include <algorithm>
#include <cstring>
#include <type_traits>

#include "Voice_Engine/epd/velmora_vad.h"
#include "fuzz/input.h"
#include "jni/orvalis.h"

namespace {

using orvalis::fuzz::Input;
using orvalis::fuzz::require;
using Samples = std::vector<std::int16_t>;

constexpr std::size_t kMostSamples = 24000;  // enough to fill the queue

/// Whether each judged frame is voiced, over and over; empty leaves it to the detector.
std::vector<bool> script;
std::size_t script_at = 0;

}  // namespace

#define ORVALIS_DETECTOR(prefix) \
  prefix##_ZN7orvalis17processVelmoraVADERNS_5FlagsEPPNS_15VelmoraVadStateEPKsPKfi

extern "C" std::int32_t ORVALIS_DETECTOR(__real_)(orvalis::Flags &, orvalis::VelmoraVadState **,
                                                  const std::int16_t *, const float *,
                                                  std::int32_t);

extern "C" std::int32_t ORVALIS_DETECTOR(__wrap_)(orvalis::Flags &flags,
                                                  orvalis::VelmoraVadState **state,
                                                  const std::int16_t *frame, const float *score,
                                                  std::int32_t band) {
  if (script.empty()) return ORVALIS_DETECTOR(__real_)(flags, state, frame, score, band);
  (*state)->vad_flag = script[script_at++ % script.size()];
  return (*state)->vad_flag;
}

namespace {

/// Runs of unvoiced and voiced frames, in turn.
std::vector<bool> read_script(Input &input) {
  std::vector<bool> voiced;
  for (int runs = input.byte() % 32, run = 0; run < runs; ++run)
    voiced.insert(voiced.end(), input.byte() % 64U, run % 2 != 0);
  return voiced;
}

/// A stream with the utterances taken from it so far, each judged as it comes.
class Listener {
public:
  explicit Listener(const UtteranceSettings &settings)
      : frame_samples_(settings.rate_hz / 100), stream_(OpenUtteranceStream(&settings)) {
    require(stream_ != nullptr, "valid settings open a stream");
    script_at = 0;
  }
  ~Listener() { require(CloseUtteranceStream(stream_) == 0, "a stream is released"); }
  Listener(const Listener &) = delete;
  Listener &operator=(const Listener &) = delete;

  const std::vector<Utterance> &found() const { return found_; }

  bool take() {
    const std::int64_t earliest = EarliestUtteranceStart(stream_);
    require(earliest >= earliest_start_, "the earliest start never goes back");
    earliest_start_ = earliest;
    Utterance next;
    const std::int32_t taken = NextUtterance(stream_, &next);
    require(taken == 0 || taken == 1, "taking answers 0 or 1");
    if (taken == 1) {
      check(next);
      found_.push_back(next);
    }
    return taken == 1;
  }

  void take_all() {
    while (take()) {
    }
  }

  void push(const Samples &audio) {
    for (std::size_t done = 0;;) {
      const Samples rest(audio.begin() + static_cast<std::ptrdiff_t>(done), audio.end());
      const auto offered = static_cast<std::int32_t>(rest.size());
      const std::int32_t taken = PushUtteranceAudio(stream_, rest.data(), offered);
      require(taken >= 0 && taken <= offered, "no more audio is taken than offered");
      pushed_ += taken;
      done += static_cast<std::size_t>(taken);
      if (taken == offered) return;
      for (int i = 0; i < UTTERANCE_QUEUE_LENGTH; ++i)
        require(take(), "audio is refused only while the queue is full");
      take_all();
    }
  }

  void flush() {
    for (int i = 0; i < 2; ++i)
      require(FlushUtteranceStream(stream_) == pushed_ % frame_samples_,
              "a flush answers with the samples behind the last whole frame");
    const std::int16_t sample = 1;
    require(PushUtteranceAudio(stream_, &sample, 1) == -1, "no audio is taken after the flush");
    take_all();
  }

private:
  void check(const Utterance &next) const {
    const std::int64_t previous_end = found_.empty() ? 0 : found_.back().end;
    require(next.number == static_cast<std::int32_t>(found_.size()) + 1, "numbers ascend by one");
    require(next.start >= previous_end, "padded neighbours do not overlap");
    require(next.start >= earliest_start_, "no utterance starts before the earliest start");
    require(next.start < next.end, "an utterance holds samples");
    require(next.end <= pushed_, "an utterance lies within the audio");
    require(next.began > 0 && next.began <= next.ended, "answers begin before they end");
    require(next.ended <= pushed_, "answers lie within the audio");
    require(next.open == 0 || next.open == 1, "open is 0 or 1");
    require(found_.empty() || found_.back().open == 0, "only the last utterance is open");
  }

  std::int32_t frame_samples_;
  UtteranceStream *stream_;
  std::int64_t pushed_ = 0;
  std::int64_t earliest_start_ = 0;
  std::vector<Utterance> found_;
};

std::int32_t read_ms(Input &input) {
  const std::int32_t number = input.number();
  return number >= 0 && number < 255 ? 5 * number : number;
}

UtteranceSettings read_settings(Input &input) {
  constexpr std::int32_t kRates[] = {16000, 8000};
  UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;
  const std::uint8_t rate = input.byte();
  settings.rate_hz = rate < 254 ? kRates[rate % 2] : input.number();
  settings.input_gain = input.number();
  settings.content_type = input.number();
  settings.hangover_ms = read_ms(input);
  settings.pad_before_ms = read_ms(input);
  settings.pad_after_ms = read_ms(input);
  return settings;
}

bool is_valid(const UtteranceSettings &settings) {
  return (settings.rate_hz == 16000 || settings.rate_hz == 8000) && settings.input_gain >= 0 &&
         settings.input_gain <= 2 &&
         std::min({settings.hangover_ms, settings.pad_before_ms, settings.pad_after_ms}) >= 0;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *bytes, std::size_t size) {
  SetLogSink([](int, const char *, const char *, void *) {}, nullptr);
  Input input(bytes, size);
  script = read_script(input);
  const UtteranceSettings settings = read_settings(input);
  if (!is_valid(settings)) {
    require(OpenUtteranceStream(&settings) == nullptr, "settings out of range are refused");
    return 0;
  }

  Listener cut(settings);
  Samples heard;
  while (!input.is_empty() && heard.size() < kMostSamples) {
    if (input.byte() % 8 == 0) {
      cut.take();
    } else {
      const Samples audio = input.audio();
      heard.insert(heard.end(), audio.begin(), audio.end());
      cut.push(audio);
    }
  }
  cut.flush();

  Listener whole(settings);
  whole.push(heard);
  whole.flush();
  static_assert(std::has_unique_object_representations_v<Utterance>);
  require(cut.found().size() == whole.found().size() &&
              std::equal(cut.found().begin(), cut.found().end(), whole.found().begin(),
                         [](const Utterance &a, const Utterance &b) {
                           return std::memcmp(&a, &b, sizeof a) == 0;
                         }),
          "no utterance is lost or depends on the cut");
  return 0;
}
