// A typed password must never be left readable in freed heap memory (plain, hex or salted hash)
// by typing, any output operation or destroy; between operations the content holds only sealed
// bytes. malloc/free are wrapped over glibc's __libc_* entry points: while armed, free() scans the
// block for the needles (kept in static arrays only). Under a sanitizer the suite skips.
#include <gtest/gtest.h>
#include <openssl/evp.h>

#include <execinfo.h>
#include <malloc.h>

#include <atomic>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "input/layout.h"
#include "session/output.h"
#include "session/sealed_text.h"
#include "session/session.h"
#include "session/settings.h"
#include "server/password_check.h"
#include "support/dispatch_oracle.h"
#include "support/keyboard_typist.h"

#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
#define TESSEL_HYGIENE_SANITIZED 1
#elif defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer) || __has_feature(memory_sanitizer)
#define TESSEL_HYGIENE_SANITIZED 1
#endif
#endif

namespace {

constexpr std::size_t kMaxNeedle = 64;
struct Needle {
  const char* what;
  unsigned char bytes[kMaxNeedle];
  std::size_t size;
};
Needle g_needles[12];
std::atomic<int> g_needleCount{0};

constexpr int kMaxHits = 16;
constexpr int kMaxFrames = 32;
struct Hit {
  int needle;
  std::size_t blockSize;
  int depth;
  void* frames[kMaxFrames];
};
Hit g_hits[kMaxHits];
std::atomic<int> g_hitCount{0};
std::atomic<bool> g_armed{false};
std::atomic<long> g_scannedBlocks{0};
thread_local bool t_inScan = false;

[[maybe_unused]] void scanFreedBlock(void* p) noexcept {
  if (p == nullptr || !g_armed.load(std::memory_order_relaxed) || t_inScan) return;
  t_inScan = true;
  const std::size_t size = malloc_usable_size(p);
  g_scannedBlocks.fetch_add(1, std::memory_order_relaxed);
  const int needles = g_needleCount.load(std::memory_order_relaxed);
  for (int i = 0; i < needles; ++i) {
    if (memmem(p, size, g_needles[i].bytes, g_needles[i].size) == nullptr) continue;
    const int slot = g_hitCount.fetch_add(1);
    if (slot < kMaxHits) {
      g_hits[slot].needle = i;
      g_hits[slot].blockSize = size;
      g_hits[slot].depth = backtrace(g_hits[slot].frames, kMaxFrames);
    }
  }
  t_inScan = false;
}

}  // namespace

#ifndef TESSEL_HYGIENE_SANITIZED
extern "C" {
void* __libc_malloc(std::size_t size);
void __libc_free(void* p);
void* __libc_calloc(std::size_t count, std::size_t size);
void* __libc_realloc(void* p, std::size_t size);

// glibc declares these noexcept (__THROW) in C++; the definitions must match.
void* malloc(std::size_t size) noexcept { return __libc_malloc(size); }
void* calloc(std::size_t count, std::size_t size) noexcept { return __libc_calloc(count, size); }
void free(void* p) noexcept {
  scanFreedBlock(p);
  __libc_free(p);
}
// Moving reallocations go through free() so the old block is scanned like any other.
void* realloc(void* p, std::size_t size) noexcept {
  if (p == nullptr) return __libc_malloc(size);
  if (!g_armed.load(std::memory_order_relaxed)) return __libc_realloc(p, size);
  const std::size_t old = malloc_usable_size(p);
  if (size <= old) return p;
  void* moved = __libc_malloc(size);
  if (moved == nullptr) return nullptr;
  std::memcpy(moved, p, old);
  free(p);
  return moved;
}
}  // extern "C"
#endif  // TESSEL_HYGIENE_SANITIZED

