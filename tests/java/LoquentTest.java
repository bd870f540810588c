package com.zentq.tqe.phonoweave;

import static org.junit.jupiter.api.Assertions.assertArrayEquals;
import static org.junit.jupiter.api.Assertions.assertEquals;
import static org.junit.jupiter.api.Assertions.assertFalse;
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
import java.util.function.ToIntFunction;
import java.util.logging.Level;
import java.util.logging.Logger;
import org.junit.jupiter.api.BeforeEach;
import org.junit.jupiter.api.Test;
import org.junit.jupiter.params.ParameterizedTest;
import org.junit.jupiter.params.provider.CsvSource;

/** The raw methods: what they return, what they do to arrays, and their loading. */
class LoquentTest {
  /** Never collected: the Java machine itself reads freed memory when it unloads a library. */
  private static ClassLoader shrunk;

  @BeforeEach
  void quiet() {
    EngineLog.off();
  }

  /** Of the results and samples of a call on each whole frame. */
  private static int digest(short[] pcm, int frame, ToIntFunction<short[]> call) {
    int digest = 1;
    for (int at = 0; at + frame <= pcm.length; at += frame) {
      short[] samples = Arrays.copyOfRange(pcm, at, at + frame);
      digest = 31 * digest + call.applyAsInt(samples);
      digest = 31 * digest + Arrays.hashCode(samples);
    }
    return digest;
  }

  static int detector(int mode, int contentType) {
    int frame = mode % 10000 == 1000 ? 80 : 160;
    long epd = Loquent.initializeEPD(mode, 0);
    int digest = digest(frame == 80 ? Audio.NARROW : Audio.SENTENCE, frame, pcm ->
        contentType < 0
            ? Loquent.processEPDFrame(epd, pcm, frame)
            : Loquent.ProcessEPDFrameByCnttype(epd, pcm, frame, contentType));
    assertEquals(0, Loquent.freeMemoryEPD(epd));
    return digest;
  }

  private static int suppressor(int mode, int microphones, boolean inPlace) {
    int frame = 160 * microphones;
    long ns = Loquent.initializeDoNS(mode, microphones, -5);
    int digest = digest(microphones == 2 ? Audio.PAIRS : Audio.COMMAND, frame, in -> {
      short[] out = in.clone();
      int count = Loquent.processDoNSFrame(ns, in, frame, inPlace ? in : out, frame);
      if (!inPlace) System.arraycopy(out, 0, in, 0, frame);
      return count;
    });
    assertEquals(0, Loquent.freeMemoryDoNS(ns));
    return digest;
  }

  private static int dynamics(int rateHz) {
    long drc = Loquent.initializeDRC(rateHz, 0);
    int digest = digest(Audio.SENTENCE, 160, pcm -> Loquent.processDRC(drc, pcm, 160));
    assertEquals(0, Loquent.freeMemoryDRC(drc));
    return digest;
  }

  private static int energy(int rateHz) {
    int block = rateHz / 50;
    return digest(Audio.COMMAND, block, pcm -> Loquent.computeEnergyFrame(pcm, block, rateHz));
  }

  private static int spectrum(int rateHz) {
    int[] bins = new int[130];
    return digest(Audio.COMMAND, 160,
        pcm -> Loquent.getSpectrum(pcm, bins, rateHz) * Arrays.hashCode(bins));
  }

  /** Digests of recordings; what frames become is for the engine's own tests. */
  @Test
  void resultsAreTheEngines() {
    int[][] digests = {
      {1402401368, detector(0, -1)}, {926912461, detector(0, 2)}, {1976655238, detector(10000, -1)},
      {1806826248, detector(1000, -1)}, {1173739860, detector(1000, 2)},
      {-1518560025, detector(21000, 0)}, {300733821, suppressor(0, 1, false)},
      {300733821, suppressor(0, 1, true)}, {1145409857, suppressor(2, 1, false)},
      {-408768905, suppressor(0, 2, false)}, {-1929826381, suppressor(0, 3, false)},
      {-1931991891, suppressor(1000, 1, false)}, {1513174269, dynamics(16000)},
      {-309864843, dynamics(8000)}, {1412237846, energy(16000)}, {1410945171, energy(8000)},
      {1153632015, spectrum(16000)}, {894250737, spectrum(8000)}
    };
    for (int[] pair : digests) assertEquals(pair[0], pair[1], () -> Arrays.deepToString(digests));
  }

