// Fuzzes the session as the managed side drives it: the input bytes decode into up to 96 steps
// on four named sessions (create, destroy, every setter, surface changes, layout builds under
// the session lock, touches inside and outside the grid, bursts of taps, clears, a prefilled
// text to reach the 4092-character capacity cheaply, and every output getter). No GL: the
// surface-changed step is the geometry part only. Two steps reach what apps do by accident:
// a crowd of other names that fills the table and evicts sessions in circular order, and a
// burst of taps on one thread while a second thread reads outputs of the same session, both
// pinned exclusively as the entry points pin them.
//
// After every step, for every live session:
//   - length <= 4092, maxLength <= 4092, and every byte from `length` to the end of the
//     4093-byte buffer is zero (nothing was written past the text);
//   - the resting buffer is RC4 of the text under the seal key (an independent RC4 computes
//     it), the text read inside a ContentGuard has exactly `length` non-NUL bytes, and the
//     guard puts the sealed bytes back as they were;
//   - steps that are not edits (setters, getters, geometry, layout, touches that are not a
//     release) leave length and buffer untouched.
// Output getters: the result is present exactly when lastError is 0, and lastError is a code
// with a message. Content envelopes are opened (deterministic random source) and their payload
// checked against the unsealed text; the encrypted PIN code is decrypted and compared with it;
// the measure value is 32 lower-case hex digits exactly when there is content; the degree is
// one of the six letters and the verify code lies in 0..-6.
#include <fuzzer/FuzzedDataProvider.h>

#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <mutex>
#include <string>
#include <thread>

#include "crypto/codec.h"
#include "crypto/error_table.h"
#include "crypto/moduli.h"
#include "crypto/rsa.h"
#include "crypto/sha1.h"
#include "fuzz_support.h"
#include "input/layout.h"
#include "crypto/rand48.h"
#include "input/touch.h"
#include "session/output.h"
#include "session/sealed_text.h"
#include "session/session.h"
#include "session/settings.h"

namespace {

using tessel::ContentStore;
using tessel::KeyboardSession;
using tessel::SecureBuffer;

constexpr int kSessions = 4;
const char* const kNames[kSessions] = {"password", "pin", "login", "otp"};
constexpr int kMaxSteps = 96;
constexpr int kMaxTapsPerInput = 600;
constexpr int kMaxBurst = 64;

const char* const kPatterns[] = {
    "[:print:]*", "[0-9]*", "[:digit:]{0,6}", ".*", "[a-z]+", "[:alnum:]{0,8}",
    "[:print:]*[:digit:]+[:print:]*", "([a-z]|[0-9])*", "[:^space:]*+", "",
};
const char* const kTimestamps[] = {nullptr, "", "20240101120000", "1700000000"};

enum Op : std::uint8_t {
  kCreate, kDestroy, kAccepts, kLimits, kKbdType, kKbdStyle, kModes, kStrings, kHashRandom,
  kKeys, kEccKey, kSurface, kBuild, kTouch, kBurst, kClear, kContentOutput, kPinCode,
  kMeasure, kDegree, kVerify, kPrefill, kCrowd, kTwoThreads,
  kTapFirst,  // every value from here on is a tap
  kOpCount = kTapFirst + 8,
};

// A session's text area at rest: its length and the whole (sealed) buffer.
struct Resting {
  bool taken = false;
  std::uint16_t length = 0;
  std::uint8_t buffer[tessel::kContentBufferSize];

