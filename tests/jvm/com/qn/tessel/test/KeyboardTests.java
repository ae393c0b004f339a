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
 * touches on the test's main thread (the app's UI thread); the setters that shape a key press are
 * shown reaching the session (their rules are covered by the C++ input and settings suites). What was typed is read back the way the bank does: the content
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

    Check.test("number pads (type 1 with '.', type 2 digits only) and switch mode 1", () -> {
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
      setNativeSwitchMode(k.handle, (short) 1);
      k.type("a");
      Check.equal(0, k.tap(1.25 * k.kw, 3.5 * k.kh), "switch key opens the digits pad");
      k.typePad("12");
      Check.equal(0, k.tapPad(1, 3), "back to the full keyboard (not clear)");
      setNativeSwitchMode(k.handle, (short) 5);  // stored as 0: the switch key toggles symbols
      k.type("b+");
      expectTyped(k, "36a12b+");
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

  }
}
