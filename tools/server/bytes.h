// Byte helpers of the server-side opener: the one wipe, the codecs (strict base64, hex), the
// constant-time selections, OpenSSL's symmetric ciphers and digests, and secret files read into
// buffers that are wiped. Everything here is below the other units of tessel_server; none of it
// is specific to an encryption type.
//
// Failure messages of these helpers name the input ("what") and never carry its bytes.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

namespace tessel::server {

// The only answer once a private-key operation has run: a forged envelope, a wrong key inside
// it, another type's output and a wrong password all read "output rejected".
extern const char kRejected[];
// Outputs longer than this are refused before any decoding ("output longer than 65536 bytes").
constexpr std::size_t kMaxOutputBytes = 65536;
// Password, key and challenge files hold at most this many bytes.
constexpr std::size_t kMaxSecretFileBytes = 4096;

// Sets *error (when not null) and returns false.
bool fail(std::string* error, const std::string& message);

// Wipes a string's bytes (plaintext, keys, their hex or base64) and empties it; null accepted.
void wipeString(std::string* s);

// Wipes a string when it goes out of scope, on every path.
struct Wiped {
  std::string& s;
  ~Wiped() { wipeString(&s); }
};

// Clears OpenSSL's error queue when it goes out of scope: a failed decryption must leave no
// trace a later caller could read.
struct ClearsOpenSslErrors {
  ~ClearsOpenSslErrors();
};

// Hex of bytes, upper or lower case.
std::string toHex(const std::string& bytes, bool upper);
// Even length, 0-9 a-f A-F only; anything else: false with "<what>: ...". *out is wiped on failure.
bool fromHex(const std::string& hex, std::string* out, const char* what, std::string* error);
// Strict base64: the standard alphabet only (no whitespace), length a multiple of 4, '=' only as
// one or two final pad characters, and canonical (unused low bits of the last symbol zero).
// Empty text is refused. *out is wiped on failure.
bool fromBase64(const std::string& text, std::string* out, const char* what, std::string* error);

// Reads at most `limit` bytes of a file ("-": stdin) into *out, through one buffer that is
// wiped on every path (no stream copies left in freed heap). Unreadable: false.
bool readAtMost(const std::string& path, std::size_t limit, std::string* out, std::string* error);
// A whole file of at most `max` bytes (readAtMost max + 1); more: false.
bool readSecretFile(const std::string& path, std::size_t max, std::string* out, std::string* error);

// ---- constant time: masks are all ones (true) or all zeros (false); no branch on their values.
inline std::uint32_t ctIsZero(std::uint32_t x) { return 0u - ((~x & (x - 1u)) >> 31); }
inline std::uint32_t ctEq(std::uint32_t a, std::uint32_t b) { return ctIsZero(a ^ b); }
// a < b for values below 2^31.
inline std::uint32_t ctLt(std::uint32_t a, std::uint32_t b) { return 0u - ((a - b) >> 31); }
inline std::uint32_t ctSelect(std::uint32_t mask, std::uint32_t a, std::uint32_t b) {
  return (mask & a) | (~mask & b);
}

// One pass of an OpenSSL cipher ("RC4", "DES-EDE-ECB") without padding; `skip` keystream bytes
// are dropped first. RC4 comes from the legacy provider in a private library context.
bool cipherPass(const char* name, bool encrypt, const std::string& key, std::size_t skip,
                const std::string& in, std::string* out, std::string* error);
// "MD5", "SHA1", "SHA256" of data, raw bytes.
std::string digest(const char* name, const std::string& data);

}  // namespace tessel::server
