// Independent oracles from OpenSSL's libcrypto, for tests only: the library never links it.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace tessel::test {

using Bytes = std::vector<std::uint8_t>;

// RC4 keystream XOR through OpenSSL's EVP (legacy provider), after dropping `drop` bytes.
Bytes opensslRc4(const Bytes& key, const Bytes& data, std::size_t drop = 0);

// Lower-case hex of bytes, and bytes of a hex text (test vectors).
std::string toHex(const Bytes& bytes);
Bytes fromHex(const std::string& hex);
Bytes bytesOf(const std::string& text);

// Path of a file under tests/data and of the suites' output folder in the build tree.
std::string dataPath(const std::string& name);
std::string outputPath(const std::string& name);

}  // namespace tessel::test
