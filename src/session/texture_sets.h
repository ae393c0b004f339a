// The GL texture names a keyboard keeps for its three surfaces: plain data the session owns
// and the renderer fills (render/textures.h has the upload lists and the rules for renewing
// them). A set remembers the GL context its names were made in.
//
// The names are stored as relaxed atomics: a frame may be drawing from a set on another GL
// thread while it is replaced.
#pragma once

#include <cstdint>

#include "session/relaxed_field.h"

namespace tessel {

using TextureName = RelaxedField<std::uint32_t>;
using GlContextTag = RelaxedField<const void*>;  // an EGLContext; null before the first upload

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
  GlContextTag madeIn;
};

struct PopTextureSet {
  TextureName background;
  TextureName frame;
  TextureName dot;
  TextureName cursor;
  TextureName balloon;
  GlContextTag madeIn;
};

struct PopTopTextureSet {
  TextureName letters[10];        // top-row positions 0..9, lower case
  TextureName shiftedLetters[10];
  TextureName symbols[10];        // first symbol page
  GlContextTag madeIn;
};

// Calls f(names, count) for each entry of a set's upload list, in upload order.
template <typename F>
void forEachEntry(const MainTextureSet& t, F f) {
  f(&t.backgroundTexture, 1);
  f(t.charKeyTextures, 3);
  f(t.letterTextures, 26);
  f(t.letterShiftTextures, 26);
  f(t.symbolTextures, 26);
  f(t.symbolShiftTextures, 26);
  f(t.spaceKeyTextures, 2);
  f(&t.spaceLabelTexture, 1);
  f(t.shiftDeleteKeyTextures, 2);
  f(t.switchKeyTextures, 2);
  f(t.doneKeyTextures, 2);
  f(t.iconTextures, 4);
  f(t.labelTextures, 5);
  f(t.padKeyTextures, 2);
  f(t.padDoneKeyTextures, 2);
  f(t.padLabelTextures, 4);
  f(&t.padDoneIconTexture, 1);
  f(t.padDigitTextures, 10);
}
template <typename F>
void forEachEntry(const PopTextureSet& t, F f) {
  f(&t.background, 1);
  f(&t.frame, 1);
  f(&t.dot, 1);
  f(&t.cursor, 1);
  f(&t.balloon, 1);
}
template <typename F>
void forEachEntry(const PopTopTextureSet& t, F f) {
  f(t.letters, 10);
  f(t.shiftedLetters, 10);
  f(t.symbols, 10);
}

}  // namespace tessel
