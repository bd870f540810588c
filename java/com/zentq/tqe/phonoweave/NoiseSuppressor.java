package com.zentq.tqe.phonoweave;

/**
 * Suppresses the noise of 16 kHz audio that comes in pieces of any length. The output, taken
 * together, does not depend on how the audio was cut.
 *
 * <pre>{@code
 * try (NoiseSuppressor suppressor = NoiseSuppressor.forOneMicrophone(NoiseSuppressor.Strength.NORMAL)) {
 *   for (short[] piece = read(); piece != null; piece = read()) {
 *     write(suppressor.push(piece));
 *   }
 *   write(suppressor.flush());
 * }
 * }</pre>
 *
 * <p><b>Delay.</b> The output begins with {@link #delaySamples} samples that come before the input,
 * and the flush gives the last ones: of N samples pushed, all in all N + {@code delaySamples()} come
 * out. Audio that the engine does not suppress (null audio, the first frames until the level has
 * settled, very quiet frames of two microphones) comes out as it is, with the same delay.
 *
 * <p><b>Threads.</b> Any thread may call; calls on one suppressor wait for each other. A suppressor
 * that is forgotten rather than closed is released when another one is made.
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
   * A suppressor for two microphones, whose samples are interleaved. Both channels of its output are
   * the same: the first one, cleaned.
   *
   * @throws IllegalStateException if memory runs out
   */
  public static NoiseSuppressor forTwoMicrophones() {
    return new NoiseSuppressor(2, Strength.NORMAL.db);
  }

  /** By how many samples the output is late: 48, or 320 (160 pairs) with two microphones. */
  public int delaySamples() {
    return microphones * stream.delay();
  }

  /** As {@link #push(short[], int, int)} with the whole array. */
  public short[] push(short[] pcm) {
    return push(pcm, 0, pcm == null ? 0 : pcm.length);
  }

  /**
   * Takes samples and returns those of the output that they complete: none or any number of whole
   * frames. The array is not changed.
   *
   * @throws IllegalArgumentException if the samples are not all in the array
   * @throws IllegalStateException after the flush or after close
   */
  public short[] push(short[] pcm, int offset, int count) {
    return toChannels(stream.push(pcm, offset, count));
  }

  /**
   * Ends the audio and returns the rest of the output; nothing when called again.
   *
   * @throws IllegalStateException after close, or if half a pair of samples is left
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
