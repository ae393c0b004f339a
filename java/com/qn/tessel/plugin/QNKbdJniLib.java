package com.qn.tessel.plugin;

/**
 * The managed side of the secure keyboard: the 51 native methods of {@code libTesselVIP.so}.
 *
 * <p>The library draws its own keyboard with OpenGL ES 1.x, hit-tests the touches you forward,
 * keeps the typed characters RC4-sealed in native memory and never hands the plaintext back. What
 * you can get out is the content length, a strength letter, a rule verdict, an MD5 measure value,
 * the content encrypted under a challenge code, and the server envelope of
 * {@link #getNativeContent} / {@link #getNativePinContent}, which only the bank's server opens.
 *
 * <h2>Sessions and handles</h2>
 * A keyboard is a <em>session</em> in a native table of 20 slots; {@link #createNativeSession}
 * returns the slot number (0..19), the <em>handle</em> that every other method takes first.
 * Creating again with the same name returns the same handle and leaves the typed text intact.
 * When all 20 slots are taken, a new name evicts the slot after the one created last (slot 0
 * after 19) and reuses its number. A handle is only a slot number, so a handle you kept across
 * that eviction now drives the other keyboard, and nothing can tell the two apart. The safe
 * pattern: call {@link #createNativeSession} with the keyboard's name each time the keyboard is
 * shown and use the handle it returns; a session that was evicted then comes back as a new, empty
 * one instead of another screen's. Destroy sessions you no longer need. A handle that is
 * negative, 20 or more, or whose slot is empty is refused by every method with the value
 * documented for it (-1, 0, {@code null} or nothing); the two version getters answer for any
 * non-negative handle. No method throws.
 *
 * <h2>Call order</h2>
 * <ol>
 * <li>{@link #createNativeSession}.</li>
 * <li>Settings. Two are required before anything can be typed: {@link #setNativeMaxLength} (the
 *     maximum length starts at 0) and {@link #setNativeAccepts} (with no pattern, every character
 *     key is dropped). Then as needed: keyboard type and style, random layout, modes, public
 *     keys, challenge code, hash random, rule inputs.</li>
 * <li>For each GL surface you show (the keyboard; optionally the field pop-up and the top
 *     pop-up): surface created, surface changed, then draw frame on every frame, from that
 *     surface's renderer ({@code GLSurfaceView.Renderer} callbacks map one to one).</li>
 * <li>{@link #setNativeTouchPos} for every touch on the keyboard surface; it returns 1 when the
 *     done key is released.</li>
 * <li>Output getters ({@link #getNativeContent} and friends).</li>
 * <li>{@link #destroyNativeSession}.</li>
 * </ol>
 * Nothing enforces this order: a touch before the surface exists lands on an empty grid and is
 * refused.
 *
 * <h2>Threads and locking</h2>
 * Every method may be called from any thread. The intended split is create, destroy, the
 * setters, {@link #setNativeTouchPos} and the getters on your UI thread, and each surface's
 * three callbacks on that surface's GL renderer thread with its EGL context current. What the
 * library guarantees for any other split:
 * <ul>
 * <li>A call that found its session keeps it alive until it returns. Destroying or evicting a
 *     session frees its slot at once; the session itself is wiped and freed when the last call
 *     still working on it returns. A call that arrives after that is refused like a bad handle.
 *     So a renderer that draws one more frame after {@link #destroyNativeSession} is harmless.</li>
 * <li>Touches, setters and the getters that read the text run one at a time per session: two
 *     threads reading outputs at once both get correct results and the text is never changed by
 *     it. A call may wait for another one on the same session (at most one output operation,
 *     some tens of microseconds).</li>
 * <li>Frames, surface callbacks and {@link #getNativeContentLen} never wait for those: a frame
 *     may show a mix of the previous and the current touch state, which is harmless. A
 *     per-session lock is taken by {@link #setNativeSurfaceCreated} and
 *     {@link #setNativePopTopSurfaceCreated} around the key-layout build and texture upload, so
 *     two surfaces created at once build the layout once.</li>
 * <li>Each keyboard has its own textures, so two keyboards whose surfaces share one GL context
 *     each show their own keys.</li>
 * </ul>
 *
 * <h2>Loading the library</h2>
 * The class loads the library when it is initialised: from the absolute path in the system
 * property {@value #LIBRARY_PATH_PROPERTY} when that is set, otherwise with
 * {@code System.loadLibrary("TesselVIP")}. A failure does not make the class unusable to load:
 * it is kept and the native methods then throw {@link UnsatisfiedLinkError} when called. Code
 * that loads the library itself (for example {@code System.load(path)} in a test, from the same
 * class loader, before touching this class) therefore works too. {@link #isAvailable()} tells
 * whether the native methods are reachable; {@link #libraryLoadFailure()} says why not.
 *
 * <p>All methods are {@code public static native}: the library keeps its state per session
 * handle, not per Java object, so there is nothing to instantiate. The public-key setters return
 * {@code int} (1 taken, 0 refused) exactly as the library produces it.
 */
