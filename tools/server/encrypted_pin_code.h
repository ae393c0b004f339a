// Opens getNativeEncryptedPinCode's value: base64 of the typed text RC4-encrypted under the
// SHA-1 of the challenge code (no keystream dropped). There is no private key and no check
// value: any base64 opens to some text, so the caller compares it with what it expects
// (matchesPassword with type -1 compares the text itself).
#pragma once

#include <string>

namespace tessel::server {

// challenge: what the app passed to setNativeChallengeCode (read up to its first zero byte, as
// the device does; empty is refused). code: the base64 text the device returned (capped at
// 65536 bytes, strict base64). *text gets the typed text.
bool openEncryptedPinCode(const std::string& challenge, const std::string& code, std::string* text,
                          std::string* error);

}  // namespace tessel::server
