// Server side of the keyboard's output: opens what the device library produces.
//
// The bank's backend holds the private halves of the two RSA keys the app hands the keyboard:
// the application-platform key (it opens the digital envelope) and the encryption-platform key
// (it opens the RSA payload inside the envelope, and the outputs that are a bare RSA value).
// This library is built on OpenSSL's libcrypto only; it shares no code with the device library
// so the two check each other.
//
// Layouts it reads (k = RSA modulus bytes, L = content bytes):
//   envelope = base64( "%08d"(k+12) | 01 02 00 00 01 68 00 00 00 A4 00 00 |
//                      RSA-PKCS#1(rc4 key, 16 bytes), least significant byte first |
//                      "%08d"(L) | RC4(key, after dropping 512, 625 or 768 bytes)(content) )
//   wrapped content = strength letter | timestamp | ":" | payload
//   "Keyou" block = two ASCII digits of the message length | message | random filler (no 00 02)
//   length-prefixed pair = "%02d"(timestamp length) timestamp "%02d"(text length) text
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
//   keys.enc = &enc;                   // optional: without it the payload stays sealed
//   Opened out;
//   if (!openOutput(47, outputFromDevice, keys, &out, &error)) { log(error); return; }
//   // out.strength 'S', out.timestamp "20240101120000", out.content the salted-hash value:
//   bool good = matchesPassword(47, out, storedPassword, salt, 'S');
//
// Every function returns false with a one-line message in *error on corrupt, truncated or
// foreign input; none throws or aborts. Messages never contain the opened plaintext.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

typedef struct evp_pkey_st EVP_PKEY;

namespace tessel::server {

// An RSA private key loaded from PEM (PKCS#8 or traditional "RSA PRIVATE KEY").
class PrivateKey {
 public:
  PrivateKey() = default;
  ~PrivateKey();
  PrivateKey(PrivateKey&& other) noexcept;
  PrivateKey& operator=(PrivateKey&& other) noexcept;
  PrivateKey(const PrivateKey&) = delete;
  PrivateKey& operator=(const PrivateKey&) = delete;

  bool loadPem(const std::string& pem, std::string* error);
  bool loadPemFile(const std::string& path, std::string* error);
  bool loaded() const { return key_ != nullptr; }
  // Modulus length in bytes (k); 0 when nothing is loaded.
  std::size_t size() const;
  // The public modulus as upper-case hex, the form the device library is configured with.
  std::string modulusHex() const;
  EVP_PKEY* get() const { return key_; }

