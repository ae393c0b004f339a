package com.qn.tessel.server;

import java.nio.ByteBuffer;
import java.nio.CharBuffer;
import java.nio.charset.StandardCharsets;
import java.util.Arrays;

/**
 * Checks an opened output against the password the bank has on file.
 *
 * <p>When the app set a hash random with {@code setNativeHashRandom("1:" + salt)} or
 * {@code ("2:" + salt)}, the hashed types (47, 48, 55, 59) carry the salted value
 * {@code MD5hex(MD5hex(password) + salt)}: its characters 8..23 for "1:" (mode S), all 32 for
 * "2:" (mode F). Without a hash random they carry the password itself. Type 5 carries the
 * upper-case SHA-1 hex of the password; every other type the text. Passwords are taken as
 * {@code char[]} (encoded as UTF-8) so the caller can wipe them; every copy made here is wiped.
 *
 * <p>A mismatch must get the same answer as a rejected output ({@link OpenException.Rejected}):
 * a forged envelope must look exactly like a wrong password.
 */
public final class PasswordCheck {
  private PasswordCheck() {}

  static byte[] utf8(char[] password) {
    ByteBuffer b = StandardCharsets.UTF_8.encode(CharBuffer.wrap(password));
    byte[] out = new byte[b.remaining()];
    b.get(out);
    if (b.hasArray()) Bytes.wipe(b.array());
    return out;
  }

  /**
   * The salted value the hashed types carry.
   *
   * @param password the password
   * @param salt the salt (the hash random after its two-character prefix)
   * @param mode 'S' or 'F'
   * @return 16 (S) or 32 (F) lower-case hex digits; wipe them
   */
  public static char[] saltedValue(char[] password, String salt, char mode) {
    byte[] pw = utf8(password);
    byte[] value = saltedValue(pw, salt, mode);
    try {
      return Bytes.chars(value);
    } finally {
      Bytes.wipe(pw, value);
    }
  }

  private static byte[] saltedValue(byte[] password, String salt, char mode) {
    if (mode != 'S' && mode != 'F') throw new IllegalArgumentException("mode is S or F");
    byte[] d1 = Bytes.digest("MD5", password);
    char[] h1 = Bytes.toHex(d1, false);
    byte[] h1Bytes = Bytes.latin1(h1);
    byte[] d2 = Bytes.digest("MD5", h1Bytes, salt.getBytes(StandardCharsets.UTF_8));
    char[] h2 = Bytes.toHex(d2, false);
    try {
      return Bytes.latin1(mode == 'S' ? Arrays.copyOfRange(h2, 8, 24) : h2);
    } finally {
      Bytes.wipe(d1, h1Bytes, d2);
      Bytes.wipe(h1);
      Bytes.wipe(h2);
    }
  }

  /**
   * Whether an opened output was made from {@code password}, given the hash random the app set.
   *
   * @param opened an output opened by {@link TesselOpener#open}
   * @param password the stored password
   * @param hashRandom what the app passed to setNativeHashRandom ("1:salt" or "2:salt"), or null
   *     when it set none
   * @return true on a match; false when the content stayed sealed
   */
  public static boolean matches(Opened opened, char[] password, String hashRandom) {
    if (hashRandom == null || hashRandom.isEmpty()) return matches(opened, password, "", 'S');
    if (hashRandom.length() < 2 || hashRandom.charAt(1) != ':' || "12".indexOf(hashRandom.charAt(0)) < 0) {
      throw new IllegalArgumentException("a hash random starts with \"1:\" or \"2:\"");
    }
    return matches(opened, password, hashRandom.substring(2), hashRandom.charAt(0) == '1' ? 'S' : 'F');
  }

  /**
   * Whether an opened output was made from {@code password}, given the salt and mode.
   *
   * @param opened an output opened by {@link TesselOpener#open}
   * @param password the stored password
   * @param salt the salt, empty when the app set no hash random
   * @param mode 'S' or 'F' (ignored without a salt)
   * @return true on a match; false when the content stayed sealed
   */
  public static boolean matches(Opened opened, char[] password, String salt, char mode) {
    byte[] pw = utf8(password);
    try {
      return matches(opened, pw, salt, mode);
    } finally {
      Bytes.wipe(pw);
    }
  }

  /** The check on the password's bytes (the command line reads them from a file as they are). */
  static boolean matches(Opened opened, byte[] password, String salt, char mode) {
    if (!opened.contentOpened()) return false;
    final Types.Inner inner = Types.of(opened.type()).inner();
    byte[] expected;
    if ((inner == Types.Inner.HASHED || inner == Types.Inner.HASHED_RSA) && !salt.isEmpty()) {
      expected = saltedValue(password, salt, mode);
    } else if (inner == Types.Inner.TYPE5) {
      byte[] d = Bytes.digest("SHA-1", password);
      char[] hex = Bytes.toHex(d, true);
      expected = Bytes.latin1(hex);
      Bytes.wipe(d);
      Bytes.wipe(hex);
    } else {
      expected = password.clone();
    }
    try {
      return opened.contentEquals(expected);
    } finally {
      Bytes.wipe(expected);
    }
  }
}