  void take(const KeyboardSession& s) {
    taken = true;
    length = s.content->length;
    std::memcpy(buffer, s.content->plaintext, sizeof buffer);
  }
  bool same(const KeyboardSession& s) const {
    return length == s.content->length && std::memcmp(buffer, s.content->plaintext, sizeof buffer) == 0;
  }
};

// Unseals (checking the seal on the way) and returns the text.
std::string unsealedText(KeyboardSession& s) {
  ContentStore& store = *s.content;
  const std::size_t length = store.length;
  std::uint8_t sealed[tessel::kContentBufferSize];
  std::memcpy(sealed, store.plaintext, length);
  std::string text;
  {
    tessel::ContentGuard guard(store);
    const std::uint8_t* plain = guard.text();
    FUZZ_CHECK(strnlen(reinterpret_cast<const char*>(plain), tessel::kContentBufferSize) == length);
    text.assign(reinterpret_cast<const char*>(plain), length);
    if (length != 0) {
      std::uint8_t expected[tessel::kContentBufferSize];
      std::memcpy(expected, plain, length);
      tessel_fuzz::MiniRc4 rc4(tessel::kSealKey, sizeof tessel::kSealKey);
      rc4.crypt(expected, length);
      FUZZ_CHECK(std::memcmp(expected, sealed, length) == 0);
    }
  }
  FUZZ_CHECK(store.length == length);
  FUZZ_CHECK(std::memcmp(store.plaintext, sealed, length) == 0);
  return text;
}

void checkSession(KeyboardSession& s) {
  const ContentStore& store = *s.content;
  const std::size_t length = store.length;
  FUZZ_CHECK(length <= tessel::kContentCapacity);
  FUZZ_CHECK(s.maxLength <= static_cast<std::int16_t>(tessel::kContentCapacity));
  static const std::uint8_t kZeros[tessel::kContentBufferSize] = {};
  FUZZ_CHECK(std::memcmp(store.plaintext + length, kZeros, tessel::kContentBufferSize - length) == 0);
  unsealedText(s);
}

// Destroys a session and frees the three strings a session's release deliberately leaves
// allocated (wiped), so that leak detection stays on for everything else.
void destroyAndReap(int handle) {
  KeyboardSession* s = tessel::sessionAt(handle);
  if (s == nullptr) return;
  char* kept[3] = {s->eccKey, s->content->hashRandomSuffix, s->content->dictionaryFilter};
  tessel::destroySession(handle);
  for (char* p : kept) std::free(p);
}

bool validLastError(tessel::ErrorCode code) {
  return std::strcmp(tessel::lastErrorText(code), "Error message does not exist!") != 0 &&
         std::strcmp(tessel::lastErrorText(code), "Unknown error") != 0;
}

class Driver {
 public:
  explicit Driver(FuzzedDataProvider& in) : in_(in) {}

  void run() {
    for (int step = 0; step < kMaxSteps && in_.remaining_bytes() > 0; ++step) {
      const auto op = static_cast<Op>(in_.ConsumeIntegralInRange<int>(0, kOpCount - 1));
      const int which = in_.ConsumeIntegralInRange(0, kSessions - 1);
      char* kept[kSessions][3] = {};
      for (int k = 0; k < kSessions; ++k) {
        KeyboardSession* s = live(k);
        before_[k].taken = false;
        if (s == nullptr) continue;
        before_[k].take(*s);
        kept[k][0] = s->eccKey;
        kept[k][1] = s->content->hashRandomSuffix;
        kept[k][2] = s->content->dictionaryFilter;
      }
      const bool edits = apply(op, which);
      reapEvicted(kept);
      if (trace_) {
        KeyboardSession* s = live(which);
        std::fprintf(stderr, "step %2d op %2d session %d length %d lastError %d\n", step, static_cast<int>(op), which,
                     s ? static_cast<int>(s->content->length) : -1, s ? static_cast<int>(s->content->lastError) : 0);
      }
      for (int k = 0; k < kSessions; ++k) {
        KeyboardSession* s = live(k);
        if (s == nullptr) continue;
        checkSession(*s);
        if (!(edits && k == which) && before_[k].taken) FUZZ_CHECK(before_[k].same(*s));
      }
    }
  }

 private:
  KeyboardSession* live(int k) const { return handles_[k] < 0 ? nullptr : tessel::sessionAt(handles_[k]); }

