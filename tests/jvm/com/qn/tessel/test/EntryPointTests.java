package com.qn.tessel.test;

import static com.qn.tessel.plugin.QNKbdJniLib.*;

import java.util.ArrayList;
import java.util.List;

/**
 * Every entry point with handles that name no session (negative, empty slots 0 and 19, 20 and
 * beyond) and with null arguments: each must return its documented value and change nothing.
 * Also what a handle kept across eviction reaches.
 */
final class EntryPointTests {
  private EntryPointTests() {}

  interface Call {
    Object call(int handle);
  }

  /** One method: what it returns for a negative handle and for a non-negative one without a session. */
  record Row(String name, Object negative, Object noSession, Call call) {}

  static Row row(String name, Object refused, Call call) {
    return new Row(name, refused, refused, call);
  }

  static Row sink(String name, Call call) {  // methods without a result: the call returns null
    return row(name, null, call);
  }

  /** The 50 methods that take a handle, each with valid arguments apart from the handle. */
  static List<Row> rows() {
    final byte[] challenge = {'c', 'o', 'd', 'e'};
    List<Row> rows = new ArrayList<>();
    rows.add(sink("destroyNativeSession", h -> { destroyNativeSession(h); return null; }));
    rows.add(sink("setNativeSurfaceCreated", h -> { setNativeSurfaceCreated(h); return null; }));
    rows.add(sink("setNativeSurfaceChanged", h -> { setNativeSurfaceChanged(h, 480, 320, 1); return null; }));
    rows.add(sink("setNativeDrawFrame", h -> { setNativeDrawFrame(h); return null; }));
    rows.add(sink("setNativePopSurfaceCreated", h -> { setNativePopSurfaceCreated(h); return null; }));
    rows.add(sink("setNativePopSurfaceChanged", h -> { setNativePopSurfaceChanged(h, 480, 80); return null; }));
    rows.add(sink("setNativePopDrawFrame", h -> { setNativePopDrawFrame(h, true); return null; }));
    rows.add(sink("setNativePopTopSurfaceCreated", h -> { setNativePopTopSurfaceCreated(h); return null; }));
    rows.add(sink("setNativePopTopSurfaceChanged", h -> { setNativePopTopSurfaceChanged(h, 96, 160); return null; }));
    rows.add(sink("setNativePopTopDrawFrame", h -> { setNativePopTopDrawFrame(h); return null; }));
    rows.add(row("setNativeTouchPos", -1, h -> setNativeTouchPos(h, TOUCH_UP, 100f, 100f)));
    rows.add(row("getNativeContentLen", -1, h -> getNativeContentLen(h)));
    rows.add(row("getNativeContent", null, h -> getNativeContent(h, "20260101120000")));
    rows.add(row("getNativePinContent", null, h -> getNativePinContent(h, "20260101120000")));
    rows.add(row("clearNativePlaintext", -1, h -> clearNativePlaintext(h)));
    rows.add(row("getNativeDegree", (short) -1, h -> getNativeDegree(h)));
    rows.add(row("getNativeVerify", -1, h -> getNativeVerify(h)));
    rows.add(new Row("getNativeVersion", -1L, VERSION, h -> getNativeVersion(h)));
    rows.add(new Row("getNativeStringVersion", null, VERSION_TEXT, h -> getNativeStringVersion(h)));
    rows.add(row("getNativeLastError", null, h -> getNativeLastError(h)));
    rows.add(row("getNativeEncryptedPinCode", null, h -> getNativeEncryptedPinCode(h)));
    rows.add(row("getNativeMeasureValue", null, h -> getNativeMeasureValue(h)));
    rows.add(sink("setNativeEncryptType", h -> { setNativeEncryptType(h, (byte) 48); return null; }));
    rows.add(sink("setNativeAppPlat", h -> { setNativeAppPlat(h, "C0FFEE", false); return null; }));
    rows.add(sink("setNativeEncryPlat", h -> { setNativeEncryPlat(h, "C0FFEE", false); return null; }));
    rows.add(row("setNativePublicKeyAppModulus", 0, h -> setNativePublicKeyAppModulus(h, "C0FFEE")));
    rows.add(row("setNativePublicKeyAppDER", 0, h -> setNativePublicKeyAppDER(h, "3006020100020100")));
    rows.add(row("setNativePublicKeyAppBlob", 0, h -> setNativePublicKeyAppBlob(h, "0602")));
    rows.add(row("setNativePublicKeyModulus", 0, h -> setNativePublicKeyModulus(h, "C0FFEE")));
    rows.add(row("setNativePublicKeyDER", 0, h -> setNativePublicKeyDER(h, "3006020100020100")));
    rows.add(row("setNativePublicKeyBlob", 0, h -> setNativePublicKeyBlob(h, "0602")));
    rows.add(row("setNativePublicKeyECC", 0, h -> setNativePublicKeyECC(h, "01", "02")));
    rows.add(sink("setNativeAccepts", h -> { setNativeAccepts(h, "[:print:]*"); return null; }));
    rows.add(sink("setNativeMinLength", h -> { setNativeMinLength(h, (short) 6); return null; }));
    rows.add(sink("setNativeMaxLength", h -> { setNativeMaxLength(h, (short) 16); return null; }));
    rows.add(sink("setNativeKbdRandom", h -> { setNativeKbdRandom(h, true); return null; }));
    rows.add(sink("setNativeKbdVibrator", h -> { setNativeKbdVibrator(h, 1); return null; }));
    rows.add(sink("setNativeKbdType", h -> { setNativeKbdType(h, (short) 1); return null; }));
    rows.add(sink("setNativeKbdStyle", h -> { setNativeKbdStyle(h, (short) 3); return null; }));
    rows.add(sink("setNativeKbdMode", h -> { setNativeKbdMode(h, (short) 1); return null; }));
    rows.add(sink("setNativeChallengeCode", h -> { setNativeChallengeCode(h, challenge); return null; }));
    rows.add(sink("setNativeKbdFactor", h -> { setNativeKbdFactor(h, "2xyz"); return null; }));
    rows.add(sink("setNativeContentType", h -> { setNativeContentType(h, 7); return null; }));
    rows.add(sink("setNativeMode", h -> { setNativeMode(h, (short) 4); return null; }));
    rows.add(sink("setNativeAlgorithmCode", h -> { setNativeAlgorithmCode(h, "123"); return null; }));
    rows.add(sink("setNativeHashRandom", h -> { setNativeHashRandom(h, "1:salt"); return null; }));
    rows.add(sink("setNativeDictionaryFilter", h -> { setNativeDictionaryFilter(h, "a,b"); return null; }));
    rows.add(sink("setNativePopMode", h -> { setNativePopMode(h, false); return null; }));
    rows.add(sink("setNativeSwitchMode", h -> { setNativeSwitchMode(h, (short) 1); return null; }));
    rows.add(sink("setNativeFinishMode", h -> { setNativeFinishMode(h, (short) 1); return null; }));
    return rows;
  }

