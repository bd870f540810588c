package com.zentq.tqe.phonoweave;

import java.util.logging.Level;
import java.util.logging.Logger;

/**
 * Where the engine's log lines go: to standard error at first. On Android they always go to the
 * platform's log under the tag "Orvalis", and nothing here changes that.
 *
 * <p>May be changed at any time and from any thread.
 */
public final class EngineLog {
  private static volatile Logger target;

  private EngineLog() {}

  /**
   * Sends lines to a logger: debug lines as {@link Level#FINE}, information as {@link Level#INFO},
   * errors as {@link Level#SEVERE}. What the logger throws is lost. Lines of threads that Java does
   * not know are left out.
   *
   * @param logger the receiver
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

  /** Writes lines to standard error. */
  public static synchronized void toStandardError() {
    NativeLibrary.load();
    SafeLayer.setLogDestination(SafeLayer.LOG_TO_STANDARD_ERROR);
  }

  static void write(int priority, String text) {
    target.log(priority >= 6 ? Level.SEVERE : priority >= 4 ? Level.INFO : Level.FINE, text);
  }
}
