package com.qn.tessel.test;

import static com.qn.tessel.test.JvmSuite.TIMESTAMP;

import java.util.Set;
import javax.crypto.Cipher;
import javax.crypto.spec.SecretKeySpec;

/**
 * Every encryption type 0..90 made by the library's own dispatcher (tests/jvm/native/
 * dispatch_helper.cpp links the core libTesselVIP.so is built from) and opened by both openers,
 * which must agree with each other and with what went in.
 */
final class DispatcherTypes {
  private DispatcherTypes() {}

  private static native String dispatch(int type, String app, String enc, String text, String timestamp);

  private static native byte[] masterPinKey(char selector);

  static final String SEP = "::::::::::";
  static final Set<Integer> NO_OUTPUT = Set.of(21, 65, 69, 76, 77, 78, 79, 83);
  static final Set<Integer> HASHED = Set.of(47, 48, 55, 59);

  /** Two-key triple-DES ECB encryption by the JDK, the way an issuer wraps keys. */
  static byte[] wrap(byte[] key16, byte[] data) throws Exception {
    byte[] key24 = new byte[24];
    System.arraycopy(key16, 0, key24, 0, 16);
    System.arraycopy(key16, 0, key24, 16, 8);
    Cipher c = Cipher.getInstance("DESede/ECB/NoPadding");
    c.init(Cipher.ENCRYPT_MODE, new SecretKeySpec(key24, "DESede"));
    return c.doFinal(data);
  }

  static void run() throws Exception {
    Check.test("every type the dispatcher makes is opened alike by both openers", () -> {
      final String text = "Tessel 7!";
      final String pin = "739182";
      final byte[] working = java.util.HexFormat.of().parseHex("3b1f6a0c9d2e4f5871a6c3e5d7092b4f");
      final String pinKey = "C4D5E6F708192A3B4C5D6E7F80912233";
      final String a = Oracles.hex(wrap(masterPinKey('1'), working), true);
      final String b = Oracles.hex(wrap(working, java.util.HexFormat.of().parseHex(pinKey)), true);
      int opened = 0;
      for (int type = 0; type <= 90; ++type) {
        String input = type == 38 ? pin : type == 68 ? "1" + SEP + a + SEP + b + SEP + pin
            : HASHED.contains(type) ? text + SEP + "pepper" + SEP + "S" : text;
        String out = dispatch(type, JvmSuite.appModulusHex, JvmSuite.encModulusHex, input, TIMESTAMP);
        Check.equal(NO_OUTPUT.contains(type), out == null, "type " + type + " makes an output");
        if (out == null) continue;
        Openers.Result r = Openers.open(type, out, true, "--pin-key", pinKey);
        String expected = type == 38 || type == 68 ? pin : type == 5 ? Oracles.hex(Oracles.digest("SHA-1", Oracles.ascii(text)), true)
            : HASHED.contains(type) ? Oracles.saltedHash(text, "pepper", 'S') : text;
        Check.equal(expected, r.get("content"), "content of type " + type + " " + r.stderr());
        String ts = r.get("timestamp");
        Check.isTrue(ts == null || ts.equals(TIMESTAMP), "timestamp of type " + type);
        if (r.exit() == 0 && expected.equals(r.get("content"))) ++opened;
      }
      Check.equal(91 - NO_OUTPUT.size(), opened, "types opened by both openers");
      System.out.println("    " + opened + " encryption types opened by both openers");
    });
  }
}
