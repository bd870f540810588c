/*
 * orvalis.h - the flat C interface of libOrvalis.so, and the manual of the whole library
 *
 * Orvalis is the front end that a voice application puts before its recogniser. It decides when
 * somebody speaks (end-point detection, EPD), suppresses the noise around them with one microphone
 * or two (noise suppression, NS), evens out how loud they are (dynamics control, DRC), and measures
 * the energy and the spectrum of a block of samples (queries).
 *
 *
 * Which interface do I want?
 * --------------------------
 *
 *   to get                                     use                         declared in
 *   utterances with their true borders, from   the utterance stream        utterance_stream.h
 *     audio in chunks of any size
 *   audio without its noise, or levelled, in   the enhancement stream      enhancement_stream.h
 *     chunks of any size, not delayed
 *   a decision on each frame, confirmed over   InitializeEPD and others    here
 *     several frames, noise suppressed before
 *   what led to it                             ProcessEPDFrameExplained    here, epd_reasons.h
 *   an immediate decision on each frame, and   processVAD, explainVAD      MCRAvad.h
 *     what led to it: the MCRA detector
 *   noise suppression frame by frame           InitializeDoNS and others   here
 *   dynamics control frame by frame            InitializeDRC and others    here
 *   the energy or the spectrum of a block      computeEnergy, getSpectrum  here
 *   the engine's own operators                 add, L_mult and others      basic_op.h
 *   its transforms                             r_fft_epd and others        fixed_fft.h
 *                                              r_fft                       float_fft.h
 *                                              Noscale_FFT                 noscale_fft_512p.h
 *   its elementary functions                   ZOLT_L_log and others       Math_baseop.h
 *
 * Use a stream unless you have a reason not to: it needs nothing but samples.
 *
 *
 * Audio
 * -----
 * Samples are signed 16-bit in native byte order, passed as a pointer and a number of samples.
 * Other rates and formats must be converted first.
 *
 *   service                     rate            a frame of 10 ms             delay of the output
 *   EPD, spectrum               16 kHz          ORVALIS_FRAME_16K            -
 *                               8 kHz           ORVALIS_FRAME_8K             -
 *   NS, one microphone          16 kHz          ORVALIS_FRAME_16K            ORVALIS_NS_DELAY_1MIC
 *   NS, two microphones         16 kHz          ORVALIS_FRAME_2MIC:          ORVALIS_NS_DELAY_2MIC
 *                                               160 interleaved pairs        pairs
 *   DRC                         16 kHz          ORVALIS_FRAME_16K            none
 *
 * WARNING: PASS WHOLE FRAMES TO ProcessDoNSFrame AND ProcessDRC. A partial last frame is read and
 * written WHOLE, beyond the given count and so beyond the end of the buffer.
 *
 * WARNING: A PROCESS HAS ONE TWO-MICROPHONE SUPPRESSOR. All instances created with micCount 2 share
 * one state. Creating a second one resets the first, and their calls must not be interleaved or
 * overlap. All other instances are independent of one another, and so are all enhancement streams.
 *
 *
 * A worked example: feed a recording frame by frame, print where the decision changes
 * -----------------------------------------------------------------------------------
 *
 *     #include <stdio.h>
 *     #include "orvalis.h"
 *
 *     int report_speech(const int16_t *pcm, int32_t samples)
 *     {
 *         EpdInstance *epd = InitializeEPD(ORVALIS_EPD_16K, 0);    // no dump files
 *         int32_t previous = 0;
 *         if (epd == NULL)
 *             return -1;
 *         for (int32_t at = 0; at + ORVALIS_FRAME_16K <= samples; at += ORVALIS_FRAME_16K) {
 *             int32_t speech = ProcessEPDFrame(epd, pcm + at, ORVALIS_FRAME_16K);
 *             if (speech != previous)
 *                 printf("%s after %.2f s\n", speech ? "speech" : "silence",
 *                        (at + ORVALIS_FRAME_16K) / 16000.0);
 *             previous = speech;
 *         }
 *         return FreeMemoryEPD(epd);
 *     }
 *
 * (tests/example_epd.c is this example; it is compiled and run as C and as C++.)
 *
 * Decisions are late by design: a run of voiced frames confirms speech, and a pause ends it. The
 * utterance stream dates both back.
 *
 *
 * Threads
 * -------
 * The library starts no threads and takes no locks. Different threads may use different instances
 * at the same time, except those for two microphones (above). Calls on one instance must not
 * overlap. The queries have no state. All instances share the overflow and carry flags of the
 * fixed-point operators (basic_op.h), and nothing else; no result of this interface depends on
 * them.
 *
 * Real time
 * ---------
 * Frame calls allocate nothing and take no lock. They write log lines, and dump files where these
 * were asked for; see "Host services" to keep them cheap.
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
 * what the library returns with what its own headers say.
 */
