// Random bytes for session keys, triple-DES keys, padding filler and, in hardened builds, the
// keyboard layout.
//
// The source is the kernel's getrandom call, made through syscall() so that builds for Android
// before API 28 (no libc wrapper) have it too. Only when the kernel lacks the call (ENOSYS) or a
// seccomp filter refuses it (EPERM) are the bytes read from "/dev/urandom" instead: opened
// read-only, read for the whole request, closed again. Either way a short read is not a failure:
// the rest is requested again until the buffer is full, so a key is never left partly zero, and
// an interrupted call (EINTR) is repeated. Any other failure of the source in use fails the
// request (the callers' error 9); a partly filled buffer is wiped.
#pragma once

#include <cstddef>
#include <cstdint>

#include <sys/types.h>

namespace tessel {

// Fills buffer with n random bytes from the test override if one is set, else from the system
// source. False when the source fails.
bool randomBytes(std::uint8_t* buffer, std::size_t n) noexcept;

// The system source alone, never the test override: for draws that are not part of an output
// (the hardened layout's shuffle and keyMask).
bool systemRandomBytes(std::uint8_t* buffer, std::size_t n) noexcept;

// Tests replace the source to turn padded encryption into a known-answer test; null
// restores the system source. Not for production use; not thread-safe against callers.
using RandomSource = bool (*)(std::uint8_t* buffer, std::size_t n);
void setRandomSourceForTesting(RandomSource source) noexcept;

// The operating-system calls behind the system source. Tests substitute them to drive its
// failure paths (the call absent, refused or failing; open or read failing; short reads);
// null restores the real calls. getrandom returns the count or -1 with errno, as syscall() does.
struct RandomSystemCalls {
  int (*open)(const char* path, int flags);
  ssize_t (*read)(int fd, void* buffer, std::size_t n);
  int (*close)(int fd);
  long (*getrandom)(void* buffer, std::size_t n, unsigned flags);
};
void setRandomSystemCallsForTesting(const RandomSystemCalls* calls) noexcept;

}  // namespace tessel
