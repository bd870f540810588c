package com.zentq.tqe.phonoweave;

import static java.nio.charset.StandardCharsets.ISO_8859_1;
import static java.nio.charset.StandardCharsets.UTF_16LE;
import static java.nio.charset.StandardCharsets.UTF_8;
import static org.junit.jupiter.api.Assertions.assertArrayEquals;
import static org.junit.jupiter.api.Assertions.assertEquals;
import static org.junit.jupiter.api.Assertions.assertNull;
import static org.junit.jupiter.api.Assertions.assertThrows;

import java.io.UnsupportedEncodingException;
import java.nio.charset.Charset;
import org.junit.jupiter.api.Test;

/** The string helpers as native code calls them. */
class StringHelpersTest {
  private static final String TEXT = "Grüße, 音声 \uD83C\uDFA4";

  private static byte[] ascii(String text) {
    return text.getBytes(ISO_8859_1);
  }

  @Test
  void bytesAreCopiedUpToTheFirstZero() {
    assertArrayEquals(ascii("pcm"), Bridge.fromC(ascii("pcm")));
    assertArrayEquals(new byte[0], Bridge.fromC(new byte[0]));
    assertArrayEquals(TEXT.getBytes(UTF_8), Bridge.fromC(TEXT.getBytes(UTF_8)));
    assertArrayEquals(ascii("pcm"), Bridge.toC(ascii("pcm")));
    assertArrayEquals(ascii("p"), Bridge.toC(ascii("p\0cm")));
    assertArrayEquals(new byte[0], Bridge.toC(new byte[0]));
  }

  @Test
  void textIsEncodedAndDecoded() {
    assertArrayEquals(TEXT.getBytes(), Bridge.getBytes(TEXT));
    assertEquals(new String(TEXT.getBytes()), Bridge.newString(TEXT.getBytes()));
    for (Charset charset : new Charset[] {UTF_8, UTF_16LE, ISO_8859_1}) {
      byte[] bytes = TEXT.getBytes(charset);
      assertArrayEquals(bytes, Bridge.getBytesEncoding(TEXT, ascii(charset.name())));
      assertEquals(new String(bytes, charset), Bridge.newStringEncoding(bytes, ascii(charset.name())));
    }
  }

  @Test
  void failuresComeBackAsNullOrAsJavasException() {
    assertNull(Bridge.fromC(null));
    assertNull(Bridge.toC(null));
    assertNull(Bridge.getBytes(null));
    assertNull(Bridge.getBytesEncoding(null, ascii("UTF-8")));
    assertNull(Bridge.getBytesEncoding(TEXT, null));
    assertNull(Bridge.newString(null));
    assertNull(Bridge.newStringEncoding(null, ascii("UTF-8")));
    assertNull(Bridge.newStringEncoding(new byte[1], null));
    byte[] unknown = ascii("no-such-encoding");
    assertThrows(UnsupportedEncodingException.class, () -> Bridge.getBytesEncoding(TEXT, unknown));
    assertThrows(
        UnsupportedEncodingException.class, () -> Bridge.newStringEncoding(new byte[1], unknown));
  }
}
