#include "cli/segments.h"

#include <algorithm>
#include <limits>

namespace orvalis::cli {
namespace {

std::int64_t middle(std::int64_t a, std::int64_t b) { return a + (b - a) / 2; }

}  // namespace

void Segments::hear(bool speech, std::int64_t samples) {
  const std::int64_t start = now_;
  now_ += samples;
  if (speech) {
    if (!growing_) growing_ = {start, now_, now_};
    growing_->end = now_;
  } else if (growing_ && now_ - growing_->end >= settings_.min_silence) {
    close_growing();
  }
  hand_out_waiting();
}

void Segments::end(std::int64_t rest) {
  if (growing_) close_growing();
  if (waiting_) hand_out(*waiting_, now_ + rest, waiting_->end == now_);
}

void Segments::close_growing() {
  if (is_long_enough(*growing_)) {
    hand_out_waiting();
    waiting_ = growing_;
  }
  growing_.reset();
}

void Segments::hand_out_waiting() {
  if (!waiting_) return;
  if (growing_ && is_long_enough(*growing_)) {
    hand_out(*waiting_, middle(waiting_->end, growing_->start), false);
  } else {
    // Whatever comes next, half of the gap will be enough.
    const std::int64_t next = growing_ ? growing_->start : now_;
    if (next - waiting_->end < 2 * settings_.pad_after) return;
    hand_out(*waiting_, std::numeric_limits<std::int64_t>::max(), false);
  }
  waiting_.reset();
}

void Segments::hand_out(const Piece &piece, std::int64_t limit, bool open) {
  const std::int64_t first = last_end_ ? middle(*last_end_, piece.start) : 0;
  Utterance segment{};
  segment.start = std::max(piece.start - settings_.pad_before, first);
  segment.end = std::min(piece.end + settings_.pad_after, limit);
  segment.began = piece.began;
  segment.ended = piece.end;
  segment.number = ++count_;
  segment.open = open ? 1 : 0;
  last_end_ = piece.end;
  take_(segment);
}

}  // namespace orvalis::cli