public final class QNKbdJniLib {

  /** System property naming an absolute path of {@code libTesselVIP.so} to load instead of the default. */
  public static final String LIBRARY_PATH_PROPERTY = "com.qn.tessel.plugin.library";

  /** Name given to {@code System.loadLibrary}. */
  public static final String LIBRARY_NAME = "TesselVIP";

  /**
   * The version's four parts: the one place it is written. The build reads this line and gives
   * the native library the same text and number; both constants below stay compile-time
   * constants.
   */
  private static final int VERSION_MAJOR = 3, VERSION_MINOR = 7, VERSION_PATCH = 0, VERSION_TWEAK = 5;

  /** What {@link #getNativeStringVersion} returns: "a.b.c.d". */
  public static final String VERSION_TEXT =
      VERSION_MAJOR + "." + VERSION_MINOR + "." + VERSION_PATCH + "." + VERSION_TWEAK;

  /** What {@link #getNativeVersion} returns: a &times; 1000000 + b &times; 10000 + c &times; 100 + d. */
  public static final long VERSION =
      VERSION_MAJOR * 1000000L + VERSION_MINOR * 10000 + VERSION_PATCH * 100 + VERSION_TWEAK;

  /** Number of session slots; handles are 0 .. {@code SESSION_SLOTS - 1}. */
  public static final int SESSION_SLOTS = 20;

  /** Touch actions of {@link #setNativeTouchPos}: the {@code MotionEvent} action values. */
  public static final int TOUCH_DOWN = 0, TOUCH_UP = 1, TOUCH_MOVE = 2;

  /** Results of {@link #setNativeTouchPos}. */
  public static final int TOUCH_NOT_A_KEY_RELEASE = -1, TOUCH_KEY_RELEASED = 0, TOUCH_DONE = 1;

  /** Keyboard types of {@link #setNativeKbdType}. */
  public static final short KBD_FULL = 0, KBD_PAD_WITH_POINT = 1, KBD_PAD_DIGITS = 2;

  /** Keyboard styles of {@link #setNativeKbdStyle}. */
  public static final short STYLE_LOWER = 0, STYLE_UPPER = 1, STYLE_SYMBOLS = 2, STYLE_SYMBOLS_2 = 3;

  /**
   * Strength letters. {@link #getNativeDegree} answers E, W, M or S; the strict numeric rating of
   * encryption type 34 adds T (too short, or a trivial digit sequence) and R (digits dominated by
   * one repeated digit or a long run), which appear only as the strength letter inside that
   * type's output.
   */
  public static final char DEGREE_EMPTY = 'E', DEGREE_WEAK = 'W', DEGREE_MEDIUM = 'M', DEGREE_STRONG = 'S',
      DEGREE_TRIVIAL = 'T', DEGREE_REPETITIVE = 'R';

  /** Results of {@link #getNativeVerify}. */
  public static final int VERIFY_OK = 0, VERIFY_EMPTY = -1, VERIFY_TOO_SHORT = -2, VERIFY_PATTERN = -3,
      VERIFY_TRIVIAL_OR_NO_RULE = -4, VERIFY_IN_DICTIONARY = -5, VERIFY_CLASS_MISSING = -6;

  /** Content types of {@link #setNativeContentType}: bits of the character classes required. */
  public static final int REQUIRE_DIGIT = 1, REQUIRE_LETTER = 2, REQUIRE_PUNCTUATION = 4;

  private static final Throwable LOAD_FAILURE;

  static {
    Throwable failure = null;
    try {
      String path = System.getProperty(LIBRARY_PATH_PROPERTY);
      if (path != null && !path.isEmpty()) {
        System.load(path);
      } else {
        System.loadLibrary(LIBRARY_NAME);
      }
    } catch (UnsatisfiedLinkError | SecurityException e) {
      failure = e;
    }
    LOAD_FAILURE = failure;
  }

