// PatternEngine: the library's own regular-expression engine, whole-text matching only.
//
// A pattern text is compiled into a tree of match nodes (pattern_nodes.h) held in an arena
// inside the engine; matching asks whether some way of matching the tree, tried in
// backtracking order (alternatives left to right, greedy repetitions longest first,
// reluctant ones shortest first, possessive ones never given back), consumes the entire text,
// and reports the group spans of the first such way. There is no search for a match inside
// the text.
//
// Syntax: literal bytes; '.' any byte (newline included); bracket sets with ranges, a leading
// '^' and named classes "[:alnum:]" / "[:^alnum:]"; a named class is also accepted on its own
// at the top level ("[:digit:]+"); \d \D \s \S \w \W; groups "( )", all capturing and numbered
// by their opening parenthesis; '|'; quantifiers * + ? {m} {m,} {m,n} (n < m means n = m),
// each optionally followed by '?' (reluctant) or '+' (possessive); "(?#...)" comments;
// assertions ^ $ \A \Z \z \b \B \G; back-references \1..\9, \gN, \g{N}, \g{-N}, \kN, \k{N},
// \k<N>; \Q...\E literal text; \L / \U ... \E case conversion of the literal bytes of the
// pattern; escapes \a \e \f \n \r \t \v \xHH \x{HH} \uHHHH (value at most 0xFF). Flags:
// kExtended (white space and '#' comments outside sets are ignored), kRightToLeft (the text
// is consumed from its end towards its start; spans are still reported start <= end).
//
// Decisions of this implementation:
// - A missing or empty pattern, and every malformed pattern, compile to an engine without a
//   node tree, which matches nothing (not even the empty text). Malformed includes:
//   unbalanced parentheses or brackets, a quantifier with nothing before it (also "a**"),
//   a '{' or '}' that is not part of a well-formed {m}, {m,} or {m,n}, counts above
//   2147483647, a reversed range "[z-a]", an unknown class name such as "[:foo:]",
//   a back-reference to a group that does not exist, a trailing backslash, an unterminated
//   "(?#", a "[:" without its closing ":]", and parenthesis nesting deeper than kMaxNesting.
// - The driver asks the root for its next way until one ends at the end of the text. Every
//   way is a distinct path and there are finitely many (loops never repeat an empty
//   iteration), so the search always ends. It also ends, without a match, when two ways in a
//   row both end where matching began (the no-progress rule of the whole-text match): apart
//   from patterns with several empty alternatives, such as "(||)|." against "c", a pattern
//   matches exactly when some way consumes the whole text.
// - Inside a set a backslash still escapes ("[\]\-]"), and \b there is backspace.
// - '^' and \A match at offset 0; '$' and \Z at the end or before a final '\n'; \z at the
//   end; \G at the position the match started from; \b and \B use \w (alnum and '_').
// - A back-reference to a group that has not taken part fails.
// - Repetitions: an optional iteration of a greedy (or possessive) loop that consumes nothing
//   is kept but ends the loop; a reluctant loop refuses an optional iteration that consumes
//   nothing (it asks that iteration for its next way instead); a mandatory iteration that
//   consumes nothing is taken to satisfy all remaining mandatory iterations.
// - Every match has a step budget (kDefaultPatternStepBudget, adjustable per context): one
//   step per repetition iteration, backtracking move or alternative tried, plus one per 16
//   bytes scanned or compared in bulk, so the work between two steps is bounded by the size
//   of the pattern. A match that exhausts the budget, or whose backtracking stack would pass
//   16 MiB, reports no match. Realistic patterns stay far below it (a whole 4092-byte text
//   against "[:print:]*[:digit:]+[:print:]*" takes about 4100 steps); it bounds hostile
//   patterns such as "(a*)*b" on long texts to tens of milliseconds.
//
// Threads: an engine is immutable after construction and may be matched from several threads
// at once, each with its own MatchContext. Native stack use is proportional to the nesting of
// the pattern (bounded by kMaxNesting), never to the length of the text: all backtracking
// state lives in the context's explicit stacks.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "pattern/arena.h"

