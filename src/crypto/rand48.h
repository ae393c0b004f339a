// Random sources of the keyboard layout: the C library's 48-bit linear congruential generator
// and, for builds with TESSEL_STRONG_LAYOUT_RANDOM, the operating system's random source.
//
// The layout builder draws with lrand48() and reseeds with srand48(time(NULL)) after each
// shuffle; session creation draws keyMask and randomByte from the same stream. Both supported
// C libraries (glibc, bionic) provide lrand48/srand48, so the stream is the platform's own.
// The lrand48 stream is not a cryptographic source: secrets come from randomBytes().
#pragma once

#include <cstdint>

namespace tessel {

// TESSEL_STRONG_LAYOUT_RANDOM is a public definition of the core library, so every target that
// links it agrees on this value.
#ifdef TESSEL_STRONG_LAYOUT_RANDOM
constexpr bool kStrongLayoutRandom = true;
#else
constexpr bool kStrongLayoutRandom = false;
#endif

// A non-negative 31-bit value, as lrand48().
long rand48Next() noexcept;

// Seeds as srand48(seed): high 32 bits of the state from seed, low 16 bits 0x330E.
void rand48Seed(long seed) noexcept;

// Uniform in [0, bound), bound >= 1, from systemRandomBytes (crypto/random.h; rejection
// sampling, no modulo bias). Should the system source fail, the draw comes from the lrand48
// stream instead, so a sandbox that hides it gets the ordinary shuffle rather than none.
std::uint32_t osRandomBelow(std::uint32_t bound) noexcept;

// keyMask for a new session: lrand48() & 31 from the shared stream; in a strong-random build a
// value 1..31 from the operating system (never 0, so no table is ever stored unmasked).
std::uint8_t drawKeyMask() noexcept;

}  // namespace tessel
