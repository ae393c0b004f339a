// The x86-64 BMI2/ADX kernels under the Montgomery products of bignum.cpp, which includes this
// header alone: a row t += a * b, the whole reduction, the doubling of a squaring's cross
// products with its squares, the final subtraction, and the cross products of a 16-limb
// squaring, each a small inline-assembly block on 64-bit limbs. bignum.cpp chooses them at run
// time (cpu_features.h) and keeps the portable C twins of each; the kernels are defined here
// with internal linkage so that they inline into its product loops exactly as the C rows do.
//
// Every kernel is built from one step, the pair of limbs below: mulx forms a * b without
// touching the flags, adcx adds the limb of t on the carry flag and adox the previous high word
// on the overflow flag, so two carry chains run side by side. LO takes the pending high word
// from `hi` and leaves its own in r11; HI takes r11 and leaves its own in `hi`.
#pragma once

#if defined(__x86_64__) && (defined(__GNUC__) || defined(__clang__))
#define TESSEL_HAVE_ADX_KERNEL 1

#include <cstdint>

// One limb: t[toff] += a[aoff] * rdx, on the two flag chains. `a` and `t` name the asm operands
// holding the pointers, `hi` the register of the pending high word.
#define TESSEL_LIMB_LO(a, aoff, t, toff, hi)   \
  "mulx " #aoff "(" a "), %%r10, %%r11\n\t"  \
  "adcx " #toff "(" t "), %%r10\n\t"         \
  "adox " hi ", %%r10\n\t"                   \
  "mov %%r10, " #toff "(" t ")\n\t"
#define TESSEL_LIMB_HI(a, aoff, t, toff, hi)   \
  "mulx " #aoff "(" a "), %%r10, " hi "\n\t" \
  "adcx " #toff "(" t "), %%r10\n\t"         \
  "adox %%r11, %%r10\n\t"                    \
  "mov %%r10, " #toff "(" t ")\n\t"

