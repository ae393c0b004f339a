// The encryption dispatcher: text + timestamp + key pair -> the output string of a type 0..90.
#pragma once

#include "crypto/error_table.h"
#include "crypto/secure_buffer.h"

namespace tessel {

// keyPair[0] application-platform modulus, keyPair[1] encryption-platform modulus (hex, either
// may be null). On success *result holds the output text; on failure it is left absent.
ErrorCode encryptionDispatch(int type, const char* const keyPair[2], SecureBuffer* result,
                             const char* text, const char* timestamp) noexcept;

}  // namespace tessel
