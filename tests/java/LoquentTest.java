package com.zentq.tqe.phonoweave;

import static org.junit.jupiter.api.Assertions.assertArrayEquals;
import static org.junit.jupiter.api.Assertions.assertEquals;
import static org.junit.jupiter.api.Assertions.assertNotEquals;
import static org.junit.jupiter.api.Assertions.assertTrue;

import java.net.URL;
import java.net.URLClassLoader;
import java.nio.file.Files;
import java.nio.file.Path;
import java.nio.file.attribute.PosixFilePermissions;
import java.util.ArrayList;
import java.util.Arrays;
import java.util.Collections;
import java.util.List;
import java.util.logging.Level;
import java.util.logging.Logger;
import org.junit.jupiter.api.BeforeEach;
import org.junit.jupiter.api.Test;
import org.junit.jupiter.params.ParameterizedTest;
import org.junit.jupiter.params.provider.CsvSource;
import org.junit.jupiter.params.provider.ValueSource;

/** The native methods against the flat C interface, what they do to arrays, and their loading. */
class LoquentTest {
  private static final int RESET_AT = 100;

  /** Never collected: the Java machine itself reads freed memory when it unloads a library. */
  private static ClassLoader shrunk;

  @BeforeEach
  void quiet() {
    EngineLog.off();
  }

  private interface Call {
    int on(int at, short[] frame);
  }

  /** The result for each whole frame, none of which may be changed. */
  private static int[] results(short[] pcm, int frame, Call call) {
    int[] results = new int[pcm.length / frame];
    for (int i = 0; i < results.length; ++i) {
      int at = i * frame;
      short[] samples = Arrays.copyOfRange(pcm, at, at + frame);
      results[i] = call.on(at, samples);
      assertArrayEquals(Arrays.copyOfRange(pcm, at, at + frame), samples);
    }
    return results;
  }

  @ParameterizedTest
  @CsvSource({"0,-1", "0,0", "0,2", "10000,-1", "1000,-1", "1000,2", "21000,0"})
  void detectorDecidesAsInC(int mode, int contentType) {
    boolean narrow = mode % 10000 == 1000;
    short[] pcm = Audio.withGap(narrow ? Audio.narrowBand() : Audio.sentence());
    int frame = narrow ? 80 : 160;
    long epd = Loquent.initializeEPD(mode, 0);
    Call call =
        (at, samples) -> {
          if (at == RESET_AT * frame) assertEquals(0, Loquent.resetEPDparams(epd));
          return contentType < 0
              ? Loquent.processEPDFrame(epd, samples, frame)
              : Loquent.ProcessEPDFrameByCnttype(epd, samples, frame, contentType);
        };
    int[] results = results(pcm, frame, call);
    assertEquals(0, Loquent.freeMemoryEPD(epd));
    assertArrayEquals(Bridge.epd(mode, pcm, frame, contentType, RESET_AT), results);
    assertTrue(Arrays.stream(results).sum() > 0, "there is speech");
  }

  @ParameterizedTest
  @CsvSource({"0,1", "2,1", "0,2", "0,3", "1000,1"})
  void suppressorWorksAsInC(int mode, int microphones) {
    short[] pcm = Audio.withGap(microphones == 2 ? Audio.twoMicrophones() : Audio.command());
    int frame = microphones == 2 ? 320 : 160;
    short[] expected = new short[pcm.length];
    Arrays.fill(expected, (short) 77);
    short[] result = expected.clone();
    long ns = Loquent.initializeDoNS(mode, microphones, -5);
    long inPlace = Loquent.initializeDoNS(mode, 1, 0);
    Call call =
        (at, in) -> {
          short[] out = Arrays.copyOfRange(result, at, at + frame);
          int count = Loquent.processDoNSFrame(ns, in, frame, out, frame);
          if (microphones == 1) {
            short[] both = in.clone();
            assertEquals(count, Loquent.processDoNSFrame(inPlace, both, frame, both, frame));
            assertArrayEquals(out[0] == 77 && out[159] == 77 ? in : out, both, "one array for both");
          }
          System.arraycopy(out, 0, result, at, frame);
          return count;
        };
    int[] counts = results(pcm, frame, call);
    assertEquals(0, Loquent.freeMemoryDoNS(ns));
    assertEquals(0, Loquent.freeMemoryDoNS(inPlace));
    assertArrayEquals(Bridge.ns(mode, microphones, pcm, expected, frame), counts);
    assertArrayEquals(expected, result);
    // Frames that are left alone keep what was there, the gap's among them.
    assertEquals(77, result[pcm.length / 2 + 500]);
    assertEquals(microphones < 3 && mode < 1000, result[pcm.length / 4] != 77);
  }

