// BigNumber against OpenSSL's BN on random and structured values: read/write, products,
// division with remainder (including the rare add-back step of the long division) and modular
// exponentiation on both Montgomery widths and the even-modulus path; plus the refusals.
#include <gtest/gtest.h>

#include <random>
#include <string>

#include "crypto/bignum.h"
#include "crypto/wipe.h"
#include "support/rsa_oracle.h"

namespace tessel {
namespace {

using test::opensslBnDiv;
using test::opensslBnModExp;
using test::opensslBnMul;

BigNumber fromHex(const std::string& hex) {
  BigNumber b;
  EXPECT_TRUE(bnRead(hex.c_str(), 16, b)) << hex;
  return b;
}

std::string toHex(const BigNumber& b) {
  SecureBuffer s = bnWrite(b, 16);
  return s ? std::string(s.c_str()) : std::string("<absent>");
}

// Values with runs of 0x00000000, 0xFFFFFFFF and 0x80000000 limbs stress carries and the
// quotient estimate far more than uniform random limbs do.
class Values {
 public:
  explicit Values(std::uint64_t seed) : rng_(seed) {}

  std::string hex(int limbs) {
    static const char kDigits[] = "0123456789ABCDEF";
    std::string s;
    for (int i = 0; i < limbs; ++i) {
      std::uint32_t limb;
      switch (rng_() % 6) {
        case 0: limb = 0; break;
        case 1: limb = 0xFFFFFFFFu; break;
        case 2: limb = 0x80000000u; break;
        case 3: limb = 1; break;
        default: limb = static_cast<std::uint32_t>(rng_());
      }
      if (i == 0 && limb == 0) limb = 1 + static_cast<std::uint32_t>(rng_() % 0xFFFF);
      for (int d = 7; d >= 0; --d) s += kDigits[(limb >> (4 * d)) & 15u];
    }
    return trim(s);
  }
  int limbs(int low, int high) { return low + static_cast<int>(rng_() % (high - low + 1)); }

  static std::string trim(const std::string& s) {
    const auto p = s.find_first_not_of('0');
    return p == std::string::npos ? "0" : s.substr(p);
  }