  private QNKbdJniLib() {}

  /**
   * Whether the native methods can be called: true when the library was loaded by this class or
   * by other code of the same class loader.
   */
  public static boolean isAvailable() {
    try {
      return getNativeVersion(0) == VERSION;
    } catch (UnsatisfiedLinkError e) {
      return false;
    }
  }

  /** Why the class's own attempt to load the library failed, or null when it succeeded. */
  public static Throwable libraryLoadFailure() {
    return LOAD_FAILURE;
  }

  // ---------------------------------------------------------------- sessions

  /**
   * Finds the session called {@code name} or creates it. When all 20 slots are taken, creating a
   * new name evicts the slot after the one created last and returns that slot's number, so a
   * handle kept from before may now belong to the new keyboard. Resolve the handle by name each
   * time the keyboard is shown, for example in {@code onResume}:
   * <pre>{@code
   * handle = QNKbdJniLib.createNativeSession("login-password");  // same session while it lives
   * QNKbdJniLib.setNativeMaxLength(handle, (short) 16);  // settings may be applied again
   * }</pre>
   *
   * @param name any text identifying the keyboard (for example the field's id)
   * @return the handle 0..19; the same handle for the same name while the session lives; -1 when
   *     {@code name} is null or memory runs out
   */
  public static native int createNativeSession(String name);

  /**
   * Releases the session and wipes its text and keys. The slot is free at once; calls still
   * working on the session (a frame being drawn, an output being made) finish first, and the
   * last of them frees it. Bad handles are ignored.
   */
  public static native void destroyNativeSession(int handle);

  // ---------------------------------------------------------------- keyboard surface (its GL thread)

  /**
   * {@code onSurfaceCreated} of the keyboard surface: builds the key layout (shuffled when
   * {@link #setNativeKbdRandom} is on) under the session lock, unless it is already built, and
   * uploads the textures into the current context. The layout is built again only after a done
   * key released with finish mode 0.
   */
  public static native void setNativeSurfaceCreated(int handle);

  /**
   * {@code onSurfaceChanged} of the keyboard surface: computes the key grid (10 columns, 4 rows)
   * from the size in pixels and sets the viewport. Ignored unless width and height are at least 1.
   *
   * @param variant 0 for the standard drawing; 1 for the variant with key balloons; 2 or more
   *     keeps variant 1 only when the previous key aspect (key width / key height) was 0.6
   */
  public static native void setNativeSurfaceChanged(int handle, int width, int height, int variant);

  /** {@code onDrawFrame} of the keyboard surface: draws the whole keyboard. */
  public static native void setNativeDrawFrame(int handle);

  // ---------------------------------------------------------------- field pop-up surface (its GL thread)

  /** {@code onSurfaceCreated} of the field pop-up: uploads its textures (takes no lock). */
  public static native void setNativePopSurfaceCreated(int handle);

  /** {@code onSurfaceChanged} of the field pop-up: sets the viewport; ignored unless both sizes are at least 1. */
  public static native void setNativePopSurfaceChanged(int handle, int width, int height);

  /**
   * {@code onDrawFrame} of the field pop-up: when {@code showField}, the masked field (one dot
   * per character, at most 19, or 18 on the number pad, and a blinking cursor); in every case
   * the balloon of a held top-row key. Draws nothing before the keyboard layout is built.
   */
  public static native void setNativePopDrawFrame(int handle, boolean showField);

  // ---------------------------------------------------------------- top pop-up surface (its GL thread)

  /**
   * {@code onSurfaceCreated} of the top pop-up: builds the key layout under the session lock (if
   * not built) and uploads the enlarged top-row glyphs.
   */
  public static native void setNativePopTopSurfaceCreated(int handle);

  /** {@code onSurfaceChanged} of the top pop-up: sets the viewport; ignored unless both sizes are at least 1. */
  public static native void setNativePopTopSurfaceChanged(int handle, int width, int height);

  /** {@code onDrawFrame} of the top pop-up: the enlarged glyph of a held top-row key, if any. */
  public static native void setNativePopTopDrawFrame(int handle);

  // ---------------------------------------------------------------- touches and content (UI thread)

