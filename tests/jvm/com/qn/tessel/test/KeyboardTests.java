package com.qn.tessel.test;

import static com.qn.tessel.plugin.QNKbdJniLib.*;
import static com.qn.tessel.test.JvmSuite.HEIGHT;
import static com.qn.tessel.test.JvmSuite.WIDTH;
import static com.qn.tessel.test.JvmSuite.keyboard;
import static com.qn.tessel.test.JvmSuite.serverContent;
import static com.qn.tessel.test.JvmSuite.surface;

import java.util.Arrays;

/**
 * Typing through setNativeTouchPos, with the surface callbacks on their own GL thread and the
 * touches on the test's main thread (the app's UI thread), and every setter that shapes what a
 * key press does, each shown reaching the session once (the rules themselves are covered by the
 * C++ input and settings suites). What was typed is read back the way the bank does: the content
 * is opened by the server-side tool, and the measure value is compared with the JVM's MD5.
 */
final class KeyboardTests {
  private KeyboardTests() {}

  static void expectTyped(KeyboardDriver k, String text) throws Exception {
    Check.equal(text.length(), getNativeContentLen(k.handle), "length of '" + text + "'");
    Check.equal(text, serverContent(k.handle), "content opened by the server");
    Check.equal(text.isEmpty() ? null : Oracles.md5Hex(text), getNativeMeasureValue(k.handle), "measure value");
  }

  /** A session set up before its surface exists: settings that apply when the layout is built. */
  static KeyboardDriver unbuilt(EglContext gl, String name, String accepts, short style, boolean random)
      throws Exception {
    int h = createNativeSession(name);
    setNativeMaxLength(h, (short) 64);
    setNativeAccepts(h, accepts);
    setNativeKbdStyle(h, style);
    setNativeKbdRandom(h, random);
    surface(gl, h);
    return new KeyboardDriver(h, WIDTH, HEIGHT);
  }

  private static String sorted(String s) {
    char[] c = s.toCharArray();
    Arrays.sort(c);
    return new String(c);
  }

  static void run() throws Exception {
    try (EglContext gl = new EglContext(WIDTH, HEIGHT)) {
      System.out.println("    GL renderer: " + gl.renderer());
      cases(gl);
    }
  }

