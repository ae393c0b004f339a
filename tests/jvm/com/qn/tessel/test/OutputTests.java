package com.qn.tessel.test;

import static com.qn.tessel.plugin.QNKbdJniLib.*;
import static com.qn.tessel.test.JvmSuite.TIMESTAMP;
import static com.qn.tessel.test.JvmSuite.WIDTH;
import static com.qn.tessel.test.JvmSuite.HEIGHT;
import static com.qn.tessel.test.JvmSuite.keyboard;
import static com.qn.tessel.test.JvmSuite.serverContent;

import com.qn.tessel.server.EncryptedPinCode;
import com.qn.tessel.server.OpenException;
import com.qn.tessel.server.Opened;
import com.qn.tessel.server.PasswordCheck;
import com.qn.tessel.server.TesselOpener;
import java.util.Base64;
import java.util.HexFormat;
import java.util.Set;
import javax.crypto.Cipher;
import javax.crypto.spec.SecretKeySpec;

/**
 * Typing through setNativeTouchPos (surface callbacks on their own GL thread, touches on the
 * test's main thread as on an app's UI thread; the rules are the C++ suites' business) and what
 * an app then gets out of the session, checked against independent parties: the envelopes of
 * getNativeContent / getNativePinContent and of every other type the dispatcher makes (through
 * tests/jvm/native/dispatch_helper.cpp, on the core libTesselVIP.so is built from) opened by both
 * server-side openers, which must agree with each other and with what went in; the encrypted PIN
 * code against RC4 over the JVM's SHA-1, the measure value and salted values against its MD5,
 * and the last-error texts.
 */
final class OutputTests {
  private OutputTests() {}

  /** Opens getNativePinContent (type 47) with both openers; returns the opened content or null. */
  static String pinContent(KeyboardDriver k) throws Exception {
    String out = getNativePinContent(k.handle, TIMESTAMP);
    if (out == null) return null;
    Bank.Result r = Bank.open(47, out, true);
    Check.equal(0, r.exit(), "type 47 opened: " + r.stderr());
    Check.equal(TIMESTAMP, r.get("timestamp"), "timestamp");
    Check.equal(String.valueOf((char) getNativeDegree(k.handle)), r.get("strength"),
        "the envelope's strength letter is the session's degree");
    return r.get("content");
  }

  /** The class of a refusal: the Java opener's exception, the C++ opener's message read alike. */
  static String refusal(String cppMessage) {
    final String[][] classes = {{"base64", "BadEncoding"}, {"longer than", "TooLong"}, {"truncated|after its content", "Truncated"},
      {"header|8-digit|8 digits|too small", "WrongHeader"}, {"bits|bytes does not match", "WrongKey"}, {"^tessel_open: output rejected$", "Rejected"}};
    for (String[] c : classes) {
      if (java.util.regex.Pattern.compile(c[0]).matcher(cppMessage).find()) return c[1];
    }
    return cppMessage;
  }

  static String patched(byte[] raw, int at, int value) {
    byte[] b = raw.clone();
    b[at] = (byte) value;
    return Base64.getEncoder().encodeToString(b);
  }

  static String javaRefusal(int type, String output) {
    try {
      JvmSuite.opener.open(type, output, new TesselOpener.Options(false, TIMESTAMP)).close();
      return "opened";
    } catch (OpenException e) {
      return e.getClass().getSimpleName();
    }
  }

  static native String dispatch(int type, String app, String enc, String text, String timestamp);

  private static native byte[] masterPinKey(char selector);

  static final String SEP = "::::::::::";
  static final Set<Integer> NO_OUTPUT = Set.of(21, 65, 69, 76, 77, 78, 79, 83);
  static final Set<Integer> HASHED = Set.of(47, 48, 55, 59);

