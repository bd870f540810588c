package com.zentq.tqe.phonoweave;

import java.util.List;
import java.util.function.Supplier;

/** The calls of an object of any safe class. What comes out of them is text, to be joined. */
record Target(Push push, Supplier<String> flush, Runnable close) {
  static final int KINDS = 5;

  interface Push {
    String push(short[] pcm, int offset, int count);
  }

  static Target of(EndPointDetector.Settings settings) {
    EndPointDetector epd = settings.open();
    return new Target((pcm, at, n) -> text(epd.push(pcm, at, n)), () -> text(epd.flush()), epd::close);
  }

  static Target of(NoiseSuppressor ns) {
    return new Target((pcm, at, n) -> text(ns.push(pcm, at, n)), () -> text(ns.flush()), ns::close);
  }

  static Target of(int kind) {
    EndPointDetector.Method[] methods = EndPointDetector.Method.values();
    if (kind < 2) return of(EndPointDetector.at(16000).method(methods[kind]).hangoverMillis(100));
    if (kind == 2) return of(NoiseSuppressor.forOneMicrophone(NoiseSuppressor.Strength.STRONG));
    if (kind == 3) return of(NoiseSuppressor.forTwoMicrophones());
    DynamicsControl drc = new DynamicsControl();
    return new Target((pcm, at, n) -> text(drc.push(pcm, at, n)), () -> text(drc.flush()), drc::close);
  }

  /** All of the output for audio at once. */
  String output(short[] pcm) {
    String text = push.push(pcm, 0, pcm.length) + flush.get();
    close.run();
    return text;
  }

  private static String text(short[] samples) {
    StringBuilder text = new StringBuilder();
    for (short sample : samples) text.append((char) sample);
    return text.toString();
  }

  private static String text(List<Utterance> utterances) {
    StringBuilder text = new StringBuilder();
    for (Utterance one : utterances) text.append(one + " (" + one.began + ", " + one.ended + ")\n");
    return text.toString();
  }
}
