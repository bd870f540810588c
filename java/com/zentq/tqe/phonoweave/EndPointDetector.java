package com.zentq.tqe.phonoweave;

import java.util.ArrayList;
import java.util.List;

/**
 * Finds utterances in audio, in chunks of any size. The results do not depend on the chunk sizes.
 *
 * <pre>{@code
 * try (EndPointDetector detector = EndPointDetector.at(16000).hangoverMillis(800).open()) {
 *   for (short[] chunk = read(); chunk != null; chunk = read()) {
 *     detector.push(chunk).forEach(System.out::println);
 *   }
 *   detector.flush().forEach(System.out::println);
 * }
 * }</pre>
 *
 * <p><b>Threads.</b> Any thread may call; calls on one detector wait for each other, but not in a
 * log handler (see {@link EngineLog#toLogger}). A detector that is not closed is released after it
 * was collected as garbage, when another object is created.
 */
public final class EndPointDetector implements AutoCloseable {
  /** The detector that decides for each frame whether it is speech. */
  public enum Method {
    /** The detector of {@link Loquent}, which confirms speech over several frames. */
    CHANNEL_ENERGY,
    /** Tracks the noise in every bin of the spectrum and decides each frame by itself. */
    MCRA
  }

  /** Settings of a detector. Times are in milliseconds, 0 or more. */
  public static final class Settings {
    private final int rateHz;
    private int inputGain;
    private int contentType;
    private int hangoverMillis = 500;
    private int padBeforeMillis = 150;
    private int padAfterMillis = 250;
    private Method method = Method.CHANNEL_ENERGY;
    private int minSpeechMillis;
    private boolean leadIn;

    private Settings(int rateHz) {
      if (rateHz != 16000 && rateHz != 8000) {
        throw new IllegalArgumentException("the rate is 16000 or 8000, not " + rateHz);
      }
      this.rateHz = rateHz;
    }

    /** 0 leaves the input as it is, 1 divides it by 4, 2 multiplies it by 4 (wrapping around). */
    public Settings inputGain(int code) {
      if (code < 0 || code > 2) {
        throw new IllegalArgumentException("the input gain is 0, 1 or 2, not " + code);
      }
      inputGain = code;
      return this;
    }

    /** Timing: 0 and 1 are slower; 2 and more are faster and ignore short sounds. */
    public Settings contentType(int type) {
      contentType = type;
      return this;
    }

    /** Longest silence within an utterance; 500 unless set. */
    public Settings hangoverMillis(int millis) {
      hangoverMillis = checkTime(millis);
      return this;
    }

    /** Time to add before an utterance; 150 unless set. Padded utterances never overlap. */
    public Settings padBeforeMillis(int millis) {
      padBeforeMillis = checkTime(millis);
      return this;
    }

    /** Time to add after an utterance; 250 unless set. */
    public Settings padAfterMillis(int millis) {
      padAfterMillis = checkTime(millis);
      return this;
    }

    /** CHANNEL_ENERGY unless set. MCRA takes no input gain, content type or lead-in. */
    public Settings method(Method choice) {
      if (choice == null) throw new IllegalArgumentException("a method is CHANNEL_ENERGY or MCRA");
      method = choice;
      return this;
    }

    /** Shortest utterance to report, measured without padding; 0 unless set. */
    public Settings minSpeechMillis(int millis) {
      minSpeechMillis = checkTime(millis);
      return this;
    }

    /**
     * For recordings, which may begin with a word: the detector waits for the first 10 s and learns
     * the noise from their quietest part. Off unless set; leave it off for live audio.
     */
    public Settings leadIn(boolean wanted) {
      leadIn = wanted;
      return this;
    }

    /**
     * Opens a detector.
     *
     * @throws IllegalArgumentException if the method does not support a setting
     * @throws IllegalStateException if memory runs out
     */
    public EndPointDetector open() {
      if (method == Method.MCRA && (inputGain != 0 || contentType != 0 || leadIn)) {
        throw new IllegalArgumentException("MCRA takes no input gain, content type or lead-in");
      }
      return new EndPointDetector(this);
    }

    private static int checkTime(int millis) {
      if (millis < 0) throw new IllegalArgumentException("a time is 0 ms or more, not " + millis);
      return millis;
    }
  }

  private final NativeHandle handle;
  private boolean flushed;

  private EndPointDetector(Settings settings) {
    NativeLibrary.load();
    NativeHandle.releaseForgotten();
    long stream =
        SafeLayer.openStream(
            new int[] {
              settings.rateHz,
              settings.inputGain,
              settings.contentType,
              settings.hangoverMillis,
              settings.padBeforeMillis,
              settings.padAfterMillis,
              settings.method.ordinal(),
              settings.minSpeechMillis,
              settings.leadIn ? 1 : 0
            });
    handle = new NativeHandle(this, stream, SafeLayer::closeStream);
  }

  /**
   * Default settings for audio at a rate; change them, then open the detector.
   *
   * @param rateHz 16000 or 8000
   */
  public static Settings at(int rateHz) {
    return new Settings(rateHz);
  }

  /** As {@link #push(short[], int, int)} with the whole array. */
  public List<Utterance> push(short[] pcm) {
    return push(pcm, 0, pcm == null ? 0 : pcm.length);
  }

  /**
   * Processes samples and returns the utterances whose end is now known. The array is not changed.
   *
   * @throws IllegalArgumentException if the range is not within the array
   * @throws IllegalStateException after flush or close
   */
  public List<Utterance> push(short[] pcm, int offset, int count) {
    SafeLayer.checkRange(pcm, offset, count);
    handle.enter();
    try {
      long stream = handle.address();
      if (flushed) throw new IllegalStateException("pushed after the flush");
      List<Utterance> found = new ArrayList<>();
      int done = 0;
      do {
        done += SafeLayer.check(SafeLayer.pushAudio(stream, pcm, offset + done, count - done));
        collect(stream, found);
      } while (done < count);
      return found;
    } finally {
      handle.leave();
    }
  }

  /**
   * Ends the audio and returns the remaining utterances; none when called again.
   *
   * @throws IllegalStateException after close
   */
  public List<Utterance> flush() {
    handle.enter();
    try {
      long stream = handle.address();
      flushed = true;
      SafeLayer.check(SafeLayer.flushStream(stream));
      List<Utterance> found = new ArrayList<>();
      collect(stream, found);
      return found;
    } finally {
      handle.leave();
    }
  }

  /** Releases the detector and drops utterances not yet returned. Does nothing the second time. */
  @Override
  public void close() {
    handle.close();
  }

  private static void collect(long stream, List<Utterance> found) {
    long[] fields = new long[6];
    while (SafeLayer.check(SafeLayer.nextUtterance(stream, fields)) == 1) {
      found.add(new Utterance(fields));
    }
  }
}
