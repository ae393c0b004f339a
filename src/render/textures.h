// GL textures of the three surfaces: uploadTexture and the three texture sets.
//
// The keyboard's and the top pop-up's texture sets belong to the session (their glyph entries
// follow its layout, so two keyboards drawn in one GL context must not share them); the field
// pop-up's set, which depends on no layout, is one for the whole process. Every creation of a
// surface generates fresh names (one glGenTextures per entry of the upload list, before the
// entry's textures are filled) and overwrites its set; old names are never deleted, they go
// with the GL context that the app recreates. The names are stored as relaxed atomics: a frame
// may be drawing from a set on another GL thread while it is replaced.
//
// Glyph entries are positional: element i shows the character that the session's layout holds
// at position i at upload time. The stored (masked) byte is unmasked only for the lookup of its
// glyph image and never kept.
#pragma once

#include <cstdint>

#include "render/image_table.h"
#include "session/relaxed_field.h"

namespace tessel {

struct KeyboardSession;

using TextureName = RelaxedField<std::uint32_t>;

struct MainTextureSet {
  TextureName backgroundTexture;
  TextureName charKeyTextures[3];        // face, held face, balloon
  TextureName letterTextures[26];        // by layout position
  TextureName letterShiftTextures[26];
  TextureName symbolTextures[26];
  TextureName symbolShiftTextures[26];
  TextureName spaceKeyTextures[2];
  TextureName spaceLabelTexture;
  TextureName shiftDeleteKeyTextures[2];
  TextureName switchKeyTextures[2];
  TextureName doneKeyTextures[2];
  TextureName iconTextures[4];
  TextureName labelTextures[5];
  TextureName padKeyTextures[2];
  TextureName padDoneKeyTextures[2];
  TextureName padLabelTextures[4];
  TextureName padDoneIconTexture;
  TextureName padDigitTextures[10];      // by pad position
};

struct PopTextureSet {
  TextureName background;
  TextureName frame;
  TextureName dot;
  TextureName cursor;
  TextureName balloon;
};

struct PopTopTextureSet {
  TextureName letters[10];        // top-row positions 0..9, lower case
  TextureName shiftedLetters[10];
  TextureName symbols[10];        // first symbol page
};

PopTextureSet& popTextures() noexcept;

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
void uploadPopTextures() noexcept;
void uploadPopTopTextures(KeyboardSession& session) noexcept;

}  // namespace tessel
