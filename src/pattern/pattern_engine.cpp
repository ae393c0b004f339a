// PatternEngine: parser from tokens to nodes, the whole-text match driver and the context.
//
// The parser is recursive descent over the token list; its recursion, like the matcher's,
// follows the parenthesis nesting and is refused beyond kMaxNesting. Every node comes from
// the engine's arena; any failure (malformed pattern, nesting, memory) destroys what was
// built and leaves the engine without a tree. The match driver runs the root's match, then
// its matchNext until a way ends exactly at the end of the text; budget exhaustion and stack
// exhaustion unwind from deep inside the tree by an internal exception caught here.
#include "pattern/pattern_engine.h"

#include <cstdlib>
#include <cstring>
#include <new>
#include <utility>

#include "pattern/pattern_lexer.h"
#include "pattern/pattern_nodes.h"

namespace tessel {

namespace {

struct MatchAborted {};

constexpr std::size_t kMaxStackEntries = std::size_t{1} << 22;  // 16 MiB of backtracking state
const std::uint8_t kNoText[1] = {0};

}  // namespace

// ---- context

MatchContext::~MatchContext() {
  if (stack != inlineStack_) std::free(stack);
  if (captures != inlineCaptures_) std::free(captures);
}

void MatchContext::abort() { throw MatchAborted{}; }

void MatchContext::grow() {
  if (capacity >= kMaxStackEntries) abort();
  const std::size_t grown = capacity * 2;
  auto* p = static_cast<std::int32_t*>(std::malloc(grown * sizeof(std::int32_t)));
  if (p == nullptr) abort();
  std::memcpy(p, stack, top * sizeof(std::int32_t));
  if (stack != inlineStack_) std::free(stack);
  stack = p;
  capacity = grown;
}

bool MatchContext::reset(const std::uint8_t* t, std::int32_t n, int groups, bool rightToLeft) noexcept {
  const std::size_t slots = 2 * (static_cast<std::size_t>(groups) + 1);
  if (slots > captureSlots) {
    auto* p = static_cast<std::int32_t*>(std::malloc(slots * sizeof(std::int32_t)));
    if (p == nullptr) return false;
    if (captures != inlineCaptures_) std::free(captures);
    captures = p;
    captureSlots = slots;
  }
  for (std::size_t i = 0; i < slots; ++i) captures[i] = -1;
  text = t != nullptr ? t : kNoText;
  length = n;
  start = rightToLeft ? n : 0;
  end = rightToLeft ? 0 : n;
  pos = start;
  lastStart = -1;
  stoppedWithoutProgress = false;
  top = 0;
  stepsLeft = stepBudget;
  return true;
}

// ---- parser

namespace {

class Parser {
 public:
  Parser(const Token* tokens, std::size_t count, bool rtl, Arena& arena, Node*& owned) noexcept
      : t_(tokens), n_(count), rtl_(rtl), arena_(arena), owned_(owned) {}

  Node* parse() noexcept {
    Node* root = alternation(0);
    if (root == nullptr) return nullptr;
    if (i_ != n_) return fail(PatternEngine::Status::kMalformed);  // a stray ')'
    if (maxBackref_ > groups_) return fail(PatternEngine::Status::kMalformed);
    return root;
  }

  int groups() const noexcept { return groups_; }
  PatternEngine::Status status() const noexcept { return status_; }

 private:
  Node* fail(PatternEngine::Status s) noexcept {
    if (status_ == PatternEngine::Status::kCompiled) status_ = s;
    return nullptr;
  }

  template <typename T, typename... Args>
  Node* make(Args&&... args) noexcept {
    void* memory = arena_.allocate(sizeof(T), alignof(T));
    if (memory == nullptr) return fail(PatternEngine::Status::kNoMemory);
    T* node = new (memory) T(std::forward<Args>(args)...);
    node->nextOwned = owned_;
    owned_ = node;
    return node;
  }

  bool atEnd() const noexcept { return i_ >= n_; }
  bool isSpecial(std::size_t at, char c) const noexcept {
    return at < n_ && t_[at].kind == TokenKind::kSpecial && t_[at].value == static_cast<std::uint8_t>(c);
  }
  bool isQuantifierAt(std::size_t at) const noexcept {
    return isSpecial(at, '*') || isSpecial(at, '+') || isSpecial(at, '?') || isSpecial(at, '{');
  }

