// RSA public operation over hex texts, on BigNumber. The padded block (x) and its power are
// secrets of the caller: both are wiped before returning, on every path.
//
// A session encrypts under the same one or two moduli again and again, so the work that
// depends only on the modulus (reading its text, the Montgomery constants, R^2 mod n) is kept
// in a small cache keyed by the modulus text itself: a setter that replaces the key changes
// the text, which misses. Entries are immutable once made and handed out as shared pointers,
// so a thread may keep using an entry that another thread's miss has just evicted; the mutex
// guards only the slot array. Released entries are wiped.
#include "crypto/rsa.h"

#include <cstdlib>
#include <cstring>
#include <memory>
#include <mutex>
#include <new>

#include "crypto/bignum.h"
#include "crypto/wipe.h"

namespace tessel {
namespace {

constexpr std::uint32_t kPublicExponent = 65537;
constexpr int kCachedModuli = 8;

struct PreparedKey {
  char* text = nullptr;  // the modulus text as given
  std::size_t length = 0;
  BigNumber n{};
  std::size_t k = 0;                     // key length in bytes
  BnPreparedModulus* prepared = nullptr;  // null for an even modulus (not an RSA key)
};

void releaseKey(PreparedKey* key) noexcept {
  if (key == nullptr) return;
  wipeAndFree(key->text, key->length);
  bnReleasePrepared(key->prepared);
  wipeObject(key->n);
  delete key;
}

using KeyRef = std::shared_ptr<const PreparedKey>;

struct ModulusCache {
  std::mutex lock;
  KeyRef slots[kCachedModuli];  // most recently used first
  ~ModulusCache() {
    for (KeyRef& slot : slots) slot.reset();
  }
};

ModulusCache& cache() {
  static ModulusCache instance;
  return instance;
}

KeyRef findCached(const char* text, std::size_t length) noexcept {
  ModulusCache& c = cache();
  std::lock_guard<std::mutex> guard(c.lock);
  for (int i = 0; i < kCachedModuli && c.slots[i]; ++i) {
    const PreparedKey& key = *c.slots[i];
    if (key.length == length && std::memcmp(key.text, text, length) == 0) {
      KeyRef found = c.slots[i];
      for (int j = i; j > 0; --j) c.slots[j] = std::move(c.slots[j - 1]);
      c.slots[0] = found;
      return found;
    }
  }
  return nullptr;
}

// The cached set-up of a modulus text; null when the text is not a usable modulus (absent,
// not hex, zero, too wide) or memory runs out.
KeyRef preparedKey(const char* text) noexcept {
  if (text == nullptr) return nullptr;
  const std::size_t length = std::strlen(text);
  if (KeyRef hit = findCached(text, length)) return hit;
  PreparedKey* key = new (std::nothrow) PreparedKey();
  if (key == nullptr) return nullptr;
  key->text = static_cast<char*>(std::malloc(length + 1));
  const bool usable = key->text != nullptr && bnRead(text, 16, key->n) && key->n.count != 0;
  if (!usable) {
    releaseKey(key);
    return nullptr;
  }
  std::memcpy(key->text, text, length + 1);
  key->length = length;
  key->k = (bnBitLength(key->n) + 7) / 8;
  if (key->n.limbs[0] & 1u) {
    key->prepared = bnPrepareModulus(key->n);
    if (key->prepared == nullptr) {
      releaseKey(key);
      return nullptr;
    }
  }
  KeyRef made;
  try {
    made = KeyRef(key, releaseKey);
  } catch (...) {  // the control block could not be allocated; the deleter has run
    return nullptr;
  }
  ModulusCache& c = cache();
  std::lock_guard<std::mutex> guard(c.lock);
  // Another thread may have made the same entry meanwhile: keep one copy in the slots.
  int evicted = kCachedModuli - 1;
  for (int i = 0; i < kCachedModuli && c.slots[i]; ++i)
    if (c.slots[i]->length == length && std::memcmp(c.slots[i]->text, text, length) == 0) evicted = i;
  for (int j = evicted; j > 0; --j) c.slots[j] = std::move(c.slots[j - 1]);
  c.slots[0] = made;
  return made;
}

// y = x^65537 mod n for x read already; false when x is not below n.
bool publicPower(const PreparedKey& key, const BigNumber& x, BigNumber& y) noexcept {
  if (bnCompare(x, key.n) >= 0) return false;
  const BigNumber e = bnFromU64(kPublicExponent);
  return key.prepared != nullptr ? bnModExpPrepared(x, e, *key.prepared, y) : bnModExp(x, e, key.n, y);
}

}  // namespace

std::size_t rsaModulusBytes(const char* modulusHex) noexcept {
  const KeyRef key = preparedKey(modulusHex);
  return key ? key->k : 0;
}

SecureBuffer rsaPublicHex(const char* modulusHex, const char* dataHex) noexcept {
  static const char kDigits[] = "0123456789ABCDEF";
  SecureBuffer out;
  if (modulusHex == nullptr || dataHex == nullptr) return out;
  const KeyRef key = preparedKey(modulusHex);
  if (!key) return out;
  BigNumber x, y;
  if (bnRead(dataHex, 16, x) && publicPower(*key, x, y)) {
    // Exactly 2k digits: y < n < 2^(8k), so the leading zeros are part of the fixed width.
    const std::size_t k = key->k;
    out = SecureBuffer::allocate(2 * k);
    if (out)
      for (std::size_t d = 0; d < 2 * k; ++d) {
        const std::size_t nibble = 2 * k - 1 - d;
        out.c_str()[d] = kDigits[(y.limbs[nibble / 8] >> (4 * (nibble % 8))) & 15u];
      }
  }
  wipeObject(y);
  wipeObject(x);
  return out;
}

SecureBuffer rsaPublicBytes(const char* modulusHex, const std::uint8_t* block, std::size_t n) noexcept {
  SecureBuffer out;
  if (modulusHex == nullptr || block == nullptr) return out;
  const KeyRef key = preparedKey(modulusHex);
  if (!key || n > 4 * static_cast<std::size_t>(kBigNumberLimbs)) return out;
  BigNumber x = bnZero(), y = bnZero();
  for (std::size_t i = 0; i < n; ++i) {
    const std::size_t shift = n - 1 - i;  // byte position from the least significant end
    x.limbs[shift / 4] |= static_cast<std::uint32_t>(block[i]) << (8 * (shift % 4));
  }
  x.count = static_cast<std::uint32_t>((n + 3) / 4);
  while (x.count > 0 && x.limbs[x.count - 1] == 0) --x.count;
  if (publicPower(*key, x, y)) {
    const std::size_t k = key->k;
    out = SecureBuffer::allocate(k);
    if (out)
      for (std::size_t i = 0; i < k; ++i) {
        const std::size_t shift = k - 1 - i;
        out.data()[i] = static_cast<std::uint8_t>(y.limbs[shift / 4] >> (8 * (shift % 4)));
      }
  }
  wipeObject(y);
  wipeObject(x);
  return out;
}

}  // namespace tessel
