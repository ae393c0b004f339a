// Independent oracles from OpenSSL's libcrypto, for tests only: the library never links it.
// Each throws std::runtime_error when OpenSSL fails, which GoogleTest reports as a failure.
#pragma once

#include <cstdint>
#include <string>
#include <utility>
#include <vector>

namespace tessel::test {

using Bytes = std::vector<std::uint8_t>;

// RC4 keystream XOR through OpenSSL's EVP (legacy provider), after dropping `drop` bytes.
Bytes opensslRc4(const Bytes& key, const Bytes& data, std::size_t drop = 0);
// A digest by OpenSSL name ("SHA1", "MD5"), and the two the suites use most.
Bytes opensslDigest(const char* name, const Bytes& data);
std::string opensslMd5Hex(const std::string& data);  // lower case
Bytes opensslSha1(const std::string& data);
// Two-key triple DES (DES-EDE) in ECB over whole blocks, no padding.
Bytes opensslDesEde(const Bytes& key16, const Bytes& data, bool encrypt);
// Base64 without line breaks.
std::string opensslBase64(const Bytes& data);
// Big-number products, quotient and remainder, and modular powers by OpenSSL's BN, over
// upper-case hex texts without leading zeros ("0" for zero).
std::string opensslBnMul(const std::string& a, const std::string& b);
std::pair<std::string, std::string> opensslBnDiv(const std::string& a, const std::string& b);
std::string opensslBnModExp(const std::string& base, const std::string& exp, const std::string& mod);

// Lower-case hex of bytes, and bytes of a hex text (test vectors).
std::string toHex(const Bytes& bytes);
Bytes fromHex(const std::string& hex);
Bytes bytesOf(const std::string& text);

// Path of a file under tests/data and of the suites' output folder in the build tree.
std::string dataPath(const std::string& name);
std::string outputPath(const std::string& name);

}  // namespace tessel::test
