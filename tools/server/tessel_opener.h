// Server side of the keyboard's output: opens what the device library produces. This header is
// the opener's entry point; pem_keys.h (keys), types.h (the type table), payloads.h (the
// payloads), password_check.h and encrypted_pin_code.h hold the rest.
//
// The bank's backend holds the private halves of the two RSA keys the app hands the keyboard:
// the application-platform key (it opens the digital envelope) and the encryption-platform key
// (it opens the RSA payload inside the envelope, and the outputs that are a bare RSA value).
// This library is built on OpenSSL's libcrypto only; it shares no code with the device library
// so the two check each other.
//
// Layout (k = RSA modulus bytes, L = content bytes):
//   envelope = base64( "%08d"(k+12) | 01 02 00 00 01 68 00 00 00 A4 00 00 |
//                      RSA-PKCS#1(rc4 key, 16 bytes), least significant byte first |
//                      "%08d"(L) | RC4(key, after dropping 512, 625 or 768 bytes)(content) )
//
// Answers. Errors that depend only on the bytes the client sent (an output over 65536 bytes,
// bad base64 or hex, a wrong header or length field, truncation, trailing bytes, an RSA value
// of another key's size) keep their own one-line messages. From the first private-key
// operation on, every failure (padding, key length, content layout, wrong type, inner payloads,
// a timestamp other than the expected one, a password that does not match) is one answer,
// kRejected ("output rejected"), reached through the same work: a forged envelope looks exactly
// like a wrong password. Never send a client more than "rejected"; see docs/deployment.md.
// Every function clears OpenSSL's error queue before it returns, and wipes what held plaintext.
//
// Typical use:
//
//   using namespace tessel::server;
//   PrivateKey app, enc;
//   std::string error;
//   if (!app.loadPemFile("/etc/bank/app_platform.pem", &error) ||
//       !enc.loadPemFile("/etc/bank/enc_platform.pem", &error)) { log(error); return; }
//   OpenKeys keys;
//   keys.app = &app;
//   keys.enc = &enc;                        // optional: without it the payload stays sealed
//   keys.expectedTimestamp = challenge;     // the timestamp this server issued
//   Opened out;
//   if (!openOutput(47, outputFromDevice, keys, &out, &error) ||
//       !matchesPassword(47, out, storedPassword, salt, 'S')) { reply("rejected"); return; }
#pragma once

#include <cstddef>
#include <string>

#include "server/pem_keys.h"
#include "server/types.h"

namespace tessel::server {

struct EnvelopeLayout {
  std::size_t keyBlobLength = 0;   // the first "%08d" field: k + 12
  std::size_t rsaLength = 0;       // k
  std::size_t contentLength = 0;   // L
  std::size_t totalLength = 0;     // decoded bytes: k + L + 28
};

// Decodes and checks the layout only (no key needed): digits, header, lengths, nothing after.
bool parseEnvelope(const std::string& base64, EnvelopeLayout* layout, std::string* error);

// Full opening: layout, key unwrap with `key` (its size must equal k), RC4 after `drop` bytes.
// A wrapped key that does not unpad to 16 bytes gives a synthetic key (implicit rejection), so
// this succeeds with content that no later check accepts.
bool openEnvelope(const std::string& base64, const PrivateKey& key, std::size_t drop,
                  std::string* content, std::string* error);

// Splits "letter timestamp ':' payload" (letter one of E W M S T R). With an expected timestamp
// the content must start with letter, that timestamp and ':', and the payload is everything after
// it. Without one, hex and base64 payloads (atLastColon) are split at the last ':', so the
// timestamp may contain any; plain-text payloads at the first ':' after the letter, so apps that
// send plain text need a timestamp without ':' (or the server passes the timestamp it expects).
// Failure: kRejected.
struct Wrapped {
  char strength = 0;
  std::string timestamp;
  std::string payload;
};
bool splitWrapped(const std::string& content, Wrapped* out, std::string* error, bool atLastColon = false,
                  const std::string& expectedTimestamp = std::string());

struct OpenKeys {
  const PrivateKey* app = nullptr;   // envelope types and 56, 73
  const PrivateKey* enc = nullptr;   // RSA payloads and the direct types 3, 4, 22, 29, 30
  std::string pinKey;                // type 68: 16 raw bytes (derivePinKey68)
  bool saltedHash = false;           // types 48, 59: the app set a hash salt, so the payload is hex
  std::string expectedTimestamp;     // empty: not checked; else the wrapper's (and a pair's) timestamp
};

// What an output opened to. The destructor wipes payload and content; so does openOutput before
// it writes into a used one.
struct Opened {
  bool wrapped = false;              // strength/timestamp/payload are set
  char strength = 0;
  std::string timestamp;             // of the wrapper, or of a length-prefixed pair
  std::string payload;               // as found in the wrapper (still sealed for RSA types)
  bool contentOpened = false;        // content is set
  std::string content;               // text, PIN digits, salted-hash value or SHA-1 hex (type 5)

  Opened() = default;
  Opened(const Opened&) = default;
  Opened& operator=(const Opened&) = default;
  ~Opened();
  void clear();                      // wipes and resets every field
};

// Opens the output of `type`. The application key is required for envelopes and types 56/73;
// the encryption key is optional for envelopes (content then stays unopened, but its shape is
// still checked, so an output of another type is refused) and required for the direct types
// 3, 4, 22, 29, 30. Type 68 needs keys.pinKey to open its PIN.
bool openOutput(int type, const std::string& output, const OpenKeys& keys, Opened* out, std::string* error);

}  // namespace tessel::server
