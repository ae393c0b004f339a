// Salted hashes and the password comparison (see password_check.h).
#include "server/password_check.h"

#include <openssl/crypto.h>

#include "server/bytes.h"

namespace tessel::server {

std::string saltedHashValue(const std::string& password, const std::string& salt, char mode) {
  if (mode != 'S' && mode != 'F') return std::string();
  std::string h1 = toHex(digest("MD5", password), false) + salt;
  std::string h2 = toHex(digest("MD5", h1), false);
  wipeString(&h1);
  if (mode == 'S') h2 = h2.substr(8, 16);
  return h2;
}

bool matchesPassword(int type, const Opened& opened, const std::string& password, const std::string& salt,
                     char mode) {
  ClearsOpenSslErrors clear;
  if (!opened.contentOpened) return false;
  const Inner inner = typeLayout(type).inner;
  std::string expected;
  Wiped w{expected};
  if ((inner == Inner::Hashed || inner == Inner::HashedRsa) && !salt.empty()) {
    expected = saltedHashValue(password, salt, mode);
    if (expected.empty()) return false;  // unknown mode
  } else if (inner == Inner::Type5) {
    std::string sha1 = digest("SHA1", password);
    expected = toHex(sha1, true);
    wipeString(&sha1);
  } else {
    expected = password;
  }
  return expected.size() == opened.content.size() &&
         CRYPTO_memcmp(expected.data(), opened.content.data(), expected.size()) == 0;
}

}  // namespace tessel::server
