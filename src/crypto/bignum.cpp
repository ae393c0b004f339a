// BigNumber arithmetic: schoolbook products, Knuth's division (TAOCP 4.3.1, algorithm D) and
// modular exponentiation with Montgomery products for odd moduli.
//
// Private to this file: the raw limb-array routines that work on more than 70 limbs (a double
// length product before its reduction, R^2 before it is reduced modulo n) and the Montgomery
// context, written once as templates over the limb width. The default path uses 64-bit limbs
// and a 128-bit accumulator, which quarters the limb products against 32-bit limbs; compilers
// without a 128-bit type get the 32-bit instantiation (also reachable through
// bnModExpPortable so tests cover it on every host).
//
// Where the time goes in an RSA public operation (e = 65537): sixteen squarings and two
// products (x * R^2 into the domain, the last one by x out of it), each a set of "rows"
// t += a * b[i] (mulAddRow, or its BMI2/ADX assembly twin) and a reduction of as many rows (one
// assembly kernel on x86-64); the long division for R^2 mod n is done once per modulus.
// Squarings form each cross product once. The x86-64 kernels live in bignum_x86_64.h; this file
// keeps the portable arithmetic and picks one or the other per Montgomery context.
#include "crypto/bignum.h"

#include <cstring>
#include <new>

#include "crypto/bignum_x86_64.h"
#include "crypto/cpu_features.h"
#include "crypto/wipe.h"

