package com.qn.tessel.server;

import java.util.Arrays;

/**
 * Opens getNativeEncryptedPinCode's value: base64 of the typed text RC4-encrypted under the
 * SHA-1 of the challenge code (no keystream dropped).
 */
public final class EncryptedPinCode {
  private EncryptedPinCode() {}

  /**
   * Opens an encrypted PIN code.
   *
   * @param challenge the challenge code the app passed to setNativeChallengeCode (the device
   *     reads it up to its first zero byte, and so does this method)
   * @param code the base64 text the device returned
   * @return the typed text; wipe it
   * @throws OpenException.TooLong when the code is longer than {@value TesselOpener#MAX_OUTPUT} bytes
   * @throws OpenException.BadEncoding when the code is not canonical base64
   */
  public static byte[] open(byte[] challenge, String code) throws OpenException {
    int end = 0;
    while (end < challenge.length && challenge[end] != 0) ++end;
    if (end == 0) throw new IllegalArgumentException("the challenge code is empty");
    if (code.length() > TesselOpener.MAX_OUTPUT) throw new OpenException.TooLong();
    byte[] sealed = Bytes.fromBase64(Bytes.latin1(code), "encrypted PIN code");
    byte[] used = Arrays.copyOf(challenge, end);
    byte[] key = Bytes.digest("SHA-1", used);
    try {
      return Bytes.rc4(key, 0, sealed);
    } finally {
      Bytes.wipe(sealed, used, key);
    }
  }
}
