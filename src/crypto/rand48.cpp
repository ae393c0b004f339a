// lrand48/srand48 behind one lock; uniform draws from the system random source.
#include "crypto/rand48.h"

#include <cstdint>
#include <cstdlib>
#include <mutex>

#include "crypto/random.h"

namespace tessel {

namespace {
// lrand48/srand48 keep one unguarded process-wide state (glibc: MT-Unsafe race:drand48), and
// the stream is drawn from several threads: session creation on the UI thread, layout builds
// on each surface's GL thread (under the session lock, which two sessions do not share).
std::mutex g_libcMutex;
}  // namespace

long rand48Next() noexcept {
  std::lock_guard<std::mutex> guard(g_libcMutex);
  return ::lrand48();
}

void rand48Seed(long seed) noexcept {
  std::lock_guard<std::mutex> guard(g_libcMutex);
  ::srand48(seed);
}

std::uint32_t osRandomBelow(std::uint32_t bound) noexcept {
  // Draws below 2^32 mod bound are rejected, so every residue has the same number of preimages.
  const std::uint32_t reject = static_cast<std::uint32_t>(0u - bound) % bound;
  for (;;) {
    std::uint32_t r = 0;
    if (!systemRandomBytes(reinterpret_cast<std::uint8_t*>(&r), sizeof r)) {
      r = static_cast<std::uint32_t>(rand48Next()) << 16 ^ static_cast<std::uint32_t>(rand48Next());
    }
    if (r >= reject) return r % bound;
  }
}

std::uint8_t drawKeyMask() noexcept {
  if (kStrongLayoutRandom) return static_cast<std::uint8_t>(1 + osRandomBelow(31));
  return static_cast<std::uint8_t>(rand48Next() & 31);
}

}  // namespace tessel
