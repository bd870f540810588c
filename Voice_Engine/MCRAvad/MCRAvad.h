/*
 * MCRAvad.h - the MCRA voice activity detector of libOrvalis.so
 *
 * A second detector, independent of the one in orvalis.h, for callers that drive it themselves. It
 * estimates the noise in 128 bins of the spectrum by minima-controlled recursive averaging (MCRA),
 * derives the probability of speech in each bin, and decides on every frame by energies and by the
 * number of bins in which speech is likely.
 *
 * Sources: I. Cohen, "Noise spectrum estimation in adverse environments: improved minima controlled
 * recursive averaging", 2003; I. Cohen and B. Berdugo, "Speech enhancement for non-stationary noise
 * environments", 2001, and "Noise estimation by minima controlled recursive averaging for robust
 * speech enhancement", 2002.
 *
 *
 * A worked example: how much of a recording is speech
 * ---------------------------------------------------
 *
 *     #include <stdio.h>
 *     #include <stdlib.h>
 *     #include "MCRAvad.h"
 *
 *     int report_share(const int16_t *pcm, int32_t samples)
 *     {
 *         VADINFO *vad = (VADINFO *)calloc(1, sizeof *vad);    // all fields 0
 *         int16_t frame[MCRA_FRAME_SAMPLES];
 *         int32_t speech = 0, frames = 0;
 *         if (vad == NULL)
 *             return -1;
 *         initialVADINFO(&vad);
 *         while (frames < samples / MCRA_FRAME_SAMPLES) {
 *             for (int32_t i = 0; i < MCRA_FRAME_SAMPLES; ++i)    // a copy: the call changes it
 *                 frame[i] = pcm[frames * MCRA_FRAME_SAMPLES + i];
 *             speech += processVAD(&vad, frame, MCRA_FRAME_SAMPLES, 0.84f);
 *             ++frames;
 *         }
 *         printf("speech in %d of %d frames\n", (int)speech, (int)frames);
 *         free(vad);
 *         return 0;
 *     }
 *
 * (tests/example_mcra.c is this example; it is compiled and run as C and as C++.)
 *
 *
 * Audio
 * -----
 * Frames of 160 samples, 16 bits, native byte order, one after the other without overlap.
 * Everything is counted in frames and bins, so the sample rate is the caller's choice:
 *
 *   rate      a frame   a bin     bins 0..40, where speech is expected
 *   16 kHz    10 ms     62.5 Hz   0 to 2.5 kHz
 *   8 kHz     20 ms     31.25 Hz  0 to 1.25 kHz
 *
 * The first frame is never speech and becomes the first noise estimate: begin with background.
 * Frames below about -45 dB of full scale are rarely speech (-48 dB with an energyMargin of 1).
 *
 *
 * Life of a record
 * ----------------
 * Allocate it and fill it with zeros; call initialVADINFO; if you like, write the fields marked
 * "configuration"; then call processVAD frame by frame. All other fields are for reading.
 * Calling initialVADINFO again starts anew. It keeps the configuration except energyMargin, and
 * does not end a calibration: reset_MCRA_params does.
 *
 * Configuration:
 *
 *   field                 value   meaning
 *   historyUpdate         0       minima over all time: the noise estimate may only fall
 *                         1       minima over the last 20 frames: it may rise too
 *                                 (other values count as 0)
 *   energyMargin          2       factor of the smoothed-energy test; 1 after a reset
 *   lowThresholdSelect    1       minimum energy threshold 0.097; other values: 0.1
 *   calibrationEnable     0       the smoothed energy is compared with that of frames 1..19
 *                         other   from frame 80 on, with that of the minima
 *   calibrationMode       1       together with calibrationEnable: the energy threshold is learnt
 *                                 from the loudest of six windows in frames 80..294
 *
 * Which historyUpdate? 0 covers words best, but background that becomes more than about 3 dB louder
 * counts as speech ever after. With 1 that passes within 5 s, but a long vowel becomes background
 * before it ends, so that only parts of words are detected and have to be joined. The field may
 * change between frames: a caller can set it to 1 when speech goes on for longer than anybody
 * speaks. Share of loud frames (within 20 dB of the loudest) that were decided to be speech, in ten
 * recordings of read speech with noise at the given level below it:
 *
 *                       white noise                   pink noise
 *   historyUpdate       20 dB    10 dB    5 dB        20 dB    10 dB    5 dB
 *   0                   99 %     83 %     55 %        99 %     88 %     66 %
 *   1                   62 %     35 %     17 %        68 %     47 %     28 %
 *
 * and less than 0.1 % of the frames without sound. The other fields change none of this for
 * historyUpdate 0; for 1, calibrationEnable halves the shares.
 *
 *
 * Threads, real time
 * ------------------
 * Records are independent; calls on one record must not overlap. Nothing is allocated, no flag of
 * the operators is touched, and only reset_MCRA_params writes a log line. A frame takes about 7 KB
 * of stack. Pointers must be valid, frames hold 160 samples; nothing is checked.
 */
