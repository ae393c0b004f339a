package com.qn.tessel.server;

import java.nio.charset.StandardCharsets;
import java.security.PrivateKey;
import java.security.interfaces.RSAKey;
import java.util.Arrays;

/**
 * Opens what the keyboard library hands the app for the bank's server: the digital envelope of
 * every encryption type 0..90 (strength letter, timestamp, payload) and the RSA payloads inside
 * it, or the bare RSA value of the types without an envelope.
 *
 * <p>The layout it reads, with k the RSA modulus bytes and L the content bytes:
 * <pre>
 * envelope = base64( "%08d"(k+12) | 01 02 00 00 01 68 00 00 00 A4 00 00 |
 *                    RSA-PKCS#1(16-byte RC4 key), least significant byte first |
 *                    "%08d"(L) | RC4(key, after dropping 512, 625 or 768 bytes)(content) )
 * content  = strength letter | timestamp | ":" | payload
 * </pre>
 *
 * <p>Answers: an output longer than {@value #MAX_OUTPUT} bytes, bad base64 or hex, a wrong
 * header, wrong lengths or an RSA value of another key's size are refused with their own
 * {@link OpenException} subclasses (they depend only on what the client sent). Every failure
 * from the private-key operation on is {@link OpenException.Rejected}, "output rejected": a bad
 * RSA padding continues with a synthetic key (see {@code Rsa}), so it fails where a wrong
 * content layout, another type or a stale timestamp fails, in the same time. A bare envelope
 * (type 88) has no layout to fail: a forged one opens to noise, as under any wrong key; so do
 * the payloads without structure (PKCS#1 text, "Keyou" blocks). Check the password, and give
 * the expected timestamp, to refuse them.
 *
 * <p>The wrapper is split right after the expected timestamp when one is given
 * ({@link Options#expectedTimestamp}: freshness; replay protection needs the caller's own cache of
 * timestamps seen). Without it, hex and base64 payloads (the RSA types, and 48/59 with
 * {@link Options#saltedHash}) are split at the last ':', plain text at the first.
 *
 * <p>An opener is immutable and thread-safe: build one per key set at start-up and share it.
 * <pre>{@code
 * TesselOpener opener = TesselOpener.builder().appKey(appKey).encKey(encKey).build();
 * try (Opened out = opener.open(47, outputFromDevice, new TesselOpener.Options(true, challenge))) {
 *   boolean good = PasswordCheck.matches(out, storedPassword, "1:" + salt);
 * } catch (OpenException e) {
 *   reject();  // never send the reason to the client
 * }
 * }</pre>
 */
public final class TesselOpener {
  /** The longest output accepted, in bytes; longer ones are refused before any decoding. */
  public static final int MAX_OUTPUT = 65536;
  private static final byte[] SIMPLE_BLOB_HEADER = {1, 2, 0, 0, 1, 0x68, 0, 0, 0, (byte) 0xA4, 0, 0};
  private static final String LETTERS = "EWMSTR";

  private final Rsa app;
  private final Rsa enc;
  private final byte[] pinKey;

  private TesselOpener(Builder b) {
    this.app = b.app == null ? null : new Rsa(b.app);
    this.enc = b.enc == null ? null : new Rsa(b.enc);
    this.pinKey = b.pinKey == null ? null : b.pinKey.clone();
  }

  /**
   * How to read an output.
   *
   * @param saltedHash the app set a hash salt (setNativeHashRandom), so types 48 and 59 carry the
   *     salted-hash hex (split at the last ':') rather than the text
   * @param expectedTimestamp the timestamp the server issued for this output, or null: given, the
   *     wrapper (and a length-prefixed pair) must carry exactly it, else the output is rejected
   */
  public record Options(boolean saltedHash, String expectedTimestamp) {
    /** No salt, no expected timestamp. */
    public static final Options DEFAULT = new Options(false, null);
  }

  /** @return a builder without keys */
  public static Builder builder() {
    return new Builder();
  }

  /** Collects the keys of one opener. */
  public static final class Builder {
    private PrivateKey app;
    private PrivateKey enc;
    private byte[] pinKey;

