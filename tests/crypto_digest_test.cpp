// SHA-1 and MD5: the published vectors (NIST CAVP short, long and Monte Carlo messages for
// SHA-1, with and without its hardware compression; RFC 1321's suite for MD5), and OpenSSL as
// an oracle for every length 0..300 fed one-shot, byte by byte, split at every offset, through
// a copied context, and for 1 MiB in uneven chunks.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <random>
#include <string>
#include <vector>

#include "crypto/md5.h"
#include "crypto/sha1.h"
#include "support/vector_file.h"

namespace tessel {
namespace {

using test::Bytes;
using test::fromHex;
using test::toHex;

// The two algorithms behind one interface so every oracle check runs on each.
template <typename C, std::size_t N, void (*Init)(C&), void (*Update)(C&, const void*, std::uint32_t),
          void (*Final)(C&, std::uint8_t*), void (*OneShot)(const void*, std::size_t, std::uint8_t*)>
struct Algo {
  static const char* peer() { return N == 20 ? "SHA1" : "MD5"; }
  static Bytes oneShot(const Bytes& m) {
    Bytes d(N);
    OneShot(m.data(), m.size(), d.data());
    return d;
  }
  // Feeds `m` in the pieces that end at `cuts`; at `copyAt` the context is copied, the original
  // fed something else, and the copy continues (it must not share state with the original).
  static Bytes digest(const Bytes& m, const std::vector<std::size_t>& cuts, std::size_t copyAt = SIZE_MAX) {
    C c;
    Init(c);
    std::size_t pos = 0;
    for (std::size_t cut : cuts) {
      Update(c, m.data() + pos, static_cast<std::uint32_t>(cut - pos));
      if ((pos = cut) == copyAt) {
        C copy = c;
        Update(c, "different", 9);
        c = copy;
      }
    }
    Bytes d(N);
    Final(c, d.data());
    return d;
  }
};
using Sha1 = Algo<Sha1Context, 20, sha1Init, sha1Update, sha1Final, sha1>;
using Md5 = Algo<Md5Context, 16, md5Init, md5Update, md5Final, md5>;

Bytes randomBytes(std::size_t n, std::uint32_t seed) {
  std::mt19937 rng(seed);
  Bytes b(n);
  for (auto& x : b) x = static_cast<std::uint8_t>(rng());
  return b;
}

// Lengths 0..300 cross the 55/56/64-byte padding boundaries several times; length 0 also feeds
// a null pointer with a zero length (an empty vector's data()).
template <typename A>
void checkEveryWayOfFeeding() {
  for (std::size_t len = 0; len <= 300; ++len) {
    const Bytes m = randomBytes(len, static_cast<std::uint32_t>(len));
    const Bytes expected = test::opensslDigest(A::peer(), m);
    ASSERT_EQ(A::oneShot(m), expected) << "one-shot, length " << len;
    std::vector<std::size_t> bytes(len);
    for (std::size_t i = 0; i < len; ++i) bytes[i] = i + 1;
    ASSERT_EQ(A::digest(m, bytes), expected) << "byte by byte, length " << len;
    for (std::size_t at = 0; at <= len; ++at) {
      ASSERT_EQ(A::digest(m, {at, len}), expected) << len << " split at " << at;
      if (len == 300) { ASSERT_EQ(A::digest(m, {at, len}, at), expected) << "copied at " << at; }
    }
  }
  const Bytes big = randomBytes(1 << 20, 5), expected = test::opensslDigest(A::peer(), big);
  std::vector<std::size_t> uneven;
  for (std::size_t pos = 0, chunk = 1; pos < big.size(); chunk = chunk * 3 + 7)
    uneven.push_back(pos = std::min(pos + chunk, big.size()));
  EXPECT_EQ(A::digest(big, uneven), expected) << "1 MiB in uneven chunks";
  EXPECT_EQ(A::oneShot(big), expected) << "1 MiB at once";
}

TEST(DigestOracle, EveryLengthEveryWayOfFeeding) {
  // SHA-1 also with its portable compression forced, so machines with SHA extensions check both.
  for (const bool hardware : {true, false}) {
    SCOPED_TRACE(hardware ? "SHA-1" : "SHA-1, portable");
    sha1AllowHardware(hardware);
    checkEveryWayOfFeeding<Sha1>();
  }
  sha1AllowHardware(true);
  checkEveryWayOfFeeding<Md5>();
}

TEST(DigestVectors, NistSha1AndRfc1321Md5) {
  int count = 0;
  for (const bool hardware : {true, false}) {
    sha1AllowHardware(hardware);
    for (const char* file : {"SHA1ShortMsg.rsp", "SHA1LongMsg.rsp", "md5-rfc-1321.txt"}) {
      const bool isMd5 = file[0] == 'm';
      for (const auto& r : test::readVectorRecords(test::dataPath(file))) {
        if (!r.has("Len")) continue;
        Bytes m = fromHex(r.at("Msg")), d(isMd5 ? 16 : 20);
        m.resize(std::stoul(r.at("Len")) / 8);
        (isMd5 ? md5 : sha1)(m.data(), m.size(), d.data());
        EXPECT_EQ(toHex(d), r.at("MD")) << file << " Len=" << r.at("Len");
        ++count;
      }
    }
  }
  sha1AllowHardware(true);
  EXPECT_EQ(count, 2 * (65 + 64 + 7));
}

TEST(DigestVectors, NistSha1MonteCarlo) {
  Bytes seed;
  int checked = 0;
  for (const auto& r : test::readVectorRecords(test::dataPath("SHA1Monte.rsp"))) {
    if (r.has("Seed")) seed = fromHex(r.at("Seed"));
    if (!r.has("MD")) continue;
    // FIPS 180 validation: MD_i = SHA1(MD_{i-3} || MD_{i-2} || MD_{i-1}), 1000 times per check.
    Bytes md[3] = {seed, seed, seed};
    for (int i = 3; i < 1003; ++i) {
      Bytes m = md[0];
      m.insert(m.end(), md[1].begin(), md[1].end());
      m.insert(m.end(), md[2].begin(), md[2].end());
      md[0] = md[1];
      md[1] = md[2];
      sha1(m.data(), m.size(), md[2].data());
    }
    seed = md[2];
    ASSERT_EQ(toHex(seed), r.at("MD")) << "COUNT " << r.at("COUNT");
    ++checked;
  }
  EXPECT_EQ(checked, 100);
}

TEST(DigestLength, CountersCarryIntoTheHighWord) {
  // 2^32 bits of SHA-1 input and 2^32 bytes of MD5 input are too slow to hash here; start the
  // counters just below the carry instead and check that the carry lands in the high half.
  Sha1Context s;
  sha1Init(s);
  s.lengthLow = 0xFFFFFFF8u;
  sha1Update(s, "ab", 2);
  EXPECT_EQ(s.lengthHigh, 1u);
  EXPECT_EQ(s.lengthLow, 8u);
  Md5Context m;
  md5Init(m);
  m.lengthLow = 0xFFFFFFFFu;
  md5Update(m, "ab", 2);
  EXPECT_EQ(m.lengthHigh, 1u);
  EXPECT_EQ(m.lengthLow, 1u);
}

}  // namespace
}  // namespace tessel
