#include "stream/utterance_stream.h"

#include <algorithm>
#include <cstdlib>
#include <new>
#include <optional>

#include "Voice_Engine/channel/frame_screening.h"
#include "Voice_Engine/epd/kepd.h"
#include "Voice_Engine/platform/export.h"
#include "jni/orvalis.h"

namespace {

constexpr int32_t kLongestFrame = 160;
constexpr int32_t kFramesPerSecond = 100;
constexpr int32_t kMsPerFrame = 1000 / kFramesPerSecond;
// A frame decides at most two utterances and so does the flush, beyond those that may wait.
constexpr int32_t kQueueSlots = UTTERANCE_QUEUE_LENGTH + 4;

/// By how many samples the detector's answers lag behind the speech.
struct DecisionDelay {
  int64_t start;
  int64_t end;
};

bool has_short_timing(int32_t content_type) { return static_cast<uint32_t>(content_type) >= 2; }

DecisionDelay decision_delay(const UtteranceSettings &settings, int32_t frame_samples) {
  const orvalis::KepdTiming timing =
      orvalis::timing_of(static_cast<uint32_t>(settings.content_type), settings.rate_hz == 8000);
  return {int64_t{timing.start_lag()} * frame_samples, int64_t{timing.end_lag()} * frame_samples};
}

bool is_valid(const UtteranceSettings &settings) {
  return (settings.rate_hz == 16000 || settings.rate_hz == 8000) && settings.input_gain >= 0 &&
         settings.input_gain <= 2 && settings.hangover_ms >= 0 && settings.pad_before_ms >= 0 &&
         settings.pad_after_ms >= 0;
}

int32_t engine_mode(const UtteranceSettings &settings) {
  return settings.input_gain * 10000 + (settings.rate_hz == 16000 ? 0 : 1000);
}

/// Decided utterances, oldest first.
class UtteranceQueue {
public:
  bool is_full() const { return count_ >= UTTERANCE_QUEUE_LENGTH; }

  void push(const Utterance &utterance) {
    slots_[(first_ + count_) % kQueueSlots] = utterance;
    ++count_;
  }

  /// The oldest; null if there is none.
  const Utterance *front() const { return count_ == 0 ? nullptr : &slots_[first_]; }

  bool pop(Utterance &utterance) {
    if (count_ == 0) return false;
    utterance = slots_[first_];
    first_ = (first_ + 1) % kQueueSlots;
    --count_;
    return true;
  }

private:
  Utterance slots_[kQueueSlots] = {};
  int32_t first_ = 0;
  int32_t count_ = 0;
};

/// Turns the answers of successive frames into utterances. Positions are samples.
class UtteranceFinder {
public:
  explicit UtteranceFinder(const UtteranceSettings &settings)
      : frame_samples_(settings.rate_hz / kFramesPerSecond),
        delay_(decision_delay(settings, frame_samples_)),
        may_refuse_(has_short_timing(settings.content_type)),
        hangover_(samples_of(settings.hangover_ms)),
        pad_before_(samples_of(settings.pad_before_ms)),
        pad_after_(samples_of(settings.pad_after_ms)) {}

  int32_t frame_samples() const { return frame_samples_; }

  /// Takes the answer of the next frame.
  void hear(bool speech, bool is_null, UtteranceQueue &queue) {
    heard_ += frame_samples_;
    if (speech) {
      hear_speech(queue);
    } else {
      hear_silence(is_null, queue);
    }
  }

  /// Closes what is open; `input_end` counts the samples behind the last frame too.
  void finish(int64_t input_end, UtteranceQueue &queue) {
    if (running_) {
      open_->open = 1;
      open_->end = heard_;
    } else {
      settle_refusal();
    }
    close_open(queue);
    if (closed_) hand_out(input_end - closed_->end, queue);
  }

