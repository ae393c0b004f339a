package com.qn.tessel.test;

import static com.qn.tessel.plugin.QNKbdJniLib.*;
import static com.qn.tessel.test.JvmSuite.HEIGHT;
import static com.qn.tessel.test.JvmSuite.WIDTH;
import static com.qn.tessel.test.JvmSuite.keyboard;
import static com.qn.tessel.test.JvmSuite.serverContent;

/**
 * Typing through setNativeTouchPos, with the surface callbacks on their own GL thread and the
 * touches on the test's main thread (the app's UI thread); the setters that shape a key press are
 * shown reaching the session (their rules are covered by the C++ input and settings suites). What
 * was typed is read back the way the bank does, by both openers, and the measure value is
 * compared with the JVM's MD5.
 */
final class KeyboardTests {
  private KeyboardTests() {}

  static void expectTyped(KeyboardDriver k, String text) throws Exception {
    Check.equal(text.length(), getNativeContentLen(k.handle), "length of '" + text + "'");
    Check.equal(text, serverContent(k.handle), "content opened by the server");
    Check.equal(text.isEmpty() ? null : Oracles.md5Hex(text), getNativeMeasureValue(k.handle), "measure value");
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
      setNativeMaxLength(k.handle, (short) text.length());
      setNativeMaxLength(k.handle, (short) -1);  // ignored
      k.type("z");
      Check.equal(text.length(), getNativeContentLen(k.handle), "the maximum length stops a key");
      Check.equal(0, k.deleteKey(), "delete");
      expectTyped(k, text.substring(0, text.length() - 1));
      Check.equal(TOUCH_DONE, k.doneKey(), "done");
      Check.equal(0, clearNativePlaintext(k.handle), "clear");
      expectTyped(k, "");
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
  }
}
