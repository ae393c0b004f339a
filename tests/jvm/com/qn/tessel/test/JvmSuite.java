package com.qn.tessel.test;

import static com.qn.tessel.plugin.QNKbdJniLib.*;

import com.qn.tessel.plugin.QNKbdJniLib;
import com.qn.tessel.server.PemKeys;
import com.qn.tessel.server.TesselOpener;
import java.nio.file.Files;
import java.nio.file.Path;
import java.security.KeyPair;
import java.security.KeyPairGenerator;
import java.security.PrivateKey;
import java.security.interfaces.RSAPrivateCrtKey;
import java.security.interfaces.RSAPrivateKey;
import java.security.interfaces.RSAPublicKey;
import java.util.Locale;

/**
 * The JVM suite: loads the built libTesselVIP.so into a real JVM and drives keyboards only
 * through com.qn.tessel.plugin.QNKbdJniLib, as an app does; exit status 0 when every check
 * passed. Run by CTest (tests/jvm.cmake) with the paths it needs as system properties: tessel.library
 * (libTesselVIP.so), tessel.helpers (the test-only JNI helpers of tests/jvm/native), tessel.server
 * (tessel_open, the C++ opener), tessel.appKey (builtin_default_key.pem), tessel.tmp (scratch).
 */
public final class JvmSuite {
  /** Keyboard surface size used by every case: keys of 48 x 80 pixels. */
  static final int WIDTH = 480;
  static final int HEIGHT = 320;
  static final String TIMESTAMP = "20260101120000";

  static String appModulusHex;
  static RSAPrivateCrtKey appKey;
  static int encKeyBytes = 128;
  static String encModulusHex;
  static TesselOpener opener;

  private JvmSuite() {}

  static int appKeyBytes() {
    return (appKey.getModulus().bitLength() + 7) / 8;
  }

  static String property(String name) {
    String v = System.getProperty(name);
    if (v == null || v.isEmpty()) throw new IllegalStateException("system property " + name + " is not set");
    return v;
  }

  /** Releases every slot, so cases that count on empty slots start from a known table. */
  static void destroyAll() {
    for (int h = 0; h < SESSION_SLOTS; ++h) destroyNativeSession(h);
  }

  /**
   * A session ready for typing: long enough maximum length, every printable character accepted,
   * the layout built and the grid set on the given GL thread (variant 1).
   */
  static KeyboardDriver keyboard(EglContext gl, String name) throws Exception {
    int h = createNativeSession(name);
    Check.isTrue(h >= 0 && h < SESSION_SLOTS, "handle of " + name);
    setNativeMaxLength(h, (short) 64);
    setNativeAccepts(h, "[:print:]*");
    gl.run(() -> {
      setNativeSurfaceCreated(h);
      setNativeSurfaceChanged(h, WIDTH, HEIGHT, 1);
    });
    return new KeyboardDriver(h, WIDTH, HEIGHT);
  }

  /** The typed text as the bank's server reads it from getNativeContent (type 48), by both openers. */
  static String serverContent(int h) throws Exception {
    String out = getNativeContent(h, TIMESTAMP);
    Check.isTrue(out != null, "getNativeContent: " + getNativeLastError(h));
    if (out == null) return null;
    Bank.Result r = Bank.open(48, out, false);
    Check.equal(0, r.exit(), "type 48 opened: " + r.stderr());
    Check.equal(TIMESTAMP, r.get("timestamp"), "timestamp in the envelope");
    return r.get("content");
  }

  private static void setUp() throws Exception {
    System.load(property("tessel.helpers"));
    // The library is loaded here, before the class is initialised: its own System.loadLibrary
    // then fails (the build directory is not on java.library.path) and must not matter.
    System.load(property("tessel.library"));
    Bank.cppTool = property("tessel.server");
    Bank.appKeyPem = property("tessel.appKey");
    PrivateKey app = PemKeys.read(Path.of(Bank.appKeyPem));
    appKey = (RSAPrivateCrtKey) app;
    appModulusHex = ((RSAPrivateKey) app).getModulus().toString(16).toUpperCase(Locale.ROOT);
    KeyPairGenerator generator = KeyPairGenerator.getInstance("RSA");
    generator.initialize(1024);
    KeyPair enc = generator.generateKeyPair();
    encModulusHex = ((RSAPublicKey) enc.getPublic()).getModulus().toString(16).toUpperCase(Locale.ROOT);
    Path pem = Path.of(property("tessel.tmp"), "enc_platform_key.pem");
    Bank.encKeyPem = Files.writeString(pem, Bank.pkcs8Pem(enc.getPrivate())).toString();
    opener = TesselOpener.builder().appKey(app).encKey(enc.getPrivate()).build();
  }

  public static void main(String[] args) throws Exception {
    setUp();
    Check.test("the class reaches the library loaded by the test", () -> {
      Check.isTrue(QNKbdJniLib.isAvailable(), "isAvailable");
      Check.isTrue(QNKbdJniLib.libraryLoadFailure() != null, "the class's own loadLibrary failed as expected");
    });
    EntryPointTests.run();
    OutputTests.run();
    ForgeryTests.run();
    RenderTests.run();
    destroyAll();
    System.out.printf("%d checks failed%n", Check.failures);
    System.exit(Check.failures == 0 ? 0 : 1);
  }
}