  // Moves a sibling list into an arena array, reversed for right-to-left sequences.
  Node* const* toArray(Node* head, int count, bool reverse) noexcept {
    void* memory = arena_.allocate(sizeof(Node*) * static_cast<std::size_t>(count), alignof(Node*));
    if (memory == nullptr) return nullptr;
    auto** array = static_cast<Node**>(memory);
    int k = 0;
    for (Node* p = head; p != nullptr; p = p->nextSibling) array[reverse ? count - 1 - k++ : k++] = p;
    return array;
  }

  Node* alternation(int depth) noexcept {
    if (depth > PatternEngine::kMaxNesting) return fail(PatternEngine::Status::kTooDeep);
    Node* head = sequence(depth);
    if (head == nullptr) return nullptr;
    if (!isSpecial(i_, '|')) return head;
    Node* last = head;
    int count = 1;
    while (isSpecial(i_, '|')) {
      ++i_;
      Node* next = sequence(depth);
      if (next == nullptr) return nullptr;
      last->nextSibling = next;
      last = next;
      ++count;
    }
    Node* const* children = toArray(head, count, false);
    if (children == nullptr) return fail(PatternEngine::Status::kNoMemory);
    return make<AlternationNode>(children, count);
  }

  Node* sequence(int depth) noexcept {
    Node* head = nullptr;
    Node* last = nullptr;
    int count = 0;
    while (!atEnd() && !isSpecial(i_, '|') && !isSpecial(i_, ')')) {
      Node* item = nullptr;
      if (t_[i_].kind == TokenKind::kByte && !isQuantifierAt(i_ + 1)) {
        item = literalRun();
      } else {
        const int groupsBefore = groups_;
        Node* atom = this->atom(depth);
        if (atom == nullptr) return nullptr;
        item = quantified(atom, groupsBefore + 1, groups_);
      }
      if (item == nullptr) return nullptr;
      if (last == nullptr) {
        head = item;
      } else {
        last->nextSibling = item;
      }
      last = item;
      ++count;
    }
    if (count == 0) return make<EmptyNode>();
    if (count == 1) return head;
    Node* const* children = toArray(head, count, rtl_);
    if (children == nullptr) return fail(PatternEngine::Status::kNoMemory);
    return make<SequenceNode>(children, count);
  }

  // Consecutive literal bytes, none of them followed by a quantifier.
  Node* literalRun() noexcept {
    std::size_t j = i_;
    while (j < n_ && t_[j].kind == TokenKind::kByte && !isQuantifierAt(j + 1)) ++j;
    const std::size_t length = j - i_;
    if (length == 1) return make<CharNode>(t_[i_++].value, rtl_);
    auto* bytes = static_cast<std::uint8_t*>(arena_.allocate(length, 1));
    if (bytes == nullptr) return fail(PatternEngine::Status::kNoMemory);
    for (std::size_t k = 0; k < length; ++k) bytes[k] = t_[i_ + k].value;
    i_ = j;
    return make<LiteralNode>(bytes, static_cast<std::int32_t>(length), rtl_);
  }

