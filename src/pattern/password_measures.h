// Measures and class predicates of a password text, used by the strength ratings and rules.
//
// All functions take the text as bytes plus length and allocate nothing. The class
// predicates are whole-text matches of eleven patterns compiled once per process (behind a
// function-local static, so the first use from any thread compiles them exactly once) and
// only read afterwards; each call matches with its own context on the stack. Only ASCII
// letters, digits, punctuation and the space character belong to a class, so a control byte
// or a byte of 0x80 and above makes every "all ..." and "contains ..." predicate false.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tessel {

enum class ClassPredicate : std::uint8_t {
  kAllDigits,      // "[:digit:]+"
  kContainsDigit,  // "[:print:]*[:digit:]+[:print:]*"
  kAllLetters,     // "[:alpha:]+"
  kContainsLetter, // "[:print:]*[:alpha:]+[:print:]*"
  kAllLower,       // "[a-z]{1,}"
  kAllUpper,       // "[A-Z]{1,}"
  kAllPunct,       // "[:punct:]+"
  kContainsPunct,  // "[:print:]*[:punct:]+[:print:]*"
  kAllAlnum,       // "[:alnum:]+"
  kDigitsPunct,    // "[[:digit:][:punct:]]+"
  kLettersPunct,   // "[[:alpha:][:punct:]]+"
};
constexpr int kClassPredicateCount = 11;

// The pattern text behind a predicate (for tests and diagnostics).
const char* classPredicatePattern(ClassPredicate p) noexcept;

// True when the whole text matches the predicate's pattern; false for the empty text.
bool classPredicate(ClassPredicate p, const std::uint8_t* text, std::size_t n) noexcept;

// Highest number of occurrences of any one byte; 0 for the empty text.
std::size_t maxCharFrequency(const std::uint8_t* text, std::size_t n) noexcept;
// n == maxCharFrequency (true for the empty text).
bool isAllSameChar(const std::uint8_t* text, std::size_t n) noexcept;
// Longest run of identical adjacent bytes; 0 for the empty text.
std::size_t longestRepeatRun(const std::uint8_t* text, std::size_t n) noexcept;
// Longest run of successive characters starting at a letter or digit, where '9' is followed
// by '0', 'Z' by 'A', 'z' by 'a' and any other byte by the next byte value; a run starting
// at any other byte has length 1; 0 for the empty text. Descending: the same with
// predecessors, where '0' is followed by '9', 'A' by 'Z' and 'a' by 'z'.
std::size_t longestAscendingRun(const std::uint8_t* text, std::size_t n) noexcept;
std::size_t longestDescendingRun(const std::uint8_t* text, std::size_t n) noexcept;
// Whole-text steps of +1 / -1 by byte value, with the digit or letter wrap-arounds; true
// for fewer than two bytes. The byte classes are deliberately not checked ("abc" is an
// ascending digit run, "89:" an ascending letter run).
bool isAscendingDigitRun(const std::uint8_t* text, std::size_t n) noexcept;
bool isDescendingDigitRun(const std::uint8_t* text, std::size_t n) noexcept;
bool isAscendingLetterRun(const std::uint8_t* text, std::size_t n) noexcept;
bool isDescendingLetterRun(const std::uint8_t* text, std::size_t n) noexcept;

}  // namespace tessel
