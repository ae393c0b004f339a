// Match nodes of a compiled pattern (private to the pattern engine).
//
// Every node answers two questions about the context's current position: `match` (the first
// way to match here; true on success, with the position moved past what was consumed) and
// `matchNext` (the next way, after an earlier success of the same node; true on success).
// Protocol of the backtracking stack, which is what keeps native recursion bounded by the
// pattern's nesting instead of the text's length:
// - after a successful match/matchNext the node has pushed exactly the state it needs to
//   resume, on top of whatever its children pushed;
// - after a failed matchNext it has popped all of it, leaving the stack as it was before its
//   first match; a failed match leaves the stack unchanged;
// - the position is undefined after a failure: each node restores it from its own state.
// Because a sequence always resumes its most recent child first, the stack stays strictly
// last-in first-out. Capture changes are undone through the same stack.
//
// Nodes are placed in the engine's arena, linked through nextOwned, and destroyed by the
// engine (no recursion). Nodes that always consume exactly one byte expose their ByteSet
// through singleByte(), which lets repetitions run a tight loop instead of calling the child.
#pragma once

#include <cstdint>
#include <string>

#include "pattern/char_class.h"
#include "pattern/pattern_engine.h"

namespace tessel {

class Node {
 public:
  virtual bool match(MatchContext& c) const = 0;
  virtual bool matchNext(MatchContext& c) const = 0;
  virtual ~Node() = default;
  virtual void dump(std::string& out) const = 0;
  // Marks a node whose continuation is only "the position must be the end of the text".
  virtual void setTail() noexcept {}

  const ByteSet* singleByte() const noexcept { return singleByte_; }

  Node* nextOwned = nullptr;    // engine's destruction list
  Node* nextSibling = nullptr;  // parser's child list

 protected:
  const ByteSet* singleByte_ = nullptr;
};

// ---- one byte

class ByteNode : public Node {
 public:
  ByteNode(const ByteSet& set, bool rtl) noexcept : set_(set), rtl_(rtl) { singleByte_ = &set_; }
  bool match(MatchContext& c) const override;
  bool matchNext(MatchContext& c) const override;

 protected:
  ByteSet set_;
  bool rtl_;
};

class CharNode final : public ByteNode {  // one literal byte
 public:
  CharNode(std::uint8_t b, bool rtl) noexcept;
  void dump(std::string& out) const override;

 private:
  std::uint8_t byte_;
};

class AnyNode final : public ByteNode {  // '.'
 public:
  explicit AnyNode(bool rtl) noexcept;
  void dump(std::string& out) const override;
};

class SetNode final : public ByteNode {  // [...]
 public:
  SetNode(const ByteSet& members, bool negated, bool rtl) noexcept;
  void dump(std::string& out) const override;

 private:
  ByteSet members_;  // as written, before negation
  bool negated_;
};

class ClassNode final : public ByteNode {  // [:name:], [:^name:], \d ...
 public:
  ClassNode(NamedClass id, bool negated, bool rtl) noexcept;
  void dump(std::string& out) const override;

 private:
  NamedClass id_;
  bool negated_;
};

// ---- literal text of two or more bytes

class LiteralNode final : public Node {
 public:
  LiteralNode(const std::uint8_t* bytes, std::int32_t length, bool rtl) noexcept
      : bytes_(bytes), length_(length), rtl_(rtl) {}
  bool match(MatchContext& c) const override;
  bool matchNext(MatchContext& c) const override;
  void dump(std::string& out) const override;

 private:
  const std::uint8_t* bytes_;  // in the arena
  std::int32_t length_;
  bool rtl_;
};

// ---- structure

class EmptyNode final : public Node {
 public:
  bool match(MatchContext& c) const override;
  bool matchNext(MatchContext& c) const override;
  void dump(std::string& out) const override;
};

class SequenceNode final : public Node {
 public:
  SequenceNode(Node* const* children, int count) noexcept : children_(children), count_(count) {}
  bool match(MatchContext& c) const override;
  bool matchNext(MatchContext& c) const override;
  void dump(std::string& out) const override;
  void setTail() noexcept override;

