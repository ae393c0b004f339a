// Input buffering and final padding shared by the 64-byte-block digests (MD5, SHA-1), whose
// contexts both count the message length in bytes.
//
// absorb adds input to a context: it completes a partly filled block from the input, compresses
// whole blocks straight from the input without copying them, and keeps the tail in the context's
// block buffer. `length` is the context's byte count, whose low six bits say how many bytes the
// buffer holds; compress(blocks, count) runs the digest's compression over `count` consecutive
// 64-byte blocks. padFinalBlock ends the message.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>

namespace tessel {

template <typename Compress>
inline void absorb(std::uint8_t block[64], std::uint64_t& length, const void* data, std::size_t left,
                   Compress compress) noexcept {
  if (left == 0) return;
  const std::uint8_t* p = static_cast<const std::uint8_t*>(data);
  std::size_t used = length & 63;
  length += left;
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

// The two digests differ only in the byte order of the length field.
enum class LengthOrder { kLittleEndian, kBigEndian };

// The message's last block, or two: its tail (bytes % 64 of them, already in `block`), 0x80,
// zeros up to byte 56, and the length in bits (bytes * 8 modulo 2^64) as eight bytes in `order`.
// A tail of more than 55 bytes leaves no room for the length, which then goes into a second block.
template <typename Compress>
inline void padFinalBlock(std::uint8_t block[64], std::uint64_t bytes, LengthOrder order,
                          Compress compress) noexcept {
  std::size_t used = bytes & 63;
  block[used++] = 0x80;
  if (used > 56) {
    std::memset(block + used, 0, 64 - used);
    compress(block, 1);
    used = 0;
  }
  std::memset(block + used, 0, 56 - used);
  const std::uint64_t bits = bytes << 3;
  for (int i = 0; i < 8; ++i)
    block[56 + i] = static_cast<std::uint8_t>(bits >> (order == LengthOrder::kBigEndian ? 56 - 8 * i : 8 * i));
  compress(block, 1);
}

}  // namespace tessel