  Node* atom(int depth) noexcept {
    if (atEnd()) return fail(PatternEngine::Status::kMalformed);
    const Token& t = t_[i_];
    switch (t.kind) {
      case TokenKind::kByte:
        ++i_;
        return make<CharNode>(t.value, rtl_);
      case TokenKind::kClass:
        ++i_;
        return make<ClassNode>(static_cast<NamedClass>(t.value), t.negated, rtl_);
      case TokenKind::kAssert:
        ++i_;
        return make<AssertNode>(assertKind(t.value));
      case TokenKind::kBackref:
        ++i_;
        if (t.number > maxBackref_) maxBackref_ = t.number;
        return make<BackrefNode>(t.number, rtl_);
      case TokenKind::kSpecial:
        break;
    }
    switch (t.value) {
      case '.':
        ++i_;
        return make<AnyNode>(rtl_);
      case '^':
        ++i_;
        return make<AssertNode>(AssertKind::kLineStart);
      case '$':
        ++i_;
        return make<AssertNode>(AssertKind::kLineEnd);
      case '[':
        ++i_;
        return bracketSet();
      case '(': {
        ++i_;
        if (groups_ == PatternEngine::kUnbounded) return fail(PatternEngine::Status::kMalformed);
        const int number = ++groups_;
        Node* inner = alternation(depth + 1);
        if (inner == nullptr) return nullptr;
        if (!isSpecial(i_, ')')) return fail(PatternEngine::Status::kMalformed);
        ++i_;
        return make<GroupNode>(number, inner);
      }
      default:  // a quantifier, '{' or '}' with nothing before it
        return fail(PatternEngine::Status::kMalformed);
    }
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

  // After the '[': members up to the closing ']'.
  Node* bracketSet() noexcept {
    bool negated = false;
    if (isSpecial(i_, '^')) {
      negated = true;
      ++i_;
    }
    ByteSet members;
    for (;;) {
      if (atEnd()) return fail(PatternEngine::Status::kMalformed);
      const Token& t = t_[i_];
      if (t.kind == TokenKind::kSpecial && t.value == ']') {
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
      if (!isRangeEnd(i_)) return fail(PatternEngine::Status::kMalformed);
      if (isSpecial(i_ + 1, '-') && isRangeEnd(i_ + 2)) {
        const std::uint8_t lo = t.value;
        const std::uint8_t hi = t_[i_ + 2].value;
        if (hi < lo) return fail(PatternEngine::Status::kMalformed);
        members.addRange(lo, hi);
        i_ += 3;
      } else {
        members.add(t.value);
        ++i_;
      }
    }
    return make<SetNode>(members, negated, rtl_);
  }

  // A byte that can be a set member or a range end: a plain byte, or a '-' standing for itself.
  bool isRangeEnd(std::size_t at) const noexcept {
    return at < n_ && (t_[at].kind == TokenKind::kByte || isSpecial(at, '-'));
  }

  bool number(std::int64_t* value) noexcept {
    std::int64_t v = 0;
    std::size_t digits = 0;
    while (i_ < n_ && t_[i_].kind == TokenKind::kByte && t_[i_].value >= '0' && t_[i_].value <= '9') {
      v = v * 10 + (t_[i_].value - '0');
      if (v > PatternEngine::kUnbounded) return false;
      ++i_;
      ++digits;
    }
    *value = v;
    return digits > 0;
  }

  Node* quantified(Node* atom, int firstGroup, int lastGroup) noexcept {
    if (!isQuantifierAt(i_)) return atom;
    std::int64_t minimum = 0;
    std::int64_t maximum = PatternEngine::kUnbounded;
    const std::uint8_t q = t_[i_++].value;
    if (q == '+') {
      minimum = 1;
    } else if (q == '?') {
      maximum = 1;
    } else if (q == '{') {
      if (!number(&minimum)) return fail(PatternEngine::Status::kMalformed);
      if (isSpecial(i_, '}')) {
        maximum = minimum;
      } else {
        if (i_ >= n_ || t_[i_].kind != TokenKind::kByte || t_[i_].value != ',')
          return fail(PatternEngine::Status::kMalformed);
        ++i_;
        if (!isSpecial(i_, '}') && !number(&maximum)) return fail(PatternEngine::Status::kMalformed);
        if (maximum < minimum) maximum = minimum;
      }
      if (!isSpecial(i_, '}')) return fail(PatternEngine::Status::kMalformed);
      ++i_;
    }
    enum class Mode { kGreedy, kReluctant, kPossessive } mode = Mode::kGreedy;
    if (isSpecial(i_, '?')) {
      mode = Mode::kReluctant;
      ++i_;
    } else if (isSpecial(i_, '+')) {
      mode = Mode::kPossessive;
      ++i_;
    }
    if (maximum == 0) return make<EmptyNode>();
    const auto lo = static_cast<std::int32_t>(minimum);
    const auto extra = static_cast<std::int32_t>(maximum - minimum);
    if (extra == 0) return make<FixedRepeatNode>(atom, lo, rtl_);
    switch (mode) {
      case Mode::kReluctant: return make<ReluctantRepeatNode>(atom, lo, extra, rtl_);
      case Mode::kPossessive:
        return make<PossessiveRepeatNode>(atom, lo, extra, rtl_, firstGroup, lastGroup);
      case Mode::kGreedy: break;
    }
    return make<GreedyRepeatNode>(atom, lo, extra, rtl_);
  }

  const Token* t_;
  std::size_t n_;
  bool rtl_;
  Arena& arena_;
  Node*& owned_;
  std::size_t i_ = 0;
  int groups_ = 0;
  std::int32_t maxBackref_ = 0;
  PatternEngine::Status status_ = PatternEngine::Status::kCompiled;
};

}  // namespace

// ---- engine

PatternEngine::PatternEngine(const char* pattern, std::uint32_t flags) noexcept {
  compile(pattern, pattern != nullptr ? std::strlen(pattern) : 0, flags);
}

PatternEngine::PatternEngine(const char* pattern, std::size_t length, std::uint32_t flags) noexcept {
  compile(pattern, pattern != nullptr ? length : 0, flags);
}

PatternEngine::~PatternEngine() { destroyNodes(); }

void PatternEngine::destroyNodes() noexcept {
  Node* n = owned_;
  while (n != nullptr) {
    Node* next = n->nextOwned;
    n->~Node();
    n = next;
  }
  owned_ = nullptr;
  root_ = nullptr;
}

void PatternEngine::compile(const char* pattern, std::size_t length, std::uint32_t flags) noexcept {
  rightToLeft_ = (flags & kRightToLeft) != 0;
  if (length == 0) {
    status_ = Status::kEmptyPattern;
    return;
  }
  TokenList tokens;
  if (!lexPattern(pattern, length, flags, tokens)) {
    status_ = Status::kMalformed;
    return;
  }
  Parser parser(tokens.data(), tokens.size(), rightToLeft_, arena_, owned_);
  Node* root = parser.parse();
  if (root == nullptr) {
    status_ = parser.status();
    destroyNodes();
    return;
  }
  root->setTail();
  root_ = root;
  groups_ = parser.groups();
  status_ = Status::kCompiled;
}

bool PatternEngine::run(MatchContext& c, const std::uint8_t* text, std::size_t length) const noexcept {
  if (root_ == nullptr || length > static_cast<std::size_t>(kUnbounded) / 2) return false;
  if (!c.reset(text, static_cast<std::int32_t>(length), groups_, rightToLeft_)) return false;
  try {
    if (!root_->match(c)) return false;
    // Ask the tree for its next way of matching until one consumes the whole text. Two ways in a
    // row that both end where matching began count as no progress and end the search: that is
    // the documented behaviour of the whole-text match (it only matters for patterns with several
    // empty alternatives, such as "(a*?|)(||)" against "a").
    while (c.pos != c.end) {
      if (!root_->matchNext(c)) return false;
      if (c.lastStart == c.start && c.start == c.pos) {
        c.stoppedWithoutProgress = true;
        return false;
      }
      c.lastStart = c.pos;
    }
  } catch (const MatchAborted&) {
    return false;
  }
  c.captures[0] = c.start;
  c.captures[1] = c.pos;
  return true;
}

bool PatternEngine::matches(const std::uint8_t* text, std::size_t length,
                            MatchContext* context) const noexcept {
  if (root_ == nullptr) return false;
  if (context != nullptr) return run(*context, text, length);
  MatchContext local;
  return run(local, text, length);
}

MatchResult PatternEngine::matchExact(const std::uint8_t* text, std::size_t length,
                                      MatchContext* context) const noexcept {
  if (root_ == nullptr) return {};
  MatchContext local;
  MatchContext& c = context != nullptr ? *context : local;
  if (!run(c, text, length)) return {};
  MatchResult result;
  try {
    result.reserve(2 + 2 * (static_cast<std::size_t>(groups_) + 1));
  } catch (...) {
    return {};
  }
  result.push_back(1);
  result.push_back(groups_);
  for (int g = 0; g <= groups_; ++g) {
    const std::int32_t a = c.captures[2 * g];
    const std::int32_t b = c.captures[2 * g + 1];
    result.push_back(a < b ? a : b);
    result.push_back(a < b ? b : a);
  }
  return result;
}

std::string PatternEngine::dump() const {
  if (root_ == nullptr) return "none";
  std::string out;
  root_->dump(out);
  return out;
}

}  // namespace tessel
