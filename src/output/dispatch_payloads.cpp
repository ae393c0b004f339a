// Payload builders of the dedicated encryption types. All secrets (digests of the password, the
// triple-DES keys of types 38 and 68, the PIN blocks and their hex forms) live in SecureBuffers
// or in stack objects wiped before every return.
#include "output/dispatch_payloads.h"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <utility>

#include "crypto/codec.h"
#include "output/envelope.h"
#include "crypto/md5.h"
#include "crypto/padding.h"
#include "crypto/random.h"
#include "crypto/sha1.h"
#include "crypto/tdes.h"
#include "crypto/wipe.h"

#ifdef TESSEL_MASTER_KEYS_FILE
#include TESSEL_MASTER_KEYS_FILE
#else
#include "crypto/master_keys.inc"
#endif

static_assert(sizeof(TESSEL_MASTER_KEY_PRIMARY_1 TESSEL_MASTER_KEY_PRIMARY_2 TESSEL_MASTER_KEY_PRIMARY_3) == 33,
              "the primary master PIN key fragments must add up to 32 hex digits");
static_assert(sizeof(TESSEL_MASTER_KEY_ALTERNATE) == 33, "the alternate master PIN key must be 32 hex digits");

namespace tessel {
namespace {

const char kSeparator[] = "::::::::::";
constexpr std::size_t kSeparatorLength = sizeof kSeparator - 1;
constexpr std::size_t kTripleDesKeyBytes = 16;

// Kept apart and read through volatile pointers so the optimiser cannot fold the primary key's
// fragments back into one literal; the joined keys exist only in a buffer wiped after use.
const char kPrimary1[] = TESSEL_MASTER_KEY_PRIMARY_1;
const char kPrimary2[] = TESSEL_MASTER_KEY_PRIMARY_2;
const char kPrimary3[] = TESSEL_MASTER_KEY_PRIMARY_3;
const char kAlternate[] = TESSEL_MASTER_KEY_ALTERNATE;
const char* volatile gPrimary1 = kPrimary1;
const char* volatile gPrimary2 = kPrimary2;
const char* volatile gPrimary3 = kPrimary3;
const char* volatile gAlternate = kAlternate;

// Triple-DES ECB over whole 8-byte blocks, in place; the key's parity is set on a wiped copy.
void tripleDesEcb(const std::uint8_t key[kTripleDesKeyBytes], bool encrypt, std::uint8_t* data,
                  std::size_t n) noexcept {
  std::uint8_t adjusted[kTripleDesKeyBytes];
  std::memcpy(adjusted, key, sizeof adjusted);
  desSetOddParity(adjusted, sizeof adjusted);
  TripleDesContext ctx;
  if (encrypt) {
    tdes2SetKeyEncrypt(ctx, adjusted);
  } else {
    tdes2SetKeyDecrypt(ctx, adjusted);
  }
  for (std::size_t k = 0; k + 8 <= n; k += 8) tdesCryptEcb(ctx, data + k, data + k);
  wipeObject(ctx);
  wipeObject(adjusted);
}

// 32 hex digits -> 16 bytes. The shared decoder reads any other character as 0, which for a key
// would silently weaken it, so the digits are checked first.
ErrorCode keyFromHex(const char* hex, std::size_t length, SecureBuffer* key) noexcept {
  SecureBuffer text = SecureBuffer::copyOf(hex, length);
  if (!text) return kErrAllocation;
  if (length != 2 * kTripleDesKeyBytes || !isHexText(text.c_str())) return kErrHexToBinary;
  SecureBuffer bytes = hexDecode(text.c_str());
  if (!bytes || bytes.size() != kTripleDesKeyBytes) return kErrHexToBinary;
  *key = std::move(bytes);
  return kOk;
}

ErrorCode concatenate(const SecureBuffer& a, const char* b, SecureBuffer* out) noexcept {
  const std::size_t bLength = std::strlen(b);
  SecureBuffer joined = SecureBuffer::allocate(a.size() + bLength);
  if (!joined) return kErrAllocation;
  std::memcpy(joined.data(), a.data(), a.size());
  std::memcpy(joined.data() + a.size(), b, bLength);
  *out = std::move(joined);
  return kOk;
}

// Payload of the hashed types from a value: the value itself, or its PKCS#1 RSA hex.
ErrorCode hashedValuePayload(int type, const char* enc, const std::uint8_t* value, std::size_t n,
                             SecureBuffer* payload) noexcept {
  if (type == 47 || type == 55) return pkcs1RsaHex(enc, value, n, payload);
  SecureBuffer copy = SecureBuffer::copyOf(value, n);
  if (!copy) return kErrAllocation;
  *payload = std::move(copy);
  return kOk;
}

// Lower-case hex of MD5(data).
ErrorCode md5Hex(const std::uint8_t* data, std::size_t n, SecureBuffer* out) noexcept {
  SecureBuffer hex = md5HexLower(data, n);
  if (!hex) return kErrBinaryToHex;
  *out = std::move(hex);
  return kOk;
}

}  // namespace

ErrorCode masterPinKey(char selector, SecureBuffer* key) noexcept {
  char assembled[2 * kTripleDesKeyBytes + 1];
  const int written = selector != '0'
                          ? std::snprintf(assembled, sizeof assembled, "%s%s%s", gPrimary1, gPrimary2, gPrimary3)
                          : std::snprintf(assembled, sizeof assembled, "%s", gAlternate);
  ErrorCode code = kErrHexToBinary;
  if (written == static_cast<int>(2 * kTripleDesKeyBytes)) code = keyFromHex(assembled, 2 * kTripleDesKeyBytes, key);
  wipeObject(assembled);
  return code;
}

ErrorCode type5Payload(const char* enc, const char* text, SecureBuffer* payload) noexcept {
  std::uint8_t digest[20];
  sha1(text, std::strlen(text), digest);
  SecureBuffer digestHex = hexEncode(digest, sizeof digest);
  wipeObject(digest);
  if (!digestHex) return kErrBinaryToHex;
  SecureBuffer cipher;
  const ErrorCode code = pkcs1RsaBinary(enc, digestHex.data(), digestHex.size(), &cipher);
  if (code != kOk) return code;
  std::reverse(cipher.data(), cipher.data() + cipher.size());
  SecureBuffer cipherHex = hexEncode(cipher.data(), cipher.size());
  if (!cipherHex) return kErrBinaryToHex;
  return concatenate(cipherHex, "0001", payload);
}

ErrorCode type19Payload(const char* enc, const char* text, SecureBuffer* payload) noexcept {
  const std::size_t length = std::strlen(text);
  // "%02d" takes three digits from 100 on: size by measuring.
  const int needed = std::snprintf(nullptr, 0, "011%02zu%s", length, text);
  if (needed < 0) return kErrInvalidParameters;
  SecureBuffer block = SecureBuffer::allocate(static_cast<std::size_t>(needed));
  if (!block) return kErrAllocation;
  std::snprintf(block.c_str(), block.capacity() + 1, "011%02zu%s", length, text);
  SecureBuffer cipher;
  const ErrorCode code = pkcs1RsaBinary(enc, block.data(), block.size(), &cipher);
  if (code != kOk) return code;
  SecureBuffer cipherHex = hexEncode(cipher.data(), cipher.size());
  if (!cipherHex) return kErrBinaryToHex;
  *payload = std::move(cipherHex);
  return kOk;
}

ErrorCode type38Payload(const char* enc, const char* text, SecureBuffer* payload) noexcept {
  const std::size_t length = std::strlen(text);
  // Deliberately "text missing" (5) rather than the PIN-block code: callers match on it.
  if (length > 12) return kErrTextMissing;
  for (std::size_t k = 0; k < length; ++k)
    if (text[k] < '0' || text[k] > '9') return kErrTextMissing;

  SecureBuffer block = fPaddedDigitBlock(text);
  if (!block || block.size() != 8) return kErrHexToBinary;
  SecureBuffer key = SecureBuffer::allocate(kTripleDesKeyBytes);
  if (!key) return kErrAllocation;
  if (!randomBytes(key.data(), kTripleDesKeyBytes)) return kErrRandomFailed;
  desSetOddParity(key.data(), kTripleDesKeyBytes);
  tripleDesEcb(key.data(), true, block.data(), 8);
  SecureBuffer blockHex = hexEncode(block.data(), 8);
  if (!blockHex) return kErrBinaryToHex;

  // SEQUENCE { OCTET STRING key, OCTET STRING 99 99 99 99 99 99 99 99 }
  SecureBuffer der = SecureBuffer::allocate(30);
  if (!der) return kErrAllocation;
  std::uint8_t* p = der.data();
  const std::uint8_t head[4] = {0x30, 0x1C, 0x04, 0x10};
  std::memcpy(p, head, 4);
  std::memcpy(p + 4, key.data(), kTripleDesKeyBytes);
  p[20] = 0x04;
  p[21] = 0x08;
  std::memset(p + 22, 0x99, 8);
  SecureBuffer keyCipher;
  const ErrorCode code = pkcs1RsaHex(enc, der.data(), der.size(), &keyCipher);
  if (code != kOk) return code;
  return concatenate(blockHex, keyCipher.c_str(), payload);
}

ErrorCode type68Payload(const char* enc, const char* text, SecureBuffer* payload, SecureBuffer* rated) noexcept {
  // F "::::::::::" A(32) "::::::::::" B(32) "::::::::::" C(<= 12, to the end)
  const char* first = std::strstr(text, kSeparator);
  if (first != text + 1) return kErrTextFormat;
  const char* a = first + kSeparatorLength;
  const char* second = std::strstr(a, kSeparator);
  if (second == nullptr || second - a != 32) return kErrTextFormat;
  const char* b = second + kSeparatorLength;
  const char* third = std::strstr(b, kSeparator);
  if (third == nullptr || third - b != 32) return kErrTextFormat;
  const char* c = third + kSeparatorLength;
  if (std::strlen(c) > 12 || std::strstr(c, kSeparator) != nullptr) return kErrTextFormat;

  SecureBuffer master, working, pinKey;
  ErrorCode code = masterPinKey(text[0], &master);
  if (code == kOk) code = keyFromHex(a, 32, &working);
  if (code == kOk) code = keyFromHex(b, 32, &pinKey);
  if (code != kOk) return code;
  tripleDesEcb(master.data(), false, working.data(), kTripleDesKeyBytes);
  tripleDesEcb(working.data(), false, pinKey.data(), kTripleDesKeyBytes);

  SecureBuffer pinBlock = pinBlockX98(c, nullptr);
  if (!pinBlock || pinBlock.size() != 8) return kErrPinBlockFailed;
  tripleDesEcb(pinKey.data(), true, pinBlock.data(), 8);
  SecureBuffer cipher;
  code = pkcs1RsaHex(enc, pinBlock.data(), 8, &cipher);
  if (code != kOk) return code;
  SecureBuffer pin = SecureBuffer::copyOfText(c);
  if (!pin) return kErrAllocation;
  *payload = std::move(cipher);
  *rated = std::move(pin);
  return kOk;
}

ErrorCode hashedPayload(int type, const char* enc, const char* text, SecureBuffer* payload,
                        SecureBuffer* rated) noexcept {
  const char* first = std::strstr(text, kSeparator);
  if (first == nullptr) {
    return hashedValuePayload(type, enc, reinterpret_cast<const std::uint8_t*>(text), std::strlen(text), payload);
  }
  // P "::::::::::" salt "::::::::::" mode: the salt runs to the last 11 characters.
  const std::size_t passwordLength = static_cast<std::size_t>(first - text);
  const std::size_t tailLength = std::strlen(first);
  if (passwordLength == 0 || tailLength == 2 * kSeparatorLength + 1) return kErrTextFormat;
  const char* second = std::strstr(first + kSeparatorLength, kSeparator);
  if (second == nullptr) return kErrTextFormat;
  const char mode = second[kSeparatorLength];
  if (mode != 'S' && mode != 'F') return kErrTextFormat;
  // A second separator followed by a letter means at least 21 characters follow P, and 21 was
  // refused above, so the salt is at least one character.
  const char* salt = first + kSeparatorLength;
  const std::size_t saltLength = tailLength - (2 * kSeparatorLength + 1);

  SecureBuffer password = SecureBuffer::copyOf(text, passwordLength);
  if (!password) return kErrAllocation;
  SecureBuffer h1, h2;
  ErrorCode code = md5Hex(password.data(), passwordLength, &h1);
  if (code != kOk) return code;
  SecureBuffer salted = SecureBuffer::allocate(h1.size() + saltLength);
  if (!salted) return kErrAllocation;
  std::memcpy(salted.data(), h1.data(), h1.size());
  std::memcpy(salted.data() + h1.size(), salt, saltLength);
  code = md5Hex(salted.data(), salted.size(), &h2);
  if (code != kOk) return code;
  const bool shortForm = mode == 'S';
  code = hashedValuePayload(type, enc, h2.data() + (shortForm ? 8 : 0), shortForm ? 16 : 32, payload);
  if (code != kOk) return code;
  *rated = std::move(password);
  return kOk;
}

}  // namespace tessel
