// The message table. Texts are part of the library's interface and are kept verbatim.
#include "crypto/error_table.h"

namespace tessel {
namespace {

const char* const kMessages[28] = {
    "No Error!",
    "The application platform modulus is missing!",
    "The encryption platform modulus is missing!",
    "Both the application platform modulus and the encryption platform modulus are missing!",
    "The timestamp is missing!",
    "The text is missing!",
    "The ciphered text is missing!",
    "Encyption failed!",
    "The encryption type (or bank id) is unknown!",
    "Generating random number failed!",
    "Converting password to ansi x9.8 pin blok failed!",
    "Allocating memory failed!",
    "Adding PKCS1 padding failed!",
    "Adding Keyou padding failed!",
    "Base64 encoding failed!",
    "Base64 decoding failed!",
    "Converting hexdecimal string to binary failed!",
    "Converting binary to hexdecimal string failed!",
    "The format of the text is wrong!",
    "Adding SDHS padding failed!",
    "Decyption failed!",
    "The parameters is invalid!",
    "The context is invalid!",
    "The sm2 public key is invalid!",
    "The sm2 private key is invalid!",
    "The signature verification failed!",
    nullptr,  // 26 has no message
    "The interface is not implemented!",
};

const char kNoMessage[] = "Error message does not exist!";

}  // namespace

const char* errorMessage(int code) noexcept {
  if (code < 0 || code > 27 || kMessages[code] == nullptr) return kNoMessage;
  return kMessages[code];
}

const char* lastErrorText(ErrorCode code) noexcept {
  switch (code) {
    case kErrChallengeCodeEmpty: return "Challenge code is empty";
    case kErrPinCodeEncryption: return "Encryption error";
    case kErrPinCodeSpace: return "Failed to apply for space";
    case kErrAntiDebugging: return "Debugging was detected, the keyboard refuses to work";
    default: break;
  }
  if (code > 99) return "Unknown error";
  return errorMessage(code);
}

}  // namespace tessel
