// Hexadecimal and base64 text forms of byte strings.
//
// Results are SecureBuffers (wiped when released): these texts routinely carry padded blocks,
// keys and ciphertexts. Hex is upper case "0123456789ABCDEF"; base64 is the standard alphabet
// with "=" padding and no line breaks.
#pragma once

#include <cstddef>
#include <cstdint>

#include "crypto/secure_buffer.h"

namespace tessel {

// 2n upper-case hex characters, high nibble first; n = 0 gives an empty text.
SecureBuffer hexEncode(const std::uint8_t* bytes, std::size_t n) noexcept;

// Lower-case variant, used for digests shown as text (measure value, salted hashes).
SecureBuffer hexEncodeLower(const std::uint8_t* bytes, std::size_t n) noexcept;

// Text to bytes, (length + 1) / 2 of them: an odd-length text is read as if it had a leading
// "0". Only 0-9, a-f, A-F have values; any other character counts as 0 without failing
// (the key setters depend on that leniency). Absent only for a null text or no memory.
SecureBuffer hexDecode(const char* text) noexcept;

// As hexDecode, but the characters " \f\n\r\t\v" are skipped wherever they stand
// (key blobs pasted with line breaks).
SecureBuffer hexDecodeSkippingSpace(const char* text) noexcept;

// Strict digit check used where a malformed number must be refused rather than read as 0.
bool isHexText(const char* text) noexcept;

// Standard base64, "=" padded to a multiple of four, no line breaks. Absent on no memory.
SecureBuffer base64Encode(const std::uint8_t* bytes, std::size_t n) noexcept;

// Inverse of base64Encode. Canonical input only: length a multiple of four, alphabet
// characters, "=" only as the final one or two characters, zero pad bits. Absent otherwise.
SecureBuffer base64Decode(const char* text, std::size_t length) noexcept;

}  // namespace tessel
