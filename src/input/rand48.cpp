// lrand48/srand48 where the C library has them; an identical generator where it does not.
#include "input/rand48.h"

#include <cstdlib>
#include <mutex>

namespace tessel {

#if defined(__unix__) || defined(__APPLE__)
namespace {
// lrand48/srand48 keep one unguarded process-wide state (glibc: MT-Unsafe race:drand48), and
// the stream is drawn from several threads: session creation on the UI thread, layout builds
// on each surface's GL thread (under the session lock, which two sessions do not share).
std::mutex g_libcMutex;
}  // namespace

long rand48Next() noexcept {
  std::lock_guard<std::mutex> guard(g_libcMutex);
  return ::lrand48();
}
void rand48Seed(long seed) noexcept {
  std::lock_guard<std::mutex> guard(g_libcMutex);
  ::srand48(seed);
}
#else
namespace {
std::mutex g_mutex;
unsigned long long g_state = 0x1234ABCD330EULL;  // the documented unseeded state
}  // namespace

long rand48Next() noexcept {
  std::lock_guard<std::mutex> guard(g_mutex);
  g_state = (g_state * 0x5DEECE66DULL + 0xB) & 0xFFFFFFFFFFFFULL;
  return static_cast<long>(g_state >> 17);
}

void rand48Seed(long seed) noexcept {
  std::lock_guard<std::mutex> guard(g_mutex);
  g_state = ((static_cast<unsigned long long>(seed) & 0xFFFFFFFFULL) << 16) | 0x330EULL;
}
#endif

}  // namespace tessel