  // A fuzzed text, or null for one input byte in sixteen.
  const char* text(std::string& storage, std::size_t maxLength) {
    if (in_.ConsumeIntegralInRange(0, 15) == 0) return nullptr;
    storage = in_.ConsumeRandomLengthString(maxLength);
    return storage.c_str();
  }

  float coordinate(float extent) {
    switch (in_.ConsumeIntegralInRange(0, 7)) {
      case 0: return std::numeric_limits<float>::quiet_NaN();
      case 1: return in_.ConsumeBool() ? std::numeric_limits<float>::infinity()
                                       : -std::numeric_limits<float>::infinity();
      case 2: return in_.ConsumeFloatingPoint<float>();
      case 3: return extent * in_.ConsumeProbability<float>();
      default: return (static_cast<float>(in_.ConsumeIntegralInRange(-2, 41)) + 0.5f) * extent / 40.0f;
    }
  }

  // Down and up on one of 40 x 16 points of the grid; true if the release hit done.
  bool tap(KeyboardSession& s, float fx, float fy) {
    const float x = (fx + 0.5f) * static_cast<float>(s.surfaceWidth) / 40.0f;
    const float y = (fy + 0.5f) * static_cast<float>(s.surfaceHeight) / 16.0f;
    FUZZ_CHECK(tessel::touch(s, 0, x, y) == -1);
    const int up = tessel::touch(s, 1, x, y);
    FUZZ_CHECK(up == -1 || up == 0 || up == 1);
    return up == 1;
  }

  void checkContentOutput(KeyboardSession& s, int type, const char* timestamp) {
    const std::string plain = unsealedText(s);
    const std::string suffix = s.content->hashRandomSuffix ? s.content->hashRandomSuffix : "";
    const SecureBuffer out = tessel::contentOutput(s, type, timestamp);
    const tessel::ErrorCode code = s.content->lastError;
    FUZZ_CHECK(validLastError(code));
    FUZZ_CHECK(static_cast<bool>(out) == (code == tessel::kOk));
    if (timestamp == nullptr) FUZZ_CHECK(code == tessel::kErrTimestampMissing);
    const bool keysSet = type == 48 || (s.encryPlat != nullptr && s.encryPlat[0] != '\0');
    if (timestamp != nullptr && !keysSet) FUZZ_CHECK(code == tessel::kErrEncModulusMissing);
    const std::string dispatched = plain + suffix;
    char mode = 0;
    const int shape = tessel_fuzz::hashedShape(dispatched, &mode);
    if (timestamp != nullptr && keysSet && shape < 0) FUZZ_CHECK(code == tessel::kErrTextFormat);
    if (type == 48 && timestamp != nullptr && shape >= 0) FUZZ_CHECK(code == tessel::kOk);
    if (!out) return;

    const std::string inner = tessel_fuzz::openEnvelope(
        out.c_str(), out.size(), tessel::rsaModulusBytes(tessel::builtinDefaultModulus()), 512);
    const std::string ts = timestamp;
    FUZZ_CHECK(inner.size() >= ts.size() + 2 && tessel_fuzz::isStrengthLetter(inner[0]));
    FUZZ_CHECK(inner.compare(1, ts.size(), ts) == 0 && inner[1 + ts.size()] == ':');
    const std::string payload = inner.substr(ts.size() + 2);
    if (type == 47) {
      FUZZ_CHECK(payload.size() == 2 * tessel::rsaModulusBytes(s.encryPlat) && tessel_fuzz::isHexOf(payload, true));
    } else if (shape == 0) {
      FUZZ_CHECK(payload == dispatched);
    } else {
      FUZZ_CHECK(payload.size() == (mode == 'S' ? 16u : 32u) && tessel_fuzz::isHexOf(payload, false));
    }
  }

