package com.zentq.tqe.phonoweave;

import java.util.concurrent.atomic.AtomicBoolean;

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
    NORMAL(0),
    /** By 18.4 dB. */
    STRONG(2);

    private final int mode;

    Strength(int mode) {
      this.mode = mode;
    }
  }

  private static final int FRAME = 160;

  /** The engine has one state for all suppressors of two microphones. */
  private static final AtomicBoolean TWO_MICROPHONES = new AtomicBoolean();

  private final NativeHandle handle;
  private final FrameCutter cutter;
  private final int delay;
  private final short[] in;

  private NoiseSuppressor(
      int mode, int microphones, int delayPerMicrophone, NativeHandle.Release release) {
    handle = new NativeHandle(this, Loquent.initializeDoNS(mode, microphones, 0), release);
    cutter = new FrameCutter(FRAME * microphones, microphones);
    delay = delayPerMicrophone * microphones;
    in = new short[FRAME * microphones];
  }

  /**
   * A suppressor for one microphone.
   *
   * @throws IllegalStateException if memory runs out
   */
  public static NoiseSuppressor forOneMicrophone(Strength strength) {
    if (strength == null) throw new IllegalArgumentException("no strength");
    NativeLibrary.load();
    NativeHandle.releaseForgotten();
    return new NoiseSuppressor(strength.mode, 1, 48, Loquent::freeMemoryDoNS);
  }

  /**
   * The suppressor for two microphones, whose samples are interleaved. Both channels of suppressed
   * audio are the same.
   *
   * @throws IllegalStateException if memory runs out, or if there is one already: only one may be
   *     open in a process
   */
  public static NoiseSuppressor forTwoMicrophones() {
    NativeLibrary.load();
    NativeHandle.releaseForgotten();
    if (!TWO_MICROPHONES.compareAndSet(false, true)) {
      throw new IllegalStateException("another suppressor of two microphones is open");
    }
    boolean made = false;
    try {
      NoiseSuppressor suppressor =
          new NoiseSuppressor(0, 2, FRAME, NoiseSuppressor::freeTwoMicrophones);
      made = true;
      return suppressor;
    } finally {
      if (!made) TWO_MICROPHONES.set(false);
    }
  }

  private static void freeTwoMicrophones(long address) {
    Loquent.freeMemoryDoNS(address);
    TWO_MICROPHONES.set(false);
  }

  /** By how many samples the output is late: 48, or 320 (160 pairs) with two microphones. */
  public int delaySamples() {
    return delay;
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
      return cutter.push(pcm, offset, count, this::suppress);
    }
  }

  /**
   * Ends the audio and returns the rest of the output; nothing when called again.
   *
   * @throws IllegalStateException after close, or if half a pair of samples is left
   */
  public short[] flush() {
    synchronized (handle) {
      handle.address();
      return cutter.flush(delay, this::suppress);
    }
  }

  /** Releases the suppressor. Does nothing the second time. */
  @Override
  public void close() {
    handle.close();
  }

  private void suppress(short[] audio, int at, short[] out) {
    System.arraycopy(audio, at, in, 0, in.length);
    // What the engine leaves alone is to come out late all the same.
    System.arraycopy(audio, at - delay, out, 0, out.length);
    Loquent.processDoNSFrame(handle.address(), in, in.length, out, out.length);
  }
}
