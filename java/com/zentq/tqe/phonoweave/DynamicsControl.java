package com.zentq.tqe.phonoweave;

/**
 * Levels recorded speech of 16 kHz that comes in pieces of any length: +12 dB for frames that peak
 * below -18 dBFS, 3:1 compression above, 0 dB at full scale. The output, taken together, does not
 * depend on how the audio was cut; it is as long as the input and not late.
 *
 * <p><b>Threads.</b> Any thread may call; calls on one instance wait for each other. An instance that
 * is forgotten rather than closed is released when another one is made.
 */
public final class DynamicsControl implements AutoCloseable {
  private final EnhancementStream stream = new EnhancementStream(this, 1, 0, true, true);

  /**
   * Creates a dynamics control.
   *
   * @throws IllegalStateException if memory runs out
   */
  public DynamicsControl() {}

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
    return stream.push(pcm, offset, count);
  }

  /**
   * Ends the audio and returns the rest of the output; nothing when called again.
   *
   * @throws IllegalStateException after close
   */
  public short[] flush() {
    return stream.flush();
  }

  /**
   * Whether the audio was loud when the last whole frame came in: more than 100 samples of the last
   * ten frames, the newest counted twice, beyond a quarter of full scale.
   */
  public boolean isLoud() {
    return stream.isLoud();
  }

  /** Releases the dynamics control. Does nothing the second time. */
  @Override
  public void close() {
    stream.close();
  }
}
