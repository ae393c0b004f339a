// BigNumber against OpenSSL's BN on random and structured values: text in several radixes,
// products, division with remainder (including the rare add-back step of the long division)
// and modular exponentiation on every kernel, prepared or not, and the even-modulus path; plus
// capacity limits and refusals.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <random>
#include <string>
#include <vector>

#include "crypto/bignum.h"
#include "crypto/cpu_features.h"
#include "support/openssl_oracle.h"

namespace tessel {
namespace {

BigNumber num(const std::string& hex) {
  BigNumber b;
  EXPECT_TRUE(bnRead(hex.c_str(), 16, b)) << hex;
  return b;
}
std::string str(const BigNumber& b, unsigned radix = 16) {
  SecureBuffer s = bnWrite(b, radix);
  return s ? std::string(s.c_str()) : std::string("<absent>");
}
const std::string kMax(560, 'F');  // 2^2240 - 1, the widest value

// Limbs of 0, 0xFFFFFFFF, 0x80000000 and 1 among random ones stress carries and the quotient
// estimate far more than uniform random limbs do.
std::string randomHex(std::mt19937_64& rng, int lowLimbs, int highLimbs) {
  const int limbs = lowLimbs + static_cast<int>(rng() % static_cast<unsigned>(highLimbs - lowLimbs + 1));
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

TEST(BigNumberText, LayoutRadixesCapacityAndRefusals) {
  const BigNumber b = num("0000123456789abcdef0");
  EXPECT_EQ(str(b), "123456789ABCDEF0");
  EXPECT_EQ(num("000").count, 0u);
  EXPECT_EQ(bnBitLength(num("100000000")), 33u);
  BigNumber x;
  EXPECT_EQ(str(bnFromU64(65537), 10) + str(bnFromU64(0), 10) + str(bnFromU64(0x100000000ull)), "655370100000000");
  ASSERT_TRUE(bnRead(("0000" + kMax).c_str(), 16, x)) << "leading zeros do not count";
  EXPECT_EQ(bnBitLength(x), 2240u);
  EXPECT_FALSE(bnRead(("1" + kMax).c_str(), 16, x));
  for (const char* bad : {"", "12G4", " 12", "12 ", "0x12", "-1", "1.0", "\xC3\xA9", static_cast<const char*>(nullptr)})
    EXPECT_FALSE(bnRead(bad, 16, x)) << (bad ? bad : "null");
  EXPECT_FALSE(bnRead("19", 8, x) || bnRead("A", 10, x) || bnRead("1", 17, x) || bnRead("1", 1, x));
  EXPECT_FALSE(bnWrite(num("1"), 17));
}

TEST(BigNumberArithmetic, MultiplyAndDivideMatchOpenSsl) {
  std::mt19937_64 rng(1);
  BigNumber p, q, r;
  for (int i = 0; i < 300; ++i) {
    const std::string a = randomHex(rng, 1, 69);
    const std::string b = randomHex(rng, 1, 70 - static_cast<int>((a.size() + 7) / 8)), w = randomHex(rng, 1, 1);
    ASSERT_TRUE(bnMultiply(num(a), num(b), p));
    EXPECT_EQ(str(p), test::opensslBnMul(a, b)) << a << " * " << b;
    ASSERT_TRUE(bnMultiplyWord(num(a), static_cast<std::uint32_t>(std::stoul(w, nullptr, 16)), p));
    EXPECT_EQ(str(p), test::opensslBnMul(a, w)) << a << " * " << w;
  }
  const BigNumber half = num(std::string(280, 'F'));
  EXPECT_TRUE(bnMultiply(half, half, p));  // 2240 bits exactly
  EXPECT_FALSE(bnMultiply(half, num("1" + std::string(281, '0')), p));
  EXPECT_FALSE(bnMultiplyWord(num("8" + std::string(559, '0')), 2, p));
  EXPECT_TRUE(bnMultiply(num("0"), num(kMax), p) && p.count == 0);
  // First operands whose two-limb quotient estimate is still one too large, so the division
  // must add the divisor back; then random ones.
  std::vector<std::pair<std::string, std::string>> cases = {
      {"7FFFFFFF800000000000000000000000", "800000000000000000000001"},
      {"8000000000000000000000000000000000000003", "20000000000000000000000000000001"}, {"5", "7"}};
  for (int i = 0; i < 2000; ++i) cases.emplace_back(randomHex(rng, 1, 70), randomHex(rng, 1, 70));
  for (const auto& [a, b] : cases) {
    ASSERT_TRUE(bnDivide(num(a), num(b), q, r));
    ASSERT_EQ(std::make_pair(str(q), str(r)), test::opensslBnDiv(a, b)) << a << " / " << b;
  }
  EXPECT_FALSE(bnDivide(num("5"), num("0"), q, r));
  BigNumber a = num("123456789ABCDEF0123");
  ASSERT_TRUE(bnDivide(a, num("10"), a, r));  // quotient over its own dividend
  EXPECT_EQ(str(a) + "/" + str(r), "123456789ABCDEF012/3");
}

TEST(BigNumberModExp, EveryKernelPreparedOrNotAndEvenModuli) {
  const std::string wideBase = "ABCDEF" + std::string(500, '1');
  std::vector<std::array<std::string, 3>> cases = {{wideBase, "10001", kMax}, {wideBase, "10001", std::string(559, 'F') + "E"},
                                                   {"0", "10001", "F1"}, {"5", "0", "F1"}, {"F1", "10001", "F1"},
                                                   {"2", "3", "1"}};
  std::mt19937_64 rng(4);
  for (int i = 0; i < 200; ++i) {  // every fourth modulus even
    std::string mod = randomHex(rng, 1, 70);
    const int last = std::stoi(mod.substr(mod.size() - 1), nullptr, 16);
    mod.back() = "0123456789ABCDEF"[i % 4 ? (last | 1) : (last & 14)];
    if (mod != "0") cases.push_back({randomHex(rng, 1, 70), randomHex(rng, 1, 2), mod});
  }
  for (const auto& [base, exp, mod] : cases) {
    const std::string expected = test::opensslBnModExp(base, exp, mod);
    BigNumber r[4];
    ASSERT_TRUE(bnModExp(num(base), num(exp), num(mod), r[0]));
    cpuAllowFeature(CpuFeature::kBmi2Adx, false);  // the C rows, where the assembly kernel would be used
    ASSERT_FALSE(cpuFeatureUsable(CpuFeature::kBmi2Adx));
    ASSERT_TRUE(bnModExp(num(base), num(exp), num(mod), r[1]));
    cpuAllowFeature(CpuFeature::kBmi2Adx, true);
    ASSERT_TRUE(bnModExpPortable(num(base), num(exp), num(mod), r[2]));
    BnPreparedModulus* prepared = bnPrepareModulus(num(mod));
    ASSERT_EQ(prepared != nullptr, std::string("13579BDF").find(mod.back()) != std::string::npos) << mod;
    r[3] = r[0];
    if (prepared) { ASSERT_TRUE(bnModExpPrepared(num(base), num(exp), *prepared, r[3])); }
    bnReleasePrepared(prepared);
    for (const BigNumber& x : r) ASSERT_EQ(str(x), expected) << base << " ^ " << exp << " mod " << mod;
  }
  BigNumber r, a = num("3");
  EXPECT_FALSE(bnModExp(num("2"), num("3"), num("0"), r));
  EXPECT_FALSE(bnPrepareModulus(num("0")));
  ASSERT_TRUE(bnModExp(a, num("5"), num(std::string(32, 'F')), a));  // result over its base
  EXPECT_EQ(str(a), "F3");
}

}  // namespace
}  // namespace tessel
