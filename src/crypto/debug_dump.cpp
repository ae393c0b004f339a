// Debug dump formatting, and in debug builds the file writer.
#include "crypto/debug_dump.h"

#include <cstdio>

namespace tessel {

std::string formatDebugDump(const char* label, const void* data, long n) {
  std::string out = std::string(label ? label : "") + ":\n";
  if (n == -1) {
    out += data ? static_cast<const char*>(data) : "";
    out += '\n';
  } else {
    const unsigned char* bytes = static_cast<const unsigned char*>(data);
    char entry[8];
    for (long k = 0; k < n; ++k) {
      if (k % 8 == 0) out += '\n';
      std::snprintf(entry, sizeof entry, "0X%hhX\t", bytes[k]);
      out += entry;
    }
  }
  out += '\n';
  return out;
}

#if defined(TESSEL_DEBUG_LOG)
void writeDebugDump(const char* label, const void* data, long n) noexcept {
  try {
    const std::string text = formatDebugDump(label, data, n);
    if (FILE* f = std::fopen("/tmp/qn_tessel.log", "a")) {
      std::fputs(text.c_str(), f);
      std::fclose(f);
    }
  } catch (...) {
  }
}
#endif

}  // namespace tessel
