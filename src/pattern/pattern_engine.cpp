// PatternEngine: parser from tokens to a program, and the whole-text matcher.
//
// Program. Every instruction either consumes (kSet one byte, kStar a run of one-byte
// repetitions), branches (kAlt, tried in order), or is a control step. General repetitions
// are expanded: mandatory iterations are copies of the body; optional ones are either copies
// behind a kAlt each (bounded) or one body in a kAlt loop (unbounded). Each loop body ends
// with kLoopEnd, which ends the loop when the iteration consumed nothing. Possessive
// repetitions sit between kAtomicBegin and kAtomicEnd, which drops the alternatives the
// body left behind.
//
// Matching state is (pc, position, s): s counts the enclosing loops, outermost first, whose
// current iteration has consumed something (those that have not always form the innermost
// part of the nesting, so a count is enough). Without back-references nothing else decides
// how the rest of the pattern can go (the driver keeps no history of the ways it saw), so a
// state that failed once fails again: kAlt and kStar remember failed states (per position, s)
// and a kStar remembers which of its end positions failed as one interval. With
// back-references the captures are part of the state, so nothing is remembered and the step
// limit applies.
#include "pattern/pattern_engine.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <new>
#include <utility>

#include "pattern/pattern_lexer.h"

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
  std::int32_t memo;   // kAlt/kStar: memo point, or -1
};

enum class FrameKind : std::uint8_t { kAlt, kStar, kUndo, kFailMark, kAtomic };

struct PatternFrame {
  FrameKind kind;
  std::int32_t pc;       // kFailMark: memo point
  std::int32_t pos;
  std::int32_t s;
  std::int32_t x;        // kAlt: next alternative; kStar: next end; kUndo: slot
  std::int32_t y;        // kStar: end being tried; kUndo: old value
  std::int32_t z;        // kStar: last end
};

