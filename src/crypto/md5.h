// MD5 (RFC 1321) as an incremental context on the caller's stack.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tessel {

struct Md5Context {
  std::uint32_t lengthLow, lengthHigh;  // message length in bytes
  std::uint32_t state[4];
  std::uint8_t block[64];
};

void md5Init(Md5Context& ctx) noexcept;
void md5Update(Md5Context& ctx, const void* data, std::uint32_t length) noexcept;
void md5Final(Md5Context& ctx, std::uint8_t digest[16]) noexcept;
// One-shot digest; the context is wiped before returning.
void md5(const void* data, std::size_t length, std::uint8_t digest[16]) noexcept;

}  // namespace tessel
