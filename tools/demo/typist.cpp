// Key centres follow the keyboard as drawn: a 10 x 4 grid; row 1 is shifted right by 0.3 key
// widths; row 2 starts after the 1.5-key-wide shift key.
#include "typist.h"

#include <cctype>

#include "input/touch.h"
#include "session/session.h"

namespace demo {
namespace {

struct Found {
  int page = -1;   // 0 letters, 1 symbols
  int shift = 0;
  int position = -1;
};

Found locate(const tessel::KeyboardSession& s, char c) {
  const auto at = [&](const tessel::RelaxedField<std::uint8_t>* table, int k) {
    return static_cast<char>(static_cast<std::uint8_t>(table[k] + s.keyMask));
  };
  const char lower = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  for (int k = 0; k < 26; ++k) {
    if (std::isalpha(static_cast<unsigned char>(c)) && at(s.letters, k) == lower)
      return {0, std::isupper(static_cast<unsigned char>(c)) ? 1 : 0, k};
  }
  // Digits stand on both symbol pages: prefer the page already shown.
  const int preferred = s.shiftOn != 0 ? 1 : 0;
  for (int pass = 0; pass < 2; ++pass) {
    const int shift = pass == 0 ? preferred : 1 - preferred;
    const auto* table = shift ? s.symbolsUpper : s.symbolsLower;
    for (int k = 0; k < 26; ++k)
      if (at(table, k) == c) return {1, shift, k};
  }
  return {};
}

}  // namespace

int Typist::tap(const Tap& t) {
  tessel::touch(session_, 0, t.x, t.y);
  if (onTap_) onTap_(t);
  return tessel::touch(session_, 1, t.x, t.y);
}

bool Typist::type(char c) {
  const Found f = locate(session_, c);
  if (f.position < 0) return false;
  const float kw = session_.keyWidth, kh = session_.keyHeight;
  if (static_cast<int>(session_.symbolPage) != f.page)
    tap({1.25f * kw, 3.5f * kh, f.page ? "page switch to symbols" : "page switch to letters"});
  if ((session_.shiftOn != 0) != (f.shift != 0)) tap({0.75f * kw, 2.5f * kh, "shift"});
  float x;
  int row;
  if (f.position < 10) {
    row = 0;
    x = (f.position + 0.5f) * kw;
  } else if (f.position < 19) {
    row = 1;
    x = (f.position - 10 + 0.8f) * kw;
  } else {
    row = 2;
    x = (f.position - 19 + 2.0f) * kw;
  }
  tap({x, (row + 0.5f) * kh, "a character key"});
  return true;
}

int Typist::done() {
  const float kw = session_.keyWidth, kh = session_.keyHeight;
  return tap({8.75f * kw, 3.5f * kh, "done"});
}

}  // namespace demo
