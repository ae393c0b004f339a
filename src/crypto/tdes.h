// Two-key Triple DES (EDE, keying option 2) in ECB form, and DES odd parity.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tessel {

struct TripleDesContext {
  std::uint32_t mode;
  std::uint32_t subkeys[96];  // three 32-word schedules in the order the passes use them
};

void desSetOddParity(std::uint8_t* key, std::size_t length) noexcept;
void tdes2SetKeyEncrypt(TripleDesContext& ctx, const std::uint8_t key[16]) noexcept;
void tdes2SetKeyDecrypt(TripleDesContext& ctx, const std::uint8_t key[16]) noexcept;
// One 8-byte block; in and out may be the same buffer.
void tdesCryptEcb(const TripleDesContext& ctx, const std::uint8_t in[8], std::uint8_t out[8]) noexcept;

}  // namespace tessel