#define ORVALIS_ABI_VERSION 1
int32_t OrvalisAbiVersion(void);

/* Samples in a frame of 10 ms; of two microphones, both together. */
#define ORVALIS_FRAME_16K  160
#define ORVALIS_FRAME_8K   80
#define ORVALIS_FRAME_2MIC 320

/* ============================================================================================ */
/* End-point detection                                                                          */
/* ============================================================================================ */

/* One detector: opaque, owned by the caller from InitializeEPD to FreeMemoryEPD. */
typedef struct EpdInstance EpdInstance;

/* Modes for InitializeEPD, which take the input as it is. */
#define ORVALIS_EPD_16K 0
#define ORVALIS_EPD_8K  1000

/* Initial noise frames: never speech, the detector learns the noise from them. */
#define ORVALIS_EPD_LEARNING 39

/*
 * Creates a detector.
 *
 * mode is three decimal fields packed into one number, gain * 10000 + rate * 1000 + sub-mode:
 *
 *   field      value     meaning
 *   gain       0         input as it is
 *              1         input divided by 4 (arithmetic shift)
 *              2         input multiplied by 4; WRAPS AROUND beyond 16 bits
 *              other     same as 0
 *   rate       0         16 kHz, frames of 160 samples
 *              1         8 kHz, frames of 80 samples
 *              2..9      same as 0
 *   sub-mode   0..3      appears in the log only; others count as 0
 *
 *   0 = 16 kHz   1000 = 8 kHz   10000 = 16 kHz with input / 4   21000 = 8 kHz with input * 4
 *
 * The fields of a negative mode are negative or 0; a negative rate field selects 8 kHz.
 *
 * pcmDumpEnabled: 1 appends raw 16-bit PCM to two files named after the handle in decimal,
 * "/sdcard/VRpreprocess/<handle>_inputEPD.pcm" (the frames before suppression) and
 * "..._resultEPD.pcm" (for every sample 0, 1000 = speech or 2000 = end of speech). A file that
 * cannot be opened, or is a symbolic link, is silently not written. The samples are in the
 * processor's own byte order, without a header. Any other value writes none.
 *
 * Returns NULL if memory runs out.
 */
EpdInstance *InitializeEPD(int32_t mode, int32_t pcmDumpEnabled);

/*
 * Decides on numSample samples, whole frames of 160 (16 kHz) or 80 (8 kHz). The buffer is not
 * changed.
 *
 *   1    at least one frame was decided to be speech or the end of speech
 *   0    none was; or numSample < 1; or the buffer ends in a partial frame
 *   -1   epd is NULL, or pcm is NULL though numSample > 0
 *
 * Pass one frame at a time if you can, as all frames of a call share one return value. If a buffer
 * ends in a partial frame, its whole frames are still processed, but the call returns 0 and none of
 * its samples is counted.
 *
 * A frame with more than 60 zero samples in a row is null audio: it is not processed and counts as
 * no speech. The first ORVALIS_EPD_LEARNING frames that are processed are never speech. At 16 kHz
 * the noise is suppressed before the decision, once the level has settled: from the first frame on
 * if fewer than 120 of its samples have a magnitude of 1 to 4, else after three such frames in a
 * row, and in any case after 200 ms.
 *
 * Speech is reported from the 6th voiced frame in a row on. It ends after 25 frames of pause; these
 * add up over several pauses until 4 voiced frames in a row reset the count.
 */
int32_t ProcessEPDFrame(EpdInstance *epd, const int16_t *pcm, int32_t numSample);

/*
 * The same, with the timing of the caller's choice:
 *
 *   contentType   onset            pause that ends speech   shortest utterance
 *   0, 1          6 voiced frames  25 frames                any
 *   2 and more    4 voiced frames  14 frames                20 frames; shorter ones end in 0
 *
 * At 8 kHz the end is reported 3 frames later. A negative content type counts as 2 and more.
 * ProcessEPDFrame takes the rate field of the mode for the content type.
 */
int32_t ProcessEPDFrameByCnttype(EpdInstance *epd, const int16_t *pcm, int32_t numSample,
                                 int32_t contentType);

/* Identical to ProcessEPDFrameByCnttype; `mode` is the content type. */
int32_t ProcessEPDFrameByMode(EpdInstance *epd, const int16_t *pcm, int32_t numSample,
                              int32_t mode);

