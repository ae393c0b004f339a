// Pattern compiler: tokens (pattern_lexer.h) to a syntax tree, the tree to a program
// (pattern_program.h). Exposes only PatternEngine's constructors; the tree and the emitter are
// private to this file.
//
// Both passes are iterative (heap stacks, no recursion), and each costs time proportional to
// what it produces: parsing is linear in the pattern, and the emitter writes every instruction
// once, expanding a counted repetition by copying the body it emitted first. The program's
// weight (the sum over its instructions of loop depth + 1, which bounds the matcher's states
// per text position) is checked as each instruction is written, so a pattern over
// kMaxWeight stops compiling as soon as it passes it, whatever its counts ask for.
#include <algorithm>
#include <cstring>
#include <utility>
#include <vector>

#include "pattern/pattern_engine.h"
#include "pattern/pattern_lexer.h"
#include "pattern/pattern_program.h"

namespace tessel {

namespace {

struct CompileError {
  PatternEngine::Status status;
};

[[noreturn]] void malformed() { throw CompileError{PatternEngine::Status::kMalformed}; }

// Syntax tree. Children are a singly linked list (first, next); a sequence to be matched right
// to left is built in reverse, so the emitter always walks lists forwards.
enum class NodeKind : std::uint8_t { kSet, kAssert, kBackref, kGroup, kCat, kAlt, kRepeat };

struct Node {
  NodeKind kind;
  std::uint8_t mode = 0;      // kAssert: AssertKind; kRepeat: StarMode
  std::int32_t value = 0;     // kSet: set index; kBackref, kGroup: group number; kAlt: children
  std::int32_t min = 0, max = 0;
  std::int32_t first = -1, last = -1, next = -1;
  std::int32_t required = -1;  // a byte every way through the node consumes, or -1
};

class Parser {
 public:
  Parser(const Token* t, std::size_t n, bool rtl, std::vector<Node>& nodes, std::vector<ByteSet>& sets)
      : t_(t), n_(n), rtl_(rtl), nodes_(nodes), sets_(sets) {}

  // The root node.
  std::int32_t parse() {
    open(0);
    while (i_ < n_) {
      const Token& t = t_[i_];
      if (special(i_, '|')) {
        Level& f = levels_.back();
        flush(f);
        addChild(f.alt, f.seq);
        f.seq = node(NodeKind::kCat);
        ++i_;
      } else if (special(i_, '(')) {
        flush(levels_.back());
        if (groups_ == PatternEngine::kUnbounded) malformed();
        ++i_;
        open(++groups_);
      } else if (special(i_, ')')) {
        if (levels_.size() == 1) malformed();
        const std::int32_t group = node(NodeKind::kGroup);
        nodes_[group].value = levels_.back().group;
        addChild(group, close());
        nodes_[group].required = nodes_[nodes_[group].first].required;
        levels_.back().atom = group;
        ++i_;
      } else if (isQuantifier(i_)) {
        Level& f = levels_.back();
        if (f.atom < 0) malformed();
        f.atom = quantifier(f.atom);
        flush(f);
      } else {
        flush(levels_.back());
        const std::int32_t a = atom(t);
        levels_.back().atom = a;
      }
    }
    if (levels_.size() != 1) malformed();
    if (maxBackref_ > groups_) malformed();
    return close();
  }

  int groups() const noexcept { return groups_; }
  bool backrefs() const noexcept { return maxBackref_ > 0; }

 private:
  struct Level {
    int group;
    std::int32_t alt, seq, atom;
  };