  @ParameterizedTest
  @ValueSource(ints = {16000, 8000})
  void dynamicsControlWorksAsInC(int rateHz) {
    short[] original = Audio.sentence();
    short[] expected = original.clone();
    short[] result = original.clone();
    long drc = Loquent.initializeDRC(rateHz, 0);
    Call call =
        (at, samples) -> {
          short[] frame = samples.clone();
          int loud = Loquent.processDRC(drc, frame, 160);
          System.arraycopy(frame, 0, result, at, 160);
          return loud;
        };
    int[] results = results(original, 160, call);
    assertEquals(0, Loquent.freeMemoryDRC(drc));
    assertArrayEquals(Bridge.drc(rateHz, expected, 160), results);
    assertArrayEquals(expected, result);
    assertEquals(rateHz == 16000, !Arrays.equals(original, expected), "in place");
  }

  @ParameterizedTest
  @ValueSource(ints = {16000, 8000})
  void queriesReturnAsInC(int rateHz) {
    short[] pcm = Audio.command();
    int block = rateHz / 50;
    int[] energies =
        results(pcm, block, (at, samples) -> Loquent.computeEnergyFrame(samples, block, rateHz));
    assertArrayEquals(Bridge.energy(rateHz, pcm, block), energies);
    assertTrue(Arrays.stream(energies).max().getAsInt() > 40);

    int[] spectra = new int[pcm.length / 160 * 128];
    Call call =
        (at, samples) -> {
          int[] spectrum = new int[130];
          assertEquals(1, Loquent.getSpectrum(samples, spectrum, rateHz));
          System.arraycopy(spectrum, 0, spectra, at / 160 * 128, 128);
          return spectrum[128] + spectrum[129];
        };
    assertEquals(0, Arrays.stream(results(pcm, 160, call)).sum(), "nothing behind the bins");
    assertArrayEquals(Bridge.spectrum(rateHz, pcm), spectra);
  }

  /** A partial last frame counts as if zeros followed, whatever lies behind it in the array. */
  @Test
  void partialFramesAreFollowedByZeros() {
    short[] pcm = Arrays.copyOfRange(Audio.command(), 16000, 16000 + 960);
    short[] padded = Arrays.copyOf(Arrays.copyOf(pcm, 900), 960);
    for (int microphones = 1; microphones <= 2; ++microphones) {
      short[] out = suppressedAtOnce(microphones, pcm, 900);
      short[] expected = suppressedAtOnce(microphones, padded, 960);
      assertArrayEquals(Arrays.copyOf(expected, 900), Arrays.copyOf(out, 900));
      assertArrayEquals(new short[60], Arrays.copyOfRange(out, 900, 960));
    }
    short[] rest = Arrays.copyOfRange(pcm, 900, 960);
    for (short[] samples : new short[][] {pcm, padded}) {
      long drc = Loquent.initializeDRC(16000, 0);
      Loquent.processDRC(drc, samples, samples == pcm ? 900 : 960);
      Loquent.freeMemoryDRC(drc);
    }
    assertArrayEquals(Arrays.copyOf(padded, 900), Arrays.copyOf(pcm, 900));
    assertArrayEquals(rest, Arrays.copyOfRange(pcm, 900, 960));
    assertEquals(
        Loquent.computeEnergyFrame(padded, 960, 16000),
        Loquent.computeEnergyFrame(pcm, 900, 16000));
  }

  private static short[] suppressedAtOnce(int microphones, short[] pcm, int count) {
    short[] out = new short[pcm.length];
    long ns = Loquent.initializeDoNS(0, microphones, 0);
    assertEquals(960, Loquent.processDoNSFrame(ns, pcm, count, out, count));
    Loquent.freeMemoryDoNS(ns);
    return out;
  }

  /** With frames of 80 samples the suppressor reaches 80 samples beyond the last one. */
  @Test
  void theSuppressorsReachIsWithinTheCopy() {
    short[] pcm = Arrays.copyOfRange(Audio.command(), 16000, 16000 + 1920);
    short[] out = new short[1920];
    long ns = Loquent.initializeDoNS(3000, 1, 0);
    assertEquals(1920, Loquent.processDoNSFrame(ns, pcm, 1920, out, 1920));
    assertNotEquals(0, out[1919]);
    Loquent.freeMemoryDoNS(ns);
  }

