// Touch dispatch.
//
// Coordinates are pixels on the keyboard surface, origin top-left, hit-tested against the grid
// of input/layout.h. A touch within keyWidth/10 (keyHeight/10) of an edge is refused. Every
// division of a coordinate by a key size truncates toward zero. Presses act only on release.
#pragma once

#include <cstdint>

namespace tessel {

struct KeyboardSession;

// action 0 down, 1 up, 2 move; x, y pixels on the keyboard surface. -1 refused or not a
// release, 1 the done key was released, 0 any other release. A refused touch changes no
// content; a margin touch also resets all highlight flags. Releasing done with finishMode 0
// clears layoutBuilt so the next surface creation rebuilds (and reshuffles) the keys.
// The caller has checked the handle; the session's layout may be unbuilt (zeroed tables).
int touch(KeyboardSession& session, int action, float x, float y) noexcept;

}  // namespace tessel
