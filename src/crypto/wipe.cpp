// The single wipe primitive of the library: explicit_bzero where libc has it (glibc, bionic),
// a volatile byte loop elsewhere, followed by a compiler barrier in both cases.
#include "crypto/wipe.h"

#include <cstring>
#include <string.h>

namespace tessel {

void secureWipe(void* p, std::size_t n) noexcept {
  if (p == nullptr || n == 0) return;
#if defined(__GLIBC__) && (__GLIBC__ > 2 || (__GLIBC__ == 2 && __GLIBC_MINOR__ >= 25))
  explicit_bzero(p, n);
#else
  volatile unsigned char* v = static_cast<volatile unsigned char*>(p);
  while (n--) *v++ = 0;
#endif
  // Tell the optimiser the zeros are observed.
  __asm__ __volatile__("" : : "r"(p) : "memory");
}

void wipeAndFreeText(char* s) noexcept {
  if (s == nullptr) return;
  secureWipe(s, std::strlen(s));
  std::free(s);
}

void wipeAndFree(void* p, std::size_t n) noexcept {
  if (p == nullptr) return;
  secureWipe(p, n);
  std::free(p);
}

}  // namespace tessel
