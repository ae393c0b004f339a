// BigNumber arithmetic: schoolbook products, Knuth's division (TAOCP 4.3.1, algorithm D) and
// modular exponentiation with Montgomery products for odd moduli.
//
// Private to this file: the raw limb-array routines that work on more than 70 limbs (a double
// length product before its reduction, R^2 before it is reduced modulo n) and the Montgomery
// context, written once as a template over the limb width. The default path uses 64-bit limbs
// and a 128-bit accumulator, which halves the number of multiplications against 32-bit limbs;
// compilers without a 128-bit type get the 32-bit instantiation (also reachable through
// bnModExpPortable so tests cover it on every host).
#include "crypto/bignum.h"

#include <cstring>

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

// q[0..m-n] and r[0..n-1] from u[0..m-1] / v[0..n-1]; m >= n >= 1, v[n-1] != 0. q may be null.
void divideRaw(const u32* u, int m, const u32* v, int n, u32* q, u32* r) noexcept {
  if (n == 1) {
    u64 rest = 0;
    for (int j = m - 1; j >= 0; --j) {
      const u64 cur = (rest << 32) | u[j];
      if (q) q[j] = static_cast<u32>(cur / v[0]);
      rest = cur % v[0];
    }
    r[0] = static_cast<u32>(rest);
    return;
  }
  u32 un[kWide + 1];
  u32 vn[kWide];
  ScopedWipe<decltype(un)> wipeU{un};
  ScopedWipe<decltype(vn)> wipeV{vn};
  // D1: normalise so the divisor's top bit is set, which bounds the quotient estimate's error.
  const int s = countLeadingZeros32(v[n - 1]);
  for (int i = n - 1; i > 0; --i)
    vn[i] = s ? (v[i] << s) | (v[i - 1] >> (32 - s)) : v[i];
  vn[0] = v[0] << s;
  un[m] = s ? u[m - 1] >> (32 - s) : 0;
  for (int i = m - 1; i > 0; --i)
    un[i] = s ? (u[i] << s) | (u[i - 1] >> (32 - s)) : u[i];
  un[0] = u[0] << s;

  for (int j = m - n; j >= 0; --j) {
    // D3: estimate the quotient digit from the top two limbs, correct it at most twice.
    const u64 top = (static_cast<u64>(un[j + n]) << 32) | un[j + n - 1];
    u64 qhat = top / vn[n - 1];
    u64 rhat = top % vn[n - 1];
    while (qhat >> 32 || qhat * vn[n - 2] > ((rhat << 32) | un[j + n - 2])) {
      --qhat;
      rhat += vn[n - 1];
      if (rhat >> 32) break;
    }
    // D4: multiply and subtract.
    std::int64_t t = 0;
    u64 borrow = 0;
    for (int i = 0; i < n; ++i) {
      const u64 p = qhat * vn[i];
      t = static_cast<std::int64_t>(un[i + j]) - static_cast<std::int64_t>(borrow) -
          static_cast<std::int64_t>(p & 0xFFFFFFFFu);
      un[i + j] = static_cast<u32>(t);
      borrow = (p >> 32) - static_cast<u64>(t >> 32);
    }
    t = static_cast<std::int64_t>(un[j + n]) - static_cast<std::int64_t>(borrow);
    un[j + n] = static_cast<u32>(t);
    // D5/D6: the estimate was one too large (rare): add the divisor back.
    if (t < 0) {
      --qhat;
      u64 carry = 0;
      for (int i = 0; i < n; ++i) {
        const u64 sum = static_cast<u64>(un[i + j]) + vn[i] + carry;
        un[i + j] = static_cast<u32>(sum);
        carry = sum >> 32;
      }
      un[j + n] = static_cast<u32>(un[j + n] + carry);
    }
    if (q) q[j] = static_cast<u32>(qhat);
  }
  // D8: unnormalise the remainder.
  for (int i = 0; i < n; ++i)
    r[i] = s ? (un[i] >> s) | (un[i + 1] << (32 - s)) : un[i];
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

template <typename L, typename W>
struct Montgomery {
  int n = 0;                   // limbs of the modulus
  L mod[maxLimbs<L>()] = {};
  L r2[maxLimbs<L>()] = {};    // R^2 mod n, R = 2^(bits(L) * n)
  L n0 = 0;                    // -mod^-1 mod 2^bits(L)

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
    // R^2 mod n by one long division of 2^(2 * bits(L) * n).
    u32 power[kWide] = {};
    const int powerLimbs = 2 * n * per + 1;
    power[powerLimbs - 1] = 1;
    u32 rest[kBigNumberLimbs] = {};
    divideRaw(power, powerLimbs, modulus.limbs, static_cast<int>(modulus.count), nullptr, rest);
    BigNumber r2Value;
    setFromRaw(r2Value, rest, static_cast<int>(modulus.count));
    load(r2Value, r2, n);
  }

  // out = a * b / R mod n, fully reduced; a, b < n. out may alias a or b.
  // Coarsely integrated operand scanning: one pass per limb of b multiplies and reduces at once.
  void multiply(const L* a, const L* b, L* out) const noexcept {
    constexpr int shift = limbBits<L>();
    L t[maxLimbs<L>() + 1] = {};
    for (int i = 0; i < n; ++i) {
      const L bi = b[i];
      W p = static_cast<W>(a[0]) * bi + t[0];
      L c1 = static_cast<L>(p >> shift);
      const L s0 = static_cast<L>(p);
      const L m = static_cast<L>(s0 * n0);
      W q = static_cast<W>(m) * mod[0] + s0;
      L c2 = static_cast<L>(q >> shift);
      for (int j = 1; j < n; ++j) {
        p = static_cast<W>(a[j]) * bi + t[j] + c1;
        c1 = static_cast<L>(p >> shift);
        q = static_cast<W>(m) * mod[j] + static_cast<L>(p) + c2;
        t[j - 1] = static_cast<L>(q);
        c2 = static_cast<L>(q >> shift);
      }
      const W top = static_cast<W>(t[n]) + c1 + c2;
      t[n - 1] = static_cast<L>(top);
      t[n] = static_cast<L>(top >> shift);
    }
    // t < 2n: subtract n once unless that borrows, chosen by mask rather than by branch.
    L diff[maxLimbs<L>()];
    L borrow = 0;
    for (int j = 0; j < n; ++j) {
      const L x = t[j];
      const L d = static_cast<L>(x - mod[j]);
      const L b1 = static_cast<L>(x < mod[j]);
      diff[j] = static_cast<L>(d - borrow);
      borrow = static_cast<L>(b1 | static_cast<L>(d < borrow));
    }
    // Keep t when t < n, i.e. the subtraction borrowed out of the top limb too.
    const L keep = static_cast<L>(0 - static_cast<L>(borrow > t[n]));
    for (int j = 0; j < n; ++j) out[j] = static_cast<L>((t[j] & keep) | (diff[j] & ~keep));
    secureWipe(t, sizeof(t));
    secureWipe(diff, sizeof(diff));
  }
};

