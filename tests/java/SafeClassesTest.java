package com.zentq.tqe.phonoweave;

import static org.junit.jupiter.api.Assertions.assertArrayEquals;
import static org.junit.jupiter.api.Assertions.assertEquals;
import static org.junit.jupiter.api.Assertions.assertFalse;
import static org.junit.jupiter.api.Assertions.assertThrows;
import static org.junit.jupiter.api.Assertions.assertTrue;

import java.nio.ShortBuffer;
import java.util.ArrayList;
import java.util.Arrays;
import java.util.List;
import java.util.Random;
import java.util.concurrent.CompletableFuture;
import java.util.function.Supplier;
import org.junit.jupiter.api.BeforeEach;
import org.junit.jupiter.api.Test;
import org.junit.jupiter.api.function.Executable;

/** The safe classes: chunk sizes, delays, ends, misuse and objects never closed. */
class SafeClassesTest {
  private static final int ROUNDS = Integer.getInteger("rounds");

  @BeforeEach
  void quiet() {
    EngineLog.off();
  }

  static NoiseSuppressor suppressor(int microphones) {
    return microphones == 2
        ? NoiseSuppressor.forTwoMicrophones()
        : NoiseSuppressor.forOneMicrophone(NoiseSuppressor.Strength.STRONG);
  }

  /** Random sizes of chunks that add up to the whole. */
  private static List<Integer> chunks(int whole, Random random) {
    int longest = 8 << random.nextInt(13);
    List<Integer> chunks = new ArrayList<>();
    for (int rest = whole; rest > 0; rest -= chunks.get(chunks.size() - 1)) {
      chunks.add(Math.min(rest, random.nextInt(longest + 1)));
    }
    return chunks;
  }

  private interface Push {
    short[] push(short[] pcm, int offset, int count);
  }

  /** The output of all chunks and of the flush. */
  private static short[] pushAll(
      short[] pcm, List<Integer> chunks, Push push, Supplier<short[]> flush) {
    ShortBuffer out = ShortBuffer.allocate(pcm.length + 1000);
    int at = 0;
    for (int length : chunks) {
      out.put(push.push(pcm, at, length));
      at += length;
    }
    out.put(flush.get());
    return Arrays.copyOf(out.array(), out.position());
  }

  private static short[] suppress(int microphones, short[] pcm, List<Integer> chunks) {
    try (NoiseSuppressor ns = suppressor(microphones)) {
      return pushAll(pcm, chunks, ns::push, ns::flush);
    }
  }

  private static short[] level(short[] pcm, List<Integer> chunks) {
    try (DynamicsControl drc = new DynamicsControl()) {
      return pushAll(pcm, chunks, drc::push, drc::flush);
    }
  }

  static String utterances(short[] pcm, List<Integer> chunks) {
    return utterances(EndPointDetector.at(16000).hangoverMillis(100), pcm, chunks);
  }

  private static String utterances(
      EndPointDetector.Settings settings, short[] pcm, List<Integer> chunks) {
    try (EndPointDetector epd = settings.open()) {
      StringBuilder text = new StringBuilder();
      int at = 0;
      for (int length : chunks) {
        for (Utterance found : epd.push(pcm, at, length)) text.append(describe(found));
        at += length;
      }
      for (Utterance found : epd.flush()) text.append(describe(found));
      return text.toString();
    }
  }

  private static String describe(Utterance found) {
    return found + " (" + found.began + ", " + found.ended + ")\n";
  }

  @Test
  void resultsDoNotDependOnChunkSizes() {
    long seed = Long.getLong("seed", System.nanoTime());
    Random random = new Random(seed);
    short[] mono = Audio.withGap(Arrays.copyOf(Audio.command(), 44_444));
    short[] pairs = Arrays.copyOf(Audio.twoMicrophones(), 12_802);
    String utterances = utterances(mono, List.of(mono.length));
    short[] one = suppress(1, mono, List.of(mono.length));
    short[] two = suppress(2, pairs, List.of(pairs.length));
    short[] levelled = level(mono, List.of(mono.length));
    assertTrue(utterances.startsWith("utterance 1: "), utterances);
    for (int i = 0; i < ROUNDS; ++i) {
      List<Integer> chunks = chunks(mono.length, random);
      String repeat = "round " + i + "; repeat with -Dseed=" + seed;
      assertEquals(utterances, utterances(mono, chunks), repeat);
      assertArrayEquals(one, suppress(1, mono, chunks), repeat);
      assertArrayEquals(two, suppress(2, pairs, chunks(pairs.length, random)), repeat);
      assertArrayEquals(levelled, level(mono, chunks), repeat);
    }
  }

