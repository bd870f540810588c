package com.zentq.tqe.phonoweave;

import java.io.IOException;
import java.io.InputStream;
import java.io.OutputStream;
import java.nio.file.Files;
import java.nio.file.Path;
import java.nio.file.attribute.FileAttribute;
import java.nio.file.attribute.PosixFilePermissions;
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
      Path copy = createCopy();
      try {
        write(library, copy);
        System.load(copy.toString());
      } finally {
        // A library that is loaded needs its name no longer.
        delete(copy);
        delete(copy.getParent());
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

  /** An empty file in a folder of its own, which no other user can open at any time. */
  static Path createCopy() throws IOException {
    Path folder = Files.createTempDirectory("libOrvalis", only("rwx------"));
    return Files.createFile(folder.resolve("libOrvalis.so"), only("rw-------"));
  }

  private static FileAttribute<?> only(String owner) {
    return PosixFilePermissions.asFileAttribute(PosixFilePermissions.fromString(owner));
  }

  private static void delete(Path path) {
    if (!path.toFile().delete()) path.toFile().deleteOnExit();
  }

  private static void write(InputStream from, Path to) throws IOException {
    try (OutputStream out = Files.newOutputStream(to)) {
      byte[] chunk = new byte[1 << 16];
      for (int count = from.read(chunk); count > 0; count = from.read(chunk)) {
        out.write(chunk, 0, count);
      }
    }
  }
}
