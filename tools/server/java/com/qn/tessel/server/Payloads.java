package com.qn.tessel.server;

import java.util.Arrays;

/**
 * The values inside an envelope (or returned bare) by payload kind.
 *
 * <p>Nothing here throws on a decrypted byte: each step folds its checks into a validity mask
 * (-1 sound, 0 not) and goes on with whatever it has, so that every opened value costs the same
 * work; the caller turns a 0 into {@link OpenException.Rejected}. Only a direct output (the
 * client's own text, before any private-key operation) may be refused with its own message.
 */
final class Payloads {
  private Payloads() {}

  private static final byte[] DER_HEAD = {0x30, 0x1C, 0x04, 0x10};
  private static final byte[] DER_TAIL = {0x04, 0x08, (byte) 0x99, (byte) 0x99, (byte) 0x99, (byte) 0x99,
    (byte) 0x99, (byte) 0x99, (byte) 0x99, (byte) 0x99};
  private static final byte[] TYPE5_TAIL = {'0', '0', '0', '1'};
  private static final byte[] TYPE19_HEAD = {'0', '1', '1'};
  /** The smallest RSA value the layouts carry (a 512-bit modulus), in bytes. */
  private static final int MIN_RSA = 64;

  /**
   * One value to open.
   *
   * @param inner its kind
   * @param value the payload text (hex or base64 for the RSA kinds)
   * @param key the key that opens it; null leaves it sealed (its shape is still checked)
   * @param pinKey type 68's PIN key, or null
   * @param timestamp the timestamp a length-prefixed pair must carry (the wrapper's, or the one
   *     the caller expects), or null
   * @param direct whether the value is the whole output (its encoding and length are public)
   */
  record Request(Types.Inner inner, byte[] value, Rsa key, byte[] pinKey, byte[] timestamp, boolean direct) {}

  /**
   * What came out.
   *
   * @param content the opened bytes, or null when sealed
   * @param timestamp a length-prefixed pair's timestamp, or null
   * @param valid -1 when every check passed, else 0
   */
  record Result(byte[] content, byte[] timestamp, int valid) {}

  static Result open(Request r) throws OpenException {
    final Types.Inner inner = r.inner();
    if (inner.text()) return new Result(r.value().clone(), null, -1);
    if (r.key() == null || (inner == Types.Inner.TYPE68 && r.pinKey() == null)) {
      return new Result(null, null, sealedShape(inner, r.value()));
    }
    final byte[] v = r.value();
    final int[] valid = {-1};
    return switch (inner) {
      case KEYOU_HEX, KEYOU_BASE64 -> message(r.key().keyou(rsaValue(r, 0, v.length, false, valid)), valid);
      case PKCS1_HEX, PKCS1_BASE64, HASHED_RSA -> message(r.key().pkcs1(rsaValue(r, 0, v.length, false, valid), -1), valid);
      case PAIR_PKCS1_HEX, PAIR_PKCS1_BASE64 -> pair(r, r.key().pkcs1(rsaValue(r, 0, v.length, false, valid), -1), valid);
      case TYPE5 -> type5(r, valid);
      case TYPE19 -> type19(r.key().pkcs1(rsaValue(r, 0, v.length, false, valid), -1), valid);
      case TYPE38 -> type38(r, valid);
      default -> type68(r, valid);
    };
  }

  private static Result message(byte[] message, int[] valid) {
    return new Result(message, null, valid[0]);
  }

