package com.zentq.tqe.phonoweave;

/** The flat C interface over whole recordings, and the string helpers, without the Java methods. */
final class Bridge {
  static {
    NativeLibrary.load();
    EngineLog.off();
    System.load(System.getProperty("bridge"));
  }

  private Bridge() {}

  /** One result a frame; a negative content type takes ProcessEPDFrame. */
  static native int[] epd(int mode, short[] pcm, int frame, int contentType, int resetAt);

  static native int[] ns(int mode, int microphones, short[] in, short[] out, int frame);

  static native int[] drc(int rateHz, short[] pcm, int frame);

  static native int[] energy(int rateHz, short[] pcm, int frame);

  static native int[] spectrum(int rateHz, short[] pcm);

  static native byte[] fromC(byte[] text);

  static native byte[] toC(byte[] bytes);

  static native byte[] getBytes(String text);

  static native byte[] getBytesEncoding(String text, byte[] encoding);

  static native String newString(byte[] bytes);

  static native String newStringEncoding(byte[] bytes, byte[] encoding);
}
