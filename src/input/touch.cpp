// Touch dispatch: hit-testing against the key grid.
//
// Exposes touch (input/touch.h). Private: the two keyboard dispatchers and the
// coordinate-to-cell conversion. Presses act only on release; a down or move just sets the
// highlight flags that the renderer reads. A character or delete key is handed to the
// session's text operations (session/sealed_text.h), which alone open the seal.
#include "input/touch.h"

#include <cstddef>
#include <cstdint>

#include "session/sealed_text.h"
#include "session/session.h"

namespace tessel {

namespace {

// Highlight flags by key.
constexpr std::size_t kFlagDone = 2;
constexpr std::size_t kFlagCharacter = 3;
constexpr std::size_t kFlagShift = 4;
constexpr std::size_t kFlagDelete = 5;

constexpr std::uint32_t kNoCell = 0xFFFFFFFFu;

// A coordinate divided by a key size, truncated toward zero as a C cast does (-0.5 is cell 0).
// Values no 32-bit cell can hold, and NaN, become kNoCell, which no key matches.
std::uint32_t cellOf(double quotient) noexcept {
  if (!(quotient > -2147483648.0 && quotient < 2147483648.0)) return kNoCell;
  return static_cast<std::uint32_t>(static_cast<std::int32_t>(quotient));
}

void releaseAllHighlights(KeyboardSession& s) noexcept {
  for (auto& flag : s.keyReleased) flag = 1;
}

std::uint32_t toggled(std::uint32_t v) noexcept { return v == 0 ? 1 : 0; }

// Appends ch with the session's accepts pattern when the length is below maxLength (read as a
// signed 16-bit value, as the length limit always has been).
void appendKey(KeyboardSession& s, std::uint8_t ch) noexcept {
  const auto length = static_cast<std::int16_t>(s.content->length.load());
  if (length >= s.maxLength) return;
  if (s.acceptsEngine != nullptr) appendCharacter(*s.content, ch, *s.acceptsEngine);  // else no pattern
}

// A character key of the full keyboard; `index` into the 26-key tables, or out of range when
// the touch fell on a cell of the row that holds no key.
void characterKey(KeyboardSession& s, bool released, std::uint32_t index, bool inRow) noexcept {
  s.keyReleased[kFlagCharacter] = released;
  if (released && inRow && index < kKeyCount) {
    std::uint8_t stored;
    if (s.symbolPage == 0) {
      stored = s.letters[index];
      if (s.shiftOn != 0) stored = static_cast<std::uint8_t>(stored - 32);
    } else {
      stored = s.shiftOn != 0 ? s.symbolsUpper[index] : s.symbolsLower[index];
    }
    appendKey(s, static_cast<std::uint8_t>(stored + s.keyMask));
  }
  s.anyKeyReleased = released;
}

// Full keyboard. True when the done key was released.
bool dispatchFullKeyboard(KeyboardSession& s, bool released, float x, float y) noexcept {
  const float kw = s.keyWidth;
  const float kh = s.keyHeight;
  const double kwd = kw;
  const double xd = x;
  const std::uint32_t row = cellOf(y / kh);
  s.touchRow = row;
  switch (row) {
    case 0: {
      const std::uint32_t column = cellOf(x / kw);
      s.touchColumn = column;
      characterKey(s, released, column, column < 10);
      return false;
    }
    case 1: {
      // Nine keys shifted right by 0.3 key widths; the dead zones are deliberately uneven.
      if (xd <= 0.3 * kwd || xd >= static_cast<double>(s.surfaceWidth) - 0.7 * kwd) {
        s.keyReleased[kFlagCharacter] = 1;
        return false;
      }
      const std::uint32_t column = cellOf((xd - 0.3 * kwd) / kwd);
      s.touchColumn = column;
      characterKey(s, released, column + 10, column < 9);
      return false;
    }
    case 2: {
      if (xd < 1.5 * kwd) {
        s.touchColumn = 0;
        s.keyReleased[kFlagShift] = released;
        if (released) s.shiftOn = toggled(s.shiftOn);
        s.anyKeyReleased = released;
        return false;
      }
      if (xd > 8.5 * kwd) {
        s.touchColumn = 8;
        s.keyReleased[kFlagDelete] = released;
        if (released) deleteLastCharacter(*s.content);
        s.anyKeyReleased = released;
        return false;
      }
      // x = 8.5 key widths exactly lands on column 8, which holds no character.
      const std::uint32_t column = cellOf((xd - 0.5 * kwd) / kwd);
      s.touchColumn = column;
      characterKey(s, released, column + 18, column >= 1 && column <= 7);
      return false;
    }
    case 3: {
      std::uint32_t column;
      if (xd < 2.5 * kwd) {
        column = 0;  // switch
        if (released) {
          if (s.switchMode != 1) {
            s.symbolPage = toggled(s.symbolPage);
          } else {
            s.currentKbdType = 2;
          }
        }
      } else if (xd < 7.5 * kwd) {
        column = 1;  // space
        if (released) appendKey(s, ' ');
      } else {
        column = 2;  // done
      }
      s.touchColumn = column;
      s.keyReleased[column] = released;
      s.anyKeyReleased = released;
      return released && column == 2;
    }
    default:
      return false;
  }
}

// Number pad: four columns of 2.5 key widths by four rows. True when done was released.
bool dispatchNumberPad(KeyboardSession& s, bool released, float x, float y) noexcept {
  s.keyReleased[kFlagCharacter] = released;
  const std::uint32_t type = s.currentKbdType;
  std::uint32_t row = cellOf(y / s.keyHeight);
  const std::uint32_t column = cellOf(static_cast<double>(x) / (2.5 * static_cast<double>(s.keyWidth)));
  s.touchColumn = column;
  if ((row == 2 || row == 3) && column == 3) {
    s.keyReleased[kFlagDone] = released;
    row = 2;  // one tall done key
  } else if (row == 3 && (column == 1 || column == 2) && type == 2) {
    s.keyReleased[kFlagCharacter] = 1;  // no "." and no done on the digits-only pad
  }
  s.touchRow = row;
  if (!released || row > 3 || column > 3) return false;

  if (column == 3) {
    if (row == 0) {
      deleteLastCharacter(*s.content);
    } else if (row == 1) {
      if (s.switchMode != 1) {
        clearContent(*s.content);
      } else {
        s.currentKbdType = 0;
      }
    }
    return row == 2;
  }
  if (row == 3 && column == 2) return type == 1;
  if (row == 3 && column == 1) {
    if (type == 1) appendKey(s, '.');
    return false;
  }
  appendKey(s, static_cast<std::uint8_t>(s.padDigits[row * 3 + column] + s.keyMask));
  return false;
}

}  // namespace

int touch(KeyboardSession& session, int action, float x, float y) noexcept {
  const float mx = session.keyWidth / 10;
  const float my = session.keyHeight / 10;
  // Written as "inside" so that a NaN coordinate is refused too.
  const bool inside = x >= mx && x <= static_cast<float>(session.surfaceWidth) - mx && y >= my &&
                      y <= static_cast<float>(session.surfaceHeight) - my;
  if (!inside) {
    releaseAllHighlights(session);
    return -1;
  }
  if (action < 0 || action > 2) return -1;
  if (action == 2) releaseAllHighlights(session);  // a move cancels every highlight
  const bool released = action == 1;
  const bool done = session.currentKbdType != 0 ? dispatchNumberPad(session, released, x, y)
                                                : dispatchFullKeyboard(session, released, x, y);
  if (!released) return -1;
  if (!done) return 0;
  if (session.finishMode == 0) session.layoutBuilt = 0;
  return 1;
}

}  // namespace tessel
