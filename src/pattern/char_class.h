// Byte classes shared by the pattern engine and the password rules.
//
// The library carries its own 256-entry class table (no locale): each entry is a bit set over
// the bits below, following ASCII; bytes 0x80..0xFF belong to no class. Named classes
// ("alnum", "digit", ...) are predicates over those bits, precomputed once into ByteSet
// bitmaps so that matching one byte against a class, a bracket set or a literal is a single
// bit test. "blank" is the one class taken from the C library (isblank), as documented.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tessel {

// Bits of the class table.
constexpr std::uint8_t kClassUpper = 0x01;
constexpr std::uint8_t kClassLower = 0x02;
constexpr std::uint8_t kClassDigit = 0x04;
constexpr std::uint8_t kClassControl = 0x08;
constexpr std::uint8_t kClassPunct = 0x10;
constexpr std::uint8_t kClassSpace = 0x20;      // tab, LF, VT, FF, CR and the space character
constexpr std::uint8_t kClassHexLetter = 0x40;  // A-F, a-f
constexpr std::uint8_t kClassBlankChar = 0x80;  // the space character only

// The table itself, indexed by the unsigned byte value.
extern const std::uint8_t kByteClassTable[256];

inline std::uint8_t byteClass(std::uint8_t b) noexcept { return kByteClassTable[b]; }

// 256-bit membership set over byte values.
struct ByteSet {
  std::uint64_t words[4] = {0, 0, 0, 0};

  bool has(std::uint8_t b) const noexcept { return (words[b >> 6] >> (b & 63)) & 1u; }
  void add(std::uint8_t b) noexcept { words[b >> 6] |= std::uint64_t{1} << (b & 63); }
  void addRange(std::uint8_t lo, std::uint8_t hi) noexcept {
    for (unsigned b = lo; b <= hi; ++b) add(static_cast<std::uint8_t>(b));
  }
  void addSet(const ByteSet& other) noexcept {
    for (int i = 0; i < 4; ++i) words[i] |= other.words[i];
  }
  void invert() noexcept {
    for (auto& w : words) w = ~w;
  }
};

// Named classes. The order is the order of the name table; kWord is \w (alnum plus '_') and
// has no bracket name.
enum class NamedClass : std::uint8_t {
  kAlnum, kAlpha, kAscii, kCntrl, kDigit, kGraph, kLower, kPrint, kPunct, kSpace, kUpper,
  kXdigit, kBlank, kWord,
};
constexpr int kNamedClassCount = 14;

// Looks a name up as written between "[:" and "]": `name` points at the first byte after
// "[:" (after "^" for a negated class) and `length` counts the bytes up to and including the
// closing ':', which takes part in the comparison ("alnum:", "xdigit:"). False for an
// unknown name.
bool lookupNamedClass(const char* name, std::size_t length, NamedClass* out) noexcept;

// The printable name ("alnum", ..., "word").
const char* namedClassName(NamedClass c) noexcept;

// The members of a named class (computed once, thread-safe).
const ByteSet& namedClassSet(NamedClass c) noexcept;

inline bool isClassMember(NamedClass c, std::uint8_t b) noexcept { return namedClassSet(c).has(b); }

}  // namespace tessel