  /// No utterance that is still to be decided starts before this.
  int64_t earliest_start() const {
    const int64_t next_piece = std::max(heard_ - delay_.start, last_piece_end_);
    const int64_t start = closed_ ? closed_->start : open_ ? open_->start : next_piece;
    return std::max(start - pad_before_, handed_out_end_);
  }

private:
  int64_t samples_of(int32_t ms) const { return int64_t{ms} * frame_samples_ / kMsPerFrame; }

  void hear_speech(UtteranceQueue &queue) {
    if (!running_) begin_piece();
    answers_ += 1;
    if (answers_ > orvalis::kShortUtterance) is_undecided_ = false;
    open_->ended = heard_;
    if (closed_ && !is_undecided_) hand_out((open_->start - closed_->end) / 2, queue);
  }

  void hear_silence(bool is_null, UtteranceQueue &queue) {
    if (running_) {
      end_piece(is_null);
    } else if (!is_null) {
      is_interrupted_ = false;
    }
    if (!is_null) settle_refusal();
    if (open_ && hangover_is_over()) {
      settle_refusal();
      if (open_ && hangover_is_over()) close_open(queue);
    }
    // No utterance to come can reach into the second half of a gap of twice the padding.
    if (closed_ && !open_ && heard_ - delay_.start >= closed_->end + 2 * pad_after_) {
      hand_out(pad_after_, queue);
    }
  }

  /// No answer from the next frame on can join the open utterance.
  bool hangover_is_over() const { return heard_ + frame_samples_ - open_->ended > hangover_; }

  void begin_piece() {
    // A piece that goes on after null audio belongs to the same utterance of the detector.
    const bool goes_on = is_interrupted_;
    if (!goes_on) answers_ = 0;
    if (!goes_on || !open_) before_piece_ = open_;
    is_undecided_ = may_refuse_ && answers_ <= orvalis::kShortUtterance;
    is_interrupted_ = false;
    running_ = true;
    const int64_t frame_start = heard_ - frame_samples_;
    piece_start_ = goes_on ? frame_start : std::max(frame_start - delay_.start, last_piece_end_);
    if (!open_) {
      open_ = Utterance{};
      open_->start = piece_start_;
      open_->end = piece_start_;
      open_->began = heard_;
    }
  }

  void end_piece(bool is_null) {
    running_ = false;
    is_interrupted_ = is_null;
    const int64_t end = is_null ? open_->ended : open_->ended - delay_.end;
    if (end > piece_start_) open_->end = end;  // else all of it was the closing pause
    last_piece_end_ = std::max(end, piece_start_);
  }

  /// Drops the pieces of an utterance that the detector refused, or has not accepted by now.
  void settle_refusal() {
    if (!is_undecided_) return;
    is_undecided_ = false;
    open_ = before_piece_;
  }

  void close_open(UtteranceQueue &queue) {
    running_ = false;
    if (open_ && open_->end > open_->start) {
      if (closed_) hand_out((open_->start - closed_->end) / 2, queue);
      closed_ = open_;
    }
    open_.reset();
  }

  /// Hands out the closed utterance, padded. `room_after` is its share of the gap behind it.
  void hand_out(int64_t room_after, UtteranceQueue &queue) {
    Utterance utterance = *closed_;
    closed_.reset();
    const int64_t gap_before = utterance.start - handed_out_end_;
    const int64_t room_before = handed_out_ == 0 ? gap_before : gap_before - gap_before / 2;
    handed_out_end_ = utterance.end;
    utterance.start -= std::min(pad_before_, room_before);
    utterance.end += std::min(pad_after_, room_after);
    utterance.number = ++handed_out_;
    queue.push(utterance);
  }

  int32_t frame_samples_;
  DecisionDelay delay_;
  bool may_refuse_;
  int64_t hangover_;
  int64_t pad_before_;
  int64_t pad_after_;

