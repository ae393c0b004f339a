// RSA public operation, DER public-key reader and built-in modulus table.
//
// Oracle: OpenSSL holds the private keys. What our public operation produces must decrypt
// (RSA_NO_PADDING) to exactly the block we fed in, for 1024- and 2048-bit keys and for the
// built-in default modulus whose demo private key lives in tests/data. The DER reader must
// accept what OpenSSL writes as a PKCS#1 RSAPublicKey and refuse every near miss, and must not
// read out of bounds on any truncation or mutation (ASan builds check that).
#include <gtest/gtest.h>

#include <cctype>
#include <cstdio>
#include <random>
#include <set>
#include <string>

#include "crypto/codec.h"
#include "crypto/der.h"
#include "crypto/moduli.h"
#include "crypto/rsa.h"
#include "support/dispatch_oracle.h"

namespace tessel {
namespace {

using server::PrivateKey;
using test::Bytes;

std::string text(const SecureBuffer& b) { return b ? std::string(b.c_str()) : std::string("<absent>"); }
std::string lower(std::string s) {
  for (auto& ch : s) ch = static_cast<char>(std::tolower(static_cast<unsigned char>(ch)));
  return s;
}
std::string encrypt(const std::string& modulus, const Bytes& block) {
  return text(rsaPublicHex(modulus.c_str(), text(hexEncode(block.data(), block.size())).c_str()));
}

class RsaRoundTrip : public ::testing::TestWithParam<int> {
 protected:
  const PrivateKey& key() const {
    return GetParam() == 1024 ? test::appKey() : GetParam() == 2048 ? test::encKey() : test::builtinDefaultKey();
  }
};

TEST_P(RsaRoundTrip, PrivateKeyRecoversTheExactBlockAtFullWidth) {
  // Random blocks below the modulus (top byte cleared) until 20 were checked and 3 ciphertexts
  // started with a zero byte (one in 256 does): those must keep their width too.
  std::mt19937 rng(GetParam());
  const std::string n = key().modulusHex();
  const std::size_t k = key().size();
  EXPECT_EQ(rsaModulusBytes(n.c_str()), k);
  int checked = 0, leadingZero = 0;
  for (int i = 0; i < 20000 && (checked < 20 || leadingZero < 3); ++i) {
    Bytes block(k);
    for (auto& x : block) x = static_cast<std::uint8_t>(rng());
    block[0] = 0;
    const std::string c = encrypt(n, block);
    ASSERT_EQ(c.size(), 2 * k);
    const bool zero = c.compare(0, 2, "00") == 0;
    if (checked >= 20 && !zero) continue;
    ++checked;
    leadingZero += zero;
    EXPECT_EQ(c.find_first_not_of("0123456789ABCDEF"), std::string::npos);
    EXPECT_EQ(test::opensslRawDecrypt(key(), test::fromHex(c)), block);
    if (i == 0) {  // the modulus with leading zero digits, in lower case, reads the same
      EXPECT_EQ(rsaModulusBytes(("000000" + n).c_str()), k);
      EXPECT_EQ(encrypt("000000" + lower(n), block), c);
    }
  }
  EXPECT_GE(leadingZero, 3);
  EXPECT_EQ(encrypt(n, Bytes{0}), std::string(2 * k, '0'));
  EXPECT_EQ(encrypt(n, Bytes{1}), std::string(2 * k - 1, '0') + "1");
}

INSTANTIATE_TEST_SUITE_P(Keys, RsaRoundTrip, ::testing::Values(1024, 2048, 0),
                         [](const ::testing::TestParamInfo<int>& p) {
                           return p.param ? std::to_string(p.param) + "bit" : std::string("BuiltinDefault");
                         });

TEST(RsaPublicHex, WidestModulusMatchesOpenSslAndRefusals) {
  const std::string wide = "C" + std::string(558, '5') + "3";  // 2240 bits, odd
  const std::string x = "1234" + std::string(500, 'A');
  std::string expected = test::opensslBnModExp(x, "10001", wide);
  EXPECT_EQ(text(rsaPublicHex(wide.c_str(), x.c_str())), std::string(560 - expected.size(), '0') + expected);
  EXPECT_EQ(text(rsaPublicHex(lower(wide).c_str(), "0a0b")), text(rsaPublicHex(wide.c_str(), "0A0B")));

  const std::string n = test::appKey().modulusHex();
  std::string nPlusOne = n, nMinusOne = n;
  nPlusOne.back() = static_cast<char>(nPlusOne.back() + 1);  // moduli are odd: no carry
  nMinusOne.back() = static_cast<char>(nMinusOne.back() - 1);
  const std::string tooWide = "1" + std::string(559, '0') + "1";  // 2241 bits
  const struct {
    const char *modulus, *data;
  } refused[] = {{nullptr, "01"},         {n.c_str(), nullptr},         {n.c_str(), ""},       {"", "01"},
                 {n.c_str(), "01 02"},    {n.c_str(), "0G"},            {"0", "0"},            {"000", "0"},
                 {n.c_str(), n.c_str()},  {n.c_str(), nPlusOne.c_str()}, {tooWide.c_str(), "02"}};
  for (const auto& r : refused) EXPECT_FALSE(rsaPublicHex(r.modulus, r.data)) << (r.data ? r.data : "null");
  EXPECT_FALSE(rsaPublicHex((n + "Z").c_str(), "01"));
  EXPECT_TRUE(rsaPublicHex(n.c_str(), nMinusOne.c_str()));
}

TEST(RsaModulusBytes, CountsSignificantBits) {
  const std::string widest(560, 'F'), tooWide = "1" + std::string(559, '0') + "1";
  const struct {
    const char* text;
    std::size_t k;
  } cases[] = {{"01", 1},   {"FF", 1},   {"100", 2},     {"0000FF", 1},  {"0001FF", 2},
               {"7FFF", 2}, {"8000", 2}, {"0", 0},       {"", 0},        {"xyz", 0},
               {"12 34", 0}, {nullptr, 0}, {widest.c_str(), 280}, {tooWide.c_str(), 0}};
  for (const auto& c : cases) EXPECT_EQ(rsaModulusBytes(c.text), c.k) << (c.text ? c.text : "null");
}

// ---- DER

std::string tlv(const std::string& tag, const std::string& hexContent) {
  const std::size_t n = hexContent.size() / 2;
  char length[8];
  std::snprintf(length, sizeof length, n < 0x80 ? "%02zX" : n < 0x100 ? "81%02zX" : "82%04zX", n);
  return tag + length + hexContent;
}
std::string modulusDer(const std::string& modulusContent, const std::string& exponentTlv = "0203010001") {
  return tlv("30", tlv("02", modulusContent) + exponentTlv);
}
std::string readDer(const std::string& hex) { return text(derPublicKeyToModulusHex(hex.c_str())); }

TEST(DerPublicKey, ReadsOpenSslKeysAndModulusForms) {
  for (const PrivateKey* k : {&test::appKey(), &test::encKey(), &test::builtinDefaultKey()}) {
    EXPECT_EQ(readDer(test::opensslPublicDerHex(*k)), k->modulusHex());
    EXPECT_EQ(readDer(lower(test::opensslPublicDerHex(*k))), k->modulusHex()) << "lower-case text";
  }
  const std::pair<std::string, std::string> cases[] = {
      {"00C5", "C5"},       // sign byte skipped
      {"000000C5", "C5"},   // every leading zero byte skipped
      {"C5", "C5"},         // top bit set without sign byte: read unsigned
      {"0102", "0102"},
      {"00" + std::string(560, 'F'), std::string(560, 'F')},
      {"01" + std::string(560, '0'), "<absent>"},  // 2241 bits
      {"00", "<absent>"},   {"0000", "<absent>"},  {"", "<absent>"}};
  for (const auto& [content, modulus] : cases) EXPECT_EQ(readDer(modulusDer(content)), modulus) << content;
}

TEST(DerPublicKey, RefusesNearMisses) {
  const std::string n = "00" + test::appKey().modulusHex();
  const std::string good = modulusDer(n);
  ASSERT_EQ(readDer(good), n.substr(2));
  const std::string inner = tlv("02", n) + "0203010001";  // 137 bytes: length 81 89
  const std::string small = tlv("02", "00C5") + "0203010001";
  ASSERT_EQ(readDer(tlv("30", small)), "C5");
  const struct {
    const char* why;
    std::string hex;
  } cases[] = {
      {"exponent 3", modulusDer(n, "020103")},
      {"exponent 65539", modulusDer(n, "0203010003")},
      {"exponent with sign byte", modulusDer(n, "020400010001")},
      {"exponent as OCTET STRING", modulusDer(n, "0403010001")},
      {"third INTEGER", tlv("30", inner + "020101")},
      {"only the modulus", tlv("30", tlv("02", n))},
      {"trailing byte after the SEQUENCE", good + "00"},
      {"SET instead of SEQUENCE", "31" + good.substr(2)},
      {"BIT STRING modulus", tlv("30", tlv("03", n) + "0203010001")},
      {"SubjectPublicKeyInfo wrapper", tlv("30", tlv("30", "06092A864886F70D0101010500") + tlv("03", "00" + good))},
      {"indefinite length", "3080" + inner + "0000"},
      {"length of length 3", "3083000089" + inner},
      {"length of length 4, huge", "3084FFFFFFFF" + inner},
      {"length of length 8", "3088FFFFFFFFFFFFFFFF" + inner},
      {"0x82 length beyond the input", "3082FFFF" + inner},
      {"0x81 form for a short length", "3081" + tlv("30", small).substr(2)},
      {"0x82 form for a one-byte length", "30820089" + inner},
      {"INTEGER length beyond the SEQUENCE", tlv("30", "0282FFFF" + n)},
      {"empty", ""},
      {"non-hex character", good.substr(0, 10) + "G" + good.substr(11)},
      {"white space", good.substr(0, 10) + " " + good.substr(10)},
      {"odd length: a leading 0 is implied, never a SEQUENCE tag", good.substr(1)},
  };
  for (const auto& c : cases) EXPECT_EQ(readDer(c.hex), "<absent>") << c.why;
  EXPECT_FALSE(derPublicKeyToModulusHex(nullptr));
}

TEST(DerPublicKey, TruncationsAndMutationsStayInBounds) {
  const std::string good = test::opensslPublicDerHex(test::encKey());
  for (std::size_t len = 0; len < good.size(); len += 2)
    EXPECT_EQ(readDer(good.substr(0, len)), "<absent>") << len / 2 << " bytes";
  // Not a fuzzer, but a cheap net: any byte changed or dropped gives a refusal or a modulus of
  // at most 280 bytes, and never touches memory past the decoded key.
  std::mt19937 rng(11);
  for (int i = 0; i < 3000; ++i) {
    std::string hex = good;
    const std::size_t pos = 2 * (rng() % (hex.size() / 2));
    char byte[3];
    std::snprintf(byte, sizeof byte, "%02X", static_cast<unsigned>(rng() & 0xFF));
    i % 3 ? hex.replace(pos, 2, byte) : hex.erase(pos, 2);
    const std::string m = readDer(hex);
    EXPECT_TRUE(m == "<absent>" || m.size() <= 560u) << hex;
  }
}

// ---- built-in moduli

TEST(BuiltinModuli, SlotLayoutTextsAndDefault) {
  // Per slot: 1 a 1024-bit modulus only, 2 a 2048-bit one only, B both, - none.
  std::string layout;
  std::set<std::string> texts[2];
  for (int s = 0; s < kBuiltinModulusSlots; ++s) {
    const char* first = builtinModulus(s, 0);
    const char* second = builtinModulus(s, 1);
    layout += first && second ? 'B' : first ? '1' : second ? '2' : '-';
    for (const char* m : {first, second}) {
      if (m == nullptr) continue;
      const std::string text = m;
      ASSERT_EQ(text.find_first_not_of("0123456789ABCDEF"), std::string::npos) << s;
      ASSERT_NE(std::string("13579BDF").find(text.back()), std::string::npos) << "odd modulus " << s;
      EXPECT_GE(text[0], '8') << "a full-width modulus in slot " << s;
      ASSERT_TRUE(text.size() == 256 || (text.size() == 512 && !first)) << "2048 bits only alone, slot " << s;
      texts[text.size() / 512].insert(text);
    }
  }
  EXPECT_EQ(layout, "1111111111" "1111111111" "11111111" "2222" "1111111" "BB" "1111" "B2-");
  EXPECT_EQ(texts[0].size(), 43u) << "distinct 1024-bit moduli";
  EXPECT_EQ(texts[1].size(), 5u) << "distinct 2048-bit moduli";
  EXPECT_EQ(builtinModulus(-1, 0), nullptr);
  EXPECT_EQ(builtinModulus(48, 0), nullptr);
  EXPECT_EQ(builtinModulus(12, 2), nullptr);
  EXPECT_STREQ(builtinModulus(39, 0), builtinModulus(40, 0));
  EXPECT_STREQ(builtinModulus(42, 0), builtinModulus(26, 0));
  EXPECT_STRNE(builtinModulus(39, 1), builtinModulus(40, 1));
  ASSERT_TRUE(builtinDefaultModulus() != nullptr && builtinDefaultModulus() == builtinModulus(12, 0));
  EXPECT_EQ(std::string(builtinDefaultModulus()), test::builtinDefaultKey().modulusHex());
}

}  // namespace
}  // namespace tessel
