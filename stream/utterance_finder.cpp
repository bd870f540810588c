#include "stream/utterance_finder.h"

#include <algorithm>

namespace orvalis {

void UtteranceQueue::push(const Utterance &utterance) {
  slots_[(first_ + count_) % kSlots] = utterance;
  ++count_;
}

bool UtteranceQueue::pop(Utterance &utterance) {
  if (count_ == 0) return false;
  utterance = slots_[first_];
  first_ = (first_ + 1) % kSlots;
  --count_;
  return true;
}

FinderSettings finder_settings(const UtteranceSettings &settings, const DecisionTiming &timing) {
  const auto samples_of = [&](int32_t ms) { return int64_t{ms} * settings.rate_hz / 1000; };
  return {.timing = timing,
          .hangover = samples_of(settings.hangover_ms),
          .pad_before = samples_of(settings.pad_before_ms),
          .pad_after = samples_of(settings.pad_after_ms),
          .min_speech = samples_of(settings.min_speech_ms)};
}

void UtteranceFinder::process(bool speech, bool is_null, UtteranceQueue &queue) {
  processed_ += settings_.timing.frame_samples;
  if (speech) {
    process_speech();
  } else {
    process_silence(is_null, queue);
  }
  hand_out_complete(queue);
}

void UtteranceFinder::finish(int64_t input_end, UtteranceQueue &queue) {
  if (running_) {
    open_->open = 1;
    open_->end = last_segment_end_ = processed_;
  } else {
    settle_refusal();
  }
  close_open(queue);
  if (closed_) hand_out(input_end - closed_->end, queue);
}

int64_t UtteranceFinder::earliest_start() const {
  const int64_t start = closed_ ? closed_->start : next_start();
  return std::max(start - settings_.pad_before, handed_out_end_);
}

void UtteranceFinder::process_speech() {
  if (!running_) begin_segment();
  run_ += 1;
  if (run_ > settings_.timing.refused_run) is_undecided_ = false;
  open_->ended = processed_;
}

void UtteranceFinder::process_silence(bool is_null, UtteranceQueue &queue) {
  if (running_) {
    end_segment(is_null);
  } else if (!is_null) {
    is_interrupted_ = false;
  }
  if (!is_null) settle_refusal();
  if (open_ && hangover_is_over()) {
    settle_refusal();
    if (open_ && hangover_is_over()) close_open(queue);
  }
}

/// No speech from the next frame on can join the open utterance.
bool UtteranceFinder::hangover_is_over() const {
  return processed_ + settings_.timing.frame_samples - open_->ended > settings_.hangover;
}

void UtteranceFinder::begin_segment() {
  // A segment that goes on after null audio belongs to the same utterance of the detector.
  const bool goes_on = is_interrupted_;
  if (!goes_on) run_ = 0;
  if (!goes_on || !open_) before_segment_ = open_;
  is_undecided_ = run_ < settings_.timing.refused_run;
  is_interrupted_ = false;
  running_ = true;
  const int64_t frame_start = processed_ - settings_.timing.frame_samples;
  segment_start_ = goes_on
                       ? frame_start
                       : std::max(frame_start - settings_.timing.start_delay, last_segment_end_);
  if (!open_) {
    open_ = Utterance{};
    open_->start = segment_start_;
    open_->end = segment_start_;
    open_->began = processed_;
  }
}

void UtteranceFinder::end_segment(bool is_null) {
  running_ = false;
  is_interrupted_ = is_null;
  const int64_t end = is_null ? open_->ended : open_->ended - settings_.timing.end_delay;
  open_->end = joined_end(end);
  last_segment_end_ = std::max(end, segment_start_);
}

/// The end of the open utterance if its last segment ends at `segment_end`: a segment may have held
/// nothing but the closing pause.
int64_t UtteranceFinder::joined_end(int64_t segment_end) const {
  return segment_end > segment_start_ ? segment_end : open_->end;
}

bool UtteranceFinder::is_long_enough(int64_t end) const {
  return end - open_->start >= settings_.min_speech;
}

/// Whatever comes, the open utterance will be handed out.
bool UtteranceFinder::open_is_certain() const {
  if (!open_ || is_undecided_) return false;
  const int64_t seen = open_->ended - settings_.timing.end_delay;
  return is_long_enough(running_ ? joined_end(seen) : open_->end);
}

/// The start of the utterance after the closed one, or its earliest possible start.
int64_t UtteranceFinder::next_start() const {
  if (open_) return open_->start;
  return std::max(processed_ - settings_.timing.start_delay, last_segment_end_);
}

/// Drops the segments of an utterance that the detector has refused, or not accepted by now.
void UtteranceFinder::settle_refusal() {
  if (!is_undecided_) return;
  is_undecided_ = false;
  open_ = before_segment_;
}

void UtteranceFinder::close_open(UtteranceQueue &queue) {
  running_ = false;
  if (open_ && open_->end > open_->start && is_long_enough(open_->end)) {
    if (closed_) hand_out((open_->start - closed_->end) / 2, queue);
    closed_ = open_;
  }
  open_.reset();
}

/// Hands out the closed utterance if no later decision can change it.
void UtteranceFinder::hand_out_complete(UtteranceQueue &queue) {
  if (!closed_) return;
  const int64_t gap = next_start() - closed_->end;
  if (open_is_certain() || gap >= 2 * settings_.pad_after) hand_out(gap / 2, queue);
}

/// Hands out the closed utterance, padded. `room_after` is its part of the gap after it.
void UtteranceFinder::hand_out(int64_t room_after, UtteranceQueue &queue) {
  Utterance utterance = *closed_;
  closed_.reset();
  const int64_t gap_before = utterance.start - handed_out_end_;
  const int64_t room_before = handed_out_ == 0 ? gap_before : gap_before - gap_before / 2;
  handed_out_end_ = utterance.end;
  utterance.start -= std::min(settings_.pad_before, room_before);
  utterance.end += std::min(settings_.pad_after, room_after);
  utterance.number = ++handed_out_;
  queue.push(utterance);
}

}  // namespace orvalis
