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
//   its closing ":]". Nesting depth has no limit: parsing and matching use explicit stacks.
//   A pattern whose program would pass kMaxProgram instructions (counted repetitions are
//   expanded) is refused as kTooLarge.
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
// Cost: for a pattern without back-references a way's outcome from a given instruction and
// position does not depend on how it got there, so the matcher remembers the (instruction,
// position) states already found to fail and never explores one twice; time and memory are
// bounded by program size x text length, with no step limit. Patterns with back-references
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
  // the same in every mode (kNever has the step limit of back-references); the last two let
  // tests compare the memo with plain backtracking.
  enum class Memo : std::uint8_t { kAuto, kAlways, kNever };
  void setMemo(Memo memo) noexcept { memo_ = memo; }

  // The last match stopped on kBackrefStepLimit (reported as no match).
  bool gaveUp() const noexcept { return gaveUp_; }
  // Heap bytes the working state held at its largest, over this context's life.
  std::size_t peakBytes() const noexcept { return peakBytes_; }
  // Updates peakBytes() after the matcher grew a buffer.
  void noteBytes() noexcept;

 private:
  friend class PatternEngine;

  std::vector<PatternFrame> stack_;
  std::vector<std::int32_t> slots_;        // captures, then the open positions of groups
  std::vector<std::uint8_t*> memoRows_;    // per branching instruction, allocated on first use
  std::vector<std::int32_t> starData_;     // per single-byte repetition: run and failed targets
  std::size_t memoBytes_ = 0;
  std::size_t peakBytes_ = 0;
  Memo memo_ = Memo::kAuto;
  bool gaveUp_ = false;
};

class PatternEngine {
 public:
  static constexpr std::uint32_t kRightToLeft = 0x10;
  static constexpr std::uint32_t kExtended = 0x20;
  static constexpr std::int32_t kUnbounded = 2147483647;
  static constexpr std::size_t kMaxProgram = std::size_t{1} << 20;  // instructions

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

  bool hasTree() const noexcept { return compiled_; }
  Status status() const noexcept { return status_; }
  int groupCount() const noexcept { return groups_; }
  bool hasBackrefs() const noexcept { return backrefs_; }

 private:
  void compile(const char* pattern, std::size_t length, std::uint32_t flags) noexcept;
  bool run(MatchContext& c, const std::uint8_t* text, std::size_t length, bool spans) const noexcept;

  std::vector<PatternInst> code_;
  std::vector<ByteSet> sets_;
  int groups_ = 0;
  int memoPoints_ = 0;
  int stars_ = 0;
  int required_ = -1;  // a byte every match must contain, or -1
  bool backrefs_ = false;
  bool compiled_ = false;
  bool rightToLeft_ = false;
  Status status_ = Status::kEmptyPattern;
};

}  // namespace tessel
