package com.qn.tessel.server;

import java.math.BigInteger;
import java.security.GeneralSecurityException;
import java.security.PrivateKey;
import java.security.SecureRandom;
import java.security.interfaces.RSAKey;
import java.security.interfaces.RSAPrivateKey;
import javax.crypto.Cipher;
import javax.crypto.Mac;
import javax.crypto.spec.SecretKeySpec;

/**
 * One RSA private key and its implicit rejection.
 *
 * <p>Every RSA value is decrypted without padding ({@code RSA/ECB/NoPadding}) and its layout
 * (PKCS#1 v1.5 type 2, or a "Keyou" block) is checked with masks over the whole block, never
 * with a branch or an early return on a decrypted byte. Whatever the outcome, a synthetic
 * message is derived as the IETF draft on implicit rejection for PKCS#1 v1.5 (and OpenSSL 3.2)
 * does: KDK = HMAC-SHA-256(SHA-256(d as k big-endian bytes), ciphertext as k bytes); the message
 * and its length come from HMAC-SHA-256(KDK, counter | label | bit length) blocks. The real or the
 * synthetic message is then selected with masks and handed back as if it were real: whether the
 * block was sound is never told, not even to the caller. A synthetic key or message fails the
 * caller's parse (or opens to noise where the layout has no structure, as a wrong key would), in
 * the same RC4 and the same parse as a real one.
 *
 * <p>CT: the time of {@link #pkcs1} and {@link #keyou} does not depend on the decrypted block,
 * only on k and on the selected message's length (which a valid and a synthetic message share
 * in distribution). The JIT may still add differences; bench/TimingBench.java measures them.
 */
final class Rsa {
  /** A key the JDK does not let us read (a hardware key) gets a per-process random secret. */
  private static final SecureRandom RANDOM = new SecureRandom();
  private static final byte[] MESSAGE = {'m', 'e', 's', 's', 'a', 'g', 'e'};
  private static final byte[] LENGTH = {'l', 'e', 'n', 'g', 't', 'h'};
  private static final int LENGTH_TRIES = 128;

  final PrivateKey key;
  /** Modulus bytes k, or -1 when the key does not say. */
  final int size;
  private final byte[] dHash;

  Rsa(PrivateKey key) {
    this.key = key;
    this.size = key instanceof RSAKey r ? (r.getModulus().bitLength() + 7) / 8 : -1;
    BigInteger d = key instanceof RSAPrivateKey p ? p.getPrivateExponent() : null;
    byte[] dBytes;
    if (d != null && size > 0) {
      dBytes = new byte[size];
      byte[] raw = d.toByteArray();
      final int n = Math.min(raw.length, size);
      System.arraycopy(raw, raw.length - n, dBytes, size - n, n);
      Bytes.wipe(raw);
    } else {
      dBytes = new byte[32];
      RANDOM.nextBytes(dBytes);
    }
    this.dHash = Bytes.digest("SHA-256", dBytes);
    Bytes.wipe(dBytes);
  }

  /** The k-byte block c^d mod n, or a block of zeros (no layout passes) when c is not below n. */
  private byte[] raw(byte[] c) {
    try {
      Cipher cipher = Cipher.getInstance("RSA/ECB/NoPadding");
      cipher.init(Cipher.DECRYPT_MODE, key);
      byte[] out = cipher.doFinal(c);
      if (out.length == size) return out;
      byte[] padded = new byte[size];  // a provider that strips leading zeros
      System.arraycopy(out, 0, padded, size - out.length, out.length);
      Bytes.wipe(out);
      return padded;
    } catch (GeneralSecurityException e) {
      return new byte[size];
    }
  }

  private static byte[] hmac(byte[] key, byte[]... parts) {
    try {
      Mac mac = Mac.getInstance("HmacSHA256");
      mac.init(new SecretKeySpec(key, "HmacSHA256"));
      for (byte[] p : parts) mac.update(p);
      return mac.doFinal();
    } catch (GeneralSecurityException e) {
      throw new IllegalStateException("HmacSHA256 is missing from the JDK", e);
    }
  }

  /** The draft's PRF: bytes of HMAC(KDK, counter | label | bit length), counter from 0. */
  private static byte[] prf(byte[] kdk, byte[] label, int bytes) {
    byte[] out = new byte[bytes];
    final byte[] bitLength = {(byte) (bytes * 8 >> 8), (byte) (bytes * 8)};
    for (int at = 0, i = 0; at < bytes; at += 32, ++i) {
      byte[] block = hmac(kdk, new byte[] {(byte) (i >> 8), (byte) i}, label, bitLength);
      System.arraycopy(block, 0, out, at, Math.min(32, bytes - at));
      Bytes.wipe(block);
    }
    return out;
  }

