package com.zentq.tqe.phonoweave;

import static org.junit.jupiter.api.Assertions.assertDoesNotThrow;
import static org.junit.jupiter.api.Assertions.assertEquals;
import static org.junit.jupiter.api.Assertions.assertFalse;
import static org.junit.jupiter.api.Assertions.assertTrue;

import java.util.ArrayList;
import java.util.Arrays;
import java.util.Collections;
import java.util.List;
import java.util.concurrent.Callable;
import java.util.concurrent.ExecutorService;
import java.util.concurrent.Executors;
import java.util.concurrent.Future;
import java.util.concurrent.ThreadLocalRandom;
import java.util.concurrent.TimeUnit;
import java.util.concurrent.atomic.AtomicBoolean;
import java.util.concurrent.atomic.AtomicInteger;
import java.util.concurrent.atomic.AtomicReferenceArray;
import java.util.function.Function;
import org.junit.jupiter.api.BeforeEach;
import org.junit.jupiter.api.Test;

/** Calls from several threads and from log handlers. */
class ThreadsTest {
  private static final int THREADS = 16;
  private static final int CALLS = Integer.getInteger("calls", 20_000);
  static final int KINDS = 5;

  /** The calls of an object, which may be of any safe class. */
  record Target(Function<short[], String> push, Runnable flush, Runnable close) {
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
      NoiseSuppressor ns = SafeClassesTest.suppressor(kind - 2);
      return new Target(pcm -> Arrays.toString(ns.push(pcm)), ns::flush, ns::close);
    }
  }

  private final AtomicReferenceArray<Target> targets = new AtomicReferenceArray<>(16);
  private final AtomicInteger calls = new AtomicInteger();
  private final AtomicInteger refusals = new AtomicInteger();

  @BeforeEach
  void quiet() {
    EngineLog.off();
  }

  /** All that one thread computes, by the raw methods and by the safe classes. */
  private static String results(short[] pcm) {
    StringBuilder text = new StringBuilder(SafeClassesTest.utterances(pcm, List.of(pcm.length)));
    long epd = Loquent.initializeEPD(0, 0);
    try (NoiseSuppressor ns = SafeClassesTest.suppressor(1);
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

  /** What each of the threads returns; fails if one does not end. */
  private static <T> List<T> onThreads(int count, Callable<T> work) throws Exception {
    ExecutorService pool = Executors.newFixedThreadPool(count);
    List<T> results = new ArrayList<>();
    for (Future<T> one : pool.invokeAll(Collections.nCopies(count, work), 500, TimeUnit.SECONDS)) {
      results.add(one.get());
    }
    pool.shutdown();
    return results;
  }

  @Test
  void resultsAreThoseOfOneThread() throws Exception {
    AtomicBoolean done = new AtomicBoolean();
    Thread collector =
        new Thread(
            () -> {
              while (!done.get()) System.gc();
            });
    collector.start();
    for (short[] pcm : new short[][] {Audio.command(), Audio.withGap(Audio.sentence())}) {
      String alone = results(pcm);
      assertTrue(alone.startsWith("utterance 1"));
      assertEquals(Collections.nCopies(THREADS, alone), onThreads(THREADS, () -> results(pcm)));
    }
    done.set(true);
    collector.join();
  }

  /** Makes a call, which may throw; whether it was refused because a log handler made it. */
  private static boolean isRefused(Runnable call) {
    try {
      call.run();
    } catch (IllegalStateException error) {
      return error.getMessage().contains("log handler");
    }
    return false;
  }

  private void handle(Runnable call) {
    if (isRefused(call)) refusals.incrementAndGet();
  }

  @Test
  void handlersDoNotReachTheObjectWhoseCallTheyRunIn() {
    short[] pcm = Audio.withGap(Audio.command());
    for (int kind : new int[] {0, 2, 3, 4}) { // MCRA logs nothing
      String expected = Target.of(kind).push.apply(pcm);
      Target target = Target.of(kind);
      refusals.set(0);
      Runnable use =
          () -> {
            assertEquals(expected, target.push.apply(pcm));
            target.close.run();
          };
      Runnable handler =
          () -> {
            Target.of(kind).close.run(); // lines of these would lead here without end
            handle(target.close);
            handle(target.flush);
            handle(() -> target.push.apply(pcm));
          };
      int lines = LoquentTest.linesOf(use, handler).size();
      assertTrue(lines > 0);
      assertEquals(3 * lines, refusals.get());
    }
  }

  private void callAtRandom() {
    ThreadLocalRandom random = ThreadLocalRandom.current();
    int at = random.nextInt(targets.length());
    Target target = targets.get(at);
    calls.incrementAndGet();
    switch (random.nextInt(8)) {
      case 0 -> target.close.run();
      case 1 -> target.flush.run();
      case 2, 3 -> targets.set(at, Target.of(random.nextInt(KINDS))); // the old one is not closed
      default -> target.push.apply(new short[2 * random.nextInt(4000)]);
    }
  }

  /** Nothing crashes or hangs; only handlers are refused, other threads wait. */
  @Test
  void handlersAndThreadsCallAtRandom() {
    for (int i = 0; i < targets.length(); ++i) targets.set(i, Target.of(i % KINDS));
    Callable<Boolean> work =
        () -> {
          while (calls.get() < CALLS) assertFalse(isRefused(this::callAtRandom));
          return true;
        };
    Runnable handler =
        () -> {
          if (ThreadLocalRandom.current().nextInt(1000) == 0) System.gc();
          for (int i = ThreadLocalRandom.current().nextInt(4); i > 0; --i) handle(this::callAtRandom);
        };
    LoquentTest.linesOf(() -> assertDoesNotThrow(() -> onThreads(8, work)), handler);
    assertTrue(refusals.get() > CALLS / 1000, refusals + " refusals");
  }
}
