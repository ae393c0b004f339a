// Paddings and PIN blocks, byte for byte. PKCS#1 v1.5 type 2 is a known-answer test: the RSA
// Laboratories vectors give each example's random seed, fed through setRandomSourceForTesting,
// so padding plus our RSA must reproduce all 300 published ciphertexts (1024 to 2048 bits). The
// other layouts, bounds and PIN blocks are checked byte for byte.
#include <gtest/gtest.h>

#include <algorithm>
#include <map>

#include "crypto/codec.h"
#include "crypto/padding.h"
#include "crypto/random.h"
#include "crypto/rsa.h"
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
  int count = 0;
  for (const auto& e : test::readVectorRecords(test::dataPath("pkcs1v15crypt-vectors.rsp"))) {
    const Bytes m = test::fromHex(e.at("MESSAGE")), seed = test::fromHex(e.at("SEED"));
    const std::size_t k = rsaModulusBytes(e.at("MODULUS").c_str());
    ASSERT_EQ(seed.size(), k - m.size() - 3) << e.at("EXAMPLE");
    g_script = seed;
    EXPECT_EQ(rsa(e.at("MODULUS"), pkcs1Type2Block(m.data(), m.size(), k)), e.at("CIPHERTEXT")) << e.at("EXAMPLE");
    ++count;
  }
  EXPECT_EQ(count, 300);
}

// Layouts, bounds and PIN blocks from tests/data/padding-blocks.rsp.
TEST_F(Padding, LayoutsBoundsAndPinBlocks) {
  const std::map<std::string, Padder> padders = {{"pkcs1", pkcs1Type2Block}, {"keyou", keyouBlock},
                                                 {"keyouBinary", keyouBinaryBlock}, {"lengthByteFf", lengthByteFfBlock}};
  const auto text = [](const std::string& field) {
    const Bytes b = field == "null" ? Bytes() : test::fromHex(field);
    return std::string(b.begin(), b.end());
  };
  const auto pointer = [](const std::string& field, const std::string& t) { return field == "null" ? nullptr : t.c_str(); };
  int count = 0;
  for (const auto& r : test::readVectorRecords(test::dataPath("padding-blocks.rsp"))) {
    ++count;
    const std::string expected = r.at("BLOCK") == "absent" ? "<absent>" : r.at("BLOCK");
    if (r.section == "PADDING") {
      const Bytes m = test::fromHex(r.at("M"));
      Bytes storage(300);  // a non-null pointer even for an empty message
      std::copy(m.begin(), m.end(), storage.begin());
      g_script = test::fromHex(r.at("SCRIPT"));
      g_calls = 0;
      const std::uint8_t* at = r.at("M") == "null" ? nullptr : storage.data();
      EXPECT_EQ(hexOf(padders.at(r.at("FUNCTION"))(at, m.size() + (at ? 0 : 3), std::stoul(r.at("K")))), expected)
          << r.at("NAME");
      EXPECT_TRUE(!r.has("CALLS") || g_calls == std::stoi(r.at("CALLS"))) << r.at("NAME");
    } else if (r.section == "PIN") {
      const std::string pin = text(r.at("PIN")), pan = text(r.at("PAN"));
      EXPECT_EQ(hexOf(pinBlockX98(pointer(r.at("PIN"), pin), pointer(r.at("PAN"), pan))), expected) << pin << "/" << pan;
    } else {
      const std::string digits = text(r.at("DIGITS"));
      EXPECT_EQ(hexOf(fPaddedDigitBlock(pointer(r.at("DIGITS"), digits))), expected) << digits;
    }
  }
  EXPECT_EQ(count, 23 + 15 + 8);
  g_fail = true;
  const Bytes x(20, 'x');
  EXPECT_FALSE(pkcs1Type2Block(x.data(), 5, 128) || keyouBlock(x.data(), 10, 128)) << "random source failure";
  g_fail = false;
}

}  // namespace
}  // namespace tessel
