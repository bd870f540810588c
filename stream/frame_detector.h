// Either voice detector behind one call a frame.
#pragma once

#include <cstdint>

#include "Voice_Engine/MCRAvad/MCRAvad.h"
#include "Voice_Engine/epd/epd_reasons.h"
#include "stream/utterance_finder.h"
#include "stream/utterance_stream.h"

struct EpdInstance;

namespace orvalis {

/// Of the detector that the settings select.
DecisionTiming decision_timing(const UtteranceSettings &settings);

class FrameDetector {
public:
  struct Decision {
    bool speech;
    bool is_null;  ///< null audio, on which nothing is decided
  };

  /// Allocates. False, with nothing allocated, if memory runs out.
  bool open(const UtteranceSettings &settings);
  void close();

  /// Decides on a frame of decision_timing().frame_samples, which is not changed.
  Decision process(const int16_t *frame);

  /// Lets the channel-energy detector learn the noise from 100 ms, which appear in no dump and no
  /// utterance.
  void lead_in(const int16_t *window);

  /// Why the last frame was decided as it was; null for the other detector.
  const EpdReasons *epd_reasons() const { return epd_ != nullptr ? &epd_reasons_ : nullptr; }
  const McraReasons *mcra_reasons() const { return mcra_ != nullptr ? &mcra_reasons_ : nullptr; }

private:
  bool open_epd(const UtteranceSettings &settings);
  bool open_mcra(const McraSettings &settings);

  // One of the two.
  EpdInstance *epd_ = nullptr;
  VADINFO *mcra_ = nullptr;

  int32_t frame_samples_ = 0;
  int32_t content_type_ = 0;
  float exponent_ = 0;
  EpdReasons epd_reasons_ = {};
  McraReasons mcra_reasons_ = {};
};

}  // namespace orvalis
