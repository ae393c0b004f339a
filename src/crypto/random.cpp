// Random bytes from the kernel. Kept deliberately simple: one open/read/close per request.
#include "crypto/random.h"

#include <atomic>
#include <cerrno>

#include <fcntl.h>
#include <unistd.h>

namespace tessel {
namespace {
std::atomic<RandomSource> g_override{nullptr};
}

bool randomBytes(std::uint8_t* buffer, std::size_t n) noexcept {
  if (RandomSource source = g_override.load(std::memory_order_acquire)) return source(buffer, n);
  const int fd = ::open("/dev/urandom", O_RDONLY | O_CLOEXEC);
  if (fd < 0) return false;
  ssize_t got;
  do {
    got = ::read(fd, buffer, n);
  } while (got < 0 && errno == EINTR);
  ::close(fd);
  return got != -1;
}

void setRandomSourceForTesting(RandomSource source) noexcept {
  g_override.store(source, std::memory_order_release);
}

}  // namespace tessel
