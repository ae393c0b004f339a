// Two-key Triple DES and the odd-parity table. Known answers: NIST's TDES ECB known-answer
// sets (the single-DES KATs of SP 800-20, run with K1 = K2, which is exactly single DES) and
// the keying-option-2 multi-block message test; oracle: OpenSSL's DES-EDE-ECB on random keys
// and blocks in both directions.
#include <gtest/gtest.h>

#include <random>
#include <string>

#include "crypto/tdes.h"
#include "crypto/wipe.h"
#include "support/vector_file.h"

namespace tessel {
namespace {

using test::Bytes;
using test::fromHex;
using test::toHex;

// ECB over whole blocks; `inPlace` runs each block over its own storage.
Bytes ecb(const Bytes& key16, const Bytes& data, bool encrypt, bool inPlace = false) {
  TripleDesContext ctx;
  (encrypt ? tdes2SetKeyEncrypt : tdes2SetKeyDecrypt)(ctx, key16.data());
  Bytes out = data;
  for (std::size_t i = 0; i + 8 <= data.size(); i += 8) tdesCryptEcb(ctx, inPlace ? &out[i] : &data[i], &out[i]);
  wipeObject(ctx);
  return out;
}

TEST(TripleDes, NistKnownAnswersAndMultiBlockMessages) {
  int checked = 0;
  for (const char* file : {"TECBvarkey.rsp", "TECBvartext.rsp", "TECBinvperm.rsp", "TECBpermop.rsp",
                           "TECBsubtab.rsp", "TECBMMT2.rsp"}) {
    for (const auto& r : test::readVectorRecords(test::dataPath(file))) {
      Bytes key;
      if (r.has("KEYs")) {  // single DES: K1 = K2
        key = fromHex(r.at("KEYs") + r.at("KEYs"));
      } else {  // keying option 2: K3 = K1
        ASSERT_EQ(r.at("KEY1"), r.at("KEY3"));
        key = fromHex(r.at("KEY1") + r.at("KEY2"));
      }
      const bool encrypt = r.section == "ENCRYPT";
      const std::string& in = r.at(encrypt ? "PLAINTEXT" : "CIPHERTEXT");
      EXPECT_EQ(toHex(ecb(key, fromHex(in), encrypt)), r.at(encrypt ? "CIPHERTEXT" : "PLAINTEXT"))
          << file << " " << r.section << " " << r.at("COUNT");
      ++checked;
    }
  }
  EXPECT_EQ(checked, 2 * (64 + 64 + 32 + 19) + 2 * 56 + 20);
}

TEST(TripleDes, MatchesOpenSslInPlaceAndIgnoresParityBits) {
  std::mt19937 rng(2024);
  for (int i = 0; i < 300; ++i) {
    Bytes key(16), data(8 * (1 + rng() % 8));
    for (auto& b : key) b = static_cast<std::uint8_t>(rng());
    for (auto& b : data) b = static_cast<std::uint8_t>(rng());
    const Bytes c = ecb(key, data, true);
    ASSERT_EQ(c, test::opensslDesEde(key, data, true)) << toHex(key);
    ASSERT_EQ(ecb(key, data, false), test::opensslDesEde(key, data, false)) << toHex(key);
    ASSERT_EQ(ecb(key, c, false, true), data) << "in place";
    ASSERT_EQ(ecb(key, data, true, true), c) << "in place";
    for (auto& b : key) b ^= 0x01;
    ASSERT_EQ(ecb(key, data, true), c) << "parity bits flipped";
  }
}

TEST(DesOddParity, Table) {
  for (int b = 0; b < 256; ++b) {
    std::uint8_t x = static_cast<std::uint8_t>(b);
    desSetOddParity(&x, 1);
    EXPECT_EQ(x & 0xFE, b & 0xFE) << b;
    EXPECT_EQ(__builtin_popcount(x) % 2, 1) << b;
  }
  Bytes k = {0x00, 0xFE, 0x01, 0x02, 0x03, 0x04, 0x07, 0x08, 0x0E, 0x10};
  desSetOddParity(k.data(), k.size());
  EXPECT_EQ(toHex(k), "01fe0102020407080e10");
  desSetOddParity(nullptr, 0);
}

}  // namespace
}  // namespace tessel
