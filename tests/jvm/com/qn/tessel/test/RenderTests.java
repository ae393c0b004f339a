package com.qn.tessel.test;

import static com.qn.tessel.plugin.QNKbdJniLib.*;
import static com.qn.tessel.test.JvmSuite.HEIGHT;
import static com.qn.tessel.test.JvmSuite.WIDTH;
import static com.qn.tessel.test.JvmSuite.keyboard;

/**
 * The three GL surfaces driven from Java as an app's renderers drive them: each on its own
 * thread with its own offscreen GLES 1.1 context (Mesa), the touches on the main thread. The
 * pictures themselves are checked key by key in the C++ render suites; these cases check that
 * the settings set through the native methods (kbdMode, popMode, keyboard type, variant) reach
 * the renderer and that every draw entry point draws.
 */
final class RenderTests {
  private RenderTests() {}

  /** A frame read back top row first, with pixel access in the app's touch coordinates. */
  record Frame(byte[] rgba, int width, int height) {
    int pixel(double x, double y) {
      int px = Math.min(width - 1, Math.max(0, (int) x));
      int py = Math.min(height - 1, Math.max(0, (int) y));
      int at = (py * width + px) * 4;
      return ((rgba[at] & 0xff) << 24) | ((rgba[at + 1] & 0xff) << 16) | ((rgba[at + 2] & 0xff) << 8)
          | (rgba[at + 3] & 0xff);
    }

    /** Pixels that differ from another frame inside [x0, x1) x [y0, y1). */
    int differing(Frame other, double x0, double y0, double x1, double y1) {
      int n = 0;
      for (int y = (int) y0; y < (int) y1; ++y)
        for (int x = (int) x0; x < (int) x1; ++x) if (pixel(x, y) != other.pixel(x, y)) ++n;
      return n;
    }

    int differing(Frame other) { return differing(other, 0, 0, width, height); }

    boolean allZero() {
      for (byte b : rgba) if (b != 0) return false;
      return true;
    }
  }

  static Frame draw(EglContext gl, Runnable drawFrame) throws Exception {
    gl.run(drawFrame);
    return new Frame(gl.readRgba(), gl.width, gl.height);
  }

  static void run() throws Exception {
    try (EglContext main = new EglContext(WIDTH, HEIGHT)) {
      mainSurface(main);
      try (EglContext pop = new EglContext(WIDTH, 80); EglContext top = new EglContext(96, 160)) {
        popSurfaces(main, pop, top);
      }
    }
  }

  private static void mainSurface(EglContext gl) throws Exception {
    Check.test("keyboard surface: held key, balloon, pop mode, kbd mode, number pad, variant 0", () -> {
      JvmSuite.destroyAll();
      KeyboardDriver k = keyboard(gl, "render");
      final int h = k.handle;
      Frame idle = draw(gl, () -> setNativeDrawFrame(h));
      double[] q = k.positionCentre(12);  // row 1
      Check.equal(-1, setNativeTouchPos(h, TOUCH_DOWN, (float) q[0], (float) q[1]), "hold position 12");
      Frame held = draw(gl, () -> setNativeDrawFrame(h));
      double x0 = q[0] - 0.5 * k.kw;
      double x1 = q[0] + 0.5 * k.kw;
      Check.isTrue(held.differing(idle, x0, q[1] - 0.5 * k.kh, x1, q[1] + 0.5 * k.kh) > 0, "held key face");
      Check.isTrue(held.differing(idle, x0, 0, x1, q[1] - 0.5 * k.kh) > 0, "balloon above the held key");

      setNativePopMode(h, false);
      Frame noBalloon = draw(gl, () -> setNativeDrawFrame(h));
      Check.isTrue(noBalloon.differing(idle, x0, q[1] - 0.5 * k.kh, x1, q[1] + 0.5 * k.kh) > 0,
          "pop mode off: the held face stays");
      Check.equal(0, noBalloon.differing(idle, 0, 0, WIDTH, q[1] - 0.5 * k.kh), "pop mode off: no balloon");

      setNativeKbdMode(h, (short) 1);
      setNativePopMode(h, true);
      Check.equal(0, draw(gl, () -> setNativeDrawFrame(h)).differing(idle), "kbd mode 1 hides the held key");
      setNativeKbdMode(h, (short) 0);
      setNativePopMode(h, true);

      Check.equal(0, setNativeTouchPos(h, TOUCH_UP, (float) q[0], (float) q[1]), "release");
      Check.equal(0, draw(gl, () -> setNativeDrawFrame(h)).differing(idle), "released: the idle frame again");

      setNativeKbdType(h, KBD_PAD_WITH_POINT);
      Check.isTrue(draw(gl, () -> setNativeDrawFrame(h)).differing(idle) > WIDTH * HEIGHT / 10, "number pad");
      setNativeKbdType(h, KBD_FULL);

      gl.run(() -> setNativeSurfaceChanged(h, WIDTH, HEIGHT, 0));
      Frame flat = draw(gl, () -> setNativeDrawFrame(h));
      setNativeTouchPos(h, TOUCH_DOWN, (float) q[0], (float) q[1]);
      Frame flatHeld = draw(gl, () -> setNativeDrawFrame(h));
      Check.equal(0, flatHeld.differing(flat, 0, 0, WIDTH, q[1] - 0.5 * k.kh), "variant 0: no balloon");
      setNativeTouchPos(h, TOUCH_UP, (float) q[0], (float) q[1]);
      destroyNativeSession(h);
    });
  }

  private static void popSurfaces(EglContext main, EglContext pop, EglContext top) throws Exception {
    Check.test("pop-up surfaces: field dots, held top-row key", () -> {
      JvmSuite.destroyAll();
      KeyboardDriver k = keyboard(main, "popups");
      final int h = k.handle;
      pop.run(() -> {
        setNativePopSurfaceCreated(h);
        setNativePopSurfaceChanged(h, pop.width, pop.height);
      });
      top.run(() -> {
        setNativePopTopSurfaceCreated(h);
        setNativePopTopSurfaceChanged(h, top.width, top.height);
      });
      Check.isTrue(draw(pop, () -> setNativePopDrawFrame(h, false)).allZero(), "no field, no key: transparent");
      Check.isTrue(draw(top, () -> setNativePopTopDrawFrame(h)).allZero(), "top pop-up without a key: transparent");

      Frame empty = draw(pop, () -> setNativePopDrawFrame(h, true));
      Check.isTrue(!empty.allZero(), "the field is drawn");
      k.type("abc");
      Frame three = draw(pop, () -> setNativePopDrawFrame(h, true));
      Check.isTrue(three.differing(empty) > 0, "typed characters show as dots");
      double[] q = k.positionCentre(3);  // top row
      setNativeTouchPos(h, TOUCH_DOWN, (float) q[0], (float) q[1]);
      Check.isTrue(!draw(top, () -> setNativePopTopDrawFrame(h)).allZero(), "held top-row key: enlarged glyph");
      Check.isTrue(!draw(pop, () -> setNativePopDrawFrame(h, false)).allZero(), "held top-row key: balloon");
      setNativeTouchPos(h, TOUCH_UP, (float) q[0], (float) q[1]);
      double[] r = k.positionCentre(14);  // row 1: no pop-up
      setNativeTouchPos(h, TOUCH_DOWN, (float) r[0], (float) r[1]);
      Check.isTrue(draw(top, () -> setNativePopTopDrawFrame(h)).allZero(), "row-1 key: nothing on the top pop-up");
      setNativeTouchPos(h, TOUCH_UP, (float) r[0], (float) r[1]);
      destroyNativeSession(h);
    });
  }
}