namespace tessel {
namespace {

using u32 = std::uint32_t;
using u64 = std::uint64_t;

// Raw arrays may hold a double-length product plus a normalisation limb.
constexpr int kWide = 2 * kBigNumberLimbs + 2;

int trimmed(const u32* a, int n) noexcept {
  while (n > 0 && a[n - 1] == 0) --n;
  return n;
}

int countLeadingZeros32(u32 x) noexcept { return x == 0 ? 32 : __builtin_clz(x); }

// Wipes raw temporaries on every return of the routine that declared them.
template <typename T>
struct ScopedWipe {
  T& object;
  ~ScopedWipe() { wipeObject(object); }
};

template <typename L>
int countLeadingZeros(L x) noexcept {
  if (sizeof(L) == 8) return x == 0 ? 64 : __builtin_clzll(static_cast<unsigned long long>(x));
  return countLeadingZeros32(static_cast<u32>(x));
}

// q[0..m-n] and r[0..n-1] from u[0..m-1] / v[0..n-1] on limbs of type L (W twice as wide);
// m >= n >= 1, v[n-1] != 0, m < kWide. q may be null.
template <typename L, typename W>
void divideLimbs(const L* u, int m, const L* v, int n, L* q, L* r) noexcept {
  constexpr int bits = static_cast<int>(8 * sizeof(L));
  if (n == 1) {
    W rest = 0;
    for (int j = m - 1; j >= 0; --j) {
      const W cur = (rest << bits) | u[j];
      if (q) q[j] = static_cast<L>(cur / v[0]);
      rest = cur % v[0];
    }
    r[0] = static_cast<L>(rest);
    return;
  }
  L un[kWide + 1];
  L vn[kWide];
  ScopedWipe<decltype(un)> wipeU{un};
  ScopedWipe<decltype(vn)> wipeV{vn};
  // D1: normalise so the divisor's top bit is set, which bounds the quotient estimate's error.
  const int s = countLeadingZeros(v[n - 1]);
  for (int i = n - 1; i > 0; --i)
    vn[i] = s ? static_cast<L>((v[i] << s) | (v[i - 1] >> (bits - s))) : v[i];
  vn[0] = static_cast<L>(v[0] << s);
  un[m] = s ? static_cast<L>(u[m - 1] >> (bits - s)) : 0;
  for (int i = m - 1; i > 0; --i)
    un[i] = s ? static_cast<L>((u[i] << s) | (u[i - 1] >> (bits - s))) : u[i];
  un[0] = static_cast<L>(u[0] << s);

  for (int j = m - n; j >= 0; --j) {
    // D3: estimate the quotient digit from the top two limbs, correct it at most twice.
    const W top = (static_cast<W>(un[j + n]) << bits) | un[j + n - 1];
    W qhat = top / vn[n - 1];
    W rhat = top % vn[n - 1];
    while ((qhat >> bits) != 0 ||
           qhat * vn[n - 2] > ((rhat << bits) | un[j + n - 2])) {
      --qhat;
      rhat += vn[n - 1];
      if ((rhat >> bits) != 0) break;
    }
    // D4: multiply and subtract qhat * vn from the window un[j..j+n].
    const L digit = static_cast<L>(qhat);
    L carry = 0, borrow = 0;
    for (int i = 0; i < n; ++i) {
      const W p = static_cast<W>(digit) * vn[i] + carry;
      carry = static_cast<L>(p >> bits);
      const L lo = static_cast<L>(p);
      const L x = un[i + j];
      const L d = static_cast<L>(x - lo);
      const L b1 = static_cast<L>(x < lo);
      un[i + j] = static_cast<L>(d - borrow);
      borrow = static_cast<L>(b1 | static_cast<L>(d < borrow));
    }
    const L x = un[j + n];
    const L d = static_cast<L>(x - carry);
    const bool negative = x < carry || d < borrow;
    un[j + n] = static_cast<L>(d - borrow);
    L quotientDigit = digit;
    // D5/D6: the estimate was one too large (rare): add the divisor back.
    if (negative) {
      --quotientDigit;
      L c = 0;
      for (int i = 0; i < n; ++i) {
        const W sum = static_cast<W>(un[i + j]) + vn[i] + c;
        un[i + j] = static_cast<L>(sum);
        c = static_cast<L>(sum >> bits);
      }
      un[j + n] = static_cast<L>(un[j + n] + c);
    }
    if (q) q[j] = quotientDigit;
  }
  // D8: unnormalise the remainder.
  for (int i = 0; i < n; ++i)
    r[i] = s ? static_cast<L>((un[i] >> s) | (un[i + 1] << (bits - s))) : un[i];
}

void divideRaw(const u32* u, int m, const u32* v, int n, u32* q, u32* r) noexcept {
  divideLimbs<u32, u64>(u, m, v, n, q, r);
}

// p[0..an+bn-1] = a * b.
void multiplyRaw(const u32* a, int an, const u32* b, int bn, u32* p) noexcept {
  std::memset(p, 0, sizeof(u32) * static_cast<std::size_t>(an + bn));
  for (int i = 0; i < an; ++i) {
    u64 carry = 0;
    const u64 ai = a[i];
    for (int j = 0; j < bn; ++j) {
      const u64 t = ai * b[j] + p[i + j] + carry;
      p[i + j] = static_cast<u32>(t);
      carry = t >> 32;
    }
    p[i + bn] = static_cast<u32>(carry);
  }
}

void setFromRaw(BigNumber& out, const u32* a, int n) noexcept {
  out = bnZero();
  n = trimmed(a, n);
  std::memcpy(out.limbs, a, sizeof(u32) * static_cast<std::size_t>(n));
  out.count = static_cast<u32>(n);
}

// ---- Montgomery arithmetic over limbs of type L with double-width accumulator W.

template <typename L>
constexpr int limbBits() {
  return static_cast<int>(8 * sizeof(L));
}

template <typename L>
constexpr int maxLimbs() {
  return kBigNumberLimbs * 32 / limbBits<L>();
}

#if defined(__clang__)
#define TESSEL_UNROLL4 _Pragma("clang loop unroll_count(4)")
#elif defined(__GNUC__)
#define TESSEL_UNROLL4 _Pragma("GCC unroll 4")
#else
#define TESSEL_UNROLL4
#endif

// t[0..n) += a[0..n) * b; returns the carry limb. The one kernel under every product: a single
// carry chain, which compilers keep in registers.
template <typename L, typename W>
inline L mulAddRow(L* t, const L* a, int n, L b) noexcept {
  constexpr int bits = limbBits<L>();
  L carry = 0;
  TESSEL_UNROLL4
  for (int j = 0; j < n; ++j) {
    const W p = static_cast<W>(a[j]) * b + t[j] + carry;
    t[j] = static_cast<L>(p);
    carry = static_cast<L>(p >> bits);
  }
  return carry;
}

// The row kernel a Montgomery context uses, picked once per context. A flag rather than a
// function pointer, so the chosen kernel is inlined into the product loops.
template <typename L, typename W>
struct RowKernel {
  static bool accelerated() noexcept { return false; }
  static L run(bool, L* t, const L* a, int n, L b) noexcept { return mulAddRow<L, W>(t, a, n, b); }
  // The whole reduction in one kernel where there is one; false to use the rows.
  static bool reduceAll(bool, L*, const L*, L, int, L&) noexcept { return false; }
  static bool addSquares(bool, L*, const L*, int) noexcept { return false; }
  static bool subtract(bool, const L*, const L*, L*, L, int, L&) noexcept { return false; }
  static bool crossProducts(bool, L*, const L*, int) noexcept { return false; }
};

#if defined(TESSEL_HAVE_ADX_KERNEL) && defined(__SIZEOF_INT128__)
template <>
struct RowKernel<std::uint64_t, unsigned __int128> {
  static bool accelerated() noexcept { return cpuFeatureUsable(CpuFeature::kBmi2Adx); }
  static std::uint64_t run(bool fast, std::uint64_t* t, const std::uint64_t* a, int n,
                           std::uint64_t b) noexcept {
    return fast ? mulAddRowAdx(t, a, n, b) : mulAddRow<std::uint64_t, unsigned __int128>(t, a, n, b);
  }
  static bool reduceAll(bool fast, std::uint64_t* t, const std::uint64_t* mod, std::uint64_t n0,
                        int n, std::uint64_t& top) noexcept {
    if (!fast || n < 8 || n % 4 != 0) return false;
    top = reduceRowsAdx(t, mod, n0, n);
    return true;
  }
  static bool addSquares(bool fast, std::uint64_t* t, const std::uint64_t* a, int n) noexcept {
    if (!fast || n < 1) return false;
    addSquaresAdx(t, a, n);
    return true;
  }
  static bool subtract(bool fast, const std::uint64_t* r, const std::uint64_t* mod,
                       std::uint64_t* out, std::uint64_t top, int n, std::uint64_t& keep) noexcept {
    if (!fast || n < 4 || n % 4 != 0) return false;
    keep = subtractAdx(r, mod, out, top, n);
    return true;
  }
  static bool crossProducts(bool fast, std::uint64_t* t, const std::uint64_t* a, int n) noexcept {
    if (!fast || n != 16) return false;
    crossProducts16Adx(t, a);
    return true;
  }
};
#endif

template <typename L, typename W>
struct Montgomery {
  int n = 0;                   // limbs of the modulus
  L mod[maxLimbs<L>()] = {};
  L r2[maxLimbs<L>()] = {};    // R^2 mod n, R = 2^(bits(L) * n)
  L n0 = 0;                    // -mod^-1 mod 2^bits(L)
  bool fast = RowKernel<L, W>::accelerated();
  // Scratch for products and reductions. Kept in the context rather than on each call's stack
  // so one wipe of the context at the end of an exponentiation clears every intermediate.
  mutable L t[2 * maxLimbs<L>()] = {};
  mutable L diff[maxLimbs<L>()] = {};

