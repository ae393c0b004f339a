// Strength degree and password rule verification.
//
// rateStrength maps a text to a degree letter under a rule set: 'E' empty, 'W' weak,
// 'M' medium, 'S' strong, 'T' trivial, 'R' repetitive. Rule sets 0..90 pick one of five
// ratings from a fixed table (strength.cpp); anything else (as unsigned 32-bit) uses the
// default rating. verifyPassword checks a text against a PasswordRule and returns 0 or a
// negative reason code (kVerify* below). Both read a text they are shown and keep nothing of it
// (session/sealed_text.h shows them the sealed text).
#pragma once

#include <cstdint>

namespace tessel {

class PatternEngine;

// Degree letter 'E', 'W', 'M', 'S', 'T' or 'R' of text under a rule set (0..90; above: default).
// A null text counts as empty.
char rateStrength(std::uint32_t ruleSet, const char* text);

// ---- the individual ratings (texts NUL-terminated; null counts as empty)

char rateGeneral(const char* text) noexcept;
char rateNumericAware(const char* text, bool strict) noexcept;
char rateLettersRequired(const char* text) noexcept;
char rateDefault(const char* text) noexcept;

// ---- verification

constexpr int kVerifyPass = 0;
constexpr int kVerifyEmpty = -1;
constexpr int kVerifyTooShort = -2;
constexpr int kVerifyPatternMismatch = -3;  // also rule set 36's missing class mix
constexpr int kVerifyTrivial = -4;          // also: the rule could not be built
constexpr int kVerifyInDictionary = -5;
constexpr int kVerifyMissingClass = -6;

// Bits of requiredClasses (the session's contentType); other bits are ignored.
constexpr std::uint32_t kRequireDigit = 1;
constexpr std::uint32_t kRequireLetter = 2;
constexpr std::uint32_t kRequirePunct = 4;

// Built afresh for one verification and released right after it.
struct PasswordRule {
  std::uint32_t minLength = 0;
  const PatternEngine* accepts = nullptr;  // borrowed (the session's compiled accepts), may be null
  std::uint32_t requiredClasses = 0;
  char** dictionary = nullptr;           // owned: null-terminated array of owned strings, or null
};

// Checks, in order: empty (-1); shorter than minLength (-2); the pattern step (-3: rule set
// 36 requires a class mix, every other rule set a whole match of `accepts`, a null pattern
// failing); then, only with fullCheck: trivial sequences for rule sets
// 60, 84 and 4 (-4), an exact dictionary entry (-5), a missing required class (-6). A null
// text counts as empty.
int verifyPassword(std::uint32_t ruleSet, const char* text, bool fullCheck,
                   const PasswordRule& rule) noexcept;

// Splits the comma-separated dictionary text into a null-terminated array of copies: an
// entry before a comma is kept only if it has two or more bytes, while the entry that ends
// at the last byte of the text is kept whatever its length ("abc,x,def" gives abc, def;
// "abc,x" gives abc, x). A null text gives a null list (success). False when memory runs
// out, with *out left null and nothing allocated.
bool parseDictionary(const char* text, char*** out) noexcept;

// Wipes and frees every string of the list, then the list; null is accepted.
void freeDictionary(char** list) noexcept;

// Frees the rule's dictionary and resets it.
void releasePasswordRule(PasswordRule& rule) noexcept;

}  // namespace tessel