  /**
   * The RSA value in value[from, to): hex or base64 (by kind), k bytes, least significant byte
   * first when reversed. A direct output that fails is refused here (public bytes); an opened
   * payload that fails clears valid[0] and yields a stand-in, so the RSA step still runs.
   */
  private static byte[] rsaValue(Request r, int from, int to, boolean reversed, int[] valid) throws OpenException {
    final byte[] v = r.value();
    final boolean base64 = r.inner().base64();
    byte[] c = new byte[base64 ? Bytes.base64Length(v, from, to) : (to - from) / 2];
    int ok = base64 ? Bytes.base64Into(v, from, to, c) : Bytes.hexInto(v, from, to, c);
    if (r.direct() && ok == 0) {
      throw new OpenException.BadEncoding("RSA value: not valid " + (base64 ? "base64" : "hexadecimal"));
    }
    if (r.direct() && c.length != r.key().size) {
      throw new OpenException.WrongKey("RSA value of " + c.length + " bytes does not match the " + r.key().size
          + "-byte key (foreign key?)");
    }
    ok &= Bytes.zeroMask(c.length - r.key().size);
    if (ok == 0) {
      valid[0] = 0;
      return r.key().standIn();
    }
    if (reversed) Bytes.reverse(c);
    return c;
  }

  /** Without the key: the payload must still have the shape of what the type carries. */
  static int sealedShape(Types.Inner inner, byte[] v) {
    if (inner.text()) return -1;
    int from = 0;
    int to = v.length;
    int ok = -1;
    if (inner == Types.Inner.TYPE5) {
      ok = v.length > 4 ? Bytes.equalMask(v, v.length - 4, TYPE5_TAIL, 0, 4) : 0;
      to = Math.max(0, v.length - 4);
    } else if (inner == Types.Inner.TYPE38) {
      ok = v.length > 16 ? Bytes.hexInto(v, 0, 16, new byte[8]) : 0;
      from = Math.min(16, v.length);
    }
    final boolean base64 = inner.base64();
    byte[] c = new byte[base64 ? Bytes.base64Length(v, from, to) : (to - from) / 2];
    ok &= base64 ? Bytes.base64Into(v, from, to, c) : Bytes.hexInto(v, from, to, c);
    ok &= ~Bytes.lessMask(c.length, MIN_RSA);
    Bytes.wipe(c);
    return ok;
  }

  /** Reads "%0Nd" at p[at, at + width): the value, or -1 (width 3 only for 100 and more). */
  private static int number(byte[] p, int at, int width) {
    if (at + width > p.length) return -1;
    int v = 0;
    int ok = -1;
    for (int k = at; k < at + width; ++k) {
      final int d = (p[k] & 0xff) - '0';
      ok &= ~(d >> 31) & Bytes.lessMask(d, 10);
      v = v * 10 + d;
    }
    ok &= (width == 3) == (v >= 100) ? -1 : 0;
    return Bytes.select(ok, v, -1);
  }

  /**
   * "%02d" timestamp "%02d" text; a length of 100 or more has three digits: the reading that
   * consumes the pair exactly is taken.
   */
  private static Result pair(Request r, byte[] p, int[] valid) {
    int tsFrom = -1;
    int tsLen = 0;
    int textFrom = -1;
    for (int w1 = 2; w1 <= 3; ++w1) {
      final int t = number(p, 0, w1);
      if (t < 0 || w1 + t > p.length) continue;
      for (int w2 = 2; w2 <= 3; ++w2) {
        final int n = number(p, w1 + t, w2);
        if (n >= 0 && w1 + t + w2 + n == p.length && tsFrom < 0) {
          tsFrom = w1;
          tsLen = t;
          textFrom = w1 + t + w2;
        }
      }
    }
    try {
      int ok = valid[0] & ~(tsFrom >> 31);
      if (tsFrom < 0) return new Result(new byte[0], new byte[0], 0);
      byte[] ts = Arrays.copyOfRange(p, tsFrom, tsFrom + tsLen);
      if (r.timestamp() != null) {
        ok &= Bytes.zeroMask(ts.length - r.timestamp().length)
            & Bytes.equalMask(ts, 0, r.timestamp(), 0, Math.min(ts.length, r.timestamp().length));
      }
      return new Result(Arrays.copyOfRange(p, textFrom, p.length), ts, ok);
    } finally {
      Bytes.wipe(p);
    }
  }

