// Test-side typist: key centres from the surface size, characters from a key map.
#include "support/keyboard_typist.h"

#include <gtest/gtest.h>

#include <cstring>
#include <stdexcept>

#include "input/layout.h"
#include "input/touch.h"
#include "session/session.h"
#include "session/settings.h"

namespace tessel::test {

namespace {
constexpr int kRowStart[3] = {0, 10, 19};
constexpr int kRowLength[3] = {10, 9, 7};

template <std::size_t N>
void copyText(std::array<char, N>& to, const char* text) {
  ASSERT_EQ(std::strlen(text), N);
  std::memcpy(to.data(), text, N);
}

template <std::size_t N>
std::optional<int> indexOf(const std::array<char, N>& table, char c) {
  for (std::size_t i = 0; i < N; ++i) {
    if (table[i] == c) return static_cast<int>(i);
  }
  return std::nullopt;
}

KeyPlace placeOf(int index, int page, bool shift) {
  KeyPlace p;
  p.page = page;
  p.shift = shift;
  p.row = index < 10 ? 0 : index < 19 ? 1 : 2;
  p.position = index - kRowStart[p.row];
  return p;
}
}  // namespace

ScopedKeyboard::ScopedKeyboard(const std::string& name, int width, int height, bool shuffled, const char* accepts,
                               std::int16_t maxLength) {
  handle_ = createSession(name.c_str());
  session_ = sessionAt(handle_);
  if (session_ == nullptr) throw std::runtime_error("no session for " + name);
  setKbdRandom(*session_, shuffled);
  setAccepts(*session_, accepts);
  setMaxLength(*session_, maxLength);
  buildLayout(*session_);
  applySurfaceGeometry(*session_, width, height, 0);
}

// The three strings a session's release leaves allocated are released first, so that the leak
// checker sees only what the library itself loses.
ScopedKeyboard::~ScopedKeyboard() {
  releaseOwnedText(session_->eccKey);
  releaseOwnedText(session_->content->hashRandomSuffix);
  releaseOwnedText(session_->content->dictionaryFilter);
  destroySession(handle_);
}

std::string ScopedKeyboard::text() {
  ContentGuard guard(*session_->content);
  return std::string(reinterpret_cast<const char*>(guard.text()), guard.length());
}

std::string ScopedKeyboard::restingBuffer() const {
  const auto* p = session_->content->plaintext;
  return std::string(reinterpret_cast<const char*>(p), sizeof session_->content->plaintext);
}

std::size_t ScopedKeyboard::length() const { return session_->content->length; }

TouchPoint KeyGrid::at(double keysFromLeft, int row) const {
  return {static_cast<float>(keysFromLeft * kw_), static_cast<float>((row + 0.5) * kh_)};
}

TouchPoint KeyGrid::characterKey(int row, int position) const {
  // Row 1 starts 0.3 key widths in; row 2's keys follow the 1.5-key-wide shift key.
  static const double kRowOffset[3] = {0.0, 0.3, 1.5};
  return at(kRowOffset[row] + position + 0.5, row);
}

TouchPoint KeyGrid::padCell(int row, int column) const {
  return {static_cast<float>((column + 0.5) * 2.5 * kw_), static_cast<float>((row + 0.5) * kh_)};
}

KeyMap KeyMap::standard() {
  KeyMap m;
  copyText(m.letters, "qwertyuiopasdfghjklzxcvbnm");
  copyText(m.symbolsLower, "1234567890`~!@#$%^&*()-_=+");
  copyText(m.symbolsUpper, "1234567890{}[]\\|:;'\",.<>/?");
  copyText(m.padDigits, "1234567890");
  return m;
}

KeyMap KeyMap::fromSession(const KeyboardSession& s) {
  KeyMap m;
  const auto unmask = [&](std::uint8_t stored) { return static_cast<char>(static_cast<std::uint8_t>(stored + s.keyMask)); };
  for (std::size_t i = 0; i < 26; ++i) {
    m.letters[i] = unmask(s.letters[i]);
    m.symbolsLower[i] = unmask(s.symbolsLower[i]);
    m.symbolsUpper[i] = unmask(s.symbolsUpper[i]);
  }
  for (std::size_t i = 0; i < 10; ++i) m.padDigits[i] = unmask(s.padDigits[i]);
  return m;
}

std::optional<KeyPlace> KeyMap::find(char c, bool shiftNow) const {
  if (auto i = indexOf(letters, c)) return placeOf(*i, 0, false);
  if (c >= 'A' && c <= 'Z') {
    if (auto i = indexOf(letters, static_cast<char>(c + 32))) return placeOf(*i, 0, true);
  }
  const auto lower = indexOf(symbolsLower, c);
  const auto upper = indexOf(symbolsUpper, c);
  if (lower && upper) return shiftNow ? placeOf(*upper, 1, true) : placeOf(*lower, 1, false);
  if (lower) return placeOf(*lower, 1, false);
  if (upper) return placeOf(*upper, 1, true);
  return std::nullopt;
}

std::optional<std::pair<int, int>> KeyMap::findOnPad(char c) const {
  if (c == '.') return std::make_pair(3, 1);
  auto i = indexOf(padDigits, c);
  if (!i) return std::nullopt;
  return std::make_pair(*i / 3, *i % 3);
}

Typist::Typist(KeyboardSession& session, const KeyGrid& grid, const KeyMap& map)
    : session_(session), grid_(grid), map_(map), page_(session.symbolPage != 0), shift_(session.shiftOn != 0) {}

int Typist::tap(TouchPoint p) {
  const int down = touch(session_, 0, p.x, p.y);
  if (down != -1) ADD_FAILURE() << "a key down returned " << down;
  return touch(session_, 1, p.x, p.y);
}

bool Typist::tapExpecting(TouchPoint p, int expected, const char* what) {
  const int got = tap(p);
  if (got == expected) return true;
  ADD_FAILURE() << what << " at (" << p.x << ", " << p.y << ") returned " << got;
  return false;
}

bool Typist::type(const std::string& text) {
  for (char c : text) {
    if (c == ' ') {
      if (!tapExpecting(grid_.spaceKey(), 0, "space")) return false;
      continue;
    }
    const auto place = map_.find(c, shift_);
    if (!place) {
      ADD_FAILURE() << "no key for '" << c << "'";
      return false;
    }
    if (place->page != page_) {
      if (!tapExpecting(grid_.switchKey(), 0, "switch")) return false;
      page_ = place->page;
    }
    if (place->shift != shift_) {
      if (!tapExpecting(grid_.shiftKey(), 0, "shift")) return false;
      shift_ = place->shift;
    }
    if (!tapExpecting(grid_.characterKey(place->row, place->position), 0, "character key")) return false;
  }
  return true;
}

bool Typist::typeOnPad(const std::string& text) {
  for (char c : text) {
    const auto cell = map_.findOnPad(c);
    if (!cell) {
      ADD_FAILURE() << "no pad key for '" << c << "'";
      return false;
    }
    if (!tapExpecting(grid_.padCell(cell->first, cell->second), 0, "pad key")) return false;
  }
  return true;
}

}  // namespace tessel::test
