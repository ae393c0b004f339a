// BigNumber: the fixed-capacity unsigned integers under RSA.
//
// Layout: `count` is the number of limbs in use, followed by 70 limbs of 32 bits, least
// significant first. The count is kept exact (the top used limb is non-zero; zero has count 0)
// and every limb at or above `count` is zero, so two equal values are equal word for word.
// Capacity is 70 * 32 = 2240 bits; anything wider is refused, never truncated.
//
// Every routine works on copies held on the stack and allocates nothing except bnWrite's text.
// Results may alias operands. Values that held a padded block or a power of one are wiped by
// the routines that made them (their temporaries) and by the RSA layer (its operands); a caller
// holding a secret BigNumber wipes it with wipeObject.
//
// Refusals are reported as `false`, the output then holding zero or a partial value (never
// uninitialised memory): digits outside the radix, an empty text, a value wider than 2240
// bits, division by zero, a zero modulus.
#pragma once

#include <cstddef>
#include <cstdint>

#include "crypto/secure_buffer.h"

namespace tessel {

constexpr int kBigNumberLimbs = 70;
constexpr unsigned kBigNumberBits = 32u * kBigNumberLimbs;

struct BigNumber {
  std::uint32_t count;
  std::uint32_t limbs[kBigNumberLimbs];
};

BigNumber bnZero() noexcept;
// One or two limbs (none for zero).
BigNumber bnFromU64(std::uint64_t value) noexcept;

// Reads digits 0-9, A-F, a-f (each below radix, 2 <= radix <= 16), most significant first.
// Leading zeros are allowed in any number; the value must fit 2240 bits. False for a null or
// empty text, a character that is not a digit of the radix, or a value too wide.
bool bnRead(const char* text, unsigned radix, BigNumber& out) noexcept;

// Digits from "0123456789ABCDEF", most significant first, no leading zeros ("0" for zero).
// Absent for a radix outside 2..16 or when memory runs out.
SecureBuffer bnWrite(const BigNumber& value, unsigned radix) noexcept;

// -1, 0 or 1 as a < b, a == b, a > b.
int bnCompare(const BigNumber& a, const BigNumber& b) noexcept;
// Position of the top set bit plus one; 0 for zero.
unsigned bnBitLength(const BigNumber& value) noexcept;

// product = a * b. False when the product needs more than 70 limbs.
bool bnMultiply(const BigNumber& a, const BigNumber& b, BigNumber& product) noexcept;
// product = a * word. False when the product needs more than 70 limbs.
bool bnMultiplyWord(const BigNumber& a, std::uint32_t word, BigNumber& product) noexcept;
// a = quotient * b + remainder, remainder < b. False when b is zero.
bool bnDivide(const BigNumber& a, const BigNumber& b, BigNumber& quotient,
              BigNumber& remainder) noexcept;

// result = base^exponent mod modulus, by left-to-right binary square-and-multiply. The base
// need not be reduced. Odd moduli use Montgomery products (64-bit limbs where the compiler
// has a 128-bit type); even moduli reduce each product by division. False for a zero modulus.
// CT: the Montgomery products and their final subtractions do not branch on the base; the
// exponent's bits, the reading of the base and the even-modulus path do (public exponents only).
// On x86-64 CPUs with BMI2 and ADX the 64-bit Montgomery rows, reductions and final
// subtractions run in small assembly kernels; cpuAllowFeature(CpuFeature::kBmi2Adx, false)
// (cpu_features.h) forces the portable C rows for exponentiations started afterwards.
bool bnModExp(const BigNumber& base, const BigNumber& exponent, const BigNumber& modulus,
              BigNumber& result) noexcept;

// The same with the 32-bit-limb Montgomery product that builds on compilers without a 128-bit
// type (32-bit Android ABIs); exposed so that tests check both against each other everywhere.
bool bnModExpPortable(const BigNumber& base, const BigNumber& exponent, const BigNumber& modulus,
                      BigNumber& result) noexcept;

// An odd modulus made ready for repeated exponentiation: its Montgomery constants and
// R^2 mod n (one long division) computed once. Never written after it is made, so threads may
// share one. Null for a zero or even modulus or when memory runs out; release wipes and frees.
struct BnPreparedModulus;
BnPreparedModulus* bnPrepareModulus(const BigNumber& modulus) noexcept;
void bnReleasePrepared(BnPreparedModulus* prepared) noexcept;
// bnModExp with the prepared modulus; the same result, without the per-modulus set-up.
bool bnModExpPrepared(const BigNumber& base, const BigNumber& exponent, const BnPreparedModulus& prepared,
                      BigNumber& result) noexcept;

}  // namespace tessel
