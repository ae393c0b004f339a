// What each encryption type returns: the outer form (an envelope with a wrapped content, a bare
// envelope, or a bare RSA value under one of the two keys) and the payload inside it.
//
//   wrapped content = strength letter | timestamp | ":" | payload
//   "Keyou" block = two ASCII digits of the message length | message | random filler (no 00 02)
//   length-prefixed pair = "%02d"(timestamp length) timestamp "%02d"(text length) text
#pragma once

#include <cstddef>

namespace tessel::server {

enum class Outer { Unknown, WrappedEnvelope, BareEnvelope, DirectWithEnc, DirectWithApp };
enum class Inner {
  None, Text, KeyouHex, KeyouBase64, Pkcs1Hex, Pkcs1Base64, PairPkcs1Hex, PairPkcs1Base64,
  Type5, Type19, Type38, Type68, Hashed, HashedRsa
};
struct TypeLayout {
  Outer outer = Outer::Unknown;
  Inner inner = Inner::None;
  std::size_t drop = 512;  // keystream bytes dropped before the envelope's content
};

// Types 0..90; Outer::Unknown for the ones that produce no output and for anything else.
TypeLayout typeLayout(int type);
// Keystream bytes dropped before the content: 625 for types 1 and 33, 768 for 88, else 512.
std::size_t envelopeDrop(int type);
// Whether the payload is hex or base64 (split at the last ':') rather than plain text (first ':').
bool payloadIsEncoded(Inner inner, bool saltedHash);

}  // namespace tessel::server
