// BigNumber against OpenSSL's BN on random and structured values: read/write, products,
// division with remainder (including the rare add-back step of the long division) and modular
// exponentiation on every kernel and the even-modulus path; plus capacity limits and refusals.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <random>
#include <string>
#include <vector>

#include "crypto/bignum.h"
#include "support/openssl_oracle.h"

namespace tessel {
namespace {

using Pair = std::pair<std::string, std::string>;

BigNumber fromHex(const std::string& hex) {
  BigNumber b;
  EXPECT_TRUE(bnRead(hex.c_str(), 16, b)) << hex;
  return b;
}
std::string toHex(const BigNumber& b, unsigned radix = 16) {
  SecureBuffer s = bnWrite(b, radix);
  return s ? std::string(s.c_str()) : std::string("<absent>");
}
const std::string kMax(560, 'F');  // 2^2240 - 1, the widest value

// Runs of 0x00000000, 0xFFFFFFFF and 0x80000000 limbs stress carries and the quotient estimate
// far more than uniform random limbs do.
struct Values {
  std::mt19937_64 rng;
  int limbs(int low, int high) { return low + static_cast<int>(rng() % (high - low + 1)); }
  std::string hex(int limbs) {
    std::string s;
    for (int i = 0; i < limbs; ++i) {
      const std::uint32_t special[4] = {0, 0xFFFFFFFFu, 0x80000000u, 1};
      const unsigned pick = rng() % 6;
      std::uint32_t limb = pick < 4 ? special[pick] : static_cast<std::uint32_t>(rng());
      if (i == 0 && limb == 0) limb = 1 + static_cast<std::uint32_t>(rng() % 0xFFFF);
      for (int d = 7; d >= 0; --d) s += "0123456789ABCDEF"[(limb >> (4 * d)) & 15u];
    }
    return s.substr(std::min(s.find_first_not_of('0'), s.size() - 1));
  }
};

TEST(BigNumberText, LayoutCapacityAndRefusals) {
  const BigNumber b = fromHex("0000123456789abcdef0");
  EXPECT_EQ(b.count, 2u);
  EXPECT_EQ(b.limbs[0], 0x9ABCDEF0u);
  EXPECT_EQ(b.limbs[1], 0x12345678u);
  EXPECT_EQ(b.limbs[2], 0u);
  EXPECT_EQ(toHex(b), "123456789ABCDEF0");
  EXPECT_EQ(fromHex("000").count, 0u);
  EXPECT_EQ(bnBitLength(fromHex("1")), 1u);
  EXPECT_EQ(bnBitLength(fromHex("100000000")), 33u);
  BigNumber x;
  ASSERT_TRUE(bnRead(("0000" + kMax).c_str(), 16, x)) << "leading zeros do not count";
  EXPECT_EQ(x.count, 70u);
  EXPECT_EQ(bnBitLength(x), 2240u);
  EXPECT_FALSE(bnRead(("1" + kMax).c_str(), 16, x));
  // 2^2240 - 1 in decimal fits; 2^2240 (its last digit ...375 -> ...376) does not.
  std::string decimal = toHex(fromHex(kMax), 10);
  ASSERT_TRUE(bnRead(decimal.c_str(), 10, x));
  EXPECT_EQ(bnCompare(x, fromHex(kMax)), 0);
  decimal.back() = static_cast<char>(decimal.back() + 1);
  EXPECT_FALSE(bnRead(decimal.c_str(), 10, x));
  for (const char* bad : {"", "12G4", " 12", "12 ", "0x12", "-1", "1.0", "\xC3\xA9", static_cast<const char*>(nullptr)})
    EXPECT_FALSE(bnRead(bad, 16, x)) << (bad ? bad : "null");
  EXPECT_FALSE(bnRead("19", 8, x));
  EXPECT_FALSE(bnRead("A", 10, x));
  EXPECT_FALSE(bnRead("1", 17, x));
  EXPECT_FALSE(bnRead("1", 1, x));
  EXPECT_FALSE(bnWrite(fromHex("1"), 17));
}

TEST(BigNumberText, OtherRadixesBothWays) {
  const struct {
    std::uint64_t value;
    unsigned radix;
    const char* text;
  } cases[] = {{0, 10, "0"},         {65537, 10, "65537"},    {65537, 2, "10000000000000001"},
               {0, 16, "0"},         {0x100000000ull, 16, "100000000"},
               {0xFFFFFFFFFFFFFFFFull, 10, "18446744073709551615"},
               {0xFFFFFFFFFFFFFFFFull, 8, "1777777777777777777777"}};
  for (const auto& c : cases) {
    EXPECT_EQ(toHex(bnFromU64(c.value), c.radix), c.text);
    BigNumber back;
    ASSERT_TRUE(bnRead(c.text, c.radix, back));
    EXPECT_EQ(bnCompare(back, bnFromU64(c.value)), 0) << c.text;
  }
  Values v{std::mt19937_64(7)};
  for (int i = 0; i < 50; ++i) {
    const BigNumber x = fromHex(v.hex(v.limbs(1, 70)));
    for (unsigned radix : {3u, 7u, 10u}) {
      BigNumber back;
      ASSERT_TRUE(bnRead(toHex(x, radix).c_str(), radix, back));
      EXPECT_EQ(bnCompare(back, x), 0);
    }
  }
}

TEST(BigNumberArithmetic, MultiplyMatchesOpenSslAndRefusesOverflow) {
  Values v{std::mt19937_64(1)};
  BigNumber p;
  for (int i = 0; i < 300; ++i) {
    const int an = v.limbs(1, 69);
    const std::string a = v.hex(an), b = v.hex(v.limbs(1, 70 - an)), w = v.hex(1);
    ASSERT_TRUE(bnMultiply(fromHex(a), fromHex(b), p));
    EXPECT_EQ(toHex(p), test::opensslBnMul(a, b)) << a << " * " << b;
    ASSERT_TRUE(bnMultiplyWord(fromHex(a), static_cast<std::uint32_t>(std::stoul(w, nullptr, 16)), p));
    EXPECT_EQ(toHex(p), test::opensslBnMul(a, w)) << a << " * " << w;
  }
  EXPECT_TRUE(bnMultiply(fromHex("0"), fromHex(kMax), p));
  EXPECT_EQ(p.count, 0u);
  const BigNumber half = fromHex(std::string(280, 'F'));
  EXPECT_TRUE(bnMultiply(half, half, p));  // 2240 bits exactly
  EXPECT_FALSE(bnMultiply(half, fromHex("1" + std::string(281, '0')), p));
  EXPECT_FALSE(bnMultiplyWord(fromHex("8" + std::string(559, '0')), 2, p));
  ASSERT_TRUE(bnMultiplyWord(fromHex(std::string(559, 'F')), 16, p));
  EXPECT_EQ(toHex(p), std::string(559, 'F') + "0");
}

TEST(BigNumberArithmetic, DivideMatchesOpenSsl) {
  // First the operands for which the two-limb quotient estimate is still one too large, so the
  // long division must add the divisor back (found by instrumenting that step); then random ones.
  std::vector<Pair> cases = {{"7FFFFFFF800000000000000000000000", "800000000000000000000001"},
                             {"8000000000000000000000000000000000000003", "20000000000000000000000000000001"},
                             {"5", "7"}};
  Values v{std::mt19937_64(3)};
  for (int i = 0; i < 2000; ++i) cases.emplace_back(v.hex(v.limbs(1, 70)), v.hex(v.limbs(1, 70)));
  for (const auto& [a, b] : cases) {
    BigNumber q, r;
    ASSERT_TRUE(bnDivide(fromHex(a), fromHex(b), q, r));
    ASSERT_EQ(Pair(toHex(q), toHex(r)), test::opensslBnDiv(a, b)) << a << " / " << b;
  }
  BigNumber q, r, a = fromHex("123456789ABCDEF0123");
  EXPECT_FALSE(bnDivide(fromHex("5"), fromHex("0"), q, r));
  ASSERT_TRUE(bnDivide(a, fromHex("10"), a, r));  // quotient over its own dividend
  EXPECT_EQ(Pair(toHex(a), toHex(r)), Pair("123456789ABCDEF012", "3"));
}

TEST(BigNumberModExp, MatchesOpenSslOnEveryKernelAndEvenModuli) {
  // Fixed edges (the widest odd modulus, the widest even one through the division path), then
  // random values with every fourth modulus even.
  const std::string wideBase = "ABCDEF" + std::string(500, '1');
  std::vector<std::array<std::string, 3>> cases = {{wideBase, "10001", kMax},
                                                   {wideBase, "10001", std::string(559, 'F') + "E"},
                                                   {"0", "10001", "F1"}, {"5", "0", "F1"},
                                                   {"F1", "10001", "F1"}, {"2", "3", "1"}};
  Values v{std::mt19937_64(4)};
  for (int i = 0; i < 200; ++i) {
    std::string mod = v.hex(v.limbs(1, 70));
    const int last = std::stoi(mod.substr(mod.size() - 1), nullptr, 16);
    mod.back() = "0123456789ABCDEF"[i % 4 ? (last | 1) : (last & 14)];
    if (mod == "0") continue;
    cases.push_back({v.hex(v.limbs(1, 70)), v.hex(v.limbs(1, 2)), mod});
  }
  for (const auto& [base, exp, mod] : cases) {
    const std::string expected = test::opensslBnModExp(base, exp, mod);
    BigNumber r1, r2, r3;
    ASSERT_TRUE(bnModExp(fromHex(base), fromHex(exp), fromHex(mod), r1));
    bnAllowAssemblyKernel(false);  // the C rows, where the assembly kernel would be used
    ASSERT_TRUE(bnModExp(fromHex(base), fromHex(exp), fromHex(mod), r2));
    bnAllowAssemblyKernel(true);
    ASSERT_TRUE(bnModExpPortable(fromHex(base), fromHex(exp), fromHex(mod), r3));
    for (const BigNumber* r : {&r1, &r2, &r3}) ASSERT_EQ(toHex(*r), expected) << base << " ^ " << exp << " mod " << mod;
  }
  BigNumber r, a = fromHex("3");
  EXPECT_FALSE(bnModExp(fromHex("2"), fromHex("3"), fromHex("0"), r));
  ASSERT_TRUE(bnModExp(a, fromHex("5"), fromHex(std::string(32, 'F')), a));  // result over its base
  EXPECT_EQ(toHex(a), "F3");
}

}  // namespace
}  // namespace tessel
