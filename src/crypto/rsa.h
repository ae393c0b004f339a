// RSA public-key operation y = x^65537 mod n over hex texts.
#pragma once

#include <cstddef>

#include "crypto/secure_buffer.h"

namespace tessel {

// Key length k in bytes of a hex modulus (leading zero digits not counted); 0 when the text is
// absent, not hex, zero, or wider than 2240 bits.
std::size_t rsaModulusBytes(const char* modulusHex) noexcept;

// dataHex^65537 mod modulusHex as exactly 2k upper-case hex characters (left-padded with "0").
// Absent when an argument is absent, either text is not hex, the modulus is zero or wider than
// 2240 bits, the data is not below the modulus, or memory runs out.
SecureBuffer rsaPublicHex(const char* modulusHex, const char* dataHex) noexcept;

}  // namespace tessel
