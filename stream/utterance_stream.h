/*
 * utterance_stream.h - utterances from audio that was cut anyhow
 *
 * The detector of orvalis.h answers frame by frame, late by its confirmation run and its closing
 * pause, and leaves the hangover to its caller. This stream does what callers then write by hand:
 * it takes audio in pieces of any size, dates the answers back, joins what a short silence has cut,
 * pads, and hands out utterances. No result depends on how the audio was cut.
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
 * From answers to utterances
 * --------------------------
 * A run of answers 1 is a piece. A piece is dated back by the detector's own delay, in frames of
 * 10 ms, clipped to the input and to the previous piece:
 *
 *   content type     start   end at 16 kHz   end at 8 kHz
 *   0, 1             5       25              28
 *   2 and more       3       14              17
 *
 * Null audio (a frame with more than 60 zero samples in a row) is silence. A piece that it
 * interrupts ends with its last 1, not dated back; if the detector answers 1 in the first frame
 * that is not null again, the piece that begins there is not dated back either. For content types
 * of 2 and more a piece of at most 19 answers is one that the detector refused as too short; it is
 * not handed out.
 *
 * Pieces join when an answer 1 comes at most `hangover_ms` after the last one. Padding lengthens an
 * utterance but never crosses a neighbour: each of two owns half of the gap between them.
 *
 * Threads: as for an EPD instance. Memory: all of it is taken in OpenUtteranceStream.
 */
#ifndef ORVALIS_UTTERANCE_STREAM_H
#define ORVALIS_UTTERANCE_STREAM_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

typedef struct UtteranceStream UtteranceStream;

typedef struct UtteranceSettings {
  int32_t rate_hz;       /* 16000 or 8000 */
  int32_t input_gain;    /* 0: as it is, 1: divided by 4, 2: multiplied by 4 (wrapping) */
  int32_t content_type;  /* timing of the detector: 0, 1, or 2 and more; see orvalis.h */
  int32_t hangover_ms;   /* longest time between answers 1 that joins pieces; 0 joins none */
  int32_t pad_before_ms; /* 0 or more, added before an utterance */
  int32_t pad_after_ms;  /* 0 or more, added after it */
  int32_t pcm_dump;      /* 1 writes the detector's dump files; see InitializeEPD in orvalis.h */
} UtteranceSettings;

/* 16 kHz, no gain, content type 0, half a second of hangover, no padding, no dump. */
#define UTTERANCE_SETTINGS_DEFAULT \
  { 16000, 0, 0, 500, 0, 0, 0 }

/* Times are counts of samples since the stream was opened. */
typedef struct Utterance {
  int64_t start;  /* first sample */
  int64_t end;    /* one past the last sample */
  int64_t began;  /* samples heard when the first answer 1 was given */
  int64_t ended;  /* samples heard when the last answer 1 was given */
  int32_t number; /* 1, 2, 3 ... */
  int32_t open;   /* 1 if the detector still answered 1 when the audio ended */
} Utterance;

/* Utterances that may wait in a stream. */
#define UTTERANCE_QUEUE_LENGTH 16

/* Opens a stream. NULL if memory runs out, settings is NULL or a setting is out of range. */
UtteranceStream *OpenUtteranceStream(const UtteranceSettings *settings);

/*
 * Judges audio. Returns how many of the numSample samples were taken: fewer only when the queue is
 * full; take utterances and push the rest. -1 if stream is NULL, if pcm is NULL though
 * numSample > 0, if numSample < 0, or after the flush.
 */
int32_t PushUtteranceAudio(UtteranceStream *stream, const int16_t *pcm, int32_t numSample);

/* Takes the oldest decided utterance: 1 if there was one, 0 if not, -1 if a pointer is NULL. */
int32_t NextUtterance(UtteranceStream *stream, Utterance *utterance);

/*
 * The first sample that an utterance still to be taken may hold: a caller that keeps audio to cut
 * utterances from it can forget what is before. It never goes back. -1 if stream is NULL.
 */
int64_t EarliestUtteranceStart(const UtteranceStream *stream);

/*
 * Ends the audio and closes what is open; there is always room for it in the queue. Returns the
 * number of samples behind the last whole frame, which were not judged (0..159), also when called
 * again; -1 if stream is NULL.
 */
int32_t FlushUtteranceStream(UtteranceStream *stream);

/* Releases the stream. Utterances not taken are lost. Returns 0, or -1 if stream is NULL. */
int32_t CloseUtteranceStream(UtteranceStream *stream);

#ifdef __cplusplus
}
#endif

#endif /* ORVALIS_UTTERANCE_STREAM_H */
