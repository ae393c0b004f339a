// RC4 against RFC 6229's keystreams: seven key lengths, offsets 0..4096 (the key schedule and
// rc4Discard), every other record out of place.
#include <gtest/gtest.h>

#include <string>

#include "crypto/rc4.h"
#include "crypto/wipe.h"
#include "support/vector_file.h"

namespace tessel {
namespace {

using test::Bytes;

Bytes rc4(const Bytes& key, std::size_t drop, const Bytes& data, bool inPlace) {
  Rc4State s;
  rc4Init(s, key.data(), key.size());
  rc4Discard(s, drop);
  Bytes out = inPlace ? data : Bytes(data.size());
  rc4Crypt(s, inPlace ? out.data() : data.data(), out.data(), out.size());
  wipeObject(s);
  return out;
}

TEST(Rc4, Rfc6229Keystreams) {
  int checked = 0;
  for (const char* bits : {"40", "56", "64", "80", "128", "192", "256"}) {
    const std::string file = std::string("rfc-6229-") + bits + ".txt";
    for (const auto& r : test::readVectorRecords(test::dataPath(file))) {
      const Bytes key = test::fromHex(r.at("KEY")), plain = test::fromHex(r.at("PLAINTEXT"));
      const Bytes out = rc4(key, std::stoul(r.at("OFFSET")), plain, checked % 2 == 0);
      EXPECT_EQ(test::toHex(out), r.at("CIPHERTEXT")) << file << " offset " << r.at("OFFSET");
      ++checked;
    }
  }
  EXPECT_EQ(checked, 7 * 36);  // 18 offsets, 32 bytes each as two 16-byte rows
}

}  // namespace
}  // namespace tessel
