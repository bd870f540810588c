// From a detector's decisions to utterances. A segment is a run of decisions for speech, dated back
// by the detector's delay. Segments are joined over the hangover to utterances; those with too
// little speech are dropped, the others padded.
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
  // Beyond those that may wait, a frame completes at most two utterances, and so does the end.
  static constexpr int32_t kSlots = UTTERANCE_QUEUE_LENGTH + 4;

  Utterance slots_[kSlots] = {};
  int32_t first_ = 0;
  int32_t count_ = 0;
};

/// How a detector's decisions relate to the speech, in samples; the run is in decisions.
struct DecisionTiming {
  int32_t frame_samples;
  int64_t start_delay;  ///< from the start of speech to the first decision for it
  int64_t end_delay;    ///< from its end to the last one
  int32_t refused_run;  ///< maximum run of decisions for speech that the detector refuses later
};

/// In samples.
struct FinderSettings {
  DecisionTiming timing;
  int64_t hangover;
  int64_t pad_before;
  int64_t pad_after;
  int64_t min_speech;
};

/// The finder's part of the settings of a stream.
FinderSettings finder_settings(const UtteranceSettings &settings, const DecisionTiming &timing);

/// Positions are in samples.
class UtteranceFinder {
public:
  explicit UtteranceFinder(const FinderSettings &settings) : settings_(settings) {}

  /// Processes the decision on the next frame. Null audio is no speech.
  void process(bool speech, bool is_null, UtteranceQueue &queue);

  /// Closes what is open. `input_end` includes the samples after the last whole frame.
  void finish(int64_t input_end, UtteranceQueue &queue);

  /// No utterance that is not complete yet starts before this. Never decreases.
  int64_t earliest_start() const;

private:
  void process_speech();
  void process_silence(bool is_null, UtteranceQueue &queue);
  bool hangover_is_over() const;
  void begin_segment();
  void end_segment(bool is_null);
  int64_t joined_end(int64_t segment_end) const;
  bool is_long_enough(int64_t end) const;
  bool open_is_certain() const;
  int64_t next_start() const;
  void settle_refusal();
  void close_open(UtteranceQueue &queue);
  void hand_out_complete(UtteranceQueue &queue);
  void hand_out(int64_t room_after, UtteranceQueue &queue);

  FinderSettings settings_;
  int64_t processed_ = 0;
  bool running_ = false;         // the last decision was for speech
  bool is_interrupted_ = false;  // null audio ended the last segment and has not ended itself
  bool is_undecided_ = false;    // the detector may still refuse its utterance
  int32_t run_ = 0;              // decisions for speech of the detector's utterance
  int64_t segment_start_ = 0;
  int64_t last_segment_end_ = 0;             // also of one that held nothing but the closing pause
  std::optional<Utterance> open_;            // further segments may join it
  std::optional<Utterance> before_segment_;  // open_ as it was before the detector's utterance
  std::optional<Utterance> closed_;          // complete, but its neighbour may limit its padding
  int32_t handed_out_ = 0;
  int64_t handed_out_end_ = 0;  // end of the last one handed out, before padding
};

}  // namespace orvalis
