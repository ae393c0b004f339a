// Pattern matcher: runs a program (pattern_program.h) against a whole text. Exposes
// PatternEngine's match calls and MatchContext; the Matcher class is private to this file.
//
// Depth-first backtracking over the program with an explicit stack of frames: alternatives to
// resume (kAlt, kStar), captures to undo, atomic marks, and fail marks. A fail mark is pushed
// when a memo point is entered and recorded in the context's bitmap when backtracking pops it,
// which happens only once every way from that state has failed. Without back-references nothing
// but the state (pc, position, s) decides how the rest of the match goes, so a state found in
// the bitmap fails at once; a kStar also remembers which of its ends failed, as one interval of
// positions, and jumps over them. The memo starts once the search has resumed about twice the
// text length alternatives (a match that backtracks less never needs it); before that, and for
// patterns with back-references, the search is plain backtracking, which the step limit bounds
// when back-references make the memo unsound.
#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <new>

#include "pattern/pattern_engine.h"
#include "pattern/pattern_program.h"

namespace tessel {

enum class FrameKind : std::uint8_t { kAlt, kStar, kUndo, kFailMark, kAtomic };

struct PatternFrame {
  FrameKind kind;
  std::int32_t pc;
  std::int32_t pos;
  std::int32_t s;
  std::int32_t x;  // kAlt: next alternative; kStar: next end; kUndo: slot
  std::int32_t y;  // kStar: end being tried; kUndo: old value
  std::int32_t z;  // kStar: last end
};

namespace {

const std::uint8_t kNoText[1] = {0};

bool isWordAt(const std::uint8_t* text, std::int32_t n, std::int32_t i) noexcept {
  return i >= 0 && i < n && isClassMember(NamedClass::kWord, text[i]);
}

}  // namespace

// One object per match.
class Matcher {
 public:
  Matcher(MatchContext& c, const PatternInst* code, const ByteSet* sets, const std::uint8_t* text,
          std::int32_t n, bool rtl, bool backrefs, bool spans, int groups, std::int32_t memoRows) noexcept
      : c_(c), stack_(c.stack_), slots_(c.slots_), code_(code), sets_(sets), text_(text), n_(n),
        dir_(rtl ? -1 : 1), start_(rtl ? n : 0), end_(rtl ? 0 : n), spans_(spans || backrefs),
        openBase_(2 * (groups + 1)), memoRows_(memoRows),
        remember_(!backrefs && c.memo_ != MatchContext::Memo::kNever),
        stepLimit_(backrefs ? kBackrefStepLimit : kBackrefStepLimit / 10), pos_(start_) {}

  // True on a whole match; throws std::bad_alloc when memory runs out.
  bool run() {
    const bool fromStart = remember_ && c_.memo_ == MatchContext::Memo::kAlways;
    std::int64_t resumesBeforeMemo = !remember_ || fromStart ? -1 : 2 * static_cast<std::int64_t>(n_) + 32;
    if (fromStart) startMemo();
    for (;;) {
      if (!remember_ && ++steps_ > stepLimit_) return giveUp();
      const PatternInst& in = code_[pc_];
      bool ok = true;
      if (memoOn_ && in.memo >= 0) {
        if (failedBefore(in, pos_, s_)) {
          ok = false;
        } else {
          push(FrameKind::kFailMark, pc_, pos_, s_);
        }
      }
      if (ok) {
        switch (in.op) {
          case Op::kSet: ok = oneByte(in); break;
          case Op::kStar: ok = star(in); break;
          case Op::kAlt: ok = alternatives(); break;
          case Op::kJmp: pc_ = in.a; break;
          case Op::kLoopEnd: loopEnd(in); break;
          case Op::kOpen:
          case Op::kClose: capture(in); break;
          case Op::kBackref: ok = backref(in); break;
          case Op::kAssert: ok = assertion(in); break;
          case Op::kAtomicBegin:
          case Op::kAtomicEnd: atomic(in); break;
          case Op::kMatch:
            if (pos_ == end_) {
              slots_[0] = start_;
              slots_[1] = pos_;
              return true;
            }
            ok = false;
            break;
        }
      }
      if (ok) continue;
      if (!backtrack(resumesBeforeMemo)) return false;
    }
  }

  bool gaveUp() const noexcept { return gaveUp_; }

 private:
  std::int32_t avail(std::int32_t pos) const noexcept { return dir_ > 0 ? n_ - pos : pos; }
  std::uint8_t at(std::int32_t pos) const noexcept { return dir_ > 0 ? text_[pos] : text_[pos - 1]; }

