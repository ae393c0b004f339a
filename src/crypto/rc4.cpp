// RC4 key schedule and keystream generation.
#include "crypto/rc4.h"

#include <utility>

namespace tessel {

void rc4Init(Rc4State& state, const std::uint8_t* key, std::size_t keyLength) noexcept {
  for (int k = 0; k < 256; ++k) state.s[k] = static_cast<std::uint8_t>(k);
  std::uint8_t j = 0;
  std::size_t next = 0;  // k % keyLength without a division per byte
  for (int k = 0; k < 256; ++k) {
    j = static_cast<std::uint8_t>(j + state.s[k] + key[next]);
    std::swap(state.s[k], state.s[j]);
    if (++next == keyLength) next = 0;
  }
  state.i = 0;
  state.j = 0;
}

void rc4Crypt(Rc4State& state, const std::uint8_t* in, std::uint8_t* out, std::size_t n) noexcept {
  std::uint8_t i = state.i, j = state.j;
  std::uint8_t* s = state.s;
  for (std::size_t k = 0; k < n; ++k) {
    i = static_cast<std::uint8_t>(i + 1);
    const std::uint8_t si = s[i];
    j = static_cast<std::uint8_t>(j + si);
    const std::uint8_t sj = s[j];
    s[i] = sj;
    s[j] = si;
    out[k] = static_cast<std::uint8_t>(in[k] ^ s[static_cast<std::uint8_t>(si + sj)]);
  }
  state.i = i;
  state.j = j;
}

void rc4Discard(Rc4State& state, std::size_t n) noexcept {
  std::uint8_t i = state.i, j = state.j;
  std::uint8_t* s = state.s;
  while (n--) {
    i = static_cast<std::uint8_t>(i + 1);
    j = static_cast<std::uint8_t>(j + s[i]);
    std::swap(s[i], s[j]);
  }
  state.i = i;
  state.j = j;
}

}  // namespace tessel
