// RSA public operation, DER public-key reader and built-in modulus table.
//
// Oracle: OpenSSL holds the private keys. What our public operation produces must decrypt
// (RSA_NO_PADDING) to exactly the block we fed in, for 1024- and 2048-bit keys and for the
// built-in default modulus whose demo private key lives in tests/data. The DER reader must
// accept what OpenSSL writes as a PKCS#1 RSAPublicKey and refuse every near miss, and must not
// read out of bounds on any truncation or mutation (ASan builds check that).
#include <gtest/gtest.h>

#include <cstring>
#include <random>
#include <set>
#include <string>

#include "crypto/codec.h"
#include "crypto/der.h"
#include "crypto/moduli.h"
#include "crypto/rsa.h"
#include "support/rsa_oracle.h"

namespace tessel {
namespace {

using test::Bytes;
using test::RsaTestKey;

const RsaTestKey& key1024() {
  static const RsaTestKey k = RsaTestKey::generate(1024);
  return k;
}
const RsaTestKey& key2048() {
  static const RsaTestKey k = RsaTestKey::generate(2048);
  return k;
}
const RsaTestKey& defaultKey() {
  static const RsaTestKey k = RsaTestKey::fromPemFile(test::dataPath("builtin_default_key.pem"));
  return k;
}

std::string upperHex(const Bytes& b) {
  SecureBuffer h = hexEncode(b.data(), b.size());
  return std::string(h.c_str());
}

// A random block of k bytes below the modulus (top byte cleared).
Bytes randomBlock(std::mt19937& rng, std::size_t k) {
  Bytes b(k);
  for (auto& x : b) x = static_cast<std::uint8_t>(rng());
  b[0] = 0;
  return b;
}

std::string encrypt(const RsaTestKey& key, const Bytes& block) {
  SecureBuffer c = rsaPublicHex(key.modulusHex().c_str(), upperHex(block).c_str());
  return c ? std::string(c.c_str()) : std::string("<absent>");
}

class RsaRoundTrip : public ::testing::TestWithParam<int> {
 protected:
  const RsaTestKey& key() const {
    return GetParam() == 1024 ? key1024() : GetParam() == 2048 ? key2048() : defaultKey();
  }
};

TEST_P(RsaRoundTrip, PrivateKeyRecoversTheExactBlock) {
  std::mt19937 rng(GetParam());
  const std::size_t k = key().bytes();
  EXPECT_EQ(rsaModulusBytes(key().modulusHex().c_str()), k);
  for (int i = 0; i < 20; ++i) {
    const Bytes block = randomBlock(rng, k);
    const std::string c = encrypt(key(), block);
    ASSERT_EQ(c.size(), 2 * k);
    EXPECT_EQ(c.find_first_not_of("0123456789ABCDEF"), std::string::npos);
    EXPECT_EQ(key().rawDecrypt(test::fromHex(c)), block);
  }
}

TEST_P(RsaRoundTrip, ResultsWithLeadingZeroBytesKeepTheirWidth) {
  std::mt19937 rng(GetParam() + 1);
  const std::size_t k = key().bytes();
  int found = 0;
  for (int i = 0; i < 20000 && found < 3; ++i) {
    const Bytes block = randomBlock(rng, k);
    const std::string c = encrypt(key(), block);
    ASSERT_EQ(c.size(), 2 * k);
    if (c.compare(0, 2, "00") != 0) continue;  // one in 256 ciphertexts starts with a zero byte
    ++found;
    EXPECT_EQ(key().rawDecrypt(test::fromHex(c)), block);
  }
  EXPECT_EQ(found, 3);
}

TEST_P(RsaRoundTrip, Pkcs1BlockDecryptsToTheMessage) {
  // Hand-built type 2 block: OpenSSL's PKCS#1 unpadding must find the message.
  const std::size_t k = key().bytes();
  const Bytes message = test::bytesOf("attack at dawn");
  Bytes block(k, 0x5A);
  block[0] = 0x00;
  block[1] = 0x02;
  block[k - message.size() - 1] = 0x00;
  std::memcpy(&block[k - message.size()], message.data(), message.size());
  EXPECT_EQ(key().pkcs1Decrypt(test::fromHex(encrypt(key(), block))), message);
}

TEST_P(RsaRoundTrip, ZeroAndOne) {
  const std::size_t k = key().bytes();
  EXPECT_EQ(encrypt(key(), Bytes{0}), std::string(2 * k, '0'));
  EXPECT_EQ(encrypt(key(), Bytes{1}), std::string(2 * k - 1, '0') + "1");
}

TEST_P(RsaRoundTrip, LeadingZeroDigitsInTheModulusText) {
  std::mt19937 rng(3);
  const std::string n = key().modulusHex();
  const std::string padded = "000000" + n;
  const Bytes block = randomBlock(rng, key().bytes());
  EXPECT_EQ(rsaModulusBytes(padded.c_str()), key().bytes());
  SecureBuffer c = rsaPublicHex(padded.c_str(), upperHex(block).c_str());
  ASSERT_TRUE(c);
  EXPECT_EQ(std::string(c.c_str()), encrypt(key(), block));
}

INSTANTIATE_TEST_SUITE_P(Keys, RsaRoundTrip, ::testing::Values(1024, 2048, 0),
                         [](const ::testing::TestParamInfo<int>& param) {
                           return param.param ? std::to_string(param.param) + "bit"
                                              : std::string("BuiltinDefault");
                         });

TEST(RsaPublicHex, LowerCaseInputIsRead) {
  std::string n = key1024().modulusHex();
  for (auto& ch : n) ch = static_cast<char>(std::tolower(ch));
  SecureBuffer c = rsaPublicHex(n.c_str(), "0a0b");
  ASSERT_TRUE(c);
  EXPECT_EQ(std::string(c.c_str()), encrypt(key1024(), Bytes{0x0A, 0x0B}));
}

TEST(RsaPublicHex, Refusals) {
  const std::string n = key1024().modulusHex();
  std::string nPlusOne = n, nMinusOne = n;
  nPlusOne.back() = static_cast<char>(nPlusOne.back() + 1);  // moduli are odd: no carry
  nMinusOne.back() = static_cast<char>(nMinusOne.back() - 1);
  EXPECT_FALSE(rsaPublicHex(nullptr, "01"));
  EXPECT_FALSE(rsaPublicHex(n.c_str(), nullptr));
  EXPECT_FALSE(rsaPublicHex(n.c_str(), ""));
  EXPECT_FALSE(rsaPublicHex("", "01"));
  EXPECT_FALSE(rsaPublicHex(n.c_str(), "01 02"));
  EXPECT_FALSE(rsaPublicHex(n.c_str(), "0G"));
  EXPECT_FALSE(rsaPublicHex((n + "Z").c_str(), "01"));
  EXPECT_FALSE(rsaPublicHex("0", "0"));
  EXPECT_FALSE(rsaPublicHex("000", "0"));
  EXPECT_FALSE(rsaPublicHex(n.c_str(), n.c_str())) << "data equal to the modulus";
  EXPECT_FALSE(rsaPublicHex(n.c_str(), nPlusOne.c_str())) << "data above the modulus";
  EXPECT_TRUE(rsaPublicHex(n.c_str(), nMinusOne.c_str()));
  const std::string wide = "1" + std::string(559, '0') + "1";  // 2241 bits
  EXPECT_FALSE(rsaPublicHex(wide.c_str(), "02"));
  EXPECT_EQ(rsaModulusBytes(wide.c_str()), 0u);
}

TEST(RsaPublicHex, WidestModulusMatchesOpenSsl) {
  const std::string n = "C" + std::string(558, '5') + "3";  // 2240 bits, odd
  const std::string x = "1234" + std::string(500, 'A');
  SecureBuffer c = rsaPublicHex(n.c_str(), x.c_str());
  ASSERT_TRUE(c);
  ASSERT_EQ(std::strlen(c.c_str()), 560u);
  std::string expected = test::opensslBnModExp(x, "10001", n);
  expected.insert(0, 560 - expected.size(), '0');
  EXPECT_EQ(std::string(c.c_str()), expected);
}

TEST(RsaModulusBytes, CountsSignificantBits) {
  struct Case {
    const char* text;
    std::size_t k;
  } cases[] = {{"01", 1},        {"FF", 1},      {"100", 2},      {"0000FF", 1},
               {"0001FF", 2},    {"7FFF", 2},    {"8000", 2},     {"0", 0},
               {"", 0},          {"xyz", 0},     {"12 34", 0}};
  for (const auto& c : cases) EXPECT_EQ(rsaModulusBytes(c.text), c.k) << c.text;
  EXPECT_EQ(rsaModulusBytes(nullptr), 0u);
  EXPECT_EQ(rsaModulusBytes(std::string(560, 'F').c_str()), 280u);
}

// ---- DER

std::string derLength(std::size_t n) {
  char buf[32];
  if (n < 0x80) std::snprintf(buf, sizeof buf, "%02zX", n);
  else if (n < 0x100) std::snprintf(buf, sizeof buf, "81%02zX", n);
  else std::snprintf(buf, sizeof buf, "82%04zX", n);
  return buf;
}
std::string tlv(const std::string& tag, const std::string& hexContent) {
  return tag + derLength(hexContent.size() / 2) + hexContent;
}
std::string modulusDer(const std::string& modulusContent, const std::string& exponentTlv = "0203010001") {
  return tlv("30", tlv("02", modulusContent) + exponentTlv);
}

std::string readDer(const std::string& hex) {
  SecureBuffer m = derPublicKeyToModulusHex(hex.c_str());
  return m ? std::string(m.c_str()) : std::string("<absent>");
}

TEST(DerPublicKey, AcceptsWhatOpenSslWrites) {
  for (const RsaTestKey* k : {&key1024(), &key2048(), &defaultKey()}) {
    std::string der = k->publicDerHex();
    EXPECT_EQ(readDer(der), k->modulusHex());
    for (auto& ch : der) ch = static_cast<char>(std::tolower(ch));
    EXPECT_EQ(readDer(der), k->modulusHex()) << "lower-case text";
  }
}

TEST(DerPublicKey, ModulusForms) {
  EXPECT_EQ(readDer(modulusDer("00C5")), "C5") << "sign byte skipped";
  EXPECT_EQ(readDer(modulusDer("000000C5")), "C5") << "every leading zero byte skipped";
  EXPECT_EQ(readDer(modulusDer("C5")), "C5") << "top bit set without sign byte read unsigned";
  EXPECT_EQ(readDer(modulusDer("0102")), "0102");
  const std::string widest = "00" + std::string(560, 'F');
  EXPECT_EQ(readDer(modulusDer(widest)), std::string(560, 'F'));
  EXPECT_EQ(readDer(modulusDer("01" + std::string(560, '0'))), "<absent>") << "2241 bits";
  EXPECT_EQ(readDer(modulusDer("00")), "<absent>");
  EXPECT_EQ(readDer(modulusDer("0000")), "<absent>");
  EXPECT_EQ(readDer(modulusDer("")), "<absent>");
}

TEST(DerPublicKey, RefusesNearMisses) {
  const std::string n = "00" + key1024().modulusHex();
  const std::string good = modulusDer(n);
  ASSERT_EQ(readDer(good), key1024().modulusHex());
  const std::string inner = tlv("02", n) + "0203010001";  // 137 bytes: length 81 89
  const std::string small = tlv("02", "00C5") + "0203010001";
  ASSERT_EQ(readDer(tlv("30", small)), "C5");
  struct Case {
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
      {"SubjectPublicKeyInfo wrapper", tlv("30", tlv("30", "06092A864886F70D0101010500") +
                                                     tlv("03", "00" + good))},
      {"indefinite length", "3080" + inner + "0000"},
      {"length of length 3", "3083000" + derLength(inner.size() / 2).substr(2) + inner},
      {"length of length 4, huge", "3084FFFFFFFF" + inner},
      {"length of length 8", "3088FFFFFFFFFFFFFFFF" + inner},
      {"0x82 length beyond the input", "3082FFFF" + inner},
      {"0x81 form for a short length", "3081" + derLength(small.size() / 2) + small},
      {"0x82 form for a one-byte length", "308200" + derLength(inner.size() / 2).substr(2) + inner},
      {"INTEGER length beyond the SEQUENCE", tlv("30", "0282FFFF" + n)},
      {"empty", ""},
      {"non-hex character", good.substr(0, 10) + "G" + good.substr(11)},
      {"white space", good.substr(0, 10) + " " + good.substr(10)},
  };
  for (const auto& c : cases) EXPECT_EQ(readDer(c.hex), "<absent>") << c.why;
  EXPECT_FALSE(derPublicKeyToModulusHex(nullptr));
}

TEST(DerPublicKey, EveryTruncationIsRefused) {
  const std::string good = key2048().publicDerHex();
  for (std::size_t len = 0; len < good.size(); len += 2)
    EXPECT_EQ(readDer(good.substr(0, len)), "<absent>") << len / 2 << " bytes";
  // An odd-length text reads as if a "0" stood in front: that can never be a SEQUENCE tag.
  EXPECT_EQ(readDer(good.substr(1)), "<absent>");
}

TEST(DerPublicKey, RandomMutationsStayInBounds) {
  // Not a fuzzer, but a cheap net: any byte changed or dropped gives a refusal or a modulus of
  // at most 280 bytes, and never touches memory past the decoded key.
  std::mt19937 rng(11);
  const std::string good = key1024().publicDerHex();
  for (int i = 0; i < 3000; ++i) {
    std::string hex = good;
    const std::size_t pos = 2 * (rng() % (hex.size() / 2));
    if (i % 3 == 0) {
      hex.erase(pos, 2);
    } else {
      char byte[3];
      std::snprintf(byte, sizeof byte, "%02X", static_cast<unsigned>(rng() & 0xFF));
      hex.replace(pos, 2, byte);
    }
    const std::string m = readDer(hex);
    if (m != "<absent>") {
      EXPECT_LE(m.size(), 560u);
    }
  }
}

// ---- built-in moduli

TEST(BuiltinModuli, SlotLayout) {
  std::set<int> firstOnly, secondOnly, both, empty;
  for (int s = 0; s < kBuiltinModulusSlots; ++s) {
    const bool f = builtinModulus(s, 0) != nullptr, g = builtinModulus(s, 1) != nullptr;
    (f && g ? both : f ? firstOnly : g ? secondOnly : empty).insert(s);
  }
  std::set<int> expectedFirstOnly;
  for (int s = 0; s <= 27; ++s) expectedFirstOnly.insert(s);
  for (int s : {32, 33, 34, 35, 36, 37, 38, 41, 42, 43, 44}) expectedFirstOnly.insert(s);
  EXPECT_EQ(firstOnly, expectedFirstOnly);
  EXPECT_EQ(secondOnly, (std::set<int>{28, 29, 30, 31, 46}));
  EXPECT_EQ(both, (std::set<int>{39, 40, 45}));
  EXPECT_EQ(empty, (std::set<int>{47}));
  EXPECT_EQ(builtinModulus(-1, 0), nullptr);
  EXPECT_EQ(builtinModulus(48, 0), nullptr);
  EXPECT_EQ(builtinModulus(12, 2), nullptr);
}

TEST(BuiltinModuli, DistinctTextsAndSharing) {
  std::set<std::string> texts1024, texts2048;
  for (int s = 0; s < kBuiltinModulusSlots; ++s)
    for (int w = 0; w < 2; ++w) {
      const char* m = builtinModulus(s, w);
      if (m == nullptr) continue;
      const std::string text(m);
      ASSERT_EQ(text.find_first_not_of("0123456789ABCDEF"), std::string::npos) << s;
      ASSERT_NE(text[0], '0') << s;
      ASSERT_NE(std::string("13579BDF").find(text.back()), std::string::npos) << "odd modulus " << s;
      EXPECT_GE(text[0], '8') << "a full-width modulus in slot " << s;
      if (text.size() == 256) {
        texts1024.insert(text);
      } else if (text.size() == 512) {
        texts2048.insert(text);
      } else {
        ADD_FAILURE() << "slot " << s << " has " << text.size() << " digits";
      }
    }
  EXPECT_EQ(texts1024.size(), 43u);
  EXPECT_EQ(texts2048.size(), 5u);
  for (int s : {28, 29, 30, 31, 46}) EXPECT_EQ(std::strlen(builtinModulus(s, 1)), 512u) << s;
  EXPECT_STREQ(builtinModulus(39, 0), builtinModulus(40, 0));
  EXPECT_STREQ(builtinModulus(42, 0), builtinModulus(26, 0));
  EXPECT_STRNE(builtinModulus(39, 1), builtinModulus(40, 1));
}

TEST(BuiltinModuli, DefaultIsSlot12AndMatchesTheDemoKey) {
  ASSERT_NE(builtinDefaultModulus(), nullptr);
  EXPECT_EQ(builtinDefaultModulus(), builtinModulus(12, 0));
  EXPECT_EQ(std::strlen(builtinDefaultModulus()), 256u);
  EXPECT_EQ(std::string(builtinDefaultModulus()), defaultKey().modulusHex());
}

}  // namespace
}  // namespace tessel
