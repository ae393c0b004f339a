// Pattern lexer: one pass over the bytes, bracket depth and quoting tracked as state.
#include "pattern/pattern_lexer.h"

#include <cstdlib>
#include <cstring>

#include "pattern/char_class.h"

namespace tessel {

TokenList::~TokenList() {
  if (data_ != inline_) std::free(data_);
}

bool TokenList::push(const Token& t) noexcept {
  if (size_ == capacity_) {
    const std::size_t grown = capacity_ * 2;
    auto* p = static_cast<Token*>(std::malloc(grown * sizeof(Token)));
    if (p == nullptr) return false;
    std::memcpy(p, data_, size_ * sizeof(Token));
    if (data_ != inline_) std::free(data_);
    data_ = p;
    capacity_ = grown;
  }
  data_[size_++] = t;
  return true;
}

namespace {

int hexValue(char c) noexcept {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  return -1;
}

bool isExtendedSpace(char c) noexcept {
  return c == ' ' || c == '\t' || c == '\n' || c == '\v' || c == '\f' || c == '\r';
}

enum class CaseMode { kNone, kLower, kUpper };

class Lexer {
 public:
  Lexer(const char* p, std::size_t n, bool extended, TokenList& out) noexcept
      : p_(p), n_(n), extended_(extended), out_(out) {}

  bool run() noexcept {
    while (i_ < n_) {
      if (!step()) return false;
    }
    return true;  // an unclosed set is reported by the parser (it never sees the ']')
  }

 private:
  bool step() noexcept {
    const char c = p_[i_];
    if (quoting_) {
      if (c == '\\' && i_ + 1 < n_ && p_[i_ + 1] == 'E') {
        quoting_ = false;
        i_ += 2;
        return true;
      }
      ++i_;
      return byte(static_cast<std::uint8_t>(c));
    }
    if (depth_ == 0) return outsideSet(c);
    return insideSet(c);
  }

  bool outsideSet(char c) noexcept {
    if (extended_) {
      if (isExtendedSpace(c)) {
        ++i_;
        return true;
      }
      if (c == '#') {
        while (i_ < n_ && p_[i_] != '\n') ++i_;
        return true;
      }
    }
    if (c == '(' && i_ + 2 < n_ && p_[i_ + 1] == '?' && p_[i_ + 2] == '#') {
      const void* close = std::memchr(p_ + i_ + 3, ')', n_ - (i_ + 3));
      if (close == nullptr) return false;
      i_ = static_cast<std::size_t>(static_cast<const char*>(close) - p_) + 1;
      return true;
    }
    if (c == '[') {
      if (i_ + 1 < n_ && p_[i_ + 1] == ':') return namedClass();
      ++i_;
      depth_ = 1;
      setStart_ = true;
      return special('[');
    }
    if (c == '\\') return escape();
    if (c == '(') ++groupsOpened_;
    ++i_;
    switch (c) {
      case '$': case '(': case ')': case '*': case '+': case '.': case '?': case '^':
      case '{': case '|': case '}':
        return special(static_cast<std::uint8_t>(c));
      default:
        return byte(static_cast<std::uint8_t>(c));
    }
  }

  bool insideSet(char c) noexcept {
    const bool atStart = setStart_;
    setStart_ = false;
    if (c == '[' && i_ + 1 < n_ && p_[i_ + 1] == ':') return namedClass();
    ++i_;  // a backslash is a plain byte here
    if (c == ']') {
      depth_ = 0;
      return special(']');
    }
    if (c == '-') return special('-');
    if (c == '^' && atStart) return special('^');
    return byte(static_cast<std::uint8_t>(c));
  }

  // At "[:": reads "[:name:]" or "[:^name:]" as one class token.
  bool namedClass() noexcept {
    std::size_t j = i_ + 2;
    bool negated = false;
    if (j < n_ && p_[j] == '^') {
      negated = true;
      ++j;
    }
    const std::size_t nameStart = j;
    while (j < n_ && p_[j] != ':') ++j;
    if (j + 1 >= n_ || p_[j + 1] != ']') return false;
    NamedClass id;
    if (!lookupNamedClass(p_ + nameStart, j + 1 - nameStart, &id)) return false;
    i_ = j + 2;
    setStart_ = false;
    return out_.push(Token{TokenKind::kClass, static_cast<std::uint8_t>(id), negated, 0});
  }