  std::int32_t node(NodeKind kind) {
    nodes_.push_back(Node{kind});
    return static_cast<std::int32_t>(nodes_.size() - 1);
  }
  void addChild(std::int32_t parent, std::int32_t child) {
    Node& p = nodes_[parent];
    if (p.first < 0) {
      p.first = p.last = child;
    } else if (p.kind == NodeKind::kCat && rtl_) {
      nodes_[child].next = p.first;
      p.first = child;
    } else {
      nodes_[p.last].next = child;
      p.last = child;
    }
    if (p.kind == NodeKind::kAlt) ++p.value;  // counts the branches
  }
  void open(int group) {
    const std::int32_t alt = node(NodeKind::kAlt);
    const std::int32_t seq = node(NodeKind::kCat);
    levels_.push_back(Level{group, alt, seq, -1});
  }
  // Ends the innermost level: its alternation, or its only sequence.
  std::int32_t close() {
    Level f = levels_.back();
    levels_.pop_back();
    flush(f);
    addChild(f.alt, f.seq);
    Node& alt = nodes_[f.alt];
    if (alt.value == 1) return f.seq;
    std::int32_t required = nodes_[alt.first].required;
    for (std::int32_t c = alt.first; c >= 0; c = nodes_[c].next)
      if (nodes_[c].required != required) required = -1;
    nodes_[f.alt].required = required;
    return f.alt;
  }
  // Moves the pending atom into the sequence.
  void flush(Level& f) {
    if (f.atom < 0) return;
    addChild(f.seq, f.atom);
    if (nodes_[f.seq].required < 0) nodes_[f.seq].required = nodes_[f.atom].required;
    f.atom = -1;
  }

  bool special(std::size_t at, char c) const noexcept {
    return at < n_ && t_[at].kind == TokenKind::kSpecial && t_[at].value == static_cast<std::uint8_t>(c);
  }
  bool isQuantifier(std::size_t at) const noexcept {
    return special(at, '*') || special(at, '+') || special(at, '?') || special(at, '{');
  }

  std::int32_t setNode(const ByteSet& s) {
    const std::int32_t n = node(NodeKind::kSet);
    nodes_[n].value = static_cast<std::int32_t>(sets_.size());
    sets_.push_back(s);
    int count = 0, only = -1;
    for (int w = 0; w < 4; ++w) {
      const std::uint64_t bits = s.words[w];
      if (bits == 0) continue;
      count += (bits & (bits - 1)) != 0 ? 2 : 1;
      only = 64 * w + __builtin_ctzll(bits);
    }
    nodes_[n].required = count == 1 ? only : -1;
    return n;
  }
  std::int32_t assertNode(AssertKind kind) {
    const std::int32_t n = node(NodeKind::kAssert);
    nodes_[n].mode = static_cast<std::uint8_t>(kind);
    return n;
  }

