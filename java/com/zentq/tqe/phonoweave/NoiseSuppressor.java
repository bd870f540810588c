package com.zentq.tqe.phonoweave;

/**
 * Suppresses the noise of audio at 16 kHz, in chunks of any size. The output as a whole does not
 * depend on the chunk sizes.
 *
 * <pre>{@code
 * try (NoiseSuppressor suppressor = NoiseSuppressor.forOneMicrophone(NoiseSuppressor.Strength.NORMAL)) {
 *   for (short[] chunk = read(); chunk != null; chunk = read()) {
 *     write(suppressor.push(chunk));
 *   }
 *   write(suppressor.flush());
 * }
 * }</pre>
 *
 * <p><b>Delay.</b> The output begins with {@link #delaySamples} samples from before the input, and
 * {@link #flush} returns the last ones: N input samples give N + {@code delaySamples()} output
 * samples in all. Audio that the engine does not suppress (null audio, the first frames until the
 * level has settled, very quiet frames of two microphones) is passed through with the same delay.
 *
 * <p><b>Threads.</b> Any thread may call; calls on one suppressor wait for each other, but not in a
 * log handler (see {@link EngineLog#toLogger}). A suppressor that is not closed is released after
 * it was collected as garbage, when another object is created.
 */
public final class NoiseSuppressor implements AutoCloseable {
  /** How much one microphone's noise is lowered. */
  public enum Strength {
    /** By 13 dB. */
    NORMAL(13),
    /** By 18.4 dB. */
    STRONG(18);

    private final int db;

    Strength(int db) {
      this.db = db;
    }
  }

  private final EnhancementStream stream;
  private final int microphones;

  private NoiseSuppressor(int microphones, int suppressionDb) {
    this.stream = new EnhancementStream(this, microphones, suppressionDb, false, false);
    this.microphones = microphones;
  }

  /**
   * A suppressor for one microphone.
   *
   * @throws IllegalStateException if memory runs out
   */
  public static NoiseSuppressor forOneMicrophone(Strength strength) {
    if (strength == null) throw new IllegalArgumentException("no strength");
    return new NoiseSuppressor(1, strength.db);
  }

  /**
   * A suppressor for two microphones, whose samples are interleaved. Both channels of its output
   * are the same: the first microphone without the noise.
   *
   * @throws IllegalStateException if memory runs out
   */
  public static NoiseSuppressor forTwoMicrophones() {
    return new NoiseSuppressor(2, Strength.NORMAL.db);
  }

  /** Delay of the output in samples: 48, or 320 (160 pairs) with two microphones. */
  public int delaySamples() {
    return microphones * stream.delay();
  }

  /** As {@link #push(short[], int, int)} with the whole array. */
  public short[] push(short[] pcm) {
    return push(pcm, 0, pcm == null ? 0 : pcm.length);
  }

  /**
   * Processes samples and returns the output that is ready: any number of whole frames, or none.
   * The array is not changed.
   *
   * @throws IllegalArgumentException if the range is not within the array
   * @throws IllegalStateException after flush or close
   */
  public short[] push(short[] pcm, int offset, int count) {
    return toChannels(stream.push(pcm, offset, count));
  }

  /**
   * Ends the audio and returns the rest of the output; an empty array when called again.
   *
   * @throws IllegalStateException after close, or if the last pair of samples is incomplete
   */
  public short[] flush() {
    return toChannels(stream.flush());
  }

  /** Releases the suppressor. Does nothing the second time. */
  @Override
  public void close() {
    stream.close();
  }

  /** As many channels as came in. */
  private short[] toChannels(short[] samples) {
    if (microphones == 1) return samples;
    short[] pairs = new short[2 * samples.length];
    for (int i = 0; i < pairs.length; ++i) pairs[i] = samples[i / 2];
    return pairs;
  }
}