#ifndef ORVALIS_MCRAVAD_H
#define ORVALIS_MCRAVAD_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

#define MCRA_FRAME_SAMPLES 160
#define MCRA_BINS          128 /* the lower half of a transform of 256 points */
#define MCRA_HISTORY       20  /* spectra over which minima are taken */

/*
 * The record of one detector. Unless stated otherwise, initialVADINFO sets a field to 0 and every
 * frame writes it. Powers are |Y|^2 of the unscaled transform of 16-bit samples; energies are sums
 * of 128 powers, divided by 2^31. The symbols in front are those of the papers.
 */
typedef struct VADINFO {
  /* Number of the frame, from 0; -1 before the first. Stops at INT32_MAX. */
  int32_t frameIndex;

  /* -- Powers of the bins, noise -- */
  int64_t periodogram[MCRA_BINS];         /* |Y|^2: power of the frame */
  int64_t smoothedPeriodogram[MCRA_BINS]; /* S_f: weighted sum over 9 bins, the weights add to 4 */
  int64_t recursivePower[MCRA_BINS];      /* S: S_f averaged over time, alpha_s = 0.95 */
  /* S_min: minimum of S, at least 21474. Initially every byte is 1. */
  int64_t minPower[MCRA_BINS];
  /* Ring of S, in place of S_tmp: slot frameIndex % 20 is written in frame 0 and, if historyUpdate
   * is 1, in every frame. Initially every byte is 1. */
  int64_t minHistory[MCRA_HISTORY][MCRA_BINS];
  /* p', Q31: average of the indicator I, which is 1 where S / S_min is 5 or more; alpha_p = 0.2. */
  int32_t presenceIndicatorAvg[MCRA_BINS];
  /* Q31: alpha_d + (1 - alpha_d) p', alpha_d = 0.999. Smooths noisePower in the next frame. */
  int32_t noiseSmoothing[MCRA_BINS];
  int64_t noisePower[MCRA_BINS]; /* lambda_d: noise in smoothedPeriodogram, one frame late */

  /* -- Signal to noise, presence of speech -- */
  int32_t postSnr[MCRA_BINS];      /* gamma, Q10: a posteriori SNR */
  int32_t prioriSnr[MCRA_BINS];    /* xi, Q12: a priori SNR, decision-directed, alpha = 0.92 */
  int32_t gain[MCRA_BINS];         /* G, Q15: gain that would suppress the noise */
  int32_t prioriSnrAvg[MCRA_BINS]; /* zeta, Q12: average of xi to the previous frame, beta = 0.7 */
  int32_t frameSnr;                /* zeta_frame, Q12: mean of zeta over bins 0..40 */
  int32_t speechProb[MCRA_BINS];   /* p, Q31: probability of speech; up to 0.051 counts as 0 */

  /* -- Frame decision, written by processVAD -- */
  /* Energy that two frames must exceed, if above 0.1 (0.097): initially -1, after a reset 0, then
   * what the calibration finds. */
  float energyThreshold;
  float prevSmoothedEnergy;    /* energy of smoothedPeriodogram; at most 30 in frames 1..19 */
  float prevMinEnergy;         /* energy of minPower */
  float prevFrameEnergy;       /* energy of periodogram */
  int64_t prevSpeechBins;      /* sum of speechProb, rounded down */
  float startupSmoothedEnergy; /* sum of prevSmoothedEnergy over frames 1..19 */
  float startupFrameEnergy;    /* sum of the energies of frame and predecessor, frames 1..10 */
  int32_t reserved[80];        /* 0 */

  /* -- Configuration: see above. initialVADINFO sets none of these, a reset clears two -- */
  int32_t historyUpdate;
  int32_t calibrationMode; /* cleared by a reset */
  int32_t calibrationEnable;
  int32_t lowThresholdSelect; /* cleared by a reset */

  /* -- Calibration: written while it runs, cleared by a reset -- */
  int32_t calibrationDone;  /* 1 after 500 frames; initialVADINFO leaves it */
  int32_t calibrationPhase; /* window 0..5; 6 when all have closed; initialVADINFO leaves it */
  /* Configuration too: 2 by initialVADINFO, 1 by a reset. */
  int32_t energyMargin;
  int32_t calibrationIndex;  /* frames counted in windows; stops at 215 */
  float calibrationBest;     /* largest energy of a window; initialVADINFO leaves it */
  float calibrationOlderSum; /* energy of the older half of the window */
  float calibrationNewerSum; /* energy of the newer half */
  float calibrationPeak;     /* largest newer half */
  int32_t calibrationCount;  /* frames since the calibration began */
} VADINFO;

