package com.zentq.tqe.phonoweave;

import java.io.File;
import java.io.FileOutputStream;
import java.io.IOException;
import java.io.InputStream;
import java.io.OutputStream;
import java.util.Locale;

/** Loads libOrvalis.so once: from java.library.path, or else from this jar's own resources. */
final class NativeLibrary {
  private static boolean loaded;

  private NativeLibrary() {}

  static synchronized void load() {
    if (loaded) return;
    try {
      System.loadLibrary("Orvalis");
    } catch (UnsatisfiedLinkError notInPath) {
      loadFromJar(notInPath);
    }
    loaded = true;
  }

  private static void loadFromJar(UnsatisfiedLinkError notInPath) {
    String platform = platform();
    String resource = "/META-INF/native/" + platform + "/libOrvalis.so";
    try (InputStream library = NativeLibrary.class.getResourceAsStream(resource)) {
      if (library == null) throw unavailable("this jar has none for " + platform, notInPath);
      File copy = File.createTempFile("libOrvalis", ".so");
      try {
        write(library, copy);
        System.load(copy.getPath());
      } finally {
        // A library that is loaded needs its name no longer.
        if (!copy.delete()) copy.deleteOnExit();
      }
    } catch (IOException error) {
      throw unavailable("the jar's own could not be unpacked: " + error, notInPath);
    } catch (UnsatisfiedLinkError error) {
      if (error.getSuppressed().length > 0) throw error;
      throw unavailable("the jar's own could not be loaded: " + error.getMessage(), notInPath);
    }
  }

  private static UnsatisfiedLinkError unavailable(String reason, UnsatisfiedLinkError notInPath) {
    UnsatisfiedLinkError error =
        new UnsatisfiedLinkError(
            "libOrvalis.so is not available: "
                + notInPath.getMessage()
                + "; "
                + reason
                + ". Set java.library.path to its folder, or java.io.tmpdir to one that allows"
                + " programs to run.");
    error.addSuppressed(notInPath);
    return error;
  }

  /** The names of the folders in the jar, such as linux-x86_64. */
  private static String platform() {
    String system = System.getProperty("os.name", "").toLowerCase(Locale.ROOT);
    String processor = System.getProperty("os.arch", "").toLowerCase(Locale.ROOT);
    return system + "-" + (processor.equals("amd64") ? "x86_64" : processor);
  }

  private static void write(InputStream from, File to) throws IOException {
    try (OutputStream out = new FileOutputStream(to)) {
      byte[] piece = new byte[1 << 16];
      for (int count = from.read(piece); count > 0; count = from.read(piece)) {
        out.write(piece, 0, count);
      }
    }
  }
}
