/*
 * enhancement_stream.h - better audio from audio in chunks of any size
 *
 * The suppressor and the dynamics control of orvalis.h process whole frames. The suppressor delays
 * its output, and leaves frames that it does not suppress to its caller. This stream does what
 * callers would then write by hand: it takes 16 kHz audio in chunks of any size, makes frames of
 * it, fills in the delayed input where nothing is suppressed, makes up for the delay, and flushes
 * the end. No sample depends on the chunk size.
 *
 *
 * A worked example: a recording without its noise, and levelled
 * -------------------------------------------------------------
 *
 *     #include <stddef.h>
 *     #include "enhancement_stream.h"
 *
 *     // `out` has room for samples + ENHANCEMENT_HELD_BACK. Returns how many there are, or -1.
 *     int32_t enhance(const int16_t *pcm, int32_t samples, int16_t *out)
 *     {
 *         EnhancementSettings settings = ENHANCEMENT_SETTINGS_DEFAULT;    // one microphone, 13 dB
 *         EnhancementStream *stream;
 *         int32_t ready = 0;
 *         settings.level = 1;
 *         stream = OpenEnhancementStream(&settings);
 *         if (stream == NULL)
 *             return -1;
 *         for (int32_t at = 0; at < samples; at += 1000) {
 *             int32_t chunk = samples - at < 1000 ? samples - at : 1000;
 *             ready += PushEnhancementAudio(stream, pcm + at, chunk,
 *                                           out + ready, chunk + ENHANCEMENT_HELD_BACK);
 *         }
 *         ready += FlushEnhancementStream(stream, out + ready, ENHANCEMENT_HELD_BACK);
 *         CloseEnhancementStream(stream);
 *         return ready;
 *     }
 *
 * (tests/example_enhancement.c is this example; it is compiled and run as C and as C++.)
 *
 *
 * What comes out
 * --------------
 * One channel, whatever comes in. The suppressor goes first, dynamics control second:
 *
 *   microphones   suppression_db   without level                                  delay
 *   1             0                the input                                      0 samples
 *   1             13, 18           without its noise                              48
 *   2             0                the first microphone                           0
 *   2             13               the first microphone, without the noise of     160
 *                                  both; noise falls by up to 14 dB
 *
 * Frames that are not suppressed give the first microphone unchanged, with the same delay: null
 * audio, the time until the level settles, and very quiet frames of two microphones (see
 * ProcessDoNSFrame in orvalis.h). With `level` all of this is levelled (see ProcessDRC), in frames
 * of 160 samples that begin with the first sample of the input.
 *
 * Of n samples a microphone, an aligned stream gives n: sample i of the output belongs to sample i
 * of the input. One that is not aligned gives the same samples with the delay in front, n + delay
 * altogether, and so gives them a little earlier. Of no audio either gives none.
 *
 * The last frame is completed, and the delay flushed, with the end of the audio mirrored. Zeros
 * would be null audio, and no speech ends so abruptly.
 *
 *
 * Room
 * ----
 * Samples come out in whole frames: a push gives at most numSample / microphones + 160, a flush at
 * most ENHANCEMENT_HELD_BACK. An `out` with room for as many samples as are pushed and
 * ENHANCEMENT_HELD_BACK more is always large enough. If it is too small, the call returns -1 and
 * does nothing: no audio is taken and none lost. The same call with more room, or one with less
 * audio, goes on where the stream was.
 *
 * Threads: streams are independent of each other and of every handle of orvalis.h, with two
 * microphones too. Calls on one stream must not overlap. Memory: allocated only in
 * OpenEnhancementStream.
 */
#ifndef ORVALIS_ENHANCEMENT_STREAM_H
#define ORVALIS_ENHANCEMENT_STREAM_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

typedef struct EnhancementStream EnhancementStream;

typedef struct EnhancementSettings {
  int32_t microphones;    /* 1, or 2: interleaved pairs, the first microphone first */
  int32_t suppression_db; /* 0 for none, 13, or with one microphone 18 */
  int32_t level;          /* 1: dynamics control, 0: none */
  int32_t aligned;        /* 1: the output is not delayed, 0: it keeps the delay */
} EnhancementSettings;

/* One microphone, 13 dB, not levelled, aligned. */
#define ENHANCEMENT_SETTINGS_DEFAULT \
  { 1, 13, 0, 1 }

/* Maximum number of samples that a stream holds back, and that a flush gives. */
#define ENHANCEMENT_HELD_BACK 319

/* Opens a stream. NULL if memory runs out, settings is NULL or a setting is not in the table. */
EnhancementStream *OpenEnhancementStream(const EnhancementSettings *settings);

/* The delay in samples, which an aligned stream makes up for: 0, 48 or 160; -1 if stream is NULL.
 */
int32_t EnhancementDelay(const EnhancementStream *stream);

/*
 * Takes numSample samples, those of two microphones counted together: half a pair waits for the
 * other half. Writes what is ready to `out`, which must not overlap the input, and returns how many
 * samples that are: from 0 to numSample / microphones + 160.
 *
 * -1, with nothing done, if they are more than `room`, if stream is NULL, if pcm is NULL though
 * numSample > 0, if `out` is NULL though room > 0, if numSample < 0 or room < 0, or after the
 * flush.
 */
int32_t PushEnhancementAudio(EnhancementStream *stream, const int16_t *pcm, int32_t numSample,
                             int16_t *out, int32_t room);

/*
 * Ends the audio. Writes the rest of the output and returns its length: 0 to ENHANCEMENT_HELD_BACK,
 * and 0 when called again.
 *
 * -1, with nothing done, if it is longer than `room`, if stream is NULL, if `out` is NULL though
 * room > 0, if room < 0, or if half a pair waits.
 */
int32_t FlushEnhancementStream(EnhancementStream *stream, int16_t *out, int32_t room);

/* How often something occurred. */
typedef struct EnhancementCount {
  int64_t count;
  int64_t first; /* the first time: sample of a microphone, from 0; -1 for never */
} EnhancementCount;

/* What occurred since the stream was opened. Full scale is 32767 and -32768. */
typedef struct EnhancementCounts {
  EnhancementCount clipped_in;  /* samples of the input at full scale, of all microphones */
  EnhancementCount loud_frames; /* frames that dynamics control found loud; see ProcessDRC */
  EnhancementCount clipped_out; /* samples of the output at full scale */
  int64_t is_loud;              /* 1 if the latest frame was loud */
} EnhancementCounts;

/* Stores the counts. Returns 0, or -1 if a pointer is NULL. */
int32_t GetEnhancementCounts(const EnhancementStream *stream, EnhancementCounts *counts);

/* Releases the stream. Samples still held back are lost. Returns 0, or -1 if stream is NULL. */
int32_t CloseEnhancementStream(EnhancementStream *stream);

#ifdef __cplusplus
}
#endif

#endif /* ORVALIS_ENHANCEMENT_STREAM_H */
