// Touch dispatch and content editing.
#pragma once

#include <cstdint>

namespace tessel {

struct ContentStore;
struct KeyboardSession;

// action 0 down, 1 up, 2 move; x, y pixels on the keyboard surface. -1 refused or not a
// release, 1 the done key was released, 0 any other release.
int touch(KeyboardSession& session, int action, float x, float y) noexcept;

void appendCharacter(ContentStore& store, std::uint8_t ch, const char* pattern) noexcept;
void deleteLastCharacter(ContentStore& store) noexcept;

}  // namespace tessel
