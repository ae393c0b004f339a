// Two-key Triple DES against NIST's TDES ECB sets: SP 800-20's single-DES KATs run with K1 = K2
// (which is single DES) and the keying-option-2 multi-block messages. Every other record runs in
// place, and every third with the key's parity bits flipped, which DES must ignore.
#include <gtest/gtest.h>

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
Bytes ecb(const Bytes& key16, const Bytes& data, bool encrypt, bool inPlace) {
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
      Bytes key = fromHex(r.has("KEYs") ? r.at("KEYs") + r.at("KEYs") : r.at("KEY1") + r.at("KEY2"));
      if (checked % 3 == 0)
        for (auto& b : key) b ^= 0x01;
      const bool encrypt = r.section == "ENCRYPT";
      const std::string& in = r.at(encrypt ? "PLAINTEXT" : "CIPHERTEXT");
      EXPECT_EQ(toHex(ecb(key, fromHex(in), encrypt, checked % 2 == 1)), r.at(encrypt ? "CIPHERTEXT" : "PLAINTEXT"))
          << file << " " << r.section << " " << r.at("COUNT");
      ++checked;
    }
  }
  EXPECT_EQ(checked, 2 * (64 + 64 + 32 + 19) + 2 * 56 + 20);
}

}  // namespace
}  // namespace tessel
