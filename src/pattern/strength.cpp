// Strength ratings, rule verification and the dictionary list, over a text the caller shows.
//
// The rule-set table is data: one rating per rule set 0..90. The general rating compares
// the runs with the ceiling of half the length, the numeric-aware one with the floor: the two
// thresholds differ on purpose. The default rating's two fixed patterns are compiled once per
// process, like the class predicates of password_measures.cpp; verification borrows the accepts
// pattern its caller compiled.
#include "pattern/strength.h"

#include <cstdlib>
#include <cstring>

#include "crypto/wipe.h"
#include "pattern/char_class.h"
#include "pattern/password_measures.h"
#include "pattern/pattern_engine.h"

namespace tessel {

namespace {

struct Text {
  const std::uint8_t* bytes;
  std::size_t n;
};

Text textOf(const char* s) noexcept {
  if (s == nullptr) return {reinterpret_cast<const std::uint8_t*>(""), 0};
  return {reinterpret_cast<const std::uint8_t*>(s), std::strlen(s)};
}

bool is(ClassPredicate p, const Text& t) noexcept { return classPredicate(p, t.bytes, t.n); }

enum class Rating : std::uint8_t { kGeneral, kNumeric, kNumericStrict, kLettersRequired, kDefault };

constexpr Rating G = Rating::kGeneral;
constexpr Rating N = Rating::kNumeric;
constexpr Rating X = Rating::kNumericStrict;
constexpr Rating L = Rating::kLettersRequired;
constexpr Rating D = Rating::kDefault;

// Rule sets 0..90, ten per row.
constexpr Rating kRatingOfRuleSet[91] = {
    D, G, G, G, N, G, L, G, G, G,  //  0..9
    G, G, G, D, N, D, G, N, G, N,  // 10..19
    N, D, D, G, G, N, G, G, G, G,  // 20..29
    G, N, G, G, X, N, G, G, G, G,  // 30..39
    G, G, G, G, G, G, G, N, N, G,  // 40..49
    G, G, G, G, G, G, D, N, G, G,  // 50..59
    G, G, G, G, G, D, G, G, G, D,  // 60..69
    G, G, G, G, G, G, D, D, D, D,  // 70..79
    G, G, G, D, N, G, G, G, D, G,  // 80..89
    G,                             // 90
};

bool isTrivialSequence(const Text& t) noexcept {
  return isAllSameChar(t.bytes, t.n) || isAscendingDigitRun(t.bytes, t.n) ||
         isDescendingDigitRun(t.bytes, t.n) || isAscendingLetterRun(t.bytes, t.n) ||
         isDescendingLetterRun(t.bytes, t.n);
}

bool isTrivialDigitSequence(const Text& t) noexcept {
  return isAllSameChar(t.bytes, t.n) || isAscendingDigitRun(t.bytes, t.n) ||
         isDescendingDigitRun(t.bytes, t.n);
}

// Rule set 36: fails for letters without digits or punctuation, and for exactly one of digits
// and punctuation without letters; two or more classes, or none at all, pass.
bool hasClassMix(const Text& t) noexcept {
  bool letters = false, digits = false, punct = false;
  for (std::size_t i = 0; i < t.n; ++i) {
    const std::uint8_t bits = byteClass(t.bytes[i]);
    letters |= (bits & (kClassUpper | kClassLower)) != 0;
    digits |= (bits & kClassDigit) != 0;
    punct |= (bits & kClassPunct) != 0;
  }
  if (letters && !digits && !punct) return false;
  if (!letters && digits != punct) return false;
  return true;
}

char* copyEntry(const char* from, std::size_t n) noexcept {
  auto* copy = static_cast<char*>(std::malloc(n + 1));
  if (copy == nullptr) return nullptr;
  std::memcpy(copy, from, n);
  copy[n] = '\0';
  return copy;
}

// Appends to a null-terminated list with room for *capacity entries; when full it grows to
// twice the count (at a comma) or by one (at the last byte), zero-filled.
bool appendEntry(char**& list, std::size_t& count, std::size_t& capacity, char* entry,
                 bool atComma) noexcept {
  if (count == capacity) {
    const std::size_t grown = atComma ? 2 * count : count + 1;
    auto* bigger = static_cast<char**>(std::calloc(grown + 1, sizeof(char*)));
    if (bigger == nullptr) return false;
    std::memcpy(bigger, list, count * sizeof(char*));
    std::free(list);
    list = bigger;
    capacity = grown;
  }
  list[count++] = entry;
  return true;
}

}  // namespace

// ---- ratings

char rateGeneral(const char* s) noexcept {
  const Text t = textOf(s);
  if (t.n == 0) return 'E';
  if (t.n <= 5) return 'W';
  const bool single = is(ClassPredicate::kAllDigits, t) || is(ClassPredicate::kAllLower, t) ||
                      is(ClassPredicate::kAllUpper, t) || is(ClassPredicate::kAllPunct, t);
  const std::size_t half = (t.n >> 1) + (t.n & 1);
  if (longestAscendingRun(t.bytes, t.n) < half && longestDescendingRun(t.bytes, t.n) < half &&
      longestRepeatRun(t.bytes, t.n) < half)
    return single ? 'M' : 'S';
  return single ? 'W' : 'M';
}

char rateNumericAware(const char* s, bool strict) noexcept {
  const Text t = textOf(s);
  if (t.n == 0) return 'E';
  if (t.n <= 5) return strict ? 'T' : 'W';
  if (is(ClassPredicate::kAllDigits, t)) {
    if (!strict) return 'W';
    if (isTrivialDigitSequence(t)) return 'T';
    const std::size_t h = t.n >> 1;
    char result = maxCharFrequency(t.bytes, t.n) < h ? 'W' : 'R';
    if (h <= longestAscendingRun(t.bytes, t.n) || h <= longestDescendingRun(t.bytes, t.n)) result = 'R';
    return result;
  }
  if (is(ClassPredicate::kAllLetters, t)) return 'W';
  if (is(ClassPredicate::kAllPunct, t)) return 'W';
  if (is(ClassPredicate::kAllAlnum, t) || is(ClassPredicate::kDigitsPunct, t) ||
      is(ClassPredicate::kLettersPunct, t)) {
    const std::size_t twoThirds = (2 * t.n) / 3;
    return maxCharFrequency(t.bytes, t.n) >= twoThirds ? 'W' : 'M';
  }
  return 'S';
}

char rateLettersRequired(const char* s) noexcept {
  const Text t = textOf(s);
  if (t.n < 8) return 'W';
  if (is(ClassPredicate::kAllDigits, t)) return 'W';
  if (!is(ClassPredicate::kAllLetters, t)) return 'S';
  if (isAllSameChar(t.bytes, t.n) || isAscendingLetterRun(t.bytes, t.n) ||
      isDescendingLetterRun(t.bytes, t.n))
    return 'W';
  if (is(ClassPredicate::kAllLower, t)) return 'M';
  if (is(ClassPredicate::kAllUpper, t)) return 'M';
  return 'S';
}

char rateDefault(const char* s) noexcept {
  // Compiled on first use (thread-safe static initialisation); an engine is immutable and is
  // matched from any thread with a context of the caller's own.
  static const PatternEngine kWeak("([0-9]{0,})|(.{0,5})");
  static const PatternEngine kMedium("([a-z]{6,})|([A-Z]{6,})");
  const Text t = textOf(s);
  MatchContext context;
  if (kWeak.matches(t.bytes, t.n, &context)) return 'W';
  if (kMedium.matches(t.bytes, t.n, &context)) return 'M';
  return 'S';
}

char rateStrength(std::uint32_t ruleSet, const char* text) {
  const Rating rating = ruleSet <= 90 ? kRatingOfRuleSet[ruleSet] : Rating::kDefault;
  switch (rating) {
    case Rating::kGeneral: return rateGeneral(text);
    case Rating::kNumeric: return rateNumericAware(text, false);
    case Rating::kNumericStrict: return rateNumericAware(text, true);
    case Rating::kLettersRequired: return rateLettersRequired(text);
    case Rating::kDefault: break;
  }
  return rateDefault(text);
}

// ---- verification

int verifyPassword(std::uint32_t ruleSet, const char* text, bool fullCheck,
                   const PasswordRule& rule) noexcept {
  const Text t = textOf(text);
  if (t.n == 0) return kVerifyEmpty;
  if (t.n < rule.minLength) return kVerifyTooShort;
  if (ruleSet == 36) {
    if (!hasClassMix(t)) return kVerifyPatternMismatch;
  } else if (rule.accepts == nullptr || !rule.accepts->matches(t.bytes, t.n)) {
    return kVerifyPatternMismatch;
  }
  if (!fullCheck) return kVerifyPass;
  if (ruleSet == 60 && isTrivialSequence(t)) return kVerifyTrivial;
  if ((ruleSet == 84 || ruleSet == 4) && is(ClassPredicate::kAllDigits, t) && isTrivialDigitSequence(t))
    return kVerifyTrivial;
  if (rule.dictionary != nullptr) {
    for (char** entry = rule.dictionary; *entry != nullptr; ++entry)
      if (std::strcmp(*entry, text) == 0) return kVerifyInDictionary;
  }
  if (rule.requiredClasses != 0) {
    if ((rule.requiredClasses & kRequireDigit) != 0 && !is(ClassPredicate::kContainsDigit, t))
      return kVerifyMissingClass;
    if ((rule.requiredClasses & kRequireLetter) != 0 && !is(ClassPredicate::kContainsLetter, t))
      return kVerifyMissingClass;
    if ((rule.requiredClasses & kRequirePunct) != 0 && !is(ClassPredicate::kContainsPunct, t))
      return kVerifyMissingClass;
  }
  return kVerifyPass;
}

// ---- dictionary list

bool parseDictionary(const char* text, char*** out) noexcept {
  *out = nullptr;
  if (text == nullptr) return true;
  std::size_t capacity = 10;
  std::size_t count = 0;
  auto** list = static_cast<char**>(std::calloc(capacity + 1, sizeof(char*)));
  if (list == nullptr) return false;
  const std::size_t n = std::strlen(text);
  std::size_t start = 0;
  for (std::size_t i = 0; i < n; ++i) {
    const bool comma = text[i] == ',';
    const bool last = i + 1 == n;
    if (!comma && !last) continue;
    // At a comma the entry before it counts only with two or more bytes; the entry that
    // runs to the last byte counts whatever its length.
    const std::size_t length = comma ? i - start : i + 1 - start;
    if (!comma || length >= 2) {
      char* entry = copyEntry(text + start, length);
      if (entry == nullptr || !appendEntry(list, count, capacity, entry, comma)) {
        wipeAndFreeText(entry);
        freeDictionary(list);
        return false;
      }
    }
    start = i + 1;
  }
  *out = list;
  return true;
}

void freeDictionary(char** list) noexcept {
  if (list == nullptr) return;
  for (char** entry = list; *entry != nullptr; ++entry) wipeAndFreeText(*entry);
  std::free(list);
}

void releasePasswordRule(PasswordRule& rule) noexcept {
  freeDictionary(rule.dictionary);
  rule = PasswordRule{};
}

}  // namespace tessel
