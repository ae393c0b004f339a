package com.qn.tessel.server;

import java.nio.charset.StandardCharsets;
import java.security.GeneralSecurityException;
import java.security.Key;
import java.security.MessageDigest;
import java.security.interfaces.RSAKey;
import java.util.Arrays;
import java.util.Base64;
import javax.crypto.Cipher;
import javax.crypto.spec.SecretKeySpec;

/** Codecs and the JDK cipher calls the layouts share; every call builds its own Cipher. */
final class Bytes {
  private Bytes() {}

  static void wipe(byte[]... arrays) {
    for (byte[] a : arrays) {
      if (a != null) Arrays.fill(a, (byte) 0);
    }
  }

  /** Bytes 1:1 as characters: the keyboard types single-byte text. */
  static String text(byte[] bytes, int from, int to) {
    return new String(bytes, from, to - from, StandardCharsets.ISO_8859_1);
  }

  static byte[] latin1(String s) {
    return s.getBytes(StandardCharsets.ISO_8859_1);
  }

  static int hexValue(char c) {
    if (c >= '0' && c <= '9') return c - '0';
    if (c >= 'a' && c <= 'f') return c - 'a' + 10;
    if (c >= 'A' && c <= 'F') return c - 'A' + 10;
    return -1;
  }

  static byte[] fromHex(String hex, String what) throws OpenException.BadEncoding {
    if (hex.length() % 2 != 0) throw new OpenException.BadEncoding(what + ": odd number of hex digits");
    byte[] out = new byte[hex.length() / 2];
    for (int k = 0; k < out.length; ++k) {
      int hi = hexValue(hex.charAt(2 * k));
      int lo = hexValue(hex.charAt(2 * k + 1));
      if (hi < 0 || lo < 0) {
        wipe(out);
        throw new OpenException.BadEncoding(what + ": not hexadecimal");
      }
      out[k] = (byte) (hi * 16 + lo);
    }
    return out;
  }

  static String toHex(byte[] bytes, boolean upper) {
    final String digits = upper ? "0123456789ABCDEF" : "0123456789abcdef";
    char[] out = new char[bytes.length * 2];
    for (int k = 0; k < bytes.length; ++k) {
      out[2 * k] = digits.charAt((bytes[k] >> 4) & 15);
      out[2 * k + 1] = digits.charAt(bytes[k] & 15);
    }
    String s = new String(out);
    Arrays.fill(out, '\0');
    return s;
  }

  /** Strict base64: standard alphabet, padded to a multiple of four, no white space. */
  static byte[] fromBase64(String text, String what) throws OpenException.BadEncoding {
    if (text.isEmpty()) throw new OpenException.BadEncoding(what + ": empty");
    if (text.length() % 4 != 0) throw new OpenException.BadEncoding(what + ": not valid base64 (corrupt or truncated)");
    try {
      return Base64.getDecoder().decode(text);
    } catch (IllegalArgumentException e) {
      throw new OpenException.BadEncoding(what + ": not valid base64 (corrupt or truncated)");
    }
  }

  static byte[] digest(String algorithm, byte[] data) {
    try {
      return MessageDigest.getInstance(algorithm).digest(data);
    } catch (GeneralSecurityException e) {
      throw new IllegalStateException(algorithm + " is missing from the JDK", e);
    }
  }

  /** Modulus bytes of an RSA key, or -1 when the key does not say (a hardware key). */
  static int keySize(Key key) {
    return key instanceof RSAKey ? (((RSAKey) key).getModulus().bitLength() + 7) / 8 : -1;
  }

  /** RSA private-key operation: "PKCS1Padding" checks and strips the block, "NoPadding" returns it. */
  static byte[] rsa(Key key, String padding, byte[] cipher) throws OpenException.WrongKey {
    final int size = keySize(key);
    if (size >= 0 && cipher.length != size) {
      throw new OpenException.WrongKey("RSA value of " + cipher.length + " bytes does not match the " + size
          + "-byte key (foreign key?)");
    }
    try {
      Cipher c = Cipher.getInstance("RSA/ECB/" + padding);
      c.init(Cipher.DECRYPT_MODE, key);
      return c.doFinal(cipher);
    } catch (GeneralSecurityException e) {
      throw new OpenException.WrongKey("RSA decryption failed (wrong key or corrupt value)");
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
