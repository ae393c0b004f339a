package com.qn.tessel.server;

/** What each encryption type returns: the outer form and the payload inside it. */
final class Types {
  private Types() {}

  enum Outer { NONE, WRAPPED_ENVELOPE, BARE_ENVELOPE, DIRECT_ENC, DIRECT_APP }

  enum Inner {
    NONE, TEXT, KEYOU_HEX, KEYOU_BASE64, PKCS1_HEX, PKCS1_BASE64, PAIR_PKCS1_HEX, PAIR_PKCS1_BASE64,
    TYPE5, TYPE19, TYPE38, TYPE68, HASHED, HASHED_RSA;

    /** Whether the payload is base64 (else hex, for the RSA kinds). */
    boolean base64() {
      return this == KEYOU_BASE64 || this == PKCS1_BASE64 || this == PAIR_PKCS1_BASE64;
    }

    /** Whether the payload is the text itself rather than an RSA value. */
    boolean text() {
      return this == TEXT || this == HASHED;
    }
  }

  record Kind(Outer outer, Inner inner) {
    /** Whether the output carries a timestamp (in a wrapper or a length-prefixed pair). */
    boolean hasTimestamp() {
      return outer == Outer.WRAPPED_ENVELOPE || inner == Inner.PAIR_PKCS1_HEX || inner == Inner.PAIR_PKCS1_BASE64;
    }
  }

  private static final Kind NO_OUTPUT = new Kind(Outer.NONE, Inner.NONE);

  static Kind of(int type) {
    return switch (type) {
      case 2, 20, 27, 81, 33 -> wrapped(Inner.KEYOU_HEX);
      case 12, 42 -> wrapped(Inner.KEYOU_BASE64);
      case 10, 28, 36, 40, 50, 74, 82, 86 -> wrapped(Inner.PKCS1_HEX);
      case 8, 51 -> wrapped(Inner.PAIR_PKCS1_HEX);
      case 46 -> wrapped(Inner.PAIR_PKCS1_BASE64);
      case 5 -> wrapped(Inner.TYPE5);
      case 19 -> wrapped(Inner.TYPE19);
      case 38 -> wrapped(Inner.TYPE38);
      case 68 -> wrapped(Inner.TYPE68);
      case 47, 55 -> wrapped(Inner.HASHED_RSA);
      case 48, 59 -> wrapped(Inner.HASHED);
      case 88 -> new Kind(Outer.BARE_ENVELOPE, Inner.TEXT);
      case 3 -> new Kind(Outer.DIRECT_ENC, Inner.KEYOU_BASE64);
      case 4 -> new Kind(Outer.DIRECT_ENC, Inner.PAIR_PKCS1_BASE64);
      case 22 -> new Kind(Outer.DIRECT_ENC, Inner.PAIR_PKCS1_HEX);
      case 29 -> new Kind(Outer.DIRECT_ENC, Inner.KEYOU_HEX);
      case 30 -> new Kind(Outer.DIRECT_ENC, Inner.PKCS1_HEX);
      case 56 -> new Kind(Outer.DIRECT_APP, Inner.PKCS1_HEX);
      case 73 -> new Kind(Outer.DIRECT_APP, Inner.PKCS1_BASE64);
      case 21, 65, 69, 76, 77, 78, 79, 83 -> NO_OUTPUT;
      default -> type >= 0 && type <= 90 ? wrapped(Inner.TEXT) : NO_OUTPUT;
    };
  }

  private static Kind wrapped(Inner inner) {
    return new Kind(Outer.WRAPPED_ENVELOPE, inner);
  }
}
