package com.zentq.tqe.phonoweave;

import java.util.logging.Level;
import java.util.logging.Logger;

/**
 * Where the engine's log lines go: warnings and errors to standard error at first, the rest nowhere.
 * On Android all of them always go to the platform's log under the tag "Orvalis", and nothing here
 * changes that.
 *
 * <p>May be changed at any time and from any thread.
 */
public final class EngineLog {
  private static volatile Logger target;

  /** Set on a thread as long as it is in a handler. */
  private static final ThreadLocal<Boolean> HANDLING = new ThreadLocal<>();

  private EngineLog() {}

  /**
   * Sends lines to a logger: debug lines as {@link Level#FINE}, information as {@link Level#INFO},
   * errors as {@link Level#SEVERE}. What the logger throws is ignored. Lines of threads that Java
   * does not know are dropped.
   *
   * <p>The logger's handlers run during the call that caused the line. Their own calls on an object
   * in use, {@code close()} included, throw {@link IllegalStateException}: on the object whose call
   * caused the line, and on one that another thread uses, as handlers do not wait. Lines that a
   * handler's calls cause are dropped. A handler must not wait for another thread that calls the
   * engine, nor use or free the {@link Loquent} handle whose call it runs in.
   *
   * @param logger where the lines go
   */
  public static synchronized void toLogger(Logger logger) {
    if (logger == null) throw new IllegalArgumentException("no logger");
    NativeLibrary.load();
    target = logger;
    SafeLayer.setLogDestination(SafeLayer.LOG_TO_JAVA);
  }

  /** Drops all lines. */
  public static synchronized void off() {
    NativeLibrary.load();
    SafeLayer.setLogDestination(SafeLayer.LOG_OFF);
  }

  /** Writes all lines to standard error, debug lines too. */
  public static synchronized void toStandardError() {
    NativeLibrary.load();
    SafeLayer.setLogDestination(SafeLayer.LOG_TO_STANDARD_ERROR);
  }

  /** Whether this thread is in a handler. */
  static boolean isHandling() {
    return HANDLING.get() != null;
  }

  static void write(int priority, String text) {
    if (isHandling()) return; // or a handler that creates objects would never end
    HANDLING.set(true);
    try {
      target.log(priority >= 6 ? Level.SEVERE : priority >= 4 ? Level.INFO : Level.FINE, text);
    } finally {
      HANDLING.remove();
    }
  }
}
