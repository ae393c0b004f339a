// Padded blocks for RSA and PIN blocks for triple-DES. Every block is built inside a
// SecureBuffer, so a refused or failed block is wiped when it is dropped. Random filler is
// requested once per block; zero bytes in it become 0x01 rather than being drawn again (the
// filler of a type 2 block must be non-zero, and the "Keyou" layout keeps the same rule).
#include "crypto/padding.h"

#include <cstring>

#include "crypto/random.h"

namespace tessel {
namespace {

bool fillNonZero(std::uint8_t* p, std::size_t n) noexcept {
  if (n == 0) return true;
  if (!randomBytes(p, n)) return false;
  for (std::size_t i = 0; i < n; ++i)
    if (p[i] == 0) p[i] = 0x01;
  return true;
}

bool allDigits(const char* s, std::size_t n) noexcept {
  for (std::size_t i = 0; i < n; ++i)
    if (s[i] < '0' || s[i] > '9') return false;
  return true;
}

// Bytes 0 and 1 are the caller's; M follows, then random filler to k bytes.
SecureBuffer keyouLayout(const std::uint8_t* m, std::size_t mlen, std::size_t k, std::uint8_t b0,
                         std::uint8_t b1) noexcept {
  SecureBuffer block = SecureBuffer::allocate(k);
  if (!block) return block;
  std::uint8_t* p = block.data();
  p[0] = b0;
  p[1] = b1;
  std::memcpy(p + 2, m, mlen);
  if (!fillNonZero(p + 2 + mlen, k - mlen - 2)) block.reset();
  return block;
}

}  // namespace

SecureBuffer pkcs1Type2Block(const std::uint8_t* m, std::size_t mlen, std::size_t k) noexcept {
  if (m == nullptr || mlen == 0 || k < 11 || mlen > k - 11) return SecureBuffer();
  SecureBuffer block = SecureBuffer::allocate(k);
  if (!block) return block;
  std::uint8_t* p = block.data();
  p[0] = 0x00;
  p[1] = 0x02;
  const std::size_t filler = k - mlen - 3;
  if (!fillNonZero(p + 2, filler)) return SecureBuffer();
  p[k - mlen - 1] = 0x00;
  std::memcpy(p + k - mlen, m, mlen);
  return block;
}

SecureBuffer keyouBlock(const std::uint8_t* m, std::size_t mlen, std::size_t k) noexcept {
  // The two length characters are '0' + m / 10 and '0' + m % 10: past 99 the first one leaves
  // the digits in ASCII order, which receivers expect as it is.
  if (m == nullptr || mlen == 0 || k < 2 || mlen > k - 2) return SecureBuffer();
  return keyouLayout(m, mlen, k, static_cast<std::uint8_t>('0' + mlen / 10),
                     static_cast<std::uint8_t>('0' + mlen % 10));
}

SecureBuffer keyouBinaryBlock(const std::uint8_t* m, std::size_t mlen, std::size_t k) noexcept {
  if (m == nullptr || mlen == 0 || mlen > 0xFF || k < 2 || mlen > k - 2) return SecureBuffer();
  return keyouLayout(m, mlen, k, 0x00, static_cast<std::uint8_t>(mlen));
}

SecureBuffer lengthByteFfBlock(const std::uint8_t* m, std::size_t mlen, std::size_t k) noexcept {
  if (m == nullptr || mlen > 0xFF || k < 1 || mlen > k - 1) return SecureBuffer();
  SecureBuffer block = SecureBuffer::allocate(k);
  if (!block) return block;
  std::uint8_t* p = block.data();
  p[0] = static_cast<std::uint8_t>(mlen);
  if (mlen != 0) std::memcpy(p + 1, m, mlen);
  std::memset(p + 1 + mlen, 0xFF, k - 1 - mlen);
  return block;
}

SecureBuffer pinBlockX98(const char* pin, const char* pan) noexcept {
  if (pin == nullptr) return SecureBuffer();
  const std::size_t pinLength = std::strlen(pin);
  if (pinLength < 4 || pinLength > 12 || !allDigits(pin, pinLength)) return SecureBuffer();
  std::size_t panLength = 0;
  if (pan != nullptr) {
    panLength = std::strlen(pan);
    if (panLength == 0 || !allDigits(pan, panLength)) return SecureBuffer();
  }
  SecureBuffer block = SecureBuffer::allocate(8);
  if (!block) return block;
  std::uint8_t* p = block.data();
  // PIN field: 0L, then the digits as nibbles, 0xF after them.
  std::memset(p, 0xFF, 8);
  p[0] = static_cast<std::uint8_t>(pinLength);
  for (std::size_t i = 0; i < pinLength; ++i) {
    std::uint8_t& b = p[1 + i / 2];
    const std::uint8_t digit = static_cast<std::uint8_t>(pin[i] - '0');
    b = (i % 2 == 0) ? static_cast<std::uint8_t>((digit << 4) | 0x0F)
                     : static_cast<std::uint8_t>((b & 0xF0) | digit);
  }
  // Account field: the twelve digits left of the check digit, right-aligned, XORed in.
  if (panLength > 1) {
    std::size_t nibble = 15;  // last nibble of the 8-byte field
    for (std::size_t taken = 0; taken < 12 && taken < panLength - 1; ++taken, --nibble) {
      const std::uint8_t digit = static_cast<std::uint8_t>(pan[panLength - 2 - taken] - '0');
      p[nibble / 2] ^= static_cast<std::uint8_t>((nibble % 2) ? digit : digit << 4);
    }
  }
  return block;
}

SecureBuffer fPaddedDigitBlock(const char* digits) noexcept {
  if (digits == nullptr) return SecureBuffer();
  const std::size_t n = std::strlen(digits);
  if (n > 12 || !allDigits(digits, n)) return SecureBuffer();
  SecureBuffer block = SecureBuffer::allocate(8);
  if (!block) return block;
  std::uint8_t* p = block.data();
  std::memset(p, 0xFF, 8);
  for (std::size_t i = 0; i < n; ++i) {
    const std::uint8_t digit = static_cast<std::uint8_t>(digits[i] - '0');
    p[i / 2] = (i % 2 == 0) ? static_cast<std::uint8_t>((digit << 4) | 0x0F)
                            : static_cast<std::uint8_t>((p[i / 2] & 0xF0) | digit);
  }
  return block;
}

}  // namespace tessel
