// Two-key Triple DES (EDE) on the classic combined-table DES core.
//
// The round function works on halves kept rotated left by one bit, which lines the expansion
// E up with whole bytes: rotr4(R) ^ k0 holds the inputs of S-boxes 1, 3, 5, 7 in its four
// bytes and R ^ k1 those of S-boxes 2, 4, 6, 8 (six bits each, first E bit highest). Each of
// the eight SP tables maps such a six-bit input straight to P(S(x)) in the same rotated form,
// so a round is eight lookups and ORs. The tables and the odd-parity table are computed at
// compile time from the published S-boxes and P, not typed in.
//
// A key schedule is 32 words: per round the two words k0, k1 above. Decryption uses the same
// round loop with the sixteen pairs in reverse order. Triple DES applies the initial and final
// permutations once around the three passes. Schedules are key material: callers wipe their
// context (wipeObject); the routines here wipe their own temporaries.
#include "crypto/tdes.h"

#include <array>

#include "crypto/wipe.h"

namespace tessel {
namespace {

using u32 = std::uint32_t;

constexpr std::uint8_t kSBoxes[8][64] = {
    {14, 4,  13, 1, 2,  15, 11, 8,  3,  10, 6,  12, 5,  9,  0, 7,  0, 15, 7,  4,  14, 2,
     13, 1,  10, 6, 12, 11, 9,  5,  3,  8,  4,  1,  14, 8,  13, 6, 2,  11, 15, 12, 9,  7,
     3,  10, 5,  0, 15, 12, 8,  2,  4,  9,  1,  7,  5,  11, 3,  14, 10, 0, 6,  13},
    {15, 1,  8,  14, 6,  11, 3,  4,  9,  7, 2,  13, 12, 0,  5,  10, 3,  13, 4, 7,  15, 2,
     8,  14, 12, 0,  1,  10, 6,  9,  11, 5, 0,  14, 7,  11, 10, 4,  13, 1,  5, 8,  12, 6,
     9,  3,  2,  15, 13, 8,  10, 1,  3,  15, 4, 2,  11, 6,  7,  12, 0,  5,  14, 9},
    {10, 0,  9,  14, 6,  3,  15, 5, 1,  13, 12, 7,  11, 4, 2,  8,  13, 7, 0,  9,  3,  4,
     6,  10, 2,  8,  5,  14, 12, 11, 15, 1,  13, 6,  4,  9, 8,  15, 3,  0, 11, 1,  2,  12,
     5,  10, 14, 7,  1,  10, 13, 0,  6,  9,  8,  7,  4,  15, 14, 3,  11, 5, 2,  12},
    {7,  13, 14, 3, 0, 6,  9,  10, 1,  2, 8,  5,  11, 12, 4,  15, 13, 8,  11, 5,  6,  15,
     0,  3,  4,  7, 2, 12, 1,  10, 14, 9, 10, 6,  9,  0,  12, 11, 7,  13, 15, 1,  3,  14,
     5,  2,  8,  4, 3, 15, 0,  6,  10, 1, 13, 8,  9,  4,  5,  11, 12, 7,  2,  14},
    {2,  12, 4,  1,  7,  10, 11, 6,  8,  5,  3,  15, 13, 0, 14, 9,  14, 11, 2,  12, 4, 7,
     13, 1,  5,  0,  15, 10, 3,  9,  8,  6,  4,  2,  1,  11, 10, 13, 7, 8,  15, 9,  12, 5,
     6,  3,  0,  14, 11, 8,  12, 7,  1,  14, 2,  13, 6,  15, 0,  9,  10, 4, 5,  3},
    {12, 1,  10, 15, 9, 2,  6,  8,  0, 13, 3,  4,  14, 7,  5,  11, 10, 15, 4,  2,  7,  12,
     9,  5,  6,  1,  13, 14, 0,  11, 3, 8,  9,  14, 15, 5,  2,  8,  12, 3,  7,  0,  4,  10,
     1,  13, 11, 6,  4,  3,  2,  12, 9, 5,  15, 10, 11, 14, 1,  7,  6,  0,  8,  13},
    {4,  11, 2,  14, 15, 0,  8,  13, 3,  12, 9, 7,  5,  10, 6, 1,  13, 0,  11, 7,  4, 9,
     1,  10, 14, 3,  5,  12, 2,  15, 8,  6,  1, 4,  11, 13, 12, 3, 7,  14, 10, 15, 6, 8,
     0,  5,  9,  2,  6,  11, 13, 8,  1,  4,  10, 7, 9,  5,  0,  15, 14, 2, 3,  12},
    {13, 2,  8,  4, 6,  15, 11, 1,  10, 9, 3,  14, 5,  0,  12, 7,  1,  15, 13, 8,  10, 3,
     7,  4,  12, 5, 6,  11, 0,  14, 9,  2, 7,  11, 4,  1,  9,  12, 14, 2,  0,  6,  10, 13,
     15, 3,  5,  8, 2,  1,  14, 7,  4,  10, 8,  13, 15, 12, 9,  0,  3,  5,  6,  11},
};

// P: output bit i (1-based, most significant first) is input bit kP[i - 1].
constexpr std::uint8_t kP[32] = {16, 7, 20, 21, 29, 12, 28, 17, 1,  15, 23, 26, 5,  18, 31, 10,
                                 2,  8, 24, 14, 32, 27, 3,  9,  19, 13, 30, 6,  22, 11, 4,  25};

constexpr std::uint8_t kPc1[56] = {57, 49, 41, 33, 25, 17, 9,  1,  58, 50, 42, 34, 26, 18,
                                   10, 2,  59, 51, 43, 35, 27, 19, 11, 3,  60, 52, 44, 36,
                                   63, 55, 47, 39, 31, 23, 15, 7,  62, 54, 46, 38, 30, 22,
                                   14, 6,  61, 53, 45, 37, 29, 21, 13, 5,  28, 20, 12, 4};

constexpr std::uint8_t kPc2[48] = {14, 17, 11, 24, 1,  5,  3,  28, 15, 6,  21, 10,
                                   23, 19, 12, 4,  26, 8,  16, 7,  27, 20, 13, 2,
                                   41, 52, 31, 37, 47, 55, 30, 40, 51, 45, 33, 48,
                                   44, 49, 39, 56, 34, 53, 46, 42, 50, 36, 29, 32};

constexpr std::uint8_t kShifts[16] = {1, 1, 2, 2, 2, 2, 2, 2, 1, 2, 2, 2, 2, 2, 2, 1};

constexpr u32 rotl(u32 x, int n) { return (x << n) | (x >> (32 - n)); }
constexpr u32 rotr(u32 x, int n) { return (x >> n) | (x << (32 - n)); }

using SpTables = std::array<std::array<u32, 64>, 8>;

constexpr SpTables makeSpTables() {
  SpTables sp{};
  for (int box = 0; box < 8; ++box)
    for (int v = 0; v < 64; ++v) {
      const int row = ((v >> 4) & 2) | (v & 1);
      const int col = (v >> 1) & 15;
      // The S-box output occupies bits 4*box+1 .. 4*box+4 of the 32-bit S output.
      const u32 s = static_cast<u32>(kSBoxes[box][16 * row + col]) << (28 - 4 * box);
      u32 p = 0;
      for (int i = 0; i < 32; ++i)
        if ((s >> (32 - kP[i])) & 1u) p |= 1u << (31 - i);
      sp[box][v] = rotl(p, 1);
    }
  return sp;
}

constexpr SpTables kSp = makeSpTables();

constexpr std::array<std::uint8_t, 256> makeOddParity() {
  std::array<std::uint8_t, 256> t{};
  for (int b = 0; b < 256; ++b) {
    int ones = 0;
    for (int i = 1; i < 8; ++i) ones += (b >> i) & 1;
    t[b] = static_cast<std::uint8_t>((b & 0xFE) | ((ones & 1) ? 0 : 1));
  }
  return t;
}

constexpr std::array<std::uint8_t, 256> kOddParity = makeOddParity();

// Sixteen encryption subkey pairs of one 8-byte DES key.
void desSchedule(const std::uint8_t key[8], u32 out[32]) noexcept {
  std::uint64_t k = 0;
  for (int i = 0; i < 8; ++i) k = (k << 8) | key[i];
  // PC-1 into two 28-bit halves C and D (parity bits dropped).
  u32 c = 0, d = 0;
  for (int i = 0; i < 28; ++i) {
    c = (c << 1) | static_cast<u32>((k >> (64 - kPc1[i])) & 1u);
    d = (d << 1) | static_cast<u32>((k >> (64 - kPc1[28 + i])) & 1u);
  }
  for (int round = 0; round < 16; ++round) {
    const int s = kShifts[round];
    c = ((c << s) | (c >> (28 - s))) & 0x0FFFFFFFu;
    d = ((d << s) | (d >> (28 - s))) & 0x0FFFFFFFu;
    const std::uint64_t cd = (static_cast<std::uint64_t>(c) << 28) | d;
    // PC-2, then split into the eight six-bit groups: odd boxes in k0, even boxes in k1.
    u32 k0 = 0, k1 = 0;
    for (int box = 0; box < 8; ++box) {
      u32 group = 0;
      for (int j = 0; j < 6; ++j)
        group = (group << 1) | static_cast<u32>((cd >> (56 - kPc2[6 * box + j])) & 1u);
      const int shift = 24 - 8 * (box / 2);
      if (box % 2 == 0)
        k0 |= group << shift;
      else
        k1 |= group << shift;
    }
    out[2 * round] = k0;
    out[2 * round + 1] = k1;
  }
  c = d = 0;
  k = 0;
  secureWipe(&k, sizeof(k));
}

void reversePairs(const u32 in[32], u32 out[32]) noexcept {
  for (int round = 0; round < 16; ++round) {
    out[2 * round] = in[30 - 2 * round];
    out[2 * round + 1] = in[31 - 2 * round];
  }
}

inline u32 feistel(u32 right, const u32* k) noexcept {
  u32 work = rotr(right, 4) ^ k[0];
  u32 f = kSp[6][work & 0x3F] | kSp[4][(work >> 8) & 0x3F] | kSp[2][(work >> 16) & 0x3F] |
          kSp[0][(work >> 24) & 0x3F];
  work = right ^ k[1];
  f |= kSp[7][work & 0x3F] | kSp[5][(work >> 8) & 0x3F] | kSp[3][(work >> 16) & 0x3F] |
       kSp[1][(work >> 24) & 0x3F];
  return f;
}

// Sixteen rounds; leaves the halves swapped as the last DES round does.
inline void sixteenRounds(u32& left, u32& right, const u32* k) noexcept {
  for (int round = 0; round < 16; round += 2) {
    left ^= feistel(right, k + 2 * round);
    right ^= feistel(left, k + 2 * round + 2);
  }
  const u32 t = left;
  left = right;
  right = t;
}

void setKey(TripleDesContext& ctx, const std::uint8_t key[16], bool encrypt) noexcept {
  u32 k1[32], k2[32];
  desSchedule(key, k1);
  desSchedule(key + 8, k2);
  if (encrypt) {
    for (int i = 0; i < 32; ++i) ctx.subkeys[i] = ctx.subkeys[64 + i] = k1[i];
    reversePairs(k2, ctx.subkeys + 32);
  } else {
    reversePairs(k1, ctx.subkeys);
    for (int i = 0; i < 32; ++i) ctx.subkeys[32 + i] = k2[i];
    for (int i = 0; i < 32; ++i) ctx.subkeys[64 + i] = ctx.subkeys[i];
  }
  ctx.mode = encrypt ? 1u : 0u;
  secureWipe(k1, sizeof(k1));
  secureWipe(k2, sizeof(k2));
}

}  // namespace

void desSetOddParity(std::uint8_t* key, std::size_t length) noexcept {
  for (std::size_t i = 0; i < length; ++i) key[i] = kOddParity[key[i]];
}

void tdes2SetKeyEncrypt(TripleDesContext& ctx, const std::uint8_t key[16]) noexcept {
  setKey(ctx, key, true);
}

void tdes2SetKeyDecrypt(TripleDesContext& ctx, const std::uint8_t key[16]) noexcept {
  setKey(ctx, key, false);
}

void tdesCryptEcb(const TripleDesContext& ctx, const std::uint8_t in[8], std::uint8_t out[8]) noexcept {
  u32 left = (u32{in[0]} << 24) | (u32{in[1]} << 16) | (u32{in[2]} << 8) | in[3];
  u32 right = (u32{in[4]} << 24) | (u32{in[5]} << 16) | (u32{in[6]} << 8) | in[7];
  u32 work;
  // Initial permutation as five masked swaps, ending with both halves rotated left by one.
  work = ((left >> 4) ^ right) & 0x0F0F0F0Fu;
  right ^= work;
  left ^= work << 4;
  work = ((left >> 16) ^ right) & 0x0000FFFFu;
  right ^= work;
  left ^= work << 16;
  work = ((right >> 2) ^ left) & 0x33333333u;
  left ^= work;
  right ^= work << 2;
  work = ((right >> 8) ^ left) & 0x00FF00FFu;
  left ^= work;
  right ^= work << 8;
  right = rotl(right, 1);
  work = (left ^ right) & 0xAAAAAAAAu;
  left ^= work;
  right ^= work;
  left = rotl(left, 1);

  sixteenRounds(left, right, ctx.subkeys);
  sixteenRounds(left, right, ctx.subkeys + 32);
  sixteenRounds(left, right, ctx.subkeys + 64);
  // Undo the last swap: the final permutation takes R16 L16.
  work = left;
  left = right;
  right = work;

  // Final permutation: the inverse swaps in reverse order.
  right = rotr(right, 1);
  work = (left ^ right) & 0xAAAAAAAAu;
  left ^= work;
  right ^= work;
  left = rotr(left, 1);
  work = ((left >> 8) ^ right) & 0x00FF00FFu;
  right ^= work;
  left ^= work << 8;
  work = ((left >> 2) ^ right) & 0x33333333u;
  right ^= work;
  left ^= work << 2;
  work = ((right >> 16) ^ left) & 0x0000FFFFu;
  left ^= work;
  right ^= work << 16;
  work = ((right >> 4) ^ left) & 0x0F0F0F0Fu;
  left ^= work;
  right ^= work << 4;

  out[0] = static_cast<std::uint8_t>(right >> 24);
  out[1] = static_cast<std::uint8_t>(right >> 16);
  out[2] = static_cast<std::uint8_t>(right >> 8);
  out[3] = static_cast<std::uint8_t>(right);
  out[4] = static_cast<std::uint8_t>(left >> 24);
  out[5] = static_cast<std::uint8_t>(left >> 16);
  out[6] = static_cast<std::uint8_t>(left >> 8);
  out[7] = static_cast<std::uint8_t>(left);
}

}  // namespace tessel
