package com.zentq.tqe.phonoweave;

import java.io.IOException;
import java.io.UncheckedIOException;
import java.nio.ByteBuffer;
import java.nio.ByteOrder;
import java.nio.file.Files;
import java.nio.file.Path;
import java.util.Arrays;

/** Real recordings, with 1000 zeros in the middle, which the engine takes for null audio. */
final class Audio {
  /** "go forward ten meters", 16 kHz. */
  static final short[] COMMAND = load("speech16", "goforward.raw", 0);

  /** A read sentence, 16 kHz. */
  static final short[] SENTENCE =
      load("speech16", "librivox/sense_and_sensibility_01_austen_64kb-0870.wav", 44);

  /** Speech at 8 kHz. */
  static final short[] NARROW = load("speech8", "raw/hts1a.raw", 0);

  /** Two microphones: the voice reaches the second later and quieter, with another from behind. */
  static final short[] PAIRS = new short[2 * COMMAND.length];

  static {
    for (int i = 0; i < COMMAND.length; ++i) {
      PAIRS[2 * i] = COMMAND[i];
      PAIRS[2 * i + 1] = (short) ((i < 3 ? 0 : COMMAND[i - 3] / 2) + SENTENCE[i] / 8);
    }
  }

  private Audio() {}

  private static short[] load(String folder, String name, int header) {
    try {
      byte[] bytes = Files.readAllBytes(Path.of(System.getProperty(folder), name));
      short[] samples = new short[(bytes.length - header) / 2];
      ByteBuffer.wrap(bytes, header, 2 * samples.length)
          .order(ByteOrder.LITTLE_ENDIAN).asShortBuffer().get(samples);
      Arrays.fill(samples, samples.length / 2, samples.length / 2 + 1000, (short) 0);
      return samples;
    } catch (IOException error) {
      throw new UncheckedIOException(error);
    }
  }
}
