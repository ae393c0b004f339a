// A test-side typist: turns characters into touch coordinates and drives touch() with them.
//
// Key centres come from the surface size alone (a 10 x 4 grid, the number pad's four columns
// of 2.5 key widths), never from the library's dispatch code, so a hit-testing fault shows up
// as a wrong character. Which key holds which character comes either from the standard
// (unshuffled) layout written out here, or from the session's key tables unmasked with its
// keyMask (for shuffled layouts).
#pragma once

#include <array>
#include <cstdint>
#include <optional>
#include <string>

namespace tessel {
struct KeyboardSession;
}

namespace tessel::test {

struct TouchPoint {
  float x = 0;
  float y = 0;
};

// A live session for touch tests: created under `name`, layout built (shuffled or not), the
// surface geometry applied, the accepts pattern and maxLength set. Destroyed on scope exit.
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
  // Character key `position` (0-based within the row) of full-keyboard row 0, 1 or 2.
  TouchPoint characterKey(int row, int position) const;
  TouchPoint shiftKey() const { return at(0.75, 2); }
  TouchPoint deleteKey() const { return at(9.25, 2); }
  TouchPoint switchKey() const { return at(1.25, 3); }
  TouchPoint spaceKey() const { return at(5.0, 3); }
  // Number-pad cell (row 0..3, column 0..3), each column 2.5 key widths wide.
  TouchPoint padCell(int row, int column) const;

 private:
  TouchPoint at(double keysFromLeft, int row) const;
  double kw_;
  double kh_;
};

// Where a character sits: the page (0 letters, 1 symbols), whether shift must be on, and the
// key's row and position within the row.
struct KeyPlace {
  int page = 0;
  bool shift = false;
  int row = 0;
  int position = 0;
};

// Character tables of one layout, unmasked: 26 letters, the two symbol pages, the pad digits.
struct KeyMap {
  std::array<char, 26> letters{};
  std::array<char, 26> symbolsLower{};
  std::array<char, 26> symbolsUpper{};
  std::array<char, 10> padDigits{};

  static KeyMap standard();                              // the unshuffled layout
  static KeyMap fromSession(const KeyboardSession& s);   // tables minus keyMask undone
  // The key for c, preferring the current shift state when c is on both symbol pages.
  std::optional<KeyPlace> find(char c, bool shiftNow) const;
  // Pad cell (row, column) holding the digit c, or "." at (3, 1).
  std::optional<std::pair<int, int>> findOnPad(char c) const;
};

// Types text through touch(): for each character it presses switch and shift as needed (keeping
// its own idea of the page and shift state, started from the session's), then the key. Every
// down must return -1 and every up 0; the first surprise is reported through ADD_FAILURE and
// typing stops (false).
class Typist {
 public:
  Typist(KeyboardSession& session, const KeyGrid& grid, const KeyMap& map);
  bool type(const std::string& text);
  bool typeOnPad(const std::string& text);
  // One press: down then up at p; returns the up's result (the down must give -1).
  int tap(TouchPoint p);

 private:
  bool tapExpecting(TouchPoint p, int expected, const char* what);
  KeyboardSession& session_;
  KeyGrid grid_;
  KeyMap map_;
  int page_;
  bool shift_;
};

}  // namespace tessel::test
