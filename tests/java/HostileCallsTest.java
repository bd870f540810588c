package com.zentq.tqe.phonoweave;

import static org.junit.jupiter.api.Assertions.assertArrayEquals;
import static org.junit.jupiter.api.Assertions.assertEquals;
import static org.junit.jupiter.api.Assertions.assertTrue;

import java.util.Random;
import org.junit.jupiter.api.Test;

/** Any arguments but invented handles: the process survives, and refusals change nothing. */
class HostileCallsTest {
  private static final int CALLS = 20_000;
  private static final long SEED = Long.getLong("seed", System.nanoTime());

  private final Random random = new Random(SEED);

  private int pick(int... values) {
    return values[random.nextInt(values.length)];
  }

  private int number() {
    return pick(0, 1, -1, 49, 80, 159, 160, 320, 8000, 16000, random.nextInt(5000),
        random.nextInt(), Integer.MIN_VALUE, Integer.MAX_VALUE);
  }

  private short[] array() {
    int length = pick(0, 1, 79, 80, 128, 159, 160, 161, 320, 1000, random.nextInt(3000));
    if (random.nextInt(8) == 0) return null;
    short[] array = new short[random.nextInt(300) == 0 ? 100_000 : length];
    int scale = pick(1, 5, 1000, 65536);
    for (int i = 0; i < array.length; ++i) array[i] = (short) random.nextInt(scale);
    return array;
  }

  private int count(short[] array) {
    int length = array == null ? 0 : array.length;
    return pick(length, length, length, length - 1, length + 1, length / 2, -length, number());
  }

  /** Blocks of 20 ms at the highest rates are large: seldom. */
  private int rate() {
    int rate = number();
    return rate > 1_000_000 && random.nextInt(50) != 0 ? 16000 : rate;
  }

  private static short[] copy(short[] array) {
    return array == null ? null : array.clone();
  }

  @Test
  void surviveByTheThousand() {
    EngineLog.off();
    String repeat = "repeat with -Dseed=" + SEED;
    int refused = 0;
    for (int i = 0; i < CALLS; i += 16) {
      long epd = Loquent.initializeEPD(pick(0, 1000, 21000, number()), pick(0, 2, -1));
      long ns = Loquent.initializeDoNS(pick(0, 2, 1000, 2000, 3000, number()), pick(1, 1, 2, 0, number()), number());
      long drc = Loquent.initializeDRC(pick(16000, number()), pick(0, 2, -1));
      for (int j = 0; j < 16; ++j) {
        short[] pcm = array();
        short[] before = copy(pcm);
        int count = count(pcm);
        boolean tooMany = count > 0 && count > (pcm == null ? 0 : pcm.length);
        long none = random.nextInt(10) == 0 ? 0 : -1;
        int method = random.nextInt(7);
        int result = 0;
        switch (method) {
          case 0:
            result = Loquent.processEPDFrame(none == 0 ? 0 : epd, pcm, count);
            break;
          case 1:
            result = Loquent.ProcessEPDFrameByCnttype(none == 0 ? 0 : epd, pcm, count, number());
            break;
          case 2:
            short[] out = random.nextInt(10) == 0 ? pcm : array();
            short[] outBefore = copy(out);
            int outCount = random.nextInt(4) == 0 ? number() : count;
            result = Loquent.processDoNSFrame(none == 0 ? 0 : ns, pcm, count, out, outCount);
            if (count > 0 && count > (out == null ? 0 : out.length)) tooMany = true;
            if (result == -1) assertArrayEquals(outBefore, out, repeat);
            if (out == pcm) before = copy(pcm);
            break;
          case 3:
            result = Loquent.processDRC(random.nextInt(10) == 0 ? none : drc, pcm, count);
            if (result != -1) before = copy(pcm);
            break;
          case 4:
            result = Loquent.computeEnergyFrame(pcm, count, rate());
            break;
          case 5:
            int[] bins = random.nextInt(8) == 0 ? null : new int[pick(0, 1, 64, 127, 128, 129)];
            int spectrum = Loquent.getSpectrum(pcm, bins, number());
            boolean enough = pcm != null && bins != null && pcm.length >= 160 && bins.length >= 128;
            assertEquals(enough ? 1 : 0, spectrum, repeat);
            tooMany = false;
            break;
          default:
            Loquent.resetEPDparams(none == 0 ? 0 : epd);
            Loquent.LogEpdSetting(none == 0 ? 0 : epd, number());
            tooMany = false;
        }
        if (tooMany) {
          ++refused;
          assertEquals(-1, result, repeat);
        }
        assertArrayEquals(before, pcm, repeat);
      }
      assertEquals(0, Loquent.freeMemoryEPD(epd));
      assertEquals(0, Loquent.freeMemoryDoNS(ns));
      assertEquals(0, Loquent.freeMemoryDRC(drc));
    }
    assertTrue(refused > CALLS / 20, refused + " refused; " + repeat);
  }
}
