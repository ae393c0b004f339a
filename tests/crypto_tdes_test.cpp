// Two-key Triple DES and the odd-parity table. Known answers: NIST's TDES ECB sets (SP 800-20's
// single-DES KATs run with K1 = K2, which is single DES, and the keying-option-2 multi-block
// messages); oracle: OpenSSL's DES-EDE-ECB on random keys and blocks in both directions.
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
      // Single DES as K1 = K2; keying option 2 has K3 = K1.
      if (!r.has("KEYs")) { ASSERT_EQ(r.at("KEY1"), r.at("KEY3")); }
      const Bytes key = fromHex(r.has("KEYs") ? r.at("KEYs") + r.at("KEYs") : r.at("KEY1") + r.at("KEY2"));
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

TEST(DesOddParity, EveryByteKeepsItsKeyBitsAndGetsOddParity) {
  Bytes all(256);
  for (int b = 0; b < 256; ++b) all[b] = static_cast<std::uint8_t>(b);
  desSetOddParity(all.data(), all.size());
  for (int b = 0; b < 256; ++b) EXPECT_TRUE((all[b] & 0xFE) == (b & 0xFE) && __builtin_popcount(all[b]) % 2 == 1) << b;
  desSetOddParity(nullptr, 0);
}

}  // namespace
}  // namespace tessel