  /** hex(reversed RSA of the 40 upper-case hex characters of SHA-1(text)) "0001". */
  private static Result type5(Request r, int[] valid) throws OpenException {
    final byte[] v = r.value();
    if (v.length <= 4) valid[0] = 0;
    else valid[0] &= Bytes.equalMask(v, v.length - 4, TYPE5_TAIL, 0, 4);
    return message(r.key().pkcs1(rsaValue(r, 0, Math.max(0, v.length - 4), true, valid), 40), valid);
  }

  /** "011" "%02d"(L) text (three digits from 100 on). */
  private static Result type19(byte[] p, int[] valid) {
    try {
      if (p.length < 5) return new Result(new byte[0], null, 0);  // lengths are no signal: synthetic ones vary too
      int ok = valid[0];
      final int digits = p.length - 5 < 100 ? 2 : 3;
      final int n = p.length - 3 - digits;
      ok &= Bytes.equalMask(p, 0, TYPE19_HEAD, 0, 3) & Bytes.zeroMask(number(p, 3, digits) - n);
      return new Result(Arrays.copyOfRange(p, 3 + digits, p.length), null, ok);
    } finally {
      Bytes.wipe(p);
    }
  }

  /** 16 hex of the triple-DES F-padded digit block, then RSA hex of the DER key value. */
  private static Result type38(Request r, int[] valid) throws OpenException {
    final byte[] v = r.value();
    byte[] block = new byte[8];
    if (v.length > 16) valid[0] &= Bytes.hexInto(v, 0, 16, block);
    else valid[0] = 0;
    final byte[] der = r.key().pkcs1(rsaValue(r, Math.min(16, v.length), v.length, false, valid), 30);
    byte[] desKey = Arrays.copyOfRange(der, 4, 20);
    byte[] plain = Bytes.tdesDecrypt(desKey, block);
    char[] hex = Bytes.toHex(plain, true);
    try {
      int ok = valid[0] & Bytes.equalMask(der, 0, DER_HEAD, 0, 4) & Bytes.equalMask(der, 20, DER_TAIL, 0, 10);
      // Digits, then only F up to 16: at most 12 digits.
      int digits = 0;
      int inPadding = 0;
      for (char c : hex) {
        final int isF = Bytes.zeroMask(c - 'F');
        inPadding |= isF;
        ok &= Bytes.select(inPadding, isF, ~Bytes.lessMask(c, '0') & Bytes.lessMask(c, '9' + 1));
        digits += ~inPadding & 1;
      }
      ok &= ~Bytes.lessMask(12, digits);
      byte[] pin = new byte[digits];
      for (int k = 0; k < digits; ++k) pin[k] = (byte) hex[k];
      return new Result(pin, null, ok);
    } finally {
      Bytes.wipe(block, der, desKey, plain);
      Bytes.wipe(hex);
    }
  }

  /** RSA hex of the triple-DES-encrypted ISO 9564 format 0 block (no account number). */
  private static Result type68(Request r, int[] valid) throws OpenException {
    final byte[] sealed = r.key().pkcs1(rsaValue(r, 0, r.value().length, false, valid), 8);
    byte[] block = Bytes.tdesDecrypt(r.pinKey(), sealed);
    char[] hex = Bytes.toHex(block, true);
    try {
      final int n = Bytes.hexValue(hex[1]);
      int ok = valid[0] & Bytes.zeroMask(hex[0] - '0') & ~Bytes.lessMask(n, 4) & ~Bytes.lessMask(12, n);
      final int len = Bytes.select(ok, n, 0);
      for (int k = 2; k < 16; ++k) {
        final int c = hex[k];
        final int digit = ~Bytes.lessMask(c, '0') & Bytes.lessMask(c, '9' + 1);
        ok &= Bytes.select(Bytes.lessMask(k, 2 + len), digit, Bytes.zeroMask(c - 'F'));
      }
      byte[] pin = new byte[len];
      for (int k = 0; k < len; ++k) pin[k] = (byte) hex[2 + k];
      return new Result(pin, null, ok);
    } finally {
      Bytes.wipe(sealed, block);
      Bytes.wipe(hex);
    }
  }
}
