// GL textures of the three surfaces: uploadTexture and the three texture sets.
//
// All three texture sets belong to the session: two keyboards drawn in one GL context must not
// share glyphs that follow their layouts, and a set made in one context means nothing in
// another. Every creation of a surface generates fresh names (one glGenTextures per entry of
// the upload list, before the entry's textures are filled) and overwrites its set. A set
// remembers the GL context its names were made in (eglGetCurrentContext()): when it is made
// again in that same context, its old names are deleted before the new ones are generated, so
// an app that re-creates surfaces in a context it keeps (a reshuffle after done) does not pile
// up textures. Old names made in another context, or with none current, are never deleted:
// they go with their context, and here their numbers may be someone else's. Nor are names that
// another keyboard's set made in the current context holds (a new context may get a destroyed
// one's handle back).
// The names are stored as relaxed atomics: a frame may be drawing from a set on another GL
// thread while it is replaced (never in the same context, where the deleting happens).
//
// Glyph entries are positional: element i shows the character that the session's layout holds
// at position i at upload time. The stored (masked) byte is unmasked only for the lookup of its
// glyph image and never kept.
#pragma once

#include <cstdint>

#include "render/image_table.h"
#include "session/texture_sets.h"

namespace tessel {

struct KeyboardSession;

// Binds `name` and fills it from the image: MIN_FILTER nearest, MAG_FILTER linear, both wraps
// clamp-to-edge (set with glTexParameterf, in that order), texture environment replace, then
// glTexImage2D RGBA/UNSIGNED_BYTE straight from the embedded pixels. No mipmaps: the nearest
// minifying filter never needs them. Needs a current GL context. In a compact artwork build the
// pixels come through artworkPixels (render/artwork.h): when they cannot be inflated the name is
// left without an image, untouched.
void uploadTexture(std::uint32_t name, const TextureImage& image) noexcept;

// The upload lists (GL context current; the session's layout built for the positional glyphs).
// Each keeps an ArtworkHold for its whole length.
// A layout byte that does not unmask to a character of the glyph tables leaves its texture
// name generated but empty.
void uploadMainTextures(KeyboardSession& session) noexcept;
void uploadPopTextures(KeyboardSession& session) noexcept;
void uploadPopTopTextures(KeyboardSession& session) noexcept;

}  // namespace tessel
