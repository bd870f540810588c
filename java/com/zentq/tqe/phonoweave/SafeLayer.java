package com.zentq.tqe.phonoweave;

/**
 * The natives behind the safe classes. The library registers them by this class's name when it is
 * loaded, so the class must not cause that itself: whoever calls makes sure first.
 */
final class SafeLayer {
  static final int LOG_TO_STANDARD_ERROR = 0;
  static final int LOG_OFF = 1;
  static final int LOG_TO_JAVA = 2;

  /** Room that the output of a push may need beyond its input. */
  static final int MOST_BEYOND_A_PUSH = 160;

  static final int MOST_OF_A_FLUSH = 319;

  private SafeLayer() {}

  /** Throws if the samples are not all in the array. */
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
   * hangover, paddings before and after, method, least speech and lead-in.
   */
  static native long openStream(int[] settings);

  /** How many samples were taken: fewer when utterances have to be fetched first. */
  static native int pushAudio(long stream, short[] pcm, int offset, int count);

  /** Stores start, end, began, ended, number and open; 1 if there was an utterance. */
  static native int nextUtterance(long stream, long[] fields);

  static native int flushStream(long stream);

  static native int closeStream(long stream);

  /** 0 if memory runs out or a setting is out of range. */
  static native long openEnhancement(
      int microphones, int suppressionDb, boolean level, boolean aligned);

  static native int enhancementDelay(long stream);

  /** How many samples of output there were; -1 after the flush. */
  static native int enhance(long stream, short[] pcm, int offset, int count, short[] out);

  /** How many samples of output were left; -1 if half a pair waits. */
  static native int flushEnhancement(long stream, short[] out);

  static native boolean isLoud(long stream);

  static native int closeEnhancement(long stream);

  static native void setLogDestination(int destination);

  /** The engine calls this, on the thread that caused the line. */
  @SuppressWarnings("unused")
  private static void line(int priority, String text) {
    EngineLog.write(priority, text);
  }
}