  bool giveUp() noexcept {
    gaveUp_ = true;
    return false;
  }

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

  // ---- the memo: one bit per (position, row), a memo point's rows indexed by s; the states of
  // one position are neighbours, as the search mostly works near one position

  void startMemo() {
    const std::size_t bits = static_cast<std::size_t>(memoRows_) * static_cast<std::size_t>(n_ + 1);
    c_.failed_.assign((bits + 63) / 64, 0);
    c_.noteBytes();
    memoOn_ = true;
  }
  std::size_t bit(const PatternInst& in, std::int32_t pos, std::int32_t s) const noexcept {
    return static_cast<std::size_t>(pos) * static_cast<std::size_t>(memoRows_) + static_cast<std::size_t>(in.memo + s);
  }
  bool failedBefore(const PatternInst& in, std::int32_t pos, std::int32_t s) const noexcept {
    const std::size_t k = bit(in, pos, s);
    return (c_.failed_[k / 64] >> (k % 64) & 1) != 0;
  }
  void recordFailure(const PatternFrame& f) noexcept {
    const std::size_t k = bit(code_[f.pc], f.pos, f.s);
    c_.failed_[k / 64] |= std::uint64_t{1} << (k % 64);
  }

  // ---- consuming instructions

  bool oneByte(const PatternInst& in) noexcept {
    if (avail(pos_) <= 0 || !sets_[in.a].has(at(pos_))) return false;
    pos_ += dir_;
    s_ = in.depth;
    ++pc_;
    return true;
  }

  // A run of one-byte repetitions: fixed, possessive (the longest run, never given back), or
  // with a choice of ends, tried longest first (greedy) or shortest first (reluctant).
  bool star(const PatternInst& in) {
    const std::int32_t p = pos_;
    const std::int32_t limit = std::min(in.c, avail(p));
    if (in.star < 0) {  // a fixed count (limit is then at most the count) or possessive
      const std::int32_t len = runLength(in, p, limit);
      if (len < in.b) return false;
      pos_ = p + dir_ * len;
    } else {
      const std::int32_t len = runLength(in, p, limit);
      if (len < in.b) return false;
      const bool greedy = in.mode == kGreedy;
      const std::int32_t first = p + dir_ * (greedy ? len : in.b);
      const std::int32_t last = p + dir_ * (greedy ? in.b : len);
      const std::int32_t step = greedy == (dir_ > 0) ? -1 : 1;
      const std::int32_t q = skipFailedEnds(in, p, first, step);
      if ((q - last) * step > 0) return false;  // every end is known to fail
      push(FrameKind::kStar, pc_, p, s_, q + step, q, last);
      pos_ = q;
    }
    if (pos_ != p) s_ = in.depth;
    ++pc_;
    return true;
  }

  // Members of the star's set from `pos` on, at most `limit`. Each branching star keeps the run
  // it measured last ([from, to), `to` its true end when complete) and extends it on demand, so
  // the visits of one run scan each byte once.
  std::int32_t runLength(const PatternInst& in, std::int32_t pos, std::int32_t limit) {
    const ByteSet& set = sets_[in.a];
    if (in.star < 0) {
      std::int32_t k = 0;
      while (k < limit && set.has(at(pos + dir_ * k))) ++k;
      return k;
    }
    std::int32_t* d = starData(in);
    const bool inside = d[0] >= 0 && (dir_ > 0 ? d[0] <= pos && pos <= d[1] : d[1] <= pos && pos <= d[0]);
    if (!inside) {
      // Scanning up to the run measured before joins it: a visit right before the last one
      // costs one byte, not the whole run.
      const std::int32_t oldFrom = d[0], oldTo = d[1], oldComplete = d[4];
      std::int32_t k = 0;
      bool joined = false;
      while (k < limit && set.has(at(pos + dir_ * k))) {
        ++k;
        if (oldFrom >= 0 && pos + dir_ * k == oldFrom) {
          joined = true;
          break;
        }
      }
      d[0] = pos;
      d[1] = joined ? oldTo : pos + dir_ * k;
      d[4] = joined ? oldComplete : (k < limit ? 1 : 0);
      if (!joined) return k;
    }
    std::int32_t k = (d[1] - pos) * dir_;
    if (k >= limit || d[4] != 0) return std::min(k, limit);
    while (k < limit && set.has(at(pos + dir_ * k))) ++k;
    d[1] = pos + dir_ * k;
    d[4] = k < limit ? 1 : 0;
    return k;
  }

