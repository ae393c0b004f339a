package com.qn.tessel.test;

import static com.qn.tessel.plugin.QNKbdJniLib.*;
import static com.qn.tessel.test.JvmSuite.HEIGHT;
import static com.qn.tessel.test.JvmSuite.WIDTH;
import static com.qn.tessel.test.JvmSuite.keyboard;

import java.util.Arrays;

/**
 * The three GL surfaces driven from Java as an app's renderers drive them, each on its own thread
 * and offscreen GLES 1.1 context. The pictures are checked key by key in the C++ render suites;
 * here, that settings set through the native methods reach the renderer and every entry point draws.
 */
final class RenderTests {
  private RenderTests() {}

  /** A frame read back top row first, in the app's touch coordinates. */
  record Frame(byte[] rgba, int width, int height) {
    /** Pixels that differ from another frame inside [x0, x1) x [y0, y1). */
    int differing(Frame o, double x0, double y0, double x1, double y1) {
      int n = 0;
      for (int y = Math.max(0, (int) y0); y < Math.min(height, (int) y1); ++y)
        for (int at = (y * width + Math.max(0, (int) x0)) * 4; at < (y * width + Math.min(width, (int) x1)) * 4; at += 4)
          n += Arrays.equals(rgba, at, at + 4, o.rgba, at, at + 4) ? 0 : 1;
      return n;
    }

    int differing(Frame o) { return differing(o, 0, 0, width, height); }
    boolean allZero() { return differing(new Frame(new byte[rgba.length], width, height)) == 0; }
  }

  static Frame draw(EglContext gl, Runnable drawFrame) throws Exception {
    gl.run(drawFrame);
    return new Frame(gl.readRgba(), gl.width, gl.height);
  }

  static void run() throws Exception {
    try (EglContext main = new EglContext(WIDTH, HEIGHT); EglContext pop = new EglContext(WIDTH, 80);
         EglContext top = new EglContext(96, 160)) {
      mainSurface(main);
      popSurfaces(main, pop, top);
    }
  }

  private static void mainSurface(EglContext gl) throws Exception {
    Check.test("keyboard surface: held key, balloon, pop mode, kbd mode, number pad", () -> {
      JvmSuite.destroyAll();
      KeyboardDriver k = keyboard(gl, "render");
      final int h = k.handle;
      Frame idle = draw(gl, () -> setNativeDrawFrame(h));
      double[] q = k.positionCentre(12);  // row 1
      Check.equal(-1, setNativeTouchPos(h, TOUCH_DOWN, (float) q[0], (float) q[1]), "hold position 12");
      Frame held = draw(gl, () -> setNativeDrawFrame(h));
      double x0 = q[0] - 0.5 * k.kw, x1 = q[0] + 0.5 * k.kw;
      Check.isTrue(held.differing(idle, x0, q[1] - 0.5 * k.kh, x1, q[1] + 0.5 * k.kh) > 0, "held key face");
      Check.isTrue(held.differing(idle, x0, 0, x1, q[1] - 0.5 * k.kh) > 0, "balloon above the held key");

      setNativePopMode(h, false);
      Check.equal(0, draw(gl, () -> setNativeDrawFrame(h)).differing(idle, 0, 0, WIDTH, q[1] - 0.5 * k.kh),
          "pop mode off: no balloon");
      setNativeKbdMode(h, (short) 1);
      Check.equal(0, draw(gl, () -> setNativeDrawFrame(h)).differing(idle), "kbd mode 1 hides the held key");
      setNativeKbdMode(h, (short) 0);
      Check.equal(0, setNativeTouchPos(h, TOUCH_UP, (float) q[0], (float) q[1]), "release");
      setNativeKbdType(h, KBD_PAD_WITH_POINT);
      Check.isTrue(draw(gl, () -> setNativeDrawFrame(h)).differing(idle) > WIDTH * HEIGHT / 10, "number pad");
      destroyNativeSession(h);
    });
  }

  private static void popSurfaces(EglContext main, EglContext pop, EglContext top) throws Exception {
    Check.test("pop-up surfaces: field dots, held top-row key", () -> {
      JvmSuite.destroyAll();
      KeyboardDriver k = keyboard(main, "popups");
      final int h = k.handle;
      pop.run(() -> { setNativePopSurfaceCreated(h); setNativePopSurfaceChanged(h, pop.width, pop.height); });
      top.run(() -> { setNativePopTopSurfaceCreated(h); setNativePopTopSurfaceChanged(h, top.width, top.height); });
      Check.isTrue(draw(pop, () -> setNativePopDrawFrame(h, false)).allZero(), "no field, no key: transparent");
      Check.isTrue(draw(top, () -> setNativePopTopDrawFrame(h)).allZero(), "top pop-up without a key: transparent");

      Frame empty = draw(pop, () -> setNativePopDrawFrame(h, true));
      k.type("abc");
      Check.isTrue(draw(pop, () -> setNativePopDrawFrame(h, true)).differing(empty) > 0, "typed characters show as dots");
      double[] q = k.positionCentre(3);  // top row
      setNativeTouchPos(h, TOUCH_DOWN, (float) q[0], (float) q[1]);
      Check.isTrue(!draw(top, () -> setNativePopTopDrawFrame(h)).allZero(), "held top-row key: enlarged glyph");
      Check.isTrue(!draw(pop, () -> setNativePopDrawFrame(h, false)).allZero(), "held top-row key: balloon");
      destroyNativeSession(h);
    });
  }
}
