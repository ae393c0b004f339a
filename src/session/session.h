// Sessions: the 20-slot table, one KeyboardSession per keyboard shown, and its ContentStore.
//
// The handle the managed side holds is the slot index 0..19. A session owns its ContentStore
// and every string it keeps (malloc'd copies, wiped when replaced or released). The typed text
// lives in ContentStore::plaintext and is RC4-sealed whenever no operation is running and the
// length is non-zero (PlaintextSeal, below); ContentGuard is how every operation gets at it.
//
// Threads: any entry point may arrive on any thread. Three rules keep that safe:
//   - Lifetime: every call works on a SessionRef, which pins the session it found. Destroy and
//     eviction unlink the slot at once; the session is wiped and freed by whoever drops the
//     last pin (the table's own, or a call still in progress).
//   - The text: setters, touches and every operation that unseals the text hold `opLock` for
//     the whole call (SessionRef with Access::kExclusive), so nobody sees or reseals half-sealed
//     bytes and no string is replaced while an operation reads it.
//   - Frames and surface callbacks never take `opLock`: they read only RelaxedField values
//     (relaxed_field.h), which may be a mix of old and new, never torn. `lock` is taken only
//     around layout building and texture upload in the surface-created handlers.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <mutex>

#include "crypto/error_table.h"
#include "crypto/rc4.h"
#include "session/relaxed_field.h"
#include "session/texture_sets.h"

namespace tessel {

constexpr int kSessionSlots = 20;
constexpr std::size_t kContentCapacity = 4092;      // characters the text can hold
constexpr std::size_t kContentBufferSize = 4093;    // plus the terminator
constexpr std::size_t kKeyCount = 26;               // character keys of a full layout
constexpr std::size_t kPadKeyCount = 10;
constexpr std::size_t kHighlightFlags = 9;

// The 12-byte key of the in-memory seal.
extern const std::uint8_t kSealKey[12];

class PatternEngine;

struct ContentStore {
  std::uint8_t scratch[kContentBufferSize] = {};
  std::uint8_t plaintext[kContentBufferSize] = {};  // sealed while idle and length != 0
  RelaxedField<std::uint16_t> length;               // read by the pop-up's dot count
  std::uint8_t randomByte = 0;
  ErrorCode lastError = 0;
  char* challengeCode = nullptr;
  Rc4State cipherState = {};                        // schedule of the seal key, set at creation
  std::uint32_t contentType = 0;                    // required classes for verification
  char* kbdFactor = nullptr;
  std::uint8_t kbdFactorKind = 0;
  char* algorithmCode = nullptr;                    // "000" by default
  char* hashRandomSuffix = nullptr;
  char* dictionaryFilter = nullptr;
};

struct KeyboardSession {
  char* sessionName = nullptr;
  RelaxedField<std::uint8_t> layoutBuilt;
  char* accepts = nullptr;
  const PatternEngine* acceptsEngine = nullptr;     // accepts compiled once by setAccepts
  std::int16_t minLength = 0;
  std::int16_t maxLength = 0;                       // never above kContentCapacity
  RelaxedField<std::uint8_t> kbdRandom;
  std::uint16_t kbdType = 0;
  RelaxedField<std::int16_t> kbdPage;
  RelaxedField<std::uint16_t> kbdMode;
  std::uint16_t mode = 1;
  RelaxedField<std::uint16_t> popMode{1};
  RelaxedField<std::uint16_t> switchMode;
  RelaxedField<std::uint16_t> finishMode;
  RelaxedField<std::uint32_t> surfaceMode;
  RelaxedField<std::int32_t> surfaceWidth, surfaceHeight;
  RelaxedField<std::int32_t> columnCount, rowCount;
  RelaxedField<float> keyAspect, columnFraction, rowFraction, gapFraction, rowFractionCopy;
  RelaxedField<float> keyWidth, keyHeight;
  std::uint8_t keyMask = 0;                         // 0..31; layout bytes are character - keyMask
  RelaxedField<std::uint8_t> letters[kKeyCount];
  RelaxedField<std::uint8_t> symbolsLower[kKeyCount];
  RelaxedField<std::uint8_t> symbolsUpper[kKeyCount];
  RelaxedField<std::uint8_t> padDigits[kPadKeyCount];
  RelaxedField<std::uint32_t> currentKbdType;       // 0 full, 1 pad with ".", 2 digits-only pad
  RelaxedField<std::uint32_t> symbolPage;
  RelaxedField<std::uint32_t> anyKeyReleased;
  RelaxedField<std::uint32_t> shiftOn;
  RelaxedField<std::uint32_t> touchColumn, touchRow;
  RelaxedField<std::uint32_t> keyReleased[kHighlightFlags];  // 1 = up, 0 = held
  std::uint8_t encryptType = 0;
  char* appPlat = nullptr;
  char* encryPlat = nullptr;
  char* eccKey = nullptr;
  ContentStore* content = nullptr;                  // set for the whole life of the session
  std::recursive_mutex lock;                        // layout build + texture upload
  std::mutex opLock;                                // one text operation or setter at a time
  std::atomic<int> pins{1};                         // the table's reference + calls in progress
  // This keyboard's own texture names, one set per surface (render/textures.h): two keyboards
  // whose surfaces share one GL context each draw their own.
  MainTextureSet mainTextures;
  PopTextureSet popTextures;
  PopTopTextureSet popTopTextures;
};

// ---- the table

// Finds the session named `name` (byte comparison) or creates one in the first free slot; when
// all 20 are taken, the slot after the one created last is evicted (circular order).
// Returns the slot, or -1 for a null name or when memory runs out.
int createSession(const char* name) noexcept;

// Unlinks the session in slot `handle` at once (the slot is free for the next create) and drops
// the table's pin; out-of-range handles and empty slots are ignored. Calls still working on the
// session finish first; the last of them frees it.
void destroySession(int handle) noexcept;

// The live session of a slot, unpinned: null for a negative, out-of-range or empty handle.
// Only for a caller that is the one thread able to destroy or evict it (a tool, a test, a
// fuzzer driving one thread); the entry points use SessionRef.
KeyboardSession* sessionAt(int handle) noexcept;

enum class Access {
  kShared,     // frames, surface callbacks, the length: relaxed fields only
  kExclusive,  // setters, touches, outputs: also holds the session's opLock
};

// The live session of a slot, pinned for the lifetime of this object; null for a negative,
// out-of-range or empty handle, so an empty slot is refused exactly like a negative one.
// Every entry point starts here. Movable, not copyable.
class SessionRef {
 public:
  SessionRef() noexcept = default;
  explicit SessionRef(int handle, Access access = Access::kShared) noexcept;
  SessionRef(SessionRef&& other) noexcept;
  SessionRef& operator=(SessionRef&& other) noexcept;
  SessionRef(const SessionRef&) = delete;
  SessionRef& operator=(const SessionRef&) = delete;
  ~SessionRef() { reset(); }