    private Builder() {}

    private static PrivateKey rsa(PrivateKey key) {
      if (!(key instanceof RSAKey)) throw new IllegalArgumentException("an RSA private key with a readable modulus");
      return key;
    }

    /**
     * The application-platform private key: opens envelopes and the bare types 56 and 73.
     *
     * @param key an RSA private key
     * @return this builder
     */
    public Builder appKey(PrivateKey key) {
      this.app = rsa(key);
      return this;
    }

    /**
     * The encryption-platform private key: opens RSA payloads and the bare types 3, 4, 22, 29, 30.
     * Without it those payloads stay sealed.
     *
     * @param key an RSA private key
     * @return this builder
     */
    public Builder encKey(PrivateKey key) {
      this.enc = rsa(key);
      return this;
    }

    /**
     * The 16-byte PIN key that opens type 68 PIN blocks (copied; wipe yours).
     *
     * @param key 16 bytes, K1 then K2
     * @return this builder
     */
    public Builder pinKey(byte[] key) {
      if (key == null || key.length != 16) throw new IllegalArgumentException("the PIN key is 16 bytes");
      Bytes.wipe(this.pinKey);
      this.pinKey = key.clone();
      return this;
    }

    /**
     * Derives the type 68 PIN key from the master key and the two wrapped keys the app was given:
     * the working key is A decrypted under the master key, the PIN key B decrypted under it.
     *
     * @param masterHex the master key, 32 hex digits (wipe yours)
     * @param wrappedWorkingKeyHex A, 32 hex digits
     * @param wrappedPinKeyHex B, 32 hex digits
     * @return this builder
     * @throws OpenException.BadEncoding when a key is not 32 hex digits
     */
    public Builder pinKey(char[] masterHex, String wrappedWorkingKeyHex, String wrappedPinKeyHex)
        throws OpenException.BadEncoding {
      byte[] masterText = masterHex == null ? new byte[0] : Bytes.latin1(masterHex);
      byte[] master = null;
      byte[] a = null;
      byte[] b = null;
      byte[] working = null;
      byte[] pin = null;
      try {
        master = hex32(masterText, "master key");
        a = hex32(wrappedWorkingKeyHex == null ? new byte[0] : Bytes.latin1(wrappedWorkingKeyHex), "wrapped working key");
        b = hex32(wrappedPinKeyHex == null ? new byte[0] : Bytes.latin1(wrappedPinKeyHex), "wrapped PIN key");
        working = Bytes.tdesDecrypt(master, a);
        pin = Bytes.tdesDecrypt(working, b);
        return pinKey(pin);
      } finally {
        Bytes.wipe(masterText, master, a, b, working, pin);
      }
    }

    private static byte[] hex32(byte[] hex, String what) throws OpenException.BadEncoding {
      if (hex.length != 32) throw new OpenException.BadEncoding(what + " must be 32 hex digits");
      return Bytes.fromHex(hex, what);
    }

    /** @return an opener holding these keys */
    public TesselOpener build() {
      return new TesselOpener(this);
    }
  }

  /**
   * Keystream bytes dropped before the content.
   *
   * @param type encryption type
   * @return 625 for types 1 and 33, 768 for 88, else 512
   */
  public static int drop(int type) {
    return type == 1 || type == 33 ? 625 : type == 88 ? 768 : 512;
  }

  /**
   * The field lengths of an envelope, read without a key.
   *
   * @param keyBlobLength the first length field, k + 12
   * @param rsaLength k
   * @param contentLength L
   * @param totalLength decoded bytes, k + L + 28
   */
  public record Layout(int keyBlobLength, int rsaLength, int contentLength, int totalLength) {}

  /**
   * Decodes an envelope and checks its layout: digits, header, lengths, nothing after the content.
   *
   * @param base64 the envelope as the device returned it
   * @return its field lengths
   * @throws OpenException when too long, on bad base64, a wrong header or a truncated envelope
   */
  public static Layout layout(String base64) throws OpenException {
    byte[] raw = Bytes.fromBase64(capped(base64), "envelope");
    try {
      return checkLayout(raw);
    } finally {
      Bytes.wipe(raw);
    }
  }

