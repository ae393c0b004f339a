// SHA-1 (FIPS 180-4) as an incremental context on the caller's stack. On x86-64 CPUs with the
// SHA extensions the compression runs on them (CpuFeature::kShaNi of cpu_features.h).
#pragma once

#include <cstddef>
#include <cstdint>

namespace tessel {

struct Sha1Context {
  std::uint64_t length;  // message length in bytes
  std::uint32_t state[5];
  std::uint8_t block[64];
};

void sha1Init(Sha1Context& ctx) noexcept;
void sha1Update(Sha1Context& ctx, const void* data, std::uint32_t length) noexcept;
void sha1Final(Sha1Context& ctx, std::uint8_t digest[20]) noexcept;
// One-shot digest; the context is wiped before returning.
void sha1(const void* data, std::size_t length, std::uint8_t digest[20]) noexcept;

}  // namespace tessel