 private:
  bool resume(MatchContext& c, int index, bool backtrack) const;
  Node* const* children_;  // in matching order (reversed for right-to-left)
  int count_;
};

class AlternationNode final : public Node {
 public:
  AlternationNode(Node* const* children, int count) noexcept : children_(children), count_(count) {}
  bool match(MatchContext& c) const override;
  bool matchNext(MatchContext& c) const override;
  void dump(std::string& out) const override;
  void setTail() noexcept override;

 private:
  Node* const* children_;
  int count_;
};

class GroupNode final : public Node {
 public:
  GroupNode(int number, Node* child) noexcept : number_(number), child_(child) {}
  bool match(MatchContext& c) const override;
  bool matchNext(MatchContext& c) const override;
  void dump(std::string& out) const override;
  void setTail() noexcept override { child_->setTail(); }

 private:
  int number_;
  Node* child_;
};

// ---- repetitions: minimum and number of optional extra iterations

class RepeatNode : public Node {
 public:
  RepeatNode(Node* child, std::int32_t minimum, std::int32_t extra, bool rtl) noexcept;
  void setTail() noexcept override { tail_ = true; }

 protected:
  bool greedyRun(MatchContext& c, std::int32_t count, bool extend) const;
  void dumpCounts(std::string& out, const char* kind) const;
  // Scans up to `limit` bytes of the child's set from the current position; the count.
  std::int32_t scan(MatchContext& c, std::int32_t limit) const;
  std::int32_t available(const MatchContext& c) const noexcept {
    return rtl_ ? c.pos : c.length - c.pos;
  }

  Node* child_;
  std::int32_t min_;
  std::int32_t extra_;
  std::int32_t max_;
  bool rtl_;
  bool tail_ = false;
  const ByteSet* bytes_;  // child's set when it is a one-byte node
};

class FixedRepeatNode final : public RepeatNode {
 public:
  FixedRepeatNode(Node* child, std::int32_t count, bool rtl) noexcept
      : RepeatNode(child, count, 0, rtl) {}
  bool match(MatchContext& c) const override;
  bool matchNext(MatchContext& c) const override;
  void dump(std::string& out) const override;
};

class GreedyRepeatNode final : public RepeatNode {
 public:
  using RepeatNode::RepeatNode;
  bool match(MatchContext& c) const override;
  bool matchNext(MatchContext& c) const override;
  void dump(std::string& out) const override;
};

class ReluctantRepeatNode final : public RepeatNode {
 public:
  using RepeatNode::RepeatNode;
  bool match(MatchContext& c) const override;
  bool matchNext(MatchContext& c) const override;
  void dump(std::string& out) const override;

 private:
  enum class Phase { kToMinimum, kOneMore, kBacktrack };
  bool run(MatchContext& c, std::int32_t count, Phase phase) const;
};

class PossessiveRepeatNode final : public RepeatNode {
 public:
  PossessiveRepeatNode(Node* child, std::int32_t minimum, std::int32_t extra, bool rtl,
                       int firstGroup, int lastGroup) noexcept
      : RepeatNode(child, minimum, extra, rtl), firstGroup_(firstGroup), lastGroup_(lastGroup) {}
  bool match(MatchContext& c) const override;
  bool matchNext(MatchContext& c) const override;
  void dump(std::string& out) const override;

 private:
  int firstGroup_;  // groups inside the child, whose captures are restored on backtracking
  int lastGroup_;
};

// ---- zero-width

enum class AssertKind : std::uint8_t {
  kLineStart,      // ^
  kLineEnd,        // $
  kTextStart,      // \A
  kTextEndOrNl,    // \Z
  kTextEnd,        // \z
  kWordBoundary,   // \b
  kNotWordBoundary,  // \B
  kMatchStart,     // \G
};

class AssertNode final : public Node {
 public:
  explicit AssertNode(AssertKind kind) noexcept : kind_(kind) {}
  bool match(MatchContext& c) const override;
  bool matchNext(MatchContext& c) const override;
  void dump(std::string& out) const override;

 private:
  AssertKind kind_;
};

class BackrefNode final : public Node {
 public:
  BackrefNode(int number, bool rtl) noexcept : number_(number), rtl_(rtl) {}
  bool match(MatchContext& c) const override;
  bool matchNext(MatchContext& c) const override;
  void dump(std::string& out) const override;

 private:
  int number_;
  bool rtl_;
};

}  // namespace tessel
