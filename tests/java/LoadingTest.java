package com.zentq.tqe.phonoweave;

import static org.junit.jupiter.api.Assertions.assertEquals;
import static org.junit.jupiter.api.Assertions.assertThrows;

import java.net.URL;
import java.net.URLClassLoader;
import java.nio.file.Files;
import java.nio.file.Path;
import java.nio.file.attribute.PosixFilePermissions;
import java.util.List;
import org.junit.jupiter.api.Test;

/** How the library gets into the process. */
class LoadingTest {
  /** Never collected: the Java machine itself reads freed memory when it unloads a library. */
  private static ClassLoader shrunk;

  @Test
  void theCopyIsItsOwnersOnly() throws Exception {
    Path copy = NativeLibrary.createCopy();
    List<String> rights =
        List.of(
            PosixFilePermissions.toString(Files.getPosixFilePermissions(copy.getParent())),
            PosixFilePermissions.toString(Files.getPosixFilePermissions(copy)));
    Files.delete(copy);
    Files.delete(copy.getParent());
    assertEquals(List.of("rwx------", "rw-------"), rights);
  }

  /** As after shrinking. A class loader of its own has a library of its own, the jar's. */
  @Test
  void loquentNeedsNoSafeClasses() throws Exception {
    List<String> kept = List.of(Loquent.class.getName(), NativeLibrary.class.getName());
    URL jar = Loquent.class.getProtectionDomain().getCodeSource().getLocation();
    shrunk =
        new URLClassLoader(new URL[] {jar}, null) {
          @Override
          protected Class<?> findClass(String name) throws ClassNotFoundException {
            if (!kept.contains(name)) throw new ClassNotFoundException(name);
            return super.findClass(name);
          }
        };
    Class<?> loquent = shrunk.loadClass(Loquent.class.getName());
    assertEquals("160705", loquent.getMethod("GetVersion").invoke(null));
    assertThrows(ClassNotFoundException.class, () -> shrunk.loadClass(SafeLayer.class.getName()));
  }
}
