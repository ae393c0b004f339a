package com.qn.tessel.test;

import static com.qn.tessel.plugin.QNKbdJniLib.*;
import static com.qn.tessel.test.JvmSuite.TIMESTAMP;

import com.qn.tessel.server.Opened;
import com.qn.tessel.server.PasswordCheck;
import com.qn.tessel.server.TesselOpener;
import java.util.ArrayList;
import java.util.HexFormat;
import java.util.List;

/**
 * The shared corpus: outputs made by the library (the session's getNativeContent and
 * getNativePinContent through QNKbdJniLib, and every other type through the core's dispatcher)
 * with timestamps with and without ':' and spaces, every hash-random form and passwords holding
 * ':', opened by both command lines with the same options (Bank.open: identical exit codes and
 * printed lines) and by the Java API, each checked against what went in.
 */
final class CorpusTests {
  private CorpusTests() {}

  static final String[] TIMESTAMPS = {TIMESTAMP, "2024-01-01 12:00:00", " 12:00 "};

  /** With --timestamp, or for hex payloads, or a timestamp without ':', the fields are exactly what went in. */
  static void expectFields(Bank.Result r, String timestamp, String content, String what) {
    Check.equal(0, r.exit(), what + " " + r.stderr());
    Check.equal(timestamp, r.get("timestamp"), "timestamp, " + what);
    Check.equal(content, r.get("content"), "content, " + what);
  }

  static void run() throws Exception {
    Check.test("library outputs of every type and timestamp: both openers print the same lines", () -> {
      final String text = "Tessel 7!";
      final String pin = "739182";
      final byte[] working = HexFormat.of().parseHex("3b1f6a0c9d2e4f5871a6c3e5d7092b4f");
      final byte[] master = OutputTests.masterPinKey('1');
      final String[] keys68 = {"--master-key", Bank.hex(master, true), "--wrapped-working-key", OutputTests.wrap(master, working),
        "--wrapped-pin-key", OutputTests.wrap(working, HexFormat.of().parseHex("C4D5E6F708192A3B4C5D6E7F80912233"))};
      final String type68 = "1" + OutputTests.SEP + keys68[3] + OutputTests.SEP + keys68[5] + OutputTests.SEP + pin;
      int opened = 0;
      for (int type = 0; type <= 90; ++type) {
        final boolean hashed = OutputTests.HASHED.contains(type);
        final String input = type == 38 ? pin : type == 68 ? type68 : hashed ? text + OutputTests.SEP + "pep:per" + OutputTests.SEP + "S" : text;
        final String expected = type == 38 || type == 68 ? pin : type == 5 ? Bank.hex(Bank.digest("SHA-1", Bank.ascii(text)), true)
            : hashed ? Bank.saltedHash(text, "pep:per", 'S') : text;
        final boolean stamped = !List.of(3, 29, 30, 56, 73, 88).contains(type);
        for (String ts : TIMESTAMPS) {
          String out = OutputTests.dispatch(type, JvmSuite.appModulusHex, JvmSuite.encModulusHex, input, ts);
          Check.equal(OutputTests.NO_OUTPUT.contains(type), out == null, "type " + type + " makes an output");
          if (out == null) break;
          List<String> options = new ArrayList<>(List.of(keys68));
          if (hashed) options.addAll(List.of("--salt", "pep:per"));
          Bank.Result plain = Bank.open(type, out, true, options.toArray(new String[0]));
          if (!stamped) {
            expectFields(plain, type == 4 || type == 22 ? ts : null, expected, "type " + type);
            continue;
          }
          options.addAll(List.of("--timestamp", ts));
          Bank.Result given = Bank.open(type, out, true, options.toArray(new String[0]));
          expectFields(given, ts, expected, "type " + type + " with --timestamp '" + ts + "'");
          if (!ts.contains(":") || !OutputTests.TEXT_PAYLOAD.test(type)) expectFields(plain, ts, expected, "type " + type);
          if (given.exit() == 0 && expected.equals(given.get("content"))) ++opened;
        }
      }
      Check.equal(3 * (91 - OutputTests.NO_OUTPUT.size() - 6), opened, "outputs opened by both openers");
    });

    try (EglContext gl = new EglContext(JvmSuite.WIDTH, JvmSuite.HEIGHT)) {
      Check.test("session outputs: every hash-random form, passwords and timestamps holding ':'", () -> sessions(gl));
    }
  }

  private static void sessions(EglContext gl) throws Exception {
    JvmSuite.destroyAll();
    final String password = "pa:ss 7";
    KeyboardDriver k = JvmSuite.keyboard(gl, "corpus");
    k.type(password);
    Check.equal(1, setNativePublicKeyModulus(k.handle, JvmSuite.encModulusHex), "encryption key");
    final String[][] forms = {{"", "", "S"}, {"1:pepper", "pepper", "S"}, {"2:pepper", "pepper", "F"}, {"1:salt:with:colons", "salt:with:colons", "S"}};
    for (String[] f : forms) {
      if (!f[0].isEmpty()) setNativeHashRandom(k.handle, f[0]);
      final String expected = f[0].isEmpty() ? password : Bank.saltedHash(password, f[1], f[2].charAt(0));
      for (String ts : TIMESTAMPS) {
        for (int type : new int[] {47, 48}) {
          String out = type == 47 ? getNativePinContent(k.handle, ts) : getNativeContent(k.handle, ts);
          List<String> options = new ArrayList<>(List.of("--timestamp", ts));
          if (!f[0].isEmpty()) options.addAll(List.of("--salt", f[1], "--mode", f[2]));
          final String what = "type " + type + " '" + f[0] + "' '" + ts + "'";
          expectFields(Bank.open(type, out, type == 47, options.toArray(new String[0])), ts, expected, what);
          options.addAll(List.of("--password", password));
          Check.equal("match", Bank.open(type, out, true, options.toArray(new String[0])).get("password"), what);
          options.set(options.size() - 1, password + "x");
          Bank.Result wrong = Bank.open(type, out, true, options.toArray(new String[0]));
          Check.equal("3||tessel_open: output rejected", wrong.exit() + "|" + wrong.stdout() + "|" + wrong.stderr(), "wrong password, " + what);
          try (Opened o = JvmSuite.opener.open(type, out, new TesselOpener.Options(!f[0].isEmpty(), ts))) {
            Check.isTrue(PasswordCheck.matches(o, password.toCharArray(), f[0]), "library: match, " + what);
            Check.isTrue(!PasswordCheck.matches(o, "pa:ss 8".toCharArray(), f[0]), "library: mismatch, " + what);
          }
        }
      }
    }
    Check.equal(3, Bank.open(47, getNativeContent(k.handle, TIMESTAMP), false).exit(), "a type-48 envelope opened as 47");
    clearNativePlaintext(k.handle);
    Check.equal(null, getNativeContent(k.handle, TIMESTAMP), "an empty password cannot be hashed");
    Check.equal("The format of the text is wrong!", getNativeLastError(k.handle), "its error");
    destroyNativeSession(k.handle);
  }
}
