// Linked into every benchmark program. The programs print through their own console reporters,
// which colour the table whatever stdout is; when stdout is not a terminal (a file, a pipe) the
// colour escape sequences are dropped here, so saved output is plain text.
#include <unistd.h>

#include <iostream>
#include <streambuf>

namespace {

// Forwards every character to the real buffer except ESC '[' ... final byte sequences.
class PlainText : public std::streambuf {
 public:
  explicit PlainText(std::streambuf* out) : out_(out) {}

 protected:
  int_type overflow(int_type c) override {
    if (traits_type::eq_int_type(c, traits_type::eof())) return traits_type::not_eof(c);
    const char ch = traits_type::to_char_type(c);
    if (state_ == kText) {
      if (ch != '\033') return out_->sputc(ch);
      state_ = kEscape;
    } else if (state_ == kEscape) {
      state_ = ch == '[' ? kSequence : kText;
    } else if (ch >= 0x40 && ch <= 0x7E) {
      state_ = kText;
    }
    return c;
  }
  int sync() override { return out_->pubsync(); }

 private:
  enum { kText, kEscape, kSequence } state_ = kText;
  std::streambuf* out_;
};

// Never destroyed: std::cout may be flushed after static destructors have run.
const bool kInstalled = !isatty(STDOUT_FILENO) && std::cout.rdbuf(new PlainText(std::cout.rdbuf()));

}  // namespace
