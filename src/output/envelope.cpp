// Digital envelope, RSA helpers, strength-letter wrapper and length-prefixed pair. The RSA
// helpers share one path (block -> RSA -> hex, or bytes and base64) and differ only in the
// block layout and its error code; the byte forms skip the hex round trip. Nothing here keeps state; the random source is the only
// thing shared with other threads.
#include "output/envelope.h"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <utility>

#include "crypto/codec.h"
#include "crypto/padding.h"
#include "crypto/random.h"
#include "crypto/rc4.h"
#include "crypto/rsa.h"
#include "crypto/wipe.h"

namespace tessel {
namespace {

const std::uint8_t kSimpleBlobHeader[12] = {0x01, 0x02, 0x00, 0x00, 0x01, 0x68,
                                            0x00, 0x00, 0x00, 0xA4, 0x00, 0x00};
constexpr std::size_t kLengthField = 8;
constexpr std::size_t kLengthFieldLimit = 99999999;  // largest "%08d" that stays eight digits

// Padded block -> hex -> RSA: the common tail of every helper.
ErrorCode rsaOverBlock(const char* modulus, const SecureBuffer& block, ErrorCode paddingError,
                       SecureBuffer* out) noexcept {
  if (!block) return paddingError;
  SecureBuffer blockHex = hexEncode(block.data(), block.size());
  if (!blockHex) return kErrBinaryToHex;
  SecureBuffer cipherHex = rsaPublicHex(modulus, blockHex.c_str());
  if (!cipherHex) return kErrEncryptionFailed;
  *out = std::move(cipherHex);
  return kOk;
}

// Padded block -> RSA -> big-endian bytes.
ErrorCode rsaOverBlockBytes(const char* modulus, const SecureBuffer& block, ErrorCode paddingError,
                            SecureBuffer* out) noexcept {
  if (!block) return paddingError;
  SecureBuffer cipher = rsaPublicBytes(modulus, block.data(), block.size());
  if (!cipher) return kErrEncryptionFailed;
  *out = std::move(cipher);
  return kOk;
}

ErrorCode toBase64(SecureBuffer* inOut) noexcept {
  SecureBuffer text = base64Encode(inOut->data(), inOut->size());
  if (!text) return kErrBase64Encode;
  *inOut = std::move(text);
  return kOk;
}

void writeLengthField(std::uint8_t* at, std::size_t value) noexcept {
  char digits[24];
  std::snprintf(digits, sizeof digits, "%08zu", value);
  std::memcpy(at, digits, kLengthField);
}

}  // namespace

ErrorCode pkcs1RsaHex(const char* modulus, const std::uint8_t* m, std::size_t n, SecureBuffer* out) noexcept {
  const SecureBuffer block = pkcs1Type2Block(m, n, rsaModulusBytes(modulus));
  return rsaOverBlock(modulus, block, kErrPkcs1Padding, out);
}

ErrorCode pkcs1RsaBinary(const char* modulus, const std::uint8_t* m, std::size_t n, SecureBuffer* out) noexcept {
  const SecureBuffer block = pkcs1Type2Block(m, n, rsaModulusBytes(modulus));
  return rsaOverBlockBytes(modulus, block, kErrPkcs1Padding, out);
}

ErrorCode pkcs1RsaBase64(const char* modulus, const std::uint8_t* m, std::size_t n, SecureBuffer* out) noexcept {
  SecureBuffer value;
  ErrorCode code = pkcs1RsaBinary(modulus, m, n, &value);
  if (code == kOk) code = toBase64(&value);
  if (code == kOk) *out = std::move(value);
  return code;
}

ErrorCode keyouRsaHex(const char* modulus, const std::uint8_t* m, std::size_t n, SecureBuffer* out) noexcept {
  const SecureBuffer block = keyouBlock(m, n, rsaModulusBytes(modulus));
  return rsaOverBlock(modulus, block, kErrKeyouPadding, out);
}

ErrorCode keyouRsaBase64(const char* modulus, const std::uint8_t* m, std::size_t n, SecureBuffer* out) noexcept {
  SecureBuffer value;
  const SecureBuffer block = keyouBlock(m, n, rsaModulusBytes(modulus));
  ErrorCode code = rsaOverBlockBytes(modulus, block, kErrKeyouPadding, &value);
  if (code == kOk) code = toBase64(&value);
  if (code == kOk) *out = std::move(value);
  return code;
}

ErrorCode digitalEnvelope(std::size_t drop, const char* modulus, const std::uint8_t* s, std::size_t n,
                          SecureBuffer* out) noexcept {
  if (n > kLengthFieldLimit) return kErrInvalidParameters;
  SecureBuffer sealed = SecureBuffer::copyOf(s, n);
  SecureBuffer key = SecureBuffer::allocate(kEnvelopeKeyBytes);
  if (!sealed || !key) return kErrAllocation;
  if (!randomBytes(key.data(), kEnvelopeKeyBytes)) return kErrRandomFailed;

  Rc4State rc4;
  rc4Init(rc4, key.data(), kEnvelopeKeyBytes);
  rc4Discard(rc4, drop);
  rc4Crypt(rc4, sealed.data(), sealed.data(), n);
  wipeObject(rc4);

  SecureBuffer wrappedKey;
  const ErrorCode code = pkcs1RsaBinary(modulus, key.data(), kEnvelopeKeyBytes, &wrappedKey);
  if (code != kOk) return code;
  const std::size_t k = wrappedKey.size();
  std::reverse(wrappedKey.data(), wrappedKey.data() + k);  // the blob keeps it least significant first

  SecureBuffer raw = SecureBuffer::allocate(k + n + 28);
  if (!raw) return kErrAllocation;
  std::uint8_t* p = raw.data();
  writeLengthField(p, k + sizeof kSimpleBlobHeader);
  p += kLengthField;
  std::memcpy(p, kSimpleBlobHeader, sizeof kSimpleBlobHeader);
  p += sizeof kSimpleBlobHeader;
  std::memcpy(p, wrappedKey.data(), k);
  p += k;
  writeLengthField(p, n);
  p += kLengthField;
  if (n != 0) std::memcpy(p, sealed.data(), n);

  const ErrorCode encoded = toBase64(&raw);
  if (encoded == kOk) *out = std::move(raw);
  return encoded;
}

ErrorCode payloadWrapper(char letter, const char* timestamp, const char* payload, SecureBuffer* out) noexcept {
  const std::size_t tsLength = std::strlen(timestamp), payloadLength = std::strlen(payload);
  SecureBuffer wrapped = SecureBuffer::allocate(tsLength + payloadLength + 50);
  if (!wrapped) return kErrAllocation;
  const int written = std::snprintf(wrapped.c_str(), wrapped.capacity() + 1, "%c%s:%s", letter, timestamp, payload);
  if (written < 0) return kErrAllocation;
  wrapped.truncate(static_cast<std::size_t>(written));
  *out = std::move(wrapped);
  return kOk;
}

ErrorCode lengthPrefixedPair(const char* timestamp, const char* text, bool fixedBuffer,
                             SecureBuffer* out) noexcept {
  const std::size_t tsLength = std::strlen(timestamp), textLength = std::strlen(text);
  // "%02d" widens past two digits from 100 on; measure rather than assume.
  const int needed = std::snprintf(nullptr, 0, "%02zu%s%02zu%s", tsLength, timestamp, textLength, text);
  if (needed < 0) return kErrInvalidParameters;
  if (fixedBuffer && static_cast<std::size_t>(needed) + 1 > kPairBufferSize) return kErrInvalidParameters;
  SecureBuffer pair = SecureBuffer::allocate(static_cast<std::size_t>(needed));
  if (!pair) return kErrAllocation;
  std::snprintf(pair.c_str(), pair.capacity() + 1, "%02zu%s%02zu%s", tsLength, timestamp, textLength, text);
  *out = std::move(pair);
  return kOk;
}

}  // namespace tessel
