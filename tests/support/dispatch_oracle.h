// OpenSSL-backed oracles for the RSA, dispatcher and server-side suites: their private keys, RSA
// by OpenSSL, an envelope assembled from its parts, and tessel_open run in a child process.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "server/tessel_opener.h"
#include "support/openssl_oracle.h"

namespace tessel::test {

// A private key from tests/data, loaded once per process (throws when it cannot be read).
const server::PrivateKey& testKey(const std::string& fileName);
// The dispatcher suites' keys: a 1024-bit application key, a 2048-bit encryption key, and a
// 1024-bit key that nothing is encrypted for.
inline const server::PrivateKey& appKey() { return testKey("dispatch_app_key_1024.pem"); }
inline const server::PrivateKey& encKey() { return testKey("dispatch_enc_key_2048.pem"); }
inline const server::PrivateKey& foreignKey() { return testKey("dispatch_foreign_key_1024.pem"); }
// The demo private key of the built-in default modulus (slot 12).
inline const server::PrivateKey& builtinDefaultKey() { return testKey("builtin_default_key.pem"); }

// Throws on text that is not canonical base64.
Bytes opensslBase64Decode(const std::string& text);
// PKCS#1 v1.5 encryption (random padding) and raw RSA under the key's public half.
Bytes opensslPkcs1Encrypt(const server::PrivateKey& key, const Bytes& message);
Bytes opensslRawEncrypt(const server::PrivateKey& key, const Bytes& block);
// What only the key owner can do: c^d mod n as exactly k bytes, and PKCS#1 v1.5 type 2
// decryption (throws when the block does not unpad).
Bytes opensslRawDecrypt(const server::PrivateKey& key, const Bytes& cipher);
Bytes opensslPkcs1Decrypt(const server::PrivateKey& key, const Bytes& cipher);
// The public half as PKCS#1 RSAPublicKey DER, in upper-case hex.
std::string opensslPublicDerHex(const server::PrivateKey& key);

// The digital envelope built with OpenSSL alone: "%08d"(k+12), SIMPLEBLOB header, the RSA value
// of rc4Key reversed, "%08d"(L), RC4 after `drop` bytes. wrappedKey (k bytes, big-endian) is
// used when given, else OpenSSL's own PKCS#1 encryption of rc4Key.
std::string opensslEnvelope(const server::PrivateKey& key, const Bytes& rc4Key, std::size_t drop,
                            const std::string& content, const Bytes& wrappedKey = Bytes());

// The salted-hash value of the hashed types, from OpenSSL's MD5.
std::string expectedSaltedHash(const std::string& password, const std::string& salt, char mode);

// Runs tessel_open's command line in a forked child: exit status (or -signal) and both streams.
struct CliRun {
  int status = 0;
  std::string out;
  std::string err;
};
CliRun runOpenCli(const std::vector<std::string>& args, const std::string& input = std::string());

}  // namespace tessel::test
