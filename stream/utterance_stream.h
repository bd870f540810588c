/*
 * utterance_stream.h - utterances from audio in chunks of any size
 *
 * A detector decides frame by frame, partly with a delay, and leaves the hangover to its caller.
 * This stream does what callers would then write by hand, for either detector of the library: it
 * takes audio in chunks of any size, dates decisions back, joins speech over short silences, drops
 * what is too short, pads, and hands out utterances. No result depends on the chunk size.
 *
 *
 * A worked example
 * ----------------
 *
 *     #include <stdio.h>
 *     #include "utterance_stream.h"
 *
 *     int print_utterances(const int16_t *pcm, int32_t samples)
 *     {
 *         UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;    // 16 kHz
 *         UtteranceStream *stream = OpenUtteranceStream(&settings);
 *         Utterance found;
 *         int32_t done = 0;
 *         if (stream == NULL)
 *             return -1;
 *         do {
 *             done += PushUtteranceAudio(stream, pcm + done, samples - done);
 *             if (done == samples)
 *                 FlushUtteranceStream(stream);
 *             while (NextUtterance(stream, &found) == 1)
 *                 printf("%d: %.2f s to %.2f s\n", (int)found.number,
 *                        found.start / 16000.0, found.end / 16000.0);
 *         } while (done < samples);
 *         return CloseUtteranceStream(stream);
 *     }
 *
 * (tests/example_stream.c is this example; it is compiled and run as C and as C++.)
 *
 *
 * The detectors
 * -------------
 *   UTTERANCE_CHANNEL_ENERGY   that of orvalis.h: confirms speech over several frames, and at
 *                              16 kHz suppresses the noise first
 *   UTTERANCE_MCRA             that of MCRAvad.h: decides on each frame at once. It has its own
 *                              configuration instead of input_gain, content_type and pcm_dump
 *
 *
 * From decisions to utterances
 * ----------------------------
 * A run of decisions for speech is a segment. It is dated back by the detector's own delay, here in
 * ms, but not before the start of the input or the end of the previous segment:
 *
 *   detector         content type   start   end at 16 kHz   end at 8 kHz
 *   channel energy   0, 1           50      250             280
 *                    2 and more     30      140             170
 *   MCRA             0              0       0               0
 *
 * The channel-energy detector decides on frames of 10 ms, the MCRA detector on frames of 160
 * samples.
 *
 * To the channel-energy detector null audio (a frame with more than 60 zero samples in a row) is
 * silence. A segment that it interrupts ends with its last frame of speech, not dated back; if the
 * first frame after the null audio is speech again, the segment that begins there is not dated back
 * either. For content types of 2 and more, a segment of at most 19 frames is one that the detector
 * refused as too short; it is dropped.
 *
 * Segments are joined if a decision for speech comes at most `hangover_ms` after the last one; what
 * then holds less than `min_speech_ms` is dropped. Padding lengthens an utterance but never reaches
 * into its neighbour: each of two may take half of the gap between them.
 *
 *
 * The first word of a recording
 * -----------------------------
 * The channel-energy detector learns the noise first and never decides for speech in its first 39
 * frames, so that speech at the very beginning of a recording is found only after 0.39 s. With
 * `lead_in` the detector first processes 0.6 s made from the recording: the 100 ms of minimum
 * variance among the first 10 s, without null audio, forwards and backwards in turn. Nothing else
 * is affected: positions, frames and dump files are those of the audio alone.
 *
 * For that the stream holds the first 10 s (320 KB at 16 kHz). Utterances in them are decided once
 * the 10 s are complete or flushed: the call that completes them, and NextUtterance if the queue
 * was full, process up to 1000 frames at once. Leave it off for live audio, which usually begins
 * with a pause of 0.39 s.
 *
 *
 * Threads: as for an EPD instance. Memory: allocated only in OpenUtteranceStream.
 */
#ifndef ORVALIS_UTTERANCE_STREAM_H
#define ORVALIS_UTTERANCE_STREAM_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

typedef struct UtteranceStream UtteranceStream;

/* Values of UtteranceSettings.detector. */
#define UTTERANCE_CHANNEL_ENERGY 0
#define UTTERANCE_MCRA           1

/* Configuration of the MCRA detector: fields of its record and the exponent, as in MCRAvad.h. */
typedef struct McraSettings {
  int32_t historyUpdate;
  int32_t energyMargin;
  int32_t lowThresholdSelect;
  int32_t calibrationEnable;
  int32_t calibrationMode;
  float exponent;
} McraSettings;

