// Error codes of the output operations and their messages.
//
// ErrorCode values 0..27 index the table of messages (exact texts, misspellings included:
// app developers match on them); 100..103 are keyboard-level codes reported by the session.
#pragma once

#include <cstdint>

namespace tessel {

using ErrorCode = std::int8_t;

enum : int {
  kOk = 0,
  kErrAppModulusMissing = 1,
  kErrEncModulusMissing = 2,
  kErrBothModuliMissing = 3,
  kErrTimestampMissing = 4,
  kErrTextMissing = 5,
  kErrResultMissing = 6,
  kErrEncryptionFailed = 7,
  kErrUnknownType = 8,
  kErrRandomFailed = 9,
  kErrPinBlockFailed = 10,
  kErrAllocation = 11,
  kErrPkcs1Padding = 12,
  kErrKeyouPadding = 13,
  kErrBase64Encode = 14,
  kErrBase64Decode = 15,
  kErrHexToBinary = 16,
  kErrBinaryToHex = 17,
  kErrTextFormat = 18,
  kErrSdhsPadding = 19,
  kErrDecryptionFailed = 20,
  kErrInvalidParameters = 21,
  kErrInvalidContext = 22,
  kErrSm2PublicKey = 23,
  kErrSm2PrivateKey = 24,
  kErrSignature = 25,
  kErrNotImplemented = 27,
  kErrChallengeCodeEmpty = 100,
  kErrPinCodeEncryption = 101,
  kErrPinCodeSpace = 102,
  kErrAntiDebugging = 103,
};

// Message of a table code 0..27; "Error message does not exist!" for a code without a row
// (26, negatives, anything above 27).
const char* errorMessage(int code) noexcept;

// What getNativeLastError shows for a session's lastError (read as signed 8-bit):
// 100..103 keyboard-level texts, other values above 99 "Unknown error", the rest the table.
const char* lastErrorText(ErrorCode code) noexcept;

}  // namespace tessel
