// Input buffering shared by the 64-byte-block digests (MD5, SHA-1).
//
// absorbBlocks completes a partly filled block from the input, compresses whole blocks straight
// from the input without copying them, and keeps the tail in the context's block buffer.
// `used` is how many bytes the buffer already holds (0..63); compress(blocks, count) runs the
// digest's compression over `count` consecutive 64-byte blocks. absorbInSlices feeds an input of
// any size to an update function that takes 32-bit lengths (the one-shot digests).
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>

namespace tessel {

template <typename Compress>
inline void absorbBlocks(std::uint8_t block[64], std::size_t used, const std::uint8_t* p,
                         std::size_t left, Compress compress) noexcept {
  if (used != 0) {
    const std::size_t take = left < 64 - used ? left : 64 - used;
    std::memcpy(block + used, p, take);
    used += take;
    p += take;
    left -= take;
    if (used < 64) return;
    compress(block, 1);
  }
  if (left >= 64) {
    compress(p, left / 64);
    p += left & ~std::size_t{63};
    left &= 63;
  }
  if (left != 0) std::memcpy(block, p, left);
}

template <typename Update>
inline void absorbInSlices(const void* data, std::size_t length, Update update) noexcept {
  const std::uint8_t* p = static_cast<const std::uint8_t*>(data);
  while (length > 0) {
    const std::uint32_t n = length > 0x40000000u ? 0x40000000u : static_cast<std::uint32_t>(length);
    update(p, n);
    p += n;
    length -= n;
  }
}

}  // namespace tessel