template <typename L, typename W>
void modExpMontgomery(const BigNumber& x, const BigNumber& e, const BigNumber& modulus,
                      BigNumber& result) noexcept {
  Montgomery<L, W> ctx;
  ctx.setUp(modulus);
  L xm[maxLimbs<L>()] = {};
  L acc[maxLimbs<L>()] = {};
  Montgomery<L, W>::load(x, acc, ctx.n);
  ctx.multiply(acc, ctx.r2, xm);  // x * R mod n
  std::memcpy(acc, xm, sizeof(L) * static_cast<std::size_t>(ctx.n));
  for (int bit = static_cast<int>(bnBitLength(e)) - 2; bit >= 0; --bit) {
    ctx.multiply(acc, acc, acc);
    if ((e.limbs[bit / 32] >> (bit % 32)) & 1u) ctx.multiply(acc, xm, acc);
  }
  L one[maxLimbs<L>()] = {};
  one[0] = 1;
  ctx.multiply(acc, one, acc);  // leave the Montgomery domain
  Montgomery<L, W>::store(acc, ctx.n, result);
  wipeObject(xm);
  wipeObject(acc);
  wipeObject(ctx);
}

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
            BigNumber& result, Width width) noexcept {
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
    modExpMontgomery<u32, u64>(x, e, modulus, result);
  } else {
#if defined(__SIZEOF_INT128__)
    modExpMontgomery<u64, unsigned __int128>(x, e, modulus, result);
#else
    modExpMontgomery<u32, u64>(x, e, modulus, result);
#endif
  }
  wipeObject(x);
  return true;
}

int digitValue(char c) noexcept {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  return -1;
}

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
  for (const char* p = text; *p; ++p) {
    const int v = digitValue(*p);
    if (v < 0 || static_cast<unsigned>(v) >= radix) return false;
  }
  while (*text == '0' && text[1] != '\0') ++text;
  const std::size_t digits = std::strlen(text);
  if (radix == 16) {
    // Nibbles straight into place: no arithmetic, linear in the length.
    if (digits > kBigNumberBits / 4) return false;
    for (std::size_t k = 0; k < digits; ++k) {
      const std::size_t nibble = digits - 1 - k;
      out.limbs[nibble / 8] |= static_cast<u32>(digitValue(text[k])) << (4 * (nibble % 8));
    }
    out.count = static_cast<u32>(trimmed(out.limbs, kBigNumberLimbs));
    return true;
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

bool bnModExpPortable(const BigNumber& base, const BigNumber& exponent, const BigNumber& modulus,
                      BigNumber& result) noexcept {
  return modExp(base, exponent, modulus, result, Width::kPortable);
}

}  // namespace tessel
