// MD5 (RFC 1321) as an incremental context on the caller's stack.
#pragma once

#include <cstddef>
#include <cstdint>

#include "crypto/secure_buffer.h"

namespace tessel {

struct Md5Context {
  std::uint64_t length;  // message length in bytes
  std::uint32_t state[4];
  std::uint8_t block[64];
};

void md5Init(Md5Context& ctx) noexcept;
void md5Update(Md5Context& ctx, const void* data, std::uint32_t length) noexcept;
void md5Final(Md5Context& ctx, std::uint8_t digest[16]) noexcept;
// One-shot digest; the context is wiped before returning.
void md5(const void* data, std::size_t length, std::uint8_t digest[16]) noexcept;
// The one-shot digest as 32 lower-case hex digits (the measure value, the salted hashes);
// absent when memory runs out. The binary digest is wiped.
SecureBuffer md5HexLower(const void* data, std::size_t length) noexcept;

}  // namespace tessel