  /**
   * Forwards one touch on the keyboard surface. Keys act on release only.
   *
   * @param action {@link #TOUCH_DOWN}, {@link #TOUCH_UP} or {@link #TOUCH_MOVE}; other values are refused
   * @param x pixels from the left edge of the keyboard surface
   * @param y pixels from the top edge
   * @return {@link #TOUCH_DONE} (1) when the done key was released (the moment to fetch the
   *     output); {@link #TOUCH_KEY_RELEASED} (0) for the release of any other key, also when the
   *     character was not taken (length limit, accepts pattern); -1 for a down or move, a touch
   *     within a tenth of a key of the surface edge, an unknown action, or a bad handle
   */
  public static native int setNativeTouchPos(int handle, int action, float x, float y);

  /** @return the number of characters typed; -1 for a bad handle */
  public static native int getNativeContentLen(int handle);

  /**
   * Erases the typed text (length 0, buffers zeroed).
   *
   * @return 0; -1 for a bad handle
   */
  public static native int clearNativePlaintext(int handle);

  // ---------------------------------------------------------------- outputs (UI thread)

  /**
   * The password for the server: a base64 digital envelope (RC4 session key wrapped with RSA
   * under the library's built-in key) around "{@code <strength letter><timestamp>:<text>}".
   * When {@link #setNativeHashRandom} was set, the text is replaced by its salted MD5 value.
   *
   * @param timestamp required text chosen by your server (a null timestamp fails the call)
   * @return the base64 text, or null on failure: {@link #getNativeLastError} then says why
   */
  public static native String getNativeContent(int handle, String timestamp);

  /**
   * As {@link #getNativeContent}, but the text (or its salted MD5 value) is first encrypted with
   * RSA under the encryption platform key set by {@link #setNativePublicKeyModulus},
   * {@link #setNativePublicKeyDER}, {@link #setNativePublicKeyBlob} or {@link #setNativeEncryPlat};
   * without that key it fails with "The encryption platform modulus is missing!".
   *
   * @return the base64 text, or null on failure (see {@link #getNativeLastError})
   */
  public static native String getNativePinContent(int handle, String timestamp);

  /**
   * The strength of the typed text.
   *
   * @return a letter as a short: 'E' empty, 'W' weak, 'M' medium, 'S' strong ({@code (char)}
   *     cast it); -1 for a bad handle
   */
  public static native short getNativeDegree(int handle);

  /**
   * Checks the typed text against the rule made of {@link #setNativeMinLength},
   * {@link #setNativeAccepts}, {@link #setNativeContentType} and {@link #setNativeDictionaryFilter}.
   *
   * @return 0 passes; -1 empty; -2 shorter than the minimum; -3 does not match the accepts
   *     pattern (or none is set); -4 the rule could not be built; -5 in the dictionary list; -6 a
   *     required character class is missing; -1 also for a bad handle
   */
  public static native int getNativeVerify(int handle);

  /** @return {@link #VERSION} for any handle &ge; 0; -1 for a negative handle */
  public static native long getNativeVersion(int handle);

  /** @return {@link #VERSION_TEXT} for any handle &ge; 0; null for a negative handle */
  public static native String getNativeStringVersion(int handle);

  /**
   * The message of the last output call ({@link #getNativeContent}, {@link #getNativePinContent},
   * {@link #getNativeEncryptedPinCode}) of this session: "No Error!" after a success or before any
   * output, for example "The timestamp is missing!", "Challenge code is empty", "Encryption error".
   * The text is kept until the next output call.
   *
   * @return the message; null for a bad handle
   */
  public static native String getNativeLastError(int handle);

  /**
   * The typed text RC4-encrypted under the SHA-1 of the challenge code
   * ({@link #setNativeChallengeCode}), as the ASCII bytes of its base64 text (no terminator).
   *
   * @return the bytes; null for a bad handle, without a challenge code ("Challenge code is
   *     empty") or with no text typed ("Encryption error")
   */
  public static native byte[] getNativeEncryptedPinCode(int handle);

  /**
   * @return the MD5 of the typed text as 32 lower-case hex digits; null when nothing is typed or
   *     for a bad handle
   */
  public static native String getNativeMeasureValue(int handle);

  // ---------------------------------------------------------------- settings (UI thread)

  /** Stores the encryption type (bank id), low 8 bits. The outputs use fixed types and do not read it. */
  public static native void setNativeEncryptType(int handle, byte type);

