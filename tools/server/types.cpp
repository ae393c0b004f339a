// The type table (see types.h).
#include "server/types.h"

namespace tessel::server {

std::size_t envelopeDrop(int type) {
  if (type == 1 || type == 33) return 625;
  if (type == 88) return 768;
  return 512;
}

bool payloadIsEncoded(Inner inner, bool saltedHash) {
  return !(inner == Inner::Text || (inner == Inner::Hashed && !saltedHash));
}

TypeLayout typeLayout(int type) {
  TypeLayout t;
  t.drop = envelopeDrop(type);
  auto set = [&](Outer outer, Inner inner) {
    t.outer = outer;
    t.inner = inner;
  };
  const Outer w = Outer::WrappedEnvelope;
  switch (type) {
    case 2: case 20: case 27: case 81: case 33: set(w, Inner::KeyouHex); break;
    case 12: case 42: set(w, Inner::KeyouBase64); break;
    case 10: case 28: case 36: case 40: case 50: case 74: case 82: case 86: set(w, Inner::Pkcs1Hex); break;
    case 8: case 51: set(w, Inner::PairPkcs1Hex); break;
    case 46: set(w, Inner::PairPkcs1Base64); break;
    case 5: set(w, Inner::Type5); break;
    case 19: set(w, Inner::Type19); break;
    case 38: set(w, Inner::Type38); break;
    case 68: set(w, Inner::Type68); break;
    case 47: case 55: set(w, Inner::HashedRsa); break;
    case 48: case 59: set(w, Inner::Hashed); break;
    case 88: set(Outer::BareEnvelope, Inner::Text); break;
    case 3: set(Outer::DirectWithEnc, Inner::KeyouBase64); break;
    case 4: set(Outer::DirectWithEnc, Inner::PairPkcs1Base64); break;
    case 22: set(Outer::DirectWithEnc, Inner::PairPkcs1Hex); break;
    case 29: set(Outer::DirectWithEnc, Inner::KeyouHex); break;
    case 30: set(Outer::DirectWithEnc, Inner::Pkcs1Hex); break;
    case 56: set(Outer::DirectWithApp, Inner::Pkcs1Hex); break;
    case 73: set(Outer::DirectWithApp, Inner::Pkcs1Base64); break;
    case 21: case 65: case 69: case 76: case 77: case 78: case 79: case 83: break;
    default:
      if (type >= 0 && type <= 90) set(w, Inner::Text);
      break;
  }
  return t;
}

}  // namespace tessel::server
