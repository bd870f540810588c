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
struct Findings {
  std::vector<Utterance> all;
  std::int64_t earliest = 0;

  void note_earliest(std::int64_t start) {
    require(start >= earliest, "the earliest start never goes back");
    earliest = start;
  }

  void take(const Utterance &next, std::int64_t pushed) {
    const Utterance before = all.empty() ? Utterance{} : all.back();
    require(next.number == before.number + 1, "numbers ascend by one");
    require(next.start >= before.end, "padded neighbours do not overlap");
    require(next.start >= earliest, "no utterance starts before the earliest start");
    require(next.start < next.end && next.end <= pushed, "an utterance holds samples of the audio");
    require(next.began > 0 && next.began <= next.ended && next.ended <= pushed,
            "decisions for speech begin before they end, within the audio");
    require((next.open == 0 || next.open == 1) && before.open == 0, "only the last one is open");
    all.push_back(next);
  }
};

/// A stream from which utterances are taken.
class Listener {
public:
  explicit Listener(UtteranceSettings settings)
      : frame_samples_(orvalis::decision_timing(settings).frame_samples) {
    settings.on_frame = [](const UtteranceFrame *frame, void *user) {
      auto &processed = static_cast<Listener *>(user)->processed_;
      require(frame->start == processed, "frames follow one another");
      processed += frame->samples;
    };
    settings.user = this;
    stream_ = OpenUtteranceStream(&settings);
  }
  ~Listener() { CloseUtteranceStream(stream_); }
  Listener(const Listener &) = delete;
  Listener &operator=(const Listener &) = delete;

  bool is_open() const { return stream_ != nullptr; }
  const std::vector<Utterance> &found() const { return findings_.all; }

  bool take() {
    findings_.note_earliest(EarliestUtteranceStart(stream_));
    Utterance next;
    const std::int32_t taken = NextUtterance(stream_, &next);
    if (taken == 1) findings_.take(next, pushed_);
    require(taken == 0 || taken == 1, "taking returns 0 or 1");
    return taken == 1;
  }

  void push(const Samples &audio) {
    for (std::ptrdiff_t done = 0;;) {
      const Samples rest(audio.begin() + done, audio.end());
      const auto offered = static_cast<std::int32_t>(rest.size());
      const std::int32_t taken = PushUtteranceAudio(stream_, rest.data(), offered);
      require(taken >= 0 && taken <= offered, "no more audio is taken than offered");
      pushed_ += taken;
      done += taken;
      if (taken == offered) return;
      for (int i = 0; i < UTTERANCE_QUEUE_LENGTH; ++i)
        require(take(), "audio is refused only while the queue is full");
    }
  }

  void flush() {
    const std::int64_t rest = pushed_ % frame_samples_;
    require(FlushUtteranceStream(stream_) == rest, "a flush returns what is no whole frame");
    while (take()) {
    }
    require(processed_ == pushed_ - rest, "every whole frame is processed");
  }

private:
  std::int32_t frame_samples_;
  UtteranceStream *stream_ = nullptr;
  std::int64_t pushed_ = 0, processed_ = 0;
  Findings findings_;
};

/// Runs of up to 63 decisions, a byte each: no speech, speech, or null audio.
void try_finder(const UtteranceSettings &settings, Input &input) {
  const orvalis::DecisionTiming timing = orvalis::decision_timing(settings);
  orvalis::UtteranceFinder finder(orvalis::finder_settings(settings, timing));
  orvalis::UtteranceQueue queue;
  Findings findings;
  std::int64_t processed = 0;
  const auto take_all = [&] {
    findings.note_earliest(queue.front() ? queue.front()->start : finder.earliest_start());
    for (Utterance next; queue.pop(next);) findings.take(next, processed);
  };
  for (int runs = input.byte(); runs > 0; --runs) {
    const std::uint8_t run = input.byte();
    for (int frame = 0; frame < run % 64; ++frame) {
      if (queue.is_full()) take_all();
      processed += timing.frame_samples;
      finder.process(run / 64 == 1, run / 64 == 2, queue);
    }
  }
  finder.finish(processed, queue);
  take_all();
}

UtteranceSettings read_settings(Input &input) {
  const auto ms = [&] {
    const std::int32_t number = input.number();
    return number >= 0 && number < 255 ? 5 * number : number;
  };
  UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;
  const std::uint8_t rate = input.byte();
  settings.rate_hz = rate > 253 ? input.number() : rate % 2 == 0 ? 16000 : 8000;
  settings.input_gain = input.number();
  settings.content_type = input.number();
  settings.hangover_ms = ms();
  settings.pad_before_ms = ms();
  settings.pad_after_ms = ms();
  settings.detector = input.number();
  settings.min_speech_ms = ms();
  settings.lead_in = input.number();
  return settings;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *bytes, std::size_t size) {
  SetLogSink(LogNothing, nullptr);
  Input input(bytes, size);
  const UtteranceSettings settings = read_settings(input);
  Listener chunked(settings), whole(settings);
  if (!chunked.is_open()) return 0;
  try_finder(settings, input);

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
  whole.push(pushed);
  whole.flush();
  static_assert(std::has_unique_object_representations_v<Utterance>);
  const auto are_same = [](const Utterance &a, const Utterance &b) {
    return std::memcmp(&a, &b, sizeof a) == 0;
  };
  require(std::ranges::equal(chunked.found(), whole.found(), are_same),
          "no utterance is lost or depends on the chunk size");
  return 0;
}
