// Shared pieces of the libFuzzer targets: an invariant check that aborts (libFuzzer records the
// input as a crash), a fast deterministic random source, an independent RC4 and the opener of
// the digital envelope.
//
// The random source restarts the same byte pattern on every request, so the 16-byte RC4 key of
// any envelope is the pattern's first 16 bytes whatever was drawn before it: the fuzzers can
// open every envelope they get and check what is inside, without an RSA private key.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>

#include "crypto/codec.h"
#include "crypto/random.h"

namespace tessel_fuzz {

[[noreturn]] inline void invariantFailed(const char* what, const char* file, int line) {
  std::fprintf(stderr, "%s:%d: invariant violated: %s\n", file, line, what);
  std::abort();
}

#define FUZZ_CHECK(cond) \
  do { \
    if (!(cond)) ::tessel_fuzz::invariantFailed(#cond, __FILE__, __LINE__); \
  } while (0)

inline std::uint8_t patternByte(std::size_t i) noexcept {
  return static_cast<std::uint8_t>((i * 167u + 89u) ^ (i >> 8));
}

// The deterministic source: byte i of every request is patternByte(i).
inline bool patternRandom(std::uint8_t* buffer, std::size_t n) {
  for (std::size_t i = 0; i < n; ++i) buffer[i] = patternByte(i);
  return true;
}

inline void installPatternRandom() { tessel::setRandomSourceForTesting(&patternRandom); }

// Checking code need not steer the mutations: keep libFuzzer's comparison tracing out of it.
#define FUZZ_NO_COVERAGE __attribute__((no_sanitize("coverage")))

// A second RC4, written from the published algorithm, so a fault in src/crypto/rc4.cpp cannot
// hide itself in the checks that use it.
class MiniRc4 {
 public:
  FUZZ_NO_COVERAGE MiniRc4(const std::uint8_t* key, std::size_t n) {
    for (int k = 0; k < 256; ++k) s_[k] = static_cast<std::uint8_t>(k);
    std::uint8_t j = 0;
    for (int k = 0; k < 256; ++k) {
      j = static_cast<std::uint8_t>(j + s_[k] + key[static_cast<std::size_t>(k) % n]);
      std::uint8_t t = s_[k];
      s_[k] = s_[j];
      s_[j] = t;
    }
  }
  FUZZ_NO_COVERAGE std::uint8_t next() {
    i_ = static_cast<std::uint8_t>(i_ + 1);
    j_ = static_cast<std::uint8_t>(j_ + s_[i_]);
    std::uint8_t t = s_[i_];
    s_[i_] = s_[j_];
    s_[j_] = t;
    return s_[static_cast<std::uint8_t>(s_[i_] + s_[j_])];
  }
  FUZZ_NO_COVERAGE void crypt(std::uint8_t* p, std::size_t n) {
    for (std::size_t k = 0; k < n; ++k) p[k] ^= next();
  }

 private:
  std::uint8_t s_[256];
  std::uint8_t i_ = 0, j_ = 0;
};

inline bool isDigits(const std::uint8_t* p, std::size_t n) {
  for (std::size_t k = 0; k < n; ++k)
    if (p[k] < '0' || p[k] > '9') return false;
  return true;
}

inline std::size_t readLengthField(const std::uint8_t* p) {
  std::size_t v = 0;
  for (int k = 0; k < 8; ++k) v = v * 10 + static_cast<std::size_t>(p[k] - '0');
  return v;
}

// Opens a base64 envelope built while patternRandom was installed: checks the layout for a
// wrapped key of k bytes (k + 12 in the first field, the SIMPLEBLOB header, the second length
// field matching what is left) and returns the RC4-decrypted string.
inline std::string openEnvelope(const char* base64, std::size_t base64Length, std::size_t k,
                                std::size_t drop) {
  static const std::uint8_t kHeader[12] = {0x01, 0x02, 0x00, 0x00, 0x01, 0x68,
                                           0x00, 0x00, 0x00, 0xA4, 0x00, 0x00};
  tessel::SecureBuffer raw = tessel::base64Decode(base64, base64Length);
  FUZZ_CHECK(raw);
  const std::uint8_t* p = raw.data();
  const std::size_t n = raw.size();
  FUZZ_CHECK(n >= k + 28);
  FUZZ_CHECK(isDigits(p, 8) && readLengthField(p) == k + 12);
  for (int q = 0; q < 12; ++q) FUZZ_CHECK(p[8 + q] == kHeader[q]);
  FUZZ_CHECK(isDigits(p + 20 + k, 8));
  const std::size_t length = readLengthField(p + 20 + k);
  FUZZ_CHECK(length == n - k - 28);
  std::uint8_t key[16];
  patternRandom(key, sizeof key);
  MiniRc4 rc4(key, sizeof key);
  for (std::size_t q = 0; q < drop; ++q) rc4.next();
  std::string inner(reinterpret_cast<const char*>(p + 28 + k), length);
  rc4.crypt(reinterpret_cast<std::uint8_t*>(&inner[0]), length);
  return inner;
}

inline bool isStrengthLetter(char c) {
  return c == 'E' || c == 'W' || c == 'M' || c == 'S' || c == 'T' || c == 'R';
}

inline bool isHexOf(const std::string& s, bool upper) {
  for (char c : s) {
    const bool digit = c >= '0' && c <= '9';
    const bool letter = upper ? (c >= 'A' && c <= 'F') : (c >= 'a' && c <= 'f');
    if (!digit && !letter) return false;
  }
  return true;
}

// The salted-hash text of types 47, 48, 55, 59, read independently of the dispatcher:
// 0 = no "::::::::::" (the text is its own value), 1 = well formed (P, separator, salt,
// separator, mode 'S' or 'F' in *mode, the salt running to the last 11 characters),
// -1 = malformed (error 18).
inline int hashedShape(const std::string& t, char* mode) {
  static const std::string kSep = "::::::::::";
  const std::size_t first = t.find(kSep);
  if (first == std::string::npos) return 0;
  if (first == 0 || t.size() - first == 21) return -1;
  const std::size_t second = t.find(kSep, first + 10);
  if (second == std::string::npos || second + 10 >= t.size()) return -1;
  *mode = t[second + 10];
  return (*mode == 'S' || *mode == 'F') ? 1 : -1;
}

}  // namespace tessel_fuzz
