package com.zentq.tqe.phonoweave;

import java.util.Arrays;

/** The library's enhancement stream: suppression and dynamics control, in chunks of any size. */
final class EnhancementStream {
  private final NativeHandle handle;
  private final int microphones;
  private final int delay;
  private boolean loud;

  /**
   * Opens a stream, which is released some time after its owner was collected.
   *
   * @throws IllegalStateException if memory runs out
   */
  EnhancementStream(
      Object owner, int microphones, int suppressionDb, boolean level, boolean aligned) {
    NativeLibrary.load();
    NativeHandle.releaseForgotten();
    long stream = SafeLayer.openEnhancement(microphones, suppressionDb, level, aligned);
    this.handle = new NativeHandle(owner, stream, SafeLayer::closeEnhancement);
    this.microphones = microphones;
    this.delay = SafeLayer.enhancementDelay(stream);
  }

  /** In samples of a microphone. */
  int delay() {
    return delay;
  }

  /** The output that is ready after these samples. */
  short[] push(short[] pcm, int offset, int count) {
    handle.enter();
    try {
      long stream = handle.address();
      SafeLayer.checkRange(pcm, offset, count);
      short[] out = new short[count / microphones + SafeLayer.MAX_EXTRA_PER_PUSH];
      int ready = SafeLayer.enhance(stream, pcm, offset, count, out);
      if (ready < 0) throw new IllegalStateException("pushed after the flush");
      loud = SafeLayer.isLoud(stream);
      return Arrays.copyOf(out, ready);
    } finally {
      handle.leave();
    }
  }

  /** The rest of the output; nothing the second time. */
  short[] flush() {
    handle.enter();
    try {
      long stream = handle.address();
      short[] out = new short[SafeLayer.MAX_PER_FLUSH];
      int ready = SafeLayer.flushEnhancement(stream, out);
      if (ready < 0) {
        throw new IllegalStateException("the last pair of samples is incomplete");
      }
      loud = SafeLayer.isLoud(stream);
      return Arrays.copyOf(out, ready);
    } finally {
      handle.leave();
    }
  }

  /** Whether the newest frame was loud. */
  boolean isLoud() {
    handle.enter();
    try {
      return loud;
    } finally {
      handle.leave();
    }
  }

  void close() {
    handle.close();
  }
}
