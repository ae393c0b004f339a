// RC4 against RFC 6229's keystream vectors (seven key lengths, offsets 0..4096), which check
// both the key schedule and rc4Discard, plus in-place operation.
#include <gtest/gtest.h>

#include <string>

#include "crypto/rc4.h"
#include "crypto/wipe.h"
#include "support/vector_file.h"

namespace tessel {
namespace {

using test::Bytes;
using test::fromHex;
using test::toHex;

TEST(Rc4, Rfc6229Keystreams) {
  int checked = 0;
  for (const char* bits : {"40", "56", "64", "80", "128", "192", "256"}) {
    const std::string file = std::string("rfc-6229-") + bits + ".txt";
    for (const auto& r : test::readVectorRecords(test::dataPath(file))) {
      const Bytes key = fromHex(r.at("KEY")), pt = fromHex(r.at("PLAINTEXT"));
      Rc4State s;
      rc4Init(s, key.data(), key.size());
      rc4Discard(s, std::stoul(r.at("OFFSET")));
      Bytes out = pt;
      rc4Crypt(s, out.data(), out.data(), out.size());
      EXPECT_EQ(toHex(out), r.at("CIPHERTEXT")) << file << " offset " << r.at("OFFSET");
      wipeObject(s);
      ++checked;
    }
  }
  EXPECT_EQ(checked, 7 * 36);  // 18 offsets, 32 bytes each as two 16-byte rows
}

TEST(Rc4, DiscardEqualsEncryptingAndDroppingOutput) {
  const Bytes key = fromHex("0102030405060708090a0b0c0d0e0f10");
  Rc4State a, b;
  rc4Init(a, key.data(), key.size());
  rc4Init(b, key.data(), key.size());
  Bytes junk(768);
  rc4Crypt(a, junk.data(), junk.data(), junk.size());
  rc4Discard(b, 768);
  Bytes x(32), y(32);
  rc4Crypt(a, x.data(), x.data(), x.size());
  rc4Crypt(b, y.data(), y.data(), y.size());
  EXPECT_EQ(x, y);
}

}  // namespace
}  // namespace tessel