namespace {

const std::uint8_t kNoText[1] = {0};

struct CompileError {
  PatternEngine::Status status;
};

// A piece of program with jump targets relative to its own start.
struct Frag {
  std::vector<PatternInst> code;
  int required = -1;  // a byte every way through it consumes, or -1
  int set = -1;       // a lone one-byte atom: its set
};

PatternInst inst(Op op, std::int32_t a = 0, std::int32_t b = 0, std::int32_t c = 0,
                 std::uint8_t mode = 0) {
  return PatternInst{op, mode, 0, a, b, c, -1};
}

void checkSize(std::size_t size) {
  if (size > PatternEngine::kMaxProgram) throw CompileError{PatternEngine::Status::kTooLarge};
}

void append(Frag& dst, const Frag& src, int extraDepth = 0) {
  const auto offset = static_cast<std::int32_t>(dst.code.size());
  checkSize(dst.code.size() + src.code.size());
  for (PatternInst i : src.code) {
    if (i.op == Op::kJmp) i.a += offset;
    if (i.op == Op::kLoopEnd) {
      if (i.a >= 0) i.a += offset;
      i.b += offset;
    }
    i.depth += extraDepth;
    dst.code.push_back(i);
  }
  if (dst.required < 0) dst.required = src.required;
  dst.set = -1;
}

// Alternatives in order: kAlt count, one kJmp per alternative, the bodies, each but the last
// followed by a kJmp to the end.
Frag alternation(std::vector<Frag>& alts) {
  if (alts.size() == 1) return std::move(alts[0]);
  Frag r;
  const auto k = static_cast<std::int32_t>(alts.size());
  r.code.push_back(inst(Op::kAlt, k));
  for (std::int32_t i = 0; i < k; ++i) r.code.push_back(inst(Op::kJmp));
  std::vector<std::size_t> exits;
  int required = alts[0].required;
  for (std::int32_t i = 0; i < k; ++i) {
    r.code[1 + i].a = static_cast<std::int32_t>(r.code.size());
    append(r, alts[i]);
    if (i + 1 < k) {
      exits.push_back(r.code.size());
      r.code.push_back(inst(Op::kJmp));
    }
    if (alts[i].required != required) required = -1;
  }
  for (std::size_t e : exits) r.code[e].a = static_cast<std::int32_t>(r.code.size());
  r.required = required;
  r.set = -1;
  return r;
}

// The loop of an unbounded repetition: kAlt, two kJmp, body, kLoopEnd back to the kAlt. When
// `checkedFirst`, one mandatory iteration comes first and also ends the loop when it
// consumes nothing.
void unboundedLoop(Frag& r, const Frag& body, bool reluctant, bool checkedFirst,
                   std::vector<std::size_t>& exits) {
  std::size_t firstEnd = 0;
  if (checkedFirst) {
    append(r, body, 1);
    firstEnd = r.code.size();
    PatternInst end = inst(Op::kLoopEnd);
    end.depth = 1;
    exits.push_back(firstEnd);
    r.code.push_back(end);
  }
  const auto head = static_cast<std::int32_t>(r.code.size());
  if (checkedFirst) r.code[firstEnd].a = head;
  r.code.push_back(inst(Op::kAlt, 2));
  r.code.push_back(inst(Op::kJmp, head + 3));
  r.code.push_back(inst(Op::kJmp));
  if (reluctant) std::swap(r.code[static_cast<std::size_t>(head) + 1], r.code[static_cast<std::size_t>(head) + 2]);
  exits.push_back(static_cast<std::size_t>(head) + (reluctant ? 1 : 2));
  append(r, body, 1);
  PatternInst end = inst(Op::kLoopEnd, head);
  end.depth = 1;
  exits.push_back(r.code.size());
  r.code.push_back(end);
}

// One optional iteration of a bounded repetition: kAlt, two kJmp, body. Like a peer that
// unrolls bounded counts, the next copy is still tried after one that consumed nothing.
void optionalCopy(Frag& r, const Frag& body, bool reluctant, std::vector<std::size_t>& exits) {
  const auto head = static_cast<std::int32_t>(r.code.size());
  r.code.push_back(inst(Op::kAlt, 2));
  r.code.push_back(inst(Op::kJmp, head + 3));
  r.code.push_back(inst(Op::kJmp));
  if (reluctant) std::swap(r.code[static_cast<std::size_t>(head) + 1], r.code[static_cast<std::size_t>(head) + 2]);
  exits.push_back(static_cast<std::size_t>(head) + (reluctant ? 1 : 2));
  append(r, body);
}

Frag quantify(const Frag& atom, std::int64_t minimum, std::int64_t maximum, StarMode mode) {
  Frag r;
  if (maximum == 0) return r;
  const auto lo = static_cast<std::int32_t>(minimum);
  const auto hi = static_cast<std::int32_t>(maximum);
  if (atom.set >= 0) {
    r.code.push_back(inst(Op::kStar, atom.set, lo, hi, lo == hi ? kGreedy : mode));
    r.required = lo > 0 ? atom.required : -1;
    return r;
  }
  const bool unbounded = hi == PatternEngine::kUnbounded;
  const std::int64_t copies = minimum + (unbounded ? 1 : maximum - minimum);
  checkSize(static_cast<std::size_t>(copies) * (atom.code.size() + 4));
  const bool atomic = mode == kPossessive && lo != hi;
  if (atomic) r.code.push_back(inst(Op::kAtomicBegin));
  const std::int32_t plain = unbounded && lo > 0 ? lo - 1 : lo;
  for (std::int32_t i = 0; i < plain; ++i) append(r, atom);
  std::vector<std::size_t> exits;
  if (unbounded) {
    unboundedLoop(r, atom, mode == kReluctant, lo > 0, exits);
  } else {
    for (std::int32_t i = lo; i < hi; ++i) optionalCopy(r, atom, mode == kReluctant, exits);
  }
  const auto end = static_cast<std::int32_t>(r.code.size());
  for (std::size_t e : exits) {
    if (r.code[e].op == Op::kJmp) r.code[e].a = end;
    else r.code[e].b = end;
  }
  if (atomic) r.code.push_back(inst(Op::kAtomicEnd));
  r.required = lo > 0 ? atom.required : -1;
  r.set = -1;
  return r;
}

// Iterative parser: one frame per open parenthesis, so nesting costs heap, not native stack.
class Parser {
 public:
  Parser(const Token* t, std::size_t n, bool rtl, std::vector<ByteSet>& sets)
      : t_(t), n_(n), rtl_(rtl), sets_(sets) {}

