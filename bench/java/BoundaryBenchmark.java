import com.zentq.tqe.phonoweave.EngineLog;
import com.zentq.tqe.phonoweave.Loquent;
import java.io.IOException;
import java.nio.ByteBuffer;
import java.nio.ByteOrder;
import java.nio.file.Files;
import java.nio.file.Path;
import java.util.Arrays;
import java.util.Locale;

/** Frame calls a second from Java, and from C++ in the same process over the same recording. */
final class BoundaryBenchmark {
  private static final int FRAME = 160;
  private static final int ROUNDS = 41;
  private static final String[] METHODS = {
    "processEPDFrame", "processDoNSFrame", "processDRC", "computeEnergyFrame", "getSpectrum",
    "resetEPDparams"
  };

  private interface Call {
    void run(short[] frame);
  }

  private BoundaryBenchmark() {}

  private static native double flatCalls(int method, short[] recording);

  /** Takes the bridge's library and a raw recording at 16 kHz. */
  public static void main(String[] arguments) throws IOException {
    EngineLog.off();
    System.load(Path.of(arguments[0]).toAbsolutePath().toString());
    byte[] bytes = Files.readAllBytes(Path.of(arguments[1]));
    short[] recording = new short[bytes.length / 2];
    ByteBuffer.wrap(bytes).order(ByteOrder.LITTLE_ENDIAN).asShortBuffer().get(recording);

    System.out.println("across the boundary     C [calls/s]  Java [calls/s]   ratio");
    for (int method = 0; method < METHODS.length; ++method) {
      double perFlat = Double.MAX_VALUE;
      double perJava = Double.MAX_VALUE;
      // The fastest of rounds in turns: what else the machine does only ever adds.
      for (int round = 0; round < ROUNDS; ++round) {
        perFlat = Math.min(perFlat, flatCalls(method, recording));
        perJava = Math.min(perJava, javaCalls(method, recording));
      }
      System.out.printf(
          Locale.ROOT, "%-20s %14.0f %15.0f %7.3f%n",
          METHODS[method], 1e9 / perFlat, 1e9 / perJava, perFlat / perJava);
    }
  }

  private static double javaCalls(int method, short[] recording) {
    long epd = Loquent.initializeEPD(0, 0);
    long ns = Loquent.initializeDoNS(0, 1, 0);
    long drc = Loquent.initializeDRC(16000, 0);
    short[] out = new short[FRAME];
    int[] spectrum = new int[128];
    Call[] calls = {
      frame -> Loquent.processEPDFrame(epd, frame, FRAME),
      frame -> Loquent.processDoNSFrame(ns, frame, FRAME, out, FRAME),
      frame -> Loquent.processDRC(drc, frame, FRAME),
      frame -> Loquent.computeEnergyFrame(frame, FRAME, 8000),
      frame -> Loquent.getSpectrum(frame, spectrum, 16000),
      frame -> Loquent.resetEPDparams(epd)
    };
    short[][] frames = new short[recording.length / FRAME][];
    Arrays.setAll(frames, i -> Arrays.copyOfRange(recording, i * FRAME, (i + 1) * FRAME));
    Call call = calls[method];
    long start = System.nanoTime();
    for (short[] frame : frames) call.run(frame);
    double time = System.nanoTime() - start;
    Loquent.freeMemoryEPD(epd);
    Loquent.freeMemoryDoNS(ns);
    Loquent.freeMemoryDRC(drc);
    return time / frames.length;
  }
}
