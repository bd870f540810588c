package com.zentq.tqe.phonoweave;

/**
 * The engine's native methods: handles, whole frames, status numbers.
 *
 * <p>Most callers want {@link EndPointDetector}, {@link NoiseSuppressor} and {@link
 * DynamicsControl} instead, which take chunks of any size and guard their handles. The methods here
 * are for callers that have whole frames.
 *
 * <p>Audio is signed 16-bit. A frame is 160 samples at 16 kHz or 80 samples at 8 kHz; two
 * microphones are interleaved, 160 pairs a frame. Other rates must be converted first.
 *
 * <p><b>Handles</b> are addresses. 0 is refused by every method, and so is the -1 of a failed
 * {@link #initializeDRC}; any other number that is not an open handle of the right kind is the
 * caller's error and may crash the process. <b>Arrays and counts</b> are checked: a null array or a
 * count above the array's length gives -1 ({@link #getSpectrum}: 0), leaves arrays as they are and
 * logs one error line; with a count of 0 or less nothing is processed.
 *
 * <p><b>Warning:</b> the Java machine may copy a whole array for a call, whatever the count, and
 * write the whole copy back. So a call on a few samples of a long array is slow, and what another
 * thread writes to the array meanwhile may be lost, even in arrays that are said not to be changed.
 * Pass arrays of the count's length that no other thread writes to.
 *
 * <p><b>Threads:</b> different threads may use different instances at the same time, those with two
 * microphones excepted. Calls on one instance must not overlap, and none may follow its release.
 */
public final class Loquent {
  static {
    NativeLibrary.load();
  }

  private Loquent() {}

  /** The version of the engine, "160705". */
  public static native String GetVersion();

  /**
   * Creates an end-point detector.
   *
   * <p>The mode is gain * 10000 + rate * 1000 + sub-mode. Gain: 0 leaves the input as it is, 1
   * divides it by 4, 2 multiplies it by 4, wrapping around beyond 16 bits. Rate: 0 is 16 kHz, 1 is
   * 8 kHz. Sub-mode: 0.
   *
   * @param mode 0 for 16 kHz, 1000 for 8 kHz
   * @param dumpFlag 1 appends input and decisions to raw files under /sdcard/VRpreprocess
   * @return the handle; 0 if memory runs out
   */
  public static native long initializeEPD(int mode, int dumpFlag);

  /**
   * Decides whether whole frames of 160 (16 kHz) or 80 (8 kHz) samples are speech. The array is not
   * changed.
   *
   * <p>Pass one frame at a time, as there is one result for all frames of a call. Frames with more
   * than 60 zeros in a row are skipped; of the others, the first 39 are never speech.
   *
   * @return 1 if a frame was decided to be speech or the end of speech; 0 if none was, if the count
   *     is below 1, or if the last frame is partial; -1 if the handle is 0 or the array too short
   */
  public static native int processEPDFrame(long handle, short[] pcm, int count);

  /**
   * The same with a choice of timing: content types 0 and 1 confirm speech after 6 voiced frames
   * and end it after a pause of 25 frames; 2 and more take 4 and 14, and ignore utterances below 20
   * frames.
   *
   * @return as {@link #processEPDFrame}
   */
  public static native int ProcessEPDFrameByCnttype(
      long handle, short[] pcm, int count, int contentType);

  /**
   * Resets the utterance in progress but not the noise estimate, and turns the hangover log lines
   * on again.
   *
   * @return 0; -1 if the handle is 0
   */
  public static native int resetEPDparams(long handle);

  /**
   * Turns the hangover log lines of a detector off until the next reset.
   *
   * @param value not used
   * @return 0; -1 if the handle is 0
   */
  public static native int LogEpdSetting(long handle, int value);

  /**
   * Releases a detector.
   *
   * @return 0; -1 if the handle is 0
   */
  public static native int freeMemoryEPD(long handle);

  /**
   * Creates a noise suppressor for 16 kHz. All suppressors for two microphones that are created
   * here share one state: use only one of them, or {@link NoiseSuppressor}.
   *
   * @param mode for one microphone 0 (13 dB) or 2 (18.4 dB); not used for two
   * @param microphones 1: frames of 160 samples, output 48 samples late; 2: frames of 160 pairs,
   *     output 160 pairs late; any other number suppresses nothing
   * @param unused not used
   * @return the handle; 0 if memory runs out
   */
  public static native long initializeDoNS(int mode, int microphones, int unused);

  /**
   * Suppresses the noise of whole frames. Input and output may be the same array; otherwise the
   * input is not changed.
   *
   * <p>Where a frame is not suppressed, the output stays as it is: frames with more than 60 zeros
   * in a row, the first ones until the level has settled, and, with two microphones, very quiet
   * ones. Fill the output with the delayed input before the call. A partial last frame is processed
   * as if zeros followed.
   *
   * @param inCount samples to take from the input and to store in the output
   * @param outCount the same number
   * @return the samples processed since creation; -1, with the output as it was, if the handle is 0,
   *     the counts differ, or an array is too short
   */
  public static native int processDoNSFrame(
      long handle, short[] in, int inCount, short[] out, int outCount);

  /**
   * Releases a noise suppressor.
   *
   * @return 0; -1 if the handle is 0
   */
  public static native int freeMemoryDoNS(long handle);

  /**
   * Creates a dynamics control, which evens out the level of speech: +12 dB for frames that peak
   * below -18 dBFS, 3:1 compression above, 0 dB at full scale.
   *
   * @param rateHz 16000; audio of any other rate is left as it is
   * @param dumpFlag 1 appends the audio before and after to raw files under /sdcard
   * @return the handle; -1 if memory runs out
   */
  public static native long initializeDRC(int rateHz, int dumpFlag);

  /**
   * Evens out the level of whole frames of 160 samples in place. A partial last frame is processed
   * as if zeros followed.
   *
   * @return 1 if the audio was loud: more than 100 samples of the last ten frames, of which the
   *     newest counts twice, were beyond a quarter of full scale; 0 if it was not, if the count is
   *     below 1, or if the rate is not 16000; -1 if the handle is 0 or -1 or the array too short
   */
  public static native int processDRC(long handle, short[] pcm, int count);

  /**
   * Releases a dynamics control.
   *
   * @return 0; -1 if the handle is 0 or -1
   */
  public static native int freeMemoryDRC(long handle);

  /**
   * Energy of the loudest block of 20 ms in whole dB, 0 to 90: 10 log10 of the variance of its
   * samples. A partial last block is read as if zeros followed. The array is not changed.
   *
   * @return the energy; 0 if the count is below 1 or the rate has no block; -1 if the array is too
   *     short
   */
  public static native int computeEnergyFrame(short[] pcm, int count, int rateHz);

  /**
   * Power spectrum of one frame: 2 re^2 + 2 im^2 of each bin, at most 2^30, of a complex transform
   * over sample pairs. The samples are not changed.
   *
   * @param pcm at least 160 samples, of which 16000 Hz takes 160 and any other rate 80
   * @param spectrum at least 128 numbers, of which 16000 Hz stores 128 and any other rate 64
   * @return 1; 0 if an array is null or too short
   */
  public static native int getSpectrum(short[] pcm, int[] spectrum, int rateHz);
}
