// From a detector's decisions to utterances: dated back by the detector's delay, joined over the
// hangover, left out if they hold too little speech, padded.
#pragma once

#include <cstdint>
#include <optional>

#include "stream/utterance_stream.h"

namespace orvalis {

/// Decided utterances, oldest first.
class UtteranceQueue {
public:
  bool is_full() const { return count_ >= UTTERANCE_QUEUE_LENGTH; }
  void push(const Utterance &utterance);
  /// Takes the oldest; false if there is none.
  bool pop(Utterance &utterance);
  /// The oldest; null if there is none.
  const Utterance *front() const { return count_ == 0 ? nullptr : &slots_[first_]; }

private:
  // A frame decides at most two utterances and so does the end, beyond those that may wait.
  static constexpr int32_t kSlots = UTTERANCE_QUEUE_LENGTH + 4;

  Utterance slots_[kSlots] = {};
  int32_t first_ = 0;
  int32_t count_ = 0;
};

/// How a detector's decisions relate to the speech. In samples, but for the run.
struct DecisionTiming {
  int32_t frame_samples;
  int64_t start_delay;  ///< of the first decision for speech behind the start of speech
  int64_t end_delay;    ///< of the last one behind its end
  int32_t refused_run;  ///< longest run of decisions for speech that the detector takes back
};

/// In samples.
struct FinderSettings {
  DecisionTiming timing;
  int64_t hangover;
  int64_t pad_before;
  int64_t pad_after;
  int64_t min_speech;
};

/// What the settings of a stream ask of the finder.
FinderSettings finder_settings(const UtteranceSettings &settings, const DecisionTiming &timing);

/// Positions are samples.
class UtteranceFinder {
public:
  explicit UtteranceFinder(const FinderSettings &settings) : settings_(settings) {}

  /// Takes the decision on the next frame. Null audio, which is not judged, is no speech.
  void process(bool speech, bool is_null, UtteranceQueue &queue);

  /// Closes what is open; `input_end` counts the samples behind the last frame too.
  void finish(int64_t input_end, UtteranceQueue &queue);

  /// No utterance that is still to be decided starts before this. Never goes back.
  int64_t earliest_start() const;

private:
  void take_speech();
  void take_silence(bool is_null, UtteranceQueue &queue);
  bool hangover_is_over() const;
  void begin_piece();
  void end_piece(bool is_null);
  int64_t joined_end(int64_t piece_end) const;
  bool is_long_enough(int64_t end) const;
  bool open_is_certain() const;
  int64_t next_start() const;
  void settle_refusal();
  void close_open(UtteranceQueue &queue);
  void hand_out_decided(UtteranceQueue &queue);
  void hand_out(int64_t room_after, UtteranceQueue &queue);

  FinderSettings settings_;
  int64_t processed_ = 0;
  bool running_ = false;         // the last decision was for speech
  bool is_interrupted_ = false;  // null audio ended the last piece, nothing was judged since
  bool is_undecided_ = false;    // the detector may still take its utterance back
  int32_t run_ = 0;              // decisions for speech of the detector's utterance
  int64_t piece_start_ = 0;
  int64_t last_piece_end_ = 0;     // also of a piece that held nothing but the closing pause
  std::optional<Utterance> open_;  // may be joined by further pieces
  std::optional<Utterance> before_piece_;  // open_ as it was before the detector's utterance
  std::optional<Utterance> closed_;        // complete, but its neighbour may limit its padding
  int32_t handed_out_ = 0;
  int64_t handed_out_end_ = 0;  // end of the last one handed out, before padding
};

}  // namespace orvalis
