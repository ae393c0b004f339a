// Debug hex dump to "/tmp/qn_tessel.log", for debug builds only.
//
// formatDebugDump produces the exact text; TESSEL_DUMP writes it, and compiles to nothing
// unless the library is built with TESSEL_DEBUG_LOG (CMake Debug builds), so a release
// library never writes the file. Nothing that holds plaintext is ever dumped.
#pragma once

#include <cstddef>
#include <string>

namespace tessel {

// "label:\n", then either the data as text and "\n" (n == -1) or each byte as "0X%hhX\t"
// with a line feed before bytes 0, 8, 16, ...; then one final line feed.
std::string formatDebugDump(const char* label, const void* data, long n);

#if defined(TESSEL_DEBUG_LOG)
// Appends the dump to the log file (opened in mode "a" per call; open failure is ignored).
void writeDebugDump(const char* label, const void* data, long n) noexcept;
#define TESSEL_DUMP(label, data, n) ::tessel::writeDebugDump((label), (data), (n))
#else
#define TESSEL_DUMP(label, data, n) ((void)0)
#endif

}  // namespace tessel