  KeyboardSession* get() const noexcept { return session_; }
  KeyboardSession& operator*() const noexcept { return *session_; }
  KeyboardSession* operator->() const noexcept { return session_; }
  explicit operator bool() const noexcept { return session_ != nullptr; }
  void reset() noexcept;

 private:
  KeyboardSession* session_ = nullptr;
  bool exclusive_ = false;
};

// ---- the sealed text

// RC4 under kSealKey over the first `length` bytes, in place, from a copy of the schedule made
// at creation (cipherState), wiped after use. Sealing and unsealing are the same operation.
void applySeal(ContentStore& store) noexcept;

// Scoped access to the plaintext: unseals on entry if length != 0 and, on every way out,
// reseals if length (after the work) != 0. All reads and edits of the text go through one, and
// only while the session's opLock is held (SessionRef with Access::kExclusive).
class ContentGuard {
 public:
  explicit ContentGuard(ContentStore& store) noexcept;
  ~ContentGuard();
  ContentGuard(const ContentGuard&) = delete;
  ContentGuard& operator=(const ContentGuard&) = delete;
  std::uint8_t* text() noexcept { return store_.plaintext; }
  std::size_t length() const noexcept { return store_.length; }

 private:
  ContentStore& store_;
};

// length = 0 and both 4093-byte areas zeroed.
void clearContent(ContentStore& store) noexcept;

// The content length, sign-extended from 16 bits, without unsealing or locking.
int contentLength(const KeyboardSession& session) noexcept;

// ---- owned strings (malloc'd, wiped before free)

// Replaces *field by a copy of text (null text stores null). False, leaving *field null, when
// the copy cannot be allocated.
bool replaceOwnedText(char*& field, const char* text) noexcept;
// Wipes and frees *field and sets it to null.
void releaseOwnedText(char*& field) noexcept;

}  // namespace tessel