  /**
   * Application platform public key: a hex RSA modulus, or, when {@code isDer}, the hex of a DER
   * {@code SEQUENCE { INTEGER n, INTEGER 65537 }}. Stored only; the outputs use the built-in key
   * in that place, so a refused key changes no output. A null key is ignored.
   *
   * <p>Refused keys: with {@code isDer}, anything but that exact structure (another exponent, a
   * {@code SubjectPublicKeyInfo} or PEM text, a modulus over 2240 bits, a character that is not
   * a hex digit): the stored key is cleared, and nothing is reported. A hex modulus is stored
   * as given, unchecked.
   */
  public static native void setNativeAppPlat(int handle, String key, boolean isDer);

  /**
   * Encryption platform public key for {@link #getNativePinContent}, in the forms of
   * {@link #setNativeAppPlat}. A null key is ignored. Nothing is checked here: a bad key shows
   * only when {@link #getNativePinContent} returns null and {@link #getNativeLastError} says
   * <ul>
   *   <li>"The encryption platform modulus is missing!" for a DER text that is refused (another
   *       exponent, a {@code SubjectPublicKeyInfo}, a modulus over 2240 bits, a non-hex
   *       character): the refusal also cleared any key set before; and for an empty text;</li>
   *   <li>"Adding PKCS1 padding failed!" for a hex modulus over 2240 bits (560 digits), one with
   *       a character that is not a hex digit (a space, a {@code 0x} prefix), or one too short
   *       for a padded block.</li>
   * </ul>
   */
  public static native void setNativeEncryPlat(int handle, String key, boolean isDer);

  /**
   * As {@code setNativeAppPlat(handle, hex, false)}: stored unchecked and read by no output.
   *
   * @return 1 stored, whatever the text holds; 0 for a null key or bad handle
   */
  public static native int setNativePublicKeyAppModulus(int handle, String hex);

  /**
   * As {@code setNativeAppPlat(handle, der, true)}: a DER text that is refused (see there)
   * clears the key; read by no output.
   *
   * @return 1, also when the DER text was refused; 0 for a null key or bad handle
   */
  public static native int setNativePublicKeyAppDER(int handle, String der);

  /**
   * Application key from the hex of a 20-byte key-blob header followed by the key bytes, least
   * significant first; the reversed bytes are read as DER (white space in the hex is skipped,
   * other non-hex characters count as 0). A blob whose bytes do not form the DER of
   * {@link #setNativeAppPlat} (or hold a modulus over 2240 bits) clears the key; read by no output.
   *
   * @return 1 once the text was read, also when the key it holds is refused (the key is then
   *     cleared); 0 for a null text or a bad handle
   */
  public static native int setNativePublicKeyAppBlob(int handle, String blobHex);

  /**
   * As {@code setNativeEncryPlat(handle, hex, false)}: stored unchecked. A modulus over 2240
   * bits (560 hex digits), with a non-hex character or too short makes the next
   * {@link #getNativePinContent} return null with "Adding PKCS1 padding failed!".
   *
   * @return 1 stored, also for such a modulus; 0 for a null key or bad handle
   */
  public static native int setNativePublicKeyModulus(int handle, String hex);

  /**
   * As {@code setNativeEncryPlat(handle, der, true)}. A refused DER text (another exponent, a
   * {@code SubjectPublicKeyInfo}, a modulus over 2240 bits, a non-hex character) clears the key:
   * the next {@link #getNativePinContent} returns null with "The encryption platform modulus is
   * missing!".
   *
   * @return 1, also when the DER text was refused; 0 for a null key or bad handle
   */
  public static native int setNativePublicKeyDER(int handle, String der);

  /**
   * Encryption key from a key blob, read as {@link #setNativePublicKeyAppBlob} reads it. A
   * refused blob clears the key: the next {@link #getNativePinContent} returns null with "The
   * encryption platform modulus is missing!".
   *
   * @return 1 / 0 as {@link #setNativePublicKeyAppBlob}, 1 also for a refused blob
   */
  public static native int setNativePublicKeyBlob(int handle, String blobHex);

  /** Stores an elliptic-curve public key "x,y" (kept only). @return 1 stored; 0 when x or y is null */
  public static native int setNativePublicKeyECC(int handle, String x, String y);

