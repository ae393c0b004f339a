// A test-side typist: turns characters into touch coordinates and drives touch() with them.
//
// Key centres come from the surface size alone, never from the library's dispatch code, so a
// hit-testing fault shows up as a wrong character; characters come from the standard layout
// written out here, or from the session's own (possibly shuffled) tables.
#pragma once

#include <cstdint>
#include <string>

namespace tessel {
struct KeyboardSession;
}

namespace tessel::test {

struct TouchPoint {
  float x = 0;
  float y = 0;
};

// A live session for touch tests: layout built (shuffled or not), the surface geometry applied,
// the accepts pattern and maxLength set. Destroyed on scope exit.
class ScopedKeyboard {
 public:
  ScopedKeyboard(const std::string& name, int width, int height, bool shuffled = false,
                 const char* accepts = "[[:print:]]*", std::int16_t maxLength = 4092);
  ~ScopedKeyboard();
  ScopedKeyboard(const ScopedKeyboard&) = delete;
  ScopedKeyboard& operator=(const ScopedKeyboard&) = delete;

  KeyboardSession& session() { return *session_; }
  // The typed text, read through a ContentGuard (resealed afterwards).
  std::string text();
  // The whole 4093-byte buffer as it rests in memory (sealed part and terminator).
  std::string restingBuffer() const;
  std::size_t length() const;

 private:
  int handle_ = -1;
  KeyboardSession* session_ = nullptr;
};

// Key centres of a surface, computed in double precision from width and height.
class KeyGrid {
 public:
  KeyGrid(int width, int height) : kw_(width / 10.0), kh_(height / 4.0) {}
  // Character key `position` of full-keyboard row 0, 1 or 2: row 1 starts 0.3 key widths in,
  // row 2's keys follow the 1.5-key-wide shift key.
  TouchPoint characterKey(int row, int position) const {
    return at((row == 1 ? 0.3 : row * 0.75) + position + 0.5, row);
  }
  TouchPoint shiftKey() const { return at(0.75, 2); }
  TouchPoint deleteKey() const { return at(9.25, 2); }
  TouchPoint switchKey() const { return at(1.25, 3); }
  TouchPoint spaceKey() const { return at(5.0, 3); }
  // Number-pad cell (row 0..3, column 0..3), each column 2.5 key widths wide.
  TouchPoint padCell(int row, int column) const { return at((column + 0.5) * 2.5, row); }

 private:
  TouchPoint at(double keysFromLeft, int row) const {
    return {static_cast<float>(keysFromLeft * kw_), static_cast<float>((row + 0.5) * kh_)};
  }
  double kw_;
  double kh_;
};

// Characters of one layout in key order: 26 letters, the two symbol pages, the pad digits.
struct KeyMap {
  std::string letters = "qwertyuiopasdfghjklzxcvbnm";
  std::string symbolsLower = "1234567890`~!@#$%^&*()-_=+";
  std::string symbolsUpper = "1234567890{}[]\\|:;'\",.<>/?";
  std::string padDigits = "1234567890";

  static KeyMap standard() { return KeyMap(); }
  static KeyMap fromSession(const KeyboardSession& s);  // the tables with keyMask undone
};

// Types text through touch(), pressing switch and shift as needed (tracking page and shift from
// the session's start state). Every down must give -1 and every up 0; the first surprise is
// reported through ADD_FAILURE and typing stops (false).
class Typist {
 public:
  Typist(KeyboardSession& session, const KeyGrid& grid, const KeyMap& map = KeyMap::standard());
  bool type(const std::string& text);
  // Digits and "." on the number pad.
  bool typeOnPad(const std::string& text);
  // One press: down then up at p; returns the up's result (the down must give -1).
  int tap(TouchPoint p);

 private:
  bool tapExpecting(TouchPoint p, const char* what);
  KeyboardSession& session_;
  KeyGrid grid_;
  KeyMap map_;
  int page_;
  bool shift_;
};

}  // namespace tessel::test