  private static byte[] capped(String output) throws OpenException.TooLong {
    if (output.length() > MAX_OUTPUT) throw new OpenException.TooLong();
    return Bytes.latin1(output);
  }

  private static int decimal8(byte[] raw, int at) {
    int v = 0;
    for (int k = at; k < at + 8; ++k) {
      if (raw[k] < '0' || raw[k] > '9') return -1;
      v = v * 10 + (raw[k] - '0');
    }
    return v;
  }

  private static Layout checkLayout(byte[] raw) throws OpenException {
    if (raw.length < 20) throw new OpenException.Truncated("envelope truncated: " + raw.length + " bytes");
    final int blob = decimal8(raw, 0);
    if (blob < 0) throw new OpenException.WrongHeader("envelope does not start with an 8-digit key length");
    if (blob < 13) throw new OpenException.WrongHeader("envelope key length field " + blob + " is too small");
    if (!Arrays.equals(raw, 8, 20, SIMPLE_BLOB_HEADER, 0, 12)) {
      throw new OpenException.WrongHeader("envelope key header is not an RC4 SIMPLEBLOB wrapped with RSA");
    }
    if ((long) raw.length < 8L + blob + 8) {
      throw new OpenException.Truncated("envelope truncated inside the wrapped key (" + raw.length + " bytes)");
    }
    final int length = decimal8(raw, 8 + blob);
    if (length < 0) throw new OpenException.WrongHeader("envelope content length field is not 8 digits");
    final long expected = 8L + blob + 8 + length;
    if (raw.length < expected) {
      throw new OpenException.Truncated("envelope truncated: " + raw.length + " of " + expected + " bytes");
    }
    if (raw.length > expected) {
      throw new OpenException.Truncated("envelope has " + (raw.length - expected) + " bytes after its content");
    }
    return new Layout(blob, blob - 12, length, raw.length);
  }

  /**
   * Opens one output of the device library without a salt or an expected timestamp.
   *
   * @param type the encryption type the output was made with (48 for getNativeContent, 47 for
   *     getNativePinContent)
   * @param output the text the device returned
   * @return the opened fields
   * @throws OpenException when the output is refused (see the class comment)
   * @throws IllegalArgumentException when the type produces no output
   * @throws IllegalStateException when a key the type needs was not given to the builder
   */
  public Opened open(int type, String output) throws OpenException {
    return open(type, output, Options.DEFAULT);
  }

  /**
   * Opens one output of the device library.
   *
   * @param type the encryption type the output was made with
   * @param output the text the device returned
   * @param options the salt flag and the expected timestamp
   * @return the opened fields
   * @throws OpenException when the output is refused (see the class comment)
   * @throws IllegalArgumentException when the type produces no output, or an expected timestamp
   *     is given for a type that carries none (3, 29, 30, 56, 73, 88)
   * @throws IllegalStateException when a key the type needs was not given to the builder
   */
  public Opened open(int type, String output, Options options) throws OpenException {
    final Types.Kind t = Types.of(type);
    if (t.outer() == Types.Outer.NONE) throw new IllegalArgumentException("encryption type " + type + " produces no output");
    final byte[] expected = options.expectedTimestamp() == null ? null
        : options.expectedTimestamp().getBytes(StandardCharsets.ISO_8859_1);
    if (expected != null && !t.hasTimestamp()) throw new IllegalArgumentException("type " + type + " carries no timestamp");
    final byte[] text = capped(output);
    final Opened opened = switch (t.outer()) {
      case DIRECT_ENC, DIRECT_APP -> {
        final Rsa key = t.outer() == Types.Outer.DIRECT_ENC ? need(enc, type, "encryption") : need(app, type, "application");
        Payloads.Result r = Payloads.open(new Payloads.Request(t.inner(), text, key, pinKey, expected, true));
        yield accept(r.valid(), new Opened(type, null, latin1(r.timestamp()), null, r.content()), r.timestamp());
      }
      default -> openEnvelope(type, t, text, expected, options.saltedHash());
    };
    if (opened == null) throw new OpenException.Rejected();  // the one place, one frame from the caller
    return opened;
  }

