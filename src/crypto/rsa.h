// RSA public-key operation y = x^65537 mod n over hex texts. The set-up of each modulus is
// cached by its text (a few entries, process-wide, thread-safe), so repeated operations under
// the same key skip reading the modulus and its Montgomery set-up.
#pragma once

#include <cstddef>
#include <cstdint>

#include "crypto/secure_buffer.h"

namespace tessel {

// Key length k in bytes of a hex modulus (leading zero digits not counted); 0 when the text is
// absent, not hex, zero, or wider than 2240 bits.
std::size_t rsaModulusBytes(const char* modulusHex) noexcept;

// dataHex^65537 mod modulusHex as exactly 2k upper-case hex characters (left-padded with "0").
// Absent when an argument is absent, either text is not hex, the modulus is zero or wider than
// 2240 bits, the data is not below the modulus, or memory runs out.
SecureBuffer rsaPublicHex(const char* modulusHex, const char* dataHex) noexcept;

// The same on bytes: block holds n big-endian bytes, the result exactly k big-endian bytes.
// Saves the hex round trip for callers that hold the block and want the ciphertext as bytes.
SecureBuffer rsaPublicBytes(const char* modulusHex, const std::uint8_t* block, std::size_t n) noexcept;

}  // namespace tessel
