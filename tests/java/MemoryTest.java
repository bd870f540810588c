package com.zentq.tqe.phonoweave;

import static org.junit.jupiter.api.Assertions.assertTrue;

import java.io.IOException;
import java.nio.file.Files;
import java.nio.file.Path;
import org.junit.jupiter.api.Tag;
import org.junit.jupiter.api.Test;

/** A million instances leave the process as large as it was. */
@Tag("memory")
class MemoryTest {
  private static final int CYCLES = 1_000_000;
  private static final int WARM_UP = 200_000;
  private static final long MAX_GROWTH_KB = 1024;

  private static long residentKb() throws IOException {
    System.gc();
    return Files.readAllLines(Path.of("/proc/self/status")).stream()
        .filter(line -> line.startsWith("VmRSS:"))
        .mapToLong(line -> Long.parseLong(line.replaceAll("\\D", "")))
        .findFirst()
        .getAsLong();
  }

  private static void cycles(int count) {
    for (int i = 0; i < count; ++i) ThreadsTest.Target.of(i % ThreadsTest.KINDS).close().run();
  }

  @Test
  void aMillionCyclesKeepItFlat() throws IOException {
    EngineLog.off();
    cycles(WARM_UP);
    long before = residentKb();
    cycles(CYCLES);
    long growth = residentKb() - before;
    System.out.printf("%d cycles: %d kB, grown by %d kB%n", CYCLES, before, growth);
    assertTrue(growth < MAX_GROWTH_KB, "grown by " + growth + " kB");
  }
}