  // The value as limbs of type L (n of them; the value has fewer significant limbs).
  static void load(const BigNumber& v, L* out, int n) noexcept {
    constexpr int per = limbBits<L>() / 32;
    for (int i = 0; i < n; ++i) {
      L x = 0;
      for (int k = per - 1; k >= 0; --k) {
        const int index = i * per + k;
        x = static_cast<L>((per > 1 ? (static_cast<W>(x) << 32) : 0) |
                           (index < kBigNumberLimbs ? v.limbs[index] : 0));
      }
      out[i] = x;
    }
  }

  static void store(const L* in, int n, BigNumber& out) noexcept {
    constexpr int per = limbBits<L>() / 32;
    u32 raw[kBigNumberLimbs] = {};
    for (int i = 0; i < n; ++i)
      for (int k = 0; k < per; ++k)
        raw[i * per + k] = static_cast<u32>(static_cast<u64>(in[i] >> (32 * k)));
    setFromRaw(out, raw, n * per);
    wipeObject(raw);
  }

  // modulus odd and non-zero.
  void setUp(const BigNumber& modulus) noexcept {
    constexpr int per = limbBits<L>() / 32;
    n = (static_cast<int>(modulus.count) + per - 1) / per;
    load(modulus, mod, n);
    // Newton's iteration for the inverse modulo 2^bits: mod*mod = 1 mod 8 gives 3 correct bits,
    // each step doubles them.
    L inv = mod[0];
    for (int i = 0; i < 5; ++i) inv = static_cast<L>(inv * static_cast<L>(2 - mod[0] * inv));
    n0 = static_cast<L>(0 - inv);
    // R^2 mod n by one long division of 2^(2 * bits(L) * n), on limbs of type L.
    L power[2 * maxLimbs<L>() + 1] = {};
    power[2 * n] = 1;
    divideLimbs<L, W>(power, 2 * n + 1, mod, n, nullptr, r2);
  }

