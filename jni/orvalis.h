/*
 * orvalis.h - the flat C interface of libOrvalis.so
 *
 * Orvalis is the front end that a voice application puts before its recogniser. It takes 16-bit
 * PCM, mono or from two microphones, in frames of 10 ms and tells whether the user is speaking and
 * when an utterance begins and ends (end-point detection, EPD), gives frames back with the noise
 * suppressed (NS), levels recorded speech (dynamics control, DRC), and answers small questions
 * about a block of samples: how loud it is, what its spectrum looks like.
 *
 * Audio is signed 16-bit, native byte order, passed as a pointer and a number of samples. A frame
 * is 160 samples at 16 kHz or 80 samples at 8 kHz; other rates must be converted first. Two
 * microphones are interleaved, 160 pairs a frame.
 *
 * ONE TWO-MICROPHONE SUPPRESSOR A PROCESS: all instances created with micCount 2 share one state.
 * Creating a second one starts the first one afresh, and their calls must not be interleaved or
 * overlap. Every other instance is independent of all others, and so is each enhancement stream
 * (enhancement_stream.h), with two microphones too.
 *
 *
 * A worked example: feed a recording frame by frame, print where the answer changes
 * ---------------------------------------------------------------------------------
 *
 *     #include <stdio.h>
 *     #include "orvalis.h"
 *
 *     int report_speech(const int16_t *pcm, int32_t samples)
 *     {
 *         EpdInstance *epd = InitializeEPD(0, 0);    // 16 kHz, no dump files
 *         int32_t previous = 0;
 *         if (epd == NULL)
 *             return -1;
 *         for (int32_t at = 0; at + 160 <= samples; at += 160) {
 *             int32_t speech = ProcessEPDFrame(epd, pcm + at, 160);
 *             if (speech != previous)
 *                 printf("%s after %.2f s\n", speech ? "speech" : "silence", (at + 160) / 16000.0);
 *             previous = speech;
 *         }
 *         return FreeMemoryEPD(epd);
 *     }
 *
 * (tests/example_epd.c is this example; it is compiled and run as C and as C++.)
 *
 * Answers come late by design: speech is confirmed by a run of voiced frames and ended by a pause.
 * A caller that wants utterances with their true borders, or has audio in pieces of any size, uses
 * the utterance stream of utterance_stream.h, which stands on this interface.
 *
 *
 * Threads
 * -------
 * The library starts no threads and takes no locks. Instances are independent, those with two
 * microphones excepted (above): different threads may use different instances at the same time.
 * Calls on one instance must not overlap. The queries have no state. The only words shared by all
 * instances are the overflow and carry flags of the fixed-point operators (basic_op.h); no answer
 * depends on them.
 *
 * Real time
 * ---------
 * Frame calls allocate nothing and take no lock. They write log lines, and dump files where these
 * were asked for; see "Host services" to keep a sink cheap.
 */
#ifndef ORVALIS_H
#define ORVALIS_H

#include <stddef.h>
#include <stdint.h>

#include "epd_reasons.h"

