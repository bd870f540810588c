package com.zentq.tqe.phonoweave;

/**
 * Evens out the level of speech at 16 kHz, in chunks of any size: +12 dB for frames that peak below
 * -18 dBFS, 3:1 compression above, 0 dB at full scale. The output as a whole does not depend on the
 * chunk sizes. It is as long as the input and not delayed.
 *
 * <p><b>Threads.</b> Any thread may call; calls on one instance wait for each other, but not in a
 * log handler (see {@link EngineLog#toLogger}). An instance that is not closed is released after it
 * was collected as garbage, when another object is created.
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
   * Processes samples and returns the output that is ready: any number of whole frames, or none.
   * The array is not changed.
   *
   * @throws IllegalArgumentException if the range is not within the array
   * @throws IllegalStateException after flush or close
   */
  public short[] push(short[] pcm, int offset, int count) {
    return stream.push(pcm, offset, count);
  }

  /**
   * Ends the audio and returns the rest of the output; an empty array when called again.
   *
   * @throws IllegalStateException after close
   */
  public short[] flush() {
    return stream.flush();
  }

  /**
   * Whether the audio was loud at the last whole frame: more than 100 samples of the last ten
   * frames, of which the newest counts twice, were beyond a quarter of full scale.
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
