// Paddings and PIN blocks, byte for byte.
//
// PKCS#1 v1.5 type 2 is a deterministic known-answer test: the RSA Laboratories vectors give
// the random seed of each example, fed through setRandomSourceForTesting, so padding plus our
// RSA must reproduce each published ciphertext exactly (300 examples, 1024 to 2048 bits).
// The other layouts are checked byte for byte, and through OpenSSL's private key where a
// receiver would open them.
#include <gtest/gtest.h>

#include <algorithm>
#include <string>

#include "crypto/codec.h"
#include "crypto/padding.h"
#include "crypto/random.h"
#include "crypto/rsa.h"
#include "support/dispatch_oracle.h"
#include "support/vector_file.h"

namespace tessel {
namespace {

using test::Bytes;
using test::toHex;
using Padder = SecureBuffer (*)(const std::uint8_t*, std::size_t, std::size_t) noexcept;

// The scripted random source: replays `g_script` (cycled), counts calls, can fail.
Bytes g_script;
int g_calls = 0;
bool g_fail = false;

bool scriptedSource(std::uint8_t* buffer, std::size_t n) {
  ++g_calls;
  for (std::size_t i = 0; i < n; ++i) buffer[i] = g_script.empty() ? 0 : g_script[i % g_script.size()];
  return !g_fail;
}

class Padding : public ::testing::Test {
 protected:
  void SetUp() override { setRandomSourceForTesting(scriptedSource); }
  void TearDown() override { setRandomSourceForTesting(nullptr); }
};

std::string hexOf(const SecureBuffer& b) { return b ? toHex(Bytes(b.data(), b.data() + b.size())) : "<absent>"; }
// Our RSA over a padded block, as upper-case hex.
std::string rsa(const std::string& modulus, const SecureBuffer& block) {
  const SecureBuffer c = rsaPublicHex(modulus.c_str(), hexEncode(block.data(), block.size()).c_str());
  return c ? std::string(c.c_str()) : "<absent>";
}

TEST_F(Padding, Pkcs1KnownAnswersFromPublishedSeeds) {
  const auto examples = test::readPkcs1Examples(test::dataPath("pkcs1v15crypt-vectors.txt"));
  ASSERT_EQ(examples.size(), 300u);
  for (const auto& e : examples) {
    const std::size_t k = rsaModulusBytes(e.modulusHex.c_str());
    ASSERT_EQ(e.seed.size(), k - e.message.size() - 3) << e.name;
    g_script = e.seed;
    EXPECT_EQ(test::fromHex(rsa(e.modulusHex, pkcs1Type2Block(e.message.data(), e.message.size(), k))), e.ciphertext)
        << e.name;
  }
}

TEST_F(Padding, LayoutsAndBounds) {
  const Bytes x(300, 'x'), dead = {0xDE, 0xAD}, ab = {0xAB};
  auto rep = [](std::size_t n, const std::string& hex) {
    std::string s;
    while (n--) s += hex;
    return s;
  };
  const struct {
    const char* name;
    Padder pad;
    const std::uint8_t* m;
    std::size_t mlen, k;
    Bytes script;
    std::string block;  // "<absent>" when refused
    int calls;          // random requests (-1: not checked)
  } cases[] = {
      // Zero filler bytes become 0x01, not a second draw.
      {"PKCS#1", pkcs1Type2Block, x.data(), 5, 20, {0x00, 0x07, 0x00}, "0002" + rep(4, "010701") + "00" + rep(5, "78"),
       1},
      {"PKCS#1 11 bytes of overhead", pkcs1Type2Block, x.data(), 117, 128, {0x5A},
       "0002" + rep(8, "5a") + "00" + rep(117, "78"), 1},
      {"PKCS#1 message too long", pkcs1Type2Block, x.data(), 118, 128, {}, "<absent>", -1},
      {"PKCS#1 empty", pkcs1Type2Block, x.data(), 0, 128, {}, "<absent>", -1},
      {"PKCS#1 null", pkcs1Type2Block, nullptr, 5, 128, {}, "<absent>", -1},
      {"PKCS#1 k = 11", pkcs1Type2Block, x.data(), 1, 11, {}, "<absent>", -1},
      {"PKCS#1 k = 0", pkcs1Type2Block, x.data(), 1, 0, {}, "<absent>", -1},
      {"PKCS#1 k = 12", pkcs1Type2Block, ab.data(), 1, 12, {0x00}, "0002" + rep(8, "01") + "00ab", 1},
      {"Keyou", keyouBlock, x.data(), 40, 128, {0x00, 0x9C}, "3430" + rep(40, "78") + rep(43, "019c"), 1},
      {"Keyou one byte", keyouBlock, ab.data(), 1, 4, {0x00}, "3031ab01", 1},
      // Lengths past 99 run past '9' in the tens character: ';' for 117, kept as it stands.
      {"Keyou 117", keyouBlock, x.data(), 117, 128, {0x5A}, "3b37" + rep(117, "78") + rep(9, "5a"), 1},
      {"Keyou fills the block, no filler drawn", keyouBlock, x.data(), 126, 128, {}, "3c36" + rep(126, "78"), 0},
      {"Keyou m + 2 > k", keyouBlock, x.data(), 127, 128, {}, "<absent>", -1},
      {"Keyou empty", keyouBlock, x.data(), 0, 128, {}, "<absent>", -1},
      {"Keyou null", keyouBlock, nullptr, 3, 128, {}, "<absent>", -1},
      {"Keyou binary", keyouBinaryBlock, dead.data(), 2, 6, {0x00}, "0002dead0101", 1},
      {"Keyou binary too long", keyouBinaryBlock, dead.data(), 2, 3, {}, "<absent>", -1},
      {"Keyou binary length above its byte", keyouBinaryBlock, x.data(), 256, 280, {}, "<absent>", -1},
      {"length byte, FF fill", lengthByteFfBlock, dead.data(), 2, 6, {}, "02deadffffff", 0},
      {"length byte, no fill", lengthByteFfBlock, dead.data(), 2, 3, {}, "02dead", 0},
      {"length byte, empty", lengthByteFfBlock, dead.data(), 0, 3, {}, "00ffff", 0},
      {"length byte, too long", lengthByteFfBlock, dead.data(), 2, 2, {}, "<absent>", -1},
      {"length byte, null", lengthByteFfBlock, nullptr, 2, 6, {}, "<absent>", -1},
  };
  for (const auto& c : cases) {
    g_script = c.script;
    g_calls = 0;
    EXPECT_EQ(hexOf(c.pad(c.m, c.mlen, c.k)), c.block) << c.name;
    if (c.calls >= 0) { EXPECT_EQ(g_calls, c.calls) << c.name; }
  }
  g_fail = true;
  EXPECT_FALSE(pkcs1Type2Block(x.data(), 5, 128)) << "random source failure";
  EXPECT_FALSE(keyouBlock(x.data(), 10, 128)) << "random source failure";
  g_fail = false;
}

TEST(PaddingReceiver, OpenSslPrivateKeyOpensPkcs1AndKeyouBlocks) {
  // Real randomness, real receiver.
  const auto& key = test::appKey();
  const Bytes m = test::bytesOf("0123456789abcdef");
  for (int i = 0; i < 10; ++i) {
    const SecureBuffer block = pkcs1Type2Block(m.data(), m.size(), key.size());
    ASSERT_TRUE(block);
    const Bytes b(block.data(), block.data() + block.size());
    EXPECT_EQ(std::count(b.begin() + 2, b.end() - static_cast<long>(m.size()) - 1, 0), 0) << "zero in the filler";
    EXPECT_EQ(test::opensslPkcs1Decrypt(key, test::fromHex(rsa(key.modulusHex(), block))), m);
  }
  // A "Keyou" block starts with an ASCII digit, so it is below any full-width modulus.
  const SecureBuffer block = keyouBlock(m.data(), 9, key.size());
  const Bytes opened = test::opensslRawDecrypt(key, test::fromHex(rsa(key.modulusHex(), block)));
  EXPECT_EQ(opened, Bytes(block.data(), block.data() + block.size()));
  EXPECT_EQ(std::string(opened.begin(), opened.begin() + 11), "09012345678");
}

TEST(PinBlock, Iso9564Format0AndFPaddedDigits) {
  const struct {
    const char *pin, *pan;
    const char* block;  // lower-case hex, "<absent>" = refused
  } cases[] = {
      {"1234", nullptr, "041234ffffffffff"},
      {"12345", nullptr, "0512345fffffffff"},
      {"123456789012", nullptr, "0c123456789012ff"},
      {"1234", "4000001234567899", "041234fedcba9876"},     // account digits 000123456789
      {"1234", "12", "041234fffffffffe"},                   // one digit left of the check digit
      {"1234", "5", "041234ffffffffff"},                    // only a check digit: no account field
      {"1234", "1234567890123456789", "04124c6fedcba987"},  // account digits 789012345678
      {"123", nullptr, "<absent>"},           {"1234567890123", nullptr, "<absent>"},
      {"12a4", nullptr, "<absent>"},          {"", nullptr, "<absent>"},
      {"1234", "", "<absent>"},               {"1234", "40000012345678X9", "<absent>"},
      {"1234 ", nullptr, "<absent>"},         {nullptr, nullptr, "<absent>"},
  };
  for (const auto& c : cases)
    EXPECT_EQ(hexOf(pinBlockX98(c.pin, c.pan)), c.block) << (c.pin ? c.pin : "null") << " / " << (c.pan ? c.pan : "-");
  const std::pair<const char*, const char*> digits[] = {
      {"", "ffffffffffffffff"},         {"1234", "1234ffffffffffff"}, {"123", "123fffffffffffff"},
      {"123456789012", "123456789012ffff"}, {"1234567890123", "<absent>"}, {"12F4", "<absent>"},
      {"-1", "<absent>"},               {nullptr, "<absent>"}};
  for (const auto& [in, block] : digits) EXPECT_EQ(hexOf(fPaddedDigitBlock(in)), block) << (in ? in : "null");
}

}  // namespace
}  // namespace tessel
