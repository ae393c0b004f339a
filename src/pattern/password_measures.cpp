// Password measures and the eleven once-compiled class predicates.
//
// The run measures are single linear scans: a run that starts at a letter or digit can only
// continue through letters and digits (every successor of one is one), so the runs starting
// inside it are its suffixes and never longer; scanning maximal runs gives the same result
// as trying every start position. maxCharFrequency uses a byte histogram, which gives the
// same maximum as counting later equal bytes from each position.
#include "pattern/password_measures.h"

#include "pattern/char_class.h"
#include "pattern/pattern_engine.h"

namespace tessel {

namespace {

constexpr const char* kPredicatePatterns[kClassPredicateCount] = {
    "[:digit:]+",
    "[:print:]*[:digit:]+[:print:]*",
    "[:alpha:]+",
    "[:print:]*[:alpha:]+[:print:]*",
    "[a-z]{1,}",
    "[A-Z]{1,}",
    "[:punct:]+",
    "[:print:]*[:punct:]+[:print:]*",
    "[:alnum:]+",
    "[[:digit:][:punct:]]+",
    "[[:alpha:][:punct:]]+",
};

// Compiled on first use, released at process exit; read-only in between.
struct PredicateEngines {
  PatternEngine engines[kClassPredicateCount] = {
      PatternEngine(kPredicatePatterns[0]), PatternEngine(kPredicatePatterns[1]),
      PatternEngine(kPredicatePatterns[2]), PatternEngine(kPredicatePatterns[3]),
      PatternEngine(kPredicatePatterns[4]), PatternEngine(kPredicatePatterns[5]),
      PatternEngine(kPredicatePatterns[6]), PatternEngine(kPredicatePatterns[7]),
      PatternEngine(kPredicatePatterns[8]), PatternEngine(kPredicatePatterns[9]),
      PatternEngine(kPredicatePatterns[10]),
  };
};

const PredicateEngines& predicateEngines() noexcept {
  static const PredicateEngines compiled;
  return compiled;
}

bool isLetterOrDigit(std::uint8_t b) noexcept {
  return (byteClass(b) & (kClassUpper | kClassLower | kClassDigit)) != 0;
}

int successor(std::uint8_t b) noexcept {
  if (b == '9') return '0';
  if (b == 'Z') return 'A';
  if (b == 'z') return 'a';
  return b + 1;
}

int predecessor(std::uint8_t b) noexcept {
  if (b == '0') return '9';
  if (b == 'A') return 'Z';
  if (b == 'a') return 'z';
  return b - 1;
}

template <typename Next>
std::size_t longestRun(const std::uint8_t* text, std::size_t n, Next next) noexcept {
  std::size_t best = 0;
  std::size_t i = 0;
  while (i < n && best < n) {
    if (!isLetterOrDigit(text[i])) {
      if (best < 1) best = 1;
      ++i;
      continue;
    }
    std::size_t j = i;
    while (j + 1 < n && text[j + 1] == next(text[j])) ++j;
    if (j - i + 1 > best) best = j - i + 1;
    i = j + 1;
  }
  return best;
}

template <typename Next>
bool wholeRun(const std::uint8_t* text, std::size_t n, Next next) noexcept {
  for (std::size_t i = 1; i < n; ++i)
    if (text[i] != next(text[i - 1])) return false;
  return true;
}

}  // namespace

const char* classPredicatePattern(ClassPredicate p) noexcept {
  return kPredicatePatterns[static_cast<int>(p)];
}

bool classPredicate(ClassPredicate p, const std::uint8_t* text, std::size_t n) noexcept {
  MatchContext context;
  return predicateEngines().engines[static_cast<int>(p)].matches(text, n, &context);
}

std::size_t maxCharFrequency(const std::uint8_t* text, std::size_t n) noexcept {
  std::size_t counts[256] = {};
  std::size_t best = 0;
  for (std::size_t i = 0; i < n; ++i) {
    const std::size_t c = ++counts[text[i]];
    if (c > best) best = c;
  }
  return best;
}

bool isAllSameChar(const std::uint8_t* text, std::size_t n) noexcept {
  return maxCharFrequency(text, n) == n;
}

std::size_t longestRepeatRun(const std::uint8_t* text, std::size_t n) noexcept {
  std::size_t best = 0;
  std::size_t run = 0;
  for (std::size_t i = 0; i < n; ++i) {
    run = (i > 0 && text[i] == text[i - 1]) ? run + 1 : 1;
    if (run > best) best = run;
  }
  return best;
}

std::size_t longestAscendingRun(const std::uint8_t* text, std::size_t n) noexcept {
  return longestRun(text, n, successor);
}

std::size_t longestDescendingRun(const std::uint8_t* text, std::size_t n) noexcept {
  return longestRun(text, n, predecessor);
}

bool isAscendingDigitRun(const std::uint8_t* text, std::size_t n) noexcept {
  return wholeRun(text, n, [](std::uint8_t b) { return b == '9' ? int{'0'} : b + 1; });
}

bool isDescendingDigitRun(const std::uint8_t* text, std::size_t n) noexcept {
  return wholeRun(text, n, [](std::uint8_t b) { return b == '0' ? int{'9'} : b - 1; });
}

bool isAscendingLetterRun(const std::uint8_t* text, std::size_t n) noexcept {
  return wholeRun(text, n, [](std::uint8_t b) {
    if (b == 'z') return int{'a'};
    if (b == 'Z') return int{'A'};
    return b + 1;
  });
}

bool isDescendingLetterRun(const std::uint8_t* text, std::size_t n) noexcept {
  return wholeRun(text, n, [](std::uint8_t b) {
    if (b == 'a') return int{'z'};
    if (b == 'A') return int{'Z'};
    return b - 1;
  });
}

}  // namespace tessel
