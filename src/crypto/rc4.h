// RC4 stream cipher (the published "alleged RC4" algorithm).
//
// Used three ways: the in-memory seal of the typed text (fixed key, fresh schedule per call),
// the session key of the digital envelope (16 random bytes, with 512/625/768 keystream bytes
// dropped first), and the encrypted PIN code (the SHA-1 of the challenge code as key).
// The state holds key-derived material: callers wipe it (wipeObject) when done.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tessel {

struct Rc4State {
  std::uint8_t s[256];
  std::uint8_t i;
  std::uint8_t j;
};

// Key schedule. keyLength is 1..256 bytes.
void rc4Init(Rc4State& state, const std::uint8_t* key, std::size_t keyLength) noexcept;

// XORs n keystream bytes into in and writes out; in and out may be the same buffer.
void rc4Crypt(Rc4State& state, const std::uint8_t* in, std::uint8_t* out, std::size_t n) noexcept;

// Advances the keystream by n bytes without producing output.
void rc4Discard(Rc4State& state, std::size_t n) noexcept;

}  // namespace tessel