 private:
  std::mt19937_64 rng_;
};

TEST(BigNumberRead, HexRoundTripsAndLayout) {
  const BigNumber b = fromHex("0000123456789abcdef0");
  EXPECT_EQ(b.count, 2u);
  EXPECT_EQ(b.limbs[0], 0x9ABCDEF0u);
  EXPECT_EQ(b.limbs[1], 0x12345678u);
  EXPECT_EQ(b.limbs[2], 0u);
  EXPECT_EQ(toHex(b), "123456789ABCDEF0");
  EXPECT_EQ(toHex(fromHex("0")), "0");
  EXPECT_EQ(fromHex("000").count, 0u);
  EXPECT_EQ(bnBitLength(fromHex("1")), 1u);
  EXPECT_EQ(bnBitLength(fromHex("100000000")), 33u);
}

TEST(BigNumberRead, CapacityIs2240Bits) {
  const std::string full(560, 'F');
  BigNumber b;
  ASSERT_TRUE(bnRead(full.c_str(), 16, b));
  EXPECT_EQ(b.count, 70u);
  EXPECT_EQ(bnBitLength(b), 2240u);
  EXPECT_TRUE(bnRead(("0000" + full).c_str(), 16, b)) << "leading zeros do not count";
  EXPECT_FALSE(bnRead(("1" + full).c_str(), 16, b));
  // 2^2240 in decimal is too wide as well; 2^2240 - 1 fits.
  const SecureBuffer decimal = bnWrite(fromHex(full), 10);
  ASSERT_TRUE(decimal);
  BigNumber back;
  ASSERT_TRUE(bnRead(decimal.c_str(), 10, back));
  EXPECT_EQ(bnCompare(back, fromHex(full)), 0);
  std::string larger(decimal.c_str());
  larger.back() = static_cast<char>(larger.back() + 1);  // ...375 -> ...376 = 2^2240
  EXPECT_FALSE(bnRead(larger.c_str(), 10, back));
}

TEST(BigNumberRead, RefusesMalformedText) {
  BigNumber b;
  for (const char* bad : {"", "12G4", " 12", "12 ", "0x12", "-1", "1.0", "\xC3\xA9"})
    EXPECT_FALSE(bnRead(bad, 16, b)) << bad;
  EXPECT_FALSE(bnRead(nullptr, 16, b));
  EXPECT_FALSE(bnRead("19", 8, b));
  EXPECT_FALSE(bnRead("A", 10, b));
  EXPECT_FALSE(bnRead("1", 17, b));
  EXPECT_FALSE(bnRead("1", 1, b));
  EXPECT_FALSE(bnWrite(fromHex("1"), 17));
}

TEST(BigNumberWrite, OtherRadixes) {
  struct Case {
    std::uint64_t value;
    unsigned radix;
    const char* text;
  } cases[] = {{0, 10, "0"},
               {65537, 10, "65537"},
               {65537, 2, "10000000000000001"},
               {0xFFFFFFFFFFFFFFFFull, 10, "18446744073709551615"},
               {0xFFFFFFFFFFFFFFFFull, 8, "1777777777777777777777"},
               {0x100000000ull, 16, "100000000"}};
  for (const auto& c : cases) {
    const SecureBuffer s = bnWrite(bnFromU64(c.value), c.radix);
    ASSERT_TRUE(s);
    EXPECT_STREQ(s.c_str(), c.text);
    BigNumber back;
    ASSERT_TRUE(bnRead(c.text, c.radix, back));
    EXPECT_EQ(bnCompare(back, bnFromU64(c.value)), 0) << c.text;
  }
  Values v(7);
  for (int i = 0; i < 50; ++i) {
    const BigNumber x = fromHex(v.hex(v.limbs(1, 70)));
    for (unsigned radix : {3u, 7u, 10u}) {
      const SecureBuffer s = bnWrite(x, radix);
      BigNumber back;
      ASSERT_TRUE(bnRead(s.c_str(), radix, back));
      EXPECT_EQ(bnCompare(back, x), 0);
    }
  }
}

TEST(BigNumberArithmetic, MultiplyMatchesOpenSsl) {
  Values v(1);
  for (int i = 0; i < 300; ++i) {
    const int an = v.limbs(1, 69);
    const std::string a = v.hex(an), b = v.hex(v.limbs(1, 70 - an));
    BigNumber p;
    ASSERT_TRUE(bnMultiply(fromHex(a), fromHex(b), p));
    EXPECT_EQ(toHex(p), opensslBnMul(a, b)) << a << " * " << b;
  }
  BigNumber p;
  EXPECT_TRUE(bnMultiply(fromHex("0"), fromHex(std::string(560, 'F')), p));
  EXPECT_EQ(p.count, 0u);
}

TEST(BigNumberArithmetic, MultiplyRefusesOverflow) {
  BigNumber p;
  const BigNumber a = fromHex(std::string(280, 'F')), b = fromHex("1" + std::string(281, '0'));
  EXPECT_TRUE(bnMultiply(a, a, p));  // 2240 bits exactly
  EXPECT_FALSE(bnMultiply(a, b, p));
  const BigNumber top = fromHex("8" + std::string(559, '0'));
  EXPECT_FALSE(bnMultiplyWord(top, 2, p));
  ASSERT_TRUE(bnMultiplyWord(fromHex(std::string(559, 'F')), 16, p));
  EXPECT_EQ(toHex(p), std::string(559, 'F') + "0");
}

TEST(BigNumberArithmetic, MultiplyWordMatchesOpenSsl) {
  Values v(2);
  for (int i = 0; i < 200; ++i) {
    const std::string a = v.hex(v.limbs(1, 69)), w = v.hex(1);
    BigNumber p;
    ASSERT_TRUE(bnMultiplyWord(fromHex(a), static_cast<std::uint32_t>(std::stoul(w, nullptr, 16)), p));
    EXPECT_EQ(toHex(p), opensslBnMul(a, w));
  }
}

TEST(BigNumberArithmetic, DivideMatchesOpenSsl) {
  Values v(3);
  for (int i = 0; i < 2000; ++i) {
    const int bn = v.limbs(1, 70);
    const std::string a = v.hex(v.limbs(1, 70)), b = v.hex(bn);
    BigNumber q, r;
    ASSERT_TRUE(bnDivide(fromHex(a), fromHex(b), q, r));
    const auto expected = opensslBnDiv(a, b);
    ASSERT_EQ(toHex(q), expected.first) << a << " / " << b;
    ASSERT_EQ(toHex(r), expected.second) << a << " % " << b;
  }
}

TEST(BigNumberArithmetic, DivideAddBackCases) {
  // Operands for which the two-limb quotient estimate is still one too large, so the long
  // division must add the divisor back (found by instrumenting that step).
  const std::pair<std::string, std::string> cases[] = {
      {"7FFFFFFF800000000000000000000000", "800000000000000000000001"},
      {"8000000000000000000000000000000000000003", "20000000000000000000000000000001"}};
  for (const auto& c : cases) {
    BigNumber q, r;
    ASSERT_TRUE(bnDivide(fromHex(c.first), fromHex(c.second), q, r));
    const auto expected = opensslBnDiv(c.first, c.second);
    EXPECT_EQ(toHex(q), expected.first) << c.first << " / " << c.second;
    EXPECT_EQ(toHex(r), expected.second) << c.first << " % " << c.second;
  }
}

TEST(BigNumberArithmetic, DivideEdgesAndAliasing) {
  BigNumber q, r;
  EXPECT_FALSE(bnDivide(fromHex("5"), fromHex("0"), q, r));
  ASSERT_TRUE(bnDivide(fromHex("5"), fromHex("7"), q, r));
  EXPECT_EQ(toHex(q), "0");
  EXPECT_EQ(toHex(r), "5");
  BigNumber a = fromHex("123456789ABCDEF0123");
  ASSERT_TRUE(bnDivide(a, fromHex("10"), a, r));  // quotient over its own dividend
  EXPECT_EQ(toHex(a), "123456789ABCDEF012");
  EXPECT_EQ(toHex(r), "3");
}

TEST(BigNumberModExp, MatchesOpenSslOnEveryKernelAndEvenModuli) {
  Values v(4);
  for (int i = 0; i < 200; ++i) {
    std::string mod = v.hex(v.limbs(1, 70));
    const bool odd = i % 4 != 0;
    const int last = std::stoi(mod.substr(mod.size() - 1), nullptr, 16);
    mod.back() = "0123456789ABCDEF"[odd ? (last | 1) : (last & 14)];
    if (Values::trim(mod) == "0") continue;
    const std::string base = v.hex(v.limbs(1, 70)), exp = v.hex(v.limbs(1, 2));
    const std::string expected = opensslBnModExp(base, exp, mod);
    BigNumber r1, r2, r3;
    ASSERT_TRUE(bnModExp(fromHex(base), fromHex(exp), fromHex(mod), r1));
    bnAllowAssemblyKernel(false);  // the C rows, where the assembly kernel would be used
    ASSERT_TRUE(bnModExp(fromHex(base), fromHex(exp), fromHex(mod), r2));
    bnAllowAssemblyKernel(true);
    ASSERT_TRUE(bnModExpPortable(fromHex(base), fromHex(exp), fromHex(mod), r3));
    ASSERT_EQ(toHex(r1), expected) << base << " ^ " << exp << " mod " << mod;
    ASSERT_EQ(toHex(r2), expected) << base << " ^ " << exp << " mod " << mod;
    ASSERT_EQ(toHex(r3), expected) << base << " ^ " << exp << " mod " << mod;
  }
}

TEST(BigNumberModExp, Edges) {
  BigNumber r;
  EXPECT_FALSE(bnModExp(fromHex("2"), fromHex("3"), fromHex("0"), r));
  ASSERT_TRUE(bnModExp(fromHex("2"), fromHex("3"), fromHex("1"), r));
  EXPECT_EQ(toHex(r), "0");
  ASSERT_TRUE(bnModExp(fromHex("0"), fromHex("10001"), fromHex("F1"), r));
  EXPECT_EQ(toHex(r), "0");
  ASSERT_TRUE(bnModExp(fromHex("5"), fromHex("0"), fromHex("F1"), r));
  EXPECT_EQ(toHex(r), "1");
  ASSERT_TRUE(bnModExp(fromHex("F1"), fromHex("10001"), fromHex("F1"), r));  // base == modulus
  EXPECT_EQ(toHex(r), "0");
  BigNumber a = fromHex("3");
  ASSERT_TRUE(bnModExp(a, fromHex("5"), fromHex("FFFFFFFFFFFFFFFFFFFFFFFFFFFFFFFF"), a));  // aliasing
  EXPECT_EQ(toHex(a), "F3");
  // The widest modulus: (2^2240 - 1) is odd; 2^2240 - 2 exercises the division path.
  const std::string m1(560, 'F'), m2 = std::string(559, 'F') + "E", base = "ABCDEF" + std::string(500, '1');
  for (const std::string& m : {m1, m2}) {
    ASSERT_TRUE(bnModExp(fromHex(base), fromHex("10001"), fromHex(m), r));
    EXPECT_EQ(toHex(r), opensslBnModExp(base, "10001", m));
  }
}

}  // namespace
}  // namespace tessel
