// Touch dispatch and content editing.
//
// Coordinates are pixels on the keyboard surface, origin top-left, hit-tested against the grid
// of input/layout.h. A touch within keyWidth/10 (keyHeight/10) of an edge is refused. Every
// division of a coordinate by a key size truncates toward zero. Presses act only on release.
#pragma once

#include <cstdint>

namespace tessel {

struct ContentStore;
struct KeyboardSession;
class PatternEngine;

// action 0 down, 1 up, 2 move; x, y pixels on the keyboard surface. -1 refused or not a
// release, 1 the done key was released, 0 any other release. A refused touch changes no
// content; a margin touch also resets all highlight flags. Releasing done with finishMode 0
// clears layoutBuilt so the next surface creation rebuilds (and reshuffles) the keys.
// The caller has checked the handle; the session's layout may be unbuilt (zeroed tables).
int touch(KeyboardSession& session, int action, float x, float y) noexcept;

// Appends ch if the whole new text matches the compiled `accepts` (a malformed pattern matches
// nothing, so nothing is appended). The text is unsealed only inside the call and resealed
// before it returns; a rejected character leaves the sealed bytes unchanged.
// The write position is `length` (the text holds no NUL that keys can produce, so this is its
// string length); nothing is written once the 4092-character capacity is reached. The caller
// applies maxLength.
void appendCharacter(ContentStore& store, std::uint8_t ch, const PatternEngine& accepts) noexcept;

// Removes the last character; nothing on empty content.
void deleteLastCharacter(ContentStore& store) noexcept;

}  // namespace tessel