  std::int32_t atom(const Token& t) {
    ++i_;
    switch (t.kind) {
      case TokenKind::kByte: {
        ByteSet s;
        s.add(t.value);
        return setNode(s);
      }
      case TokenKind::kClass: {
        ByteSet s = namedClassSet(static_cast<NamedClass>(t.value));
        if (t.negated) s.invert();
        return setNode(s);
      }
      case TokenKind::kAssert:
        return assertNode(assertKind(t.value));
      case TokenKind::kBackref: {
        maxBackref_ = std::max(maxBackref_, t.number);
        const std::int32_t n = node(NodeKind::kBackref);
        nodes_[n].value = t.number;
        return n;
      }
      case TokenKind::kSpecial:
        break;
    }
    switch (t.value) {
      case '.': {
        ByteSet s;
        s.invert();
        return setNode(s);
      }
      case '^': return assertNode(AssertKind::kLineStart);
      case '$': return assertNode(AssertKind::kLineEnd);
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
  std::int32_t bracketSet() {
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
    return setNode(members);
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

  std::int32_t quantifier(std::int32_t child) {
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
    const std::int32_t n = node(NodeKind::kRepeat);
    Node& r = nodes_[n];
    r.min = static_cast<std::int32_t>(minimum);
    r.max = static_cast<std::int32_t>(maximum);
    r.mode = minimum == maximum ? kGreedy : mode;
    r.first = r.last = child;
    r.required = minimum > 0 ? nodes_[child].required : -1;
    return n;
  }

  const Token* t_;
  std::size_t n_;
  bool rtl_;
  std::vector<Node>& nodes_;
  std::vector<ByteSet>& sets_;
  std::vector<Level> levels_;
  std::size_t i_ = 0;
  int groups_ = 0;
  std::int32_t maxBackref_ = 0;
};

// Weight of a repetition of one byte or set with a choice of ends: a visit tries its ends.
constexpr std::int64_t kChoiceWeight = 4;

// Writes the program of a tree, depth first, with an explicit stack of tasks.
class Emitter {
 public:
  Emitter(const std::vector<Node>& nodes, std::vector<PatternInst>& code) : nodes_(nodes), code_(code) {}

  void emit(std::int32_t root) {
    tasks_.push_back(Task{kNode, root, 0, 0, 0});
    while (!tasks_.empty()) {
      const Task t = tasks_.back();
      tasks_.pop_back();
      switch (t.kind) {
        case kNode: node(t.node, t.depth); break;
        case kCatFrom: catFrom(t.node, t.depth); break;
        case kClose: push(Op::kClose, t.depth, t.x); break;
        case kAltBranch: afterBranch(t); break;
        case kRepeatRest: repeatRest(t); break;
      }
    }
    push(Op::kMatch, 0);
  }

 private:
  enum TaskKind : std::uint8_t { kNode, kCatFrom, kClose, kAltBranch, kRepeatRest };
  // kAltBranch: node = the branch just written, x = the kAlt's pc, y = its index, z = chain of
  // exit jumps.
  // kRepeatRest: node = the repetition, x = first body's pc, y = its header's pc or -1.
  struct Task {
    TaskKind kind;
    std::int32_t node, depth, x, y;
    std::int32_t z = -1;
  };

  std::size_t push(Op op, std::int32_t depth, std::int32_t a = 0, std::int32_t b = 0, std::int32_t c = 0,
                   std::uint8_t mode = 0) {
    return push(PatternInst{op, mode, depth, a, b, c, -1, -1});
  }
  std::size_t push(const PatternInst& i) {
    const bool choice = i.op == Op::kStar && i.b != i.c && i.mode != kPossessive;  // resumed per end
    weight_ += (i.depth + 1) * (choice ? kChoiceWeight : 1);
    if (weight_ > static_cast<std::int64_t>(PatternEngine::kMaxWeight))
      throw CompileError{PatternEngine::Status::kTooLarge};
    code_.push_back(i);
    return code_.size() - 1;
  }
  std::int32_t here() const noexcept { return static_cast<std::int32_t>(code_.size()); }

  void node(std::int32_t n, std::int32_t depth) {
    const Node& x = nodes_[n];
    switch (x.kind) {
      case NodeKind::kSet: push(Op::kSet, depth, x.value); break;
      case NodeKind::kAssert: push(Op::kAssert, depth, 0, 0, 0, x.mode); break;
      case NodeKind::kBackref: push(Op::kBackref, depth, x.value); break;
      case NodeKind::kGroup:
        push(Op::kOpen, depth, x.value);
        tasks_.push_back(Task{kClose, n, depth, x.value, 0});
        tasks_.push_back(Task{kNode, x.first, depth, 0, 0});
        break;
      case NodeKind::kCat: catFrom(x.first, depth); break;
      case NodeKind::kAlt: {
        const std::int32_t alt = here();
        push(Op::kAlt, depth, x.value);
        for (std::int32_t i = 0; i < x.value; ++i) push(Op::kJmp, depth);
        startBranch(x.first, depth, alt, 0, -1);
        break;
      }
      case NodeKind::kRepeat: repeat(n, depth); break;
    }
  }

  void catFrom(std::int32_t child, std::int32_t depth) {
    if (child < 0) return;
    tasks_.push_back(Task{kCatFrom, nodes_[child].next, depth, 0, 0});
    tasks_.push_back(Task{kNode, child, depth, 0, 0});
  }

  // Branch y of the alternation at pc x starts here. Exit jumps of finished branches are
  // chained through their targets (z) and pointed at the end once the last branch is written.
  void startBranch(std::int32_t branch, std::int32_t depth, std::int32_t alt, std::int32_t y, std::int32_t chain) {
    code_[static_cast<std::size_t>(alt + 1 + y)].a = here();
    tasks_.push_back(Task{kAltBranch, branch, depth, alt, y, chain});
    tasks_.push_back(Task{kNode, branch, depth, 0, 0});
  }
  void afterBranch(const Task& t) {
    const std::int32_t next = nodes_[t.node].next;
    if (next >= 0) {
      const auto exit = static_cast<std::int32_t>(push(Op::kJmp, t.depth, t.z));
      startBranch(next, t.depth, t.x, t.y + 1, exit);
      return;
    }
    for (std::int32_t e = t.z; e >= 0;) {
      const std::int32_t after = code_[static_cast<std::size_t>(e)].a;
      code_[static_cast<std::size_t>(e)].a = here();
      e = after;
    }
  }

  // The header of an optional iteration: kAlt, the jump into the body, the jump out (swapped
  // when reluctant). Returns its pc.
  std::int32_t header(std::int32_t depth, bool reluctant) {
    const std::int32_t h = here();
    push(Op::kAlt, depth, 2);
    push(Op::kJmp, depth, reluctant ? -1 : h + 3);
    push(Op::kJmp, depth, reluctant ? h + 3 : -1);
    return h;
  }
  static std::int32_t jumpOut(std::int32_t header, bool reluctant) { return header + (reluctant ? 1 : 2); }

  // Shapes of the iterations of a repetition, in order: plain copies; with a minimum and no
  // maximum, one mandatory iteration that also ends the loop when it consumes nothing; the loop;
  // or, with a maximum, optional copies.
  enum Slot : std::uint8_t { kPlain, kChecked, kLoop, kOptional };

  void repeat(std::int32_t n, std::int32_t depth) {
    const Node& r = nodes_[n];
    if (r.max == 0) return;
    const Node& body = nodes_[r.first];
    if (body.kind == NodeKind::kSet) {
      push(Op::kStar, depth, body.value, r.min, r.max, r.mode);
      return;
    }
    if (r.mode == kPossessive) push(Op::kAtomicBegin, depth);
    const Slot first = firstSlot(r);
    std::int32_t head = -1;
    if (first == kLoop || first == kOptional) head = header(depth, r.mode == kReluctant);
    tasks_.push_back(Task{kRepeatRest, n, depth, here(), head});
    tasks_.push_back(Task{kNode, r.first, depth + (first == kChecked || first == kLoop ? 1 : 0), 0, 0});
  }

  static Slot firstSlot(const Node& r) {
    const bool unbounded = r.max == PatternEngine::kUnbounded;
    if (plainCopies(r) > 0) return kPlain;
    if (unbounded) return r.min > 0 ? kChecked : kLoop;
    return kOptional;
  }
  static std::int32_t plainCopies(const Node& r) {
    return r.max == PatternEngine::kUnbounded && r.min > 0 ? r.min - 1 : r.min;
  }

  // Appends a copy of the body written first, code_[from, to), its loop depth moved by
  // `deltaChange` (the first body may sit in a loop and the copy not, or the other way round).
  void copyBody(std::int32_t from, std::int32_t to, std::int32_t deltaChange) {
    const std::int32_t offset = here() - from;
    for (std::int32_t k = from; k < to; ++k) {
      PatternInst i = code_[static_cast<std::size_t>(k)];
      if (i.op == Op::kJmp) i.a += offset;
      if (i.op == Op::kLoopEnd) {
        if (i.a >= 0) i.a += offset;
        i.b += offset;
      }
      i.depth += deltaChange;
      push(i);
    }
  }

  std::int32_t loopEnd(std::int32_t depth, std::int32_t next) {
    const auto pc = static_cast<std::int32_t>(push(Op::kLoopEnd, depth + 1, next));
    exits_.push_back(pc);
    return pc;
  }

  void repeatRest(const Task& t) {
    const Node& r = nodes_[t.node];
    const std::int32_t depth = t.depth, from = t.x, to = here();
    const bool reluctant = r.mode == kReluctant, unbounded = r.max == PatternEngine::kUnbounded;
    const Slot first = firstSlot(r);
    const std::int32_t firstDelta = first == kChecked || first == kLoop ? 1 : 0;
    const std::size_t exitBase = exits_.size();
    std::int32_t checkedEnd = -1, head = t.y;
    if (head >= 0) exits_.push_back(jumpOut(head, reluctant));
    if (first == kChecked) checkedEnd = loopEnd(depth, -1);
    if (first == kLoop) loopEnd(depth, head);
    for (std::int32_t k = plainCopies(r) - (first == kPlain ? 1 : 0); k > 0; --k) copyBody(from, to, -firstDelta);
    if (unbounded && first == kPlain) {
      copyBody(from, to, 1 - firstDelta);
      checkedEnd = loopEnd(depth, -1);
    }
    if (unbounded && first != kLoop) {
      head = header(depth, reluctant);
      exits_.push_back(jumpOut(head, reluctant));
      copyBody(from, to, 1 - firstDelta);
      loopEnd(depth, head);
      code_[static_cast<std::size_t>(checkedEnd)].a = head;
    }
    for (std::int32_t i = r.min + (first == kOptional ? 1 : 0); !unbounded && i < r.max; ++i) {
      exits_.push_back(jumpOut(header(depth, reluctant), reluctant));
      copyBody(from, to, -firstDelta);
    }
    const std::int32_t end = here();
    for (std::size_t k = exitBase; k < exits_.size(); ++k) {
      PatternInst& e = code_[static_cast<std::size_t>(exits_[k])];
      if (e.op == Op::kJmp) e.a = end;
      else e.b = end;
    }
    exits_.resize(exitBase);
    if (r.mode == kPossessive) push(Op::kAtomicEnd, depth);
  }

  const std::vector<Node>& nodes_;
  std::vector<PatternInst>& code_;
  std::vector<Task> tasks_;
  std::vector<std::int32_t> exits_;
  std::int64_t weight_ = 0;
};

}  // namespace

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
    if (!lexPattern(pattern, length, (flags & kExtended) != 0, tokens)) {
      status_ = Status::kMalformed;
      return;
    }
    std::vector<Node> nodes;
    Parser parser(tokens.data(), tokens.size(), rightToLeft_, nodes, sets_);
    const std::int32_t root = parser.parse();
    Emitter(nodes, code_).emit(root);
    markMemoPoints();
    groups_ = parser.groups();
    backrefs_ = parser.backrefs();
    required_ = nodes[static_cast<std::size_t>(root)].required;
    status_ = Status::kCompiled;
  } catch (const CompileError& e) {
    status_ = e.status;
  } catch (...) {
    status_ = Status::kNoMemory;
  }
  if (status_ != Status::kCompiled) {
    std::vector<PatternInst>().swap(code_);
    std::vector<ByteSet>().swap(sets_);
    memoRows_ = stars_ = 0;
  }
}

// Memo points: branches, and instructions with more than one way in (a jump target that is also
// reached by another jump or by falling through), plus the instruction after a kStar with a
// choice of ends, reached from the star's visits at several positions.
void PatternEngine::markMemoPoints() {
  std::vector<std::uint8_t> ways(code_.size() + 1, 0);
  const auto reach = [&](std::int32_t target) {
    std::uint8_t& w = ways[static_cast<std::size_t>(target)];
    if (w < 2) ++w;
  };
  for (std::size_t pc = 0; pc < code_.size(); ++pc) {
    const PatternInst& i = code_[pc];
    if (i.op == Op::kJmp) reach(i.a);
    if (i.op == Op::kLoopEnd) {
      if (i.a >= 0) reach(i.a);
      reach(i.b);
    }
    const bool fallsThrough = i.op != Op::kJmp && i.op != Op::kAlt && i.op != Op::kLoopEnd && i.op != Op::kMatch;
    if (fallsThrough) reach(static_cast<std::int32_t>(pc + 1));
    if (i.op == Op::kStar && i.b != i.c && i.mode != kPossessive) ways[pc + 1] = 2;
  }
  for (std::size_t pc = 0; pc < code_.size(); ++pc) {
    PatternInst& i = code_[pc];
    const bool branchingStar = i.op == Op::kStar && i.b != i.c && i.mode != kPossessive;
    if (branchingStar) i.star = stars_++;
    if (i.op == Op::kAlt || i.op == Op::kAtomicBegin || branchingStar || ways[pc] >= 2) {
      i.memo = memoRows_;
      memoRows_ += i.depth + 1;
    }
  }
}

}  // namespace tessel
