package com.qn.tessel.test;

import static com.qn.tessel.plugin.QNKbdJniLib.setNativeTouchPos;

import com.qn.tessel.plugin.QNKbdJniLib;

/**
 * Types through the keyboard the way a finger does: computes key centres from the surface size
 * the app passed to setNativeSurfaceChanged (10 columns and 4 rows of keys; row 1 shifted right
 * by 0.3 key, row 2 between shift and delete) and sends a down and an up at each. It tracks the
 * page and shift state its own taps produce, so it knows the unshuffled layout's keys only: use
 * it with random layout off, or for positions.
 */
final class KeyboardDriver {
  static final String[] LETTERS = {"qwertyuiop", "asdfghjkl", "zxcvbnm"};
  static final String[] SYMBOLS = {"1234567890", "`~!@#$%^&", "*()-_=+"};
  static final String[] SYMBOLS_SHIFTED = {"1234567890", "{}[]\\|:;'", "\",.<>/?"};

  final int handle;
  final double kw;
  final double kh;
  boolean symbolPage;
  boolean shift;

  KeyboardDriver(int handle, int width, int height) {
    this.handle = handle;
    this.kw = width / 10.0;
    this.kh = height / 4.0;
  }

  /** A down then an up at (x, y): the down must report -1; returns what the up reports. */
  int tap(double x, double y) {
    Check.equal(-1, setNativeTouchPos(handle, QNKbdJniLib.TOUCH_DOWN, (float) x, (float) y), "down at " + x + "," + y);
    return setNativeTouchPos(handle, QNKbdJniLib.TOUCH_UP, (float) x, (float) y);
  }

  /** Centre of layout position 0..25 of the full keyboard. */
  double[] positionCentre(int position) {
    if (position < 10) return new double[] {(position + 0.5) * kw, 0.5 * kh};
    if (position < 19) return new double[] {(position - 10 + 0.8) * kw, 1.5 * kh};
    return new double[] {(position - 19 + 2) * kw, 2.5 * kh};
  }

  int deleteKey() {
    return tap(9.25 * kw, 2.5 * kh);
  }

  int doneKey() {
    return tap(8.75 * kw, 3.5 * kh);
  }

  private static int find(String[] rows, char c) {
    int base = 0;
    for (String row : rows) {
      int at = row.indexOf(c);
      if (at >= 0) return base + at;
      base += row.length();
    }
    return -1;
  }

  /** Types one character of the unshuffled full keyboard, switching page and shift as needed. */
  void type(char c) {
    if (c == ' ') {
      Check.equal(0, tap(5 * kw, 3.5 * kh), "space key");
      return;
    }
    int letter = find(LETTERS, Character.toLowerCase(c));
    int symbol = find(SYMBOLS, c);
    int shifted = find(SYMBOLS_SHIFTED, c);
    int position = letter >= 0 ? letter : symbol >= 0 ? symbol : shifted;
    if (position < 0) throw new IllegalArgumentException("no key for " + c);
    // Digits are on both symbol pages: either shift state will do.
    Boolean wantShift = letter >= 0 ? Boolean.valueOf(Character.isUpperCase(c))
        : symbol >= 0 && shifted >= 0 ? null : Boolean.valueOf(shifted >= 0);
    if (symbolPage != (letter < 0)) {
      Check.equal(0, tap(1.25 * kw, 3.5 * kh), "switch key (switch mode 0: letters and symbols)");
      symbolPage = !symbolPage;
    }
    if (wantShift != null && shift != wantShift) {
      Check.equal(0, tap(0.75 * kw, 2.5 * kh), "shift key");
      shift = !shift;
    }
    double[] centre = positionCentre(position);
    Check.equal(0, tap(centre[0], centre[1]), "key '" + c + "'");
  }

  void type(String text) {
    for (int k = 0; k < text.length(); ++k) type(text.charAt(k));
  }
}
