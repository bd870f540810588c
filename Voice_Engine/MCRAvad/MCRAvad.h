/*
 * MCRAvad.h - the MCRA voice activity detector of libOrvalis.so
 *
 * A second detector, independent of that of orvalis.h, for callers that drive it themselves. It
 * estimates the noise in 128 bins of the spectrum by minima-controlled recursive averaging, derives
 * from it how likely speech is in each bin, and answers every frame with speech or no speech: by
 * energies, and by the number of bins in which speech is likely.
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
 * Everything is counted in frames and bins, so that the sample rate is the caller's choice:
 *
 *   rate      a frame   a bin     bins 0..40, where voices are sought
 *   16 kHz    10 ms     62.5 Hz   0 to 2.5 kHz
 *   8 kHz     20 ms     31.25 Hz  0 to 1.25 kHz
 *
 * The first frame is never speech, and it is the first estimate of the noise: begin with
 * background. Frames below about -45 dB of full scale are rarely speech (-48 dB with an
 * energyMargin of 1).
 *
 *
 * Life of a record
 * ----------------
 * Allocate it and fill it with zeros; initialVADINFO; if wanted, configure it by writing the fields
 * marked "configuration"; then processVAD frame by frame. All other fields are for reading.
 * initialVADINFO again starts anew and leaves the configuration, energyMargin apart, but not the
 * state of a calibration: reset_MCRA_params clears that.
 *
 * Configuration:
 *
 *   field                 value   meaning
 *   historyUpdate         0       minima are those of all time: noise may only fall
 *                         1       minima are those of the last 20 frames: noise may rise too
 *                                 (other values count as 0)
 *   energyMargin          2       factor of the smoothed-energy test; 1 after a reset
 *   lowThresholdSelect    1       least energy threshold 0.097; other values: 0.1
 *   calibrationEnable     0       the smoothed energy is held against that of frames 1..19
 *                         other   from frame 80 on, against that of the minima
 *   calibrationMode       1       together with calibrationEnable: the energy threshold is learnt
 *                                 from the loudest of six windows in frames 80..294
 *
 * Which historyUpdate? With 0 words are covered best, while background that becomes more than about
 * 3 dB louder counts as speech ever after. With 1 that passes within 5 s, but a long vowel counts
 * as background before it ends, so that only pieces of words are answered with 1 and have to be
 * joined. The field may change between frames: a caller can set it to 1 when speech goes on for
 * longer than anybody speaks. Of ten recordings of read speech, in noise below the level of the
 * speech, the share of loud frames (within 20 dB of the loudest) that were answered with 1:
 *
 *                       white noise                   pink noise
 *   historyUpdate       20 dB    10 dB    5 dB        20 dB    10 dB    5 dB
 *   0                   99 %     83 %     55 %        99 %     88 %     66 %
 *   1                   62 %     35 %     17 %        68 %     47 %     28 %
 *
 * and below 0.1 % of the frames without any sound in them. The other fields change
 * none of this for historyUpdate 0; for 1, calibrationEnable halves the shares.
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
#define MCRA_HISTORY       20  /* spectra among which minima are sought */

/*
 * The record of one detector. Unless said otherwise initialVADINFO sets a field to 0 and every
 * frame writes it. Powers are squares of the sums of a frame's windowed samples; energies are sums
 * of a spectrum's 128 powers, divided by 2^31.
 */
