package com.qn.tessel.server;

import java.security.PrivateKey;
import java.util.Arrays;

/** The values inside an envelope (or returned bare) by payload kind. */
final class Payloads {
  private Payloads() {}

  private static final byte[] DER_HEAD = {0x30, 0x1C, 0x04, 0x10};
  private static final byte[] DER_TAIL = {0x04, 0x08, (byte) 0x99, (byte) 0x99, (byte) 0x99, (byte) 0x99,
    (byte) 0x99, (byte) 0x99, (byte) 0x99, (byte) 0x99};
  /** The smallest RSA value the layouts carry (a 512-bit modulus), in bytes. */
  private static final int MIN_RSA = 64;

  /**
   * Opens `value` of kind `inner` with `key`; a null key (no encryption-platform key given)
   * leaves it sealed after checking that it has the shape of an RSA value of that kind.
   */
  static Opened open(int type, Types.Inner inner, String value, PrivateKey key, byte[] pinKey, boolean wrapped,
      char letter, String timestamp, String payload) throws OpenException {
    checkShape(inner, value);
    if (key == null || (inner == Types.Inner.TYPE68 && pinKey == null)) {
      return new Opened(type, wrapped, letter, timestamp, payload, null);
    }
    String content;
    String ts = timestamp;
    switch (inner) {
      case KEYOU_HEX:
      case KEYOU_BASE64: {
        byte[] block = Bytes.rsa(key, "NoPadding", decode(inner == Types.Inner.KEYOU_HEX, value));
        try {
          content = keyouMessage(block);
        } finally {
          Bytes.wipe(block);
        }
        break;
      }
      case PKCS1_HEX:
      case PKCS1_BASE64:
      case HASHED_RSA:
        content = pkcs1(key, inner != Types.Inner.PKCS1_BASE64, value);
        break;
      case PAIR_PKCS1_HEX:
      case PAIR_PKCS1_BASE64: {
        String[] pair = lengthPrefixedPair(pkcs1(key, inner == Types.Inner.PAIR_PKCS1_HEX, value));
        if (wrapped && !pair[0].equals(timestamp)) {
          throw new OpenException.WrongType("timestamp inside the payload differs from the wrapper's");
        }
        ts = pair[0];
        content = pair[1];
        break;
      }
      case TYPE5:
        content = type5(key, value);
        break;
      case TYPE19:
        content = type19(pkcs1(key, true, value));
        break;
      case TYPE38:
        content = type38(key, value);
        break;
      case TYPE68:
        content = type68(key, value, pinKey);
        break;
      default:
        content = value;
        break;
    }
    return new Opened(type, wrapped, letter, ts, payload, content);
  }

  private static byte[] decode(boolean hex, String value) throws OpenException.BadEncoding {
    return hex ? Bytes.fromHex(value, "RSA value") : Bytes.fromBase64(value, "RSA value");
  }

  /** RSA values are whole hex or base64 texts at least as long as the smallest modulus. */
  private static void checkShape(Types.Inner inner, String value) throws OpenException {
    String v = value;
    boolean base64 = false;
    switch (inner) {
      case KEYOU_BASE64: case PKCS1_BASE64: case PAIR_PKCS1_BASE64:
        base64 = true;
        break;
      case TYPE5:
        if (!v.endsWith("0001")) throw new OpenException.WrongType("type 5 payload does not end in 0001");
        v = v.substring(0, v.length() - 4);
        break;
      case TYPE38:
        if (v.length() <= 16) throw new OpenException.WrongType("type 38 payload too short");
        v = v.substring(16);
        break;
      case TEXT: case HASHED: case NONE:
        return;
      default:
        break;
    }
    final int bytes = base64 ? v.length() / 4 * 3 : v.length() / 2;
    boolean ok = bytes >= MIN_RSA;
    for (int k = 0; ok && k < v.length(); ++k) {
      char c = v.charAt(k);
      ok = base64 ? c == '+' || c == '/' || c == '=' || Character.isLetterOrDigit(c) && c < 128 : Bytes.hexValue(c) >= 0;
    }
    if (!ok) throw new OpenException.WrongType("payload is not an RSA value as encryption type layouts carry it");
  }

  private static String pkcs1(PrivateKey key, boolean hex, String value) throws OpenException {
    byte[] plain = Bytes.rsa(key, "PKCS1Padding", decode(hex, value));
    try {
      return Bytes.text(plain, 0, plain.length);
    } finally {
      Bytes.wipe(plain);
    }
  }

  /** Two ASCII digits of the length (the tens "digit" runs past '9' from 100 on), then the message. */
  static String keyouMessage(byte[] block) throws OpenException.WrongType {
    if (block.length < 3) throw new OpenException.WrongType("Keyou block too short");
    final int tens = (block[0] & 0xff) - '0';
    final int units = (block[1] & 0xff) - '0';
    if (tens < 0 || units < 0 || units > 9) throw new OpenException.WrongType("Keyou block does not start with a length");
    final int m = tens * 10 + units;
    if (m == 0 || m + 2 > block.length) throw new OpenException.WrongType("Keyou block length " + m + " out of range");
    return Bytes.text(block, 2, 2 + m);
  }

