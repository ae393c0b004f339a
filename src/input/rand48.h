// The 48-bit linear congruential generator behind key-row shuffling and session masks.
//
// The layout builder draws with lrand48() and reseeds with srand48(time(NULL)) after each
// shuffle; session creation draws keyMask and randomByte from the same stream. Where libc
// provides lrand48/srand48 (glibc, bionic) they are used, so the stream is the platform's;
// elsewhere an equivalent generator (a = 0x5DEECE66D, c = 0xB, 48-bit state, top 31 bits out)
// stands in. Not a cryptographic source: secrets come from randomBytes().
#pragma once

namespace tessel {

// A non-negative 31-bit value, as lrand48().
long rand48Next() noexcept;

// Seeds as srand48(seed): high 32 bits of the state from seed, low 16 bits 0x330E.
void rand48Seed(long seed) noexcept;

}  // namespace tessel