  /** Synthetic length: the last of 128 masked 16-bit candidates below max, else 0. */
  private static int syntheticLength(byte[] kdk, int max) {
    byte[] candidates = prf(kdk, LENGTH, LENGTH_TRIES * 2);
    int mask = max;
    mask |= mask >> 1;
    mask |= mask >> 2;
    mask |= mask >> 4;
    mask |= mask >> 8;
    int length = 0;
    for (int k = 0; k < candidates.length; k += 2) {
      final int candidate = ((candidates[k] & 0xff) << 8 | (candidates[k + 1] & 0xff)) & mask;
      length = Bytes.select(Bytes.lessMask(candidate, max), candidate, length);
    }
    Bytes.wipe(candidates);
    return length;
  }

  /**
   * Selects real (start, length) or the synthetic message at the block's end, and copies it out
   * reading both blocks at every position.
   */
  private static byte[] select(byte[] block, byte[] synthetic, int valid, int start, int length, int syntheticLength) {
    final int from = Bytes.select(valid, start, block.length - syntheticLength);
    final int n = Bytes.select(valid, length, syntheticLength);
    byte[] out = new byte[n];
    for (int j = 0; j < n; ++j) {
      out[j] = (byte) Bytes.select(valid, block[from + j], synthetic[from + j]);
    }
    return out;
  }

  private byte[] kdk(byte[] c) {
    return hmac(dHash, c);
  }

  /**
   * Decrypts a PKCS#1 v1.5 type 2 block.
   *
   * @param c the ciphertext, exactly {@link #size} bytes (the caller checks: public bytes)
   * @param expected the message length the layout requires, or -1 for any length
   */
  byte[] pkcs1(byte[] c, int expected) {
    final int k = size;
    byte[] block = raw(c);
    byte[] kdk = kdk(c);
    byte[] synthetic = prf(kdk, MESSAGE, k);
    final int syntheticLength = expected >= 0 ? expected : syntheticLength(kdk, k - 2 - 8);
    try {
      int ok = Bytes.zeroMask(block[0]) & Bytes.zeroMask((block[1] & 0xff) - 2);
      int zeroIndex = 0;
      int found = 0;
      for (int i = 2; i < k; ++i) {
        final int isZero = Bytes.zeroMask(block[i] & 0xff);
        zeroIndex = Bytes.select(~found & isZero, i, zeroIndex);
        found |= isZero;
      }
      ok &= ~Bytes.lessMask(zeroIndex, 2 + 8);  // at least 8 padding bytes; 0 if none found
      final int start = zeroIndex + 1;
      if (expected >= 0) ok &= Bytes.zeroMask(k - start - expected);
      return select(block, synthetic, ok, start, k - start, syntheticLength);
    } finally {
      Bytes.wipe(block, kdk, synthetic);
    }
  }

  /**
   * Decrypts a "Keyou" block: two ASCII digits of the message length m (the tens "digit" runs past
   * '9' from 100 on: it is read as a value), the m message bytes, random filler.
   *
   * @param c the ciphertext, exactly {@link #size} bytes
   */
  byte[] keyou(byte[] c) {
    final int k = size;
    byte[] block = raw(c);
    byte[] kdk = kdk(c);
    byte[] synthetic = prf(kdk, MESSAGE, k);
    final int syntheticLength = syntheticLength(kdk, k - 2 - 8);
    try {
      final int tens = (block[0] & 0xff) - '0';
      final int units = (block[1] & 0xff) - '0';
      final int m = tens * 10 + units;
      int ok = ~(tens >> 31) & ~(units >> 31) & Bytes.lessMask(units, 10);
      ok &= ~Bytes.zeroMask(m) & ~(m >> 31) & ~Bytes.lessMask(k, m + 2);
      return select(block, synthetic, ok, 2, Bytes.select(ok, m, 0), syntheticLength);
    } finally {
      Bytes.wipe(block, kdk, synthetic);
    }
  }

  /** A stand-in ciphertext for a value that could not be decoded, so the same work runs. */
  byte[] standIn() {
    byte[] c = new byte[size];
    c[size - 1] = 1;
    return c;
  }

  @Override
  public String toString() {
    return "Rsa[" + size * 8 + " bits]";
  }
}
