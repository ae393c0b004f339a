// The session's output operations: content envelopes and the encrypted PIN code.
#pragma once

#include "crypto/secure_buffer.h"

namespace tessel {

struct KeyboardSession;

// Unseal, append the hash-random suffix (in a wiped temporary), dispatch `type` (48 content,
// 47 PIN content) with (built-in default modulus, encryPlat), store lastError, reseal.
SecureBuffer contentOutput(KeyboardSession& session, int type, const char* timestamp) noexcept;

// Base64 of the content RC4-encrypted under SHA-1(challenge code); sets lastError 100..102.
SecureBuffer encryptedPinCode(KeyboardSession& session) noexcept;

}  // namespace tessel
