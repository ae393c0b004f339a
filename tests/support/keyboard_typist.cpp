// Test-side typist: key centres from the surface size, characters from a key map.
#include "support/keyboard_typist.h"

#include <gtest/gtest.h>

#include <stdexcept>

#include "input/layout.h"
#include "input/touch.h"
#include "session/session.h"
#include "session/settings.h"

namespace tessel::test {

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

KeyMap KeyMap::fromSession(const KeyboardSession& s) {
  KeyMap m;
  const auto unmask = [&](const auto& table, std::string& to) {
    for (std::size_t i = 0; i < to.size(); ++i) {
      to[i] = static_cast<char>(static_cast<std::uint8_t>(table[i] + s.keyMask));
    }
  };
  unmask(s.letters, m.letters);
  unmask(s.symbolsLower, m.symbolsLower);
  unmask(s.symbolsUpper, m.symbolsUpper);
  unmask(s.padDigits, m.padDigits);
  return m;
}

Typist::Typist(KeyboardSession& session, const KeyGrid& grid, const KeyMap& map)
    : session_(session), grid_(grid), map_(map), page_(session.symbolPage != 0), shift_(session.shiftOn != 0) {}

int Typist::tap(TouchPoint p) {
  const int down = touch(session_, 0, p.x, p.y);
  if (down != -1) ADD_FAILURE() << "a key down returned " << down;
  return touch(session_, 1, p.x, p.y);
}

bool Typist::tapExpecting(TouchPoint p, const char* what) {
  const int got = tap(p);
  if (got == 0) return true;
  ADD_FAILURE() << what << " at (" << p.x << ", " << p.y << ") returned " << got;
  return false;
}

bool Typist::type(const std::string& text) {
  constexpr auto npos = std::string::npos;
  for (char c : text) {
    if (c == ' ') {
      if (!tapExpecting(grid_.spaceKey(), "space")) return false;
      continue;
    }
    // Letters on page 0 (upper case through shift); symbols on page 1, the shifted page only
    // when c is not on the other, or when shift is on already.
    const char lower = c >= 'A' && c <= 'Z' ? static_cast<char>(c + 32) : c;
    std::size_t index = map_.letters.find(lower);
    int page = 0;
    bool shift = c != lower;
    if (index == npos) {
      const std::size_t below = map_.symbolsLower.find(c), above = map_.symbolsUpper.find(c);
      page = 1;
      shift = above != npos && (below == npos || shift_);
      index = shift ? above : below;
    }
    if (index == npos) {
      ADD_FAILURE() << "no key for '" << c << "'";
      return false;
    }
    if (page != page_ && !tapExpecting(grid_.switchKey(), "switch")) return false;
    page_ = page;
    if (shift != shift_ && !tapExpecting(grid_.shiftKey(), "shift")) return false;
    shift_ = shift;
    const int row = index < 10 ? 0 : index < 19 ? 1 : 2;
    const int position = static_cast<int>(index) - (row == 0 ? 0 : row == 1 ? 10 : 19);
    if (!tapExpecting(grid_.characterKey(row, position), "character key")) return false;
  }
  return true;
}

bool Typist::typeOnPad(const std::string& text) {
  for (char c : text) {
    const std::size_t i = map_.padDigits.find(c);
    if (c != '.' && i == std::string::npos) {
      ADD_FAILURE() << "no pad key for '" << c << "'";
      return false;
    }
    const int cell = c == '.' ? 10 : static_cast<int>(i);  // "." sits at (3, 1)
    if (!tapExpecting(grid_.padCell(cell / 3, cell % 3), "pad key")) return false;
  }
  return true;
}

}  // namespace tessel::test
