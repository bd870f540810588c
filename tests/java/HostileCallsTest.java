package com.zentq.tqe.phonoweave;

import static org.junit.jupiter.api.Assertions.assertArrayEquals;
import static org.junit.jupiter.api.Assertions.assertEquals;
import static org.junit.jupiter.api.Assertions.assertTrue;

import java.util.ArrayList;
import java.util.Collections;
import java.util.List;
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

  @Test
  void surviveByTheThousand() {
    EngineLog.off();
    String repeat = "repeat with -Dseed=" + SEED;
    int refused = 0;
    for (int i = 0; i < CALLS; i += 16) {
      long epd = Loquent.initializeEPD(pick(0, 1000, 21000, number()), pick(0, 2, -1));
      long ns = Loquent.initializeDoNS(
          pick(0, 2, 1000, 2000, 3000, number()), pick(1, 1, 2, 0, number()), number());
      long drc = Loquent.initializeDRC(pick(16000, number()), pick(0, 2, -1));
      for (int j = 0; j < 16; ++j) {
        short[] pcm = array();
        short[] out = random.nextInt(10) == 0 ? pcm : array();
        int[] bins = random.nextInt(8) == 0 ? null : new int[pick(0, 1, 64, 127, 128, 129)];
        short[] before = pcm == null ? null : pcm.clone();
        short[] outBefore = out == null ? null : out.clone();
        int count = count(pcm);
        int outCount = random.nextInt(4) == 0 ? number() : count;
        // Blocks of 20 ms at the highest rates are large: seldom.
        int rate = random.nextInt(50) == 0 ? number() : pick(0, 49, -1, 8000, 16000, 999_999);
        long handle = random.nextInt(10) == 0 ? 0 : 1;
        int method = random.nextInt(7);
        int result = switch (method) {
          case 0 -> Loquent.processEPDFrame(handle * epd, pcm, count);
          case 1 -> Loquent.ProcessEPDFrameByCnttype(handle * epd, pcm, count, number());
          case 2 -> Loquent.processDoNSFrame(handle * ns, pcm, count, out, outCount);
          case 3 -> Loquent.processDRC(handle == 0 ? pick(0, -1) : drc, pcm, count);
          case 4 -> Loquent.computeEnergyFrame(pcm, count, rate);
          case 5 -> Loquent.getSpectrum(pcm, bins, rate);
          default ->
              Loquent.resetEPDparams(handle * epd) + Loquent.LogEpdSetting(handle * epd, rate);
        };
        boolean tooMany = method < 5 && count > 0
            && (pcm == null || count > pcm.length
                || method == 2 && (out == null || count > out.length));
        refused += tooMany ? 1 : 0;
        if (tooMany || handle == 0 && method < 4) assertEquals(-1, result, repeat);
        if (handle == 0 && method == 6) assertEquals(-2, result, repeat);
        boolean enough = pcm != null && bins != null && pcm.length >= 160 && bins.length >= 128;
        if (method == 5) assertEquals(enough ? 1 : 0, result, repeat);
        boolean inPlace = method == 3 || method == 2 && out == pcm;
        if (result == -1 || !inPlace) assertArrayEquals(before, pcm, repeat);
        if (result == -1) assertArrayEquals(outBefore, out, repeat);
      }
      assertEquals(0, Loquent.freeMemoryEPD(epd));
      assertEquals(0, Loquent.freeMemoryDoNS(ns));
      assertEquals(0, Loquent.freeMemoryDRC(drc));
    }
    assertTrue(refused > CALLS / 20, refused + " refused; " + repeat);
  }

  /** What chance does not try often, and the line that tells of a wrong array or count. */
  @Test
  void refusalsAreTold() {
    long epd = Loquent.initializeEPD(0, 0);
    long ns = Loquent.initializeDoNS(0, 1, 0);
    short[] in = new short[160];
    List<Integer> results = new ArrayList<>();
    List<String> lines = LoquentTest.linesOf(() -> Collections.addAll(results,
        Loquent.processEPDFrame(epd, null, 160), Loquent.processEPDFrame(epd, in, 161),
        Loquent.processDoNSFrame(ns, in, 160, new short[159], 160),
        Loquent.processDoNSFrame(ns, in, 160, in.clone(), 80), Loquent.freeMemoryEPD(0),
        Loquent.freeMemoryDoNS(0), Loquent.freeMemoryDRC(0), Loquent.freeMemoryDRC(-1)));
    assertEquals(Collections.nCopies(8, -1), results);
    assertEquals(3, lines.stream().filter(line -> line.contains("asked of")).count());
    assertEquals(0, Loquent.computeEnergyFrame(in, 160, 49), "no block, no energy");
    assertEquals(0, Loquent.processEPDFrame(epd, null, -1), "no samples, no array");
    Loquent.freeMemoryEPD(epd);
    Loquent.freeMemoryDoNS(ns);
  }
}
