// The compiled form of a pattern, shared by the compiler (pattern_compiler.cpp) and the matcher
// (pattern_matcher.cpp); private to the pattern engine.
//
// A program is a flat instruction array ending in kMatch. Every instruction either consumes
// (kSet one byte, kStar a run of one-byte repetitions), branches (kAlt, tried in order), or is
// a control step. General repetitions are expanded: mandatory iterations are copies of the
// body; optional ones are either copies behind a kAlt each (bounded) or one body in a kAlt loop
// (unbounded). Each loop body ends with kLoopEnd, which ends the loop when the iteration
// consumed nothing. Possessive repetitions sit between kAtomicBegin and kAtomicEnd, which drops
// the alternatives the body left behind.
//
// Matching state is (pc, position, s), s counting the enclosing loops, outermost first, whose
// current iteration has consumed something. The memo points, whose failed states the matcher
// remembers, are every branch (kAlt, a kStar with a choice of ends) and every instruction
// reached from more than one place (jump targets), so that with the memo on each state runs at
// most once. A memo point owns depth + 1 rows of the memo (one per value of s), starting at
// row `memo`; the weight of a program, the sum over its instructions of depth + 1 (times 4 for
// a kStar with a choice of ends, whose visits try several ends), bounds the work per text
// position.
#pragma once

#include <cstdint>

namespace tessel {

enum class Op : std::uint8_t {
  kSet, kStar, kAlt, kJmp, kOpen, kClose, kAssert, kBackref, kLoopEnd, kAtomicBegin,
  kAtomicEnd, kMatch,
};

enum class AssertKind : std::uint8_t {
  kLineStart, kLineEnd, kTextStart, kTextEndOrNl, kTextEnd, kWordBoundary, kNotWordBoundary,
  kMatchStart,
};

enum StarMode : std::uint8_t { kGreedy = 0, kReluctant = 1, kPossessive = 2 };

struct PatternInst {
  Op op;
  std::uint8_t mode;   // kStar: StarMode; kAssert: AssertKind
  std::int32_t depth;  // number of loop bodies around this instruction
  std::int32_t a;      // kSet/kStar: set; kAlt: count; kJmp: target; groups; kLoopEnd: next or -1
  std::int32_t b;      // kStar: minimum; kLoopEnd: exit
  std::int32_t c;      // kStar: maximum
  std::int32_t memo;   // first memo row, or -1
  std::int32_t star;   // branching kStar: its slot of run and failed-end bookkeeping, or -1
};

}  // namespace tessel
