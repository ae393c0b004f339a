// Random bytes from the kernel: getrandom, or /dev/urandom where that call is unavailable.
#include "crypto/random.h"

#include <atomic>
#include <cerrno>

#include <fcntl.h>
#include <sys/syscall.h>
#include <unistd.h>

#include "crypto/wipe.h"

namespace tessel {
namespace {

int systemOpen(const char* path, int flags) { return ::open(path, flags); }

long systemGetrandom(void* buffer, std::size_t n, unsigned flags) {
#ifdef SYS_getrandom
  return ::syscall(SYS_getrandom, buffer, n, flags);
#else
  (void)buffer, (void)n, (void)flags;
  errno = ENOSYS;
  return -1;
#endif
}

const RandomSystemCalls kSystemCalls{systemOpen, ::read, ::close, systemGetrandom};

std::atomic<RandomSource> g_override{nullptr};
std::atomic<const RandomSystemCalls*> g_calls{&kSystemCalls};

enum class Outcome { kFilled, kFailed, kUnavailable };

// getrandom without flags: blocks only until the kernel's pool is first seeded, then never.
Outcome fromGetrandom(const RandomSystemCalls& os, std::uint8_t* buffer, std::size_t n) noexcept {
  std::size_t filled = 0;
  while (filled < n) {
    const long got = os.getrandom(buffer + filled, n - filled, 0);
    if (got > 0) {
      filled += static_cast<std::size_t>(got);
    } else if (got < 0 && errno == EINTR) {
      continue;
    } else {
      return got < 0 && (errno == ENOSYS || errno == EPERM) ? Outcome::kUnavailable : Outcome::kFailed;
    }
  }
  return Outcome::kFilled;
}

bool fromUrandom(const RandomSystemCalls& os, std::uint8_t* buffer, std::size_t n) noexcept {
  const int fd = os.open("/dev/urandom", O_RDONLY | O_CLOEXEC);
  if (fd < 0) return false;
  std::size_t filled = 0;
  while (filled < n) {
    const ssize_t got = os.read(fd, buffer + filled, n - filled);
    if (got < 0 && errno == EINTR) continue;
    if (got <= 0) break;
    filled += static_cast<std::size_t>(got);
  }
  os.close(fd);
  return filled == n;
}

}  // namespace

bool systemRandomBytes(std::uint8_t* buffer, std::size_t n) noexcept {
  const RandomSystemCalls& os = *g_calls.load(std::memory_order_acquire);
  Outcome outcome = fromGetrandom(os, buffer, n);
  if (outcome == Outcome::kUnavailable) outcome = fromUrandom(os, buffer, n) ? Outcome::kFilled : Outcome::kFailed;
  if (outcome == Outcome::kFilled) return true;
  secureWipe(buffer, n);
  return false;
}

bool randomBytes(std::uint8_t* buffer, std::size_t n) noexcept {
  if (RandomSource source = g_override.load(std::memory_order_acquire)) return source(buffer, n);
  return systemRandomBytes(buffer, n);
}

void setRandomSourceForTesting(RandomSource source) noexcept {
  g_override.store(source, std::memory_order_release);
}

void setRandomSystemCallsForTesting(const RandomSystemCalls* calls) noexcept {
  g_calls.store(calls != nullptr ? calls : &kSystemCalls, std::memory_order_release);
}

}  // namespace tessel
