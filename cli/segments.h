// Segments of speech from a detector's answers to frames.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>

#include "utterance_stream.h"

namespace orvalis::cli {

/// In samples.
struct SegmentSettings {
  std::int64_t min_speech = 0;   ///< Shorter segments are left out
  std::int64_t min_silence = 0;  ///< Shorter silence joins what is before and after it
  std::int64_t pad_before = 0;   ///< Padding never crosses a neighbour: each of two owns half of
  std::int64_t pad_after = 0;    ///< the gap between them
};

/// Hands each segment to `take` as soon as no answer to come can change it.
class Segments {
public:
  Segments(const SegmentSettings &settings, std::function<void(const Utterance &)> take)
      : settings_(settings), take_(std::move(take)) {}

  /// The answer to the next frame, of so many samples.
  void hear(bool speech, std::int64_t samples);
  /// The audio ended, with so many samples behind the last frame.
  void end(std::int64_t rest);

private:
  struct Piece {
    std::int64_t start, began, end;
  };

  bool is_long_enough(const Piece &piece) const {
    return piece.end - piece.start >= settings_.min_speech;
  }
  void close_growing();
  void hand_out_waiting();
  void hand_out(const Piece &piece, std::int64_t limit, bool open);

  SegmentSettings settings_;
  std::function<void(const Utterance &)> take_;
  std::int64_t now_ = 0;
  std::optional<Piece> growing_;          ///< may still be joined, or be left out
  std::optional<Piece> waiting_;          ///< only its padding is not decided
  std::optional<std::int64_t> last_end_;  ///< of the segment handed out last, without padding
  std::int32_t count_ = 0;
};

}  // namespace orvalis::cli
