package com.qn.tessel.server;

import java.security.GeneralSecurityException;

/**
 * An output of the keyboard library could not be opened. Each reason has its own subclass, so a
 * service can answer them differently (a corrupt upload, a stale client, a misconfigured key).
 * Messages name the layout field that failed and never carry any opened byte.
 */
public class OpenException extends GeneralSecurityException {
  private static final long serialVersionUID = 1L;

  OpenException(String message) {
    super(message);
  }

  /** The text is not valid base64 or hexadecimal where the layout needs it. */
  public static final class BadEncoding extends OpenException {
    private static final long serialVersionUID = 1L;

    BadEncoding(String message) {
      super(message);
    }
  }

  /** The envelope does not start with its length field and RC4 key header. */
  public static final class WrongHeader extends OpenException {
    private static final long serialVersionUID = 1L;

    WrongHeader(String message) {
      super(message);
    }
  }

  /** The envelope's length fields disagree with its size: cut short or followed by extra bytes. */
  public static final class Truncated extends OpenException {
    private static final long serialVersionUID = 1L;

    Truncated(String message) {
      super(message);
    }
  }

  /** A private key does not open the RSA value: another key's size, or its padding fails. */
  public static final class WrongKey extends OpenException {
    private static final long serialVersionUID = 1L;

    WrongKey(String message) {
      super(message);
    }
  }

  /** What the envelope holds is not laid out as the encryption type says. */
  public static final class WrongType extends OpenException {
    private static final long serialVersionUID = 1L;

    WrongType(String message) {
      super(message);
    }
  }
}
