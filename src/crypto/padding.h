// Block layouts applied before RSA and triple-DES: PKCS#1 v1.5 type 2, the "Keyou" layout
// and its variants, ANSI X9.8 / ISO 9564 format 0 PIN blocks and the F-padded digit block.
// Each returns a complete block or absent; random filler comes from randomBytes() with zero
// bytes replaced by 0x01.
#pragma once

#include <cstddef>
#include <cstdint>

#include "crypto/secure_buffer.h"

namespace tessel {

SecureBuffer pkcs1Type2Block(const std::uint8_t* m, std::size_t mlen, std::size_t k) noexcept;
SecureBuffer keyouBlock(const std::uint8_t* m, std::size_t mlen, std::size_t k) noexcept;
SecureBuffer keyouBinaryBlock(const std::uint8_t* m, std::size_t mlen, std::size_t k) noexcept;
SecureBuffer lengthByteFfBlock(const std::uint8_t* m, std::size_t mlen, std::size_t k) noexcept;
// 8 bytes; pan may be null (no account number).
SecureBuffer pinBlockX98(const char* pin, const char* pan) noexcept;
// 8 bytes: 0..12 digits then "F" to 16 characters, read as hex.
SecureBuffer fPaddedDigitBlock(const char* digits) noexcept;

}  // namespace tessel