  // out = a * b / R mod n, fully reduced; a, b < n. out may alias a or b.
  void multiply(const L* a, const L* b, L* out) const noexcept {
    for (int i = 0; i < n; ++i) t[i] = 0;
    for (int i = 0; i < n; ++i) t[i + n] = row(t + i, a, n, b[i]);
    reduce(out);
  }

  // out = a * a / R mod n; a < n. Each cross product a[i] * a[j] is formed once and doubled,
  // which saves nearly half of the multiplications of a general product.
  void square(const L* a, L* out) const noexcept {
    constexpr int bits = limbBits<L>();
    // Row 0 adds into t[1..n) and sets t[n]; each later row adds only into limbs the row before
    // it wrote, and sets the limb above. Only t[2n - 1] is left to clear.
    for (int i = 0; i < n; ++i) t[i] = 0;
    t[2 * n - 1] = 0;
    if (!RowKernel<L, W>::crossProducts(fast, t, a, n))
      for (int i = 0; i + 1 < n; ++i) t[i + n] = row(t + 2 * i + 1, a + i + 1, n - i - 1, a[i]);
    // Double the cross products and add the squares a[i]^2 in one pass over t.
    if (RowKernel<L, W>::addSquares(fast, t, a, n)) {
      reduce(out);
      return;
    }
    L shifted = 0, carry = 0;
    for (int i = 0; i < n; ++i) {
      const L lo = t[2 * i], hi = t[2 * i + 1];
      const L doubledLo = static_cast<L>((lo << 1) | shifted);
      const L doubledHi = static_cast<L>((hi << 1) | (lo >> (bits - 1)));
      shifted = static_cast<L>(hi >> (bits - 1));
      const W sq = static_cast<W>(a[i]) * a[i];
      const W sumLo = static_cast<W>(doubledLo) + static_cast<L>(sq) + carry;
      t[2 * i] = static_cast<L>(sumLo);
      const W sumHi = static_cast<W>(doubledHi) + static_cast<L>(sq >> bits) + static_cast<L>(sumLo >> bits);
      t[2 * i + 1] = static_cast<L>(sumHi);
      carry = static_cast<L>(sumHi >> bits);
    }
    reduce(out);
  }

  // out = a / R mod n: leaves the Montgomery domain with one reduction and no product.
  void leaveDomain(const L* a, L* out) const noexcept {
    for (int i = 0; i < n; ++i) t[i] = a[i];
    for (int i = n; i < 2 * n; ++i) t[i] = 0;
    reduce(out);
  }

 private:
  L row(L* into, const L* a, int count, L b) const noexcept {
    return RowKernel<L, W>::run(fast, into, a, count, b);
  }

