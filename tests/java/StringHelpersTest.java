package com.zentq.tqe.phonoweave;

import static java.nio.charset.StandardCharsets.UTF_8;
import static org.junit.jupiter.api.Assertions.assertArrayEquals;
import static org.junit.jupiter.api.Assertions.assertEquals;
import static org.junit.jupiter.api.Assertions.assertNull;
import static org.junit.jupiter.api.Assertions.assertThrows;

import java.io.UnsupportedEncodingException;
import java.util.List;
import org.junit.jupiter.api.Test;

/** The string helpers on a real Java machine. What they do when it fails is tested from C++. */
class StringHelpersTest {
  static native byte[] throughC(byte[] bytes);

  static native byte[] encode(String text);

  static native byte[] encodeAs(String text, byte[] encoding);

  static native String decode(byte[] bytes);

  static native String decodeAs(byte[] bytes, byte[] encoding);

  @Test
  void textIsEncodedAndDecodedAsByJava() throws UnsupportedEncodingException {
    NativeLibrary.load();
    EngineLog.off();
    System.load(System.getProperty("bridge"));
    String text = "Grüße, 音声 \uD83C\uDFA4";
    assertArrayEquals(text.getBytes(UTF_8), throughC(text.getBytes(UTF_8)));
    assertArrayEquals(text.getBytes(), encode(text));
    assertEquals(new String(text.getBytes()), decode(text.getBytes()));
    for (String encoding : List.of("UTF-8", "UTF-16LE", "ISO-8859-1")) {
      byte[] bytes = text.getBytes(encoding);
      assertArrayEquals(bytes, encodeAs(text, encoding.getBytes(UTF_8)));
      assertEquals(new String(bytes, encoding), decodeAs(bytes, encoding.getBytes(UTF_8)));
    }
    assertNull(throughC(null));
    assertNull(encode(null));
    assertNull(encodeAs(text, null));
    assertNull(decode(null));
    assertNull(decodeAs(new byte[1], null));
    byte[] unknown = "no-such-encoding".getBytes(UTF_8);
    assertThrows(UnsupportedEncodingException.class, () -> encodeAs(text, unknown));
    assertThrows(UnsupportedEncodingException.class, () -> decodeAs(new byte[1], unknown));
  }
}
