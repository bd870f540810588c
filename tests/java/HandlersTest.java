package com.zentq.tqe.phonoweave;

import static org.junit.jupiter.api.Assertions.assertEquals;
import static org.junit.jupiter.api.Assertions.assertFalse;
import static org.junit.jupiter.api.Assertions.assertTrue;

import java.util.ArrayList;
import java.util.Arrays;
import java.util.List;
import java.util.Random;
import java.util.concurrent.ExecutorService;
import java.util.concurrent.Executors;
import java.util.concurrent.Future;
import java.util.concurrent.TimeUnit;
import java.util.concurrent.atomic.AtomicInteger;
import java.util.concurrent.atomic.AtomicReferenceArray;
import java.util.function.Function;
import java.util.logging.Level;
import java.util.logging.Logger;
import org.junit.jupiter.api.AfterEach;
import org.junit.jupiter.api.Test;

/** Log handlers that call objects in use, and other threads that do so. */
class HandlersTest {
  private static final int CALLS = Integer.getInteger("calls", 20_000);
  private static final int THREADS = 8;
  private static final int KINDS = 5;

  /** An object of any safe class, by its calls. */
  private record Target(Function<short[], String> push, Runnable flush, Runnable close) {
    static Target of(int kind) {
      if (kind < 2) {
        EndPointDetector.Method method = EndPointDetector.Method.values()[kind];
        EndPointDetector epd = EndPointDetector.at(16000).method(method).open();
        return new Target(pcm -> epd.push(pcm).toString(), epd::flush, epd::close);
      }
      if (kind == 2) {
        DynamicsControl drc = new DynamicsControl();
        return new Target(pcm -> Arrays.toString(drc.push(pcm)), drc::flush, drc::close);
      }
      NoiseSuppressor ns =
          kind == 3
              ? NoiseSuppressor.forOneMicrophone(NoiseSuppressor.Strength.NORMAL)
              : NoiseSuppressor.forTwoMicrophones();
      return new Target(pcm -> Arrays.toString(ns.push(pcm)), ns::flush, ns::close);
    }
  }

  private final AtomicReferenceArray<Target> targets = new AtomicReferenceArray<>(2 * THREADS);
  private final AtomicInteger calls = new AtomicInteger();
  private final AtomicInteger refusals = new AtomicInteger();

  @AfterEach
  void quiet() {
    EngineLog.off();
  }

  private static void onLine(Runnable work) {
    Logger logger = Logger.getAnonymousLogger();
    logger.setLevel(Level.ALL);
    logger.setFilter(
        line -> {
          work.run();
          return false;
        });
    EngineLog.toLogger(logger);
  }

  /** A call that may throw; whether it was refused because of a log handler. */
  private static boolean isRefused(Runnable call) {
    try {
      call.run();
    } catch (IllegalStateException error) {
      return error.getMessage().contains("log handler");
    }
    return false;
  }

  @Test
  void handlersDoNotReachTheObjectWhoseCallTheyRunIn() {
    short[] pcm = Audio.withGap(Audio.command());
    for (int kind : new int[] {0, 2, 3, 4}) { // MCRA logs nothing
      EngineLog.off();
      String expected = Target.of(kind).push.apply(pcm);
      Target target = Target.of(kind);
      AtomicInteger lines = new AtomicInteger();
      refusals.set(0);
      onLine(
          () -> {
            lines.incrementAndGet();
            Target.of(kind).close.run(); // lines of these would lead here without end
            if (isRefused(target.close)) refusals.incrementAndGet();
            if (isRefused(target.flush)) refusals.incrementAndGet();
            if (isRefused(() -> target.push.apply(pcm))) refusals.incrementAndGet();
          });
      assertEquals(expected, target.push.apply(pcm));
      target.close.run();
      assertTrue(lines.get() > 0);
      assertEquals(3 * lines.get(), refusals.get());
    }
  }

  /** Calls any target; whether it was refused because of a log handler. */
  private boolean callAtRandom(Random random) {
    int at = random.nextInt(targets.length());
    Target target = targets.get(at);
    calls.incrementAndGet();
    return switch (random.nextInt(8)) {
      case 0 -> isRefused(target.close);
      case 1 -> isRefused(target.flush);
      case 2, 3 -> isRefused(() -> targets.set(at, Target.of(random.nextInt(KINDS)))); // forgets one
      default -> isRefused(() -> target.push.apply(new short[2 * random.nextInt(4000)]));
    };
  }

  /** Nothing crashes or hangs; only handlers are refused, other threads wait. */
  @Test
  void handlersAndThreadsCallAtRandom() throws Exception {
    long seed = Long.getLong("seed", System.nanoTime());
    String repeat = "repeat with -Dseed=" + seed;
    for (int i = 0; i < targets.length(); ++i) targets.set(i, Target.of(i % KINDS));
    ThreadLocal<Random> random = new ThreadLocal<>();
    onLine(
        () -> {
          if (random.get().nextInt(1000) == 0) System.gc();
          for (int i = random.get().nextInt(4); i > 0; --i) {
            if (callAtRandom(random.get())) refusals.incrementAndGet();
          }
        });
    ExecutorService pool = Executors.newFixedThreadPool(THREADS);
    List<Future<?>> threads = new ArrayList<>();
    for (int i = 0; i < THREADS; ++i) {
      Random own = new Random(seed + i);
      threads.add(
          pool.submit(
              () -> {
                random.set(own);
                while (calls.get() < CALLS) assertFalse(callAtRandom(own), repeat);
              }));
    }
    for (Future<?> thread : threads) thread.get(500, TimeUnit.SECONDS);
    pool.shutdown();
    assertTrue(refusals.get() > CALLS / 1000, refusals + " refusals; " + repeat);
  }
}
