// Random bytes for session keys, triple-DES keys and padding filler.
//
// The source is "/dev/urandom": opened read-only, read once for the whole request, closed
// again; no descriptor is cached and there is no fallback. A short read is not a failure
// (the kernel's urandom does not return short reads for the sizes we ask).
#pragma once

#include <cstddef>
#include <cstdint>

namespace tessel {

// Fills buffer with n random bytes. False when the device cannot be opened or read fails.
bool randomBytes(std::uint8_t* buffer, std::size_t n) noexcept;

// Tests replace the source to turn padded encryption into a known-answer test; null
// restores the system source. Not for production use; not thread-safe against callers.
using RandomSource = bool (*)(std::uint8_t* buffer, std::size_t n);
void setRandomSourceForTesting(RandomSource source) noexcept;

}  // namespace tessel
