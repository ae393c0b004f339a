// Match nodes: the backtracking algorithms behind each node kind, and their dump forms.
//
// Stack frames, by node (top of stack last):
//   alternation        [child state] p0 index
//   group              oldStart oldEnd [child state]
//   greedy/fixed       per iteration: [child state] iterStart countBefore; then count
//                      one-byte child: lowestEnd currentEnd (nothing when tail)
//   reluctant          per iteration as greedy; then endPosition count
//                      one-byte child: limit current (nothing when tail)
//   possessive         saved captures of its groups (nothing for a one-byte child)
// "countBefore" lets a mandatory iteration that consumed nothing stand for all remaining
// mandatory ones (count jumps to the minimum) and still be undone exactly.
#include "pattern/pattern_nodes.h"

#include <algorithm>
#include <cstdio>
#include <cstring>

namespace tessel {

namespace {

void appendByte(std::string& out, std::uint8_t b, const char* escaped) {
  if (b >= 0x20 && b < 0x7F && std::strchr(escaped, b) == nullptr) {
    out += static_cast<char>(b);
    return;
  }
  char buf[8];
  std::snprintf(buf, sizeof buf, "\\x%02X", b);
  out += buf;
}

void appendSetMembers(std::string& out, const ByteSet& s) {
  int b = 0;
  while (b < 256) {
    if (!s.has(static_cast<std::uint8_t>(b))) {
      ++b;
      continue;
    }
    int e = b;
    while (e + 1 < 256 && s.has(static_cast<std::uint8_t>(e + 1))) ++e;
    appendByte(out, static_cast<std::uint8_t>(b), "]-\\^");
    if (e - b >= 2) out += '-';
    if (e > b) appendByte(out, static_cast<std::uint8_t>(e), "]-\\^");
    b = e + 1;
  }
}

void appendNumber(std::string& out, long long v) { out += std::to_string(v); }

bool isWordAt(const MatchContext& c, std::int32_t i) noexcept {
  return i >= 0 && i < c.length && isClassMember(NamedClass::kWord, c.text[i]);
}

}  // namespace

// ---- one byte

bool ByteNode::match(MatchContext& c) const {
  if (!rtl_) {
    if (c.pos < c.length && set_.has(c.text[c.pos])) {
      ++c.pos;
      return true;
    }
    return false;
  }
  if (c.pos > 0 && set_.has(c.text[c.pos - 1])) {
    --c.pos;
    return true;
  }
  return false;
}

bool ByteNode::matchNext(MatchContext&) const { return false; }

namespace {
ByteSet singleton(std::uint8_t b) noexcept {
  ByteSet s;
  s.add(b);
  return s;
}
ByteSet everything() noexcept {
  ByteSet s;
  s.invert();
  return s;
}
ByteSet classMembers(NamedClass id, bool negated) noexcept {
  ByteSet s = namedClassSet(id);
  if (negated) s.invert();
  return s;
}
ByteSet maybeInverted(ByteSet s, bool negated) noexcept {
  if (negated) s.invert();
  return s;
}
}  // namespace

CharNode::CharNode(std::uint8_t b, bool rtl) noexcept : ByteNode(singleton(b), rtl), byte_(b) {}

void CharNode::dump(std::string& out) const {
  out += "lit\"";
  appendByte(out, byte_, "\"\\");
  out += '"';
}

AnyNode::AnyNode(bool rtl) noexcept : ByteNode(everything(), rtl) {}

void AnyNode::dump(std::string& out) const { out += "any"; }

SetNode::SetNode(const ByteSet& members, bool negated, bool rtl) noexcept
    : ByteNode(maybeInverted(members, negated), rtl), members_(members), negated_(negated) {}

void SetNode::dump(std::string& out) const {
  out += negated_ ? "set^[" : "set[";
  appendSetMembers(out, members_);
  out += ']';
}

ClassNode::ClassNode(NamedClass id, bool negated, bool rtl) noexcept
    : ByteNode(classMembers(id, negated), rtl), id_(id), negated_(negated) {}

void ClassNode::dump(std::string& out) const {
  out += negated_ ? "class(^" : "class(";
  out += namedClassName(id_);
  out += ')';
}

// ---- literal text

bool LiteralNode::match(MatchContext& c) const {
  if (!rtl_) {
    if (c.length - c.pos < length_ ||
        std::memcmp(c.text + c.pos, bytes_, static_cast<std::size_t>(length_)) != 0)
      return false;
    c.pos += length_;
    return true;
  }
  if (c.pos < length_ ||
      std::memcmp(c.text + c.pos - length_, bytes_, static_cast<std::size_t>(length_)) != 0)
    return false;
  c.pos -= length_;
  return true;
}

bool LiteralNode::matchNext(MatchContext&) const { return false; }

void LiteralNode::dump(std::string& out) const {
  out += "lit\"";
  for (std::int32_t i = 0; i < length_; ++i) appendByte(out, bytes_[i], "\"\\");
  out += '"';
}

// ---- empty

bool EmptyNode::match(MatchContext&) const { return true; }
bool EmptyNode::matchNext(MatchContext&) const { return false; }
void EmptyNode::dump(std::string& out) const { out += "empty"; }

// ---- sequence: no state of its own; resumes its last child first

bool SequenceNode::resume(MatchContext& c, int i, bool backtrack) const {
  for (;;) {
    if (backtrack) {
      for (;;) {
        if (i == 0) return false;
        --i;
        if (children_[i]->matchNext(c)) {
          ++i;
          break;
        }
      }
    }
    while (i < count_ && children_[i]->match(c)) ++i;
    if (i == count_) return true;
    backtrack = true;
  }
}

bool SequenceNode::match(MatchContext& c) const { return resume(c, 0, false); }
bool SequenceNode::matchNext(MatchContext& c) const { return resume(c, count_, true); }

void SequenceNode::setTail() noexcept {
  if (count_ > 0) children_[count_ - 1]->setTail();
}

void SequenceNode::dump(std::string& out) const {
  out += "seq(";
  for (int i = 0; i < count_; ++i) {
    if (i > 0) out += ", ";
    children_[i]->dump(out);
  }
  out += ')';
}

// ---- alternation: frame (p0, index)

bool AlternationNode::match(MatchContext& c) const {
  const std::int32_t p0 = c.pos;
  for (int i = 0; i < count_; ++i) {
    c.step();
    c.pos = p0;
    if (children_[i]->match(c)) {
      c.push(p0);
      c.push(i);
      return true;
    }
  }
  return false;
}

bool AlternationNode::matchNext(MatchContext& c) const {
  const int i = c.pop();
  const std::int32_t p0 = c.pop();
  if (children_[i]->matchNext(c)) {
    c.push(p0);
    c.push(i);
    return true;
  }
  for (int j = i + 1; j < count_; ++j) {
    c.step();
    c.pos = p0;
    if (children_[j]->match(c)) {
      c.push(p0);
      c.push(j);
      return true;
    }
  }
  return false;
}

void AlternationNode::setTail() noexcept {
  for (int i = 0; i < count_; ++i) children_[i]->setTail();
}

void AlternationNode::dump(std::string& out) const {
  out += "alt(";
  for (int i = 0; i < count_; ++i) {
    if (i > 0) out += " | ";
    children_[i]->dump(out);
  }
  out += ')';
}

// ---- group: the captures change only when the child has matched, so a back-reference
// inside the group still sees the previous iteration's text.

bool GroupNode::match(MatchContext& c) const {
  std::int32_t* slot = c.captures + 2 * number_;
  const std::int32_t entry = c.pos;
  c.push(slot[0]);
  c.push(slot[1]);
  if (!child_->match(c)) {
    c.top -= 2;
    return false;
  }
  slot = c.captures + 2 * number_;
  slot[0] = entry;
  slot[1] = c.pos;
  return true;
}

bool GroupNode::matchNext(MatchContext& c) const {
  if (child_->matchNext(c)) {
    c.captures[2 * number_ + 1] = c.pos;
    return true;
  }
  c.captures[2 * number_ + 1] = c.pop();
  c.captures[2 * number_] = c.pop();
  return false;
}

void GroupNode::dump(std::string& out) const {
  out += "group";
  appendNumber(out, number_);
  out += '(';
  child_->dump(out);
  out += ')';
}

// ---- repetitions

RepeatNode::RepeatNode(Node* child, std::int32_t minimum, std::int32_t extra, bool rtl) noexcept
    : child_(child),
      min_(minimum),
      extra_(extra),
      max_(minimum + extra),
      rtl_(rtl),
      bytes_(child->singleByte()) {}

std::int32_t RepeatNode::scan(MatchContext& c, std::int32_t limit) const {
  const ByteSet& set = *bytes_;
  std::int32_t n = 0;
  if (!rtl_) {
    const std::uint8_t* t = c.text + c.pos;
    while (n < limit && set.has(t[n])) ++n;
  } else {
    const std::uint8_t* t = c.text + c.pos - 1;
    while (n < limit && set.has(t[-n])) ++n;
  }
  c.chargeBytes(n);
  return n;
}

// Greedy iteration over a general child. `extend`: add iterations first (a fresh match, or
// after an iteration found a new way); otherwise start by asking the most recent iteration
// for its next way. Order: at each point after k iterations, "one more iteration" (all its
// ways, each followed by further greedy iterations) comes before "stop here".
bool RepeatNode::greedyRun(MatchContext& c, std::int32_t count, bool extend) const {
  for (;;) {
    if (extend) {
      while (count < max_) {
        c.step();
        const std::int32_t s = c.pos;
        if (!child_->match(c)) {
          c.pos = s;
          break;
        }
        c.push(s);
        c.push(count);
        if (c.pos == s) {  // consumed nothing: no further iterations can differ
          count = std::max(count + 1, min_);
          break;
        }
        ++count;
      }
      if (count >= min_) {
        c.push(count);
        return true;
      }
    }
    if (count == 0) return false;
    c.step();
    const std::int32_t before = c.pop();
    const std::int32_t s = c.pop();
    if (child_->matchNext(c)) {
      c.push(s);
      c.push(before);
      if (c.pos == s) {
        count = std::max(before + 1, min_);
        c.push(count);
        return true;
      }
      count = before + 1;
      extend = true;
      continue;
    }
    count = before;
    c.pos = s;
    if (count >= min_) {
      c.push(count);
      return true;
    }
    extend = false;
  }
}

void RepeatNode::dumpCounts(std::string& out, const char* kind) const {
  out += kind;
  out += '{';
  appendNumber(out, min_);
  if (extra_ != 0 || std::strcmp(kind, "fixed") != 0) {
    out += ',';
    if (max_ == PatternEngine::kUnbounded)
      out += '*';
    else
      appendNumber(out, max_);
  }
  out += "}(";
  child_->dump(out);
  out += ')';
}

bool FixedRepeatNode::match(MatchContext& c) const {
  if (bytes_ != nullptr) {
    const std::int32_t avail = available(c);
    if (avail < min_ || (tail_ && avail != min_)) return false;
    if (scan(c, min_) != min_) return false;
    c.pos += rtl_ ? -min_ : min_;
    return true;
  }
  return greedyRun(c, 0, true);
}

bool FixedRepeatNode::matchNext(MatchContext& c) const {
  if (bytes_ != nullptr) return false;
  const std::int32_t count = c.pop();
  return greedyRun(c, count, false);
}

void FixedRepeatNode::dump(std::string& out) const { dumpCounts(out, "fixed"); }

bool GreedyRepeatNode::match(MatchContext& c) const {
  if (bytes_ != nullptr) {
    const std::int32_t avail = available(c);
    const std::int32_t n = scan(c, std::min(avail, max_));
    if (n < min_) return false;
    if (tail_) {
      if (n != avail) return false;  // only the end of the text can follow
      c.pos += rtl_ ? -n : n;
      return true;
    }
    c.push(rtl_ ? c.pos - min_ : c.pos + min_);
    c.pos += rtl_ ? -n : n;
    c.push(c.pos);
    return true;
  }
  return greedyRun(c, 0, true);
}

bool GreedyRepeatNode::matchNext(MatchContext& c) const {
  if (bytes_ != nullptr) {
    if (tail_) return false;
    c.step();
    std::int32_t& current = c.stack[c.top - 1];
    if (current == c.stack[c.top - 2]) {
      c.top -= 2;
      return false;
    }
    current += rtl_ ? 1 : -1;
    c.pos = current;
    return true;
  }
  const std::int32_t count = c.pop();
  return greedyRun(c, count, false);
}

void GreedyRepeatNode::dump(std::string& out) const { dumpCounts(out, "greedy"); }

bool ReluctantRepeatNode::match(MatchContext& c) const {
  if (bytes_ != nullptr) {
    const std::int32_t avail = available(c);
    if (tail_) {  // must take exactly the rest of the text
      if (avail < min_ || avail > max_ || scan(c, avail) != avail) return false;
      c.pos = rtl_ ? 0 : c.length;
      return true;
    }
    if (avail < min_ || scan(c, min_) != min_) return false;
    const std::int32_t reach = std::min(avail, max_);
    c.push(rtl_ ? c.pos - reach : c.pos + reach);
    c.pos += rtl_ ? -min_ : min_;
    c.push(c.pos);
    return true;
  }
  return run(c, 0, Phase::kToMinimum);
}

bool ReluctantRepeatNode::matchNext(MatchContext& c) const {
  if (bytes_ != nullptr) {
    if (tail_) return false;
    c.step();
    std::int32_t& current = c.stack[c.top - 1];
    const std::int32_t limit = c.stack[c.top - 2];
    if (current == limit || !bytes_->has(rtl_ ? c.text[current - 1] : c.text[current])) {
      c.top -= 2;
      return false;
    }
    current += rtl_ ? -1 : 1;
    c.pos = current;
    return true;
  }
  const std::int32_t count = c.pop();
  c.pos = c.pop();  // where the last way ended: later nodes have moved on since
  return run(c, count, Phase::kOneMore);
}

// Order: at each point after k >= min iterations, "stop here" comes before "one more
// iteration"; an optional iteration that would consume nothing is refused (its next way is
// asked for instead), since stopping at the same position was already tried.
bool ReluctantRepeatNode::run(MatchContext& c, std::int32_t count, Phase phase) const {
  for (;;) {
    switch (phase) {
      case Phase::kToMinimum: {
        bool failed = false;
        while (count < min_) {
          c.step();
          const std::int32_t s = c.pos;
          if (!child_->match(c)) {
            c.pos = s;
            failed = true;
            break;
          }
          c.push(s);
          c.push(count);
          count = (c.pos == s) ? min_ : count + 1;
        }
        if (!failed) {
          c.push(c.pos);
          c.push(count);
          return true;
        }
        phase = Phase::kBacktrack;
        break;
      }
      case Phase::kOneMore: {
        if (count < max_) {
          c.step();
          const std::int32_t s = c.pos;
          if (child_->match(c)) {
            bool found = true;
            while (c.pos == s) {
              c.step();
              if (!child_->matchNext(c)) {
                found = false;
                break;
              }
            }
            if (found) {
              c.push(s);
              c.push(count);
              c.push(c.pos);
              c.push(count + 1);
              return true;
            }
          }
          c.pos = s;
        }
        phase = Phase::kBacktrack;
        break;
      }
      case Phase::kBacktrack: {
        if (count == 0) return false;
        const std::int32_t before = c.pop();
        const std::int32_t s = c.pop();
        bool found = false;
        for (;;) {
          c.step();
          if (!child_->matchNext(c)) break;
          if (before < min_ || c.pos != s) {
            found = true;
            break;
          }
        }
        if (found) {
          c.push(s);
          c.push(before);
          count = (c.pos == s) ? min_ : before + 1;
          phase = Phase::kToMinimum;  // yields at once when the minimum is reached
          break;
        }
        count = before;
        c.pos = s;
        break;  // still kBacktrack: this point's choices are exhausted
      }
    }
  }
}

void ReluctantRepeatNode::dump(std::string& out) const { dumpCounts(out, "reluctant"); }

// Possessive: the first way of the greedy loop, with everything it could give back dropped.
bool PossessiveRepeatNode::match(MatchContext& c) const {
  if (bytes_ != nullptr) {
    const std::int32_t avail = available(c);
    const std::int32_t n = scan(c, std::min(avail, max_));
    if (n < min_ || (tail_ && n != avail)) return false;
    c.pos += rtl_ ? -n : n;
    return true;
  }
  for (int g = firstGroup_; g <= lastGroup_; ++g) {
    c.push(c.captures[2 * g]);
    c.push(c.captures[2 * g + 1]);
  }
  const std::size_t mark = c.top;
  if (!greedyRun(c, 0, true)) {
    c.top = mark - 2 * static_cast<std::size_t>(lastGroup_ >= firstGroup_ ? lastGroup_ - firstGroup_ + 1 : 0);
    return false;
  }
  c.top = mark;
  return true;
}

bool PossessiveRepeatNode::matchNext(MatchContext& c) const {
  if (bytes_ != nullptr) return false;
  for (int g = lastGroup_; g >= firstGroup_; --g) {
    c.captures[2 * g + 1] = c.pop();
    c.captures[2 * g] = c.pop();
  }
  return false;
}

void PossessiveRepeatNode::dump(std::string& out) const { dumpCounts(out, "possessive"); }

// ---- assertions and back-references

bool AssertNode::match(MatchContext& c) const {
  switch (kind_) {
    case AssertKind::kLineStart:
    case AssertKind::kTextStart:
      return c.pos == 0;
    case AssertKind::kLineEnd:
    case AssertKind::kTextEndOrNl:
      return c.pos == c.length || (c.pos == c.length - 1 && c.text[c.pos] == '\n');
    case AssertKind::kTextEnd:
      return c.pos == c.length;
    case AssertKind::kWordBoundary:
      return isWordAt(c, c.pos - 1) != isWordAt(c, c.pos);
    case AssertKind::kNotWordBoundary:
      return isWordAt(c, c.pos - 1) == isWordAt(c, c.pos);
    case AssertKind::kMatchStart:
      return c.pos == c.start;
  }
  return false;
}

bool AssertNode::matchNext(MatchContext&) const { return false; }

void AssertNode::dump(std::string& out) const {
  static const char* const kNames[] = {"^", "$", "\\A", "\\Z", "\\z", "\\b", "\\B", "\\G"};
  out += "assert(";
  out += kNames[static_cast<int>(kind_)];
  out += ')';
}

bool BackrefNode::match(MatchContext& c) const {
  const std::int32_t a = c.captures[2 * number_];
  const std::int32_t b = c.captures[2 * number_ + 1];
  if (a < 0 || b < 0) return false;
  const std::int32_t from = std::min(a, b);
  const std::int32_t len = a < b ? b - a : a - b;
  if (len == 0) return true;
  if (rtl_ ? c.pos < len : c.length - c.pos < len) return false;
  c.chargeBytes(len);  // an upper bound: the comparison may stop sooner
  const std::uint8_t* here = rtl_ ? c.text + c.pos - len : c.text + c.pos;
  if (std::memcmp(here, c.text + from, static_cast<std::size_t>(len)) != 0) return false;
  c.pos += rtl_ ? -len : len;
  return true;
}

bool BackrefNode::matchNext(MatchContext&) const { return false; }

void BackrefNode::dump(std::string& out) const {
  out += "backref(";
  appendNumber(out, number_);
  out += ')';
}

}  // namespace tessel