  // Per branching star, 5 ints: run start and end, failed ends lo..hi, run complete.
  std::int32_t* starData(const PatternInst& in) noexcept {
    return c_.starData_.data() + 5 * static_cast<std::size_t>(in.star);
  }
  void starEndFailed(const PatternInst& in, std::int32_t end) noexcept {
    std::int32_t* d = starData(in);
    if (d[2] <= d[3] && end >= d[2] - 1 && end <= d[3] + 1) {
      d[2] = std::min(d[2], end);
      d[3] = std::max(d[3], end);
    } else {
      d[2] = d[3] = end;
    }
  }
  // Next end to try from `q`, stepping by `step`, jumping over ends known to fail.
  std::int32_t skipFailedEnds(const PatternInst& in, std::int32_t p, std::int32_t q, std::int32_t step) noexcept {
    if (!remember_ || q == p) return q;
    const std::int32_t* d = starData(in);
    if (d[2] > d[3] || q < d[2] || q > d[3]) return q;
    std::int32_t next = step < 0 ? d[2] - 1 : d[3] + 1;
    if ((q > p && next < p) || (q < p && next > p)) next = p;
    return next;
  }

  // ---- branches

  bool alternatives() {
    push(FrameKind::kAlt, pc_, pos_, s_, 1);
    pc_ = code_[pc_ + 1].a;
    return true;
  }
  // The end of a loop body: go round again if the iteration consumed something, else leave.
  void loopEnd(const PatternInst& in) noexcept {
    const bool progressed = s_ >= in.depth;
    s_ = std::min(s_, in.depth - 1);
    pc_ = !progressed ? in.b : in.a >= 0 ? in.a : pc_ + 1;
  }

  // ---- captures and back-references

  void capture(const PatternInst& in) {
    if (spans_) {
      if (in.op == Op::kOpen) {
        setSlot(openBase_ + in.a, pos_);
      } else {
        setSlot(2 * in.a, slots_[static_cast<std::size_t>(openBase_ + in.a)]);
        setSlot(2 * in.a + 1, pos_);
      }
    }
    ++pc_;
  }
  bool backref(const PatternInst& in) noexcept {
    const std::int32_t a = slots_[2 * static_cast<std::size_t>(in.a)];
    const std::int32_t b = slots_[2 * static_cast<std::size_t>(in.a) + 1];
    if (a < 0 || b < 0) return false;
    const std::int32_t from = std::min(a, b), len = a < b ? b - a : a - b;
    if (avail(pos_) < len) return false;
    const std::uint8_t* here = dir_ > 0 ? text_ + pos_ : text_ + pos_ - len;
    if (len > 0 && std::memcmp(here, text_ + from, static_cast<std::size_t>(len)) != 0) return false;
    if (len > 0) {
      pos_ += dir_ * len;
      s_ = in.depth;
    }
    ++pc_;
    return true;
  }

  bool assertion(const PatternInst& in) noexcept {
    bool ok = false;
    switch (static_cast<AssertKind>(in.mode)) {
      case AssertKind::kLineStart:
      case AssertKind::kTextStart: ok = pos_ == 0; break;
      case AssertKind::kLineEnd:
      case AssertKind::kTextEndOrNl: ok = pos_ == n_ || (pos_ == n_ - 1 && text_[pos_] == '\n'); break;
      case AssertKind::kTextEnd: ok = pos_ == n_; break;
      case AssertKind::kWordBoundary: ok = isWordAt(text_, n_, pos_ - 1) != isWordAt(text_, n_, pos_); break;
      case AssertKind::kNotWordBoundary: ok = isWordAt(text_, n_, pos_ - 1) == isWordAt(text_, n_, pos_); break;
      case AssertKind::kMatchStart: ok = pos_ == start_; break;
    }
    if (ok) ++pc_;
    return ok;
  }

  // ---- possessive bodies: the end drops what the body left to resume (but keeps the undos)

  void atomic(const PatternInst& in) {
    if (in.op == Op::kAtomicBegin) {
      push(FrameKind::kAtomic, pc_, pos_, s_);
    } else {
      std::size_t mark = stack_.size();
      while (stack_[mark - 1].kind != FrameKind::kAtomic) --mark;
      std::size_t keep = mark - 1;
      for (std::size_t k = mark; k < stack_.size(); ++k) {
        if (stack_[k].kind == FrameKind::kUndo) stack_[keep++] = stack_[k];
      }
      stack_.resize(keep);
    }
    ++pc_;
  }

  // ---- backtracking: resume the most recent alternative; false when none is left

