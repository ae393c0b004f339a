// Random bytes from the kernel. Kept deliberately simple: one open/read/close per request.
#include "crypto/random.h"

#include <atomic>
#include <cerrno>

#include <fcntl.h>
#include <unistd.h>

#include "crypto/wipe.h"

namespace tessel {
namespace {

int systemOpen(const char* path, int flags) { return ::open(path, flags); }

const RandomSystemCalls kSystemCalls{systemOpen, ::read, ::close};

std::atomic<RandomSource> g_override{nullptr};
std::atomic<const RandomSystemCalls*> g_calls{&kSystemCalls};

}  // namespace

bool randomBytes(std::uint8_t* buffer, std::size_t n) noexcept {
  if (RandomSource source = g_override.load(std::memory_order_acquire)) return source(buffer, n);
  const RandomSystemCalls& os = *g_calls.load(std::memory_order_acquire);
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
  if (filled == n) return true;
  secureWipe(buffer, n);
  return false;
}

void setRandomSourceForTesting(RandomSource source) noexcept {
  g_override.store(source, std::memory_order_release);
}

void setRandomSystemCallsForTesting(const RandomSystemCalls* calls) noexcept {
  g_calls.store(calls != nullptr ? calls : &kSystemCalls, std::memory_order_release);
}

}  // namespace tessel
