package com.zentq.tqe.phonoweave;

import java.io.IOException;
import java.io.UncheckedIOException;
import java.nio.ByteBuffer;
import java.nio.ByteOrder;
import java.nio.file.Files;
import java.nio.file.Path;
import java.util.Arrays;

/** Real recordings, and what the tests make of them. */
final class Audio {
  private Audio() {}

  /** "go forward ten meters", 16 kHz. */
  static short[] command() {
    return load("speech16", "goforward.raw", 0);
  }

  /** A read sentence, 16 kHz. */
  static short[] sentence() {
    return load("speech16", "librivox/sense_and_sensibility_01_austen_64kb-0870.wav", 44);
  }

  /** Speech at 8 kHz. */
  static short[] narrowBand() {
    return load("speech8", "raw/hts1a.raw", 0);
  }

  /** Two microphones: the voice reaches the second later and quieter, with another one from behind. */
  static short[] twoMicrophones() {
    short[] voice = command();
    short[] other = sentence();
    short[] pairs = new short[2 * voice.length];
    for (int i = 0; i < voice.length; ++i) {
      pairs[2 * i] = voice[i];
      pairs[2 * i + 1] = (short) ((i < 3 ? 0 : voice[i - 3] / 2) + other[i] / 8);
    }
    return pairs;
  }

  /** The recording with 1000 zeros in it, which the engine takes for null audio. */
  static short[] withGap(short[] pcm) {
    short[] gapped = pcm.clone();
    Arrays.fill(gapped, pcm.length / 2, pcm.length / 2 + 1000, (short) 0);
    return gapped;
  }

  static short[] concat(short[] a, short[] b) {
    short[] both = Arrays.copyOf(a, a.length + b.length);
    System.arraycopy(b, 0, both, a.length, b.length);
    return both;
  }

  private static short[] load(String folder, String name, int header) {
    try {
      byte[] bytes = Files.readAllBytes(Path.of(System.getProperty(folder), name));
      short[] samples = new short[(bytes.length - header) / 2];
      ByteBuffer.wrap(bytes, header, 2 * samples.length)
          .order(ByteOrder.LITTLE_ENDIAN)
          .asShortBuffer()
          .get(samples);
      return samples;
    } catch (IOException error) {
      throw new UncheckedIOException(error);
    }
  }
}