  /**
   * The accepts pattern: after every key the whole text must match it or the character is
   * dropped. Required: with no pattern no character can be typed. Example: {@code "[:alnum:]*"};
   * POSIX classes are written without the outer brackets, e.g. {@code "[:digit:]{0,6}"}.
   * Back-references are written {@code \g1} or {@code \k<1>}; {@code \1} is the digit 1.
   *
   * <p>Cost: a pattern without back-references is decided exactly on every key in time bounded
   * by the pattern's weight times the text length: there is no step limit and no refusal of a
   * text the pattern accepts. The weight counts each pattern element once per loop around it
   * plus one, a repeated single character or class with a choice of lengths ({@code [a-z]{0,16}})
   * as 4, and a counted repetition of a group as that many copies of the group. A pattern
   * weighing more than 2048 (such as {@code (a|b){0,80000}}, or 30 nested loops) is refused:
   * it never matches, so no character can be typed. A pattern with back-references is searched
   * with a limit of 1,000,000 steps (one per pattern instruction executed or alternative
   * resumed) per key; a key whose check reaches the limit counts as not matching: the character
   * is dropped, as is every later key while the limit is reached, and {@link #getNativeVerify}
   * returns -3.
   */
  public static native void setNativeAccepts(int handle, String pattern);

  /** Minimum length for {@link #getNativeVerify}; negative values are ignored. */
  public static native void setNativeMinLength(int handle, short n);

  /** Maximum number of characters keys may add (starts at 0: set it); negative values are ignored. */
  public static native void setNativeMaxLength(int handle, short n);

  /** Shuffle each key row when the layout is next built (the next surface creation after a done key, or the first). */
  public static native void setNativeKbdRandom(int handle, boolean on);

  /** Accepted and ignored: vibration is left to the app. */
  public static native void setNativeKbdVibrator(int handle, int value);

  /** {@link #KBD_FULL}, {@link #KBD_PAD_WITH_POINT} or {@link #KBD_PAD_DIGITS}; takes effect at once. */
  public static native void setNativeKbdType(int handle, short type);

  /**
   * {@link #STYLE_LOWER}, {@link #STYLE_UPPER}, {@link #STYLE_SYMBOLS} or {@link #STYLE_SYMBOLS_2}:
   * shift at once, the page at the next layout build.
   */
  public static native void setNativeKbdStyle(int handle, short style);

  /** Non-zero: never show the held character key or its balloon (function keys still react). */
  public static native void setNativeKbdMode(int handle, short mode);

  /**
   * The challenge code for {@link #getNativeEncryptedPinCode}: its bytes up to the first zero byte
   * or the end of the array. Ignored when null, empty or starting with a zero byte.
   */
  public static native void setNativeChallengeCode(int handle, byte[] code);

  /** Keyboard factor text ("0", "1", or a kind character followed by the factor); stored only. */
  public static native void setNativeKbdFactor(int handle, String text);

  /** Required classes for {@link #getNativeVerify}: {@link #REQUIRE_DIGIT} | {@link #REQUIRE_LETTER} | {@link #REQUIRE_PUNCTUATION}. */
  public static native void setNativeContentType(int handle, int type);

  /** Session mode: 0, 1 (default) or 4; other values are ignored. */
  public static native void setNativeMode(int handle, short mode);

  /** Algorithm code (default "000"); an empty text is ignored. Stored only. */
  public static native void setNativeAlgorithmCode(int handle, String text);

  /**
   * Salt for the content outputs: "1:&lt;salt&gt;" sends 16 hex digits of a salted MD5 instead of
   * the text, "2:&lt;salt&gt;" all 32. Other texts are ignored.
   */
  public static native void setNativeHashRandom(int handle, String text);

  /** Comma-separated list of forbidden passwords for {@link #getNativeVerify} (-5). */
  public static native void setNativeDictionaryFilter(int handle, String text);

  /** Show the key balloon on the keyboard surface (default on). */
  public static native void setNativePopMode(int handle, boolean on);

  /**
   * 1: the switch key opens the digits-only pad, whose second function key returns to the full
   * keyboard; 0 (or any other value): the switch key toggles letters and symbols.
   */
  public static native void setNativeSwitchMode(int handle, short mode);

  /** 0: the done key makes the next surface creation rebuild (and reshuffle) the layout; 1: keep it. Others: 0. */
  public static native void setNativeFinishMode(int handle, short mode);
}
