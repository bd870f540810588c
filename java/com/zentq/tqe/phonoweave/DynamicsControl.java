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
  private static final int RATE_HZ = 16000;
  private static final int FRAME = 160;

  private final NativeHandle handle;
  private final FrameCutter cutter = new FrameCutter(FRAME, 1);
  private boolean loud;

  /**
   * Creates a dynamics control.
   *
   * @throws IllegalStateException if memory runs out
   */
  public DynamicsControl() {
    NativeLibrary.load();
    NativeHandle.releaseForgotten();
    handle = new NativeHandle(this, Loquent.initializeDRC(RATE_HZ, 0), Loquent::freeMemoryDRC);
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
    synchronized (handle) {
      handle.address();
      return cutter.push(pcm, offset, count, this::level);
    }
  }

  /**
   * Ends the audio and returns the rest of the output; nothing when called again.
   *
   * @throws IllegalStateException after close
   */
  public short[] flush() {
    synchronized (handle) {
      handle.address();
      return cutter.flush(0, this::level);
    }
  }

  /**
   * Whether the audio was loud when the last whole frame came in: more than 100 samples of the last
   * ten frames, the newest counted twice, beyond a quarter of full scale.
   */
  public boolean isLoud() {
    synchronized (handle) {
      return loud;
    }
  }

  /** Releases the dynamics control. Does nothing the second time. */
  @Override
  public void close() {
    handle.close();
  }

  private void level(short[] audio, int at, short[] out) {
    System.arraycopy(audio, at, out, 0, out.length);
    loud = Loquent.processDRC(handle.address(), out, out.length) == 1;
  }
}