  private Opened openEnvelope(int type, Types.Kind t, byte[] text, byte[] expected, boolean saltedHash)
      throws OpenException {
    final Rsa key = need(app, type, "application");
    byte[] raw = Bytes.fromBase64(text, "envelope");
    byte[] wrappedKey = null;
    byte[] rc4Key = null;
    byte[] sealed = null;
    byte[] content = null;
    try {
      final Layout layout = checkLayout(raw);
      if (layout.rsaLength() != key.size) {
        throw new OpenException.WrongKey("envelope key is wrapped for a " + layout.rsaLength() * 8
            + "-bit key, the private key has " + key.size * 8 + " bits (foreign envelope?)");
      }
      wrappedKey = Arrays.copyOfRange(raw, 20, 20 + layout.rsaLength());
      Bytes.reverse(wrappedKey);  // stored least significant byte first
      rc4Key = key.pkcs1(wrappedKey, 16);
      final int from = 8 + layout.keyBlobLength() + 8;
      sealed = Arrays.copyOfRange(raw, from, from + layout.contentLength());
      content = Bytes.rc4(rc4Key, drop(type), sealed);
      if (t.outer() == Types.Outer.BARE_ENVELOPE) return new Opened(type, null, null, null, content.clone());
      return openWrapped(type, t.inner(), content, expected, saltedHash);
    } finally {
      Bytes.wipe(raw, wrappedKey, rc4Key, sealed, content);
    }
  }

  /** "letter timestamp ':' payload", then the payload. */
  private Opened openWrapped(int type, Types.Inner inner, byte[] content, byte[] expected, boolean saltedHash)
      throws OpenException {
    final int n = content.length;
    int ok = -1;
    int letter = 0;
    for (int k = 0; k < LETTERS.length(); ++k) letter |= Bytes.zeroMask((n > 0 ? content[0] : 0) - LETTERS.charAt(k));
    ok &= letter;
    int split;
    if (expected != null) {
      final int end = 1 + expected.length;
      if (n > end) {
        ok &= Bytes.equalMask(content, 1, expected, 0, expected.length) & Bytes.zeroMask(content[end] - ':');
        split = end;
      } else {
        ok = 0;
        split = Math.min(1, n);
      }
    } else {
      final boolean atFirst = inner == Types.Inner.TEXT || (inner == Types.Inner.HASHED && !saltedHash);
      int first = 0;
      int last = 0;
      int found = 0;
      for (int k = 1; k < n; ++k) {
        final int colon = Bytes.zeroMask(content[k] - ':');
        first = Bytes.select(~found & colon, k, first);
        last = Bytes.select(colon, k, last);
        found |= colon;
      }
      ok &= found;
      split = Bytes.select(found, atFirst ? first : last, Math.min(1, n));
    }
    byte[] ts = Arrays.copyOfRange(content, Math.min(1, n), Math.max(split, Math.min(1, n)));
    byte[] payload = Arrays.copyOfRange(content, Math.min(split + 1, n), n);
    Payloads.Result r = Payloads.open(new Payloads.Request(inner, payload, enc, pinKey, ts, false));
    ok &= r.valid();
    final Character strength = (char) (n > 0 ? content[0] & 0xff : 0);
    final String timestamp = latin1(ts);
    Bytes.wipe(ts);
    return accept(ok, new Opened(type, strength, timestamp, payload, r.content()), r.timestamp());
  }

  /** The opened fields, or null (wiped) when a check failed: {@link #open} then rejects. */
  private static Opened accept(int valid, Opened opened, byte[] scratch) {
    Bytes.wipe(scratch);
    if (valid == 0) {
      opened.close();
      return null;
    }
    return opened;
  }

  private static String latin1(byte[] b) {
    return b == null ? null : Bytes.text(b, 0, b.length);
  }

  private static Rsa need(Rsa key, int type, String which) {
    if (key == null) throw new IllegalStateException("type " + type + " needs the " + which + "-platform key");
    return key;
  }
}