namespace tessel {
namespace {
// t[0..n) += a[0..n) * b, returning the carry limb (bignum.cpp's mulAddRow): the additions of
// neighbouring limbs overlap on the two chains. The n mod 4 single limbs first (written out, one variant per
// count, so short rows such as a squaring's last ones pay no loop), then one block of four if
// left, then blocks of eight; loop control uses only lea, mov, jmp and jrcxz, which keep both
// flags intact.
#define TESSEL_ROW_LO(off) TESSEL_LIMB_LO("%[a]", off, "%[t]", off, "%[hi]")
#define TESSEL_ROW_HI(off) TESSEL_LIMB_HI("%[a]", off, "%[t]", off, "%[hi]")
#define TESSEL_ROW_TAIL                                                              \
  "mov %[four], %%rcx\n\t"                                                           \
  "jrcxz 3f\n\t"                                                                     \
  TESSEL_ROW_LO(0) TESSEL_ROW_HI(8) TESSEL_ROW_LO(16) TESSEL_ROW_HI(24)              \
  "lea 32(%[a]), %[a]\n\t"                                                           \
  "lea 32(%[t]), %[t]\n"                                                             \
  "3:\n\t"                                                                           \
  "mov %[blocks], %%rcx\n\t"                                                         \
  "jrcxz 6f\n\t" /* jrcxz reaches only 127 bytes: hop over a long jump out */        \
  "jmp 1f\n"                                                                         \
  "6:\n\t"                                                                           \
  "jmp 2f\n"                                                                         \
  "1:\n\t"                                                                           \
  TESSEL_ROW_LO(0) TESSEL_ROW_HI(8) TESSEL_ROW_LO(16) TESSEL_ROW_HI(24)              \
  TESSEL_ROW_LO(32) TESSEL_ROW_HI(40) TESSEL_ROW_LO(48) TESSEL_ROW_HI(56)            \
  "lea 64(%[a]), %[a]\n\t"                                                           \
  "lea 64(%[t]), %[t]\n\t"                                                           \
  "lea -1(%%rcx), %%rcx\n\t"                                                         \
  "jrcxz 2f\n\t"                                                                     \
  "jmp 1b\n"                                                                         \
  "2:\n\t"                                                                           \
  "mov $0, %%r10d\n\t" /* mov keeps the flags: fold both pending carries into hi */  \
  "adcx %%r10, %[hi]\n\t"                                                            \
  "adox %%r10, %[hi]\n\t"
#define TESSEL_ROW_OPERANDS                                 \
  : [t] "+r"(t), [a] "+r"(a), [hi] "+r"(hi)                 \
  : "d"(b), [blocks] "r"(blocks), [four] "r"(four)          \
  : "rcx", "r10", "r11", "cc", "memory"

__attribute__((always_inline)) inline std::uint64_t mulAddRowAdx(std::uint64_t* t,
                                                                  const std::uint64_t* a, int n,
                                                                  std::uint64_t b) noexcept {
  std::uint64_t hi = 0;
  const long blocks = n >> 3, four = (n >> 2) & 1;
  switch (n & 3) {
    case 0:
      __asm__ volatile("xor %%r10d, %%r10d\n\t" TESSEL_ROW_TAIL TESSEL_ROW_OPERANDS);
      break;
    case 1:
      __asm__ volatile("xor %%r10d, %%r10d\n\t" TESSEL_ROW_LO(0) "mov %%r11, %[hi]\n\t"
                       "lea 8(%[a]), %[a]\n\t"
                       "lea 8(%[t]), %[t]\n\t" TESSEL_ROW_TAIL TESSEL_ROW_OPERANDS);
      break;
    case 2:
      __asm__ volatile("xor %%r10d, %%r10d\n\t" TESSEL_ROW_LO(0) TESSEL_ROW_HI(8)
                       "lea 16(%[a]), %[a]\n\t"
                       "lea 16(%[t]), %[t]\n\t" TESSEL_ROW_TAIL TESSEL_ROW_OPERANDS);
      break;
    default:
      __asm__ volatile("xor %%r10d, %%r10d\n\t" TESSEL_ROW_LO(0) TESSEL_ROW_HI(8)
                       TESSEL_ROW_LO(16) "mov %%r11, %[hi]\n\t"
                       "lea 24(%[a]), %[a]\n\t"
                       "lea 24(%[t]), %[t]\n\t" TESSEL_ROW_TAIL TESSEL_ROW_OPERANDS);
      break;
  }
  return hi;
}

// The whole Montgomery reduction of t[0..2n) on BMI2/ADX, for n a multiple of four (n >= 8):
// n rows t[i..i+n) += m_i * mod, m_i = t[i] * n0. What bounds short moduli is the latency from
// one row's multiplier to the next, so each row forms its first two limbs with plain add/adc
// and takes the next row's multiplier from the second limb still in a register (no round trip
// through memory), then runs the remaining limbs on the two flag chains. Rows of 16 and 32
// limbs (1024- and 2048-bit moduli) are written out; other sizes loop over blocks of four.
// The row loop starts on a 32-byte boundary: left to where the function happens to land, a
// 16-byte shift cost 1024-bit RSA 4%. Returns the carry above limb 2n - 1 (0 or 1).
#define TESSEL_RLIMB_LO(off) TESSEL_LIMB_LO("%[ra]", off, "%[rt]", off, "%[hi]")
#define TESSEL_RLIMB_HI(off) TESSEL_LIMB_HI("%[ra]", off, "%[rt]", off, "%[hi]")
// Limbs 4.. of a row, rt and ra pointing at limb 2; then the offset of limb n from rt.
#define TESSEL_REDUCE_LOOP                                                           \
  "mov %[blocks], %%rcx\n"                                                           \
  "2:\n\t"                                                                           \
  TESSEL_RLIMB_LO(16) TESSEL_RLIMB_HI(24) TESSEL_RLIMB_LO(32) TESSEL_RLIMB_HI(40)    \
  "lea 32(%[ra]), %[ra]\n\t"                                                         \
  "lea 32(%[rt]), %[rt]\n\t"                                                         \
  "lea -1(%%rcx), %%rcx\n\t"                                                         \
  "jrcxz 3f\n\t"                                                                     \
  "jmp 2b\n"                                                                         \
  "3:\n\t"
#define TESSEL_REDUCE_16 \
  TESSEL_RLIMB_LO(16) TESSEL_RLIMB_HI(24) TESSEL_RLIMB_LO(32) TESSEL_RLIMB_HI(40) \
  TESSEL_RLIMB_LO(48) TESSEL_RLIMB_HI(56) TESSEL_RLIMB_LO(64) TESSEL_RLIMB_HI(72) \
  TESSEL_RLIMB_LO(80) TESSEL_RLIMB_HI(88) TESSEL_RLIMB_LO(96) TESSEL_RLIMB_HI(104) \
  /* */
#define TESSEL_REDUCE_32 \
  TESSEL_RLIMB_LO(16) TESSEL_RLIMB_HI(24) TESSEL_RLIMB_LO(32) TESSEL_RLIMB_HI(40) \
  TESSEL_RLIMB_LO(48) TESSEL_RLIMB_HI(56) TESSEL_RLIMB_LO(64) TESSEL_RLIMB_HI(72) \
  TESSEL_RLIMB_LO(80) TESSEL_RLIMB_HI(88) TESSEL_RLIMB_LO(96) TESSEL_RLIMB_HI(104) \
  TESSEL_RLIMB_LO(112) TESSEL_RLIMB_HI(120) TESSEL_RLIMB_LO(128) TESSEL_RLIMB_HI(136) \
  TESSEL_RLIMB_LO(144) TESSEL_RLIMB_HI(152) TESSEL_RLIMB_LO(160) TESSEL_RLIMB_HI(168) \
  TESSEL_RLIMB_LO(176) TESSEL_RLIMB_HI(184) TESSEL_RLIMB_LO(192) TESSEL_RLIMB_HI(200) \
  TESSEL_RLIMB_LO(208) TESSEL_RLIMB_HI(216) TESSEL_RLIMB_LO(224) TESSEL_RLIMB_HI(232) \
  /* */
#define TESSEL_REDUCE_ASM(middle, above)                                                     \
  __asm__ volatile(                                                                          \
      "mov (%[t]), %%rdx\n\t"                                                                \
      "imul %[n0], %%rdx\n\t"                                                                \
      ".p2align 5\n"                                                                         \
      "1:\n\t" /* limbs 0 and 1: t[0] + lo(m * mod[0]) is zero by the choice of m */         \
      "mulx 0(%[mod]), %%r10, %%r11\n\t"                                                     \
      "add 0(%[t]), %%r10\n\t" /* its carry is t[0] != 0 */                                  \
      "adc $0, %%r11\n\t"                                                                    \
      "mulx 8(%[mod]), %%r10, %[hi]\n\t"                                                     \
      "add 8(%[t]), %%r10\n\t"                                                               \
      "adc $0, %[hi]\n\t"                                                                    \
      "add %%r11, %%r10\n\t"                                                                 \
      "adc $0, %[hi]\n\t" /* cannot overflow: t[0..1] + m * mod[0..1] < 2^192 */             \
      "mov %%r10, 8(%[t])\n\t"                                                               \
      "mov %%r10, %[next]\n\t"                                                               \
      "imul %[n0], %[next]\n\t"                                                              \
      /* limbs 2 and 3, then the rest; only lea, mov, jmp and jrcxz between the chains */   \
      "lea 16(%[t]), %[rt]\n\t"                                                              \
      "lea 16(%[mod]), %[ra]\n\t"                                                            \
      "xor %%r10d, %%r10d\n\t"                                                               \
      TESSEL_RLIMB_LO(0) TESSEL_RLIMB_HI(8) middle                                           \
      /* fold both chains into the row's carry word, then add it and the running top bit */ \
      /* to the limb above the row */                                                        \
      "mov $0, %%r10d\n\t"                                                                   \
      "adcx %%r10, %[hi]\n\t"                                                                \
      "adox %%r10, %[hi]\n\t"                                                                \
      "xor %%r10d, %%r10d\n\t"                                                               \
      "add %[top], %[hi]\n\t"                                                                \
      "adc $0, %%r10\n\t"                                                                    \
      "add %[hi], " above "(%[rt])\n\t"                                                      \
      "adc $0, %%r10\n\t"                                                                    \
      "mov %%r10, %[top]\n\t"                                                                \
      "mov %[next], %%rdx\n\t"                                                               \
      "lea 8(%[t]), %[t]\n\t"                                                                \
      "dec %[rows]\n\t"                                                                      \
      "jnz 1b\n\t"                                                                           \
      : [t] "+r"(t), [top] "+r"(top), [rows] "+r"(rows), [rt] "=&r"(rt), [ra] "=&r"(ra),     \
        [next] "=&r"(next), [hi] "=&r"(hi)                                                   \
      : [mod] "r"(mod), [n0] "m"(n0), [blocks] "m"(blocks)                                   \
      : "rcx", "rdx", "r10", "r11", "cc", "memory")

inline std::uint64_t reduceRowsAdx(std::uint64_t* t, const std::uint64_t* mod, std::uint64_t n0,
                                   int n) noexcept {
  std::uint64_t top = 0;
  const std::uint64_t blocks = static_cast<std::uint64_t>((n - 4) / 4);
  long rows = n;
  std::uint64_t* rt;
  const std::uint64_t* ra;
  std::uint64_t next, hi;
  if (n == 16)
    TESSEL_REDUCE_ASM(TESSEL_REDUCE_16, "112");
  else if (n == 32)
    TESSEL_REDUCE_ASM(TESSEL_REDUCE_32, "240");
  else
    TESSEL_REDUCE_ASM(TESSEL_REDUCE_LOOP, "16");
  return top;
}

// The last step of a squaring on BMI2/ADX: t[0..2n) = 2 * t + the squares a[i]^2 at limbs 2i,
// 2i + 1. CF carries the doubling (adcx x, x shifts one bit across the limbs), OF the squares.
// Both chains end at zero, as the sum is a^2 < 2^(128n).
inline void addSquaresAdx(std::uint64_t* t, const std::uint64_t* a, long n) noexcept {
  __asm__ volatile(
      "xor %%eax, %%eax\n"
      "1:\n\t"
      "mov (%[a]), %%rdx\n\t"
      "mulx %%rdx, %%r10, %%r11\n\t"
      "mov (%[t]), %%rax\n\t"
      "adcx %%rax, %%rax\n\t"
      "adox %%r10, %%rax\n\t"
      "mov %%rax, (%[t])\n\t"
      "mov 8(%[t]), %%rax\n\t"
      "adcx %%rax, %%rax\n\t"
      "adox %%r11, %%rax\n\t"
      "mov %%rax, 8(%[t])\n\t"
      "lea 8(%[a]), %[a]\n\t"
      "lea 16(%[t]), %[t]\n\t"
      "lea -1(%[n]), %[n]\n\t"
      "jrcxz 2f\n\t"
      "jmp 1b\n"
      "2:\n\t"
      : [t] "+r"(t), [a] "+r"(a), [n] "+c"(n)
      :
      : "rax", "rdx", "r10", "r11", "cc", "memory");
}

// out = r - mod over n limbs (n a multiple of four) on one sbb chain; returns the mask that
// keeps r instead: all ones when r (with the carry bit top above it) is below mod.
inline std::uint64_t subtractAdx(const std::uint64_t* r, const std::uint64_t* mod,
                                 std::uint64_t* out, std::uint64_t top, long n) noexcept {
  long blocks = n / 4;
  std::uint64_t keep;
  __asm__ volatile(
      "xor %%eax, %%eax\n"
      "1:\n\t"
      "mov 0(%[r]), %%rax\n\t"
      "sbb 0(%[m]), %%rax\n\t"
      "mov %%rax, 0(%[o])\n\t"
      "mov 8(%[r]), %%rax\n\t"
      "sbb 8(%[m]), %%rax\n\t"
      "mov %%rax, 8(%[o])\n\t"
      "mov 16(%[r]), %%rax\n\t"
      "sbb 16(%[m]), %%rax\n\t"
      "mov %%rax, 16(%[o])\n\t"
      "mov 24(%[r]), %%rax\n\t"
      "sbb 24(%[m]), %%rax\n\t"
      "mov %%rax, 24(%[o])\n\t"
      "lea 32(%[r]), %[r]\n\t"
      "lea 32(%[m]), %[m]\n\t"
      "lea 32(%[o]), %[o]\n\t"
      "lea -1(%[c]), %[c]\n\t"
      "jrcxz 2f\n\t"
      "jmp 1b\n"
      "2:\n\t"
      "sbb $0, %[top]\n\t"  // borrows only when top is 0 and the limbs borrowed: r < mod
      "sbb %[keep], %[keep]\n\t"
      : [r] "+r"(r), [m] "+r"(mod), [o] "+r"(out), [c] "+c"(blocks), [top] "+r"(top),
        [keep] "=r"(keep)
      :
      : "rax", "cc", "memory");
  return keep;
}

// The cross products a[i] * a[j], i < j, of a 16-limb squaring (1024-bit moduli) written out
// row by row: t[i + j] += a[i] * a[j], each row's carry word set at t[i + 16]. The same rows as
// the looped kernel, without its per-row set-up, which costs as much as the short rows' work.
// t[0..16) must be zero on entry.
#define TESSEL_SQ_LO(aoff, toff) TESSEL_LIMB_LO("%[a]", aoff, "%[t]", toff, "%%rax")
#define TESSEL_SQ_HI(aoff, toff) TESSEL_LIMB_HI("%[a]", aoff, "%[t]", toff, "%%rax")
#define TESSEL_SQ_BEGIN(aoff) \
  "mov " #aoff "(%[a]), %%rdx\n\t" "xor %%eax, %%eax\n\t"
#define TESSEL_SQ_END(toff) \
  "mov $0, %%r10d\n\t" "adcx %%r10, %%rax\n\t" "adox %%r10, %%rax\n\t" \
  "mov %%rax, " #toff "(%[t])\n\t"
#define TESSEL_SQ_END_ODD(toff) "mov %%r11, %%rax\n\t" TESSEL_SQ_END(toff)

inline void crossProducts16Adx(std::uint64_t* t, const std::uint64_t* a) noexcept {
  __asm__ volatile(
      TESSEL_SQ_BEGIN(0) TESSEL_SQ_LO(8, 8) TESSEL_SQ_HI(16, 16) TESSEL_SQ_LO(24, 24)
      TESSEL_SQ_HI(32, 32) TESSEL_SQ_LO(40, 40) TESSEL_SQ_HI(48, 48) TESSEL_SQ_LO(56, 56)
      TESSEL_SQ_HI(64, 64) TESSEL_SQ_LO(72, 72) TESSEL_SQ_HI(80, 80) TESSEL_SQ_LO(88, 88)
      TESSEL_SQ_HI(96, 96) TESSEL_SQ_LO(104, 104) TESSEL_SQ_HI(112, 112) TESSEL_SQ_LO(120, 120)
      TESSEL_SQ_END_ODD(128)
      TESSEL_SQ_BEGIN(8) TESSEL_SQ_LO(16, 24) TESSEL_SQ_HI(24, 32) TESSEL_SQ_LO(32, 40)
      TESSEL_SQ_HI(40, 48) TESSEL_SQ_LO(48, 56) TESSEL_SQ_HI(56, 64) TESSEL_SQ_LO(64, 72)
      TESSEL_SQ_HI(72, 80) TESSEL_SQ_LO(80, 88) TESSEL_SQ_HI(88, 96) TESSEL_SQ_LO(96, 104)
      TESSEL_SQ_HI(104, 112) TESSEL_SQ_LO(112, 120) TESSEL_SQ_HI(120, 128) TESSEL_SQ_END(136)
      TESSEL_SQ_BEGIN(16) TESSEL_SQ_LO(24, 40) TESSEL_SQ_HI(32, 48) TESSEL_SQ_LO(40, 56)
      TESSEL_SQ_HI(48, 64) TESSEL_SQ_LO(56, 72) TESSEL_SQ_HI(64, 80) TESSEL_SQ_LO(72, 88)
      TESSEL_SQ_HI(80, 96) TESSEL_SQ_LO(88, 104) TESSEL_SQ_HI(96, 112) TESSEL_SQ_LO(104, 120)
      TESSEL_SQ_HI(112, 128) TESSEL_SQ_LO(120, 136) TESSEL_SQ_END_ODD(144)
      TESSEL_SQ_BEGIN(24) TESSEL_SQ_LO(32, 56) TESSEL_SQ_HI(40, 64) TESSEL_SQ_LO(48, 72)
      TESSEL_SQ_HI(56, 80) TESSEL_SQ_LO(64, 88) TESSEL_SQ_HI(72, 96) TESSEL_SQ_LO(80, 104)
      TESSEL_SQ_HI(88, 112) TESSEL_SQ_LO(96, 120) TESSEL_SQ_HI(104, 128) TESSEL_SQ_LO(112, 136)
      TESSEL_SQ_HI(120, 144) TESSEL_SQ_END(152)
      TESSEL_SQ_BEGIN(32) TESSEL_SQ_LO(40, 72) TESSEL_SQ_HI(48, 80) TESSEL_SQ_LO(56, 88)
      TESSEL_SQ_HI(64, 96) TESSEL_SQ_LO(72, 104) TESSEL_SQ_HI(80, 112) TESSEL_SQ_LO(88, 120)
      TESSEL_SQ_HI(96, 128) TESSEL_SQ_LO(104, 136) TESSEL_SQ_HI(112, 144) TESSEL_SQ_LO(120, 152)
      TESSEL_SQ_END_ODD(160)
      TESSEL_SQ_BEGIN(40) TESSEL_SQ_LO(48, 88) TESSEL_SQ_HI(56, 96) TESSEL_SQ_LO(64, 104)
      TESSEL_SQ_HI(72, 112) TESSEL_SQ_LO(80, 120) TESSEL_SQ_HI(88, 128) TESSEL_SQ_LO(96, 136)
      TESSEL_SQ_HI(104, 144) TESSEL_SQ_LO(112, 152) TESSEL_SQ_HI(120, 160) TESSEL_SQ_END(168)
      TESSEL_SQ_BEGIN(48) TESSEL_SQ_LO(56, 104) TESSEL_SQ_HI(64, 112) TESSEL_SQ_LO(72, 120)
      TESSEL_SQ_HI(80, 128) TESSEL_SQ_LO(88, 136) TESSEL_SQ_HI(96, 144) TESSEL_SQ_LO(104, 152)
      TESSEL_SQ_HI(112, 160) TESSEL_SQ_LO(120, 168) TESSEL_SQ_END_ODD(176)
      TESSEL_SQ_BEGIN(56) TESSEL_SQ_LO(64, 120) TESSEL_SQ_HI(72, 128) TESSEL_SQ_LO(80, 136)
      TESSEL_SQ_HI(88, 144) TESSEL_SQ_LO(96, 152) TESSEL_SQ_HI(104, 160) TESSEL_SQ_LO(112, 168)
      TESSEL_SQ_HI(120, 176) TESSEL_SQ_END(184)
      TESSEL_SQ_BEGIN(64) TESSEL_SQ_LO(72, 136) TESSEL_SQ_HI(80, 144) TESSEL_SQ_LO(88, 152)
      TESSEL_SQ_HI(96, 160) TESSEL_SQ_LO(104, 168) TESSEL_SQ_HI(112, 176) TESSEL_SQ_LO(120, 184)
      TESSEL_SQ_END_ODD(192)
      TESSEL_SQ_BEGIN(72) TESSEL_SQ_LO(80, 152) TESSEL_SQ_HI(88, 160) TESSEL_SQ_LO(96, 168)
      TESSEL_SQ_HI(104, 176) TESSEL_SQ_LO(112, 184) TESSEL_SQ_HI(120, 192) TESSEL_SQ_END(200)
      TESSEL_SQ_BEGIN(80) TESSEL_SQ_LO(88, 168) TESSEL_SQ_HI(96, 176) TESSEL_SQ_LO(104, 184)
      TESSEL_SQ_HI(112, 192) TESSEL_SQ_LO(120, 200) TESSEL_SQ_END_ODD(208)
      TESSEL_SQ_BEGIN(88) TESSEL_SQ_LO(96, 184) TESSEL_SQ_HI(104, 192) TESSEL_SQ_LO(112, 200)
      TESSEL_SQ_HI(120, 208) TESSEL_SQ_END(216)
      TESSEL_SQ_BEGIN(96) TESSEL_SQ_LO(104, 200) TESSEL_SQ_HI(112, 208) TESSEL_SQ_LO(120, 216)
      TESSEL_SQ_END_ODD(224)
      TESSEL_SQ_BEGIN(104) TESSEL_SQ_LO(112, 216) TESSEL_SQ_HI(120, 224) TESSEL_SQ_END(232)
      TESSEL_SQ_BEGIN(112) TESSEL_SQ_LO(120, 232) TESSEL_SQ_END_ODD(240)
      :
      : [t] "r"(t), [a] "r"(a)
      : "rax", "rdx", "r10", "r11", "cc", "memory");
}

}  // namespace
}  // namespace tessel

#endif
