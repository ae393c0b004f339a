// The byte class table and the named-class bitmaps built from it.
//
// The table is computed at compile time from ASCII ranges, so it cannot drift from the bit
// definitions in the header. The bitmaps are built on first use behind a function-local
// static (thread-safe one-time initialisation); only "blank" consults the C library.
#include "pattern/char_class.h"

#include <cctype>
#include <cstring>

namespace tessel {

namespace {

struct ClassTable {
  std::uint8_t entries[256];
};

constexpr ClassTable buildClassTable() {
  ClassTable t{};
  for (int b = 0; b < 256; ++b) {
    std::uint8_t bits = 0;
    if (b >= 'A' && b <= 'Z') bits |= kClassUpper;
    if (b >= 'a' && b <= 'z') bits |= kClassLower;
    if (b >= '0' && b <= '9') bits |= kClassDigit;
    if (b < 0x20 || b == 0x7F) bits |= kClassControl;
    if ((b >= '!' && b <= '/') || (b >= ':' && b <= '@') || (b >= '[' && b <= '`') ||
        (b >= '{' && b <= '~'))
      bits |= kClassPunct;
    if ((b >= '\t' && b <= '\r') || b == ' ') bits |= kClassSpace;
    if ((b >= 'A' && b <= 'F') || (b >= 'a' && b <= 'f')) bits |= kClassHexLetter;
    if (b == ' ') bits |= kClassBlankChar;
    t.entries[b] = bits;
  }
  return t;
}

constexpr ClassTable kTable = buildClassTable();

struct NameEntry {
  const char* nameWithColon;
  NamedClass id;
};

// Searched by the bracket syntax; "word" is only reachable through \w and \W.
constexpr NameEntry kNames[] = {
    {"alnum:", NamedClass::kAlnum}, {"alpha:", NamedClass::kAlpha}, {"ascii:", NamedClass::kAscii},
    {"cntrl:", NamedClass::kCntrl}, {"digit:", NamedClass::kDigit}, {"graph:", NamedClass::kGraph},
    {"lower:", NamedClass::kLower}, {"print:", NamedClass::kPrint}, {"punct:", NamedClass::kPunct},
    {"space:", NamedClass::kSpace}, {"upper:", NamedClass::kUpper}, {"xdigit:", NamedClass::kXdigit},
    {"blank:", NamedClass::kBlank},
};

constexpr const char* kPrintNames[kNamedClassCount] = {
    "alnum", "alpha", "ascii", "cntrl", "digit", "graph", "lower",
    "print", "punct", "space", "upper", "xdigit", "blank", "word"};

bool predicate(NamedClass c, int b) noexcept {
  const std::uint8_t bits = kTable.entries[b];
  switch (c) {
    case NamedClass::kAlnum: return (bits & (kClassUpper | kClassLower | kClassDigit)) != 0;
    case NamedClass::kAlpha: return (bits & (kClassUpper | kClassLower)) != 0;
    case NamedClass::kAscii: return b < 0x80;
    case NamedClass::kCntrl: return (bits & kClassControl) != 0;
    case NamedClass::kDigit: return (bits & kClassDigit) != 0;
    case NamedClass::kGraph:
      return (bits & (kClassUpper | kClassLower | kClassDigit | kClassPunct)) != 0;
    case NamedClass::kLower: return (bits & kClassLower) != 0;
    case NamedClass::kPrint:
      return (bits & (kClassUpper | kClassLower | kClassDigit | kClassPunct | kClassBlankChar)) != 0;
    case NamedClass::kPunct: return (bits & kClassPunct) != 0;
    case NamedClass::kSpace: return (bits & kClassSpace) != 0;
    case NamedClass::kUpper: return (bits & kClassUpper) != 0;
    case NamedClass::kXdigit: return (bits & (kClassDigit | kClassHexLetter)) != 0;
    case NamedClass::kBlank: return std::isblank(b) != 0;
    case NamedClass::kWord:
      return (bits & (kClassUpper | kClassLower | kClassDigit)) != 0 || b == '_';
  }
  return false;
}

struct ClassSets {
  ByteSet sets[kNamedClassCount];
  ClassSets() noexcept {
    for (int c = 0; c < kNamedClassCount; ++c)
      for (int b = 0; b < 256; ++b)
        if (predicate(static_cast<NamedClass>(c), b)) sets[c].add(static_cast<std::uint8_t>(b));
  }
};

}  // namespace

const std::uint8_t kByteClassTable[256] = {
#define TESSEL_ROW(i)                                                                      \
  kTable.entries[i], kTable.entries[i + 1], kTable.entries[i + 2], kTable.entries[i + 3],  \
      kTable.entries[i + 4], kTable.entries[i + 5], kTable.entries[i + 6], kTable.entries[i + 7]
    TESSEL_ROW(0),   TESSEL_ROW(8),   TESSEL_ROW(16),  TESSEL_ROW(24),  TESSEL_ROW(32),
    TESSEL_ROW(40),  TESSEL_ROW(48),  TESSEL_ROW(56),  TESSEL_ROW(64),  TESSEL_ROW(72),
    TESSEL_ROW(80),  TESSEL_ROW(88),  TESSEL_ROW(96),  TESSEL_ROW(104), TESSEL_ROW(112),
    TESSEL_ROW(120), TESSEL_ROW(128), TESSEL_ROW(136), TESSEL_ROW(144), TESSEL_ROW(152),
    TESSEL_ROW(160), TESSEL_ROW(168), TESSEL_ROW(176), TESSEL_ROW(184), TESSEL_ROW(192),
    TESSEL_ROW(200), TESSEL_ROW(208), TESSEL_ROW(216), TESSEL_ROW(224), TESSEL_ROW(232),
    TESSEL_ROW(240), TESSEL_ROW(248),
#undef TESSEL_ROW
};

bool lookupNamedClass(const char* name, std::size_t length, NamedClass* out) noexcept {
  for (const NameEntry& e : kNames) {
    if (std::strlen(e.nameWithColon) == length && std::memcmp(e.nameWithColon, name, length) == 0) {
      *out = e.id;
      return true;
    }
  }
  return false;
}

const char* namedClassName(NamedClass c) noexcept {
  const int i = static_cast<int>(c);
  return (i >= 0 && i < kNamedClassCount) ? kPrintNames[i] : "?";
}

const ByteSet& namedClassSet(NamedClass c) noexcept {
  static const ClassSets sets;
  return sets.sets[static_cast<int>(c)];
}

}  // namespace tessel
