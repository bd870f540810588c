package com.zentq.tqe.phonoweave;

/**
 * The natives of the safe classes. The library looks this class up and registers them when it is
 * loaded, so the class must not load it: callers call {@link NativeLibrary#load} first.
 */
final class SafeLayer {
  static final int LOG_TO_STANDARD_ERROR = 0;
  static final int LOG_OFF = 1;
  static final int LOG_TO_JAVA = 2;

  /** How many more samples a push may return than it was given. */
  static final int MAX_EXTRA_PER_PUSH = 160;

  /** How many samples a flush may return. */
  static final int MAX_PER_FLUSH = 319;

  private SafeLayer() {}

  /** Throws if the range is not within the array. */
  static void checkRange(short[] pcm, int offset, int count) {
    if (pcm == null) throw new IllegalArgumentException("no samples");
    if (offset < 0 || count < 0 || offset > pcm.length - count) {
      throw new IllegalArgumentException(
          count + " samples from " + offset + " on, in an array of " + pcm.length);
    }
  }

  /** What a native returned, which throws if it refused. */
  static int check(int result) {
    if (result < 0) throw new IllegalStateException("the engine refused the call");
    return result;
  }

  /**
   * 0 if memory runs out or a setting is refused. The settings are rate, input gain, content type,
   * hangover, padding before and after, method, min speech and lead-in.
   */
  static native long openStream(int[] settings);

  /** How many samples were taken: not all if utterances have to be fetched first. */
  static native int pushAudio(long stream, short[] pcm, int offset, int count);

  /** Stores start, end, began, ended, number and open; 1 if there was an utterance. */
  static native int nextUtterance(long stream, long[] fields);

  static native int flushStream(long stream);

  static native int closeStream(long stream);

  /** 0 if memory runs out or a setting is refused. */
  static native long openEnhancement(
      int microphones, int suppressionDb, boolean level, boolean aligned);

  static native int enhancementDelay(long stream);

  /** How many samples of output there were; -1 after the flush. */
  static native int enhance(long stream, short[] pcm, int offset, int count, short[] out);

  /** How many samples of output were left; -1 if the last pair of samples is incomplete. */
  static native int flushEnhancement(long stream, short[] out);

  static native boolean isLoud(long stream);

  static native int closeEnhancement(long stream);

  static native void setLogDestination(int destination);

  /** Called by the library, on the thread that caused the line. */
  @SuppressWarnings("unused")
  private static void line(int priority, String text) {
    EngineLog.write(priority, text);
  }
}
