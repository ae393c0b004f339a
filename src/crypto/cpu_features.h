// Optional x86-64 instruction sets that the crypto kernels use when the CPU has them: BMI2 with
// ADX (the Montgomery kernels of bignum_x86_64.h) and the SHA extensions (SHA-1's compression).
//
// Each feature is probed once per process from CPUID and has one process-wide switch, on by
// default, so tests and benchmarks can force the portable code on machines that have the
// instructions and check both paths there. Off x86-64, or with compilers other than GCC and
// Clang, no feature is ever usable.
#pragma once

#include <atomic>

namespace tessel {

enum class CpuFeature : unsigned {
  kBmi2Adx = 1u << 0,  // mulx, adcx, adox
  kShaNi = 1u << 1,    // sha1rnds4 and its helpers, with SSSE3 and SSE4.1
};

namespace cpu_detail {
unsigned probe() noexcept;                 // bit set of CpuFeature that this CPU has
extern std::atomic<unsigned> g_allowed;   // bit set of CpuFeature allowed by cpuAllowFeature
}  // namespace cpu_detail

// Allows or forbids a feature. Work started afterwards sees it: a Montgomery context picks its
// kernels when it is made, SHA-1 at each compression.
void cpuAllowFeature(CpuFeature feature, bool allowed) noexcept;

// Present and allowed. Inline (one relaxed load once the probe is done): SHA-1 asks per call.
inline bool cpuFeatureUsable(CpuFeature feature) noexcept {
  static const unsigned present = cpu_detail::probe();
  return (present & cpu_detail::g_allowed.load(std::memory_order_relaxed) & static_cast<unsigned>(feature)) != 0;
}

}  // namespace tessel
