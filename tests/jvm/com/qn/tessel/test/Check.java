package com.qn.tessel.test;

import java.util.Arrays;
import java.util.Objects;

/**
 * The suite's assertions: each failed check is counted and printed with the name of its case,
 * and the case goes on, so one run reports every broken expectation. A case that throws is
 * reported as failed at that point.
 */
final class Check {
  static int failures;
  private static String current = "";

  private Check() {}

  interface Body {
    void run() throws Exception;
  }

  static void test(String name, Body body) {
    current = name;
    final int before = failures;
    try {
      body.run();
    } catch (Throwable t) {
      fail("threw " + t);
      t.printStackTrace(System.out);
    }
    System.out.printf("[%s] %s%n", failures == before ? "  OK  " : "FAILED", name);
  }

  static void fail(String message) {
    ++failures;
    System.out.println("    " + current + ": " + message);
  }

  static void isTrue(boolean condition, String what) {
    if (!condition) fail(what);
  }

  /** Numbers of any width, other objects, or byte arrays by content. */
  static void equal(Object expected, Object actual, String what) {
    if (expected instanceof Number && actual instanceof Number && !(expected instanceof Double)) {
      expected = ((Number) expected).longValue();
      actual = ((Number) actual).longValue();
    } else if (expected instanceof byte[] && actual instanceof byte[]) {
      expected = Arrays.toString((byte[]) expected);
      actual = Arrays.toString((byte[]) actual);
    }
    if (!Objects.equals(expected, actual)) fail(what + ": expected <" + expected + ">, got <" + actual + ">");
  }
}