  bool backtrack(std::int64_t& resumesBeforeMemo) {
    for (;;) {
      if (stack_.empty()) return false;
      PatternFrame& f = stack_.back();
      switch (f.kind) {
        case FrameKind::kUndo: slots_[static_cast<std::size_t>(f.x)] = f.y; break;
        case FrameKind::kFailMark: recordFailure(f); break;
        case FrameKind::kAtomic: break;
        case FrameKind::kAlt:
        case FrameKind::kStar:
          if (!remember_ && ++steps_ > stepLimit_) return giveUp();
          if (resumesBeforeMemo > 0 && --resumesBeforeMemo == 0) startMemo();
          if (f.kind == FrameKind::kAlt ? resumeAlt(f) : resumeStar(f)) return true;
          continue;  // resumeStar popped a star with no end left
      }
      stack_.pop_back();
    }
  }
  bool resumeAlt(PatternFrame& f) noexcept {
    const std::int32_t i = f.x;
    pc_ = code_[f.pc + 1 + i].a;
    pos_ = f.pos;
    s_ = f.s;
    if (i + 1 < code_[f.pc].a) {
      f.x = i + 1;
    } else {
      stack_.pop_back();
    }
    return true;
  }
  // The end f.y failed; try the next one.
  bool resumeStar(PatternFrame& f) noexcept {
    const PatternInst& st = code_[f.pc];
    if (f.y != f.pos && remember_) starEndFailed(st, f.y);
    const std::int32_t step = (st.mode == kGreedy) == (dir_ > 0) ? -1 : 1;
    const std::int32_t q = skipFailedEnds(st, f.pos, f.x, step);
    if ((q - f.z) * step > 0) {
      stack_.pop_back();
      return false;
    }
    f.y = q;
    f.x = q + step;
    pos_ = q;
    s_ = q != f.pos ? st.depth : f.s;
    pc_ = f.pc + 1;
    return true;
  }

  MatchContext& c_;
  std::vector<PatternFrame>& stack_;
  std::vector<std::int32_t>& slots_;
  const PatternInst* code_;
  const ByteSet* sets_;
  const std::uint8_t* text_;
  const std::int32_t n_, dir_, start_, end_;
  const bool spans_;
  const std::int32_t openBase_, memoRows_;
  const bool remember_;  // failed states may be remembered: no back-references, not plain mode
  const std::int64_t stepLimit_;  // when not remembering
  bool memoOn_ = false;
  bool gaveUp_ = false;
  std::int64_t steps_ = 0;
  std::int32_t pc_ = 0;
  std::int32_t pos_;
  std::int32_t s_ = 0;
};

// ---- context

MatchContext::MatchContext() noexcept = default;
MatchContext::~MatchContext() = default;

void MatchContext::noteBytes() noexcept {
  const std::size_t now = stack_.capacity() * sizeof(PatternFrame) + slots_.capacity() * sizeof(std::int32_t) +
                          failed_.capacity() * sizeof(std::uint64_t) + starData_.capacity() * sizeof(std::int32_t);
  peakBytes_ = std::max(peakBytes_, now);
}

// ---- engine

bool PatternEngine::run(MatchContext& c, const std::uint8_t* text, std::size_t length,
                        bool spans) const noexcept {
  c.gaveUp_ = false;
  if (status_ != Status::kCompiled || length > static_cast<std::size_t>(kUnbounded) / 2) return false;
  if (text == nullptr) text = kNoText;
  if (required_ >= 0 && std::memchr(text, required_, length) == nullptr) return false;
  bool matched = false;
  try {
    c.stack_.clear();
    c.slots_.assign(3 * (static_cast<std::size_t>(groups_) + 1), -1);
    c.starData_.resize(5 * static_cast<std::size_t>(stars_));
    for (std::size_t i = 0; i < c.starData_.size(); i += 5) {
      c.starData_[i] = -1;     // no run scanned
      c.starData_[i + 2] = 1;  // no failed ends
      c.starData_[i + 3] = 0;
    }
    c.noteBytes();
    Matcher m(c, code_.data(), sets_.data(), text, static_cast<std::int32_t>(length), rightToLeft_, backrefs_,
              spans, groups_, memoRows_);
    matched = m.run();
    c.gaveUp_ = m.gaveUp();
  } catch (...) {
    matched = false;
  }
  return matched;
}

bool PatternEngine::matches(const std::uint8_t* text, std::size_t length,
                            MatchContext* context) const noexcept {
  if (status_ != Status::kCompiled) return false;
  if (context != nullptr) return run(*context, text, length, false);
  MatchContext local;
  return run(local, text, length, false);
}

MatchResult PatternEngine::matchExact(const std::uint8_t* text, std::size_t length,
                                      MatchContext* context) const noexcept {
  if (status_ != Status::kCompiled) return {};
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
