/*
 * epd_reasons.h - why the end-point detector of libOrvalis.so answered a frame as it did
 *
 * Filled by ProcessEPDFrameExplained of orvalis.h and by the utterance stream. Each condition has
 * both its sides. A frame is voice if
 *
 *   - it is no noise that the detector may learn from: voiceMetric exceeds voiceMetricThreshold,
 * and its spectrum has not stayed as it was (spectralDeviation below its threshold in a frame that
 * is not silent) for 50 such frames;
 *   - channelEnergy reaches minChannelEnergy;
 *   - energy reaches energyGate, which is 0 until half a second of voice has been learnt;
 *   - it is not one of the first 39 judged frames.
 *
 * Speech is answered from the voiced frame on that makes onset reach onsetFrames; pauses add up
 * until pause reaches pauseFrames.
 */
#ifndef ORVALIS_EPD_REASONS_H
#define ORVALIS_EPD_REASONS_H

#include <stdint.h>

typedef struct EpdReasons {
  int32_t judged; /* frames of the call that were no null audio; if 0, all other fields are 0 */
  int32_t answer; /* to the last of them: 0 no speech, 1 speech, 2 end of speech */
  int32_t voice;  /* 1 for voice */
  int32_t noise;  /* 1 if the noise is learnt from the frame */
  int32_t voiceMetric, voiceMetricThreshold;
  int32_t spectralDeviation, spectralDeviationThreshold; /* sum over the channels, dB in Q5 */
  int32_t channelEnergy, minChannelEnergy;               /* sum of the smoothed channel energies */
  int64_t energy, energyGate;                            /* the same sum before its floor */
  float noiseFloor;           /* mean square over 100 of the frames without voice */
  int32_t onset, onsetFrames; /* voiced frames in a row */
  int32_t pause, pauseFrames; /* frames without voice in an utterance */
} EpdReasons;

#endif /* ORVALIS_EPD_REASONS_H */