  Frag parse() {
    frames_.emplace_back();
    while (i_ < n_) {
      const Token& t = t_[i_];
      if (special(i_, '|')) {
        Level& f = frames_.back();
        flush(f);
        f.alts.push_back(std::move(f.seq));
        f.seq = Frag{};
        ++i_;
      } else if (special(i_, '(')) {
        flush(frames_.back());
        if (groups_ == PatternEngine::kUnbounded) throw CompileError{PatternEngine::Status::kMalformed};
        frames_.emplace_back();
        frames_.back().group = ++groups_;
        ++i_;
      } else if (special(i_, ')')) {
        if (frames_.size() == 1) malformed();
        Level& f = frames_.back();
        const int group = f.group;
        Frag inner = close(f);
        frames_.pop_back();
        Frag g;
        g.code.push_back(inst(Op::kOpen, group));
        append(g, inner);
        g.code.push_back(inst(Op::kClose, group));
        g.required = inner.required;
        Level& parent = frames_.back();
        parent.atom = std::move(g);
        parent.hasAtom = true;
        ++i_;
      } else if (isQuantifier(i_)) {
        Level& f = frames_.back();
        if (!f.hasAtom) malformed();
        f.atom = quantifier(f.atom);
        flush(f);
      } else {
        Level& f = frames_.back();
        flush(f);
        f.atom = atom(t);
        f.hasAtom = true;
      }
    }
    if (frames_.size() != 1) malformed();
    if (maxBackref_ > groups_) malformed();
    return close(frames_.back());
  }

  int groups() const noexcept { return groups_; }
  bool backrefs() const noexcept { return maxBackref_ > 0; }

 private:
  struct Level {
    int group = 0;
    std::vector<Frag> alts;
    Frag seq;
    Frag atom;
    bool hasAtom = false;
  };

  [[noreturn]] static void malformed() { throw CompileError{PatternEngine::Status::kMalformed}; }

  bool special(std::size_t at, char c) const noexcept {
    return at < n_ && t_[at].kind == TokenKind::kSpecial && t_[at].value == static_cast<std::uint8_t>(c);
  }
  bool isQuantifier(std::size_t at) const noexcept {
    return special(at, '*') || special(at, '+') || special(at, '?') || special(at, '{');
  }

  // Moves the pending atom into the sequence (in front of it when matching right to left).
  void flush(Level& f) {
    if (!f.hasAtom) return;
    f.hasAtom = false;
    if (!rtl_) {
      append(f.seq, f.atom);
    } else {
      Frag joined = std::move(f.atom);
      append(joined, f.seq);
      f.seq = std::move(joined);
    }
    f.atom = Frag{};
  }

  Frag close(Level& f) {
    flush(f);
    f.alts.push_back(std::move(f.seq));
    return alternation(f.alts);
  }

  Frag oneByte(const ByteSet& s) {
    Frag r;
    r.set = static_cast<int>(sets_.size());
    sets_.push_back(s);
    r.code.push_back(inst(Op::kSet, r.set));
    int count = 0, only = -1;
    for (int b = 0; b < 256 && count < 2; ++b) {
      if (s.has(static_cast<std::uint8_t>(b))) {
        ++count;
        only = b;
      }
    }
    r.required = count == 1 ? only : -1;
    return r;
  }

  Frag single(Op op, std::int32_t a, std::uint8_t mode = 0) {
    Frag r;
    r.code.push_back(inst(op, a, 0, 0, mode));
    return r;
  }

  Frag atom(const Token& t) {
    ++i_;
    switch (t.kind) {
      case TokenKind::kByte: {
        ByteSet s;
        s.add(t.value);
        return oneByte(s);
      }
      case TokenKind::kClass: {
        ByteSet s = namedClassSet(static_cast<NamedClass>(t.value));
        if (t.negated) s.invert();
        return oneByte(s);
      }
      case TokenKind::kAssert:
        return single(Op::kAssert, 0, static_cast<std::uint8_t>(assertKind(t.value)));
      case TokenKind::kBackref:
        maxBackref_ = std::max(maxBackref_, t.number);
        return single(Op::kBackref, t.number);
      case TokenKind::kSpecial:
        break;
    }
    switch (t.value) {
      case '.': {
        ByteSet s;
        s.invert();
        return oneByte(s);
      }
      case '^': return single(Op::kAssert, 0, static_cast<std::uint8_t>(AssertKind::kLineStart));
      case '$': return single(Op::kAssert, 0, static_cast<std::uint8_t>(AssertKind::kLineEnd));
      case '[': return bracketSet();
      default: break;  // '{' or '}' out of place
    }
    malformed();
  }

  static AssertKind assertKind(std::uint8_t letter) noexcept {
    switch (letter) {
      case 'A': return AssertKind::kTextStart;
      case 'Z': return AssertKind::kTextEndOrNl;
      case 'z': return AssertKind::kTextEnd;
      case 'b': return AssertKind::kWordBoundary;
      case 'B': return AssertKind::kNotWordBoundary;
      default: return AssertKind::kMatchStart;
    }
  }

  bool rangeEnd(std::size_t at) const noexcept {
    return at < n_ && (t_[at].kind == TokenKind::kByte || special(at, '-'));
  }

