// Random bytes for session keys, triple-DES keys and padding filler.
//
// The source is "/dev/urandom": opened read-only, read for the whole request, closed again; no
// descriptor is cached and there is no fallback. A short read is not a failure: the rest of the
// request is read again until it is full, so a key is never left partly zero. A failed open, a
// failed read, or an end of file before the request is full is a failure (the callers' error 9).
#pragma once

#include <cstddef>
#include <cstdint>

#include <sys/types.h>

namespace tessel {

// Fills buffer with n random bytes. False when the source cannot be opened or read (a partly
// read buffer is wiped).
bool randomBytes(std::uint8_t* buffer, std::size_t n) noexcept;

// Tests replace the source to turn padded encryption into a known-answer test; null
// restores the system source. Not for production use; not thread-safe against callers.
using RandomSource = bool (*)(std::uint8_t* buffer, std::size_t n);
void setRandomSourceForTesting(RandomSource source) noexcept;

// The operating-system calls behind the system source. Tests substitute them to drive its
// failure paths (open failing, read failing, short reads); null restores the real calls.
struct RandomSystemCalls {
  int (*open)(const char* path, int flags);
  ssize_t (*read)(int fd, void* buffer, std::size_t n);
  int (*close)(int fd);
};
void setRandomSystemCallsForTesting(const RandomSystemCalls* calls) noexcept;

}  // namespace tessel