namespace tessel {

class Node;

// Default number of repetition/alternation steps a single match may take.
constexpr std::int64_t kDefaultPatternStepBudget = 2000000;

// Match result: empty on failure; on success [1, N, start0, end0, ..., startN, endN] with N the
// highest group number, group 0 the whole match, -1 -1 for a group that did not take part.
using MatchResult = std::vector<std::int32_t>;

// Per-call working state of a match: the text, the positions, the backtracking stack and the
// capture array. Reusable across matches (the stacks keep their heap growth); never share
// one between threads. Members are the engine's working storage, not a caller API, except
// stepBudget.
class MatchContext {
 public:
  static constexpr std::size_t kInlineStack = 192;
  static constexpr std::size_t kInlineCaptures = 32;

  MatchContext() noexcept = default;
  ~MatchContext();
  MatchContext(const MatchContext&) = delete;
  MatchContext& operator=(const MatchContext&) = delete;

  // Steps allowed per match (see the header comment); applies from the next match on.
  std::int64_t stepBudget = kDefaultPatternStepBudget;

  const std::uint8_t* text = nullptr;
  std::int32_t length = 0;
  std::int32_t start = 0;       // where matching began (0, or length when right-to-left)
  std::int32_t pos = 0;         // current position
  std::int32_t end = 0;         // where a whole match must finish
  std::int32_t lastStart = -1;  // where the previous way of matching ended (no-progress rule)
  bool stoppedWithoutProgress = false;  // the last match ended on the no-progress rule
  std::int64_t stepsLeft = 0;
  // Steps taken by the last match: at most stepBudget + 1, the +1 meaning "gave up".
  std::int64_t stepsUsed() const noexcept { return stepBudget - stepsLeft; }

  std::int32_t* stack = inlineStack_;
  std::size_t top = 0;
  std::size_t capacity = kInlineStack;
  std::size_t highWater = 0;    // deepest stack use of the last match (tests, diagnostics)

  std::int32_t* captures = inlineCaptures_;  // 2 * (groups + 1) entries: raw entry/exit
  std::size_t captureSlots = kInlineCaptures;

  void push(std::int32_t v) {
    if (top == capacity) grow();
    stack[top++] = v;
  }
  std::int32_t pop() noexcept { return stack[--top]; }
  void step() {
    if (--stepsLeft < 0) abort();
  }
  // Charges a scan or comparison of `bytes` bytes: one step per 16 bytes. Like step(), it
  // never takes stepsUsed() past stepBudget + 1.
  void chargeBytes(std::int32_t bytes) {
    stepsLeft -= bytes >> 4;
    if (stepsLeft < 0) {
      stepsLeft = -1;
      abort();
    }
  }

  // Prepares for one match; false when the capture array cannot be sized.
  bool reset(const std::uint8_t* text, std::int32_t length, int groups, bool rightToLeft) noexcept;

  [[noreturn]] static void abort();  // unwinds to the engine: reported as no match

 private:
  void grow();

  std::int32_t inlineStack_[kInlineStack];
  std::int32_t inlineCaptures_[kInlineCaptures];
};

class PatternEngine {
 public:
  static constexpr std::uint32_t kRightToLeft = 0x10;
  static constexpr std::uint32_t kExtended = 0x20;
  static constexpr std::int32_t kUnbounded = 2147483647;
  static constexpr int kMaxNesting = 32;                       // parenthesis levels

  enum class Status : std::uint8_t { kCompiled, kEmptyPattern, kMalformed, kTooDeep, kNoMemory };

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

  bool hasTree() const noexcept { return root_ != nullptr; }
  Status status() const noexcept { return status_; }
  int groupCount() const noexcept { return groups_; }
  std::size_t heapBytes() const noexcept { return arena_.heapBytes(); }

  // The node tree in a compact text form for golden tests, "none" without a tree.
  std::string dump() const;

 private:
  void compile(const char* pattern, std::size_t length, std::uint32_t flags) noexcept;
  bool run(MatchContext& c, const std::uint8_t* text, std::size_t length) const noexcept;
  void destroyNodes() noexcept;

  Arena arena_;
  Node* root_ = nullptr;
  Node* owned_ = nullptr;   // every node, linked for destruction
  int groups_ = 0;
  bool rightToLeft_ = false;
  Status status_ = Status::kEmptyPattern;
};

}  // namespace tessel
