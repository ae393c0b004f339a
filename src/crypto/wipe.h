// Zeroing of secrets that the compiler may not elide.
//
// Every buffer that held plaintext, a key, a cipher state, a padded block or a hex/base64
// form of any of them goes through secureWipe before it is freed or goes out of scope, on
// success and failure paths alike. wipeObject takes the size from the object itself so a
// context or a fixed array cannot be wiped short.
#pragma once

#include <cstddef>
#include <cstdlib>
#include <type_traits>

namespace tessel {

// Writes n zero bytes at p through a volatile pointer and a compiler barrier, so the stores
// survive dead-store elimination even right before free(). p may be null when n is 0.
void secureWipe(void* p, std::size_t n) noexcept;

// Wipes a whole object or array: a context, a key schedule, a fixed buffer.
template <typename T>
inline void wipeObject(T& object) noexcept {
  static_assert(std::is_trivially_copyable<T>::value, "wipe only plain data");
  secureWipe(&object, sizeof(T));
}

// Wipes the NUL-terminated text at s (its strlen bytes) and frees it; null is accepted.
void wipeAndFreeText(char* s) noexcept;

// Wipes n bytes at p and frees it; null is accepted.
void wipeAndFree(void* p, std::size_t n) noexcept;

}  // namespace tessel