namespace tessel::test {
namespace {

// Typeable on the standard layout: both letter cases, digits and both symbol pages.
constexpr char kPassword[] = "Qz7#Vx!k9Lm2?Pw";
constexpr std::size_t kPasswordLength = sizeof kPassword - 1;
constexpr char kSalt[] = "NaCl-4711";
constexpr int kWidth = 1080, kHeight = 720;

char g_md5Hex[33];

void hexInto(const void* in, std::size_t n, char* out, const char* digits = "0123456789abcdef") {
  for (std::size_t i = 0; i < n; ++i) {
    const unsigned char b = static_cast<const unsigned char*>(in)[i];
    out[2 * i] = digits[b >> 4];
    out[2 * i + 1] = digits[b & 15];
  }
}

void addNeedle(const char* what, const void* bytes, std::size_t size) {
  const int i = g_needleCount.load();
  ASSERT_LT(i, static_cast<int>(sizeof g_needles / sizeof g_needles[0]));
  ASSERT_LE(size, kMaxNeedle);
  g_needles[i].what = what;
  std::memcpy(g_needles[i].bytes, bytes, size);
  g_needles[i].size = size;
  g_needleCount.store(i + 1);
}

// OpenSSL's MD5 (the independent oracle); called only while no scan is armed.
void opensslMd5(const void* data, std::size_t n, unsigned char out[16]) {
  ASSERT_EQ(EVP_Digest(data, n, out, nullptr, EVP_md5(), nullptr), 1);
}

// A password prefix (partial copies too), its upper-case hex (a hex-encoded padded block),
// MD5(password) as hex, and the 16 hex digits of MD5(md5hex || salt) that every mode keeps.
void buildNeedles() {
  g_needleCount.store(0);
  addNeedle("password (first 8 characters)", kPassword, 8);
  char hex[16];
  hexInto(kPassword, 8, hex, "0123456789ABCDEF");
  addNeedle("password as upper-case hex", hex, 16);

  unsigned char md5[16];
  opensslMd5(kPassword, kPasswordLength, md5);
  hexInto(md5, 16, g_md5Hex);
  g_md5Hex[32] = 0;
  addNeedle("MD5(password), lower-case hex", g_md5Hex, 32);

  char salted[32 + sizeof kSalt];
  std::memcpy(salted, g_md5Hex, 32);
  std::memcpy(salted + 32, kSalt, sizeof kSalt - 1);
  unsigned char md5Salted[16];
  opensslMd5(salted, 32 + sizeof kSalt - 1, md5Salted);
  char saltedHex[32];
  hexInto(md5Salted, 16, saltedHex);
  addNeedle("MD5(md5hex || salt), hex digits 8..24", saltedHex + 8, 16);
}

// Arms the free() scan for the lifetime of the object; reports every hit on disarm.
class ScanScope {
 public:
  explicit ScanScope(const char* what) : what_(what), scannedBefore_(g_scannedBlocks.load()) {
    g_hitCount.store(0);
    g_armed.store(true);
  }
  long scanned() const { return g_scannedBlocks.load() - scannedBefore_; }
  ~ScanScope() {
    g_armed.store(false);
    const int hits = g_hitCount.load();
    for (int i = 0; i < hits && i < kMaxHits; ++i) {
      const Hit& h = g_hits[i];
      std::string where;
      char** symbols = backtrace_symbols(h.frames, h.depth);
      for (int f = 2; f < h.depth && symbols != nullptr; ++f) where += std::string("\n    ") + symbols[f];
      std::free(symbols);
      ADD_FAILURE() << what_ << ": a freed heap block of " << h.blockSize << " bytes still held "
                    << g_needles[h.needle].what << "; freed at (addr2line -Cfe <test> <+offset>):" << where;
    }
  }

 private:
  const char* what_;
  long scannedBefore_;
};

// Between operations: RC4(password) under the seal key, zeros after, no plaintext in either area.
void expectSealed(const KeyboardSession& s, const char* after) {
  SCOPED_TRACE(after);
  const ContentStore& store = *s.content;
  ASSERT_EQ(store.length.load(), kPasswordLength);
  const Bytes keystream = opensslRc4(bytesOf("QN-Tesselate"), Bytes(kPasswordLength, 0));
  std::size_t mismatches = 0, nonZeroTail = 0;
  for (std::size_t i = 0; i < kPasswordLength; ++i) {
    if (store.plaintext[i] != static_cast<unsigned char>(kPassword[i] ^ keystream[i])) ++mismatches;
  }
  for (std::size_t i = kPasswordLength; i < kContentBufferSize; ++i) nonZeroTail += store.plaintext[i] != 0;
  EXPECT_EQ(mismatches, 0u) << "resting bytes are not RC4(text) under the seal key";
  EXPECT_EQ(nonZeroTail, 0u) << "bytes after the sealed text are not zero";
  EXPECT_EQ(memmem(store.plaintext, kContentBufferSize, kPassword, 4), nullptr) << "plaintext at rest";
  EXPECT_EQ(memmem(store.scratch, kContentBufferSize, kPassword, 4), nullptr) << "plaintext in scratch";
}

bool sameBytes(const SecureBuffer& b, const char* expected, std::size_t n) {
  return b && b.size() == n && std::memcmp(b.data(), expected, n) == 0;
}

class Hygiene : public ::testing::Test {
 protected:
  static void SetUpTestSuite() {
    void* frames[4];
    backtrace(frames, 4);  // loads the unwinder now, not from inside free()
  }
  void SetUp() override {
#ifdef TESSEL_HYGIENE_SANITIZED
    GTEST_SKIP() << "a sanitizer owns the allocator; this suite runs in the plain build";
#endif
    buildNeedles();
    encModulus_ = encKey().modulusHex();  // loads the key (OpenSSL) before any scan
  }

  // As ScopedKeyboard sets it up, but kept here so that destroy can be scanned too.
  int createKeyboard(const char* name) {
    const int handle = createSession(name);
    KeyboardSession* s = sessionAt(handle);
    if (s == nullptr) return -1;
    setAccepts(*s, "[[:print:]]*");
    setMaxLength(*s, 64);
    setMinLength(*s, 6);
    setContentType(*s, 7);
    setDictionaryFilter(*s, "123456,qwerty,password");
    setEncryPlat(*s, encModulus_.c_str(), false);
    setChallengeCode(*s, "challenge-0042");
    buildLayout(*s);
    applySurfaceGeometry(*s, kWidth, kHeight, 0);
    return handle;
  }

