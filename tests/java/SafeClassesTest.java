package com.zentq.tqe.phonoweave;

import static org.junit.jupiter.api.Assertions.assertEquals;
import static org.junit.jupiter.api.Assertions.assertFalse;
import static org.junit.jupiter.api.Assertions.assertThrows;
import static org.junit.jupiter.api.Assertions.assertTrue;

import java.util.Arrays;
import java.util.List;
import java.util.Random;
import java.util.concurrent.CompletableFuture;
import org.junit.jupiter.api.BeforeEach;
import org.junit.jupiter.api.Test;
import org.junit.jupiter.api.function.Executable;

/** The safe classes: chunk sizes, settings, misuse and objects never closed. */
class SafeClassesTest {
  private static final int ROUNDS = Integer.getInteger("rounds");

  @BeforeEach
  void quiet() {
    EngineLog.off();
  }

  @Test
  void resultsDoNotDependOnChunkSizes() {
    long seed = Long.getLong("seed", System.nanoTime());
    Random random = new Random(seed);
    for (int kind = 0; kind < Target.KINDS; ++kind) {
      short[] pcm = kind == 3 ? Arrays.copyOf(Audio.PAIRS, 12_802) : Audio.COMMAND;
      String expected = Target.of(kind).output(pcm);
      for (int i = 0; i < ROUNDS; ++i) {
        int longest = 8 << random.nextInt(13);
        Target target = Target.of(kind);
        StringBuilder text = new StringBuilder();
        for (int at = 0, length; at < pcm.length; at += length) {
          length = Math.min(pcm.length - at, random.nextInt(longest + 1));
          text.append(target.push().push(pcm, at, length));
        }
        assertEquals(expected, text + target.flush().get(), kind + "; repeat with -Dseed=" + seed);
        target.close().run();
      }
    }
  }

  @Test
  void settingsReachTheEngine() {
    EndPointDetector.Settings settings = EndPointDetector.at(16000);
    String one = "utterance 1: 3840 to 109920 (7200, 109920)\n";
    assertEquals(one, Target.of(settings).output(Audio.SENTENCE));
    settings.inputGain(1).contentType(2).hangoverMillis(90).padBeforeMillis(30).padAfterMillis(70);
    String fourth = "utterance 4: 92640 to 102880 (93760, 104000)\n";
    String found = Target.of(settings.minSpeechMillis(200)).output(Audio.SENTENCE);
    assertTrue(found.startsWith("utterance 1: 5760 to") && found.endsWith(fourth), found);
    found = Target.of(settings.leadIn(true)).output(Audio.SENTENCE);
    assertTrue(found.endsWith("utterance 4: 80960 to 102880 (82080, 104000)\n"), found);
    String narrow = "utterance 1: 1920 to 21840 (3600, 22080)\n";
    assertEquals(narrow, Target.of(EndPointDetector.at(8000)).output(Audio.NARROW));
    found = Target.of(1).output(Audio.SENTENCE);
    assertTrue(found.endsWith("utterance 2: 2720 to 112800 (4160, 108800)\n"), found);
    settings.method(EndPointDetector.Method.MCRA);
    assertMisuse(IllegalArgumentException.class, settings::open);
    assertMisuse(IllegalArgumentException.class, settings.inputGain(0)::open);
    assertMisuse(IllegalArgumentException.class, settings.contentType(0)::open);
    settings.leadIn(false).open().close();

    NoiseSuppressor normal = NoiseSuppressor.forOneMicrophone(NoiseSuppressor.Strength.NORMAL);
    assertEquals(48, normal.delaySamples());
    assertEquals(-2129671572, Target.of(normal).output(Audio.COMMAND).hashCode());
    assertEquals(-1658303848, Target.of(2).output(Audio.COMMAND).hashCode());
    NoiseSuppressor pair = NoiseSuppressor.forTwoMicrophones();
    assertEquals(320, pair.delaySamples());
    assertEquals(-33277440, Target.of(pair).output(Audio.PAIRS).hashCode());
    assertEquals(-1458612382, Target.of(4).output(Audio.COMMAND).hashCode());
  }

  /** More utterances at once than the engine's queue holds. */
  @Test
  void allUtterancesComeOut() {
    short[] many = new short[40 * Audio.SENTENCE.length];
    for (int i = 0; i < many.length; ++i) many[i] = Audio.SENTENCE[i % Audio.SENTENCE.length];
    assertTrue(Target.of(0).push().push(many, 0, many.length).contains("utterance 39"));
  }

  @Test
  void loudnessIsThatOfTheLastFrame() {
    short[] frame = new short[160];
    Arrays.fill(frame, (short) 20000);
    DynamicsControl drc = new DynamicsControl();
    drc.push(frame, 0, 159);
    assertFalse(drc.isLoud());
    drc.push(frame, 0, 1);
    assertTrue(drc.isLoud());
    drc.push(new short[1760]);
    assertFalse(drc.isLoud());
  }

  @Test
  void misuseThrows() {
    short[] pcm = new short[10];
    for (int kind = 0; kind < Target.KINDS; ++kind) {
      Target target = Target.of(kind);
      for (int[] range : new int[][] {{-1, 1}, {0, 11}, {10, 1}, {5, -1}, {1 << 30, 1 << 30}})
        assertMisuse(IllegalArgumentException.class,
            () -> target.push().push(pcm, range[0], range[1]));
      assertMisuse(IllegalArgumentException.class, () -> target.push().push(null, 0, 0));
      for (int i = 0; i < 2; ++i) {
        assertEquals("", target.flush().get());
        assertMisuse(IllegalStateException.class, () -> target.push().push(pcm, 0, 1));
      }
      for (int i = 0; i < 2; ++i) {
        target.close().run();
        assertMisuse(IllegalStateException.class, target.flush()::get);
        assertMisuse(IllegalStateException.class, () -> target.push().push(pcm, 0, 1));
      }
    }
    EndPointDetector.Settings settings = EndPointDetector.at(16000);
    assertMisuse(IllegalArgumentException.class,
        () -> EndPointDetector.at(44100), () -> settings.method(null),
        () -> settings.inputGain(3), () -> settings.inputGain(-1),
        () -> settings.hangoverMillis(-1), () -> settings.minSpeechMillis(-1),
        () -> settings.padBeforeMillis(-1), () -> settings.padAfterMillis(-1),
        () -> settings.open().push(null), () -> new DynamicsControl().push(null),
        () -> NoiseSuppressor.forTwoMicrophones().push(null),
        () -> NoiseSuppressor.forOneMicrophone(null), () -> EngineLog.toLogger(null));
    NoiseSuppressor pair = NoiseSuppressor.forTwoMicrophones();
    pair.push(new short[3]);
    assertMisuse(IllegalStateException.class, pair::flush,
        () -> new NativeHandle(this, 0, x -> {}), () -> new NativeHandle(this, -1, x -> {}));
  }

  private static void assertMisuse(Class<? extends RuntimeException> kind, Executable... calls) {
    for (Executable call : calls) assertFalse(assertThrows(kind, call).getMessage().isEmpty());
  }

  @Test
  void forgottenHandlesAreReleased() throws InterruptedException {
    for (int i = 0; i < 20; ++i) Target.of(i % Target.KINDS).push().push(new short[10], 0, 10);
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
    lines = LoquentTest.linesOf(() -> {
      Loquent.computeEnergyFrame(null, 160, 16000);
      EngineLog.off();
      new DynamicsControl().close();
    });
    String line = "SEVERE TQE: computeEnergyFrame: 160 samples asked of an array of 0";
    assertEquals(List.of(line), lines);
  }
}
