// PatternEngine: the library's own regular-expression engine, whole-text matching only.
//
// A pattern text is compiled into a small program (a flat instruction array); matching asks
// whether some way of matching it, tried in backtracking order (alternatives left to right,
// greedy repetitions longest first, reluctant ones shortest first, possessive ones never
// given back), consumes the entire text, and reports the group spans of the first such way.
// There is no search for a match inside the text.
//
// Syntax: literal bytes; '.' any byte (newline included); bracket sets with ranges, a leading
// '^' and named classes "[:alnum:]" / "[:^alnum:]"; a named class is also accepted on its own
// at the top level ("[:digit:]+"); \d \D \s \S \w \W; groups "( )", all capturing and numbered
// by their opening parenthesis; '|'; quantifiers * + ? {m} {m,} {m,n} (n < m means n = m),
// each optionally followed by '?' (reluctant) or '+' (possessive); "(?#...)" comments;
// assertions ^ $ \A \Z \z \b \B \G; back-references \gN, \g{N}, \g{-N}, \kN, \k{N}, \k<N>
// (an escaped digit such as \1 is the digit itself); \Q...\E literal text; \L / \U ... \E
// case conversion of the literal bytes of the pattern; escapes \a \e \f \n \r \t \v \xHH
// \x{HH} \uHHHH (value at most 0xFF). Flags: kExtended (white space and '#' comments outside
// sets are ignored), kRightToLeft (the text is consumed from its end towards its start;
// spans are still reported start <= end).
//
// Decisions of this implementation:
// - A missing or empty pattern, and every malformed pattern, compile to an engine without a
//   program, which matches nothing (not even the empty text). Malformed includes: unbalanced
//   parentheses or brackets, a quantifier with nothing before it (also "a**"), a '{' or '}'
//   that is not part of a well-formed {m}, {m,} or {m,n}, counts above 2147483647, a
//   reversed range "[z-a]", an unknown class name such as "[:foo:]", a back-reference to a
//   group that does not exist, a trailing backslash, an unterminated "(?#", a "[:" without
//   its closing ":]". Nesting depth has no limit of its own: parsing and matching use
//   explicit stacks.
// - A pattern whose program would weigh more than kMaxWeight is refused as kTooLarge (and so
//   never matches). The weight is the sum over the instructions of their loop depth + 1 (4
//   times that for a repeated byte or set with a choice of lengths); counted repetitions of
//   anything else are expanded into copies of their body, so "(ab){500}" weighs 2001,
//   "(a|b){0,80000}" and 30 nested loops "((…(a)*…)*)*" are refused, and "[a-z]{0,80000}"
//   weighs 4. The bound keeps every match within interactive time and memory (below).
// - Whole-text driver: the ways of matching are tried in order until one ends at the end of
//   the text. It keeps no rule over the ways it has seen: empty iterations end their loop
//   (below), so the search always ends, and no alternative is made unreachable.
// - Repetitions: mandatory iterations are all run, even when they consume nothing; an
//   optional iteration that consumes nothing is kept but ends the loop (greedy, reluctant
//   and possessive alike).
// - Inside a set a backslash is a plain byte: "[a-z\]" is a to z and the backslash, "[\d]" the
//   backslash and 'd'.
// - '^' and \A match at offset 0; '$' and \Z at the end or before a final '\n'; \z at the
//   end; \G at the position the match started from; \b and \B use \w (alnum and '_').
// - A back-reference sees the group's last completed capture of the current way: inside its
//   own group's first pass it is unset, and an unset group makes it fail.
//
// Cost: for a pattern without back-references a way's outcome from a given instruction,
// position and loop progress does not depend on how it got there, so the matcher remembers the
// states already found to fail and never explores one twice: time is bounded by weight x text
// length, and the remembered states take one bit each (at most kMaxWeight x 4093 bits, 1 MiB,
// for the longest content), with no step limit. Compiling takes time linear in the pattern
// (a refused one stops writing its program at the bound); a compiled engine holds at most
// kMaxWeight instructions. Patterns with back-references
// cannot share states that way: they run plain backtracking limited to kBackrefStepLimit
// steps (one per instruction executed or alternative resumed); a match that reaches the limit
// reports no match (MatchContext::gaveUp() tells).
//
// Threads: an engine is immutable after construction and may be matched from several threads
// at once, each with its own MatchContext.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "pattern/char_class.h"

