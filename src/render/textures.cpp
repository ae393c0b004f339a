// Texture upload and the three texture sets. The upload lists follow one fixed
// order per surface; the glyph entries follow the session's layout.
#include "render/textures.h"

#include <EGL/egl.h>
#include <GLES/gl.h>

#include <algorithm>
#include <cstddef>

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

// Starts the upload of `set` in the current context. When its old names were made in this same
// context, returns the names that each entry must keep while it deletes the old ones before
// generating new ones; null when nothing is to be deleted.
template <typename Set>
const HeldNames* renew(Set& set, HeldNames& held) noexcept {
  const void* current = eglGetCurrentContext();
  const bool same = current != EGL_NO_CONTEXT && set.madeIn.load() == current;
  set.madeIn = current;
  if (!same) return nullptr;
  for (int handle = 0; handle < kSessionSlots; ++handle) {
    const SessionRef other(handle);
    if (!other) continue;
    addHeld(other->mainTextures, &set, current, held);
    addHeld(other->popTextures, &set, current, held);
    addHeld(other->popTopTextures, &set, current, held);
  }
  std::sort(held.names, held.names + held.count);
  return held.complete ? &held : nullptr;
}

// One upload-list entry: fresh names for `count` textures, stored into `out`, then filled. With
// `keep`, the names `out` held before are deleted first, except those that `keep` holds.
// `imageAt(i)` gives the image of texture i, or null to leave it empty.
template <typename ImageAt>
void uploadEntry(const HeldNames* keep, TextureName* out, int count, ImageAt imageAt) noexcept {
  GLuint names[kMaxEntry] = {};
  if (keep != nullptr) {
    int old = 0;
    for (int i = 0; i < count; ++i)
      if (!keep->holds(out[i])) names[old++] = out[i];
    glDeleteTextures(old, names);
  }
  glGenTextures(count, names);
  for (int i = 0; i < count; ++i) out[i] = names[i];
  for (int i = 0; i < count; ++i)
    if (const TextureImage* image = imageAt(i)) uploadTexture(names[i], *image);
}

void uploadGroup(const HeldNames* keep, TextureName* out, const ImageGroup& group) noexcept {
  uploadEntry(keep, out, group.count, [&](int i) { return &group[i]; });
}

void uploadPlain(const HeldNames* keep, TextureName& out, const std::uint8_t* pixels) noexcept {
  const TextureImage image{0, images::kPlainImageSize, images::kPlainImageSize, pixels, 0};
  uploadEntry(keep, &out, 1, [&](int) { return &image; });
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
void uploadPositional(const HeldNames* keep, TextureName* out, int count, const ImageGroup& group,
                      const RelaxedField<std::uint8_t> (&layout)[N], std::uint8_t mask) noexcept {
  uploadEntry(keep, out, count, [&](int i) { return glyphFor(group, layout[i], mask); });
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
  HeldNames held;
  const HeldNames* keep = renew(t, held);
  const std::uint8_t mask = s.keyMask;
  uploadPlain(keep, t.backgroundTexture, images::kBackgroundPixels);
  uploadGroup(keep, t.charKeyTextures, images::kCharKeys);
  uploadPositional(keep, t.letterTextures, 26, images::kLetterGlyphs, s.letters, mask);
  uploadPositional(keep, t.letterShiftTextures, 26, images::kShiftedLetterGlyphs, s.letters, mask);
  uploadPositional(keep, t.symbolTextures, 26, images::kSymbolGlyphs, s.symbolsLower, mask);
  uploadPositional(keep, t.symbolShiftTextures, 26, images::kSymbolShiftGlyphs, s.symbolsUpper, mask);
  uploadGroup(keep, t.spaceKeyTextures, images::kSpaceKeys);
  uploadGroup(keep, &t.spaceLabelTexture, images::kSpaceLabel);
  uploadGroup(keep, t.shiftDeleteKeyTextures, images::kShiftDeleteKeys);
  uploadGroup(keep, t.switchKeyTextures, images::kSwitchKeys);
  uploadGroup(keep, t.doneKeyTextures, images::kDoneKeys);
  uploadGroup(keep, t.iconTextures, images::kIcons);
  uploadGroup(keep, t.labelTextures, images::kLabels);
  uploadGroup(keep, t.padKeyTextures, images::kPadKeys);
  uploadGroup(keep, t.padDoneKeyTextures, images::kPadDoneKeys);
  uploadGroup(keep, t.padLabelTextures, images::kPadLabels);
  uploadGroup(keep, &t.padDoneIconTexture, images::kPadDoneIcon);
  uploadEntry(keep, t.padDigitTextures, 10, [&](int i) { return padGlyphFor(s.padDigits[i], mask); });
}

void uploadPopTextures(KeyboardSession& s) noexcept {
  PopTextureSet& t = s.popTextures;
  HeldNames held;
  const HeldNames* keep = renew(t, held);
  uploadPlain(keep, t.background, images::kBackgroundPixels);
  uploadPlain(keep, t.frame, images::kFieldFramePixels);
  uploadPlain(keep, t.dot, images::kMaskDotPixels);
  uploadGroup(keep, &t.cursor, images::kCursor);
  uploadEntry(keep, &t.balloon, 1, [](int) { return &images::kCharKeys[2]; });
}

void uploadPopTopTextures(KeyboardSession& s) noexcept {
  PopTopTextureSet& t = s.popTopTextures;
  HeldNames held;
  const HeldNames* keep = renew(t, held);
  const std::uint8_t mask = s.keyMask;
  uploadPositional(keep, t.letters, 10, images::kLetterGlyphs, s.letters, mask);
  uploadPositional(keep, t.shiftedLetters, 10, images::kShiftedLetterGlyphs, s.letters, mask);
  uploadPositional(keep, t.symbols, 10, images::kSymbolGlyphs, s.symbolsLower, mask);
}

}  // namespace tessel