#ifdef __cplusplus
extern "C" {
#endif

/* The version of the library, "160705". The string is constant and never freed. */
const char *GetVersion(void);

/*
 * Changes when a struct or a function of a public header changes incompatibly. A program compares
 * what the library answers with what its own headers say.
 */
#define ORVALIS_ABI_VERSION 1
int32_t OrvalisAbiVersion(void);

/* ============================================================================================ */
/* End-point detection                                                                          */
/* ============================================================================================ */

/* One detector: opaque, owned by the caller from InitializeEPD to FreeMemoryEPD. */
typedef struct EpdInstance EpdInstance;

/*
 * Creates a detector.
 *
 * mode is three decimal fields packed into one number, gain * 10000 + rate * 1000 + sub-mode:
 *
 *   field      value     meaning
 *   gain       0         input as it is
 *              1         input divided by 4 (arithmetic shift)
 *              2         input multiplied by 4, wrapping around beyond 16 bits
 *              other     as 0
 *   rate       0         16 kHz, frames of 160 samples
 *              1         8 kHz, frames of 80 samples
 *              2..9      as 0
 *   sub-mode   0..3      kept for the log; others count as 0
 *
 *   0 = 16 kHz   1000 = 8 kHz   10000 = 16 kHz with input / 4   21000 = 8 kHz with input * 4
 *
 * A negative mode divides toward zero, so that its rate field is negative, which selects 8 kHz.
 *
 * pcmDumpEnabled: 1 appends raw 16-bit PCM to two files named after the handle in decimal,
 * "/sdcard/VRpreprocess/<handle>_inputEPD.pcm" (what was judged, before suppression) and
 * "..._resultEPD.pcm" (0, 1000 = speech or 2000 = end of speech for every sample). A file that
 * cannot be opened is left out silently. Any other value writes none.
 *
 * Returns NULL if memory runs out.
 */
EpdInstance *InitializeEPD(int32_t mode, int32_t pcmDumpEnabled);

/*
 * Judges numSample samples, whole frames of 160 (16 kHz) or 80 (8 kHz). The buffer is not changed.
 *
 *   1    at least one frame was answered with speech or end of speech
 *   0    none was; or numSample < 1; or the buffer ends in a partial frame
 *   -1   epd is NULL, or pcm is NULL though numSample > 0
 *
 * Pass whole frames, best one at a time: of several frames the answers are folded into one. A
 * buffer that ends in a partial frame has its whole frames judged, but returns 0 and is not
 * counted.
 *
 * A frame with more than 60 zero samples in a row is null audio: it is not judged and counts as no
 * answer. The first 39 judged frames are never speech. Suppression at 16 kHz begins once the audio
 * has settled: with the first frame if fewer than 120 of its samples are of magnitude 1 to 4, else
 * after three such frames, and after 200 ms in any case.
 *
 * Speech is answered from the 6th voiced frame in a row on; it ends when 25 frames of pause have
 * added up. Four voiced frames in a row forget a pause.
 */
int32_t ProcessEPDFrame(EpdInstance *epd, const int16_t *pcm, int32_t numSample);

/*
 * The same with the caller's choice of timing:
 *
 *   contentType   onset            pause that ends speech   shortest utterance
 *   0, 1          6 voiced frames  25 frames                any
 *   2 and more    4 voiced frames  14 frames                20 frames; shorter ones end in 0
 *
 * A negative content type counts as large. ProcessEPDFrame uses the rate field of the mode.
 */
int32_t ProcessEPDFrameByCnttype(EpdInstance *epd, const int16_t *pcm, int32_t numSample,
                                 int32_t contentType);

/* Identical to ProcessEPDFrameByCnttype; `mode` is the content type. */
int32_t ProcessEPDFrameByMode(EpdInstance *epd, const int16_t *pcm, int32_t numSample,
                              int32_t mode);

/*
 * The same as ProcessEPDFrameByCnttype, and why: `reasons` is set to those of the last frame of the
 * buffer that was judged (see epd_reasons.h), or left alone if the call returns -1 because pcm is
 * NULL. It may be NULL.
 */
int32_t ProcessEPDFrameExplained(EpdInstance *epd, const int16_t *pcm, int32_t numSample,
                                 int32_t contentType, EpdReasons *reasons);

/*
 * Forgets the utterance in progress and turns hangover log lines on again. What the detector has
 * learnt of the noise, and the count of frames, stay. Returns 0, or -1 if epd is NULL.
 */
int32_t ResetEPDparams(EpdInstance *epd);

/*
 * Turns the hangover log lines of this detector off until the next reset. `value` is not used.
 * Returns 0, or -1 if epd is NULL.
 */
int32_t setLogging(EpdInstance *epd, int32_t value);

/* Releases the detector and closes its dump files. Returns 0, or -1 if epd is NULL. */
int32_t FreeMemoryEPD(EpdInstance *epd);

/* ============================================================================================ */
/* Noise suppression                                                                            */
/* ============================================================================================ */

/* One suppressor: opaque, owned by the caller from InitializeDoNS to FreeMemoryNS. */
typedef struct NsInstance NsInstance;

/*
 * Creates a noise suppressor for 16 kHz.
 *
 *   micCount   mode                         samples a frame       suppresses    delay
 *   1          0 (or rate digit 0)          160                   13 dB         48 samples
 *   1          2                            160                   18.4 dB       48 samples
 *   2          any                          320: 160 pairs        up to 14 dB   160 samples
 *   other      any                          as for 1              nothing       none
 *
 * With one microphone the thousands of the mode are its rate digit, as for InitializeEPD: 1 makes
 * every frame call return -1 (there is no suppression at 8 kHz); 2 takes frames of 320 samples and
 * any other but 0 frames of 80. Neither is of use, for the suppressor itself works on 160 samples
 * of each frame: with frames of 80 it reads and writes 80 samples beyond the last one.
 *
 * `unused` is not used. Returns NULL if memory runs out.
 */
NsInstance *InitializeDoNS(int32_t mode, int32_t micCount, int32_t unused);

/*
 * Suppresses the noise of numIn samples, whole frames. numOut must be equal to numIn.
 *
 * The enhancement stream of enhancement_stream.h does by itself what is asked of the caller here.
 *
 * Fill `out` before the call, as a rule with the input delayed as above: a frame that is not
 * suppressed leaves its part of `out` as it is. These are frames with more than 60 zero samples in
 * a row, and the first ones until the audio has settled: with the first frame if fewer than three
 * quarters of its samples are of magnitude 1 to 4, else after three such frames, and after 3200
 * samples in any case. The quiet samples of all frames of a call add up: pass one frame at a time.
 * Two microphones also leave a frame alone if the mean magnitude of the first channel is below 10.
 *
 * With one microphone `in` IS OVERWRITTEN with the output too, and may be the same buffer as `out`.
 * With two, `in` is not changed, both channels of `out` are the same, and samples beyond 16 bits
 * wrap around. A partial last frame is read and written WHOLE, beyond the given count: pass whole
 * frames.
 *
 * Returns the number of samples processed since creation, skipped frames included (it stays at
 * 2^31 - 1 once there); or -1, with nothing done, if ns is NULL, the counts differ, a pointer is
 * NULL though numIn > 0, or one microphone was given 8 kHz.
 */
int32_t ProcessDoNSFrame(NsInstance *ns, int16_t *in, int32_t numIn, int16_t *out, int32_t numOut);

/* Releases the suppressor. Returns 0, or -1 if ns is NULL. */
int32_t FreeMemoryNS(NsInstance *ns);

/* ============================================================================================ */
/* Dynamics control                                                                             */
/* ============================================================================================ */

/*
 * Creates a dynamics control, which levels recorded speech: +12 dB for frames that peak below an
 * eighth of full scale (-18 dBFS), 3:1 compression above, 0 dB at full scale. The gain rises with a
 * time constant of 12.5 ms, from silence at the start, and falls with one of 0.2 s. There is no
 * delay.
 *
 * samplingRate: 16000; any other is accepted, and its audio left as it is.
 * pcmDumpEnabled: 1 appends raw 16-bit PCM to "/sdcard/<handle>_beforeDRC.pcm" and
 * "..._afterDRC.pcm".
 *
 * Returns the handle, a number that is not a pointer to look into; -1 if memory runs out.
 */
int64_t InitializeDRC(int32_t samplingRate, int32_t pcmDumpEnabled);

/*
 * Levels numSample samples in place, whole frames of 160. A partial last frame is read and written
 * WHOLE, beyond the given count.
 *
 *   1    the audio was loud: more than 100 samples of the last ten frames, the newest frame counted
 *        twice, came in beyond 8192 (a quarter of full scale), after at least one frame of the call
 *   0    it was not; or numSample < 1; or the rate is not 16000
 *   -1   drc is 0 or -1, or pcm is NULL though numSample > 0
 */
int32_t ProcessDRC(int64_t drc, int16_t *pcm, int32_t numSample);

/* Releases the dynamics control. Returns 0, or -1 if drc is 0 or -1. */
int32_t FreeMemoryDRC(int64_t drc);

/* ============================================================================================ */
/* Queries                                                                                      */
/* ============================================================================================ */

/*
 * Energy of a block in whole dB: 10 log10 of the variance of its n samples, truncated. 0 for a
 * constant, 90 for a square wave of full scale; 0 if n < 1 or pcm is NULL.
 */
int32_t computeEnergy(const int16_t *pcm, int32_t n);

/*
 * Energy of the loudest block of 20 ms, in dB as above. 0 if numSample < 1 or pcm is NULL, or if
 * samplingRate gives blocks of no sample. A last partial block is read as a whole one: numSample
 * must be a multiple of samplingRate / 50, or the buffer hold that many samples.
 */
int32_t ComputeEnergy(const int16_t *pcm, int32_t numSample, int32_t samplingRate);

/*
 * Power spectrum of one frame: 2 re^2 + 2 im^2 of each bin, at most 2^30, of a complex
 * transform over sample pairs (even samples real, odd ones imaginary, zero-padded, no window),
 * scaled by the reciprocal of its size.
 *
 *   samplingRate   samples read   values written
 *   16000          160            128
 *   any other      80             64
 *
 * Returns 1, or 0 without writing if a pointer is NULL.
 */
int32_t getSpectrum(const int16_t *pcm, int32_t *spectrum, int32_t samplingRate);

/* ============================================================================================ */
/* Host services                                                                                */
/* ============================================================================================ */

/*
 * Where log lines go. On Android that is the platform log, and this function changes nothing.
 * Elsewhere every line is handed to `sink` with its priority (3 debug, 4 info, 6 error), the tag
 * "Orvalis", the text without a line end, and `user` as it was given. NULL restores the default,
 * which writes "D/Orvalis: text" to standard error ("I/" and "E/" for the other priorities).
 *
 * Set it before creating instances. The sink may be called from several threads at once, and from
 * within frame calls.
 */
void SetLogSink(void (*sink)(int priority, const char *tag, const char *text, void *user),
                void *user);

/*
 * Puts a directory in front of the dump files' paths: with "/tmp/run" they lie in
 * "/tmp/run/sdcard/VRpreprocess/". The string is copied; NULL or "" restores none. The library
 * makes no folders. Set it before creating instances.
 *
 * Returns 0, or -1 if the root is too long for the 256-byte path buffers (nothing changes then).
 */
int32_t SetDumpRoot(const char *directory);

#ifdef __cplusplus
}
#endif

#endif /* ORVALIS_H */
