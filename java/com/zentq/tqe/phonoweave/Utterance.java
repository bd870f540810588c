package com.zentq.tqe.phonoweave;

/** A stretch of speech. Times are in samples since the detector was opened. */
public final class Utterance {
  /** First sample. */
  public final long start;

  /** One past the last sample. */
  public final long end;

  /** Samples processed when the detector first decided for speech. */
  public final long began;

  /** Samples processed when it last did. */
  public final long ended;

  /** 1, 2, 3 and so on. */
  public final int number;

  /** Whether the audio ended during the utterance. */
  public final boolean open;

  Utterance(long[] fields) {
    start = fields[0];
    end = fields[1];
    began = fields[2];
    ended = fields[3];
    number = (int) fields[4];
    open = fields[5] != 0;
  }

  @Override
  public String toString() {
    return "utterance " + number + ": " + start + " to " + end + (open ? ", open" : "");
  }
}
