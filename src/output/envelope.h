// Building blocks of the encryption dispatcher: the digital envelope, the RSA helpers with their
// error codes, the strength-letter wrapper and the length-prefixed pair.
//
// Every function returns an ErrorCode (0 = success) and fills *out only on success; on failure
// *out is left absent. Every temporary that held plaintext, a key, a padded block, a keystream
// scratch or a hex/binary form of them is wiped before release (they all live in SecureBuffers
// or are wiped explicitly), on success and failure alike.
//
// Digital envelope layout (k = RSA modulus bytes, L = string bytes), before base64:
//
//   offset 0       8 ASCII digits "%08d" of k + 12
//   offset 8       01 02 00 00 01 68 00 00 00 A4 00 00   SIMPLEBLOB header: type 1, version 2,
//                                                        reserved 0, RC4 (0x6801), RSA key
//                                                        exchange (0xA400), little-endian
//   offset 20      RSA-PKCS#1(16-byte RC4 key), k bytes, least significant byte first
//   offset 20+k    8 ASCII digits "%08d" of L
//   offset 28+k    RC4(key)(string) after dropping `drop` keystream bytes
//
// so k + L + 28 bytes in all, base64-encoded without line breaks.
#pragma once

#include <cstddef>
#include <cstdint>

#include "crypto/error_table.h"
#include "crypto/secure_buffer.h"

namespace tessel {

constexpr std::size_t kEnvelopeKeyBytes = 16;
constexpr std::size_t kEnvelopeDrop = 512;
constexpr std::size_t kEnvelopeDropLegacy = 625;   // types 1 and 33
constexpr std::size_t kEnvelopeDropBare = 768;     // type 88
constexpr std::size_t kPairBufferSize = 128;       // fixed buffer of the length-prefixed pair

// RSA helpers over (modulus hex, message bytes), exponent 65537, big-endian.
//   pkcs1RsaHex     PKCS#1 v1.5 type 2 block, hex, RSA -> 2k hex chars.  12 padding, 17 hex, 7 RSA
//   pkcs1RsaBinary  ... then hex to k bytes.                                           16
//   pkcs1RsaBase64  ... then base64.                                                   14
//   keyouRsaHex     "Keyou" block instead of PKCS#1.                                   13 padding
//   keyouRsaBase64  ... hex to binary, base64.                                         16, 14
// An empty message or one too long for the modulus is a padding failure (12 or 13).
ErrorCode pkcs1RsaHex(const char* modulus, const std::uint8_t* m, std::size_t n, SecureBuffer* out) noexcept;
ErrorCode pkcs1RsaBinary(const char* modulus, const std::uint8_t* m, std::size_t n, SecureBuffer* out) noexcept;
ErrorCode pkcs1RsaBase64(const char* modulus, const std::uint8_t* m, std::size_t n, SecureBuffer* out) noexcept;
ErrorCode keyouRsaHex(const char* modulus, const std::uint8_t* m, std::size_t n, SecureBuffer* out) noexcept;
ErrorCode keyouRsaBase64(const char* modulus, const std::uint8_t* m, std::size_t n, SecureBuffer* out) noexcept;

// The envelope above over the n bytes at s (n may be 0). Random failure 9, key wrap 12/17/7/16,
// allocation 11, base64 14.
ErrorCode digitalEnvelope(std::size_t drop, const char* modulus, const std::uint8_t* s, std::size_t n,
                          SecureBuffer* out) noexcept;

// letter, timestamp, ":", payload ("%c%s:%s"). Allocation failure 11. timestamp and payload are
// NUL-terminated; payload may be empty.
ErrorCode payloadWrapper(char letter, const char* timestamp, const char* payload, SecureBuffer* out) noexcept;

// "%02d%s%02d%s" of (strlen(timestamp), timestamp, strlen(text), text).
// fixedBuffer: built in the 128-byte stack buffer of types 4, 8, 46 and 51; a pair that would not
// fit (with its terminator) is refused with 21. Otherwise a heap buffer sized to the pair.
ErrorCode lengthPrefixedPair(const char* timestamp, const char* text, bool fixedBuffer,
                             SecureBuffer* out) noexcept;

}  // namespace tessel