  /** Two-key triple-DES ECB encryption by the JDK, the way an issuer wraps keys. */
  static String wrap(byte[] key16, byte[] data) throws Exception {
    byte[] key24 = HexFormat.of().parseHex(HexFormat.of().formatHex(key16) + HexFormat.of().formatHex(key16, 0, 8));
    Cipher c = Cipher.getInstance("DESede/ECB/NoPadding");
    c.init(Cipher.ENCRYPT_MODE, new SecretKeySpec(key24, "DESede"));
    return Bank.hex(c.doFinal(data), true);
  }

  static void expectTyped(KeyboardDriver k, String text) throws Exception {
    Check.equal(text.length(), getNativeContentLen(k.handle), "length of '" + text + "'");
    Check.equal(text, serverContent(k.handle), "content opened by the server");
    Check.equal(text.isEmpty() ? null : Bank.md5Hex(text), getNativeMeasureValue(k.handle), "measure value");
  }

  static void run() throws Exception {
    try (EglContext gl = new EglContext(WIDTH, HEIGHT)) {
      cases(gl);
    }
    Check.test("every type the dispatcher makes is opened alike by both openers", () -> {
      final String text = "Tessel 7!";
      final String pin = "739182";
      final byte[] working = HexFormat.of().parseHex("3b1f6a0c9d2e4f5871a6c3e5d7092b4f");
      final String[] keys68 = {"--master-key", Bank.hex(masterPinKey('1'), true), "--wrapped-working-key",
        wrap(masterPinKey('1'), working), "--wrapped-pin-key", wrap(working, HexFormat.of().parseHex("C4D5E6F708192A3B4C5D6E7F80912233"))};
      final String type68 = "1" + SEP + keys68[3] + SEP + keys68[5] + SEP + pin;
      int opened = 0;
      for (int type = 0; type <= 90; ++type) {
        String input = type == 38 ? pin : type == 68 ? type68 : HASHED.contains(type) ? text + SEP + "pepper" + SEP + "S" : text;
        String out = dispatch(type, JvmSuite.appModulusHex, JvmSuite.encModulusHex, input, TIMESTAMP);
        Check.equal(NO_OUTPUT.contains(type), out == null, "type " + type + " makes an output");
        if (out == null) continue;
        Bank.Result r = Bank.open(type, out, true, keys68);  // both derive the PIN key
        String expected = type == 38 || type == 68 ? pin
            : type == 5 ? Bank.hex(Bank.digest("SHA-1", Bank.ascii(text)), true)
            : HASHED.contains(type) ? Bank.saltedHash(text, "pepper", 'S') : text;
        Check.equal(expected, r.get("content"), "content of type " + type + " " + r.stderr());
        Check.isTrue(r.get("timestamp") == null || r.get("timestamp").equals(TIMESTAMP), "timestamp of type " + type);
        if (r.exit() == 0 && expected.equals(r.get("content"))) ++opened;
      }
      Check.equal(91 - NO_OUTPUT.size(), opened, "types opened by both openers");
      // A timestamp holding ':' is found by splitting a hex payload at its last ':'.
      Opened o = JvmSuite.opener.open(10, dispatch(10, JvmSuite.appModulusHex, JvmSuite.encModulusHex, text, "12:00:00"));
      Check.equal(text + "@12:00:00", new String(o.content(), "ISO-8859-1") + "@" + o.timestamp(), "timestamp with ':', library");
      System.out.println("    " + opened + " encryption types opened by both openers");
    });
  }

