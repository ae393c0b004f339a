// Lexer of the pattern syntax (private to the pattern engine).
//
// Turns a pattern text into tokens: a plain byte, a special byte (context dependent: outside a
// bracket expression $ ( ) * + . ? [ ^ { | } are special; inside one only ']', '-' and a
// leading '^'), a class (a "[:name:]" / "[:^name:]" written anywhere, or \d \D \s \S \w \W),
// an assertion (\A \Z \z \b \B \G), or a back-reference (\g and \k only:
// an escaped digit stands for itself, so "a\1" matches "a1"). Comments "(?#...)"
// produce nothing; with the extended flag, white space and '#' comments outside brackets are
// skipped. \Q...\E is literal mode; \L and \U lower/upper-case the following literal bytes
// until \E. The bracket depth is tracked here so the parser never sees a '[' inside a set as
// anything but a plain byte.
//
// Decisions where the syntax leaves room (documented in pattern_engine.h): inside a bracket
// expression a backslash is a plain byte, like every byte but ']', '-', a leading '^' and "[:";
// \x takes up to two hex digits (none means NUL) or
// {hex} up to 0xFF; \u takes one to four hex digits up to 0xFF; \0..\9 stand for the digit. Anything
// the lexer cannot read (unknown class name, unterminated "[:", "(?#" or \x{, trailing
// backslash) makes the whole pattern malformed.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tessel {

enum class TokenKind : std::uint8_t { kByte, kSpecial, kClass, kAssert, kBackref };

struct Token {
  TokenKind kind;
  std::uint8_t value;     // the byte; the special byte; a NamedClass; the assertion letter
  bool negated;           // classes only
  std::int32_t number;    // back-references only
};

// Growable token list with inline room for the patterns of everyday use.
class TokenList {
 public:
  static constexpr std::size_t kInlineTokens = 48;
  TokenList() noexcept = default;
  ~TokenList();
  TokenList(const TokenList&) = delete;
  TokenList& operator=(const TokenList&) = delete;

  bool push(const Token& t) noexcept;  // false when memory runs out
  const Token* data() const noexcept { return data_; }
  std::size_t size() const noexcept { return size_; }

 private:
  Token inline_[kInlineTokens];
  Token* data_ = inline_;
  std::size_t size_ = 0;
  std::size_t capacity_ = kInlineTokens;
};

// Tokenizes pattern[0, length), `extended` skipping white space and '#' comments outside sets.
// False when the pattern cannot be read or memory runs out.
bool lexPattern(const char* pattern, std::size_t length, bool extended, TokenList& out) noexcept;

}  // namespace tessel