typedef struct VADINFO {
  /* Number of the frame, from 0; -1 before the first. Stops at INT32_MAX. */
  int32_t frameIndex;

  /* -- Powers of the bins, noise -- */
  int64_t periodogram[MCRA_BINS];         /* power of the frame */
  int64_t smoothedPeriodogram[MCRA_BINS]; /* weighted sum over 9 bins, of weight 4 */
  int64_t recursivePower[MCRA_BINS];      /* its average over about 20 frames */
  /* The least of these averages, at least 21474. Initially every byte is 1. */
  int64_t minPower[MCRA_BINS];
  /* Ring of these averages: slot frameIndex % 20 is written in frame 0 and, if historyUpdate is 1,
   * in every frame. Initially every byte is 1. */
  int64_t minHistory[MCRA_HISTORY][MCRA_BINS];
  int32_t presenceIndicatorAvg[MCRA_BINS]; /* Q31; average of "five times the minimum" */
  int32_t noiseSmoothing[MCRA_BINS];       /* Q31, 0.999 and above: what noisePower will keep */
  int64_t noisePower[MCRA_BINS];           /* noise in smoothedPeriodogram, one frame late */

  /* -- Signal to noise, presence of speech -- */
  int32_t postSnr[MCRA_BINS];      /* Q10; a posteriori SNR */
  int32_t prioriSnr[MCRA_BINS];    /* Q12; a priori SNR */
  int32_t gain[MCRA_BINS];         /* Q15; gain that would take the noise out */
  int32_t prioriSnrAvg[MCRA_BINS]; /* Q12; average of prioriSnr up to the previous frame */
  int32_t frameSnr;                /* Q12; mean of prioriSnrAvg over bins 0..40 */
  int32_t speechProb[MCRA_BINS];   /* Q31; probability of speech, 0 if not above 0.051 */

  /* -- Frame decision, written by processVAD -- */
  /* Energy that two frames must exceed, if above 0.1 (0.097): -1 initially, 0 after a reset, then
   * the calibration's. */
  float energyThreshold;
  float prevSmoothedEnergy;    /* energy of smoothedPeriodogram; in frames 1..19 at most 30 */
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
  int32_t calibrationIndex;  /* frames taken in; stops at 215 */
  float calibrationBest;     /* largest energy of a window; initialVADINFO leaves it */
  float calibrationOlderSum; /* energy of the older half of the window */
  float calibrationNewerSum; /* energy of the newer half */
  float calibrationPeak;     /* largest newer half */
  int32_t calibrationCount;  /* frames since the calibration began */
} VADINFO;

/* Every function takes the address of the caller's pointer to the record. */

/* Sets the record's initial values; allocates nothing. */
void initialVADINFO(VADINFO **info);

/* Ends a calibration and clears what it has learnt: energyMargin is 1, energyThreshold 0, all
 * calibration fields but calibrationEnable and lowThresholdSelect are 0. Spectra and noise stay.
 * Writes the log line "TQE: reset MCRA params". */
void reset_MCRA_params(VADINFO **info);

/* Analyses a frame of 160 samples into the record without a decision. The frame's first `length`
 * samples are windowed in place; more than 160 count as 160. Pass 160. */
void ApplyVAD(VADINFO **info, int16_t *frame, int32_t length);

/*
 * ApplyVAD, then the decision: 1 for speech, 0 for none. Frame 0 is never speech. A later one is if
 * frame and predecessor together have
 *
 *   an energy above energyThreshold and its floor of 0.1 or 0.097,
 *   a smoothed energy above 0.4 and above energyMargin times a scale,
 *   and more than 40 bins' worth of speechProb.
 *
 * The scale is 1 up to frame 79. Then it is a 20th of startupSmoothedEnergy, but 0.5 up to 0.5 and
 * 1 up to 1; or with calibrationEnable the energy of the minima.
 *
 * exponent, 0.84 or less and above 0, shapes a threshold that is being calibrated: 2 x^exponent /
 * (2^31 - 1), with x the mean of a frame's sum of powers in the loudest window.
 */
int32_t processVAD(VADINFO **info, int16_t *frame, int32_t length, float exponent);

/*
 * Why a frame was answered as it was. It is speech if each of the first three values exceeds its
 * threshold, frame 0 apart. Energies and bins are those of the frame and its predecessor together.
 */
typedef struct McraReasons {
  int32_t frameIndex;
  int32_t answer;                          /* 1 for speech, 0 for none */
  float energy, energyThreshold;           /* of periodogram */
  float smoothedEnergy, smoothedThreshold; /* of smoothedPeriodogram */
  float minEnergy;                         /* of minPower */
  float frameSnr;                          /* mean a priori SNR, as a ratio */
  int64_t speechBins, speechBinsThreshold; /* bins' worth of speechProb */
  /* What the next frame's reasons need of this frame. */
  float prevEnergy, prevSmoothedEnergy, prevMinEnergy;
  int64_t prevSpeechBins;
} McraReasons;

/*
 * Explains the frame that processVAD has just answered, and returns that answer. Fill `reasons`
 * with zeros before the first frame and call this after every frame; it then holds the reasons for
 * the last one. The record is only read.
 */
int32_t explainVAD(VADINFO **info, McraReasons *reasons);

#ifdef __cplusplus
}
#endif

#endif /* ORVALIS_MCRAVAD_H */
