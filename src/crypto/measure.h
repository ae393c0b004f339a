// The measure value: lower-case hex MD5 of the session's typed text.
#pragma once

#include "crypto/secure_buffer.h"

namespace tessel {

struct KeyboardSession;

// 32 lower-case hex digits, or absent for empty content. Unseals and reseals the content.
SecureBuffer computeMeasureValue(KeyboardSession& session) noexcept;

}  // namespace tessel
