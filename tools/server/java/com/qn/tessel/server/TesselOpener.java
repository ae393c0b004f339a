package com.qn.tessel.server;

import java.security.PrivateKey;
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
 * <p>An opener is immutable and thread-safe: build one per key set at start-up and share it.
 * <pre>{@code
 * TesselOpener opener = TesselOpener.builder().appKey(appKey).encKey(encKey).build();
 * Opened out = opener.open(47, outputFromDevice);
 * boolean good = PasswordCheck.matches(out, storedPassword, "1:" + salt);
 * }</pre>
 */
public final class TesselOpener {
  private static final byte[] SIMPLE_BLOB_HEADER = {1, 2, 0, 0, 1, 0x68, 0, 0, 0, (byte) 0xA4, 0, 0};

  private final PrivateKey app;
  private final PrivateKey enc;
  private final byte[] pinKey;

  private TesselOpener(Builder b) {
    this.app = b.app;
    this.enc = b.enc;
    this.pinKey = b.pinKey == null ? null : b.pinKey.clone();
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

    /**
     * The application-platform private key: opens envelopes and the bare types 56 and 73.
     *
     * @param key an RSA private key
     * @return this builder
     */
    public Builder appKey(PrivateKey key) {
      this.app = key;
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
      this.enc = key;
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
     * @param masterHex the master key, 32 hex digits
     * @param wrappedWorkingKeyHex A, 32 hex digits
     * @param wrappedPinKeyHex B, 32 hex digits
     * @return this builder
     * @throws OpenException.BadEncoding when a key is not 32 hex digits
     */
    public Builder pinKey(String masterHex, String wrappedWorkingKeyHex, String wrappedPinKeyHex)
        throws OpenException.BadEncoding {
      byte[] master = hex32(masterHex, "master key");
      byte[] a = hex32(wrappedWorkingKeyHex, "wrapped working key");
      byte[] b = hex32(wrappedPinKeyHex, "wrapped PIN key");
      byte[] working = Bytes.tdesDecrypt(master, a);
      byte[] pin = Bytes.tdesDecrypt(working, b);
      try {
        return pinKey(pin);
      } finally {
        Bytes.wipe(master, a, b, working, pin);
      }
    }

    private static byte[] hex32(String hex, String what) throws OpenException.BadEncoding {
      if (hex == null || hex.length() != 32) throw new OpenException.BadEncoding(what + " must be 32 hex digits");
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
   * @throws OpenException on bad base64, a wrong header or a truncated envelope
   */
  public static Layout layout(String base64) throws OpenException {
    byte[] raw = Bytes.fromBase64(base64, "envelope");
    try {
      return checkLayout(raw);
    } finally {
      Bytes.wipe(raw);
    }
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

  /** The envelope's content bytes; the caller wipes them. */
  private static byte[] openEnvelope(String base64, PrivateKey key, int drop) throws OpenException {
    byte[] raw = Bytes.fromBase64(base64, "envelope");
    byte[] wrappedKey = null;
    byte[] rc4Key = null;
    byte[] sealed = null;
    try {
      Layout layout = checkLayout(raw);
      final int size = Bytes.keySize(key);
      if (size >= 0 && layout.rsaLength() != size) {
        throw new OpenException.WrongKey("envelope key is wrapped for a " + layout.rsaLength() * 8
            + "-bit key, the private key has " + size * 8 + " bits (foreign envelope?)");
      }
      wrappedKey = Arrays.copyOfRange(raw, 20, 20 + layout.rsaLength());
      Bytes.reverse(wrappedKey);  // stored least significant byte first
      rc4Key = Bytes.rsa(key, "PKCS1Padding", wrappedKey);
      if (rc4Key.length != 16) throw new OpenException.WrongKey("envelope key is " + rc4Key.length + " bytes, expected 16");
      final int from = 8 + layout.keyBlobLength() + 8;
      sealed = Arrays.copyOfRange(raw, from, from + layout.contentLength());
      return Bytes.rc4(rc4Key, drop, sealed);
    } finally {
      Bytes.wipe(raw, wrappedKey, rc4Key, sealed);
    }
  }

  /**
   * Opens one output of the device library.
   *
   * @param type the encryption type the output was made with (48 for getNativeContent, 47 for
   *     getNativePinContent)
   * @param output the text the device returned
   * @return the opened fields
   * @throws OpenException when the output is corrupt, truncated, foreign or of another type
   * @throws IllegalArgumentException when the type produces no output
   * @throws IllegalStateException when a key the type needs was not given to the builder
   */
  public Opened open(int type, String output) throws OpenException {
    final Types.Kind t = Types.of(type);
    switch (t.outer) {
      case NONE:
        throw new IllegalArgumentException("encryption type " + type + " produces no output");
      case DIRECT_ENC:
        return Payloads.open(type, t.inner, output, need(enc, type, "encryption"), pinKey, false, (char) 0, "", "");
      case DIRECT_APP:
        return Payloads.open(type, t.inner, output, need(app, type, "application"), pinKey, false, (char) 0, "", "");
      default:
        break;
    }
    byte[] content = openEnvelope(output, need(app, type, "application"), drop(type));
    try {
      if (t.outer == Types.Outer.BARE_ENVELOPE) {
        return new Opened(type, false, (char) 0, "", "", Bytes.text(content, 0, content.length));
      }
      // Hex and base64 payloads hold no ':', so a ':' in the timestamp is found by splitting at the
      // last one; a text payload may hold ':' itself and is split at the first.
      final boolean textPayload = t.inner == Types.Inner.TEXT || t.inner == Types.Inner.HASHED;
      int colon = -1;
      for (int k = 1; k < content.length; ++k) {
        if (content[k] == ':') {
          colon = k;
          if (textPayload) break;
        }
      }
      if (content.length < 2) throw new OpenException.WrongType("wrapped content too short");
      if (colon < 0) throw new OpenException.WrongType("wrapped content has no ':' after the timestamp");
      final char letter = (char) content[0];
      if ("EWMSTR".indexOf(letter) < 0) {
        throw new OpenException.WrongType("wrapped content does not start with a strength letter");
      }
      final String timestamp = Bytes.text(content, 1, colon);
      final String payload = Bytes.text(content, colon + 1, content.length);
      if (textPayload) return new Opened(type, true, letter, timestamp, payload, payload);
      return Payloads.open(type, t.inner, payload, enc, pinKey, true, letter, timestamp, payload);
    } finally {
      Bytes.wipe(content);
    }
  }

  private static PrivateKey need(PrivateKey key, int type, String which) {
    if (key == null) throw new IllegalStateException("type " + type + " needs the " + which + "-platform key");
    return key;
  }
}
