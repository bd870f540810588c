/*
 * epd_reasons.h - why the end-point detector of libOrvalis.so decided as it did
 *
 * Filled by ProcessEPDFrameExplained of orvalis.h and by the utterance stream. Values come with the
 * thresholds that they are compared with. A frame is voice if
 *
 *   - it does not update the noise: voiceMetric exceeds voiceMetricThreshold, and the spectrum has
 *     not stood still (spectralDeviation below its threshold in a frame that is not silent) for 50
 *     such frames;
 *   - channelEnergy is at least minChannelEnergy;
 *   - energy is at least energyGate, which is 0 until half a second of voice has set it;
 *   - it is not one of the first 39 frames that were no null audio.
 *
 * A frame is speech once onset reaches onsetFrames, until pause reaches pauseFrames.
 */
#ifndef ORVALIS_EPD_REASONS_H
#define ORVALIS_EPD_REASONS_H

#include <stdint.h>

typedef struct EpdReasons {
  int32_t judged; /* frames of the call that were no null audio; if 0, all other fields are 0 */
  int32_t answer; /* decision on the last of them: 0 no speech, 1 speech, 2 end of speech */
  int32_t voice;  /* 1 for voice */
  int32_t noise;  /* 1 if the frame updates the noise estimate */
  int32_t voiceMetric, voiceMetricThreshold;
  int32_t spectralDeviation, spectralDeviationThreshold; /* sum over the channels, dB in Q5 */
  int32_t channelEnergy, minChannelEnergy;               /* sum of the smoothed channel energies */
  int64_t energy, energyGate;                            /* the same sum before the floor */
  float noiseFloor;           /* mean square / 100 of the frames without voice */
  int32_t onset, onsetFrames; /* voiced frames in a row */
  int32_t pause, pauseFrames; /* frames without voice in an utterance */
} EpdReasons;

#endif /* ORVALIS_EPD_REASONS_H */