  void checkPinCode(KeyboardSession& s) {
    const std::string plain = unsealedText(s);
    const SecureBuffer out = tessel::encryptedPinCode(s);
    const tessel::ErrorCode code = s.content->lastError;
    FUZZ_CHECK(validLastError(code));
    FUZZ_CHECK(static_cast<bool>(out) == (code == tessel::kOk));
    if (s.content->challengeCode == nullptr) {
      FUZZ_CHECK(code == tessel::kErrChallengeCodeEmpty);
      return;
    }
    if (plain.empty()) {
      FUZZ_CHECK(code == tessel::kErrPinCodeEncryption);
      return;
    }
    FUZZ_CHECK(code == tessel::kOk);
    SecureBuffer raw = tessel::base64Decode(out.c_str(), out.size());
    FUZZ_CHECK(raw && raw.size() == plain.size());
    std::uint8_t key[20];
    tessel::sha1(s.content->challengeCode, std::strlen(s.content->challengeCode), key);
    tessel_fuzz::MiniRc4 rc4(key, sizeof key);
    rc4.crypt(raw.data(), raw.size());
    FUZZ_CHECK(std::memcmp(raw.data(), plain.data(), plain.size()) == 0);
  }

  // Applies one step; true when it may edit the text of session `which`.
  bool apply(Op op, int which) {
    if (op == kCreate) {
      const int handle = tessel::createSession(kNames[which]);
      FUZZ_CHECK(handle >= 0 && tessel::sessionAt(handle) != nullptr);
      if (handles_[which] >= 0) FUZZ_CHECK(handle == handles_[which]);  // same name, same slot
      handles_[which] = handle;
      return true;
    }
    if (op == kCrowd) {
      crowd(in_.ConsumeIntegralInRange(1, 2 * tessel::kSessionSlots));
      return true;
    }
    KeyboardSession* sp = live(which);
    if (sp == nullptr) return false;
    KeyboardSession& s = *sp;
    std::string a, b;
    switch (op) {
      case kDestroy:
        destroyAndReap(handles_[which]);
        FUZZ_CHECK(tessel::sessionAt(handles_[which]) == nullptr);
        handles_[which] = -1;
        return true;
      case kAccepts:
        if (in_.ConsumeBool()) {
          tessel::setAccepts(s, in_.PickValueInArray(kPatterns));
        } else {
          tessel::setAccepts(s, text(a, 48));
        }
        return false;
      case kLimits:
        tessel::setMaxLength(s, in_.ConsumeIntegral<std::int16_t>());
        tessel::setMinLength(s, in_.ConsumeIntegral<std::int16_t>());
        return false;
      case kKbdType:
        tessel::setKbdType(s, in_.ConsumeBool() ? in_.ConsumeIntegralInRange<std::int16_t>(0, 2)
                                                : in_.ConsumeIntegral<std::int16_t>());
        return false;
      case kKbdStyle:
        tessel::setKbdStyle(s, in_.ConsumeIntegralInRange<std::int16_t>(-5, 5));
        tessel::setKbdRandom(s, in_.ConsumeBool());
        return false;
      case kModes: {
        const auto v = in_.ConsumeIntegral<std::int16_t>();
        switch (in_.ConsumeIntegralInRange(0, 7)) {
          case 0: tessel::setSwitchMode(s, v); break;
          case 1: tessel::setFinishMode(s, v); break;
          case 2: tessel::setMode(s, v); break;
          case 3: tessel::setKbdMode(s, v); break;
          case 4: tessel::setPopMode(s, v & 1); break;
          case 5: tessel::setEncryptType(s, static_cast<std::int8_t>(v)); break;
          case 6: tessel::setContentType(s, v); break;
          default: tessel::setSwitchMode(s, v & 1); break;
        }
        return false;
      }
      case kStrings:
        switch (in_.ConsumeIntegralInRange(0, 3)) {
          case 0: tessel::setChallengeCode(s, text(a, 32)); break;
          case 1: tessel::setKbdFactor(s, text(a, 32)); break;
          case 2: tessel::setAlgorithmCode(s, text(a, 8)); break;
          default: tessel::setDictionaryFilter(s, text(a, 64)); break;
        }
        return false;
      case kHashRandom: {
        static const char* const kPrefixes[] = {"1:", "2:", "3:", "1", ""};
        const char* salt = text(a, 24);
        b = std::string(in_.PickValueInArray(kPrefixes)) + (salt ? salt : "");
        tessel::setHashRandom(s, salt == nullptr && in_.ConsumeBool() ? nullptr : b.c_str());
        return false;
      }
      case kKeys: {
        const int slot = in_.ConsumeIntegralInRange(0, 2);
        const char* key = slot == 0 ? tessel::builtinModulus(0, 0)
                          : slot == 1 ? tessel::builtinModulus(46, 1)
                                      : text(a, 600);
        const bool isDer = slot == 2 && in_.ConsumeBool();
        switch (in_.ConsumeIntegralInRange(0, 3)) {
          case 0: tessel::setEncryPlat(s, key, isDer); break;
          case 1: tessel::setAppPlat(s, key, isDer); break;
          case 2: tessel::setEncryPlatBlob(s, key); break;
          default: tessel::setAppPlatBlob(s, key); break;
        }
        return false;
      }
      case kEccKey: {
        const char* x = text(a, 80);
        const char* y = text(b, 80);
        const int stored = tessel::setEccKey(s, x, y);
        FUZZ_CHECK(stored == ((x != nullptr && y != nullptr) ? 1 : 0));
        if (stored) FUZZ_CHECK(s.eccKey != nullptr && std::string(s.eccKey) == std::string(x) + "," + y);
        return false;
      }
      case kSurface: {
        const int width = in_.ConsumeIntegralInRange(1, 4000);
        const int height = in_.ConsumeIntegralInRange(1, 4000);
        const int variant = in_.ConsumeIntegralInRange(-1, 3);
        tessel::applySurfaceGeometry(s, width, height, variant);
        return false;
      }
      case kBuild: {
        std::lock_guard<std::recursive_mutex> guard(s.lock);
        tessel::buildLayout(s);
        tessel::rand48Seed(20240101);  // keep the next build's shuffle reproducible
        return false;
      }
      case kTouch: {
        const int action = in_.ConsumeIntegralInRange(-1, 3);
        const float x = coordinate(static_cast<float>(s.surfaceWidth));
        const float y = coordinate(static_cast<float>(s.surfaceHeight));
        const int r = tessel::touch(s, action, x, y);
        FUZZ_CHECK(r == -1 || r == 0 || r == 1);
        if (action != 1) FUZZ_CHECK(r == -1);
        return action == 1;
      }
      case kBurst: {
        const int count = in_.ConsumeIntegralInRange(1, kMaxBurst);
        const float fx = static_cast<float>(in_.ConsumeIntegralInRange(0, 39));
        const float fy = static_cast<float>(in_.ConsumeIntegralInRange(0, 15));
        for (int k = 0; k < count && taps_ < kMaxTapsPerInput; ++k, ++taps_) tap(s, fx, fy);
        return true;
      }
      case kPrefill: {
        // Puts n copies of one printable character in place as a sealed text, the state that
        // n accepted keys leave, without paying n whole-text matches: the capacity edge stays
        // within reach of a few taps.
        const auto n = static_cast<std::size_t>(in_.ConsumeIntegralInRange(0, static_cast<int>(tessel::kContentCapacity)));
        const auto ch = static_cast<std::uint8_t>(in_.ConsumeIntegralInRange(0x20, 0x7E));
        ContentStore& store = *s.content;
        tessel::clearContent(store);
        std::memset(store.plaintext, ch, n);
        store.length = static_cast<std::uint16_t>(n);
        if (n != 0) tessel::applySeal(store);
        return true;
      }
      case kClear:
        tessel::clearContent(*s.content);
        FUZZ_CHECK(tessel::contentLength(s) == 0);
        return true;
      case kContentOutput: {
        const int type = in_.ConsumeBool() ? 48 : 47;
        const char* ts = in_.ConsumeBool() ? in_.PickValueInArray(kTimestamps) : text(a, 40);
        checkContentOutput(s, type, ts);
        return false;
      }
      case kPinCode:
        checkPinCode(s);
        return false;
      case kMeasure: {
        const SecureBuffer m = tessel::computeMeasureValue(s);
        FUZZ_CHECK(static_cast<bool>(m) == (s.content->length != 0));
        if (m) FUZZ_CHECK(m.size() == 32 && tessel_fuzz::isHexOf(std::string(m.c_str(), m.size()), false));
        return false;
      }
      case kDegree:
        FUZZ_CHECK(tessel_fuzz::isStrengthLetter(tessel::sessionDegree(s)));
        return false;
      case kVerify: {
        const int v = tessel::sessionVerify(s);
        FUZZ_CHECK(v <= 0 && v >= -6);
        return false;
      }
      case kTwoThreads: {
        const int count = in_.ConsumeIntegralInRange(1, kMaxBurst);
        const float fx = static_cast<float>(in_.ConsumeIntegralInRange(0, 39));
        const float fy = static_cast<float>(in_.ConsumeIntegralInRange(0, 15));
        const int handle = handles_[which];
        std::thread reader([handle, count] {
          for (int k = 0; k < count; ++k) {
            tessel::SessionRef r(handle, tessel::Access::kExclusive);
            if (!r) return;
            const SecureBuffer m = tessel::computeMeasureValue(*r);
            FUZZ_CHECK(static_cast<bool>(m) == (r->content->length != 0));
            if (k % 8 == 0) tessel::contentOutput(*r, 48, "20240101120000");
          }
        });
        for (int k = 0; k < count && taps_ < kMaxTapsPerInput; ++k, ++taps_) {
          tessel::SessionRef r(handle, tessel::Access::kExclusive);
          tap(*r, fx, fy);
        }
        reader.join();
        return true;
      }
      default: {
        if (taps_ >= kMaxTapsPerInput) return false;
        ++taps_;
        const float fx = static_cast<float>(in_.ConsumeIntegralInRange(0, 39));
        const float fy = static_cast<float>(in_.ConsumeIntegralInRange(0, 15));
        tap(s, fx, fy);
        FUZZ_CHECK(tessel::contentLength(s) == s.content->length);
        return true;
      }
    }
  }