  // Montgomery reduction of the 2n-limb scratch t (< n * R) to t / R mod n in out.
  // Separate operand scanning: each row adds m * mod so that one more low limb becomes zero.
  void reduce(L* out) const noexcept {
    constexpr int bits = limbBits<L>();
    L top = 0;  // the carry above limb 2n - 1 (0 or 1)
    if (!RowKernel<L, W>::reduceAll(fast, t, mod, n0, n, top))
      for (int i = 0; i < n; ++i) {
        const L m = static_cast<L>(t[i] * n0);
        const L c = row(t + i, mod, n, m);
        const W s = static_cast<W>(t[i + n]) + c + top;
        t[i + n] = static_cast<L>(s);
        top = static_cast<L>(s >> bits);
      }
    // The result (top, t[n..2n)) is below 2n: subtract n once unless that borrows, chosen by
    // mask rather than by branch.
    const L* r = t + n;
    L keepR = 0;
    if (RowKernel<L, W>::subtract(fast, r, mod, out, top, n, keepR)) {  // out never overlaps t
      for (int j = 0; j < n; ++j) out[j] = static_cast<L>((r[j] & keepR) | (out[j] & ~keepR));
      return;
    }
    L borrow = 0;
    for (int j = 0; j < n; ++j) {  // double-width difference: compilers emit a sub/sbb chain
      const W d = static_cast<W>(static_cast<W>(r[j]) - mod[j] - borrow);
      diff[j] = static_cast<L>(d);
      borrow = static_cast<L>(d >> (2 * bits - 1));
    }
    // Keep r when r < n, i.e. the subtraction borrowed out of the top limb too.
    const L keep = static_cast<L>(0 - static_cast<L>(borrow > top));
    for (int j = 0; j < n; ++j) out[j] = static_cast<L>((r[j] & keep) | (diff[j] & ~keep));
  }
};

template <typename L, typename W>
void modExpMontgomery(const BigNumber& x, const BigNumber& e, const BigNumber& modulus,
                      const Montgomery<L, W>* prepared, BigNumber& result) noexcept {
  // A private copy of a prepared context (made directly, not over a zeroed one): the scratch is
  // per call, the prepared one is shared.
  Montgomery<L, W> ctx = prepared != nullptr ? *prepared : Montgomery<L, W>();
  if (prepared != nullptr)
    ctx.fast = RowKernel<L, W>::accelerated();
  else
    ctx.setUp(modulus);
  L x0[maxLimbs<L>()] = {};
  L xm[maxLimbs<L>()] = {};
  L acc[maxLimbs<L>()] = {};
  Montgomery<L, W>::load(x, x0, ctx.n);
  ctx.multiply(x0, ctx.r2, xm);  // x * R mod n
  std::memcpy(acc, xm, sizeof(L) * static_cast<std::size_t>(ctx.n));
  // An odd exponent (65537) ends with a product by x itself rather than by x * R: that product
  // also leaves the Montgomery domain, which saves the separate reduction.
  bool inDomain = true;
  for (int bit = static_cast<int>(bnBitLength(e)) - 2; bit >= 0; --bit) {
    ctx.square(acc, acc);
    if ((e.limbs[bit / 32] >> (bit % 32)) & 1u) {
      inDomain = bit != 0;
      ctx.multiply(acc, inDomain ? xm : x0, acc);
    }
  }
  if (inDomain) ctx.leaveDomain(acc, acc);
  Montgomery<L, W>::store(acc, ctx.n, result);
  wipeObject(x0);
  wipeObject(xm);
  wipeObject(acc);
  wipeObject(ctx);
}

#if defined(__SIZEOF_INT128__)
using DefaultMontgomery = Montgomery<u64, unsigned __int128>;
#else
using DefaultMontgomery = Montgomery<u32, u64>;
#endif

// Even moduli (never an RSA key): each product is reduced by division.
void modExpDivision(const BigNumber& x, const BigNumber& e, const BigNumber& modulus,
                    BigNumber& result) noexcept {
  const int n = static_cast<int>(modulus.count);
  u32 acc[kBigNumberLimbs] = {};
  u32 product[kWide] = {};
  std::memcpy(acc, x.limbs, sizeof(acc));
  for (int bit = static_cast<int>(bnBitLength(e)) - 2; bit >= 0; --bit) {
    multiplyRaw(acc, n, acc, n, product);
    divideRaw(product, 2 * n, modulus.limbs, n, nullptr, acc);
    if ((e.limbs[bit / 32] >> (bit % 32)) & 1u) {
      multiplyRaw(acc, n, x.limbs, n, product);
      divideRaw(product, 2 * n, modulus.limbs, n, nullptr, acc);
    }
  }
  setFromRaw(result, acc, n);
  wipeObject(acc);
  wipeObject(product);
}

enum class Width { kDefault, kPortable };

bool modExp(const BigNumber& base, const BigNumber& exponent, const BigNumber& modulus,
            BigNumber& result, Width width, const DefaultMontgomery* prepared = nullptr) noexcept {
  if (modulus.count == 0) return false;
  const BigNumber e = exponent;  // result may alias the exponent
  BigNumber x;
  if (bnCompare(base, modulus) >= 0) {
    BigNumber quotient;
    bnDivide(base, modulus, quotient, x);
    wipeObject(quotient);
  } else {
    x = base;
  }
  const bool modulusIsOne = modulus.count == 1 && modulus.limbs[0] == 1;
  if (modulusIsOne) {
    result = bnZero();
  } else if (e.count == 0) {
    result = bnFromU64(1);
  } else if (x.count == 0) {
    result = bnZero();
  } else if ((modulus.limbs[0] & 1u) == 0) {
    modExpDivision(x, e, modulus, result);
  } else if (width == Width::kPortable) {
    modExpMontgomery<u32, u64>(x, e, modulus, nullptr, result);
  } else {
    modExpMontgomery(x, e, modulus, prepared, result);
  }
  wipeObject(x);
  return true;
}

// Value of each character as a digit, -1 for anything that is not one.
struct DigitTable {
  signed char v[256];
  constexpr DigitTable() : v() {
    for (int c = 0; c < 256; ++c) v[c] = -1;
    for (int c = '0'; c <= '9'; ++c) v[c] = static_cast<signed char>(c - '0');
    for (int c = 'A'; c <= 'F'; ++c) v[c] = static_cast<signed char>(c - 'A' + 10);
    for (int c = 'a'; c <= 'f'; ++c) v[c] = static_cast<signed char>(c - 'a' + 10);
  }
  constexpr int operator[](unsigned char c) const { return v[c]; }
};
constexpr DigitTable kDigitValue;

int digitValue(char c) noexcept { return kDigitValue[static_cast<unsigned char>(c)]; }

// quotient = a / word, returns the remainder; word != 0.
u32 divideByWord(BigNumber& a, u32 word) noexcept {
  u64 rest = 0;
  for (int j = static_cast<int>(a.count) - 1; j >= 0; --j) {
    const u64 cur = (rest << 32) | a.limbs[j];
    a.limbs[j] = static_cast<u32>(cur / word);
    rest = cur % word;
  }
  a.count = static_cast<u32>(trimmed(a.limbs, static_cast<int>(a.count)));
  return static_cast<u32>(rest);
}

}  // namespace

// The modulus and its Montgomery set-up; never written after bnPrepareModulus returns.
struct BnPreparedModulus {
  BigNumber modulus;
  DefaultMontgomery montgomery;
};

BigNumber bnZero() noexcept {
  BigNumber z;
  std::memset(&z, 0, sizeof(z));
  return z;
}

BigNumber bnFromU64(std::uint64_t value) noexcept {
  BigNumber b = bnZero();
  b.limbs[0] = static_cast<u32>(value);
  b.limbs[1] = static_cast<u32>(value >> 32);
  b.count = b.limbs[1] ? 2 : (b.limbs[0] ? 1 : 0);
  return b;
}

bool bnRead(const char* text, unsigned radix, BigNumber& out) noexcept {
  out = bnZero();
  if (text == nullptr || *text == '\0' || radix < 2 || radix > 16) return false;
  while (*text == '0' && text[1] != '\0') ++text;
  if (radix == 16) {
    // One pass from the last digit: eight digits to a limb, checked as they are placed.
    const std::size_t digits = std::strlen(text);
    if (digits > kBigNumberBits / 4) return false;
    std::size_t left = digits;
    for (int limb = 0; left > 0; ++limb) {
      const std::size_t take = left < 8 ? left : 8;
      u32 v = 0;
      if (take == 8) {
        // A whole limb: eight independent look-ups, one check of their sign bits, and the
        // nibbles combined as a tree rather than through one serial shift chain.
        const unsigned char* q = reinterpret_cast<const unsigned char*>(text + left - 8);
        const int d0 = kDigitValue[q[0]], d1 = kDigitValue[q[1]], d2 = kDigitValue[q[2]],
                  d3 = kDigitValue[q[3]], d4 = kDigitValue[q[4]], d5 = kDigitValue[q[5]],
                  d6 = kDigitValue[q[6]], d7 = kDigitValue[q[7]];
        if (((d0 | d1) | (d2 | d3) | ((d4 | d5) | (d6 | d7))) < 0) {
          wipeObject(out);
          return false;
        }
        out.limbs[limb] = ((static_cast<u32>(d0) << 28 | static_cast<u32>(d1) << 24) |
                           (static_cast<u32>(d2) << 20 | static_cast<u32>(d3) << 16)) |
                          ((static_cast<u32>(d4) << 12 | static_cast<u32>(d5) << 8) |
                           (static_cast<u32>(d6) << 4 | static_cast<u32>(d7)));
        left -= 8;
        continue;
      }
      for (const char* p = text + left - take; p < text + left; ++p) {
        const int d = kDigitValue[static_cast<unsigned char>(*p)];
        if (d < 0) {
          wipeObject(out);
          return false;
        }
        v = (v << 4) | static_cast<u32>(d);
      }
      out.limbs[limb] = v;
      left -= take;
    }
    out.count = static_cast<u32>(trimmed(out.limbs, kBigNumberLimbs));
    return true;
  }
  for (const char* p = text; *p; ++p) {
    const int v = kDigitValue[static_cast<unsigned char>(*p)];
    if (v < 0 || static_cast<unsigned>(v) >= radix) return false;
  }
  for (const char* p = text; *p; ++p) {
    // out = out * radix + digit; a carry out of the top limb means the value is too wide.
    u64 carry = static_cast<u64>(digitValue(*p));
    for (int i = 0; i < kBigNumberLimbs; ++i) {
      const u64 t = static_cast<u64>(out.limbs[i]) * radix + carry;
      out.limbs[i] = static_cast<u32>(t);
      carry = t >> 32;
    }
    if (carry != 0) {
      wipeObject(out);
      return false;
    }
  }
  out.count = static_cast<u32>(trimmed(out.limbs, kBigNumberLimbs));
  return true;
}

SecureBuffer bnWrite(const BigNumber& value, unsigned radix) noexcept {
  static const char kDigits[] = "0123456789ABCDEF";
  if (radix < 2 || radix > 16) return SecureBuffer();
  if (value.count == 0) return SecureBuffer::copyOfText("0");
  if (radix == 16) {
    const unsigned bits = bnBitLength(value);
    const std::size_t digits = (bits + 3) / 4;
    SecureBuffer out = SecureBuffer::allocate(digits);
    if (!out) return out;
    for (std::size_t k = 0; k < digits; ++k) {
      const std::size_t nibble = digits - 1 - k;
      out.c_str()[k] = kDigits[(value.limbs[nibble / 8] >> (4 * (nibble % 8))) & 15u];
    }
    return out;
  }
  // Repeated division by the radix; digits come out least significant first.
  char reversed[kBigNumberBits + 1];
  std::size_t digits = 0;
  BigNumber rest = value;
  while (rest.count != 0) reversed[digits++] = kDigits[divideByWord(rest, radix)];
  SecureBuffer out = SecureBuffer::allocate(digits);
  if (out)
    for (std::size_t k = 0; k < digits; ++k) out.c_str()[k] = reversed[digits - 1 - k];
  wipeObject(reversed);
  wipeObject(rest);
  return out;
}

int bnCompare(const BigNumber& a, const BigNumber& b) noexcept {
  if (a.count != b.count) return a.count < b.count ? -1 : 1;
  for (int i = static_cast<int>(a.count) - 1; i >= 0; --i)
    if (a.limbs[i] != b.limbs[i]) return a.limbs[i] < b.limbs[i] ? -1 : 1;
  return 0;
}

unsigned bnBitLength(const BigNumber& value) noexcept {
  if (value.count == 0) return 0;
  return (value.count - 1) * 32 + (32 - countLeadingZeros32(value.limbs[value.count - 1]));
}

bool bnMultiply(const BigNumber& a, const BigNumber& b, BigNumber& product) noexcept {
  if (a.count == 0 || b.count == 0) {
    product = bnZero();
    return true;
  }
  u32 raw[kWide];
  const int n = static_cast<int>(a.count + b.count);
  multiplyRaw(a.limbs, static_cast<int>(a.count), b.limbs, static_cast<int>(b.count), raw);
  const int used = trimmed(raw, n);
  const bool fits = used <= kBigNumberLimbs;
  if (fits)
    setFromRaw(product, raw, used);
  else
    product = bnZero();
  secureWipe(raw, sizeof(u32) * static_cast<std::size_t>(n));
  return fits;
}

bool bnMultiplyWord(const BigNumber& a, std::uint32_t word, BigNumber& product) noexcept {
  BigNumber out = bnZero();
  u64 carry = 0;
  for (u32 i = 0; i < a.count; ++i) {
    const u64 t = static_cast<u64>(a.limbs[i]) * word + carry;
    out.limbs[i] = static_cast<u32>(t);
    carry = t >> 32;
  }
  if (carry != 0) {
    if (a.count == kBigNumberLimbs) {
      wipeObject(out);
      product = bnZero();
      return false;
    }
    out.limbs[a.count] = static_cast<u32>(carry);
  }
  out.count = static_cast<u32>(trimmed(out.limbs, kBigNumberLimbs));
  product = out;
  wipeObject(out);
  return true;
}

bool bnDivide(const BigNumber& a, const BigNumber& b, BigNumber& quotient,
              BigNumber& remainder) noexcept {
  if (b.count == 0) {
    quotient = bnZero();
    remainder = bnZero();
    return false;
  }
  if (bnCompare(a, b) < 0) {
    remainder = a;
    quotient = bnZero();
    return true;
  }
  u32 q[kBigNumberLimbs] = {};
  u32 r[kBigNumberLimbs] = {};
  divideRaw(a.limbs, static_cast<int>(a.count), b.limbs, static_cast<int>(b.count), q, r);
  setFromRaw(quotient, q, static_cast<int>(a.count - b.count + 1));
  setFromRaw(remainder, r, static_cast<int>(b.count));
  wipeObject(q);
  wipeObject(r);
  return true;
}

bool bnModExp(const BigNumber& base, const BigNumber& exponent, const BigNumber& modulus,
              BigNumber& result) noexcept {
  return modExp(base, exponent, modulus, result, Width::kDefault);
}

BnPreparedModulus* bnPrepareModulus(const BigNumber& modulus) noexcept {
  if (modulus.count == 0 || (modulus.limbs[0] & 1u) == 0) return nullptr;
  BnPreparedModulus* prepared = new (std::nothrow) BnPreparedModulus();
  if (prepared == nullptr) return nullptr;
  prepared->modulus = modulus;
  prepared->montgomery.setUp(modulus);
  return prepared;
}

void bnReleasePrepared(BnPreparedModulus* prepared) noexcept {
  if (prepared == nullptr) return;
  wipeObject(*prepared);
  delete prepared;
}

bool bnModExpPrepared(const BigNumber& base, const BigNumber& exponent, const BnPreparedModulus& prepared,
                      BigNumber& result) noexcept {
  return modExp(base, exponent, prepared.modulus, result, Width::kDefault, &prepared.montgomery);
}

bool bnModExpPortable(const BigNumber& base, const BigNumber& exponent, const BigNumber& modulus,
                      BigNumber& result) noexcept {
  return modExp(base, exponent, modulus, result, Width::kPortable);
}

}  // namespace tessel
