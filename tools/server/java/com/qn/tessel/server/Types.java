package com.qn.tessel.server;

/** What each encryption type returns: the outer form and the payload inside it. */
final class Types {
  private Types() {}

  enum Outer { NONE, WRAPPED_ENVELOPE, BARE_ENVELOPE, DIRECT_ENC, DIRECT_APP }

  enum Inner {
    NONE, TEXT, KEYOU_HEX, KEYOU_BASE64, PKCS1_HEX, PKCS1_BASE64, PAIR_PKCS1_HEX, PAIR_PKCS1_BASE64,
    TYPE5, TYPE19, TYPE38, TYPE68, HASHED, HASHED_RSA
  }

  static final class Kind {
    final Outer outer;
    final Inner inner;

    Kind(Outer outer, Inner inner) {
      this.outer = outer;
      this.inner = inner;
    }
  }

  private static Kind wrapped(Inner inner) {
    return new Kind(Outer.WRAPPED_ENVELOPE, inner);
  }

  static Kind of(int type) {
    switch (type) {
      case 2: case 20: case 27: case 81: case 33:
        return wrapped(Inner.KEYOU_HEX);
      case 12: case 42:
        return wrapped(Inner.KEYOU_BASE64);
      case 10: case 28: case 36: case 40: case 50: case 74: case 82: case 86:
        return wrapped(Inner.PKCS1_HEX);
      case 8: case 51:
        return wrapped(Inner.PAIR_PKCS1_HEX);
      case 46:
        return wrapped(Inner.PAIR_PKCS1_BASE64);
      case 5:
        return wrapped(Inner.TYPE5);
      case 19:
        return wrapped(Inner.TYPE19);
      case 38:
        return wrapped(Inner.TYPE38);
      case 68:
        return wrapped(Inner.TYPE68);
      case 47: case 55:
        return wrapped(Inner.HASHED_RSA);
      case 48: case 59:
        return wrapped(Inner.HASHED);
      case 88:
        return new Kind(Outer.BARE_ENVELOPE, Inner.TEXT);
      case 3:
        return new Kind(Outer.DIRECT_ENC, Inner.KEYOU_BASE64);
      case 4:
        return new Kind(Outer.DIRECT_ENC, Inner.PAIR_PKCS1_BASE64);
      case 22:
        return new Kind(Outer.DIRECT_ENC, Inner.PAIR_PKCS1_HEX);
      case 29:
        return new Kind(Outer.DIRECT_ENC, Inner.KEYOU_HEX);
      case 30:
        return new Kind(Outer.DIRECT_ENC, Inner.PKCS1_HEX);
      case 56:
        return new Kind(Outer.DIRECT_APP, Inner.PKCS1_HEX);
      case 73:
        return new Kind(Outer.DIRECT_APP, Inner.PKCS1_BASE64);
      case 21: case 65: case 69: case 76: case 77: case 78: case 79: case 83:
        return new Kind(Outer.NONE, Inner.NONE);
      default:
        return type >= 0 && type <= 90 ? wrapped(Inner.TEXT) : new Kind(Outer.NONE, Inner.NONE);
    }
  }
}
