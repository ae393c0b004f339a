// Key layouts (letters, two symbol pages, number pad), shuffling, masking and geometry.
#pragma once

namespace tessel {

struct KeyboardSession;

// Builds the layout unless layoutBuilt is 1. The caller holds session.lock.
void buildLayout(KeyboardSession& session) noexcept;

// Geometry of a surface change (width, height >= 1, checked by the caller); no GL call.
void applySurfaceGeometry(KeyboardSession& session, int width, int height, int variant) noexcept;

}  // namespace tessel