 private:
  EVP_PKEY* key_ = nullptr;
};

// ---- the digital envelope

// Keystream bytes dropped before the content: 625 for types 1 and 33, 768 for 88, else 512.
std::size_t envelopeDrop(int type);

struct EnvelopeLayout {
  std::size_t keyBlobLength = 0;   // the first "%08d" field: k + 12
  std::size_t rsaLength = 0;       // k
  std::size_t contentLength = 0;   // L
  std::size_t totalLength = 0;     // decoded bytes: k + L + 28
};

// Decodes and checks the layout only (no key needed): digits, header, lengths, nothing after.
bool parseEnvelope(const std::string& base64, EnvelopeLayout* layout, std::string* error);

// Full opening: layout, key unwrap with `key` (its size must equal k), RC4 after `drop` bytes.
bool openEnvelope(const std::string& base64, const PrivateKey& key, std::size_t drop,
                  std::string* content, std::string* error);

// Splits "letter timestamp ':' payload". Hex and base64 payloads hold no ':', so they are split
// at the last ':' and the timestamp may contain any (e.g. "2024-01-01 12:00:00"). A plain-text
// payload may hold ':' itself, so it is split at the first ':' after the letter: apps that
// send plain text must use a timestamp without ':'.
struct Wrapped {
  char strength = 0;
  std::string timestamp;
  std::string payload;
};
bool splitWrapped(const std::string& content, Wrapped* out, std::string* error, bool atLastColon = false);

// ---- RSA payloads (all with the encryption-platform key unless the type says otherwise)

bool rsaPkcs1Decrypt(const PrivateKey& key, const std::string& cipher, std::string* plain,
                     std::string* error);
// Raw RSA (no padding check): the k-byte block.
bool rsaRawDecrypt(const PrivateKey& key, const std::string& cipher, std::string* block,
                   std::string* error);

bool openPkcs1Hex(const PrivateKey& key, const std::string& hex, std::string* plain, std::string* error);
bool openPkcs1Base64(const PrivateKey& key, const std::string& b64, std::string* plain, std::string* error);
bool openKeyouHex(const PrivateKey& key, const std::string& hex, std::string* plain, std::string* error);
bool openKeyouBase64(const PrivateKey& key, const std::string& b64, std::string* plain, std::string* error);
// The message inside a "Keyou" block.
bool parseKeyouBlock(const std::string& block, std::string* message, std::string* error);
bool parseLengthPrefixedPair(const std::string& pair, std::string* timestamp, std::string* text,
                             std::string* error);

// Type 5: hex(reversed RSA) "0001" -> the 40 upper-case hex characters of SHA-1(text).
bool openType5(const PrivateKey& enc, const std::string& payload, std::string* sha1Hex, std::string* error);
// Type 19: RSA hex of "011" "%02d"(L) text -> text.
bool openType19(const PrivateKey& enc, const std::string& payload, std::string* text, std::string* error);
// Type 38: 16 hex of the triple-DES F-padded digit block, then RSA hex of the DER key value
// (SEQUENCE { OCTET STRING key16, OCTET STRING 99*8 }) -> the PIN digits.
bool openType38(const PrivateKey& enc, const std::string& payload, std::string* pin, std::string* error);
// Type 68: the PIN key is the triple-DES (ECB, decrypt) of B under (A decrypted under the master
// key). All three as 32 hex characters; the result is 16 bytes.
bool derivePinKey68(const std::string& masterHex, const std::string& aHex, const std::string& bHex,
                    std::string* pinKey, std::string* error);
// Type 68: RSA hex of the triple-DES-encrypted ISO 9564 format 0 block (no PAN) -> PIN digits.
bool openType68(const PrivateKey& enc, const std::string& payload, const std::string& pinKey,
                std::string* pin, std::string* error);

// Salted hash of types 47, 48, 55, 59: MD5 hex (lower case) of password, then MD5 hex of that
// followed by the salt; mode 'S' keeps characters 8..23, 'F' all 32. Empty for another mode.
std::string saltedHashValue(const std::string& password, const std::string& salt, char mode);

// ---- whole outputs by encryption type

enum class Outer { Unknown, WrappedEnvelope, BareEnvelope, DirectWithEnc, DirectWithApp };
enum class Inner {
  None, Text, KeyouHex, KeyouBase64, Pkcs1Hex, Pkcs1Base64, PairPkcs1Hex, PairPkcs1Base64,
  Type5, Type19, Type38, Type68, Hashed, HashedRsa
};
struct TypeLayout {
  Outer outer = Outer::Unknown;
  Inner inner = Inner::None;
  std::size_t drop = 512;
};
TypeLayout typeLayout(int type);

struct OpenKeys {
  const PrivateKey* app = nullptr;   // envelope types and 56, 73
  const PrivateKey* enc = nullptr;   // RSA payloads and the direct types 3, 4, 22, 29, 30
  std::string pinKey;                // type 68: 16 raw bytes (derivePinKey68)
  bool saltedHash = false;           // types 48, 59: the app set a hash salt, so the payload is hex
};

struct Opened {
  bool wrapped = false;              // strength/timestamp/payload are set
  char strength = 0;
  std::string timestamp;             // of the wrapper, or of a length-prefixed pair
  std::string payload;               // as found in the wrapper (still sealed for RSA types)
  bool contentOpened = false;        // content is set
  std::string content;               // text, PIN digits, salted-hash value or SHA-1 hex (type 5)
};

// Opens the output of `type`. The application key is required for envelopes and types 56/73;
// the encryption key is optional for envelopes (content then stays unopened, but its shape is
// still checked, so an output of another type is refused) and required for the direct types
// 3, 4, 22, 29, 30. Type 68 needs keys.pinKey to open its PIN.
bool openOutput(int type, const std::string& output, const OpenKeys& keys, Opened* out,
                std::string* error);

// Whether an opened output of `type` was made from `password`. Hashed types (47, 48, 55, 59):
// with a salt, the salted-hash value (mode 'S' or 'F'); with an empty salt (the app set none),
// the password itself. Type 5: the SHA-1 of the password. Other types: the opened text itself.
// False when the content was not opened.
bool matchesPassword(int type, const Opened& opened, const std::string& password, const std::string& salt,
                     char mode);

// Wipes a std::string's bytes (plaintext held by the caller) before it is destroyed.
void wipeString(std::string* s);

}  // namespace tessel::server