  // One character at a time: no heap copy of the password in the test.
  void typePassword(KeyboardSession& s) {
    Typist typist(s, KeyGrid(kWidth, kHeight));
    for (std::size_t i = 0; i < kPasswordLength; ++i) ASSERT_TRUE(typist.type(std::string(1, kPassword[i])));
  }

  std::string encModulus_;
};

// The detector itself: a block holding a needle, freed while armed, must be reported.
TEST_F(Hygiene, ScannerSeesANeedleInAFreedBlock) {
  auto* block = static_cast<char*>(std::calloc(200, 1));
  std::memcpy(block + 100, g_md5Hex, 32);
  g_hitCount.store(0);
  g_armed.store(true);
  std::free(block);
  g_armed.store(false);
  EXPECT_EQ(g_hitCount.load(), 1);
  g_hitCount.store(0);
}

struct OutputStep {
  const char* what;
  std::function<bool(KeyboardSession&)> run;  // true when the operation produced its result
  bool freesTemporaries;                      // allocates and frees on the way (proves the scan ran)
};

TEST_F(Hygiene, TypedPasswordNeverReachesFreedHeap) {
  const int handle = createKeyboard("hygiene");
  ASSERT_GE(handle, 0);
  KeyboardSession& s = *sessionAt(handle);

  {
    ScanScope scan("typing (with one character deleted)");
    typePassword(s);
    // A typo and its deletion: the delete path reseals too.
    Typist typist(s, KeyGrid(kWidth, kHeight));
    ASSERT_TRUE(typist.type(std::string(1, 'j')));
    ASSERT_EQ(typist.tap(KeyGrid(kWidth, kHeight).deleteKey()), 0);
  }
  expectSealed(s, "typing");

  const std::vector<OutputStep> steps = {
      {"contentOutput 48", [](KeyboardSession& k) { return !!contentOutput(k, 48, "20240101120000"); }, true},
      {"contentOutput 47", [](KeyboardSession& k) { return !!contentOutput(k, 47, "20240101120000"); }, true},
      {"encryptedPinCode", [](KeyboardSession& k) { return !!encryptedPinCode(k); }, true},
      {"computeMeasureValue", [](KeyboardSession& k) { return sameBytes(computeMeasureValue(k), g_md5Hex, 32); }, true},
      {"sessionDegree", [](KeyboardSession& k) { return sessionDegree(k) != 'E'; }, false},
      {"sessionVerify", [](KeyboardSession& k) { return sessionVerify(k) == 0; }, false},
  };
  // No suffix, then the two salted modes (a suffix can be replaced but never removed).
  const char* const hashRandoms[] = {nullptr, "1:NaCl-4711", "2:NaCl-4711"};
  for (const char* hashRandom : hashRandoms) {
    if (hashRandom != nullptr) setHashRandom(s, hashRandom);
    for (const OutputStep& step : steps) {
      const std::string what = std::string(step.what) + " with hash random " + (hashRandom ? hashRandom : "none");
      SCOPED_TRACE(what);
      bool produced = false;
      {
        ScanScope scan(what.c_str());
        produced = step.run(s);
        if (step.freesTemporaries) { EXPECT_GT(scan.scanned(), 0) << "no freed block was scanned"; }
      }
      EXPECT_TRUE(produced) << "lastError " << static_cast<int>(s.content->lastError);
      expectSealed(s, what.c_str());
    }
  }

  {
    ScanScope scan("destroySession");
    destroySession(handle);
  }
  EXPECT_EQ(sessionAt(handle), nullptr);
}

// The server side: loading a key file and opening a type-48 output that carries the password
// itself leave neither the key's PEM text nor the password in freed heap.
TEST_F(Hygiene, ServerOpenerLeavesNoKeyOrPasswordInFreedHeap) {
  static const char kPemLine[] = "gxnc2cB1SAB/WC7vgINLjh4dqLjqgdaeKLRpvzWrbtZOU7tk";  // from the key's body
  addNeedle("PEM text of the private key", kPemLine, sizeof kPemLine - 1);
  const std::string output = opensslEnvelope(appKey(), Bytes(16, 7), 512, std::string("S1700000000:") + kPassword);
  ScanScope scan("tessel_server: loadPemFile, openOutput, matchesPassword, ~Opened");
  server::PrivateKey key;
  std::string error;
  ASSERT_TRUE(key.loadPemFile(dataPath("dispatch_app_key_1024.pem"), &error)) << error;
  server::OpenKeys keys;
  keys.app = &key;
  keys.expectedTimestamp = "1700000000";
  auto opened = std::make_unique<server::Opened>();
  ASSERT_TRUE(server::openOutput(48, output, keys, opened.get(), &error)) << error;
  EXPECT_TRUE(server::matchesPassword(48, *opened, kPassword, "", 'S'));
  opened.reset();
  EXPECT_GT(scan.scanned(), 0);
}

}  // namespace
}  // namespace tessel::test