  private static void cases(EglContext gl) throws Exception {
    Check.test("a password typed through key centres, with shift, symbols and space; its envelope", () -> {
      JvmSuite.destroyAll();
      KeyboardDriver k = keyboard(gl, "password");
      Check.equal("No Error!", getNativeLastError(k.handle), "before any output");
      final String text = "Tessel 7!x{q}";
      k.type(text);
      expectTyped(k, text);
      Check.equal("No Error!", getNativeLastError(k.handle), "after a success");
      String out = getNativeContent(k.handle, TIMESTAMP);
      Check.equal("S", Bank.open(48, out, false).get("strength"), "strength letter");
      Check.isTrue(!out.equals(getNativeContent(k.handle, TIMESTAMP)), "a fresh session key every call");
      Check.equal(null, getNativeContent(k.handle, null), "no timestamp");
      Check.equal("The timestamp is missing!", getNativeLastError(k.handle), "its error");
      Check.equal(null, getNativePinContent(k.handle, TIMESTAMP), "PIN content without an encryption key");
      Check.equal("The encryption platform modulus is missing!", getNativeLastError(k.handle), "its error");
      Check.equal(0, k.deleteKey(), "delete");
      expectTyped(k, text.substring(0, text.length() - 1));
      Check.equal(TOUCH_DONE, k.doneKey(), "done");
      Check.equal(0, clearNativePlaintext(k.handle), "clear");
      expectTyped(k, "");
      destroyNativeSession(k.handle);
    });

    Check.test("salted values of both outputs, each hash-random form, checked against the password", () -> {
      JvmSuite.destroyAll();
      KeyboardDriver k = keyboard(gl, "hash");
      k.type("secret9");
      Check.equal(1, setNativePublicKeyModulus(k.handle, JvmSuite.encModulusHex), "encryption key");
      final String[][] forms = {{"1:pepper", "pepper", "S"}, {"2:salt:with:colons", "salt:with:colons", "F"}};
      for (String[] f : forms) {
        setNativeHashRandom(k.handle, f[0]);
        final char mode = f[2].charAt(0);
        Check.equal(Bank.saltedHash("secret9", f[1], mode), serverContent(k.handle), "type 48, " + f[0]);
        Check.equal(Bank.saltedHash("secret9", f[1], mode), pinContent(k), "type 47, " + f[0]);
        for (int type : new int[] {47, 48}) {
          String out = type == 47 ? getNativePinContent(k.handle, TIMESTAMP) : getNativeContent(k.handle, TIMESTAMP);
          Opened o = JvmSuite.opener.open(type, out);
          Check.isTrue(PasswordCheck.matches(o, "secret9".toCharArray(), f[0]), "library: match, type " + type + " " + f[0]);
          Check.isTrue(!PasswordCheck.matches(o, "secret8".toCharArray(), f[0]), "library: mismatch, type " + type);
          Check.isTrue(!PasswordCheck.matches(o, "secret9".toCharArray(), (mode == 'S' ? "2:" : "1:") + f[1]), "library: other mode");
          for (String pw : new String[] {"secret9", "secret8"}) {
            Bank.Result r = Bank.open(type, out, type == 47, "--password", pw, "--salt", f[1], "--mode", f[2]);
            Check.equal(pw.equals("secret9") ? 0 : 3, r.exit(), "openers' password check, type " + type + " " + pw);
          }
        }
      }
      // A type-48 envelope offered as type 47 without the encryption key: its payload is no RSA value.
      String out48 = getNativeContent(k.handle, TIMESTAMP);
      Check.equal("Rejected", javaRefusal(47, out48), "library refuses 48 as 47");
      Check.equal(3, Bank.open(47, out48, false).exit(), "both openers refuse 48 as 47");
      clearNativePlaintext(k.handle);
      Check.equal(null, getNativeContent(k.handle, TIMESTAMP), "an empty password cannot be hashed");
      Check.equal("The format of the text is wrong!", getNativeLastError(k.handle), "its error");
      destroyNativeSession(k.handle);
    });

    Check.test("corrupt and foreign envelopes: both openers refuse alike; after the RSA step, one answer", () -> {
      JvmSuite.destroyAll();
      KeyboardDriver k = keyboard(gl, "corrupt");
      k.type("ab1!cd");
      final String out = getNativeContent(k.handle, TIMESTAMP);
      final byte[] raw = Base64.getDecoder().decode(out);
      final String[][] table = {  // corrupted output, class of refusal, exit code
        {out.substring(0, 30) + "*" + out.substring(31), "BadEncoding", "1"},
        {out + "-ANYTHING<script>", "BadEncoding", "1"},
        {out.substring(0, out.length() - 2), "BadEncoding", "1"},  // unpadded
        {out.substring(0, out.length() - 3) + (char) (out.charAt(out.length() - 3) + 1) + "==", "BadEncoding", "1"},
        {"A".repeat(65537), "TooLong", "1"},
        {out.substring(0, out.length() - 8), "Truncated", "1"},
        {Base64.getEncoder().encodeToString(java.util.Arrays.copyOf(raw, raw.length + 3)), "Truncated", "1"},
        {patched(raw, 9, raw[9] ^ 0x04), "WrongHeader", "1"},
        {patched(raw, 3, 'x'), "WrongHeader", "1"},
        {patched(raw, 40, raw[40] ^ 0x01), "Rejected", "3"},
        {patched(raw, raw.length - 1, raw[raw.length - 1] ^ 0x20), "Rejected", "3"},
      };
      Check.isTrue(out.endsWith("=="), "a 1-byte tail: its last symbol has 4 unused bits, zero when canonical");
      for (String[] row : table) {
        Bank.Result r = Bank.open(48, row[0], false, "--timestamp", TIMESTAMP);
        Check.equal(Integer.parseInt(row[2]), r.exit(), "both refuse: " + row[1]);
        if (r.exit() != 0) Check.equal(row[1], refusal(r.stderr()), "C++ class of the refusal");
        Check.equal(row[1], javaRefusal(48, row[0]), "Java class of the refusal");
      }
      // Sealed for another key of the same size: the encryption key's private half.
      Bank.Result r = Bank.cpp(java.util.List.of("--key", Bank.encKeyPem, "-"), out);
      Bank.Result j = Bank.java(java.util.List.of("--key", Bank.encKeyPem, "-"), out);
      Check.equal("3 tessel_open: output rejected|3 tessel-server: output rejected", r.exit() + " " + r.stderr() + "|"
          + j.exit() + " " + j.stderr(), "a foreign key of the same size");
      destroyNativeSession(k.handle);
    });

    Check.test("encrypted PIN code is RC4 under SHA-1 of the challenge", () -> {
      JvmSuite.destroyAll();
      KeyboardDriver k = keyboard(gl, "pincode");
      Check.equal(null, getNativeEncryptedPinCode(k.handle), "no challenge code");
      Check.equal("Challenge code is empty", getNativeLastError(k.handle), "its error");
      byte[] challenge = Bank.ascii("challenge-4711");
      setNativeChallengeCode(k.handle, challenge);
      Check.equal(null, getNativeEncryptedPinCode(k.handle), "no text typed");
      Check.equal("Encryption error", getNativeLastError(k.handle), "its error");
      k.type("0815 pin");
      byte[] code = getNativeEncryptedPinCode(k.handle);
      Check.equal(Bank.encryptedPinCode(challenge, "0815 pin"), code, "code");
      Check.equal(Bank.ascii("0815 pin"), EncryptedPinCode.open(challenge, new String(code, "US-ASCII")), "opened by the library");
      Check.equal("No Error!", getNativeLastError(k.handle), "after a success");
      final byte[] high = {(byte) 0xC3, (byte) 0xA9, (byte) 0xFF, 0x7F};
      final byte[][][] challenges = {  // set, then the challenge in force: a zero byte ends one, bytes
        {{'a', 'b', 0, 'c'}, {'a', 'b'}}, {high, high}};  // above 0x7F are taken as they are
      for (byte[][] c : challenges) {
        setNativeChallengeCode(k.handle, c[0]);
        Check.equal(Bank.encryptedPinCode(c[1], "0815 pin"), getNativeEncryptedPinCode(k.handle),
            "challenge " + java.util.Arrays.toString(c[0]));
      }
      code = getNativeEncryptedPinCode(k.handle);
      Check.isTrue(code != null && code[code.length - 1] != 0, "no terminator in the array");
      destroyNativeSession(k.handle);
    });
  }
}
