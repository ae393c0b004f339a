// SHA-1 (FIPS 180-4): portable compression with the message schedule kept as a rolling
// 16-word window, fully unrolled so the round functions and constants are fixed per step;
// on x86-64 CPUs with the SHA extensions the blocks go through those instructions instead
// (CpuFeature::kShaNi of cpu_features.h, which tests turn off to check the portable code).
// The context holds message-derived state: sha1() wipes its own, callers wipe theirs.
#include "crypto/sha1.h"

#include <cstring>

#if defined(__x86_64__) && (defined(__GNUC__) || defined(__clang__))
#define TESSEL_HAVE_SHA_NI 1
#include <immintrin.h>
#endif

#include "crypto/block_buffer.h"
#include "crypto/cpu_features.h"
#include "crypto/wipe.h"

namespace tessel {
namespace {

inline std::uint32_t rol(std::uint32_t x, int n) { return (x << n) | (x >> (32 - n)); }

inline std::uint32_t load32be(const std::uint8_t* p) {
  return (std::uint32_t{p[0]} << 24) | (std::uint32_t{p[1]} << 16) | (std::uint32_t{p[2]} << 8) | p[3];
}

inline void store32be(std::uint8_t* p, std::uint32_t v) {
  p[0] = static_cast<std::uint8_t>(v >> 24);
  p[1] = static_cast<std::uint8_t>(v >> 16);
  p[2] = static_cast<std::uint8_t>(v >> 8);
  p[3] = static_cast<std::uint8_t>(v);
}

// W[t] for t >= 16 overwrites W[t - 16] in the 16-word window.
#define SHA1_W(t) (w[(t) & 15] = rol(w[((t) + 13) & 15] ^ w[((t) + 8) & 15] ^ w[((t) + 2) & 15] ^ w[(t) & 15], 1))
#define SHA1_F1(b, c, d) ((d) ^ ((b) & ((c) ^ (d))))
#define SHA1_F2(b, c, d) ((b) ^ (c) ^ (d))
#define SHA1_F3(b, c, d) (((b) & (c)) | ((d) & ((b) | (c))))
#define SHA1_STEP(f, k, a, b, c, d, e, x) \
  do {                                    \
    (e) += rol(a, 5) + f(b, c, d) + (k) + (x); \
    (b) = rol(b, 30);                     \
  } while (0)

void compressPortable(std::uint32_t state[5], const std::uint8_t* block, std::size_t blocks) noexcept {
  std::uint32_t w[16];
  for (; blocks > 0; --blocks, block += 64) {
    std::uint32_t a = state[0], b = state[1], c = state[2], d = state[3], e = state[4];
    for (int t = 0; t < 16; ++t) w[t] = load32be(block + 4 * t);
    // Rounds 0-15 read the block words, 16-79 the rolling schedule; the five registers rotate
    // names instead of values.
#define R0(a, b, c, d, e, t) SHA1_STEP(SHA1_F1, 0x5A827999u, a, b, c, d, e, w[t])
#define R1(a, b, c, d, e, t) SHA1_STEP(SHA1_F1, 0x5A827999u, a, b, c, d, e, SHA1_W(t))
#define R2(a, b, c, d, e, t) SHA1_STEP(SHA1_F2, 0x6ED9EBA1u, a, b, c, d, e, SHA1_W(t))
#define R3(a, b, c, d, e, t) SHA1_STEP(SHA1_F3, 0x8F1BBCDCu, a, b, c, d, e, SHA1_W(t))
#define R4(a, b, c, d, e, t) SHA1_STEP(SHA1_F2, 0xCA62C1D6u, a, b, c, d, e, SHA1_W(t))
#define FIVE(R, t)         \
  R(a, b, c, d, e, t);     \
  R(e, a, b, c, d, t + 1); \
  R(d, e, a, b, c, t + 2); \
  R(c, d, e, a, b, t + 3); \
  R(b, c, d, e, a, t + 4)
    FIVE(R0, 0); FIVE(R0, 5); FIVE(R0, 10);
    R0(a, b, c, d, e, 15); R1(e, a, b, c, d, 16); R1(d, e, a, b, c, 17); R1(c, d, e, a, b, 18);
    R1(b, c, d, e, a, 19);
    FIVE(R2, 20); FIVE(R2, 25); FIVE(R2, 30); FIVE(R2, 35);
    FIVE(R3, 40); FIVE(R3, 45); FIVE(R3, 50); FIVE(R3, 55);
    FIVE(R4, 60); FIVE(R4, 65); FIVE(R4, 70); FIVE(R4, 75);
#undef FIVE
#undef R0
#undef R1
#undef R2
#undef R3
#undef R4
    state[0] += a;
    state[1] += b;
    state[2] += c;
    state[3] += d;
    state[4] += e;
  }
  secureWipe(w, sizeof(w));
}

#if defined(TESSEL_HAVE_SHA_NI)
// Four rounds per sha1rnds4, all twenty groups written out. Group g of the schedule
// (W[4g..4g+3], lane 3 holding the first word) lives in m[g % 4]; sha1msg1/sha1msg2 extend it
// in place (W[t-16] ^ W[t-14], then ^ W[t-8] by hand, then W[t-3] and the rotation), and
// sha1nexte derives each group's E from the A of four rounds earlier. The sixteen schedule
// words, the state and its copy all stay in xmm registers: nothing of the message reaches the
// stack, and the registers that held it are zeroed before returning.
#define SHA1NI_LOAD(m, g) \
  m = _mm_shuffle_epi8(_mm_loadu_si128(reinterpret_cast<const __m128i*>(block + 16 * (g))), reverseBytes)
#define SHA1NI_EXTEND(m, m1, m2, m3) \
  m = _mm_sha1msg2_epu32(_mm_xor_si128(_mm_sha1msg1_epu32(m, m1), m2), m3)
#define SHA1NI_ROUNDS(f, m)             \
  e = _mm_sha1nexte_epu32(previous, m); \
  previous = abcd;                      \
  abcd = _mm_sha1rnds4_epu32(abcd, e, f)
#define SHA1NI_GROUP(f, m, m1, m2, m3) \
  SHA1NI_EXTEND(m, m1, m2, m3);        \
  SHA1NI_ROUNDS(f, m)

__attribute__((target("sha,sse4.1,ssse3"))) void compressShaNi(std::uint32_t state[5],
                                                               const std::uint8_t* block,
                                                               std::size_t blocks) noexcept {
  const __m128i reverseBytes = _mm_set_epi64x(0x0001020304050607LL, 0x08090a0b0c0d0e0fLL);
  __m128i abcd = _mm_shuffle_epi32(_mm_loadu_si128(reinterpret_cast<const __m128i*>(state)), 0x1B);
  __m128i e0 = _mm_set_epi32(static_cast<int>(state[4]), 0, 0, 0);
  __m128i m0, m1, m2, m3, e, previous;
  for (; blocks > 0; --blocks, block += 64) {
    const __m128i abcdSaved = abcd, eSaved = e0;
    SHA1NI_LOAD(m0, 0);
    e = _mm_add_epi32(e0, m0);
    previous = abcd;
    abcd = _mm_sha1rnds4_epu32(abcd, e, 0);
    SHA1NI_LOAD(m1, 1); SHA1NI_ROUNDS(0, m1);
    SHA1NI_LOAD(m2, 2); SHA1NI_ROUNDS(0, m2);
    SHA1NI_LOAD(m3, 3); SHA1NI_ROUNDS(0, m3);
    SHA1NI_GROUP(0, m0, m1, m2, m3);
    SHA1NI_GROUP(1, m1, m2, m3, m0);
    SHA1NI_GROUP(1, m2, m3, m0, m1);
    SHA1NI_GROUP(1, m3, m0, m1, m2);
    SHA1NI_GROUP(1, m0, m1, m2, m3);
    SHA1NI_GROUP(1, m1, m2, m3, m0);
    SHA1NI_GROUP(2, m2, m3, m0, m1);
    SHA1NI_GROUP(2, m3, m0, m1, m2);
    SHA1NI_GROUP(2, m0, m1, m2, m3);
    SHA1NI_GROUP(2, m1, m2, m3, m0);
    SHA1NI_GROUP(2, m2, m3, m0, m1);
    SHA1NI_GROUP(3, m3, m0, m1, m2);
    SHA1NI_GROUP(3, m0, m1, m2, m3);
    SHA1NI_GROUP(3, m1, m2, m3, m0);
    SHA1NI_GROUP(3, m2, m3, m0, m1);
    SHA1NI_GROUP(3, m3, m0, m1, m2);
    e0 = _mm_sha1nexte_epu32(previous, eSaved);
    abcd = _mm_add_epi32(abcd, abcdSaved);
  }
  _mm_storeu_si128(reinterpret_cast<__m128i*>(state), _mm_shuffle_epi32(abcd, 0x1B));
  state[4] = static_cast<std::uint32_t>(_mm_extract_epi32(e0, 3));
  // Clear the registers that held schedule words; the empty asm keeps the zeroing.
  m0 = m1 = m2 = m3 = e = previous = _mm_setzero_si128();
  __asm__ __volatile__("" : "+x"(m0), "+x"(m1), "+x"(m2), "+x"(m3), "+x"(e), "+x"(previous));
}
#undef SHA1NI_GROUP
#undef SHA1NI_ROUNDS
#undef SHA1NI_EXTEND
#undef SHA1NI_LOAD
#endif

void compress(std::uint32_t state[5], const std::uint8_t* block, std::size_t blocks) noexcept {
#if defined(TESSEL_HAVE_SHA_NI)
  if (cpuFeatureUsable(CpuFeature::kShaNi)) return compressShaNi(state, block, blocks);
#endif
  compressPortable(state, block, blocks);
}

// The compression over a context's state, as block_buffer.h calls it.
auto compressInto(Sha1Context& ctx) noexcept {
  return [&ctx](const std::uint8_t* blocks, std::size_t count) { compress(ctx.state, blocks, count); };
}

}  // namespace

void sha1Init(Sha1Context& ctx) noexcept {
  ctx.state[0] = 0x67452301u;
  ctx.state[1] = 0xEFCDAB89u;
  ctx.state[2] = 0x98BADCFEu;
  ctx.state[3] = 0x10325476u;
  ctx.state[4] = 0xC3D2E1F0u;
  ctx.length = 0;
  std::memset(ctx.block, 0, sizeof(ctx.block));
}

void sha1Update(Sha1Context& ctx, const void* data, std::uint32_t length) noexcept {
  absorb(ctx.block, ctx.length, data, length, compressInto(ctx));
}

void sha1Final(Sha1Context& ctx, std::uint8_t digest[20]) noexcept {
  padFinalBlock(ctx.block, ctx.length, LengthOrder::kBigEndian, compressInto(ctx));
  for (int i = 0; i < 5; ++i) store32be(digest + 4 * i, ctx.state[i]);
}

void sha1(const void* data, std::size_t length, std::uint8_t digest[20]) noexcept {
  Sha1Context ctx;
  sha1Init(ctx);
  absorb(ctx.block, ctx.length, data, length, compressInto(ctx));
  sha1Final(ctx, digest);
  wipeObject(ctx);
}

}  // namespace tessel