  /** More utterances at once than the engine's queue holds. */
  @Test
  void allUtterancesComeOut() {
    short[] command = Audio.command();
    short[] many = new short[40 * command.length];
    for (int i = 0; i < 40; ++i) {
      System.arraycopy(command, 0, many, i * command.length, command.length);
    }
    try (EndPointDetector epd = EndPointDetector.at(16000).open()) {
      int found = epd.push(many).size();
      assertTrue(found >= 39, found + " utterances");
    }
  }

  @Test
  void settingsReachTheDetector() {
    short[] pcm = Arrays.copyOfRange(Audio.command(), 8000, 40_000); // begins with speech
    List<Integer> whole = List.of(pcm.length);
    EndPointDetector.Settings settings = EndPointDetector.at(16000);
    String plain = utterances(settings, pcm, whole);
    String mcra = utterances(settings.method(EndPointDetector.Method.MCRA), pcm, whole);
    assertFalse(plain.isEmpty());
    assertFalse(mcra.isEmpty());
    assertFalse(plain.equals(mcra));
    assertMisuse(() -> settings.leadIn(true).open(), IllegalArgumentException.class);
    settings.method(EndPointDetector.Method.CHANNEL_ENERGY);
    assertFalse(plain.equals(utterances(settings, pcm, whole)));
    settings.method(EndPointDetector.Method.MCRA).leadIn(false);
    assertEquals("", utterances(settings.minSpeechMillis(60_000), pcm, whole));
    assertMisuse(() -> settings.contentType(2).open(), IllegalArgumentException.class);
    assertMisuse(() -> settings.contentType(0).inputGain(1).open(), IllegalArgumentException.class);
  }

  /** With the delayed first channel in the output, which is what comes where nothing is suppressed. */
  @Test
  void suppressorIsTheEnginesFrameByFrame() {
    for (int microphones = 1; microphones <= 2; ++microphones) {
      int frame = 160 * microphones;
      int delay = microphones == 2 ? 320 : 48;
      short[] whole = Audio.withGap(microphones == 2 ? Audio.twoMicrophones() : Audio.command());
      short[] pcm = Arrays.copyOf(whole, whole.length / frame * frame);
      short[] late = Audio.concat(new short[delay], pcm);
      short[] expected = new short[pcm.length];
      long ns = Loquent.initializeDoNS(2, microphones, 0);
      for (int at = 0; at < pcm.length; at += frame) {
        short[] in = Arrays.copyOfRange(pcm, at, at + frame);
        short[] out = Arrays.copyOfRange(late, at, at + frame);
        Loquent.processDoNSFrame(ns, in, frame, out, frame);
        for (int i = 0; i < frame; ++i) expected[at + i] = out[i / microphones * microphones];
      }
      Loquent.freeMemoryDoNS(ns);
      try (NoiseSuppressor suppressor = suppressor(microphones)) {
        assertEquals(delay, suppressor.delaySamples());
        assertArrayEquals(expected, suppressor.push(pcm));
        assertEquals(delay, suppressor.flush().length);
      }
    }
  }

  @Test
  void shortInputsHaveTheirLength() {
    for (int samples : new int[] {0, 1, 7, 159, 160, 161}) {
      short[] pcm = Arrays.copyOfRange(Audio.command(), 16000, 16000 + samples);
      List<Integer> chunks = List.of(samples);
      assertEquals(samples == 0 ? 0 : samples + 48, suppress(1, pcm, chunks).length);
      assertEquals(samples, level(pcm, chunks).length);
    }
  }

  @Test
  void loudnessIsThatOfTheLastFrame() {
    short[] frame = new short[160];
    Arrays.fill(frame, (short) 20000);
    try (DynamicsControl drc = new DynamicsControl()) {
      drc.push(frame, 0, 159);
      assertFalse(drc.isLoud());
      drc.push(frame, 0, 1);
      assertTrue(drc.isLoud());
      drc.push(new short[1760]);
      assertFalse(drc.isLoud());
    }
  }