  // After the '[': members up to the closing ']'.
  Frag bracketSet() {
    bool negated = false;
    if (special(i_, '^')) {
      negated = true;
      ++i_;
    }
    ByteSet members;
    for (;;) {
      if (i_ >= n_) malformed();
      const Token& t = t_[i_];
      if (special(i_, ']')) {
        ++i_;
        break;
      }
      if (t.kind == TokenKind::kClass) {
        ByteSet s = namedClassSet(static_cast<NamedClass>(t.value));
        if (t.negated) s.invert();
        members.addSet(s);
        ++i_;
        continue;
      }
      if (!rangeEnd(i_)) malformed();
      if (special(i_ + 1, '-') && rangeEnd(i_ + 2)) {
        const std::uint8_t lo = t.value, hi = t_[i_ + 2].value;
        if (hi < lo) malformed();
        members.addRange(lo, hi);
        i_ += 3;
      } else {
        members.add(t.value);
        ++i_;
      }
    }
    if (negated) members.invert();
    return oneByte(members);
  }

  bool number(std::int64_t* value) {
    std::int64_t v = 0;
    std::size_t digits = 0;
    while (i_ < n_ && t_[i_].kind == TokenKind::kByte && t_[i_].value >= '0' && t_[i_].value <= '9') {
      v = v * 10 + (t_[i_].value - '0');
      if (v > PatternEngine::kUnbounded) malformed();
      ++i_;
      ++digits;
    }
    *value = v;
    return digits > 0;
  }

  Frag quantifier(const Frag& a) {
    std::int64_t minimum = 0, maximum = PatternEngine::kUnbounded;
    const std::uint8_t q = t_[i_++].value;
    if (q == '+') {
      minimum = 1;
    } else if (q == '?') {
      maximum = 1;
    } else if (q == '{') {
      if (!number(&minimum)) malformed();
      if (special(i_, '}')) {
        maximum = minimum;
      } else {
        if (i_ >= n_ || t_[i_].kind != TokenKind::kByte || t_[i_].value != ',') malformed();
        ++i_;
        if (!special(i_, '}') && !number(&maximum)) malformed();
        if (maximum < minimum) maximum = minimum;
      }
      if (!special(i_, '}')) malformed();
      ++i_;
    }
    StarMode mode = kGreedy;
    if (special(i_, '?')) {
      mode = kReluctant;
      ++i_;
    } else if (special(i_, '+')) {
      mode = kPossessive;
      ++i_;
    }
    return quantify(a, minimum, maximum, mode);
  }

  const Token* t_;
  std::size_t n_;
  bool rtl_;
  std::vector<ByteSet>& sets_;
  std::vector<Level> frames_;
  std::size_t i_ = 0;
  int groups_ = 0;
  std::int32_t maxBackref_ = 0;
};

bool isWordAt(const std::uint8_t* text, std::int32_t n, std::int32_t i) noexcept {
  return i >= 0 && i < n && isClassMember(NamedClass::kWord, text[i]);
}

}  // namespace

// ---- context

MatchContext::MatchContext() noexcept = default;

MatchContext::~MatchContext() {
  for (std::uint8_t* row : memoRows_) std::free(row);
}

void MatchContext::noteBytes() noexcept {
  const std::size_t now = stack_.capacity() * sizeof(PatternFrame) +
                          slots_.capacity() * sizeof(std::int32_t) +
                          memoRows_.capacity() * sizeof(std::uint8_t*) +
                          starData_.capacity() * sizeof(std::int32_t) + memoBytes_;
  peakBytes_ = std::max(peakBytes_, now);
}

// ---- engine

PatternEngine::PatternEngine(const char* pattern, std::uint32_t flags) noexcept {
  compile(pattern, pattern != nullptr ? std::strlen(pattern) : 0, flags);
}

PatternEngine::PatternEngine(const char* pattern, std::size_t length, std::uint32_t flags) noexcept {
  compile(pattern, pattern != nullptr ? length : 0, flags);
}

PatternEngine::~PatternEngine() = default;

