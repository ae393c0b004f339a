// The session's output operations: content envelopes, the encrypted PIN code and the measure
// value. Each unseals the text for the length of the call and reseals it on the way out.
#pragma once

#include "crypto/secure_buffer.h"

namespace tessel {

struct KeyboardSession;

// Unseal, append the hash-random suffix (in a wiped temporary), dispatch `type` (48 content,
// 47 PIN content) with (built-in default modulus, encryPlat), store lastError, reseal.
// The dispatcher always reads a wiped copy of exactly `length` characters plus the suffix, so
// nothing beyond the content is ever read from the store; lastError 11 when that copy cannot
// be allocated. Returns the output text, absent on failure. timestamp may be null (error 4 for
// both types).
SecureBuffer contentOutput(KeyboardSession& session, int type, const char* timestamp) noexcept;

// Base64 of the content RC4-encrypted under SHA-1(challenge code), no keystream dropped.
// lastError: 100 no challenge code, 102 no memory for the copy, 101 empty content (or no
// memory for the text), 0 on success. The RC4 state, key and copy are wiped on every path.
SecureBuffer encryptedPinCode(KeyboardSession& session) noexcept;

// The measure value: 32 lower-case hex digits of MD5 over the text, or absent for empty content.
SecureBuffer computeMeasureValue(KeyboardSession& session) noexcept;

}  // namespace tessel