  /** "%02d" timestamp "%02d" text; a length of 100 or more has three digits: take the reading that fits. */
  static String[] lengthPrefixedPair(String pair) throws OpenException.WrongType {
    for (int w1 = 2; w1 <= 3; ++w1) {
      final int tsLen = number(pair, 0, w1);
      if (tsLen < 0 || w1 + tsLen > pair.length()) continue;
      for (int w2 = 2; w2 <= 3; ++w2) {
        final int textLen = number(pair, w1 + tsLen, w2);
        if (textLen < 0 || w1 + tsLen + w2 + textLen != pair.length()) continue;
        return new String[] {pair.substring(w1, w1 + tsLen), pair.substring(w1 + tsLen + w2)};
      }
    }
    throw new OpenException.WrongType("length-prefixed pair is malformed");
  }

  private static int number(String s, int at, int width) {
    if (at + width > s.length()) return -1;
    int v = 0;
    for (int k = at; k < at + width; ++k) {
      char c = s.charAt(k);
      if (c < '0' || c > '9') return -1;
      v = v * 10 + (c - '0');
    }
    return (width == 3) == (v >= 100) ? v : -1;
  }

  private static String type5(PrivateKey key, String payload) throws OpenException {
    byte[] cipher = Bytes.fromHex(payload.substring(0, payload.length() - 4), "type 5 payload");
    Bytes.reverse(cipher);
    byte[] plain = Bytes.rsa(key, "PKCS1Padding", cipher);
    try {
      if (plain.length != 40) throw new OpenException.WrongType("type 5 payload does not hold a SHA-1 hex digest");
      return Bytes.text(plain, 0, 40);
    } finally {
      Bytes.wipe(plain);
    }
  }

  private static String type19(String plain) throws OpenException.WrongType {
    if (plain.length() < 5 || !plain.startsWith("011")) throw new OpenException.WrongType("type 19 block does not start with 011");
    final int digits = plain.length() - 5 < 100 ? 2 : 3;
    final int n = plain.length() - 3 - digits;
    if (!plain.startsWith(String.format("%02d", n), 3)) throw new OpenException.WrongType("type 19 length does not match its text");
    return plain.substring(3 + digits);
  }

  private static String type38(PrivateKey key, String payload) throws OpenException {
    byte[] block = Bytes.fromHex(payload.substring(0, 16), "type 38 PIN block");
    byte[] der = Bytes.rsa(key, "PKCS1Padding", Bytes.fromHex(payload.substring(16), "RSA value"));
    byte[] desKey = null;
    byte[] plain = null;
    try {
      if (der.length != 30 || !Arrays.equals(der, 0, 4, DER_HEAD, 0, 4) || !Arrays.equals(der, 20, 30, DER_TAIL, 0, 10)) {
        throw new OpenException.WrongType("type 38 key value is not the expected DER SEQUENCE");
      }
      desKey = Arrays.copyOfRange(der, 4, 20);
      plain = Bytes.tdesDecrypt(desKey, block);
      String hex = Bytes.toHex(plain, true);
      int f = hex.indexOf('F');
      String digits = f < 0 ? hex : hex.substring(0, f);
      if (digits.length() > 12 || !digits.chars().allMatch(c -> c >= '0' && c <= '9')
          || (f >= 0 && !hex.substring(f).chars().allMatch(c -> c == 'F'))) {
        throw new OpenException.WrongType("type 38 block is not digits padded with F");
      }
      return digits;
    } finally {
      Bytes.wipe(block, der, desKey, plain);
    }
  }

  private static String type68(PrivateKey key, String payload, byte[] pinKey) throws OpenException {
    byte[] sealed = Bytes.rsa(key, "PKCS1Padding", Bytes.fromHex(payload, "RSA value"));
    byte[] block = null;
    try {
      if (sealed.length != 8) throw new OpenException.WrongType("type 68 payload is not one 8-byte block");
      block = Bytes.tdesDecrypt(pinKey, sealed);
      String hex = Bytes.toHex(block, true);
      final int n = Bytes.hexValue(hex.charAt(1));
      if (hex.charAt(0) != '0' || n < 4 || n > 12) {
        throw new OpenException.WrongKey("type 68 block is not an ISO 9564 format 0 block (wrong PIN key?)");
      }
      String digits = hex.substring(2, 2 + n);
      if (!digits.chars().allMatch(c -> c >= '0' && c <= '9') || !hex.substring(2 + n).chars().allMatch(c -> c == 'F')) {
        throw new OpenException.WrongKey("type 68 block is not an ISO 9564 format 0 block (wrong PIN key?)");
      }
      return digits;
    } finally {
      Bytes.wipe(sealed, block);
    }
  }
}
