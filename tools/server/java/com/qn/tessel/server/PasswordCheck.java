package com.qn.tessel.server;

import java.nio.charset.StandardCharsets;
import java.security.MessageDigest;

/**
 * Checks an opened output against the password the bank has on file.
 *
 * <p>When the app set a hash random with {@code setNativeHashRandom("1:" + salt)} or
 * {@code ("2:" + salt)}, the hashed types (47, 48, 55, 59) carry the salted value
 * {@code MD5hex(MD5hex(password) + salt)}: its characters 8..23 for "1:" (mode S), all 32 for
 * "2:" (mode F). Without a hash random they carry the password itself. Type 5 carries the
 * upper-case SHA-1 hex of the password; every other type the text.
 */
public final class PasswordCheck {
  private PasswordCheck() {}

  /**
   * The salted value the hashed types carry.
   *
   * @param password the password
   * @param salt the salt (the hash random after its two-character prefix)
   * @param mode 'S' or 'F'
   * @return 16 (S) or 32 (F) lower-case hex digits
   */
  public static String saltedValue(String password, String salt, char mode) {
    if (mode != 'S' && mode != 'F') throw new IllegalArgumentException("mode is S or F");
    byte[] pw = password.getBytes(StandardCharsets.UTF_8);
    byte[] d1 = Bytes.digest("MD5", pw);
    byte[] h1 = (Bytes.toHex(d1, false) + salt).getBytes(StandardCharsets.UTF_8);
    byte[] d2 = Bytes.digest("MD5", h1);
    String h2 = Bytes.toHex(d2, false);
    Bytes.wipe(pw, d1, h1, d2);
    return mode == 'S' ? h2.substring(8, 24) : h2;
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
  public static boolean matches(Opened opened, String password, String hashRandom) {
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
  public static boolean matches(Opened opened, String password, String salt, char mode) {
    if (!opened.contentOpened()) return false;
    final Types.Inner inner = Types.of(opened.type()).inner;
    final String expected;
    if ((inner == Types.Inner.HASHED || inner == Types.Inner.HASHED_RSA) && !salt.isEmpty()) {
      expected = saltedValue(password, salt, mode);
    } else if (inner == Types.Inner.TYPE5) {
      byte[] pw = password.getBytes(StandardCharsets.UTF_8);
      byte[] d = Bytes.digest("SHA-1", pw);
      expected = Bytes.toHex(d, true);
      Bytes.wipe(pw, d);
    } else {
      expected = new String(password.getBytes(StandardCharsets.UTF_8), StandardCharsets.ISO_8859_1);
    }
    byte[] a = Bytes.latin1(expected);
    byte[] b = Bytes.latin1(opened.content());
    try {
      return MessageDigest.isEqual(a, b);  // time independent of where they differ
    } finally {
      Bytes.wipe(a, b);
    }
  }
}
