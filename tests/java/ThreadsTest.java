package com.zentq.tqe.phonoweave;

import static org.junit.jupiter.api.Assertions.assertDoesNotThrow;
import static org.junit.jupiter.api.Assertions.assertEquals;
import static org.junit.jupiter.api.Assertions.assertFalse;
import static org.junit.jupiter.api.Assertions.assertTrue;

import java.io.IOException;
import java.nio.file.Files;
import java.nio.file.Path;
import java.util.Arrays;
import java.util.Collections;
import java.util.HashSet;
import java.util.Set;
import java.util.concurrent.Callable;
import java.util.concurrent.ExecutorService;
import java.util.concurrent.Executors;
import java.util.concurrent.Future;
import java.util.concurrent.ThreadLocalRandom;
import java.util.concurrent.TimeUnit;
import java.util.concurrent.atomic.AtomicInteger;
import org.junit.jupiter.api.BeforeEach;
import org.junit.jupiter.api.Tag;
import org.junit.jupiter.api.Test;

/** Calls from several threads and from log handlers; a million instances. */
class ThreadsTest {
  private static final int CALLS = Integer.getInteger("calls", 20_000);

  private final Target[] targets = new Target[16]; // racing on purpose
  private final AtomicInteger calls = new AtomicInteger();
  private final AtomicInteger refusals = new AtomicInteger();

  @BeforeEach
  void quiet() {
    EngineLog.off();
  }

  /** What threads return; fails if one does not end. */
  private static <T> Set<T> onThreads(int count, Callable<T> work) throws Exception {
    ExecutorService pool = Executors.newFixedThreadPool(count);
    Set<T> results = new HashSet<>();
    for (Future<T> one : pool.invokeAll(Collections.nCopies(count, work), 500, TimeUnit.SECONDS))
      results.add(one.get());
    pool.shutdown();
    return results;
  }

  @Test
  void resultsAreThoseOfOneThread() throws Exception {
    for (int kind = 0; kind < Target.KINDS; ++kind) {
      int number = kind;
      short[] pcm = kind == 3 ? Audio.PAIRS : Audio.SENTENCE;
      Callable<String> work = () -> {
        if (ThreadLocalRandom.current().nextBoolean()) System.gc();
        return Target.of(number).output(pcm) + LoquentTest.detector(0, -1);
      };
      assertEquals(Set.of(work.call()), onThreads(16, work));
    }
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
    short[] pcm = Audio.COMMAND;
    for (int kind : new int[] {0, 2, 3, 4}) { // MCRA logs nothing
      String expected = Target.of(kind).output(pcm);
      Target target = Target.of(kind);
      refusals.set(0);
      Runnable handler = () -> {
        Target.of(kind).close().run(); // lines of these would lead here without end
        handle(target.close());
        handle(target.flush()::get);
        handle(() -> target.push().push(pcm, 0, 160));
      };
      int lines =
          LoquentTest.linesOf(() -> assertEquals(expected, target.output(pcm)), handler).size();
      assertTrue(lines > 0);
      assertEquals(3 * lines, refusals.get());
    }
  }

  private void callAtRandom() {
    ThreadLocalRandom random = ThreadLocalRandom.current();
    int at = random.nextInt(targets.length);
    Target target = targets[at];
    calls.incrementAndGet();
    switch (random.nextInt(8)) {
      case 0 -> target.close().run();
      case 1 -> target.flush().get();
      case 2, 3 -> targets[at] = Target.of(random.nextInt(Target.KINDS)); // the old one is open
      default -> target.push().push(new short[8000], 0, 2 * random.nextInt(4000));
    }
  }

  /** Nothing crashes or hangs; only handlers are refused, other threads wait. */
  @Test
  void handlersAndThreadsCallAtRandom() {
    Arrays.setAll(targets, i -> Target.of(i % Target.KINDS));
    Callable<Boolean> work = () -> {
      while (calls.get() < CALLS) assertFalse(isRefused(this::callAtRandom));
      return true;
    };
    Runnable handler = () -> {
      if (ThreadLocalRandom.current().nextInt(1000) == 0) System.gc();
      for (int i = ThreadLocalRandom.current().nextInt(4); i > 0; --i) handle(this::callAtRandom);
    };
    LoquentTest.linesOf(() -> assertDoesNotThrow(() -> onThreads(8, work)), handler);
    assertTrue(refusals.get() > CALLS / 1000, refusals + " refusals");
  }

  private static long residentKb(int cycles) throws IOException {
    for (int i = 0; i < cycles; ++i) Target.of(i % Target.KINDS).close().run();
    System.gc();
    String status = Files.readString(Path.of("/proc/self/status"));
    return Long.parseLong(status.replaceAll("(?s).*VmRSS:\\s*(\\d+).*", "$1"));
  }

  /** A million instances leave the process as large as it was. */
  @Test
  @Tag("memory")
  void aMillionCyclesKeepItFlat() throws IOException {
    long before = residentKb(200_000);
    long growth = residentKb(1_000_000) - before;
    assertTrue(growth < 1024, "grown by " + growth + " kB");
  }
}