/*
 * Does what ProcessEPDFrameByCnttype does, and sets `reasons` to what led to the decision on the
 * last frame that was processed (see epd_reasons.h). `reasons` may be NULL. It is not changed if
 * the call returns -1 because pcm is NULL.
 */
int32_t ProcessEPDFrameExplained(EpdInstance *epd, const int16_t *pcm, int32_t numSample,
                                 int32_t contentType, EpdReasons *reasons);

/*
 * Drops the utterance in progress and turns hangover log lines on again. The noise estimate and the
 * count of frames stay. Returns 0, or -1 if epd is NULL.
 */
int32_t ResetEPDparams(EpdInstance *epd);

/*
 * Turns the detector's hangover log lines off until the next reset. `value` is not used.
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

/* Modes for InitializeDoNS with one microphone. */
#define ORVALIS_NS_13DB 0
#define ORVALIS_NS_18DB 2

/* Delay of the output in samples a microphone. */
#define ORVALIS_NS_DELAY_1MIC 48
#define ORVALIS_NS_DELAY_2MIC 160

/*
 * Creates a noise suppressor for 16 kHz.
 *
 *   micCount   mode               samples a frame   suppresses    delay
 *   1          ORVALIS_NS_13DB    160               13 dB         48 samples
 *   1          ORVALIS_NS_18DB    160               18.4 dB       48 samples
 *   2          any                320: 160 pairs    12 to 15 dB   160 pairs
 *   other      any                same as 1         nothing       none
 *
 * 18.4 dB costs speech quality; take 13 dB unless pauses have to be very quiet.
 * `unused` is not used. Returns NULL if memory runs out.
 *
 * WARNING: with one microphone LEAVE THE THOUSANDS OF THE MODE AT 0. They are a rate digit, and no
 * other value is useful: 1 (8 kHz) makes every frame call return -1, 2 takes frames of 320 samples,
 * 3 to 9 take frames of 80. The suppressor still processes 160 samples of each frame: with frames
 * of 80 it READS AND WRITES 80 SAMPLES BEYOND THE END of both buffers.
 */
NsInstance *InitializeDoNS(int32_t mode, int32_t micCount, int32_t unused);

/*
 * Suppresses the noise of numIn samples, whole frames. numOut must be equal to numIn.
 *
 * Fill `out` BEFORE the call, usually with the delayed input: a frame that is not suppressed leaves
 * its part of `out` as it is. This is the hardest call of the library; the enhancement stream
 * (enhancement_stream.h) does all of it for you. By hand:
 *
 *     #include <string.h>
 *     #include "orvalis.h"
 *
 *     // At least one frame, and whole ones. `out` is late by 48 samples; `pcm` is overwritten.
 *     int suppress_noise(int16_t *pcm, int32_t samples, int16_t *out)
 *     {
 *         NsInstance *ns = InitializeDoNS(ORVALIS_NS_13DB, 1, 0);
 *         if (ns == NULL)
 *             return -1;
 *         memset(out, 0, ORVALIS_NS_DELAY_1MIC * sizeof *out);
 *         memcpy(out + ORVALIS_NS_DELAY_1MIC, pcm,
 *                (samples - ORVALIS_NS_DELAY_1MIC) * sizeof *out);
 *         for (int32_t at = 0; at < samples; at += ORVALIS_FRAME_16K)
 *             ProcessDoNSFrame(ns, pcm + at, ORVALIS_FRAME_16K, out + at, ORVALIS_FRAME_16K);
 *         return FreeMemoryNS(ns);
 *     }
 *
 * (tests/example_ns.c is this example; it is compiled and run as C and as C++.)
 *
 * Suppression begins once the level has settled: with the first frame if fewer than three quarters
 * of its samples have a magnitude of 1 to 4, else after three such frames in a row, and in any case
 * with the 3200th sample. (Samples of that magnitude add up over the frames of a call: pass one
 * frame at a time.) Later frames are left alone if more than 60 samples in a row are zero, and with
 * two microphones also if the mean magnitude of the first channel is below 10.
 *
 * With one microphone `in` IS OVERWRITTEN with the output too, and may be the same buffer as `out`.
 * With two, `in` is not changed, both channels of `out` are the same, and samples beyond 16 bits
 * wrap around.
 *
 * WARNING: a partial last frame is read and written WHOLE, beyond numIn and numOut.
 *
 * Returns the number of samples processed since creation, skipped frames included (it stays at
 * 2^31 - 1 once there); or -1, with nothing done, if ns is NULL, the counts differ, a pointer is
 * NULL though numIn > 0, or the instance of one microphone was created for 8 kHz.
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
 * time constant of 12.5 ms, starting from silence, and falls with one of 0.2 s. There is no delay.
 * Speech that sets in loudly after a pause may clip until the gain has followed.
 *
 * samplingRate: 16000; with any other, audio is left as it is.
 * pcmDumpEnabled: 1 appends raw 16-bit PCM to "/sdcard/<handle>_beforeDRC.pcm" and
 * "..._afterDRC.pcm", as InitializeEPD does.
 *
 * Returns a handle, which is a number; -1 if memory runs out.
 */