/* Every function takes the address of the caller's pointer to the record. */

/* Sets the record's initial values; allocates nothing. */
void initialVADINFO(VADINFO **info);

/* Ends a calibration and clears its results: sets energyMargin to 1; energyThreshold,
 * lowThresholdSelect and all calibration fields but calibrationEnable to 0. Spectra and noise stay.
 * Writes the log line "TQE: reset MCRA params". */
void reset_MCRA_params(VADINFO **info);

/* Analyses a frame of 160 samples into the record without a decision. The frame's first `length`
 * samples are windowed in place; more than 160 count as 160. Pass 160. */
void ApplyVAD(VADINFO **info, int16_t *frame, int32_t length);

/*
 * ApplyVAD, then the decision: 1 for speech, 0 for none. Frame 0 is never speech. A later frame is
 * speech if, together with its predecessor, it has
 *
 *   an energy above energyThreshold and its floor of 0.1 or 0.097,
 *   a smoothed energy above 0.4 and above energyMargin times a scale,
 *   and a sum of speechProb, in bins, above 40.
 *
 * The scale is 1 up to frame 79. From then on it is the energy of the minima with
 * calibrationEnable; without, s = startupSmoothedEnergy / 20, but 0.5 for s up to 0.5 and 1 for s
 * up to 1.
 *
 * exponent, above 0 and at most 0.84, applies to a threshold under calibration: 2 x^exponent /
 * (2^31 - 1), with x the mean of a frame's sum of powers in the loudest window.
 */
int32_t processVAD(VADINFO **info, int16_t *frame, int32_t length, float exponent);

/*
 * Why a frame was decided as it was. Frame 0 apart, it is speech if each of the three values with a
 * threshold exceeds it. Energies and bins are those of the frame and its predecessor together.
 */
typedef struct McraReasons {
  int32_t frameIndex;
  int32_t answer;                          /* the decision: 1 for speech, 0 for none */
  float energy, energyThreshold;           /* of periodogram */
  float smoothedEnergy, smoothedThreshold; /* of smoothedPeriodogram */
  float minEnergy;                         /* of minPower */
  float frameSnr;                          /* mean a priori SNR, as a ratio */
  int64_t speechBins, speechBinsThreshold; /* sum of speechProb, in bins */
  /* Of this frame alone, for the reasons of the next one. */
  float prevEnergy, prevSmoothedEnergy, prevMinEnergy;
  int64_t prevSpeechBins;
} McraReasons;

/*
 * Explains the decision that processVAD has just made, and returns it. Fill `reasons` with zeros
 * before the first frame and call this after every frame; it then holds the reasons for the last
 * one. The record is only read.
 */
int32_t explainVAD(VADINFO **info, McraReasons *reasons);

#ifdef __cplusplus
}
#endif

#endif /* ORVALIS_MCRAVAD_H */
