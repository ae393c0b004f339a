// SHA-1 and MD5: the published vectors (NIST CAVP short and long messages for SHA-1, RFC
// 1321's suite for MD5) and OpenSSL as an oracle for every length 0..300 fed one-shot, byte by
// byte and split at every offset. SHA-1 runs each check twice, with the SHA-extension compression
// where the CPU has it and with the portable one forced.
#include <gtest/gtest.h>

#include <random>
#include <string>
#include <vector>

#include "crypto/cpu_features.h"
#include "crypto/md5.h"
#include "crypto/sha1.h"
#include "support/vector_file.h"

namespace tessel {
namespace {

using test::Bytes;

template <typename C, std::size_t N, void (*Init)(C&), void (*Update)(C&, const void*, std::uint32_t),
          void (*Final)(C&, std::uint8_t*), void (*OneShot)(const void*, std::size_t, std::uint8_t*)>
struct Algo {
  static constexpr const char* kPeer = N == 20 ? "SHA1" : "MD5";
  static Bytes oneShot(const Bytes& m) {
    Bytes d(N);
    OneShot(m.data(), m.size(), d.data());
    return d;
  }
  // Feeds m in pieces ending at `cuts`.
  static Bytes pieces(const Bytes& m, const std::vector<std::size_t>& cuts) {
    C c;
    Init(c);
    for (std::size_t pos = 0, i = 0; i < cuts.size(); pos = cuts[i++])
      Update(c, m.data() + pos, static_cast<std::uint32_t>(cuts[i] - pos));
    Bytes d(N);
    Final(c, d.data());
    return d;
  }
};
using Sha1 = Algo<Sha1Context, 20, sha1Init, sha1Update, sha1Final, sha1>;
using Md5 = Algo<Md5Context, 16, md5Init, md5Update, md5Final, md5>;

template <typename A>
void checkAgainstOpenSsl() {
  std::mt19937 rng(5);
  for (std::size_t len = 0; len <= 300; ++len) {  // crosses the 55/56/64-byte boundaries
    Bytes m(len);
    for (auto& x : m) x = static_cast<std::uint8_t>(rng());
    const Bytes expected = test::opensslDigest(A::kPeer, m);
    ASSERT_EQ(A::oneShot(m), expected) << "one-shot, length " << len;
    std::vector<std::size_t> bytes(len);
    for (std::size_t i = 0; i < len; ++i) bytes[i] = i + 1;
    ASSERT_EQ(A::pieces(m, bytes), expected) << "byte by byte, length " << len;
    for (std::size_t at = 0; at <= len; ++at) ASSERT_EQ(A::pieces(m, {at, len}), expected) << len << " split at " << at;
  }
}

class Sha1Compression : public ::testing::TestWithParam<bool> {
 protected:
  void SetUp() override {
    cpuAllowFeature(CpuFeature::kShaNi, GetParam());
    ASSERT_TRUE(GetParam() || !cpuFeatureUsable(CpuFeature::kShaNi)) << "the portable run must be portable";
  }
  void TearDown() override { cpuAllowFeature(CpuFeature::kShaNi, true); }
};

TEST_P(Sha1Compression, MatchesOpenSslEveryWayOfFeeding) { checkAgainstOpenSsl<Sha1>(); }
TEST(Md5, MatchesOpenSslEveryWayOfFeeding) { checkAgainstOpenSsl<Md5>(); }

TEST_P(Sha1Compression, NistShortLongAndRfc1321Vectors) {
  int count = 0;
  for (const char* file : {"SHA1ShortMsg.rsp", "SHA1LongMsg.rsp", "md5-rfc-1321.txt"})
    for (const auto& r : test::readVectorRecords(test::dataPath(file))) {
      if (!r.has("Len")) continue;
      Bytes m = test::fromHex(r.at("Msg")), d(file[0] == 'm' ? 16 : 20);
      m.resize(std::stoul(r.at("Len")) / 8);
      (file[0] == 'm' ? md5 : sha1)(m.data(), m.size(), d.data());
      EXPECT_EQ(test::toHex(d), r.at("MD")) << file << " Len=" << r.at("Len");
      ++count;
    }
  EXPECT_EQ(count, 65 + 64 + 7);
}

INSTANTIATE_TEST_SUITE_P(HardwareAndPortable, Sha1Compression, ::testing::Values(true, false),
                         [](const auto& p) { return p.param ? "Default" : "Portable"; });

}  // namespace
}  // namespace tessel
