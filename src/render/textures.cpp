// Texture upload and the three texture sets. The upload lists follow one fixed
// order per surface; the glyph entries follow the session's layout.
#include "render/textures.h"

#include <EGL/egl.h>
#include <GLES/gl.h>

#include <cstddef>

#include "render/glyph_index.h"
#include "session/session.h"

namespace tessel {

namespace {

constexpr int kMaxEntry = 26;

// Starts the upload of a set in the current context: true when its old names were made in this
// same context, so that each entry deletes them before generating its new ones.
bool renewIn(GlContextTag& madeIn) noexcept {
  const void* current = eglGetCurrentContext();
  const bool same = current != EGL_NO_CONTEXT && madeIn.load() == current;
  madeIn = current;
  return same;
}

// One upload-list entry: fresh names for `count` textures, stored into `out`, then filled; the
// names `out` held before are deleted first when `dropOld`. `imageAt(i)` gives the image of
// texture i, or null to leave it empty.
template <typename ImageAt>
void uploadEntry(bool dropOld, TextureName* out, int count, ImageAt imageAt) noexcept {
  GLuint names[kMaxEntry] = {};
  if (dropOld) {
    for (int i = 0; i < count; ++i) names[i] = out[i];
    glDeleteTextures(count, names);
  }
  glGenTextures(count, names);
  for (int i = 0; i < count; ++i) out[i] = names[i];
  for (int i = 0; i < count; ++i)
    if (const TextureImage* image = imageAt(i)) uploadTexture(names[i], *image);
}

void uploadGroup(bool dropOld, TextureName* out, const ImageGroup& group) noexcept {
  uploadEntry(dropOld, out, group.count, [&](int i) { return &group[i]; });
}

void uploadPlain(bool dropOld, TextureName& out, const std::uint8_t* pixels) noexcept {
  const TextureImage image{0, images::kPlainImageSize, images::kPlainImageSize, pixels, 0};
  uploadEntry(dropOld, &out, 1, [&](int) { return &image; });
}

// The glyph image of a stored layout byte, unmasked only here; null when the character is not
// in the group (an unbuilt layout holds zero bytes).
const TextureImage* glyphFor(const ImageGroup& group, std::uint8_t stored, std::uint8_t mask) noexcept {
  const int index = glyphIndexOf(static_cast<std::uint8_t>(stored + mask));
  return (index >= 0 && index < group.count) ? &group[index] : nullptr;
}

const TextureImage* padGlyphFor(std::uint8_t stored, std::uint8_t mask) noexcept {
  const unsigned index = keypadIndexOf(static_cast<std::uint8_t>(stored + mask));
  return index < static_cast<unsigned>(images::kPadDigitGlyphs.count) ? &images::kPadDigitGlyphs[static_cast<int>(index)]
                                                                       : nullptr;
}

template <std::size_t N>
void uploadPositional(bool dropOld, TextureName* out, int count, const ImageGroup& group,
                      const RelaxedField<std::uint8_t> (&layout)[N], std::uint8_t mask) noexcept {
  uploadEntry(dropOld, out, count, [&](int i) { return glyphFor(group, layout[i], mask); });
}

}  // namespace

void uploadTexture(std::uint32_t name, const TextureImage& image) noexcept {
  glBindTexture(GL_TEXTURE_2D, name);
  glTexParameterf(GL_TEXTURE_2D, GL_TEXTURE_MIN_FILTER, static_cast<GLfloat>(GL_NEAREST));
  glTexParameterf(GL_TEXTURE_2D, GL_TEXTURE_MAG_FILTER, static_cast<GLfloat>(GL_LINEAR));
  glTexParameterf(GL_TEXTURE_2D, GL_TEXTURE_WRAP_S, static_cast<GLfloat>(GL_CLAMP_TO_EDGE));
  glTexParameterf(GL_TEXTURE_2D, GL_TEXTURE_WRAP_T, static_cast<GLfloat>(GL_CLAMP_TO_EDGE));
  glTexEnvf(GL_TEXTURE_ENV, GL_TEXTURE_ENV_MODE, static_cast<GLfloat>(GL_REPLACE));
  glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, image.width, image.height, 0, GL_RGBA, GL_UNSIGNED_BYTE, image.pixels);
}

void uploadMainTextures(KeyboardSession& s) noexcept {
  MainTextureSet& t = s.mainTextures;
  const bool renew = renewIn(t.madeIn);
  const std::uint8_t mask = s.keyMask;
  uploadPlain(renew, t.backgroundTexture, images::kBackgroundPixels);
  uploadGroup(renew, t.charKeyTextures, images::kCharKeys);
  uploadPositional(renew, t.letterTextures, 26, images::kLetterGlyphs, s.letters, mask);
  uploadPositional(renew, t.letterShiftTextures, 26, images::kShiftedLetterGlyphs, s.letters, mask);
  uploadPositional(renew, t.symbolTextures, 26, images::kSymbolGlyphs, s.symbolsLower, mask);
  uploadPositional(renew, t.symbolShiftTextures, 26, images::kSymbolShiftGlyphs, s.symbolsUpper, mask);
  uploadGroup(renew, t.spaceKeyTextures, images::kSpaceKeys);
  uploadGroup(renew, &t.spaceLabelTexture, images::kSpaceLabel);
  uploadGroup(renew, t.shiftDeleteKeyTextures, images::kShiftDeleteKeys);
  uploadGroup(renew, t.switchKeyTextures, images::kSwitchKeys);
  uploadGroup(renew, t.doneKeyTextures, images::kDoneKeys);
  uploadGroup(renew, t.iconTextures, images::kIcons);
  uploadGroup(renew, t.labelTextures, images::kLabels);
  uploadGroup(renew, t.padKeyTextures, images::kPadKeys);
  uploadGroup(renew, t.padDoneKeyTextures, images::kPadDoneKeys);
  uploadGroup(renew, t.padLabelTextures, images::kPadLabels);
  uploadGroup(renew, &t.padDoneIconTexture, images::kPadDoneIcon);
  uploadEntry(renew, t.padDigitTextures, 10, [&](int i) { return padGlyphFor(s.padDigits[i], mask); });
}

void uploadPopTextures(KeyboardSession& s) noexcept {
  PopTextureSet& t = s.popTextures;
  const bool renew = renewIn(t.madeIn);
  uploadPlain(renew, t.background, images::kBackgroundPixels);
  uploadPlain(renew, t.frame, images::kFieldFramePixels);
  uploadPlain(renew, t.dot, images::kMaskDotPixels);
  uploadGroup(renew, &t.cursor, images::kCursor);
  uploadEntry(renew, &t.balloon, 1, [](int) { return &images::kCharKeys[2]; });
}

void uploadPopTopTextures(KeyboardSession& s) noexcept {
  PopTopTextureSet& t = s.popTopTextures;
  const bool renew = renewIn(t.madeIn);
  const std::uint8_t mask = s.keyMask;
  uploadPositional(renew, t.letters, 10, images::kLetterGlyphs, s.letters, mask);
  uploadPositional(renew, t.shiftedLetters, 10, images::kShiftedLetterGlyphs, s.letters, mask);
  uploadPositional(renew, t.symbols, 10, images::kSymbolGlyphs, s.symbolsLower, mask);
}

}  // namespace tessel
