package com.zentq.tqe.phonoweave;

import java.util.Arrays;

/** Cuts audio of any length into whole frames, and brings the last one to its full length. */
final class FrameCutter {
  interface Work {
    /**
     * Works on one frame.
     *
     * @param audio holds the frame from {@code at} on, and what came before it in front
     * @param out takes the result from its beginning on
     */
    void work(short[] audio, int at, short[] out);
  }

  private final int frame;
  private final int channels;

  /** Two frames of the past, zeros at first, and the frame that is being filled. */
  private final short[] audio;

  private final short[] result;
  private int filled;
  private int past;
  private boolean flushed;

  FrameCutter(int frameSamples, int channels) {
    this.frame = frameSamples;
    this.channels = channels;
    this.audio = new short[3 * frameSamples];
    this.result = new short[frameSamples];
  }

  /** The results of the frames that these samples complete. */
  short[] push(short[] pcm, int offset, int count, Work work) {
    checkRange(pcm, offset, count);
    if (flushed) throw new IllegalStateException("pushed after the flush");
    int frames = count / frame + (filled + count % frame) / frame;
    short[] out = new short[frames * frame];
    for (int done = 0, ready = 0; done < count; ) {
      int taken = Math.min(count - done, frame - filled);
      System.arraycopy(pcm, offset + done, audio, 2 * frame + filled, taken);
      filled += taken;
      done += taken;
      if (filled == frame) {
        finishFrame(work);
        System.arraycopy(result, 0, out, ready, frame);
        ready += frame;
      }
    }
    return out;
  }

  /**
   * Ends the audio: the results of what is left and of {@code delay} samples more, for which the end
   * of the audio is mirrored. Zeros would be taken for null audio. Nothing the second time.
   */
  short[] flush(int delay, Work work) {
    if (filled % channels != 0) {
      throw new IllegalStateException("the last sample of one channel has no partner");
    }
    int known = past + filled;
    short[] out = new short[flushed || known == 0 ? 0 : filled + delay];
    flushed = true;
    if (out.length == 0) return out;
    short[] tail = Arrays.copyOfRange(audio, 2 * frame - past, 2 * frame + filled);
    for (int ready = 0, mirrored = 0; ready < out.length; ready += frame) {
      for (; filled < frame; ++filled, ++mirrored) {
        audio[2 * frame + filled] = mirror(tail, mirrored);
      }
      finishFrame(work);
      System.arraycopy(result, 0, out, ready, Math.min(frame, out.length - ready));
    }
    return out;
  }

  /** Sample {@code at} behind the end of a tail that is read backwards, forwards, and so on. */
  private short mirror(short[] tail, int at) {
    int length = tail.length / channels;
    int step = at / channels % (2 * length);
    int position = step < length ? length - 1 - step : step - length;
    return tail[position * channels + at % channels];
  }

  private void finishFrame(Work work) {
    work.work(audio, 2 * frame, result);
    System.arraycopy(audio, frame, audio, 0, 2 * frame);
    past = Math.min(past + frame, 2 * frame);
    filled = 0;
  }

  /** Throws if the samples are not all in the array. */
  static void checkRange(short[] pcm, int offset, int count) {
    if (pcm == null) throw new IllegalArgumentException("no samples");
    if (offset < 0 || count < 0 || offset > pcm.length - count) {
      throw new IllegalArgumentException(
          count + " samples from " + offset + " on, in an array of " + pcm.length);
    }
  }
}
