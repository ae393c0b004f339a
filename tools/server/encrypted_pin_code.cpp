// getNativeEncryptedPinCode's value (see encrypted_pin_code.h).
#include "server/encrypted_pin_code.h"

#include "server/bytes.h"

namespace tessel::server {

bool openEncryptedPinCode(const std::string& challenge, const std::string& code, std::string* text,
                          std::string* error) {
  ClearsOpenSslErrors clear;
  if (code.size() > kMaxOutputBytes) return fail(error, "output longer than 65536 bytes");
  std::string used = challenge.substr(0, challenge.find('\0')), sealed, key;
  Wiped w1{used}, w2{sealed}, w3{key};
  if (used.empty()) return fail(error, "the challenge code is empty");
  if (!fromBase64(code, &sealed, "encrypted PIN code", error)) return false;
  key = digest("SHA1", used);
  return cipherPass("RC4", true, key, 0, sealed, text, error);
}

}  // namespace tessel::server