  static void run() throws Exception {
    Check.test("handles without a session return the documented values", () -> {
      Check.equal(50, rows().size(), "the sweep covers the 50 methods that take a handle");
      JvmSuite.destroyAll();
      final int[] handles = {-1, -20, Integer.MIN_VALUE, 0, 19, 20, 1000, Integer.MAX_VALUE};
      for (int h : handles) {
        for (Row r : rows()) {
          Object got = r.call().call(h);
          Check.equal(h < 0 ? r.negative() : r.noSession(), got, r.name() + "(" + h + ")");
        }
      }
      // Nothing above may have brought a session to life.
      for (int h = 0; h < SESSION_SLOTS; ++h) Check.equal(-1, getNativeContentLen(h), "slot " + h + " empty");
      Check.equal(0, createNativeSession("first"), "the first create after the sweep takes slot 0");
      JvmSuite.destroyAll();
    });

    Check.test("null arguments on a live session", () -> {
      JvmSuite.destroyAll();
      Check.equal(-1, createNativeSession(null), "createNativeSession(null)");
      int h = createNativeSession("nulls");
      Check.equal(0, h, "handle");
      final int[] keySetters = {setNativePublicKeyAppModulus(h, null), setNativePublicKeyAppDER(h, null),
        setNativePublicKeyAppBlob(h, null), setNativePublicKeyModulus(h, null), setNativePublicKeyDER(h, null),
        setNativePublicKeyBlob(h, null), setNativePublicKeyECC(h, null, "02"), setNativePublicKeyECC(h, "01", null),
        setNativePublicKeyECC(h, null, null)};
      Check.equal("[0, 0, 0, 0, 0, 0, 0, 0, 0]", java.util.Arrays.toString(keySetters), "key setters given null");
      setNativeAppPlat(h, null, false);
      setNativeEncryPlat(h, null, true);
      setNativeAccepts(h, null);
      setNativeKbdFactor(h, null);
      setNativeAlgorithmCode(h, null);
      setNativeHashRandom(h, null);
      setNativeDictionaryFilter(h, null);
      setNativeChallengeCode(h, null);
      Check.equal(null, getNativePinContent(h, null), "getNativePinContent(null timestamp)");
      Check.equal(null, getNativeContent(h, null), "getNativeContent(null timestamp)");
      Check.equal("The timestamp is missing!", getNativeLastError(h), "last error after a null timestamp");
      Check.equal(null, getNativeEncryptedPinCode(h), "no challenge code after setNativeChallengeCode(null)");
      Check.equal("Challenge code is empty", getNativeLastError(h), "last error without a challenge code");
      Check.equal(0, getNativeContentLen(h), "the session is still whole");
      destroyNativeSession(h);
    });

    Check.test("a handle kept across eviction drives the successor; one resolved by name does not", () -> {
      JvmSuite.destroyAll();
      final int login = createNativeSession("login-password");
      for (int k = 1; k < SESSION_SLOTS; ++k) createNativeSession("screen" + k);
      final int pin = createNativeSession("transfer-pin");
      Check.equal(login, pin, "the 21st name takes the kept handle's slot");
      getNativeContent(login, null);  // through the kept handle: refused for the missing timestamp
      Check.equal("The timestamp is missing!", getNativeLastError(pin), "the kept handle reached the PIN session");
      final int resolved = createNativeSession("login-password");
      Check.equal(true, resolved != pin, "resolved by name: a session of its own");
      Check.equal("No Error!", getNativeLastError(resolved), "and a fresh one");
      JvmSuite.destroyAll();
    });
  }
}
