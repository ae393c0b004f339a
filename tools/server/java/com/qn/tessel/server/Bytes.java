package com.qn.tessel.server;

import java.nio.charset.StandardCharsets;
import java.security.GeneralSecurityException;
import java.security.MessageDigest;
import java.util.Arrays;
import javax.crypto.Cipher;
import javax.crypto.spec.SecretKeySpec;

/**
 * Codecs and the JDK cipher calls the layouts share; every call builds its own Cipher.
 *
 * <p>The decoders read the whole text and report validity at the end (a mask: -1 valid, 0 not),
 * never stopping at the first bad character, so that opened payloads are parsed in the same time
 * whether they are sound or not. Base64 is strict and canonical: standard alphabet, no white
 * space, a multiple of four, '=' only as one or two final characters, unused low bits zero.
 * Hexadecimal: even length, 0-9 a-f A-F.
 */
final class Bytes {
  private Bytes() {}

  private static final byte[] HEX = new byte[256];
  private static final byte[] B64 = new byte[256];
  private static final String B64_ALPHABET = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

  static {
    Arrays.fill(HEX, (byte) -1);
    Arrays.fill(B64, (byte) -1);
    for (int k = 0; k < 16; ++k) {
      HEX["0123456789abcdef".charAt(k)] = (byte) k;
      HEX["0123456789ABCDEF".charAt(k)] = (byte) k;
    }
    for (int k = 0; k < 64; ++k) B64[B64_ALPHABET.charAt(k)] = (byte) k;
  }

  static void wipe(byte[]... arrays) {
    for (byte[] a : arrays) {
      if (a != null) Arrays.fill(a, (byte) 0);
    }
  }

  static void wipe(char[] chars) {
    if (chars != null) Arrays.fill(chars, '\0');
  }

  /** -1 when {@code a} is zero, else 0 (a a signed int of any value). */
  static int zeroMask(int a) {
    return ~(a | -a) >> 31;
  }

  /** -1 when a &lt; b, else 0 (both in 0..2^30). */
  static int lessMask(int a, int b) {
    return (a - b) >> 31;
  }

  static int select(int mask, int a, int b) {
    return (a & mask) | (b & ~mask);
  }

  /** -1 when a[aFrom..aFrom+n) equals b[bFrom..bFrom+n), else 0; time independent of where they differ. */
  static int equalMask(byte[] a, int aFrom, byte[] b, int bFrom, int n) {
    int diff = 0;
    for (int k = 0; k < n; ++k) diff |= a[aFrom + k] ^ b[bFrom + k];
    return zeroMask(diff);
  }

  /** Bytes 1:1 as characters: the keyboard types single-byte text. */
  static String text(byte[] bytes, int from, int to) {
    return new String(bytes, from, to - from, StandardCharsets.ISO_8859_1);
  }

  static byte[] latin1(String s) {
    return s.getBytes(StandardCharsets.ISO_8859_1);
  }

  static byte[] latin1(char[] chars) {
    byte[] out = new byte[chars.length];
    for (int k = 0; k < chars.length; ++k) out[k] = (byte) chars[k];
    return out;
  }

  static char[] chars(byte[] bytes) {
    char[] out = new char[bytes.length];
    for (int k = 0; k < bytes.length; ++k) out[k] = (char) (bytes[k] & 0xff);
    return out;
  }

  static int hexValue(int c) {
    return HEX[c & 0xff] | ~zeroMask(c & ~0xff);
  }

  /** Decodes t[from, to) into out (length (to - from) / 2); returns the validity mask. */
  static int hexInto(byte[] t, int from, int to, byte[] out) {
    int ok = zeroMask((to - from) & 1);
    for (int k = 0; k < out.length; ++k) {
      final int hi = HEX[t[from + 2 * k] & 0xff];
      final int lo = HEX[t[from + 2 * k + 1] & 0xff];
      ok &= ~((hi | lo) >> 31);
      out[k] = (byte) (hi << 4 | (lo & 15));
    }
    return ok;
  }

  /** The decoded length of a base64 text whose validity {@link #base64Into} decides. */
  static int base64Length(byte[] t, int from, int to) {
    final int n = to - from;
    if (n < 4) return 0;
    return n / 4 * 3 - (t[to - 1] == '=' ? 1 : 0) - (t[to - 2] == '=' ? 1 : 0);
  }

