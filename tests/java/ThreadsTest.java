package com.zentq.tqe.phonoweave;

import static org.junit.jupiter.api.Assertions.assertEquals;
import static org.junit.jupiter.api.Assertions.assertTrue;

import java.util.ArrayList;
import java.util.Arrays;
import java.util.List;
import java.util.concurrent.ExecutorService;
import java.util.concurrent.Executors;
import java.util.concurrent.Future;
import java.util.concurrent.atomic.AtomicBoolean;
import org.junit.jupiter.api.Test;

/** Instances on threads of their own, while memory is collected all the time, result as alone. */
class ThreadsTest {
  private static final int THREADS = 16;

  /** All that one thread computes, by the raw methods and by the safe classes. */
  private static String results(short[] pcm) {
    StringBuilder text = new StringBuilder(SafeClassesTest.utterances(pcm, List.of(pcm.length)));
    long epd = Loquent.initializeEPD(0, 0);
    try (NoiseSuppressor ns =
            NoiseSuppressor.forOneMicrophone(NoiseSuppressor.Strength.NORMAL);
        DynamicsControl drc = new DynamicsControl()) {
      for (int at = 0; at + 160 <= pcm.length; at += 160) {
        short[] frame = Arrays.copyOfRange(pcm, at, at + 160);
        text.append(Loquent.processEPDFrame(epd, frame, 160));
        text.append(Arrays.hashCode(drc.push(ns.push(frame))));
      }
    }
    Loquent.freeMemoryEPD(epd);
    return text.toString();
  }

  @Test
  void resultsAreThoseOfOneThread() throws Exception {
    EngineLog.off();
    short[][] recordings = {Audio.command(), Audio.sentence(), Audio.withGap(Audio.sentence())};
    String[] alone = Arrays.stream(recordings).map(ThreadsTest::results).toArray(String[]::new);
    AtomicBoolean done = new AtomicBoolean();
    Thread collector =
        new Thread(
            () -> {
              while (!done.get()) System.gc();
            });
    collector.start();
    ExecutorService pool = Executors.newFixedThreadPool(THREADS);
    List<Future<String>> together = new ArrayList<>();
    for (int i = 0; i < THREADS; ++i) {
      short[] pcm = recordings[i % recordings.length];
      together.add(pool.submit(() -> results(pcm)));
    }
    for (int i = 0; i < THREADS; ++i) {
      assertEquals(alone[i % recordings.length], together.get(i).get(), "thread " + i);
    }
    pool.shutdown();
    done.set(true);
    collector.join();
    assertTrue(alone[0].startsWith("utterance 1"));
  }
}