void PatternEngine::compile(const char* pattern, std::size_t length, std::uint32_t flags) noexcept {
  rightToLeft_ = (flags & kRightToLeft) != 0;
  if (length == 0) {
    status_ = Status::kEmptyPattern;
    return;
  }
  try {
    TokenList tokens;
    if (!lexPattern(pattern, length, flags, tokens)) {
      status_ = Status::kMalformed;
      return;
    }
    Parser parser(tokens.data(), tokens.size(), rightToLeft_, sets_);
    Frag root = parser.parse();
    root.code.push_back(inst(Op::kMatch));
    code_ = std::move(root.code);
    for (PatternInst& i : code_) {
      const bool branches = i.op == Op::kAlt || (i.op == Op::kStar && i.b != i.c && i.mode != kPossessive);
      if (branches) i.memo = memoPoints_++;
    }
    groups_ = parser.groups();
    backrefs_ = parser.backrefs();
    required_ = root.required;
    compiled_ = true;
    status_ = Status::kCompiled;
  } catch (const CompileError& e) {
    status_ = e.status;
  } catch (...) {
    status_ = Status::kNoMemory;
  }
  if (!compiled_) {
    code_.clear();
    sets_.clear();
    memoPoints_ = 0;
  }
}

namespace {

// The matcher proper; one object per run.
class Matcher {
 public:
  Matcher(MatchContext& c, std::vector<PatternFrame>& stack, std::vector<std::int32_t>& slots,
          std::vector<std::uint8_t*>& rows, std::vector<std::int32_t>& stars, std::size_t& memoBytes,
          const PatternInst* code, const ByteSet* sets, const std::uint8_t* text, std::int32_t n,
          bool rtl, bool backrefs, bool spans, int groups, MatchContext::Memo memo)
      : c_(c), stack_(stack), slots_(slots), rows_(rows), stars_(stars), memoBytes_(memoBytes),
        code_(code), sets_(sets), text_(text), n_(n), dir_(rtl ? -1 : 1), start_(rtl ? n : 0),
        end_(rtl ? 0 : n), backrefs_(backrefs), spans_(spans || backrefs),
        openBase_(2 * (groups + 1)), remember_(!backrefs && memo != MatchContext::Memo::kNever),
        memoFromStart_(memo == MatchContext::Memo::kAlways) {}

  // True on a whole match; throws std::bad_alloc when memory runs out.
  bool run(bool& gaveUp);

 private:
  std::int32_t avail(std::int32_t pos) const noexcept { return dir_ > 0 ? n_ - pos : pos; }
  std::uint8_t at(std::int32_t pos) const noexcept { return dir_ > 0 ? text_[pos] : text_[pos - 1]; }

  void push(FrameKind k, std::int32_t pc, std::int32_t pos, std::int32_t s, std::int32_t x = 0,
            std::int32_t y = 0, std::int32_t z = 0) {
    if (stack_.size() == stack_.capacity()) {
      stack_.reserve(std::max<std::size_t>(64, stack_.capacity() * 2));
      c_.noteBytes();
    }
    stack_.push_back(PatternFrame{k, pc, pos, s, x, y, z});
  }
  void setSlot(std::int32_t slot, std::int32_t value) {
    push(FrameKind::kUndo, 0, 0, 0, slot, slots_[static_cast<std::size_t>(slot)]);
    slots_[static_cast<std::size_t>(slot)] = value;
  }

  // One bit per (position, loop progress) of a memo point, allocated on its first failure.
  std::uint8_t* row(std::int32_t memo, std::int32_t depth, bool create) {
    std::uint8_t*& r = rows_[static_cast<std::size_t>(memo)];
    if (r == nullptr && create) {
      const std::size_t bytes = (static_cast<std::size_t>(depth + 1) * static_cast<std::size_t>(n_ + 1) + 7) / 8;
      r = static_cast<std::uint8_t*>(std::calloc(bytes, 1));
      if (r == nullptr) throw std::bad_alloc();
      memoBytes_ += bytes;
      c_.noteBytes();
    }
    return r;
  }
  std::size_t cell(std::int32_t pos, std::int32_t s) const noexcept {
    return static_cast<std::size_t>(s) * static_cast<std::size_t>(n_ + 1) + static_cast<std::size_t>(pos);
  }
  // True when (memo point, pos, s) is known to fail.
  bool knownFailure(const PatternInst& in, std::int32_t pos, std::int32_t s) const noexcept {
    if (!memoOn_ || in.memo < 0) return false;
    const std::uint8_t* r = rows_[static_cast<std::size_t>(in.memo)];
    if (r == nullptr) return false;
    const std::size_t k = cell(pos, s);
    return (r[k / 8] >> (k % 8) & 1) != 0;
  }
  void recordFailure(const PatternFrame& f) {
    const PatternInst& in = code_[f.pc];
    std::uint8_t* r = row(in.memo, in.depth, true);
    const std::size_t k = cell(f.pos, f.s);
    r[k / 8] = static_cast<std::uint8_t>(r[k / 8] | 1u << (k % 8));
  }

