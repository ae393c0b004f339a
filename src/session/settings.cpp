// Session setters: validation and storage of everything the managed side configures.
//
// Exposes the setters of session/settings.h. Every string is stored as a private malloc'd copy
// (replaceOwnedText / releaseOwnedText), so the session's release code can wipe and free it;
// the hash suffix, the dictionary filter and the elliptic-curve key are malloc'd as well even
// though a session's release deliberately leaves them allocated. Temporaries that carried a key
// (decoded blobs, their hex forms) are SecureBuffers and are wiped on every way out.
#include "session/settings.h"

#include <cstdlib>
#include <cstring>
#include <new>

#include "crypto/codec.h"
#include "crypto/der.h"
#include "crypto/secure_buffer.h"
#include "crypto/wipe.h"
#include "pattern/pattern_engine.h"
#include "session/session.h"

namespace tessel {

namespace {

// The blob header in front of the key bytes: an 8-byte blob header and a 12-byte RSA
// public-key header.
constexpr std::size_t kBlobHeaderSize = 20;

// Stores a public key: hex modulus as given, or the modulus read from DER hex (null when the
// reader refuses it, which discards the previous key).
void storePublicKey(char*& field, const char* key, bool isDer) noexcept {
  if (!isDer) {
    replaceOwnedText(field, key);
    return;
  }
  SecureBuffer modulus = derPublicKeyToModulusHex(key);
  replaceOwnedText(field, modulus ? modulus.c_str() : nullptr);
}

// Blob hex -> header dropped, remaining bytes reversed -> hex -> DER path. 0 only when the
// text cannot be decoded at all.
int storeBlobKey(char*& field, const char* blobHex) noexcept {
  SecureBuffer blob = hexDecodeSkippingSpace(blobHex);
  if (!blob) return 0;
  // A blob shorter than its header carries no key bytes: an empty DER text, which the reader
  // refuses, so the field ends up cleared like any other unreadable key.
  const std::size_t n = blob.size() > kBlobHeaderSize ? blob.size() - kBlobHeaderSize : 0;
  SecureBuffer reversed = SecureBuffer::allocate(n);
  if (!reversed) return 0;
  const std::uint8_t* body = blob.data() + (blob.size() - n);
  for (std::size_t i = 0; i < n; ++i) reversed.data()[i] = body[n - 1 - i];
  SecureBuffer hex = hexEncode(reversed.data(), n);
  if (!hex) return 0;
  storePublicKey(field, hex.c_str(), true);
  return 1;
}

// "Unsigned 16-bit value below 2, else 0" rule of the switch and finish modes.
std::uint16_t binaryModeOrZero(std::int16_t m) noexcept {
  const auto u = static_cast<std::uint16_t>(m);
  return u < 2 ? u : 0;
}

}  // namespace

// The key press matches the pattern against the whole text each time: it is compiled here, once
// per setting, not per key. Without memory for it, no key is accepted, as with no pattern.
void setAccepts(KeyboardSession& s, const char* pattern) noexcept {
  replaceOwnedText(s.accepts, pattern);
  delete s.acceptsEngine;
  s.acceptsEngine = s.accepts != nullptr ? new (std::nothrow) PatternEngine(s.accepts) : nullptr;
}

void setMinLength(KeyboardSession& s, std::int16_t n) noexcept {
  if (n >= 0) s.minLength = n;
}

void setMaxLength(KeyboardSession& s, std::int16_t n) noexcept {
  if (n < 0) return;
  // Key entry checks only maxLength, so the buffer's capacity is folded in here.
  s.maxLength = n > static_cast<std::int16_t>(kContentCapacity) ? static_cast<std::int16_t>(kContentCapacity) : n;
}

void setKbdRandom(KeyboardSession& s, bool on) noexcept { s.kbdRandom = on ? 1 : 0; }

void setKbdType(KeyboardSession& s, std::int16_t type) noexcept {
  s.kbdType = static_cast<std::uint16_t>(type);
  s.currentKbdType = static_cast<std::uint32_t>(static_cast<std::int32_t>(type));
}

void setKbdStyle(KeyboardSession& s, std::int16_t style) noexcept {
  // C division and remainder: style -1 gives page 0 and shiftOn 0xFFFFFFFF (non-zero: shifted).
  s.kbdPage = static_cast<std::int16_t>(style / 2);
  s.shiftOn = static_cast<std::uint32_t>(static_cast<std::int32_t>(style % 2));
}

void setKbdMode(KeyboardSession& s, std::int16_t mode) noexcept { s.kbdMode = static_cast<std::uint16_t>(mode); }

void setPopMode(KeyboardSession& s, bool on) noexcept { s.popMode = on ? 1 : 0; }

void setSwitchMode(KeyboardSession& s, std::int16_t mode) noexcept { s.switchMode = binaryModeOrZero(mode); }

void setFinishMode(KeyboardSession& s, std::int16_t mode) noexcept { s.finishMode = binaryModeOrZero(mode); }

void setMode(KeyboardSession& s, std::int16_t mode) noexcept {
  const auto u = static_cast<std::uint16_t>(mode);
  if (u == 0 || u == 1 || u == 4) s.mode = u;
}

void setEncryptType(KeyboardSession& s, std::int8_t type) noexcept { s.encryptType = static_cast<std::uint8_t>(type); }

void setContentType(KeyboardSession& s, std::int32_t type) noexcept {
  s.content->contentType = static_cast<std::uint32_t>(type);
}

void setChallengeCode(KeyboardSession& s, const char* code) noexcept {
  if (code == nullptr || code[0] == '\0') return;
  replaceOwnedText(s.content->challengeCode, code);
}

void setKbdFactor(KeyboardSession& s, const char* text) noexcept {
  if (text == nullptr || text[0] == '\0') return;
  ContentStore& store = *s.content;
  if (text[0] == '0' || text[0] == '1') {
    // Kinds 0 and 1 keep whatever buffer an earlier kind-2 factor left.
    store.kbdFactorKind = static_cast<std::uint8_t>(text[0] - '0');
    return;
  }
  releaseOwnedText(store.kbdFactor);
  store.kbdFactorKind = 2;
  const std::size_t n = std::strlen(text);  // the rest plus its terminator
  char* copy = static_cast<char*>(std::malloc(n));
  if (copy == nullptr) return;
  std::memcpy(copy, text + 1, n);
  store.kbdFactor = copy;
}

void setAlgorithmCode(KeyboardSession& s, const char* text) noexcept {
  if (text == nullptr || text[0] == '\0') return;
  replaceOwnedText(s.content->algorithmCode, text);
}

void setHashRandom(KeyboardSession& s, const char* text) noexcept {
  if (text == nullptr || std::strlen(text) <= 2) return;
  if ((text[0] != '1' && text[0] != '2') || text[1] != ':') return;
  static const char kFence[] = "::::::::::";
  constexpr std::size_t kFenceLength = sizeof kFence - 1;
  const char* salt = text + 2;
  const std::size_t saltLength = std::strlen(salt);
  const std::size_t total = kFenceLength + saltLength + kFenceLength + 1;
  char* suffix = static_cast<char*>(std::malloc(total + 1));
  if (suffix == nullptr) return;
  char* p = suffix;
  std::memcpy(p, kFence, kFenceLength);
  p += kFenceLength;
  std::memcpy(p, salt, saltLength);
  p += saltLength;
  std::memcpy(p, kFence, kFenceLength);
  p += kFenceLength;
  *p++ = text[0] == '1' ? 'S' : 'F';
  *p = '\0';
  releaseOwnedText(s.content->hashRandomSuffix);
  s.content->hashRandomSuffix = suffix;
}

void setDictionaryFilter(KeyboardSession& s, const char* text) noexcept {
  if (text == nullptr) return;
  replaceOwnedText(s.content->dictionaryFilter, text);
}

void setAppPlat(KeyboardSession& s, const char* key, bool isDer) noexcept { storePublicKey(s.appPlat, key, isDer); }

void setEncryPlat(KeyboardSession& s, const char* key, bool isDer) noexcept {
  storePublicKey(s.encryPlat, key, isDer);
}

int setAppPlatBlob(KeyboardSession& s, const char* blobHex) noexcept { return storeBlobKey(s.appPlat, blobHex); }

int setEncryPlatBlob(KeyboardSession& s, const char* blobHex) noexcept {
  return storeBlobKey(s.encryPlat, blobHex);
}

int setEccKey(KeyboardSession& s, const char* x, const char* y) noexcept {
  if (x == nullptr || y == nullptr) return 0;
  releaseOwnedText(s.eccKey);
  // Sized from both coordinates, so a y longer than x still fits: x, ',', y, NUL.
  const std::size_t xLength = std::strlen(x);
  const std::size_t yLength = std::strlen(y);
  char* text = static_cast<char*>(std::malloc(xLength + yLength + 2));
  if (text == nullptr) return 0;
  std::memcpy(text, x, xLength);
  text[xLength] = ',';
  std::memcpy(text + xLength + 1, y, yLength);
  text[xLength + 1 + yLength] = '\0';
  s.eccKey = text;
  return 1;
}

}  // namespace tessel
