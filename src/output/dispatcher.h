// The encryption dispatcher: text + timestamp + key pair -> the output string of a type 0..90.
#pragma once

#include "crypto/error_table.h"
#include "crypto/secure_buffer.h"

namespace tessel {

// keyPair[0] application-platform modulus, keyPair[1] encryption-platform modulus (hex, either
// may be null; an empty text counts as missing). On success *result holds the output text; on
// failure it is left absent (it is reset on entry).
//
// Checks, in this order, before anything is built:
//   4  no timestamp (every type except 3, 21, 29, 30, 56, 65, 69, 73, 76-79, 83, 88 and the
//      unknown types above 90; negative types count as above 90)
//   5  no text; 6 no result; 8 a type above 90 or below 0
//   1/2/3  the moduli the type needs ("App" types: 1 whatever the other slot holds; "Enc": 2;
//      "Both": 1, or 3 when both are missing, then 2)
//   8  types 21, 65, 69, 76-79, 83
// then the type's own codes (see envelope.h and dispatch_payloads.h), passed up unchanged.
// Types 4, 8, 46 and 51 refuse a length-prefixed pair longer than 127 characters with 21.
ErrorCode encryptionDispatch(int type, const char* const keyPair[2], SecureBuffer* result,
                             const char* text, const char* timestamp) noexcept;

}  // namespace tessel