  // kStar bookkeeping, 6 ints per memo point: run start and end, failed ends lo..hi, emitted,
  // run complete.
  std::int32_t* star(const PatternInst& in) { return stars_.data() + 6 * static_cast<std::size_t>(in.memo); }
  // Members of the star's set from `pos` on, at most `limit`. Each branching star keeps the run
  // it measured last ([from, to), `to` its true end when complete) and extends it on demand, so
  // the visits of one run scan each byte once.
  std::int32_t runLength(const PatternInst& in, std::int32_t pos, std::int32_t limit) {
    const ByteSet& set = sets_[in.a];
    const std::int32_t room = avail(pos);
    if (in.memo < 0) {
      std::int32_t k = 0;
      while (k < limit && set.has(at(pos + dir_ * k))) ++k;
      return k;
    }
    std::int32_t* d = star(in);
    const bool inside = d[0] >= 0 && (dir_ > 0 ? d[0] <= pos && pos <= d[1] : d[1] <= pos && pos <= d[0]);
    if (!inside) {
      // Scanning up to the run measured before joins it: a visit right before the last one
      // costs one byte, not the whole run.
      const std::int32_t oldFrom = d[0], oldTo = d[1], oldComplete = d[5];
      std::int32_t k = 0;
      bool joined = false;
      while (k < limit && k < room && set.has(at(pos + dir_ * k))) {
        ++k;
        if (oldFrom >= 0 && pos + dir_ * k == oldFrom) {
          joined = true;
          break;
        }
      }
      d[0] = pos;
      d[1] = joined ? oldTo : pos + dir_ * k;
      d[5] = joined ? oldComplete : (k < limit ? 1 : 0);
      if (!joined) return k;
    }
    std::int32_t k = (d[1] - pos) * dir_;
    if (k >= limit || d[5] != 0) return std::min(k, limit);
    while (k < limit && k < room && set.has(at(pos + dir_ * k))) ++k;
    d[1] = pos + dir_ * k;
    d[5] = k < limit ? 1 : 0;
    return k;
  }
  void starEndFailed(const PatternInst& in, std::int32_t end) {
    std::int32_t* d = star(in);
    if (d[2] <= d[3] && end >= d[2] - 1 && end <= d[3] + 1) {
      d[2] = std::min(d[2], end);
      d[3] = std::max(d[3], end);
    } else {
      d[2] = d[3] = end;
    }
  }
  // Next end to try from `q`, stepping by `step`, jumping over ends known to fail.
  std::int32_t skipFailedEnds(const PatternInst& in, std::int32_t p, std::int32_t q, std::int32_t step) {
    if (!remember_ || q == p) return q;
    const std::int32_t* d = star(in);
    if (d[2] > d[3] || q < d[2] || q > d[3]) return q;
    std::int32_t next = step < 0 ? d[2] - 1 : d[3] + 1;
    if ((q > p && next < p) || (q < p && next > p)) next = p;
    return next;
  }