  bool escape() noexcept {
    if (i_ + 1 >= n_) return false;
    const char e = p_[i_ + 1];
    i_ += 2;
    switch (e) {
      case 'd': return classToken(NamedClass::kDigit, false);
      case 'D': return classToken(NamedClass::kDigit, true);
      case 's': return classToken(NamedClass::kSpace, false);
      case 'S': return classToken(NamedClass::kSpace, true);
      case 'w': return classToken(NamedClass::kWord, false);
      case 'W': return classToken(NamedClass::kWord, true);
      case 'A': case 'Z': case 'z': case 'b': case 'B': case 'G':
        return assertion(static_cast<std::uint8_t>(e));
      case 'g': case 'k': return backrefSyntax();
      case 'Q': quoting_ = true; return true;
      case 'E': caseMode_ = CaseMode::kNone; return true;
      case 'L': caseMode_ = CaseMode::kLower; return true;
      case 'U': caseMode_ = CaseMode::kUpper; return true;
      case 'a': return rawByte(0x07);
      case 'e': return rawByte(0x1B);
      case 'f': return rawByte(0x0C);
      case 'n': return rawByte(0x0A);
      case 'r': return rawByte(0x0D);
      case 't': return rawByte(0x09);
      case 'v': return rawByte(0x0B);
      case 'x': return hexEscape(2, true);
      case 'u': return hexEscape(4, false);
      default:
        break;
    }
    return byte(static_cast<std::uint8_t>(e));
  }

  // \gN \g{N} \g{-N} \kN \k{N} \k<N>: absolute group numbers, or relative to the groups
  // opened so far (every '(' opens a capturing group in this syntax).
  bool backrefSyntax() noexcept {
    if (i_ >= n_) return false;
    char close = 0;
    if (p_[i_] == '{') close = '}';
    if (p_[i_] == '<') close = '>';
    if (close != 0) ++i_;
    bool relative = false;
    if (close != 0 && i_ < n_ && p_[i_] == '-') {
      relative = true;
      ++i_;
    }
    std::int64_t value = 0;
    std::size_t digits = 0;
    while (i_ < n_ && p_[i_] >= '0' && p_[i_] <= '9') {
      value = value * 10 + (p_[i_] - '0');
      if (value > INT32_MAX) return false;
      ++i_;
      ++digits;
    }
    if (digits == 0) return false;
    if (close != 0) {
      if (i_ >= n_ || p_[i_] != close) return false;
      ++i_;
    }
    if (relative) value = static_cast<std::int64_t>(groupsOpened_) - value + 1;
    if (value <= 0) return false;
    return out_.push(Token{TokenKind::kBackref, 0, false, static_cast<std::int32_t>(value)});
  }

  bool hexEscape(int maxDigits, bool allowBraces) noexcept {
    int value = 0;
    if (allowBraces && i_ < n_ && p_[i_] == '{') {
      ++i_;
      int digits = 0;
      while (i_ < n_ && hexValue(p_[i_]) >= 0) {
        value = value * 16 + hexValue(p_[i_]);
        if (value > 0xFF) return false;
        ++i_;
        ++digits;
      }
      if (digits == 0 || i_ >= n_ || p_[i_] != '}') return false;
      ++i_;
      return rawByte(static_cast<std::uint8_t>(value));
    }
    int digits = 0;
    while (digits < maxDigits && i_ < n_ && hexValue(p_[i_]) >= 0) {
      value = value * 16 + hexValue(p_[i_]);
      ++i_;
      ++digits;
    }
    if (!allowBraces && (digits == 0 || value > 0xFF)) return false;
    return rawByte(static_cast<std::uint8_t>(value));
  }

  bool classToken(NamedClass id, bool negated) noexcept {
    return out_.push(Token{TokenKind::kClass, static_cast<std::uint8_t>(id), negated, 0});
  }
  bool assertion(std::uint8_t letter) noexcept {
    return out_.push(Token{TokenKind::kAssert, letter, false, 0});
  }
  bool special(std::uint8_t c) noexcept {
    return out_.push(Token{TokenKind::kSpecial, c, false, 0});
  }
  // A literal byte from the pattern text: subject to \L / \U.
  bool byte(std::uint8_t c) noexcept {
    if (caseMode_ == CaseMode::kLower && c >= 'A' && c <= 'Z') c = static_cast<std::uint8_t>(c + 32);
    if (caseMode_ == CaseMode::kUpper && c >= 'a' && c <= 'z') c = static_cast<std::uint8_t>(c - 32);
    return out_.push(Token{TokenKind::kByte, c, false, 0});
  }
  // A byte given by value (\n, \x41, ...): taken as written.
  bool rawByte(std::uint8_t c) noexcept { return out_.push(Token{TokenKind::kByte, c, false, 0}); }

  const char* p_;
  std::size_t n_;
  bool extended_;
  TokenList& out_;
  std::size_t i_ = 0;
  int depth_ = 0;
  bool setStart_ = false;
  bool quoting_ = false;
  CaseMode caseMode_ = CaseMode::kNone;
  std::int64_t groupsOpened_ = 0;
};

}  // namespace

bool lexPattern(const char* pattern, std::size_t length, bool extended, TokenList& out) noexcept {
  Lexer lexer(pattern, length, extended, out);
  return lexer.run();
}

}  // namespace tessel