int64_t InitializeDRC(int32_t samplingRate, int32_t pcmDumpEnabled);

/*
 * Levels numSample samples in place, whole frames of 160.
 *
 * WARNING: a partial last frame is read and written WHOLE, beyond numSample.
 *
 *   1    the audio was loud at least once in the call: after a frame, more than 100 input samples
 *        of the last ten frames, the newest counted twice, were beyond a quarter of full scale
 *   0    it was not; or numSample < 1; or the rate is not 16000
 *   -1   drc is 0 or -1, or pcm is NULL though numSample > 0
 */
int32_t ProcessDRC(int64_t drc, int16_t *pcm, int32_t numSample);

/* Releases the dynamics control. Returns 0, or -1 if drc is 0 or -1. */
int32_t FreeMemoryDRC(int64_t drc);

/* ============================================================================================ */
/* Queries                                                                                      */
/* ============================================================================================ */

/* Values that getSpectrum writes. */
#define ORVALIS_BINS_16K 128
#define ORVALIS_BINS_8K  64

/*
 * Energy of a block in whole dB: 10 log10 of the variance of its n samples, truncated. 0 for a
 * constant, 90 for a full-scale square wave; 0 if n < 1 or pcm is NULL.
 */
int32_t computeEnergy(const int16_t *pcm, int32_t n);

/*
 * Energy of the loudest block of 20 ms, in dB as above. 0 if numSample < 1, if pcm is NULL, or if a
 * block of 20 ms at samplingRate has no sample.
 *
 * WARNING: a partial last block is read WHOLE, beyond numSample. Make numSample a multiple of
 * samplingRate / 50.
 */
int32_t ComputeEnergy(const int16_t *pcm, int32_t numSample, int32_t samplingRate);

/*
 * Power spectrum of one frame: 2 re^2 + 2 im^2 of each bin, at most 2^30, of a complex
 * transform over sample pairs (even samples real, odd ones imaginary, zero-padded, no window),
 * scaled by the reciprocal of its size.
 *
 *   samplingRate   samples read        values written
 *   16000          ORVALIS_FRAME_16K   ORVALIS_BINS_16K
 *   any other      ORVALIS_FRAME_8K    ORVALIS_BINS_8K
 *
 * Returns 1; or 0, with nothing written, if a pointer is NULL.
 */
int32_t getSpectrum(const int16_t *pcm, int32_t *spectrum, int32_t samplingRate);

/* ============================================================================================ */
/* Host services                                                                                */
/* ============================================================================================ */

/*
 * Where log lines go. On Android that is the platform log, and this function changes nothing.
 * Elsewhere every line is handed to `sink` with its priority (3 debug, 4 info, 5 warning, 6 error),
 * the tag "Orvalis", the text without a line end, and `user` as it was given. NULL restores the
 * default, which writes warnings and errors to standard error, as "W/Orvalis: text" and "E/Orvalis:
 * text", and drops the rest.
 *
 * Set the sink before creating instances. It may be called from several threads at once, and from
 * within frame calls.
 */
void SetLogSink(void (*sink)(int priority, const char *tag, const char *text, void *user),
                void *user);

/*
 * Sinks for SetLogSink. The first writes every line to standard error, debug lines as "D/Orvalis:
 * text" and information as "I/Orvalis: text". The second drops every line. Both ignore `user`.
 */
void LogAllToStandardError(int priority, const char *tag, const char *text, void *user);
void LogNothing(int priority, const char *tag, const char *text, void *user);

/*
 * Puts a directory in front of the dump files' paths: with "/tmp/run" they are written to
 * "/tmp/run/sdcard/VRpreprocess/" and "/tmp/run/sdcard/". The string is copied; NULL or "" removes
 * it. The library creates no folders. Set it before creating instances.
 *
 * Returns 0, or -1, with nothing changed, if the root is too long for the 256-byte path buffers.
 */
int32_t SetDumpRoot(const char *directory);

#ifdef __cplusplus
}
#endif

#endif /* ORVALIS_H */