  @Test
  void wrongArgumentsAreRefusedAndChangeNothing() {
    long epd = Loquent.initializeEPD(0, 0);
    long ns = Loquent.initializeDoNS(0, 1, 0);
    long drc = Loquent.initializeDRC(16000, 0);
    short[] loud = new short[160];
    for (int i = 0; i < 160; ++i) loud[i] = (short) (i % 2 == 0 ? 9000 : -9000);
    short[] in = loud.clone();
    short[] out = loud.clone();
    int[] bins = new int[127];
    List<String> lines = linesOf(() -> {
      int[] refused = {
        Loquent.processEPDFrame(epd, null, 160),
        Loquent.processEPDFrame(epd, in, 161),
        Loquent.processEPDFrame(0, in, 160),
        Loquent.ProcessEPDFrameByCnttype(epd, in, Integer.MAX_VALUE, 0),
        Loquent.processDoNSFrame(ns, null, 160, out, 160),
        Loquent.processDoNSFrame(ns, in, 160, null, 160),
        Loquent.processDoNSFrame(ns, in, 160, new short[159], 160),
        Loquent.processDoNSFrame(ns, in, 320, out, 320),
        Loquent.processDoNSFrame(ns, in, 160, out, 80),
        Loquent.processDoNSFrame(ns, in, 0, out, 1),
        Loquent.processDoNSFrame(0, in, 160, out, 160),
        Loquent.processDRC(drc, null, 160),
        Loquent.processDRC(drc, in, 161),
        Loquent.processDRC(0, in, 160),
        Loquent.processDRC(-1, in, 160),
        Loquent.computeEnergyFrame(null, 1, 16000),
        Loquent.computeEnergyFrame(in, 161, 16000),
        Loquent.resetEPDparams(0),
        Loquent.LogEpdSetting(0, 1),
        Loquent.freeMemoryEPD(0),
        Loquent.freeMemoryDoNS(0),
        Loquent.freeMemoryDRC(0),
        Loquent.freeMemoryDRC(-1)
      };
      for (int i = 0; i < refused.length; ++i) assertEquals(-1, refused[i], "call " + i);
      int[] nothing = {
        Loquent.getSpectrum(null, new int[128], 16000),
        Loquent.getSpectrum(in, null, 16000),
        Loquent.getSpectrum(in, bins, 16000),
        Loquent.getSpectrum(new short[159], new int[128], 16000),
        Loquent.processEPDFrame(epd, in, 0),
        Loquent.processEPDFrame(epd, in, Integer.MIN_VALUE),
        Loquent.processEPDFrame(epd, null, -1),
        Loquent.processDoNSFrame(ns, in, 0, out, 0),
        Loquent.processDoNSFrame(ns, in, -7, out, -7),
        Loquent.processDRC(drc, in, -160),
        Loquent.computeEnergyFrame(in, 160, 49),
        Loquent.computeEnergyFrame(in, -1, 16000)
      };
      for (int i = 0; i < nothing.length; ++i) assertEquals(0, nothing[i], "call " + i);
    });
    // One line for each wrong array or count; none for handles, other rates, 0 and -1 DRC.
    assertEquals(11 + 4 + 5, lines.stream().filter(line -> line.contains("asked of")).count());
    assertArrayEquals(loud, in);
    assertArrayEquals(loud, out);
    assertArrayEquals(new int[127], bins);
    Loquent.freeMemoryEPD(epd);
    Loquent.freeMemoryDoNS(ns);
    Loquent.freeMemoryDRC(drc);
  }

  @Test
  void versionAndHangoverLinesAreTheEngines() {
    assertEquals("160705", Loquent.GetVersion());
    String hangover = "HANGframe";
    for (boolean off : new boolean[] {false, true}) {
      long epd = Loquent.initializeEPD(0, 0);
      if (off) assertEquals(0, Loquent.LogEpdSetting(epd, 1));
      Runnable process =
          () -> results(Audio.command(), 160, (at, pcm) -> Loquent.processEPDFrame(epd, pcm, 160));
      boolean logged = linesOf(process).stream().anyMatch(line -> line.contains(hangover));
      assertNotEquals(off, logged);
      Loquent.resetEPDparams(epd);
      assertTrue(linesOf(process).stream().anyMatch(line -> line.contains(hangover)));
      Loquent.freeMemoryEPD(epd);
    }
  }

  static List<String> linesOf(Runnable work) {
    return linesOf(work, () -> {});
  }

  /** The engine's lines meanwhile, on each of which a handler runs; that it throws does no harm. */
  static List<String> linesOf(Runnable work, Runnable handler) {
    List<String> lines = Collections.synchronizedList(new ArrayList<>());
    Logger logger = Logger.getAnonymousLogger();
    logger.setLevel(Level.ALL);
    logger.setFilter(
        line -> {
          lines.add(line.getLevel() + " " + line.getMessage());
          handler.run();
          throw new IllegalStateException("a logger's own fault");
        });
    EngineLog.toLogger(logger);
    work.run();
    EngineLog.off();
    return lines;
  }

  @Test
  void theCopyIsItsOwnersOnly() throws Exception {
    Path copy = NativeLibrary.createCopy();
    List<String> rights =
        List.of(
            PosixFilePermissions.toString(Files.getPosixFilePermissions(copy.getParent())),
            PosixFilePermissions.toString(Files.getPosixFilePermissions(copy)));
    Files.delete(copy);
    Files.delete(copy.getParent());
    assertEquals(List.of("rwx------", "rw-------"), rights);
  }

  /** As after shrinking. A class loader of its own has a library of its own, the jar's. */
  @Test
  void loquentNeedsNoSafeClasses() throws Exception {
    List<String> kept = List.of(Loquent.class.getName(), NativeLibrary.class.getName());
    URL jar = Loquent.class.getProtectionDomain().getCodeSource().getLocation();
    shrunk =
        new URLClassLoader(new URL[] {jar}, null) {
          @Override
          protected Class<?> findClass(String name) throws ClassNotFoundException {
            if (!kept.contains(name)) throw new ClassNotFoundException(name);
            return super.findClass(name);
          }
        };
    Class<?> loquent = shrunk.loadClass(Loquent.class.getName());
    assertEquals("160705", loquent.getMethod("GetVersion").invoke(null));
  }
}
