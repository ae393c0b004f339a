// The digital envelope byte for byte: with the random source replaced by a known sequence, the
// device's output must equal the one assembled with OpenSSL alone (raw RSA of the expected padded
// block, RC4 after the type's drop, the SIMPLEBLOB layout, base64). Then the system source with
// its calls faked. (The RSA helpers alone: crypto_padding_test and crypto_rsa_test.)
#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <string>
#include <vector>

#include "output/dispatcher.h"
#include "output/envelope.h"
#include "crypto/random.h"
#include "support/dispatch_oracle.h"

namespace tessel::test {
namespace {

// A full-period byte sequence (x -> 5x + 1 mod 256): a zero byte falls in the filler.
std::vector<Bytes> gRequests;
std::uint8_t gNext = 0;
bool sequenceSource(std::uint8_t* buffer, std::size_t n) {
  for (std::size_t k = 0; k < n; ++k, gNext = static_cast<std::uint8_t>(gNext * 5 + 1)) buffer[k] = gNext;
  gRequests.emplace_back(buffer, buffer + n);
  return true;
}

class KnownRandom : public ::testing::Test {
 protected:
  void SetUp() override {
    gNext = 0x2b;
    setRandomSourceForTesting(sequenceSource);
  }
  void TearDown() override { setRandomSourceForTesting(nullptr); }
};

// The PKCS#1 type 2 block, its filler as the padding routine uses it: zero bytes become 0x01.
Bytes pkcs1Block(const Bytes& filler, const Bytes& message) {
  Bytes block = {0x00, 0x02};
  for (std::uint8_t b : filler) block.push_back(b ? b : 1);
  block.push_back(0x00);
  block.insert(block.end(), message.begin(), message.end());
  return block;
}
std::string text(const SecureBuffer& b) { return b ? std::string(b.c_str(), b.size()) : std::string("<absent>"); }

TEST_F(KnownRandom, EnvelopeMatchesOpenSslAssemblyForEachDrop) {
  const std::string modulus = appKey().modulusHex();
  const char* const keys[2] = {modulus.c_str(), nullptr};
  // "0123456789" rates 'W' under both the default (type 0) and the general (type 1) rating.
  const struct {
    int type;
    std::size_t drop;
    std::string content;  // what the envelope must hold
  } cases[] = {{0, 512, "W1700000000:0123456789"}, {1, 625, "W1700000000:0123456789"}, {88, 768, "0123456789"}};
  for (const auto& c : cases) {
    gRequests.clear();
    SecureBuffer out;
    ASSERT_EQ(encryptionDispatch(c.type, keys, &out, "0123456789", "1700000000"), 0) << c.type;
    ASSERT_EQ(gRequests.size(), 2u) << "one request for the RC4 key, one for the PKCS#1 filler";
    ASSERT_EQ(gRequests[0].size(), 16u);
    ASSERT_EQ(gRequests[1].size(), 128u - 16 - 3);
    const Bytes wrapped = opensslRawEncrypt(appKey(), pkcs1Block(gRequests[1], gRequests[0]));
    EXPECT_EQ(text(out), opensslEnvelope(appKey(), gRequests[0], c.drop, c.content, wrapped)) << "type " << c.type;
  }
  // A long content under the 2048-bit key: base64 without line breaks, and the server opens it.
  const std::string content(3000, 'z'), encModulus = encKey().modulusHex();
  SecureBuffer out;
  ASSERT_EQ(digitalEnvelope(kEnvelopeDrop, encModulus.c_str(), bytesOf(content).data(), content.size(), &out), 0);
  EXPECT_EQ(text(out).find_first_of("\r\n"), std::string::npos);
  std::string opened, error;
  ASSERT_TRUE(server::openEnvelope(text(out), encKey(), kEnvelopeDrop, &opened, &error)) << error;
  EXPECT_EQ(opened, content);
}

// ---- the system source, its calls faked: each getrandom or read gives at most the count its
// script names (-1: fails with the next errno, 0: end of file), from the byte sequence 1, 2, 3, ...
struct Script { std::vector<int> results = {}, errnos = {}; std::size_t call = 0; };
struct FakeOs { Script getrandom; int openResult = 7; Script reads; int opens = 0, closes = 0; std::uint8_t next = 1; } gOs;
long play(Script& script, void* buffer, std::size_t n) {
  if (script.call >= script.results.size()) return 0;
  const int result = script.results[script.call];
  errno = script.call < script.errnos.size() ? script.errnos[script.call] : EIO;
  if (++script.call, result < 0) return -1;
  const std::size_t k = std::min(n, static_cast<std::size_t>(result));
  for (std::size_t i = 0; i < k; ++i) static_cast<std::uint8_t*>(buffer)[i] = gOs.next++;
  return static_cast<long>(k);
}
const RandomSystemCalls kFakeCalls{
    +[](const char* path, int) { return ++gOs.opens, std::string(path) == "/dev/urandom" ? gOs.openResult : -1; },
    +[](int fd, void* buffer, std::size_t n) -> ssize_t { return fd == 7 ? play(gOs.reads, buffer, n) : -2; },
    +[](int) { return ++gOs.closes, 0; },
    +[](void* buffer, std::size_t n, unsigned flags) { return flags == 0 ? play(gOs.getrandom, buffer, n) : -2; }};

TEST(RandomSource, SystemCallFailuresGiveError9AndNeverAPartKey) {
  Bytes counting(16);
  for (std::size_t i = 0; i < 16; ++i) counting[i] = static_cast<std::uint8_t>(i + 1);
  const Script absent{{-1}, {ENOSYS}};
  const struct {
    const char* name;
    Script getrandom;
    int open;
    Script reads;
    bool ok;
    int opens;  // /dev/urandom is opened only when getrandom is absent or refused
  } cases[] = {
      {"getrandom", {{16}}, 7, {}, true, 0},
      {"getrandom interrupted, short, then complete", {{-1, 5, 11}, {EINTR}}, 7, {}, true, 0},
      {"getrandom fails otherwise: no fallback", {{5, -1}, {0, EFAULT}}, 7, {{16}}, false, 0},
      {"getrandom refused by seccomp: /dev/urandom", {{-1}, {EPERM}}, 7, {{16}}, true, 1},
      {"getrandom absent, open fails", absent, -1, {{16}}, false, 1},
      {"getrandom absent, read fails", absent, 7, {{-1}, {EIO}}, false, 1},
      {"getrandom absent, interrupted, then read", absent, 7, {{-1, 16}, {EINTR}}, true, 1},
      {"getrandom absent, short reads are completed", absent, 7, {{5, 5, 1, 100}}, true, 1},
      {"getrandom absent, end of file before the request is full", absent, 7, {{5, 0}}, false, 1},
  };
  const std::string modulus = appKey().modulusHex(), encModulus = encKey().modulusHex();
  const char* const keys[2] = {modulus.c_str(), encModulus.c_str()};
  setRandomSystemCallsForTesting(&kFakeCalls);
  for (const auto& c : cases) {
    // randomBytes itself; on failure also the envelope key (type 0) and the triple-DES key (38).
    for (int type : c.ok ? std::vector<int>{-1} : std::vector<int>{-1, 0, 38}) {
      gOs = FakeOs{c.getrandom, c.open, c.reads};
      Bytes key(16, 0xEE);
      SecureBuffer out;
      const int code = type < 0 ? (randomBytes(key.data(), key.size()) ? 0 : 9)
                                : encryptionDispatch(type, keys, &out, "1234", "1700000000");
      EXPECT_EQ(code, c.ok ? 0 : 9) << c.name << ", type " << type;
      EXPECT_FALSE(out) << c.name;
      if (type < 0) { EXPECT_EQ(key, c.ok ? counting : Bytes(16, 0)) << c.name; }
      EXPECT_EQ(gOs.opens, c.opens) << c.name << ", type " << type;
      EXPECT_EQ(gOs.closes, c.open < 0 ? 0 : c.opens) << c.name << ", type " << type;
    }
  }
  setRandomSystemCallsForTesting(nullptr);
  // The real device: two requests differ and are not all zero.
  Bytes a(64), b(64);
  ASSERT_TRUE(randomBytes(a.data(), a.size()) && randomBytes(b.data(), b.size()));
  EXPECT_NE(a, b);
  EXPECT_NE(a, Bytes(64, 0));
}

}  // namespace
}  // namespace tessel::test
