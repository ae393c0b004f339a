// Two-key Triple DES and the odd-parity table. Known answers: NIST's TDES ECB known-answer
// sets (the single-DES KATs of SP 800-20, run with K1 = K2, which is exactly single DES) and
// the keying-option-2 multi-block message test; oracle: OpenSSL's DES-EDE-ECB on random keys
// and blocks in both directions.
#include <gtest/gtest.h>

#include <openssl/evp.h>

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

Bytes ecb(const Bytes& key16, const Bytes& data, bool encrypt) {
  TripleDesContext ctx;
  if (encrypt)
    tdes2SetKeyEncrypt(ctx, key16.data());
  else
    tdes2SetKeyDecrypt(ctx, key16.data());
  Bytes out(data.size());
  for (std::size_t i = 0; i + 8 <= data.size(); i += 8) tdesCryptEcb(ctx, &data[i], &out[i]);
  wipeObject(ctx);
  return out;
}

Bytes opensslEde(const Bytes& key16, const Bytes& data, bool encrypt) {
  EVP_CIPHER_CTX* c = EVP_CIPHER_CTX_new();
  EVP_CipherInit_ex(c, EVP_des_ede_ecb(), nullptr, key16.data(), nullptr, encrypt ? 1 : 0);
  EVP_CIPHER_CTX_set_padding(c, 0);
  Bytes out(data.size() + 8);
  int n = 0, m = 0;
  EVP_CipherUpdate(c, out.data(), &n, data.data(), static_cast<int>(data.size()));
  EVP_CipherFinal_ex(c, out.data() + n, &m);
  EVP_CIPHER_CTX_free(c);
  out.resize(static_cast<std::size_t>(n + m));
  return out;
}

TEST(TripleDes, NistSingleDesKnownAnswers) {
  int checked = 0;
  for (const char* file : {"TECBvarkey.rsp", "TECBvartext.rsp", "TECBinvperm.rsp", "TECBpermop.rsp",
                           "TECBsubtab.rsp"}) {
    for (const auto& r : test::readVectorRecords(test::dataPath(file))) {
      Bytes key = fromHex(r.at("KEYs"));
      key.insert(key.end(), key.begin(), key.end());
      const Bytes pt = fromHex(r.at("PLAINTEXT")), ct = fromHex(r.at("CIPHERTEXT"));
      if (r.section == "ENCRYPT")
        EXPECT_EQ(toHex(ecb(key, pt, true)), r.at("CIPHERTEXT")) << file << " " << r.at("COUNT");
      else
        EXPECT_EQ(toHex(ecb(key, ct, false)), r.at("PLAINTEXT")) << file << " " << r.at("COUNT");
      ++checked;
    }
  }
  EXPECT_EQ(checked, 2 * (64 + 64 + 32 + 19) + 2 * 56);
}

TEST(TripleDes, NistKeyingOption2MultiBlock) {
  int checked = 0;
  for (const auto& r : test::readVectorRecords(test::dataPath("TECBMMT2.rsp"))) {
    ASSERT_EQ(r.at("KEY1"), r.at("KEY3"));
    const Bytes key = fromHex(r.at("KEY1") + r.at("KEY2"));
    if (r.section == "ENCRYPT")
      EXPECT_EQ(toHex(ecb(key, fromHex(r.at("PLAINTEXT")), true)), r.at("CIPHERTEXT"));
    else
      EXPECT_EQ(toHex(ecb(key, fromHex(r.at("CIPHERTEXT")), false)), r.at("PLAINTEXT"));
    ++checked;
  }
  EXPECT_EQ(checked, 20);
}

TEST(TripleDes, MatchesOpenSslOnRandomKeysAndBlocks) {
  std::mt19937 rng(2024);
  for (int i = 0; i < 500; ++i) {
    Bytes key(16), data(8 * (1 + rng() % 8));
    for (auto& b : key) b = static_cast<std::uint8_t>(rng());
    for (auto& b : data) b = static_cast<std::uint8_t>(rng());
    const Bytes c = ecb(key, data, true);
    ASSERT_EQ(c, opensslEde(key, data, true)) << toHex(key);
    ASSERT_EQ(ecb(key, data, false), opensslEde(key, data, false)) << toHex(key);
    ASSERT_EQ(ecb(key, c, false), data);
  }
}

TEST(TripleDes, ParityBitsAreIgnoredAndInPlaceWorks) {
  std::mt19937 rng(5);
  Bytes key(16), block(8);
  for (auto& b : key) b = static_cast<std::uint8_t>(rng());
  for (auto& b : block) b = static_cast<std::uint8_t>(rng());
  Bytes flipped = key;
  for (auto& b : flipped) b ^= 0x01;
  EXPECT_EQ(ecb(key, block, true), ecb(flipped, block, true));
  TripleDesContext ctx;
  tdes2SetKeyEncrypt(ctx, key.data());
  Bytes inPlace = block;
  tdesCryptEcb(ctx, inPlace.data(), inPlace.data());
  EXPECT_EQ(inPlace, ecb(key, block, true));
  EXPECT_EQ(ctx.mode, 1u);
  tdes2SetKeyDecrypt(ctx, key.data());
  EXPECT_EQ(ctx.mode, 0u);
  tdesCryptEcb(ctx, inPlace.data(), inPlace.data());
  EXPECT_EQ(inPlace, block);
  wipeObject(ctx);
}

TEST(DesOddParity, Table) {
  for (int b = 0; b < 256; ++b) {
    std::uint8_t x = static_cast<std::uint8_t>(b);
    desSetOddParity(&x, 1);
    EXPECT_EQ(x & 0xFE, b & 0xFE) << b;
    EXPECT_EQ(__builtin_popcount(x) % 2, 1) << b;
    std::uint8_t again = x;
    desSetOddParity(&again, 1);
    EXPECT_EQ(again, x) << "idempotent at " << b;
  }
  Bytes k = {0x00, 0xFE, 0x01, 0x02, 0x03, 0x04, 0x07, 0x08, 0x0E, 0x10};
  desSetOddParity(k.data(), k.size());
  EXPECT_EQ(toHex(k), "01fe0102020407080e10");
  desSetOddParity(nullptr, 0);
}

}  // namespace
}  // namespace tessel
