// Session setters: every validation rule as a table row; public keys from OpenSSL as DER and blob.
#include <gtest/gtest.h>

#include <cstring>
#include <functional>
#include <memory>
#include <set>
#include <string>
#include <vector>

#include "session/session.h"
#include "session/settings.h"
#include "support/dispatch_oracle.h"
#include "support/keyboard_typist.h"

namespace tessel {
namespace {

using test::Bytes;

class SettingsTest : public ::testing::Test {
 protected:
  void SetUp() override { renew(); }
  // The old session's release frees the three strings destroy leaves.
  void renew() {
    kb_.reset();
    kb_ = std::make_unique<test::ScopedKeyboard>("settings", 1080, 720);
    s_ = &kb_->session();
  }

  std::unique_ptr<test::ScopedKeyboard> kb_;
  KeyboardSession* s_ = nullptr;
};

// Each row gives its values in order to a fresh session and reads the field after each (kRead:
// read only); a refused value keeps the last.

constexpr long long kRead = -99999;

struct NumberCase {
  const char* name;
  std::function<void(KeyboardSession&, std::int16_t)> set;
  std::function<long long(const KeyboardSession&)> read;
  std::vector<std::pair<long long, long long>> steps;  // value given, value read afterwards
};

const NumberCase kNumberCases[] = {
    {"minLength", setMinLength, [](auto& s) { return s.minLength; }, {{5, 5}, {-1, 5}, {0, 0}}},
    {"maxLength", setMaxLength, [](auto& s) { return s.maxLength; },
     {{6, 6}, {-6, 6}, {4092, 4092}, {4093, 4092}, {32767, 4092}, {0, 0}}},
    {"kbdRandom", [](auto& s, std::int16_t v) { setKbdRandom(s, v != 0); }, [](auto& s) { return s.kbdRandom.load(); },
     {{1, 1}, {0, 0}}},
    {"popMode", [](auto& s, std::int16_t v) { setPopMode(s, v != 0); }, [](auto& s) { return s.popMode.load(); },
     {{kRead, 1}, {0, 0}}},
    {"kbdType", setKbdType, [](auto& s) { return s.kbdType; }, {{1, 1}, {-1, 0xFFFF}}},
    {"currentKbdType", setKbdType, [](auto& s) { return s.currentKbdType.load(); }, {{2, 2}, {-1, 0xFFFFFFFFLL}}},
    {"stylePage", setKbdStyle, [](auto& s) { return s.kbdPage.load(); }, {{3, 1}, {-1, 0}, {-3, -1}}},
    {"styleShift", setKbdStyle, [](auto& s) { return s.shiftOn.load(); }, {{3, 1}, {2, 0}, {-1, 0xFFFFFFFFLL}}},
    {"kbdMode", setKbdMode, [](auto& s) { return s.kbdMode.load(); }, {{-2, 0xFFFE}}},
    {"switchMode", setSwitchMode, [](auto& s) { return s.switchMode.load(); }, {{1, 1}, {5, 0}, {1, 1}, {-1, 0}}},
    {"finishMode", setFinishMode, [](auto& s) { return s.finishMode.load(); }, {{1, 1}, {2, 0}}},
    {"mode", setMode, [](auto& s) { return s.mode; },
     {{kRead, 1}, {2, 1}, {0, 0}, {4, 4}, {3, 4}, {-4, 4}, {static_cast<std::int16_t>(0x8001), 4}, {1, 1}}},
};

TEST_F(SettingsTest, NumericSettersValidateAndStore) {
  for (const auto& c : kNumberCases) {
    renew();
    for (const auto& step : c.steps) {
      if (step.first != kRead) c.set(*s_, static_cast<std::int16_t>(step.first));
      EXPECT_EQ(c.read(*s_), step.second) << c.name << " after " << step.first;
    }
  }
}

struct TextCase {
  const char* name;
  std::function<void(KeyboardSession&)> apply;
  std::function<const char*(const KeyboardSession&)> read;
  const char* expected;
};

const char* hashSuffix(const KeyboardSession& s) { return s.content->hashRandomSuffix; }
const char* challenge(const KeyboardSession& s) { return s.content->challengeCode; }
const char* dictionary(const KeyboardSession& s) { return s.content->dictionaryFilter; }
const char* accepts(const KeyboardSession& s) { return s.accepts; }
const char* ecc(const KeyboardSession& s) { return s.eccKey; }
const char* encryPlat(const KeyboardSession& s) { return s.encryPlat; }
const char* appPlat(const KeyboardSession& s) { return s.appPlat; }

const TextCase kTextCases[] = {
    {"hashRandomS", [](auto& s) { setHashRandom(s, "1:abc"); }, hashSuffix, "::::::::::abc::::::::::S"},
    {"hashRandomF", [](auto& s) { setHashRandom(s, "2:x"); }, hashSuffix, "::::::::::x::::::::::F"},
    {"hashRandomBadKind", [](auto& s) { setHashRandom(s, "3:abc"); }, hashSuffix, nullptr},
    {"hashRandomTooShort", [](auto& s) { setHashRandom(s, "1:"); }, hashSuffix, nullptr},
    {"hashRandomKeepsOld", [](auto& s) { setHashRandom(s, "1:abc"); setHashRandom(s, "9:zz"); }, hashSuffix, "::::::::::abc::::::::::S"},
    {"hashRandomReplaces", [](auto& s) { setHashRandom(s, "1:abc"); setHashRandom(s, "2:de"); }, hashSuffix, "::::::::::de::::::::::F"},
    {"challengeEmptyKeeps", [](auto& s) { setChallengeCode(s, "C0DE"); setChallengeCode(s, ""); }, challenge, "C0DE"},
    {"dictionaryEmpty", [](auto& s) { setDictionaryFilter(s, "pw"); setDictionaryFilter(s, ""); }, dictionary, ""},
    {"dictionaryNullKeeps", [](auto& s) { setDictionaryFilter(s, "pw"); setDictionaryFilter(s, nullptr); }, dictionary, "pw"},
    {"acceptsNullClears", [](auto& s) { setAccepts(s, "[0-9]*"); setAccepts(s, nullptr); }, accepts, nullptr},
    {"eccLongY", [](auto& s) { setEccKey(s, "1A", "0123456789ABCDEF0123456789"); }, ecc, "1A,0123456789ABCDEF0123456789"},
    {"eccEmptyX", [](auto& s) { setEccKey(s, "", "FF"); }, ecc, ",FF"},
    {"eccNullYKeeps", [](auto& s) { setEccKey(s, "1", "2"); setEccKey(s, "3", nullptr); }, ecc, "1,2"},
    {"appModulusAsGiven", [](auto& s) { setAppPlat(s, "AB CD", false); }, appPlat, "AB CD"},
    {"derRefusedClears", [](auto& s) { setEncryPlat(s, "ABCD", false); setEncryPlat(s, "3003020101", true); }, encryPlat, nullptr},
    {"blobNullKeeps", [](auto& s) { setAppPlat(s, "ABCD", false); setAppPlatBlob(s, nullptr); }, appPlat, "ABCD"},
    {"blobShorterThanHeaderClears", [](auto& s) { setEncryPlat(s, "ABCD", false); setEncryPlatBlob(s, "0602"); }, encryPlat, nullptr},
    {"blobBadHexClears", [](auto& s) { setEncryPlat(s, "ABCD", false); setEncryPlatBlob(s, "12G4"); }, encryPlat, nullptr},
};

TEST_F(SettingsTest, TextSettersValidateAndStore) {
  for (const auto& c : kTextCases) {
    SCOPED_TRACE(c.name);
    renew();
    c.apply(*s_);
    EXPECT_STREQ(c.read(*s_), c.expected);
  }
}

// What destroy leaves allocated, counted through the sanitizer's allocator hooks: exactly the
// three strings at their sizes, whatever was set before (replace paths included).

#if defined(__SANITIZE_ADDRESS__)
#define TESSEL_COUNTS_BLOCKS 1
#elif defined(__has_feature)
#if __has_feature(address_sanitizer)
#define TESSEL_COUNTS_BLOCKS 1
#endif
#endif
#ifdef TESSEL_COUNTS_BLOCKS
extern "C" int __sanitizer_install_malloc_and_free_hooks(void (*)(const volatile void*, std::size_t),
                                                         void (*)(const volatile void*));
struct LiveBlock {
  const volatile void* p;
  std::size_t size;
};
LiveBlock gLive[256];
int gLiveCount = 0;
bool gCounting = false;
void onMalloc(const volatile void* p, std::size_t size) {
  if (gCounting && gLiveCount < 256) gLive[gLiveCount++] = {p, size};
}
void onFree(const volatile void* p) {
  for (int i = 0; gCounting && i < gLiveCount; ++i) {
    if (gLive[i].p == p) {
      gLive[i] = gLive[--gLiveCount];
      return;
    }
  }
}
#endif

TEST(SessionRelease, DestroyLeavesExactlyTheThreeStrings) {
#ifndef TESSEL_COUNTS_BLOCKS
  GTEST_SKIP() << "counts allocations through the sanitizer's allocator hooks";
#else
  static const int installed = __sanitizer_install_malloc_and_free_hooks(onMalloc, onFree);
  ASSERT_NE(installed, 0);
  gLiveCount = 0;
  gCounting = true;
  const int handle = createSession("release-set");
  KeyboardSession& s = *sessionAt(handle);
  setAccepts(s, "[0-9]*");
  setAppPlat(s, "C0FFEE", false);
  setEncryPlat(s, "C0FFEE", false);
  setChallengeCode(s, "C0DE");
  setKbdFactor(s, "2xyz");
  setAlgorithmCode(s, "123");
  setEccKey(s, "0A", "0B");
  setEccKey(s, "1234", "56789");  // "1234,56789": 11 bytes
  setHashRandom(s, "1:s4lt");
  setHashRandom(s, "2:salt-x");  // 10 colons, "salt-x", 10 colons, "F": 28 bytes
  setDictionaryFilter(s, "pw");
  setDictionaryFilter(s, "password|qwerty");  // 16 bytes
  destroySession(handle);
  gCounting = false;
  std::multiset<std::size_t> sizes;
  for (int i = 0; i < gLiveCount; ++i) sizes.insert(gLive[i].size);
  EXPECT_EQ(sizes, (std::multiset<std::size_t>{11, 16, 28}));
  // Freed here, so that the leak checker needs no suppression for them.
  for (int i = 0; i < gLiveCount; ++i) std::free(const_cast<void*>(gLive[i].p));
#endif
}

// PUBLICKEYBLOB header (bType 6, bVersion 2, CALG_RSA_KEYX, "RSA1", bit length, exponent), then
// the key bytes reversed, as hex with line breaks and blanks.
std::string blobAround(const std::string& derHex, int bits) {
  Bytes blob = {0x06, 0x02, 0x00, 0x00, 0x00, 0xA4, 0x00, 0x00, 'R', 'S', 'A', '1'};
  for (int i = 0; i < 4; ++i) blob.push_back(static_cast<std::uint8_t>(bits >> (8 * i)));
  for (std::uint8_t b : {0x01, 0x00, 0x01, 0x00}) blob.push_back(b);
  Bytes der = test::fromHex(derHex);
  blob.insert(blob.end(), der.rbegin(), der.rend());
  const std::string hex = test::toHex(blob);
  std::string spaced;
  for (std::size_t i = 0; i < hex.size(); ++i) {
    spaced += hex[i];
    if (i % 64 == 63) spaced += "\r\n";
    else if (i % 8 == 7) spaced += ' ';
  }
  return spaced;
}

// DER and blobs yield the modulus; a blob setter given a text returns 1; a blob around the bare
// modulus instead of the DER is refused and clears the key.
TEST_F(SettingsTest, DerAndBlobKeysYieldTheModulusOrClear) {
  const std::pair<const server::PrivateKey*, int> keys[] = {{&test::appKey(), 1024}, {&test::encKey(), 2048}};
  for (const auto& [key, bits] : keys) {
    const std::string der = test::opensslPublicDerHex(*key), modulus = key->modulusHex(), blob = blobAround(der, bits);
    setEncryPlat(*s_, der.c_str(), true);
    ASSERT_NE(s_->encryPlat, nullptr) << bits;
    EXPECT_EQ(std::string(s_->encryPlat), modulus) << bits;
    EXPECT_EQ(setEncryPlatBlob(*s_, blob.c_str()), 1);
    EXPECT_EQ(setAppPlatBlob(*s_, blob.c_str()), 1);
    ASSERT_TRUE(s_->encryPlat && s_->appPlat) << bits;
    EXPECT_EQ(std::string(s_->encryPlat), modulus) << bits;
    EXPECT_EQ(std::string(s_->appPlat), modulus) << bits;
  }
  EXPECT_EQ(setEncryPlatBlob(*s_, blobAround(test::appKey().modulusHex(), 1024).c_str()), 1);
  EXPECT_EQ(s_->encryPlat, nullptr);
  EXPECT_EQ(setEncryPlatBlob(*s_, ""), 1);
  EXPECT_EQ(setEccKey(*s_, "1", "2"), 1);
}

}  // namespace
}  // namespace tessel