  MatchContext& c_;
  std::vector<PatternFrame>& stack_;
  std::vector<std::int32_t>& slots_;
  std::vector<std::uint8_t*>& rows_;
  std::vector<std::int32_t>& stars_;
  std::size_t& memoBytes_;
  const PatternInst* code_;
  const ByteSet* sets_;
  const std::uint8_t* text_;
  std::int32_t n_;
  std::int32_t dir_;
  std::int32_t start_;
  std::int32_t end_;
  bool backrefs_;
  bool spans_;
  std::int32_t openBase_;
  bool remember_;  // failed states may be remembered: no back-references, not plain mode
  bool memoFromStart_;
  bool memoOn_ = false;
};

bool Matcher::run(bool& gaveUp) {
  std::int32_t pc = 0, pos = start_, s = 0;
  std::int64_t steps = 0;
  // Remembering failures costs a little per branch; a match that backtracks less than about
  // twice the text length never needs it.
  std::int64_t resumesBeforeMemo = !remember_ ? -1 : memoFromStart_ ? 1 : 2 * static_cast<std::int64_t>(n_) + 32;
  memoOn_ = remember_ && memoFromStart_;
  for (;;) {
    if (!remember_ && ++steps > kBackrefStepLimit) {
      gaveUp = true;
      return false;
    }
    const PatternInst& in = code_[pc];
    bool ok = true;
    switch (in.op) {
      case Op::kSet:
        if (avail(pos) > 0 && sets_[in.a].has(at(pos))) {
          pos += dir_;
          s = in.depth;
          ++pc;
        } else {
          ok = false;
        }
        break;
      case Op::kStar: {
        const std::int32_t p = pos;
        if (in.memo < 0 && in.mode != kPossessive) {  // fixed count
          if (avail(p) < in.b || runLength(in, p, in.b) != in.b) {
            ok = false;
            break;
          }
          pos = p + dir_ * in.b;
        } else {
          if (knownFailure(in, p, s)) {
            ok = false;
            break;
          }
          const std::int32_t len = runLength(in, p, std::min(in.c, avail(p)));
          if (len < in.b) {
            ok = false;
            break;
          }
          if (in.mode == kPossessive) {
            pos = p + dir_ * len;
          } else {
            if (memoOn_) push(FrameKind::kFailMark, pc, p, s);
            const std::int32_t first = in.mode == kGreedy ? p + dir_ * len : p + dir_ * in.b;
            const std::int32_t last = in.mode == kGreedy ? p + dir_ * in.b : p + dir_ * len;
            const std::int32_t step = (in.mode == kGreedy) == (dir_ > 0) ? -1 : 1;
            const std::int32_t q = skipFailedEnds(in, p, first, step);
            if ((q - last) * step > 0) {
              ok = false;  // every end is known to fail
              break;
            }
            push(FrameKind::kStar, pc, p, s, q + step, q, last);
            pos = q;
          }
        }
        if (pos != p) s = in.depth;
        ++pc;
        break;
      }
      case Op::kAlt:
        if (knownFailure(in, pos, s)) {
          ok = false;
          break;
        }
        if (memoOn_) push(FrameKind::kFailMark, pc, pos, s);
        push(FrameKind::kAlt, pc, pos, s, 1);
        pc = code_[pc + 1].a;
        break;
      case Op::kJmp:
        pc = in.a;
        break;
      case Op::kOpen:
        if (spans_) setSlot(openBase_ + in.a, pos);
        ++pc;
        break;
      case Op::kClose:
        if (spans_) {
          setSlot(2 * in.a, slots_[static_cast<std::size_t>(openBase_ + in.a)]);
          setSlot(2 * in.a + 1, pos);
        }
        ++pc;
        break;
      case Op::kAssert: {
        switch (static_cast<AssertKind>(in.mode)) {
          case AssertKind::kLineStart:
          case AssertKind::kTextStart: ok = pos == 0; break;
          case AssertKind::kLineEnd:
          case AssertKind::kTextEndOrNl: ok = pos == n_ || (pos == n_ - 1 && text_[pos] == '\n'); break;
          case AssertKind::kTextEnd: ok = pos == n_; break;
          case AssertKind::kWordBoundary: ok = isWordAt(text_, n_, pos - 1) != isWordAt(text_, n_, pos); break;
          case AssertKind::kNotWordBoundary: ok = isWordAt(text_, n_, pos - 1) == isWordAt(text_, n_, pos); break;
          case AssertKind::kMatchStart: ok = pos == start_; break;
        }
        ++pc;
        break;
      }
      case Op::kBackref: {
        const std::int32_t a = slots_[2 * static_cast<std::size_t>(in.a)];
        const std::int32_t b = slots_[2 * static_cast<std::size_t>(in.a) + 1];
        if (a < 0 || b < 0) {
          ok = false;
          break;
        }
        const std::int32_t from = std::min(a, b), len = a < b ? b - a : a - b;
        if (avail(pos) < len) {
          ok = false;
          break;
        }
        const std::uint8_t* here = dir_ > 0 ? text_ + pos : text_ + pos - len;
        if (len > 0 && std::memcmp(here, text_ + from, static_cast<std::size_t>(len)) != 0) {
          ok = false;
          break;
        }
        if (len > 0) {
          pos += dir_ * len;
          s = in.depth;
        }
        ++pc;
        break;
      }
      case Op::kLoopEnd: {
        const bool progressed = s >= in.depth;
        s = std::min(s, in.depth - 1);
        pc = !progressed ? in.b : in.a >= 0 ? in.a : pc + 1;
        break;
      }
      case Op::kAtomicBegin:
        push(FrameKind::kAtomic, pc, pos, s);
        ++pc;
        break;
      case Op::kAtomicEnd: {
        std::size_t mark = stack_.size();
        while (stack_[mark - 1].kind != FrameKind::kAtomic) --mark;
        std::size_t keep = mark - 1;
        for (std::size_t k = mark; k < stack_.size(); ++k) {
          if (stack_[k].kind == FrameKind::kUndo) stack_[keep++] = stack_[k];
        }
        stack_.resize(keep);
        ++pc;
        break;
      }
      case Op::kMatch:
        if (pos == end_) {
          slots_[0] = start_;
          slots_[1] = pos;
          return true;
        }
        ok = false;
        break;
    }
    if (ok) continue;

    // Backtrack to the most recent alternative.
    for (;;) {
      if (stack_.empty()) return false;
      PatternFrame& f = stack_.back();
      if (f.kind == FrameKind::kUndo) {
        slots_[static_cast<std::size_t>(f.x)] = f.y;
        stack_.pop_back();
        continue;
      }
      if (f.kind == FrameKind::kFailMark) {
        recordFailure(f);
        stack_.pop_back();
        continue;
      }
      if (f.kind == FrameKind::kAtomic) {
        stack_.pop_back();
        continue;
      }
      if (!remember_ && ++steps > kBackrefStepLimit) {
        gaveUp = true;
        return false;
      }
      if (resumesBeforeMemo > 0 && --resumesBeforeMemo == 0) memoOn_ = true;
      if (f.kind == FrameKind::kAlt) {
        const PatternInst& alt = code_[f.pc];
        const std::int32_t i = f.x;
        pc = code_[f.pc + 1 + i].a;
        pos = f.pos;
        s = f.s;
        if (i + 1 < alt.a) {
          f.x = i + 1;
        } else {
          stack_.pop_back();
        }
        break;
      }
      // kStar: the end f.y failed; try the next one.
      const PatternInst& st = code_[f.pc];
      if (f.y != f.pos && remember_) starEndFailed(st, f.y);
      const std::int32_t step = (st.mode == kGreedy) == (dir_ > 0) ? -1 : 1;
      const std::int32_t q = skipFailedEnds(st, f.pos, f.x, step);
      if ((q - f.z) * step > 0) {
        stack_.pop_back();
        continue;
      }
      f.y = q;
      f.x = q + step;
      pos = q;
      s = q != f.pos ? st.depth : f.s;
      pc = f.pc + 1;
      break;
    }
  }
}

}  // namespace