  /** Decodes t[from, to) into out (length {@link #base64Length}); returns the validity mask. */
  static int base64Into(byte[] t, int from, int to, byte[] out) {
    final int n = to - from;
    int ok = zeroMask(n & 3) & ~zeroMask(n);
    final int pads = n / 4 * 3 - out.length;
    int acc = 0;
    int bits = 0;
    int at = 0;
    for (int k = 0; k < n; ++k) {
      final int c = t[from + k] & 0xff;
      final int v = B64[c];
      final boolean pad = k >= n - pads;
      ok &= pad ? zeroMask(c - '=') : ~(v >> 31);
      if (pad) continue;
      acc = acc << 6 | (v & 63);
      bits += 6;
      if (bits >= 8) {
        bits -= 8;
        if (at < out.length) out[at++] = (byte) (acc >> bits);
      }
    }
    ok &= zeroMask(acc & ((1 << bits) - 1));  // canonical: the unused low bits are zero
    return ok;
  }

  /** Public-text decoders: strict, with a message for the caller. */
  static byte[] fromHex(byte[] text, String what) throws OpenException.BadEncoding {
    byte[] out = new byte[text.length / 2];
    if (hexInto(text, 0, text.length, out) == 0) {
      wipe(out);
      throw new OpenException.BadEncoding(what + ": not hexadecimal (an even number of 0-9 a-f A-F)");
    }
    return out;
  }

  static byte[] fromBase64(byte[] text, String what) throws OpenException.BadEncoding {
    if (text.length == 0) throw new OpenException.BadEncoding(what + ": empty");
    byte[] out = new byte[base64Length(text, 0, text.length)];
    if (base64Into(text, 0, text.length, out) == 0) {
      wipe(out);
      throw new OpenException.BadEncoding(what + ": not valid base64 (corrupt or truncated)");
    }
    return out;
  }

  static char[] toHex(byte[] bytes, boolean upper) {
    final String digits = upper ? "0123456789ABCDEF" : "0123456789abcdef";
    char[] out = new char[bytes.length * 2];
    for (int k = 0; k < bytes.length; ++k) {
      out[2 * k] = digits.charAt((bytes[k] >> 4) & 15);
      out[2 * k + 1] = digits.charAt(bytes[k] & 15);
    }
    return out;
  }

  static byte[] digest(String algorithm, byte[]... parts) {
    try {
      MessageDigest md = MessageDigest.getInstance(algorithm);
      for (byte[] p : parts) md.update(p);
      return md.digest();
    } catch (GeneralSecurityException e) {
      throw new IllegalStateException(algorithm + " is missing from the JDK", e);
    }
  }

  /** RC4 over data after `drop` keystream bytes. */
  static byte[] rc4(byte[] key, int drop, byte[] data) {
    byte[] scratch = new byte[drop];
    try {
      Cipher c = Cipher.getInstance("ARCFOUR");
      c.init(Cipher.ENCRYPT_MODE, new SecretKeySpec(key, "ARCFOUR"));
      if (drop > 0) c.update(scratch);
      return c.doFinal(data);
    } catch (GeneralSecurityException e) {
      throw new IllegalStateException("ARCFOUR is missing from the JDK", e);
    } finally {
      wipe(scratch);
    }
  }

  /** Two-key triple-DES ECB decryption (K1, K2, K1) of whole 8-byte blocks. */
  static byte[] tdesDecrypt(byte[] key16, byte[] data) {
    byte[] key24 = Arrays.copyOf(key16, 24);
    System.arraycopy(key16, 0, key24, 16, 8);
    try {
      Cipher c = Cipher.getInstance("DESede/ECB/NoPadding");
      c.init(Cipher.DECRYPT_MODE, new SecretKeySpec(key24, "DESede"));
      return c.doFinal(data);
    } catch (GeneralSecurityException e) {
      throw new IllegalStateException("DESede is missing from the JDK", e);
    } finally {
      wipe(key24);
    }
  }

  static void reverse(byte[] b) {
    for (int i = 0, j = b.length - 1; i < j; ++i, --j) {
      byte t = b[i];
      b[i] = b[j];
      b[j] = t;
    }
  }
}