  private static void cases(EglContext gl) throws Exception {
    Check.test("a password typed through key centres, with shift, symbols and space", () -> {
      JvmSuite.destroyAll();
      KeyboardDriver k = keyboard(gl, "password");
      final String text = "Tessel 7!x{q}";
      k.type(text);
      expectTyped(k, text);
      Check.equal(k.handle, createNativeSession("password"), "create with the same name finds the session");
      Check.equal(0, k.deleteKey(), "delete");
      expectTyped(k, text.substring(0, text.length() - 1));
      Check.equal(TOUCH_DONE, k.doneKey(), "done");
      Check.equal(0, clearNativePlaintext(k.handle), "clear");
      expectTyped(k, "");
      destroyNativeSession(k.handle);
    });

    Check.test("touches that are not key releases, and odd floats", () -> {
      JvmSuite.destroyAll();
      KeyboardDriver k = keyboard(gl, "touches");
      final float mx = (float) (k.kw / 10);
      final float y = (float) (0.5 * k.kh);
      Check.equal(-1, setNativeTouchPos(k.handle, TOUCH_UP, mx - 0.01f, y), "up inside the left margin");
      Check.equal(0, setNativeTouchPos(k.handle, TOUCH_UP, mx, y), "up exactly at the margin is a key");
      Check.equal(-1, setNativeTouchPos(k.handle, TOUCH_MOVE, 100f, y), "move");
      Check.equal(-1, setNativeTouchPos(k.handle, 3, 100f, y), "unknown action 3");
      Check.equal(-1, setNativeTouchPos(k.handle, -1, 100f, y), "unknown action -1");
      Check.equal(-1, setNativeTouchPos(k.handle, TOUCH_UP, Float.NaN, y), "NaN x");
      Check.equal(-1, setNativeTouchPos(k.handle, TOUCH_UP, Float.POSITIVE_INFINITY, y), "infinite x");
      Check.equal(-1, setNativeTouchPos(k.handle, TOUCH_UP, 100f, Float.NaN), "NaN y");
      Check.equal(0, k.tap(0.2 * k.kw, 1.5 * k.kh), "row 1 left dead zone releases nothing");
      expectTyped(k, "q");  // only the up exactly at the margin typed
      destroyNativeSession(k.handle);
    });

    Check.test("maximum length and accepts pattern filter every key", () -> {
      JvmSuite.destroyAll();
      KeyboardDriver k = unbuilt(gl, "limits", null, STYLE_LOWER, false);
      k.type("ab");
      Check.equal(0, getNativeContentLen(k.handle), "no pattern set: nothing is typed");
      setNativeAccepts(k.handle, "[:digit:]{0,4}");
      setNativeAccepts(k.handle, null);  // ignored
      k.type("1a2 b3!45");
      expectTyped(k, "1234");
      setNativeAccepts(k.handle, "[:print:]*");
      setNativeMaxLength(k.handle, (short) 6);
      setNativeMaxLength(k.handle, (short) -1);  // ignored
      k.type("abcd");
      expectTyped(k, "1234ab");
      setNativeMaxLength(k.handle, (short) 0);
      k.type("h");
      Check.equal(6, getNativeContentLen(k.handle), "maximum 0 adds nothing");
      destroyNativeSession(k.handle);
    });

    Check.test("keyboard style: upper case, symbol pages", () -> {
      JvmSuite.destroyAll();
      KeyboardDriver k = keyboard(gl, "style");
      setNativeKbdStyle(k.handle, STYLE_UPPER);  // shift at once
      Check.equal(0, k.tapPosition(0), "Q");
      setNativeKbdStyle(k.handle, (short) -1);  // odd negative style: shifted too
      Check.equal(0, k.tapPosition(1), "W");
      setNativeKbdStyle(k.handle, STYLE_LOWER);
      Check.equal(0, k.tapPosition(2), "e");
      expectTyped(k, "QWe");
      destroyNativeSession(k.handle);
      // The page applies when the layout is built: set before the surface exists.
      KeyboardDriver s = unbuilt(gl, "style-symbols", "[:print:]*", STYLE_SYMBOLS_2, false);
      s.symbolPage = true;
      s.shift = true;
      s.type("{5?*a");
      expectTyped(s, "{5?*a");
      destroyNativeSession(s.handle);
    });

    Check.test("switch mode 1 opens the digits pad and its function key returns", () -> {
      JvmSuite.destroyAll();
      KeyboardDriver k = keyboard(gl, "switch");
      setNativeSwitchMode(k.handle, (short) 1);
      k.type("a");
      Check.equal(0, k.tap(1.25 * k.kw, 3.5 * k.kh), "switch key");
      k.typePad("12");
      Check.equal(0, k.tapPad(1, 3), "back to the full keyboard (not clear)");
      k.type("b");
      setNativeSwitchMode(k.handle, (short) 5);  // stored as 0: the switch key toggles symbols
      k.type("+c");
      expectTyped(k, "a12b+c");
      destroyNativeSession(k.handle);
    });

    Check.test("number pads: type 1 with '.', type 2 digits only", () -> {
      JvmSuite.destroyAll();
      KeyboardDriver k = keyboard(gl, "pad");
      setNativeKbdType(k.handle, KBD_PAD_WITH_POINT);
      k.typePad("90.5");
      Check.equal(0, k.tapPad(0, 3), "pad delete");
      expectTyped(k, "90.");
      Check.equal(TOUCH_DONE, k.tapPad(3, 2), "row 3 column 2 is done on type 1");
      Check.equal(0, k.tapPad(1, 3), "clear");
      setNativeKbdType(k.handle, KBD_PAD_DIGITS);
      k.typePad("36");
      Check.equal(0, k.tapPad(3, 1), "'.' is inert on type 2");
      Check.equal(TOUCH_DONE, k.tapPad(3, 3), "done covers rows 2 and 3 of column 3");
      setNativeKbdType(k.handle, KBD_FULL);
      k.type("z");
      expectTyped(k, "36z");
      destroyNativeSession(k.handle);
    });

    Check.test("finish mode decides whether done makes the next surface rebuild the layout", () -> {
      JvmSuite.destroyAll();
      KeyboardDriver k = keyboard(gl, "finish");
      // A style set now shows only after a rebuild, which makes the rebuild visible.
      setNativeKbdStyle(k.handle, STYLE_SYMBOLS);
      setNativeFinishMode(k.handle, (short) 1);
      Check.equal(TOUCH_DONE, k.doneKey(), "done, finish mode 1");
      surface(gl, k.handle);
      Check.equal(0, k.tapPosition(0), "position 0");
      setNativeFinishMode(k.handle, (short) 9);  // stored as 0
      Check.equal(TOUCH_DONE, k.doneKey(), "done, finish mode 0");
      Check.equal(0, k.tapPosition(0), "before the surface is created again the old layout stays");
      surface(gl, k.handle);
      Check.equal(0, k.tapPosition(0), "position 0 after the rebuild");
      expectTyped(k, "qq1");
      destroyNativeSession(k.handle);
    });

    Check.test("random layout shuffles keys within their rows", () -> {
      JvmSuite.destroyAll();
      KeyboardDriver k = unbuilt(gl, "random", "[:print:]*", STYLE_LOWER, true);
      for (int p = 0; p < 26; ++p) k.tapPosition(p);
      String typed = String.valueOf(serverContent(k.handle));
      Check.equal(sorted("qwertyuiop") + sorted("asdfghjkl") + sorted("zxcvbnm"),
          typed.length() != 26 ? typed
              : sorted(typed.substring(0, 10)) + sorted(typed.substring(10, 19)) + sorted(typed.substring(19)),
          "each row keeps its letters");
      Check.isTrue(!typed.equals("qwertyuiopasdfghjklzxcvbnm"), "the order changed: " + typed);
      destroyNativeSession(k.handle);
    });

    Check.test("settings that only store: mode, encrypt type, factor, algorithm, vibrator, app key, ECC", () -> {
      JvmSuite.destroyAll();
      KeyboardDriver k = keyboard(gl, "stored");
      for (short m : new short[] {0, 1, 2, 4, -1, Short.MAX_VALUE}) setNativeMode(k.handle, m);
      for (byte t : new byte[] {0, 47, 48, 90, (byte) 200, -1}) setNativeEncryptType(k.handle, t);
      for (String f : new String[] {"", "0", "1", "2xyz", "0", "9"}) setNativeKbdFactor(k.handle, f);
      for (String c : new String[] {"", "123", ""}) setNativeAlgorithmCode(k.handle, c);
      setNativeKbdVibrator(k.handle, 1);
      setNativeKbdVibrator(k.handle, -7);
      setNativeAppPlat(k.handle, JvmSuite.encModulusHex, false);
      setNativeAppPlat(k.handle, "3003020100", true);
      Check.equal(1, setNativePublicKeyAppModulus(k.handle, JvmSuite.encModulusHex), "app modulus");
      Check.equal(1, setNativePublicKeyAppDER(k.handle, "3003020100"), "app DER (refused, still 1)");
      Check.equal(1, setNativePublicKeyAppBlob(k.handle, "XYZ"), "app blob, unreadable (still 1)");
      Check.equal(1, setNativePublicKeyECC(k.handle, "04AB", "CDEF0123456789"), "ECC, y longer than x");
      Check.equal(1, setNativePublicKeyECC(k.handle, "", ""), "ECC, empty");
      // None of these changes typing or the output, which keeps using the built-in key.
      k.type("stored1");
      expectTyped(k, "stored1");
      destroyNativeSession(k.handle);
    });
  }
}