  /** A partial last frame counts as if zeros followed, whatever lies behind it in the array. */
  @ParameterizedTest
  @CsvSource({"900,960", "500,640"}) // copied to the heap, and to the stack
  void partialFramesAreFollowedByZeros(int count, int whole) {
    short[] pcm = Arrays.copyOfRange(Audio.COMMAND, 8000, 8000 + 1920);
    short[] padded = Arrays.copyOf(Arrays.copyOf(pcm, count), 1920);
    for (int microphones = 1; microphones <= 2; ++microphones) {
      short[] out = suppressed(0, microphones, pcm, count);
      short[] expected = Arrays.copyOf(suppressed(0, microphones, padded, whole), count);
      assertArrayEquals(Arrays.copyOf(expected, 1920), out);
    }
    // With frames of 80 samples the suppressor reaches 80 samples beyond the last one.
    assertNotEquals(0, suppressed(3000, 1, pcm, 1920)[1919]);
    int energy = Loquent.computeEnergyFrame(padded, whole, 16000);
    assertEquals(energy, Loquent.computeEnergyFrame(pcm, count, 16000));
    short[] expected = levelled(padded, whole);
    System.arraycopy(pcm, count, expected, count, 1920 - count);
    assertArrayEquals(expected, levelled(pcm, count));
  }

  private static short[] suppressed(int mode, int microphones, short[] pcm, int count) {
    short[] out = new short[pcm.length];
    long ns = Loquent.initializeDoNS(mode, microphones, 0);
    Loquent.processDoNSFrame(ns, pcm, count, out, count);
    Loquent.freeMemoryDoNS(ns);
    return out;
  }

  private static short[] levelled(short[] pcm, int count) {
    short[] levelled = pcm.clone();
    long drc = Loquent.initializeDRC(16000, 0);
    Loquent.processDRC(drc, levelled, count);
    Loquent.freeMemoryDRC(drc);
    return levelled;
  }

  @Test
  void versionAndHangoverLinesAreTheEngines() {
    assertEquals("160705", Loquent.GetVersion());
    long epd = Loquent.initializeEPD(0, 0);
    Runnable detect = () -> digest(Audio.COMMAND, 160, pcm -> Loquent.processEPDFrame(epd, pcm, 160));
    assertTrue(linesOf(detect).toString().contains("HANGframe"));
    assertEquals(0, Loquent.LogEpdSetting(epd, 1));
    assertFalse(linesOf(detect).toString().contains("HANGframe"));
    assertEquals(0, Loquent.resetEPDparams(epd));
    assertTrue(linesOf(detect).toString().contains("HANGframe"));
    Loquent.freeMemoryEPD(epd);
  }

  static List<String> linesOf(Runnable work) {
    return linesOf(work, () -> {});
  }

  /** The engine's lines meanwhile, on each of which a handler runs; that it throws does no harm. */
  static List<String> linesOf(Runnable work, Runnable handler) {
    List<String> lines = Collections.synchronizedList(new ArrayList<>());
    Logger logger = Logger.getAnonymousLogger();
    logger.setLevel(Level.ALL);
    logger.setFilter(line -> {
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
    List<String> rights = new ArrayList<>();
    for (Path path : List.of(copy, copy.getParent())) {
      rights.add(PosixFilePermissions.toString(Files.getPosixFilePermissions(path)));
      Files.delete(path);
    }
    assertEquals(List.of("rw-------", "rwx------"), rights);
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