  int64_t heard_ = 0;            // samples judged
  bool running_ = false;         // the last answer was 1
  bool is_interrupted_ = false;  // null audio ended the last piece, nothing was judged since
  bool is_undecided_ = false;    // the detector may still refuse its utterance
  int32_t answers_ = 0;          // answers 1 of the detector's utterance
  int64_t piece_start_ = 0;
  int64_t last_piece_end_ = 0;     // also of a piece that held nothing but the closing pause
  std::optional<Utterance> open_;  // may be joined by further pieces
  std::optional<Utterance> before_piece_;  // open_ as it was before the detector's utterance
  std::optional<Utterance> closed_;        // complete, but its neighbour may limit its padding
  int32_t handed_out_ = 0;
  int64_t handed_out_end_ = 0;  // end of the last one handed out, before padding
};

}  // namespace

struct UtteranceStream {
  UtteranceStream(const UtteranceSettings &settings, EpdInstance *detector)
      : epd(detector), content_type(settings.content_type), finder(settings) {}

  EpdInstance *epd;
  int32_t content_type;
  bool flushed = false;
  int64_t pushed = 0;
  int32_t filled = 0;
  int16_t frame[kLongestFrame] = {};
  UtteranceFinder finder;
  UtteranceQueue queue;
};

namespace {

void judge_frame(UtteranceStream &stream) {
  const int32_t samples = stream.finder.frame_samples();
  int32_t small_samples = 0;
  const bool is_null = orvalis::is_null_frame(stream.frame, samples, small_samples);
  const int32_t answer =
      ProcessEPDFrameByCnttype(stream.epd, stream.frame, samples, stream.content_type);
  stream.finder.hear(answer == 1, is_null, stream.queue);
  stream.filled = 0;
}

}  // namespace

extern "C" {

ORVALIS_EXPORT UtteranceStream *OpenUtteranceStream(const UtteranceSettings *settings) {
  if (settings == nullptr || !is_valid(*settings)) return nullptr;
  void *memory = std::malloc(sizeof(UtteranceStream));
  if (memory == nullptr) return nullptr;
  EpdInstance *epd = InitializeEPD(engine_mode(*settings), settings->pcm_dump);
  if (epd == nullptr) {
    std::free(memory);
    return nullptr;
  }
  return new (memory) UtteranceStream(*settings, epd);
}

ORVALIS_EXPORT int32_t PushUtteranceAudio(UtteranceStream *stream, const int16_t *pcm,
                                          int32_t numSample) {
  if (stream == nullptr || stream->flushed || numSample < 0 || (pcm == nullptr && numSample > 0)) {
    return -1;
  }
  const int32_t frame_samples = stream->finder.frame_samples();
  int32_t taken = 0;
  while (taken < numSample && !stream->queue.is_full()) {
    const int32_t piece = std::min(numSample - taken, frame_samples - stream->filled);
    std::copy_n(pcm + taken, piece, stream->frame + stream->filled);
    stream->filled += piece;
    taken += piece;
    if (stream->filled == frame_samples) judge_frame(*stream);
  }
  stream->pushed += taken;
  return taken;
}

ORVALIS_EXPORT int32_t NextUtterance(UtteranceStream *stream, Utterance *utterance) {
  if (stream == nullptr || utterance == nullptr) return -1;
  return stream->queue.pop(*utterance) ? 1 : 0;
}

ORVALIS_EXPORT int64_t EarliestUtteranceStart(const UtteranceStream *stream) {
  if (stream == nullptr) return -1;
  const Utterance *decided = stream->queue.front();
  return decided != nullptr ? decided->start : stream->finder.earliest_start();
}

ORVALIS_EXPORT int32_t FlushUtteranceStream(UtteranceStream *stream) {
  if (stream == nullptr) return -1;
  if (!stream->flushed) stream->finder.finish(stream->pushed, stream->queue);
  stream->flushed = true;
  return stream->filled;
}

ORVALIS_EXPORT int32_t CloseUtteranceStream(UtteranceStream *stream) {
  if (stream == nullptr) return -1;
  FreeMemoryEPD(stream->epd);
  std::free(stream);
  return 0;
}

}  // extern "C"
