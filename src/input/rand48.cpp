// lrand48/srand48 behind one lock, and the operating system's random source.
#include "input/rand48.h"

#include <fcntl.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <cstdlib>
#include <mutex>

namespace tessel {

namespace {
// lrand48/srand48 keep one unguarded process-wide state (glibc: MT-Unsafe race:drand48), and
// the stream is drawn from several threads: session creation on the UI thread, layout builds
// on each surface's GL thread (under the session lock, which two sessions do not share).
std::mutex g_libcMutex;

// getrandom through syscall(): the libc wrapper needs Android API 28, the call itself is in
// every kernel since 3.17. ENOSYS (or a seccomp refusal) sends the caller to /dev/urandom.
bool fromGetrandom(std::uint8_t* out, std::size_t n) noexcept {
#ifdef SYS_getrandom
  while (n > 0) {
    const long got = ::syscall(SYS_getrandom, out, n, 0);
    if (got < 0) {
      if (errno == EINTR) continue;
      return false;
    }
    out += got;
    n -= static_cast<std::size_t>(got);
  }
  return true;
#else
  (void)out;
  return n == 0;
#endif
}

bool fromUrandom(std::uint8_t* out, std::size_t n) noexcept {
  const int fd = ::open("/dev/urandom", O_RDONLY | O_CLOEXEC);
  if (fd < 0) return false;
  while (n > 0) {
    const ssize_t got = ::read(fd, out, n);
    if (got < 0 && errno == EINTR) continue;
    if (got <= 0) break;
    out += got;
    n -= static_cast<std::size_t>(got);
  }
  ::close(fd);
  return n == 0;
}
}  // namespace

long rand48Next() noexcept {
  std::lock_guard<std::mutex> guard(g_libcMutex);
  return ::lrand48();
}

void rand48Seed(long seed) noexcept {
  std::lock_guard<std::mutex> guard(g_libcMutex);
  ::srand48(seed);
}

bool osRandomBytes(void* buffer, std::size_t n) noexcept {
  auto* out = static_cast<std::uint8_t*>(buffer);
  return fromGetrandom(out, n) || fromUrandom(out, n);
}

std::uint32_t osRandomBelow(std::uint32_t bound) noexcept {
  // Draws below 2^32 mod bound are rejected, so every residue has the same number of preimages.
  const std::uint32_t reject = static_cast<std::uint32_t>(0u - bound) % bound;
  for (;;) {
    std::uint32_t r = 0;
    if (!osRandomBytes(&r, sizeof r)) {
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
