package com.qn.tessel.server;

import java.security.GeneralSecurityException;

/**
 * An output of the keyboard library could not be opened.
 *
 * <p>Two kinds of failure exist. Those decided by the bytes the client sent alone, before any
 * private-key operation ({@link TooLong}, {@link BadEncoding}, {@link WrongHeader},
 * {@link Truncated}, {@link WrongKey}), have their own subclasses and messages: they tell an
 * attacker nothing the attacker did not already know. Everything from the first private-key
 * operation on (RSA padding, key length, the opened content's layout, the type, the timestamp,
 * the password) is one answer, {@link Rejected}, so that a forged envelope looks exactly like a
 * wrong password. Never send more than "rejected" to a client.
 */
public class OpenException extends GeneralSecurityException {
  private static final long serialVersionUID = 1L;

  OpenException(String message) {
    super(message);
  }

  /** The output is longer than {@value TesselOpener#MAX_OUTPUT} bytes; nothing was decoded. */
  public static final class TooLong extends OpenException {
    private static final long serialVersionUID = 1L;

    TooLong() {
      super("output longer than " + TesselOpener.MAX_OUTPUT + " bytes");
    }
  }

  /** The text is not canonical base64 or hexadecimal where the layout needs it. */
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

  /** An RSA value is not as long as the private key's modulus: sealed for another key. */
  public static final class WrongKey extends OpenException {
    private static final long serialVersionUID = 1L;

    WrongKey(String message) {
      super(message);
    }
  }

  /**
   * The one answer after the private-key operation: "output rejected". It never has a cause or a
   * stack trace (either would tell which check failed, or take a different time to build).
   */
  public static final class Rejected extends OpenException {
    private static final long serialVersionUID = 1L;
    static final String MESSAGE = "output rejected";

    Rejected() {
      super(MESSAGE);
    }

    /** Nothing to fill: every rejection is thrown from the same place. */
    @Override
    public synchronized Throwable fillInStackTrace() {
      return this;
    }

    /** A rejection keeps no cause. */
    @Override
    public synchronized Throwable initCause(Throwable cause) {
      return this;
    }
  }
}
