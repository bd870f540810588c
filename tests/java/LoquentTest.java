package com.zentq.tqe.phonoweave;

import static org.junit.jupiter.api.Assertions.assertArrayEquals;
import static org.junit.jupiter.api.Assertions.assertEquals;
import static org.junit.jupiter.api.Assertions.assertNotEquals;
import static org.junit.jupiter.api.Assertions.assertTrue;

import java.util.ArrayList;
import java.util.Arrays;
import java.util.List;
import java.util.function.ToIntFunction;
import java.util.logging.Handler;
import java.util.logging.Level;
import java.util.logging.LogRecord;
import java.util.logging.Logger;
import org.junit.jupiter.api.BeforeEach;
import org.junit.jupiter.api.Test;
import org.junit.jupiter.params.ParameterizedTest;
import org.junit.jupiter.params.provider.CsvSource;
import org.junit.jupiter.params.provider.ValueSource;

/** The native methods against the flat C interface, and what they do to arrays. */
class LoquentTest {
  private static final int RESET_AT = 100;

  @BeforeEach
  void quiet() {
    EngineLog.off();
  }

  /** One answer for each whole frame. */
  private static int[] answers(short[] pcm, int frame, ToIntFunction<short[]> call) {
    int[] answers = new int[pcm.length / frame];
    for (int i = 0; i < answers.length; ++i) {
      answers[i] = call.applyAsInt(Arrays.copyOfRange(pcm, i * frame, (i + 1) * frame));
    }
    return answers;
  }

  @ParameterizedTest
  @CsvSource({"0,-1", "0,0", "0,2", "10000,-1", "1000,-1", "1000,2", "21000,0"})
  void detectorAnswersAsInC(int mode, int contentType) {
    boolean narrow = mode % 10000 == 1000;
    short[] pcm = Audio.withGap(narrow ? Audio.narrowBand() : Audio.sentence());
    int frame = narrow ? 80 : 160;
    long epd = Loquent.initializeEPD(mode, 0);
    int[] number = {0};
    int[] answers =
        answers(
            pcm,
            frame,
            samples -> {
              if (number[0]++ == RESET_AT) assertEquals(0, Loquent.resetEPDparams(epd));
              short[] before = samples.clone();
              int answer =
                  contentType < 0
                      ? Loquent.processEPDFrame(epd, samples, frame)
                      : Loquent.ProcessEPDFrameByCnttype(epd, samples, frame, contentType);
              assertArrayEquals(before, samples, "the array is never changed");
              return answer;
            });
    assertEquals(0, Loquent.freeMemoryEPD(epd));
    assertArrayEquals(Bridge.epd(mode, pcm, frame, contentType, RESET_AT), answers);
    assertTrue(Arrays.stream(answers).sum() > 0, "there is speech");
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
    int[] at = {0};
    int[] counts =
        answers(
            pcm,
            frame,
            samples -> {
              short[] in = samples.clone();
              short[] out = Arrays.copyOfRange(result, at[0], at[0] + frame);
              int count = Loquent.processDoNSFrame(ns, in, frame, out, frame);
              assertArrayEquals(samples, in, "the input is never changed");
              System.arraycopy(out, 0, result, at[0], frame);
              at[0] += frame;
              return count;
            });
    assertEquals(0, Loquent.freeMemoryDoNS(ns));
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
    short[] result = new short[original.length / 160 * 160];
    long drc = Loquent.initializeDRC(rateHz, 0);
    int[] at = {0};
    int[] answers =
        answers(
            original,
            160,
            samples -> {
              int answer = Loquent.processDRC(drc, samples, 160);
              System.arraycopy(samples, 0, result, at[0], 160);
              at[0] += 160;
              return answer;
            });
    assertEquals(0, Loquent.freeMemoryDRC(drc));
    assertArrayEquals(Bridge.drc(rateHz, expected, 160), answers);
    assertArrayEquals(Arrays.copyOf(expected, result.length), result);
    assertEquals(rateHz == 16000, !Arrays.equals(original, expected), "in place");
  }

  @ParameterizedTest
  @ValueSource(ints = {16000, 8000})
  void queriesAnswerAsInC(int rateHz) {
    short[] pcm = Audio.command();
    int frame = rateHz / 50;
    int[] energies =
        answers(
            pcm,
            frame,
            samples -> {
              short[] before = samples.clone();
              int energy = Loquent.computeEnergyFrame(samples, frame, rateHz);
              assertArrayEquals(before, samples);
              return energy;
            });
    assertArrayEquals(Bridge.energy(rateHz, pcm, frame), energies);
    assertTrue(Arrays.stream(energies).max().getAsInt() > 40);

    int[] spectra = new int[pcm.length / 160 * 128];
    int[] spectrum = new int[130];
    int[] frames = {0};
    answers(
        pcm,
        160,
        samples -> {
          Arrays.fill(spectrum, 0);
          assertEquals(1, Loquent.getSpectrum(samples, spectrum, rateHz));
          System.arraycopy(spectrum, 0, spectra, 128 * frames[0]++, 128);
          return spectrum[128] + spectrum[129];
        });
    assertArrayEquals(Bridge.spectrum(rateHz, pcm), spectra);
  }

  /** A partial last frame counts as if zeros followed, whatever lies behind it in the array. */
  @Test
  void partialFramesAreFollowedByZeros() {
    short[] pcm = Arrays.copyOfRange(Audio.command(), 16000, 16000 + 960);
    short[] padded = Arrays.copyOf(Arrays.copyOf(pcm, 900), 960);
    for (int microphones = 1; microphones <= 2; ++microphones) {
      short[][] out = new short[2][960];
      for (int i = 0; i < 2; ++i) {
        long ns = Loquent.initializeDoNS(0, microphones, 0);
        int count = i == 0 ? 900 : 960;
        assertEquals(
            960, Loquent.processDoNSFrame(ns, i == 0 ? pcm : padded, count, out[i], count));
        Loquent.freeMemoryDoNS(ns);
      }
      assertArrayEquals(Arrays.copyOf(out[1], 900), Arrays.copyOf(out[0], 900));
      assertArrayEquals(new short[60], Arrays.copyOfRange(out[0], 900, 960));
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
      Runnable listen =
          () -> answers(Audio.command(), 160, pcm -> Loquent.processEPDFrame(epd, pcm, 160));
      boolean logged = linesOf(listen).stream().anyMatch(line -> line.contains(hangover));
      assertNotEquals(off, logged);
      Loquent.resetEPDparams(epd);
      assertTrue(linesOf(listen).stream().anyMatch(line -> line.contains(hangover)));
      Loquent.freeMemoryEPD(epd);
    }
  }

  /** The engine's lines meanwhile; a handler that throws does no harm. */
  static List<String> linesOf(Runnable work) {
    List<String> lines = new ArrayList<>();
    Logger logger = Logger.getAnonymousLogger();
    logger.setUseParentHandlers(false);
    logger.setLevel(Level.ALL);
    logger.addHandler(
        new Handler() {
          @Override
          public void publish(LogRecord line) {
            lines.add(line.getLevel() + " " + line.getMessage());
            throw new IllegalStateException("a handler's own fault");
          }

          @Override
          public void flush() {}

          @Override
          public void close() {}
        });
    EngineLog.toLogger(logger);
    work.run();
    EngineLog.off();
    return lines;
  }
}
