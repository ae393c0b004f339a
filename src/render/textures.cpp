// Texture upload and the three texture sets. The upload lists follow one fixed
// order per surface; the glyph entries follow the session's layout.
#include "render/textures.h"

#include <EGL/egl.h>
#include <GLES/gl.h>

#include <algorithm>
#include <cstddef>

#include "render/artwork.h"
#include "render/glyph_index.h"
#include "session/session.h"

namespace tessel {

namespace {

constexpr int kMaxEntry = 26;
constexpr std::size_t kNamesPerKeyboard = 164 + 5 + 30;  // the three upload lists

// The names that the other sets of every live keyboard made in one context hold, sorted. An app
// that destroys a context and makes a new one may get the old EGLContext handle back; there a
// set's old numbers can already be another set's textures, and those are never deleted.
struct HeldNames {
  GLuint names[kSessionSlots * kNamesPerKeyboard];
  std::size_t count = 0;
  bool complete = true;
  bool holds(GLuint name) const noexcept { return std::binary_search(names, names + count, name); }
};

template <typename Set>
void addHeld(const Set& set, const void* self, const void* context, HeldNames& held) noexcept {
  if (static_cast<const void*>(&set) == self || set.madeIn.load() != context) return;
  forEachEntry(set, [&](const TextureName* names, int n) {
    for (int i = 0; i < n; ++i) {
      if (held.count == sizeof held.names / sizeof held.names[0]) {
        held.complete = false;
        return;
      }
      held.names[held.count++] = names[i];
    }
  });
}

// Starts the upload of `set` in the current context: when its old names were made in this same
// context, deletes them (all at once, before any new name is generated), except those that
// another live set holds here.
template <typename Set>
void renew(Set& set) noexcept {
  const void* current = eglGetCurrentContext();
  const bool same = current != EGL_NO_CONTEXT && set.madeIn.load() == current;
  set.madeIn = current;
  if (!same) return;
  HeldNames held;
  for (int handle = 0; handle < kSessionSlots; ++handle) {
    const SessionRef other(handle);
    if (!other) continue;
    addHeld(other->mainTextures, &set, current, held);
    addHeld(other->popTextures, &set, current, held);
    addHeld(other->popTopTextures, &set, current, held);
  }
  if (!held.complete) return;
  std::sort(held.names, held.names + held.count);
  GLuint old[kNamesPerKeyboard];
  GLsizei n = 0;
  forEachEntry(set, [&](const TextureName* names, int count) {
    for (int i = 0; i < count; ++i)
      if (static_cast<std::size_t>(n) < kNamesPerKeyboard && !held.holds(names[i])) old[n++] = names[i];
  });
  glDeleteTextures(n, old);
}

// One upload-list entry: fresh names for `count` textures, stored into `out`, then filled.
// `imageAt(i)` gives the image of texture i, or null to leave it empty.
template <typename ImageAt>
void uploadEntry(TextureName* out, int count, ImageAt imageAt) noexcept {
  GLuint names[kMaxEntry] = {};
  glGenTextures(count, names);
  for (int i = 0; i < count; ++i) out[i] = names[i];
  for (int i = 0; i < count; ++i)
    if (const TextureImage* image = imageAt(i)) uploadTexture(names[i], *image);
}

void uploadGroup(TextureName* out, const ImageGroup& group) noexcept {
  uploadEntry(out, group.count, [&](int i) { return &group[i]; });
}

void uploadPlain(TextureName& out, const std::uint8_t* pixels) noexcept {
  const TextureImage image{0, images::kPlainImageSize, images::kPlainImageSize, pixels, 0};
  uploadEntry(&out, 1, [&](int) { return &image; });
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
void uploadPositional(TextureName* out, int count, const ImageGroup& group,
                      const RelaxedField<std::uint8_t> (&layout)[N], std::uint8_t mask) noexcept {
  uploadEntry(out, count, [&](int i) { return glyphFor(group, layout[i], mask); });
}

}  // namespace

void uploadTexture(std::uint32_t name, const TextureImage& image) noexcept {
  const std::uint8_t* pixels = artworkPixels(image);
  if (pixels == nullptr) return;
  glBindTexture(GL_TEXTURE_2D, name);
  glTexParameterf(GL_TEXTURE_2D, GL_TEXTURE_MIN_FILTER, static_cast<GLfloat>(GL_NEAREST));
  glTexParameterf(GL_TEXTURE_2D, GL_TEXTURE_MAG_FILTER, static_cast<GLfloat>(GL_LINEAR));
  glTexParameterf(GL_TEXTURE_2D, GL_TEXTURE_WRAP_S, static_cast<GLfloat>(GL_CLAMP_TO_EDGE));
  glTexParameterf(GL_TEXTURE_2D, GL_TEXTURE_WRAP_T, static_cast<GLfloat>(GL_CLAMP_TO_EDGE));
  glTexEnvf(GL_TEXTURE_ENV, GL_TEXTURE_ENV_MODE, static_cast<GLfloat>(GL_REPLACE));
  glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, image.width, image.height, 0, GL_RGBA, GL_UNSIGNED_BYTE, pixels);
}

void uploadMainTextures(KeyboardSession& s) noexcept {
  const ArtworkHold hold;
  MainTextureSet& t = s.mainTextures;
  renew(t);
  const std::uint8_t mask = s.keyMask;
  uploadPlain(t.backgroundTexture, images::kBackgroundPixels);
  uploadGroup(t.charKeyTextures, images::kCharKeys);
  uploadPositional(t.letterTextures, 26, images::kLetterGlyphs, s.letters, mask);
  uploadPositional(t.letterShiftTextures, 26, images::kShiftedLetterGlyphs, s.letters, mask);
  uploadPositional(t.symbolTextures, 26, images::kSymbolGlyphs, s.symbolsLower, mask);
  uploadPositional(t.symbolShiftTextures, 26, images::kSymbolShiftGlyphs, s.symbolsUpper, mask);
  uploadGroup(t.spaceKeyTextures, images::kSpaceKeys);
  uploadGroup(&t.spaceLabelTexture, images::kSpaceLabel);
  uploadGroup(t.shiftDeleteKeyTextures, images::kShiftDeleteKeys);
  uploadGroup(t.switchKeyTextures, images::kSwitchKeys);
  uploadGroup(t.doneKeyTextures, images::kDoneKeys);
  uploadGroup(t.iconTextures, images::kIcons);
  uploadGroup(t.labelTextures, images::kLabels);
  uploadGroup(t.padKeyTextures, images::kPadKeys);
  uploadGroup(t.padDoneKeyTextures, images::kPadDoneKeys);
  uploadGroup(t.padLabelTextures, images::kPadLabels);
  uploadGroup(&t.padDoneIconTexture, images::kPadDoneIcon);
  uploadEntry(t.padDigitTextures, 10, [&](int i) { return padGlyphFor(s.padDigits[i], mask); });
}

void uploadPopTextures(KeyboardSession& s) noexcept {
  const ArtworkHold hold;
  PopTextureSet& t = s.popTextures;
  renew(t);
  uploadPlain(t.background, images::kBackgroundPixels);
  uploadPlain(t.frame, images::kFieldFramePixels);
  uploadPlain(t.dot, images::kMaskDotPixels);
  uploadGroup(&t.cursor, images::kCursor);
  uploadEntry(&t.balloon, 1, [](int) { return &images::kCharKeys[2]; });
}

void uploadPopTopTextures(KeyboardSession& s) noexcept {
  const ArtworkHold hold;
  PopTopTextureSet& t = s.popTopTextures;
  renew(t);
  const std::uint8_t mask = s.keyMask;
  uploadPositional(t.letters, 10, images::kLetterGlyphs, s.letters, mask);
  uploadPositional(t.shiftedLetters, 10, images::kShiftedLetterGlyphs, s.letters, mask);
  uploadPositional(t.symbols, 10, images::kSymbolGlyphs, s.symbolsLower, mask);
}

}  // namespace tessel
