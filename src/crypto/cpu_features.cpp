// The CPUID probe behind cpu_features.h and the switch that turns features off.
#include "crypto/cpu_features.h"

#if defined(__x86_64__) && (defined(__GNUC__) || defined(__clang__))
#include <cpuid.h>
#define TESSEL_HAVE_CPUID 1
#endif

namespace tessel {
namespace cpu_detail {

std::atomic<unsigned> g_allowed{~0u};

unsigned probe() noexcept {
  unsigned present = 0;
#if defined(TESSEL_HAVE_CPUID)
  unsigned a = 0, b = 0, c = 0, d = 0;
  if (!__get_cpuid(1, &a, &b, &c, &d)) return 0;
  const bool ssse3 = (c & (1u << 9)) != 0, sse41 = (c & (1u << 19)) != 0;
  if (!__get_cpuid_count(7, 0, &a, &b, &c, &d)) return 0;
  if ((b & (1u << 8)) != 0 && (b & (1u << 19)) != 0) present |= static_cast<unsigned>(CpuFeature::kBmi2Adx);
  if (ssse3 && sse41 && (b & (1u << 29)) != 0) present |= static_cast<unsigned>(CpuFeature::kShaNi);
#endif
  return present;
}

}  // namespace cpu_detail

void cpuAllowFeature(CpuFeature feature, bool allowed) noexcept {
  const unsigned bit = static_cast<unsigned>(feature);
  if (allowed)
    cpu_detail::g_allowed.fetch_or(bit, std::memory_order_relaxed);
  else
    cpu_detail::g_allowed.fetch_and(~bit, std::memory_order_relaxed);
}

}  // namespace tessel
