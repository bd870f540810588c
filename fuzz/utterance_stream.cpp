// The utterance stream: any settings, chunk sizes and order of calls. The finder also by itself, on
// any decisions, as few bytes make no speech.
#include "stream/utterance_stream.h"

#include <algorithm>
#include <cstring>
#include <type_traits>

#include "fuzz/input.h"
#include "jni/orvalis.h"
#include "stream/frame_detector.h"
#include "stream/utterance_finder.h"

namespace {

using orvalis::fuzz::Input;
using orvalis::fuzz::require;
using orvalis::fuzz::Samples;

constexpr std::size_t kMaxSamples = 96000;  // more than a lead-in searches at 8 kHz

/// The utterances taken so far, each checked as it comes.
class Findings {
public:
  const std::vector<Utterance> &all() const { return found_; }

  void note_earliest(std::int64_t start) {
    require(start >= earliest_, "the earliest start never goes back");
    earliest_ = start;
  }

  void take(const Utterance &next, std::int64_t pushed) {
    const std::int64_t previous_end = found_.empty() ? 0 : found_.back().end;
    require(next.number == static_cast<std::int32_t>(found_.size()) + 1, "numbers ascend by one");
    require(next.start >= previous_end, "padded neighbours do not overlap");
    require(next.start >= earliest_, "no utterance starts before the earliest start");
    require(next.start < next.end, "an utterance holds samples");
    require(next.end <= pushed, "an utterance lies within the audio");
    require(next.began > 0 && next.began <= next.ended,
            "decisions for speech begin before they end");
    require(next.ended <= pushed, "decisions lie within the audio");
    require(next.open == 0 || next.open == 1, "open is 0 or 1");
    require(found_.empty() || found_.back().open == 0, "only the last utterance is open");
    found_.push_back(next);
  }

private:
  std::int64_t earliest_ = 0;
  std::vector<Utterance> found_;
};

/// A stream from which utterances are taken.
class Listener {
public:
  explicit Listener(UtteranceSettings settings)
      : frame_samples_(orvalis::decision_timing(settings).frame_samples) {
    settings.on_frame = [](const UtteranceFrame *frame, void *user) {
      auto &processed = static_cast<Listener *>(user)->processed_;
      require(frame->start == processed, "frames follow one another");
      require(frame->speech == 0 || frame->speech == 1, "a decision is 0 or 1");
      processed += frame->samples;
    };
    settings.user = this;
    stream_ = OpenUtteranceStream(&settings);
    require(stream_ != nullptr, "valid settings open a stream");
  }
  ~Listener() { require(CloseUtteranceStream(stream_) == 0, "a stream is released"); }
  Listener(const Listener &) = delete;
  Listener &operator=(const Listener &) = delete;

  const std::vector<Utterance> &found() const { return findings_.all(); }

  bool take() {
    findings_.note_earliest(EarliestUtteranceStart(stream_));
    Utterance next;
    const std::int32_t taken = NextUtterance(stream_, &next);
    require(taken == 0 || taken == 1, "taking returns 0 or 1");
    if (taken == 1) findings_.take(next, pushed_);
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
              "a flush returns the samples after the last whole frame");
    const std::int16_t sample = 1;
    require(PushUtteranceAudio(stream_, &sample, 1) == -1, "no audio is taken after the flush");
    take_all();
    require(processed_ == pushed_ / frame_samples_ * frame_samples_,
            "every whole frame is processed");
  }

private:
  std::int32_t frame_samples_;
  UtteranceStream *stream_ = nullptr;
  std::int64_t pushed_ = 0;
  std::int64_t processed_ = 0;
  Findings findings_;
};

/// Runs of up to 63 decisions, a byte each: no speech, speech, or null audio.
void try_finder(const UtteranceSettings &settings, Input &input) {
  enum Kind { kNone, kSpeech, kNull };
  const orvalis::DecisionTiming timing = orvalis::decision_timing(settings);
  orvalis::UtteranceFinder finder(orvalis::finder_settings(settings, timing));
  orvalis::UtteranceQueue queue;
  Findings findings;
  std::int64_t processed = 0;
  const auto take_all = [&] {
    findings.note_earliest(queue.front() ? queue.front()->start : finder.earliest_start());
    for (Utterance next; queue.pop(next);) findings.take(next, processed);
  };
  for (int runs = input.byte(), run = 0; run < runs; ++run) {
    const std::uint8_t byte = input.byte();
    const int kind = byte / 64;
    for (int frame = 0; frame < byte % 64; ++frame) {
      if (queue.is_full()) take_all();
      processed += timing.frame_samples;
      finder.process(kind == kSpeech, kind == kNull, queue);
    }
  }
  finder.finish(processed, queue);
  take_all();
}

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
  settings.detector = input.number();
  settings.min_speech_ms = read_ms(input);
  settings.lead_in = input.number();
  return settings;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *bytes, std::size_t size) {
  SetLogSink(LogNothing, nullptr);
  Input input(bytes, size);
  const UtteranceSettings settings = read_settings(input);
  UtteranceStream *stream = OpenUtteranceStream(&settings);
  if (stream == nullptr) return 0;
  CloseUtteranceStream(stream);
  try_finder(settings, input);

  Listener chunked(settings);
  Samples pushed;
  while (!input.is_empty() && pushed.size() < kMaxSamples) {
    if (input.byte() % 8 == 0) {
      chunked.take();
    } else {
      const Samples audio = input.audio();
      pushed.insert(pushed.end(), audio.begin(), audio.end());
      chunked.push(audio);
    }
  }
  chunked.flush();

  Listener whole(settings);
  whole.push(pushed);
  whole.flush();
  static_assert(std::has_unique_object_representations_v<Utterance>);
  require(std::ranges::equal(chunked.found(), whole.found(),
                             [](const Utterance &a, const Utterance &b) {
                               return std::memcmp(&a, &b, sizeof a) == 0;
                             }),
          "no utterance is lost or depends on the chunk size");
  return 0;
}
