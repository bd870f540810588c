package com.zentq.tqe.phonoweave;

/**
 * The natives behind the safe classes. The library registers them by this class's name when it is
 * loaded, so the class must not cause that itself: whoever calls makes sure first.
 */
final class SafeLayer {
  static final int LOG_TO_STANDARD_ERROR = 0;
  static final int LOG_OFF = 1;
  static final int LOG_TO_JAVA = 2;

  private SafeLayer() {}

  /** 0 if memory runs out or a setting is out of range. */
  static native long openStream(
      int rateHz,
      int inputGain,
      int contentType,
      int hangoverMillis,
      int padBeforeMillis,
      int padAfterMillis);

  /** How many samples were taken: fewer when utterances have to be fetched first. */
  static native int pushAudio(long stream, short[] pcm, int offset, int count);

  /** Stores start, end, began, ended, number and open; 1 if there was an utterance. */
  static native int nextUtterance(long stream, long[] fields);

  static native int flushStream(long stream);

  static native int closeStream(long stream);

  static native void setLogDestination(int destination);

  /** The engine calls this, on the thread that caused the line. */
  @SuppressWarnings("unused")
  private static void line(int priority, String text) {
    EngineLog.write(priority, text);
  }
}
