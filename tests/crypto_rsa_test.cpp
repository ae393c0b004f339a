// RSA public operation, its per-modulus cache, the DER public-key reader and the default
// modulus. Oracles: OpenSSL's private keys recover exactly the block we encrypted (1024, 2048
// bits, built-in default), and OpenSSL's BN_mod_exp gives our result for moduli that outnumber
// the cache and replace each other in one buffer. The DER reader accepts what OpenSSL writes and refuses every near miss and truncation.
#include <gtest/gtest.h>

#include <cctype>
#include <cstdio>
#include <random>
#include <string>

#include "crypto/codec.h"
#include "crypto/der.h"
#include "crypto/moduli.h"
#include "crypto/rsa.h"
#include "support/dispatch_oracle.h"

namespace tessel {
namespace {

using test::Bytes;

std::string text(const SecureBuffer& b) { return b ? std::string(b.c_str()) : std::string("<absent>"); }
std::string lower(std::string s) {
  for (auto& ch : s) ch = static_cast<char>(std::tolower(static_cast<unsigned char>(ch)));
  return s;
}
std::string encrypt(const std::string& modulus, const Bytes& block) {
  return text(rsaPublicHex(modulus.c_str(), text(hexEncode(block.data(), block.size())).c_str()));
}
// OpenSSL's x^65537 mod n, left-padded to the width of n.
std::string expectedPower(const std::string& n, const std::string& x) {
  const std::string y = test::opensslBnModExp(x, "10001", n);
  return std::string(2 * rsaModulusBytes(n.c_str()) - y.size(), '0') + y;
}

class RsaRoundTrip : public ::testing::TestWithParam<int> {};

TEST_P(RsaRoundTrip, PrivateKeyRecoversTheBlockAtFullWidthInHexAndBytes) {
  // Random blocks below the modulus until 20 were checked and 3 ciphertexts started with a
  // zero byte (one in 256 does): those must keep their width too.
  const auto& key = GetParam() == 1024 ? test::appKey() : GetParam() == 2048 ? test::encKey() : test::builtinDefaultKey();
  std::mt19937 rng(GetParam());
  const std::string n = key.modulusHex();
  const std::size_t k = key.size();
  ASSERT_EQ(rsaModulusBytes(n.c_str()), k);
  int checked = 0, leadingZero = 0;
  for (int i = 0; i < 20000 && (checked < 20 || leadingZero < 3); ++i) {
    Bytes block(k);
    for (auto& x : block) x = static_cast<std::uint8_t>(rng());
    block[0] = 0;
    const std::string c = encrypt(n, block);
    const bool zero = c.compare(0, 2, "00") == 0;
    if (checked >= 20 && !zero) continue;
    ++checked;
    leadingZero += zero;
    ASSERT_EQ(c.size(), 2 * k);
    EXPECT_EQ(c.find_first_not_of("0123456789ABCDEF"), std::string::npos);
    EXPECT_EQ(test::opensslRawDecrypt(key, test::fromHex(c)), block);
    const SecureBuffer bytes = rsaPublicBytes(n.c_str(), block.data(), block.size());
    EXPECT_EQ(test::toHex(Bytes(bytes.data(), bytes.data() + bytes.size())), lower(c));
  }
  EXPECT_EQ(encrypt(n, Bytes{0}), std::string(2 * k, '0'));
  EXPECT_EQ(encrypt(n, Bytes{1}), std::string(2 * k - 1, '0') + "1");
}

INSTANTIATE_TEST_SUITE_P(Keys, RsaRoundTrip, ::testing::Values(1024, 2048, 0),
                         [](const auto& p) { return p.param ? std::to_string(p.param) + "bit" : std::string("Builtin"); });

TEST(RsaPublic, WidestModulusRefusalsAndKeyLengths) {
  const std::string wide = "C" + std::string(558, '5') + "3", x = "1234" + std::string(500, 'A');  // 2240 bits
  EXPECT_EQ(text(rsaPublicHex(wide.c_str(), x.c_str())), expectedPower(wide, x));
  EXPECT_EQ(text(rsaPublicHex(lower(wide).c_str(), "0a0b")), text(rsaPublicHex(wide.c_str(), "0A0B")));
  const std::string n = test::appKey().modulusHex(), tooWide = "1" + std::string(559, '0') + "1", notHex = n + "Z";
  std::string nPlusOne = n, nMinusOne = n;
  nPlusOne.back() = static_cast<char>(nPlusOne.back() + 1);  // moduli are odd: no carry
  nMinusOne.back() = static_cast<char>(nMinusOne.back() - 1);
  const std::pair<const char*, const char*> refused[] = {
      {nullptr, "01"}, {n.c_str(), nullptr}, {n.c_str(), ""}, {"", "01"}, {n.c_str(), "01 02"}, {n.c_str(), "0G"},
      {"0", "0"}, {"000", "0"}, {n.c_str(), n.c_str()}, {n.c_str(), nPlusOne.c_str()}, {tooWide.c_str(), "02"},
      {notHex.c_str(), "01"}};
  for (const auto& [modulus, data] : refused) EXPECT_FALSE(rsaPublicHex(modulus, data)) << (data ? data : "null");
  EXPECT_TRUE(rsaPublicHex(n.c_str(), nMinusOne.c_str()));
  const Bytes nBytes = test::fromHex(n);
  EXPECT_FALSE(rsaPublicBytes(n.c_str(), nBytes.data(), nBytes.size())) << "block not below the modulus";
  EXPECT_FALSE(rsaPublicBytes(n.c_str(), nullptr, 0));
  const std::pair<const char*, std::size_t> lengths[] = {
      {"01", 1}, {"FF", 1}, {"100", 2}, {"0000FF", 1}, {"0001FF", 2}, {"7FFF", 2}, {"8000", 2}, {"0", 0}, {"", 0},
      {"xyz", 0}, {"12 34", 0}, {nullptr, 0}, {wide.c_str(), 280}, {tooWide.c_str(), 0}};
  for (const auto& [modulus, k] : lengths) EXPECT_EQ(rsaModulusBytes(modulus), k) << (modulus ? modulus : "null");
}

// Random odd moduli of a given width, enough of them to overflow the cache of set-ups.
std::vector<std::string> randomModuli(int count, int digits, std::uint32_t seed) {
  std::mt19937 rng(seed);
  std::vector<std::string> out;
  for (int i = 0; i < count; ++i) {
    std::string m;
    for (int d = 0; d < digits; ++d) m += "0123456789ABCDEF"[rng() % 16];
    m[0] = "89ABCDEF"[rng() % 8];
    m.back() = "13579BDF"[rng() % 8];
    out.push_back(m);
  }
  return out;
}

TEST(RsaModulusCache, ReplacedKeyInTheSameBufferAndEvictionsGiveTheRightPower) {
  const auto moduli = randomModuli(20, 256, 3);
  const std::string x = "0123456789ABCDEF0123456789";
  char buffer[257];
  for (int round = 0; round < 2; ++round)
    for (const std::string& m : moduli) {  // same length, same storage, new text each time
      std::snprintf(buffer, sizeof buffer, "%s", m.c_str());
      ASSERT_EQ(text(rsaPublicHex(buffer, x.c_str())), expectedPower(m, x)) << m;
    }
  const std::string odd = moduli[0], even = odd.substr(0, 255) + "4";  // not an RSA key, still defined
  EXPECT_EQ(text(rsaPublicHex(even.c_str(), x.c_str())), expectedPower(even, x));
  EXPECT_EQ(text(rsaPublicHex(odd.c_str(), x.c_str())), expectedPower(odd, x));
}

// ---- DER

std::string tlv(const std::string& tag, const std::string& hexContent) {
  const std::size_t n = hexContent.size() / 2;
  char length[8];
  std::snprintf(length, sizeof length, n < 0x80 ? "%02zX" : n < 0x100 ? "81%02zX" : "82%04zX", n);
  return tag + length + hexContent;
}
std::string modulusDer(const std::string& content, const std::string& exponent = "0203010001") {
  return tlv("30", tlv("02", content) + exponent);
}
std::string readDer(const std::string& hex) { return text(derPublicKeyToModulusHex(hex.c_str())); }

TEST(DerPublicKey, ReadsModulusFormsAndRefusesNearMissesTruncationsAndMutations) {
  const std::pair<std::string, std::string> forms[] = {
      {"00C5", "C5"}, {"000000C5", "C5"}, {"C5", "C5"}, {"0102", "0102"},  // sign and leading zero bytes skipped
      {"00" + std::string(560, 'F'), std::string(560, 'F')}, {"01" + std::string(560, '0'), "<absent>"},
      {"00", "<absent>"}, {"0000", "<absent>"}, {"", "<absent>"}};
  for (const auto& [content, modulus] : forms) EXPECT_EQ(readDer(modulusDer(content)), modulus) << content;
  const std::string n = "00" + test::appKey().modulusHex(), good = modulusDer(n);
  const std::string inner = tlv("02", n) + "0203010001", small = tlv("02", "00C5") + "0203010001";
  ASSERT_EQ(readDer(good), n.substr(2));
  ASSERT_EQ(readDer(tlv("30", small)), "C5");
  const std::string refused[] = {
      modulusDer(n, "020103"), modulusDer(n, "0203010003"), modulusDer(n, "020400010001"), modulusDer(n, "0403010001"),
      tlv("30", inner + "020101"), tlv("30", tlv("02", n)), good + "00", "31" + good.substr(2),
      tlv("30", tlv("03", n) + "0203010001"),
      tlv("30", tlv("30", "06092A864886F70D0101010500") + tlv("03", "00" + good)),  // SubjectPublicKeyInfo
      "3080" + inner + "0000", "3083000089" + inner, "3084FFFFFFFF" + inner, "3088FFFFFFFFFFFFFFFF" + inner,
      "3082FFFF" + inner, "3081" + tlv("30", small).substr(2), "30820089" + inner, tlv("30", "0282FFFF" + n), "",
      good.substr(0, 10) + "G" + good.substr(11), good.substr(0, 10) + " " + good.substr(10), good.substr(1)};
  for (const auto& hex : refused) EXPECT_EQ(readDer(hex), "<absent>") << hex.substr(0, 40);
  EXPECT_FALSE(derPublicKeyToModulusHex(nullptr));
  const std::string key = test::opensslPublicDerHex(test::encKey());
  for (std::size_t len = 0; len < key.size(); len += 2) EXPECT_EQ(readDer(key.substr(0, len)), "<absent>") << len;
}

TEST(BuiltinModuli, DefaultIsSlot12AndMatchesItsDemoKey) {
  ASSERT_TRUE(builtinDefaultModulus() != nullptr && builtinDefaultModulus() == builtinModulus(12, 0));
  EXPECT_EQ(std::string(builtinDefaultModulus()), test::builtinDefaultKey().modulusHex());
  EXPECT_TRUE(!builtinModulus(-1, 0) && !builtinModulus(kBuiltinModulusSlots, 0) && !builtinModulus(12, 2));
}

}  // namespace
}  // namespace tessel