  @Test
  void misuseThrows() {
    short[] pcm = new short[10];
    EndPointDetector epd = EndPointDetector.at(8000).open();
    NoiseSuppressor ns = suppressor(1);
    DynamicsControl drc = new DynamicsControl();
    for (int[] range : new int[][] {{-1, 1}, {0, 11}, {10, 1}, {5, -1}, {1 << 30, 1 << 30}}) {
      int at = range[0];
      int count = range[1];
      assertMisuse(() -> epd.push(pcm, at, count), IllegalArgumentException.class);
      assertMisuse(() -> ns.push(pcm, at, count), IllegalArgumentException.class);
      assertMisuse(() -> drc.push(pcm, at, count), IllegalArgumentException.class);
    }
    for (Executable call :
        new Executable[] {
          () -> epd.push(null),
          () -> ns.push(null),
          () -> drc.push(null),
          () -> EndPointDetector.at(44100),
          () -> EndPointDetector.at(16000).inputGain(3),
          () -> EndPointDetector.at(16000).hangoverMillis(-1),
          () -> EndPointDetector.at(16000).padBeforeMillis(-1),
          () -> EndPointDetector.at(16000).padAfterMillis(-1),
          () -> EndPointDetector.at(16000).minSpeechMillis(-1),
          () -> EndPointDetector.at(16000).method(null),
          () -> NoiseSuppressor.forOneMicrophone(null),
          () -> EngineLog.toLogger(null)
        }) {
      assertMisuse(call, IllegalArgumentException.class);
    }
    for (int i = 0; i < 2; ++i) {
      assertEquals(List.of(), epd.flush());
      assertEquals(0, ns.flush().length);
      assertEquals(0, drc.flush().length);
      assertMisuse(() -> epd.push(pcm), IllegalStateException.class);
      assertMisuse(() -> ns.push(pcm), IllegalStateException.class);
      assertMisuse(() -> drc.push(pcm), IllegalStateException.class);
    }
    for (int i = 0; i < 2; ++i) {
      epd.close();
      ns.close();
      drc.close();
      assertMisuse(epd::flush, IllegalStateException.class);
      assertMisuse(ns::flush, IllegalStateException.class);
      assertMisuse(drc::flush, IllegalStateException.class);
    }
    for (long failed : new long[] {0, -1}) {
      assertMisuse(() -> new NativeHandle(this, failed, x -> {}), IllegalStateException.class);
    }
  }

  private static void assertMisuse(Executable call, Class<? extends RuntimeException> kind) {
    assertFalse(assertThrows(kind, call).getMessage().isEmpty());
  }

  @Test
  void suppressorsOfTwoMicrophonesDoNotMeet() {
    short[] a = Audio.twoMicrophones();
    short[] b = Arrays.copyOfRange(a, 20_000, a.length);
    short[] outA = new short[0];
    short[] outB = new short[0];
    try (NoiseSuppressor first = suppressor(2);
        NoiseSuppressor second = suppressor(2)) {
      for (int at = 0; at + 1000 <= b.length; at += 1000) {
        outA = Audio.concat(outA, first.push(a, at, 1000));
        outB = Audio.concat(outB, second.push(b, at, 1000));
      }
      first.push(new short[1]);
      assertMisuse(first::flush, IllegalStateException.class);
    }
    short[] alone = suppress(2, a, List.of(a.length));
    assertArrayEquals(Arrays.copyOf(alone, outA.length), outA);
    alone = suppress(2, b, List.of(b.length));
    assertArrayEquals(Arrays.copyOf(alone, outB.length), outB);
  }

  @Test
  void forgottenHandlesAreReleased() throws InterruptedException {
    suppressor(2).push(new short[10]);
    for (int i = 0; i < 20; ++i) EndPointDetector.at(16000).open();
    assertTrue(NativeHandle.living() > 0);
    for (int tries = 0; NativeHandle.living() > 0 && tries < 1000; ++tries) {
      System.gc();
      Thread.sleep(10);
      new DynamicsControl().close();
    }
    assertEquals(0, NativeHandle.living());

    NativeHandle inUse = new NativeHandle(new Object(), 1, address -> {});
    inUse.enter();
    for (int tries = 0; tries < 20 || !inUse.refersTo(null); ++tries) {
      System.gc();
      Thread.sleep(10);
      NativeHandle.releaseForgotten();
      CompletableFuture.runAsync(NativeHandle::releaseForgotten).join();
    }
    assertEquals(1, NativeHandle.living());
    inUse.leave();
    NativeHandle.releaseForgotten();
    assertEquals(0, NativeHandle.living());
  }

  @Test
  void linesGoWhereTheyAreSent() {
    List<String> lines = LoquentTest.linesOf(() -> new DynamicsControl().close());
    assertTrue(lines.get(0).startsWith("FINE Create DRC, SamplingRate : 16000"), lines.toString());
    lines = LoquentTest.linesOf(() -> Loquent.computeEnergyFrame(null, 160, 16000));
    assertEquals(
        List.of("SEVERE TQE: computeEnergyFrame: 160 samples asked of an array of 0"), lines);
    lines = LoquentTest.linesOf(() -> {
      EngineLog.off();
      new DynamicsControl().close();
    });
    assertEquals(List.of(), lines);
  }
}