bool PatternEngine::run(MatchContext& c, const std::uint8_t* text, std::size_t length,
                        bool spans) const noexcept {
  c.gaveUp_ = false;
  if (!compiled_ || length > static_cast<std::size_t>(kUnbounded) / 2) return false;
  const auto n = static_cast<std::int32_t>(length);
  if (text == nullptr) text = kNoText;
  if (required_ >= 0 && std::memchr(text, required_, length) == nullptr) return false;
  bool matched = false;
  try {
    c.stack_.clear();
    c.slots_.assign(3 * (static_cast<std::size_t>(groups_) + 1), -1);
    c.memoRows_.assign(static_cast<std::size_t>(memoPoints_), nullptr);
    c.starData_.resize(6 * static_cast<std::size_t>(memoPoints_));
    for (std::size_t i = 0; i < c.starData_.size(); i += 6) {
      c.starData_[i] = -1;  // no run scanned
      c.starData_[i + 2] = 1;  // no failed ends
      c.starData_[i + 3] = 0;
    }
    c.memoBytes_ = 0;
    c.noteBytes();
    Matcher m(c, c.stack_, c.slots_, c.memoRows_, c.starData_, c.memoBytes_, code_.data(),
              sets_.data(), text, n, rightToLeft_, backrefs_, spans, groups_, c.memo_);
    matched = m.run(c.gaveUp_);
  } catch (...) {
    matched = false;
  }
  for (std::uint8_t*& row : c.memoRows_) {
    std::free(row);
    row = nullptr;
  }
  c.memoBytes_ = 0;
  return matched;
}

bool PatternEngine::matches(const std::uint8_t* text, std::size_t length,
                            MatchContext* context) const noexcept {
  if (!compiled_) return false;
  if (context != nullptr) return run(*context, text, length, false);
  MatchContext local;
  return run(local, text, length, false);
}

MatchResult PatternEngine::matchExact(const std::uint8_t* text, std::size_t length,
                                      MatchContext* context) const noexcept {
  if (!compiled_) return {};
  MatchContext local;
  MatchContext& c = context != nullptr ? *context : local;
  if (!run(c, text, length, true)) return {};
  MatchResult result;
  try {
    result.reserve(2 + 2 * (static_cast<std::size_t>(groups_) + 1));
  } catch (...) {
    return {};
  }
  result.push_back(1);
  result.push_back(groups_);
  for (int g = 0; g <= groups_; ++g) {
    const std::int32_t a = c.slots_[2 * static_cast<std::size_t>(g)];
    const std::int32_t b = c.slots_[2 * static_cast<std::size_t>(g) + 1];
    result.push_back(a < b ? a : b);
    result.push_back(a < b ? b : a);
  }
  return result;
}

}  // namespace tessel
