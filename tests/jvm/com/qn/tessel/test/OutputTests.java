package com.qn.tessel.test;

import static com.qn.tessel.plugin.QNKbdJniLib.*;
import static com.qn.tessel.test.JvmSuite.TIMESTAMP;
import static com.qn.tessel.test.JvmSuite.WIDTH;
import static com.qn.tessel.test.JvmSuite.HEIGHT;
import static com.qn.tessel.test.JvmSuite.keyboard;
import static com.qn.tessel.test.JvmSuite.serverContent;

import com.qn.tessel.server.EncryptedPinCode;
import com.qn.tessel.server.OpenException;
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

  static native byte[] masterPinKey(char selector);

  static final String SEP = "::::::::::";
  static final Set<Integer> NO_OUTPUT = Set.of(21, 65, 69, 76, 77, 78, 79, 83);
  static final Set<Integer> HASHED = Set.of(47, 48, 55, 59);
  /** Envelope types whose payload is the text (48 and 59 without a salt; the corpus always salts them). */
  static final java.util.function.IntPredicate TEXT_PAYLOAD = t -> !HASHED.contains(t) && !ForgeryTests.RSA_PAYLOAD.contains(t);

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
    CorpusTests.run();
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
        {patched(raw, raw.length - 20, raw[raw.length - 20] ^ 0x01), "Rejected", "3"},  // a timestamp digit
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
      Check.equal("0815 pin", Bank.open(48, new String(code, "US-ASCII"), false, "--challenge", "challenge-4711").get("content"),
          "opened alike by both command lines");
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