/* The noise estimate may only fall; no calibration. */
#define MCRA_SETTINGS_DEFAULT \
  { 0, 2, 0, 0, 0, 0.84f }

/* A frame, and why its detector decided as it did: see epd_reasons.h and MCRAvad.h. */
typedef struct UtteranceFrame {
  int64_t start;                  /* its first sample */
  const int16_t *pcm;             /* its samples, as they were pushed */
  int32_t samples;                /* 160, or 80 for the channel-energy detector at 8 kHz */
  int32_t speech;                 /* the detector's decision: 1 or 0 */
  const struct EpdReasons *epd;   /* of the channel-energy detector; else NULL */
  const struct McraReasons *mcra; /* of the MCRA detector; else NULL */
} UtteranceFrame;

typedef struct UtteranceSettings {
  int32_t rate_hz;       /* 16000 or 8000 */
  int32_t input_gain;    /* 0: as it is, 1: divided by 4, 2: multiplied by 4 (wrapping) */
  int32_t content_type;  /* timing of the detector: 0, 1, or 2 and more; see orvalis.h */
  int32_t hangover_ms;   /* maximum time between decisions for speech that are joined; 0: none */
  int32_t pad_before_ms; /* 0 or more, added before an utterance */
  int32_t pad_after_ms;  /* 0 or more, added after it */
  int32_t pcm_dump;      /* 1 writes the detector's dump files; see InitializeEPD in orvalis.h */
  int32_t detector;      /* UTTERANCE_CHANNEL_ENERGY or UTTERANCE_MCRA */
  int32_t min_speech_ms; /* 0 or more: minimum length of an utterance, without padding */
  int32_t lead_in;       /* 1: for recordings, whose first word may come at once; see above */

  /* Read by OpenUtteranceStream. NULL: MCRA_SETTINGS_DEFAULT, or another detector. */
  const McraSettings *mcra;

  /* Unless NULL, called with each decision, from within calls on the stream; it must not make such
   * calls itself. What `frame` points to is valid until it returns. */
  void (*on_frame)(const UtteranceFrame *frame, void *user);
  void *user; /* passed to on_frame */
} UtteranceSettings;

/* Channel energy at 16 kHz, no gain, content type 0, half a second of hangover, and padding that
 * keeps soft beginnings and ends of words. */
#define UTTERANCE_SETTINGS_DEFAULT \
  { 16000, 0, 0, 500, 150, 250, 0, UTTERANCE_CHANNEL_ENERGY, 0, 0, 0, 0, 0 }

/* Times are counts of samples since the stream was opened. */
typedef struct Utterance {
  int64_t start;  /* first sample */
  int64_t end;    /* one past the last sample */
  int64_t began;  /* samples processed up to the first decision for speech */
  int64_t ended;  /* samples processed up to the last one */
  int32_t number; /* 1, 2, 3 ... */
  int32_t open;   /* 1 if the last frame of the audio was speech */
} Utterance;

/* Number of utterances that may wait in a stream. */
#define UTTERANCE_QUEUE_LENGTH 16

/* Opens a stream. NULL if memory runs out, settings is NULL, a setting is out of range, or the
 * detector does not take it. */
UtteranceStream *OpenUtteranceStream(const UtteranceSettings *settings);

/*
 * Processes audio. Returns how many of the numSample samples were taken: fewer only when the queue
 * is full; take utterances and push the rest. -1 if stream is NULL, if pcm is NULL though
 * numSample > 0, if numSample < 0, or after the flush.
 */
int32_t PushUtteranceAudio(UtteranceStream *stream, const int16_t *pcm, int32_t numSample);

/* Takes the oldest decided utterance: 1 if there was one, 0 if not, -1 if a pointer is NULL. */
int32_t NextUtterance(UtteranceStream *stream, Utterance *utterance);

/*
 * The first sample that an utterance still to be taken may hold: a caller that keeps audio to
 * extract utterances from it can drop what is before. It never decreases. -1 if stream is NULL.
 */
int64_t EarliestUtteranceStart(const UtteranceStream *stream);

/*
 * Ends the audio and closes what is open. NextUtterance then hands out all that is left, even if it
 * exceeds the queue. Returns the number of samples after the last whole frame, which are not
 * processed (0..159), also when called again; -1 if stream is NULL.
 */
int32_t FlushUtteranceStream(UtteranceStream *stream);

/* Releases the stream. Utterances not taken are lost. Returns 0, or -1 if stream is NULL. */
int32_t CloseUtteranceStream(UtteranceStream *stream);

#ifdef __cplusplus
}
#endif

#endif /* ORVALIS_UTTERANCE_STREAM_H */