  // Creates `count` sessions of names no step uses; past 20 they evict in circular order.
  void crowd(int count) {
    for (int n = 0; n < count; ++n) {
      const std::string name = "crowd-" + std::to_string(crowded_++);
      const int handle = tessel::createSession(name.c_str());
      FUZZ_CHECK(handle >= 0 && std::strcmp(tessel::sessionAt(handle)->sessionName, name.c_str()) == 0);
    }
  }

  // A tracked session whose slot no longer holds its name was evicted (by a crowd, or by a
  // create on a full table): the three strings a release keeps, taken before the step, are
  // freed here so that leak detection stays on.
  void reapEvicted(char* const (&kept)[kSessions][3]) {
    for (int k = 0; k < kSessions; ++k) {
      KeyboardSession* s = live(k);
      if (handles_[k] < 0 || (s != nullptr && std::strcmp(s->sessionName, kNames[k]) == 0)) continue;
      for (char* p : kept[k]) std::free(p);
      handles_[k] = -1;
    }
  }

  FuzzedDataProvider& in_;
  int crowded_ = 0;
  int handles_[kSessions] = {-1, -1, -1, -1};
  int taps_ = 0;
  Resting before_[kSessions];
  // TESSEL_FUZZ_TRACE=1 prints each step (for reading a crash or checking a seed).
  const bool trace_ = std::getenv("TESSEL_FUZZ_TRACE") != nullptr;
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size > 8192) return 0;
  tessel_fuzz::installPatternRandom();
  tessel::rand48Seed(1);
  FuzzedDataProvider in(data, size);
  Driver(in).run();
  for (int slot = 0; slot < tessel::kSessionSlots; ++slot) destroyAndReap(slot);
  return 0;
}