namespace tessel {

// Steps a match of a pattern with back-references may take (see the header comment).
constexpr std::int64_t kBackrefStepLimit = 1000000;

// Match result: empty on failure; on success [1, N, start0, end0, ..., startN, endN] with N the
// highest group number, group 0 the whole match, -1 -1 for a group that did not take part.
using MatchResult = std::vector<std::int32_t>;

struct PatternInst;
struct PatternFrame;
class Matcher;

// Per-call working state of a match: the backtracking stack, the captures and the table of
// failed states. Reusable across matches (buffers keep their size); never share one between
// threads.
class MatchContext {
 public:
  MatchContext() noexcept;
  ~MatchContext();
  MatchContext(const MatchContext&) = delete;
  MatchContext& operator=(const MatchContext&) = delete;

  // When failed states are remembered: kAuto once the search has backtracked about twice the
  // text length; kAlways from the first step; kNever (plain backtracking). Outcome and spans are
  // the same in every mode, except that kNever gives up after kBackrefStepLimit / 10 steps
  // (without back-references); the last two let tests compare the memo with plain backtracking.
  enum class Memo : std::uint8_t { kAuto, kAlways, kNever };
  void setMemo(Memo memo) noexcept { memo_ = memo; }

  // The last match stopped on kBackrefStepLimit (reported as no match).
  bool gaveUp() const noexcept { return gaveUp_; }
  // Heap bytes the working state held at its largest, over this context's life.
  std::size_t peakBytes() const noexcept { return peakBytes_; }

 private:
  friend class PatternEngine;
  friend class Matcher;
  void noteBytes() noexcept;  // updates peakBytes() after the matcher grew a buffer

  std::vector<PatternFrame> stack_;
  std::vector<std::int32_t> slots_;     // captures, then the open positions of groups
  std::vector<std::uint64_t> failed_;   // one bit per memo row and position, once the memo is on
  std::vector<std::int32_t> starData_;  // per branching single-byte repetition: run, failed ends
  std::size_t peakBytes_ = 0;
  Memo memo_ = Memo::kAuto;
  bool gaveUp_ = false;
};

class PatternEngine {
 public:
  static constexpr std::uint32_t kRightToLeft = 0x10;
  static constexpr std::uint32_t kExtended = 0x20;
  static constexpr std::int32_t kUnbounded = 2147483647;
  static constexpr std::size_t kMaxWeight = 2048;  // see the header comment

  enum class Status : std::uint8_t { kCompiled, kEmptyPattern, kMalformed, kTooLarge, kNoMemory };

  // Compiles a NUL-terminated pattern (null allowed). Never fails visibly: see Status.
  explicit PatternEngine(const char* pattern, std::uint32_t flags = 0) noexcept;
  // The same for a pattern given with its length (may contain NUL bytes).
  PatternEngine(const char* pattern, std::size_t length, std::uint32_t flags) noexcept;
  ~PatternEngine();
  PatternEngine(const PatternEngine&) = delete;
  PatternEngine& operator=(const PatternEngine&) = delete;

  // Whole-text match; see MatchResult. With no context a local one is used. Never throws.
  MatchResult matchExact(const std::uint8_t* text, std::size_t length,
                         MatchContext* context = nullptr) const noexcept;
  MatchResult matchExact(const char* text, std::size_t length,
                         MatchContext* context = nullptr) const noexcept {
    return matchExact(reinterpret_cast<const std::uint8_t*>(text), length, context);
  }

  // Whole-text match without building the result array (the key-press path).
  bool matches(const std::uint8_t* text, std::size_t length,
               MatchContext* context = nullptr) const noexcept;

  Status status() const noexcept { return status_; }
  int groupCount() const noexcept { return groups_; }
  bool hasBackrefs() const noexcept { return backrefs_; }

 private:
  void compile(const char* pattern, std::size_t length, std::uint32_t flags) noexcept;  // compiler
  void markMemoPoints();                                                                 // compiler
  bool run(MatchContext& c, const std::uint8_t* text, std::size_t length, bool spans) const noexcept;

  std::vector<PatternInst> code_;
  std::vector<ByteSet> sets_;
  int groups_ = 0;
  std::int32_t memoRows_ = 0;  // rows of the memo, one per (memo point, loop progress)
  std::int32_t stars_ = 0;
  int required_ = -1;  // a byte every match must contain, or -1
  bool backrefs_ = false;
  bool rightToLeft_ = false;
  Status status_ = Status::kEmptyPattern;
};

}  // namespace tessel
