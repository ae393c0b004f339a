// The keyboard surface: created (layout build + GL state + uploads, under the session lock),
// changed (grid geometry + viewport) and one frame of textured quads.
//
// Grid units: every chain starts by scaling to the key grid, after which a key cell is 2 x 2
// units. Letter keyboard: S(columnFraction, rowFraction), the surface spanning x -10..10 and
// y -4..4; layout position i sits at x = 2i - 9 (row 0, y 3), 2(i - 10) - 8 (row 1, y 1),
// 2(i - 19) - 6 (row 2, y -1). Number pad: S(0.953125, 0.92611) S(2.5 columnFraction,
// rowFraction), four columns at x -3, -1, 1, 3 and four rows at y 3, 1, -1, -3.
//
// The aspect correction A keeps glyphs and icons undistorted: S(1 / keyAspect, 2) in surface
// mode 1, S(1, 2 keyAspect) otherwise. The frame reads session fields without a lock and may
// mix old and new values of a concurrent touch; indexes taken from them are range-checked.
#include "render/surfaces.h"

#include <mutex>

#include "input/layout.h"
#include "render/gl_draw.h"
#include "render/textures.h"
#include "session/session.h"

namespace tessel {

using render::S;
using render::T;

namespace {

// Pad glyph x factors and the mode-0 pad label factor, fixed to the bit.
float padAspectX(bool mode1) { return render::floatFromBits(mode1 ? 0x3F2AAAABu : 0x3E666667u); }  // 2/3, 0.225
float padSwitchLabelX(bool mode1) { return render::floatFromBits(mode1 ? 0x3FAAAAABu : 0x3EE66667u); }  // 4/3, 0.45

struct Frame {
  const KeyboardSession& s;
  const MainTextureSet& t;
  bool mode1;         // surfaceMode == 1
  float columnFraction, rowFraction, keyAspect;

  void letterStart() const { S(columnFraction, rowFraction); }
  void padStart() const {
    S(0.953125f, 0.92611f);
    S(2.5f * columnFraction, rowFraction);
  }
  void aspect() const { render::aspect(mode1, keyAspect); }
  void padAspect(float y) const { S(padAspectX(mode1), y); }
  // Switch and done labels: wide aspect factors.
  void labelAspect() const {
    if (mode1)
      S(2.0f / keyAspect, 1.0f);
    else
      S(2.0f, keyAspect);
  }
};

GLuint name(const TextureName& n) { return n.load(); }

// Centre of layout position i (0..25) on the letter keyboard.
void keyCentre(int i, float& x, float& y) {
  if (i <= 9) {
    x = static_cast<float>(2 * i - 9);
    y = 3.0f;
  } else if (i <= 18) {
    x = static_cast<float>(2 * (i - 10) - 8);
    y = 1.0f;
  } else {
    x = static_cast<float>(2 * (i - 19) - 6);
    y = -1.0f;
  }
}

// The glyph array the letter keyboard shows: letters by shift, or a symbol page by shift.
const TextureName* currentGlyphs(const KeyboardSession& s, const MainTextureSet& t) {
  const bool shift = s.shiftOn != 0;
  if (s.symbolPage != 0) return shift ? t.symbolShiftTextures : t.symbolTextures;
  return shift ? t.letterShiftTextures : t.letterTextures;
}

void drawLetterKeyboard(const Frame& f) {
  const KeyboardSession& s = f.s;
  const MainTextureSet& t = f.t;
  std::uint32_t released[kHighlightFlags];
  for (std::size_t k = 0; k < kHighlightFlags; ++k) released[k] = s.keyReleased[k];
  const bool symbols = s.symbolPage != 0;

  // 1. Function key faces.
  render::beginBlend();
  f.letterStart();
  T(-8.5f, -1.0f);
  S(1.5f, 1.0f);
  S(0.753f, 0.884f);
  T(-0.185f, 0.0f);
  render::drawQuad(name(t.shiftDeleteKeyTextures[released[4] == 1 ? 0 : 1]), render::kShiftSet);
  f.letterStart();
  T(8.5f, -1.0f);
  S(1.5f, 1.0f);
  S(0.753f, 0.884f);
  T(0.185f, 0.0f);
  render::drawQuad(name(t.shiftDeleteKeyTextures[released[5] == 1 ? 0 : 1]), render::kShiftSet);
  f.letterStart();
  T(-7.5f, -3.0f);
  S(2.5f, 1.0f);
  S(0.9f, 0.9f);
  render::drawQuad(name(t.switchKeyTextures[released[0] == 1 ? 0 : 1]), render::kBarSet);
  f.letterStart();
  T(7.5f, -3.0f);
  S(2.5f, 1.0f);
  S(0.926f, 0.884f);
  render::drawQuad(name(t.doneKeyTextures[released[2] == 1 ? 0 : 1]), render::kBarSet);
  render::endBlend();

  // 2. Function key icons and labels.
  render::beginBlend();
  f.letterStart();
  T(-8.5f, -1.0f);
  if (f.mode1) {
    S(1.0f / f.keyAspect, 1.0f);
    T(-0.1f, 0.0f);
  } else {
    S(1.0f, f.keyAspect);
    T(-0.2f, 0.0f);
  }
  S(0.4f, 0.4f);
  render::drawQuad(name(t.iconTextures[symbols ? 3 : (s.shiftOn != 0 ? 2 : 1)]), render::kFullSet);
  f.letterStart();
  T(8.5f, -1.0f);
  if (f.mode1) {
    S(1.0f / f.keyAspect, 1.0f);
    T(0.1f, 0.0f);
  } else {
    S(1.0f, f.keyAspect);
    T(0.2f, 0.0f);
  }
  S(0.48f, 0.48f);
  render::drawQuad(name(t.iconTextures[0]), render::kFullSet);
  f.letterStart();
  T(-7.5f, -3.0f);
  f.labelAspect();
  S(0.64f, 0.64f);
  render::drawQuad(name(t.labelTextures[s.switchMode == 1 ? 4 : (symbols ? 0 : 1)]), render::kFullSet);
  f.letterStart();
  T(7.5f, -3.0f);
  f.labelAspect();
  S(0.36f, 0.36f);
  render::drawQuad(name(t.labelTextures[released[2] == 1 ? 2 : 3]), render::kFullSet);
  render::endBlend();

  // 3. Character key faces.
  render::beginBlend();
  for (int i = 0; i < static_cast<int>(kKeyCount); ++i) {
    float x, y;
    keyCentre(i, x, y);
    f.letterStart();
    T(x, y);
    S(0.815f, 0.884f);
    render::drawQuad(name(t.charKeyTextures[0]), render::kSquareSet);
  }
  render::endBlend();

  // The held key: rows 0..2 only; row-2 columns count from 1 (the shift key is column 0).
  const std::uint32_t row = s.touchRow, column = s.touchColumn;
  const bool heldShown = s.anyKeyReleased == 0 && released[3] != 1 && s.kbdMode == 0 && row <= 2;
  const float heldX = 2.0f * static_cast<float>(column) - (row == 0 ? 9.0f : 8.0f);
  const std::uint32_t heldGlyph = column + (row == 0 ? 0 : row == 1 ? 10 : 18);  // unsigned: wraps high

  // 4. Held key face.
  if (heldShown) {
    render::beginBlend();
    f.letterStart();
    T(heldX, 3.0f - 2.0f * static_cast<float>(row));
    S(0.815f, 0.884f);
    render::drawQuad(name(t.charKeyTextures[1]), render::kSquareSet);
    render::endBlend();
  }

  // 5. Glyphs.
  const TextureName* glyphs = currentGlyphs(s, t);
  render::beginBlend();
  for (int i = 0; i < static_cast<int>(kKeyCount); ++i) {
    float x, y;
    keyCentre(i, x, y);
    f.letterStart();
    T(x, y);
    f.aspect();
    S(0.3f, 0.3f);
    render::drawQuad(name(glyphs[i]), render::kFullSet);
  }
  render::endBlend();

  // 6. Space key face.
  render::beginBlend();
  f.letterStart();
  T(0.0f, -3.0f);
  S(5.0f, 1.0f);
  S(0.963f, 0.884f);
  render::drawQuad(name(t.spaceKeyTextures[released[1] == 1 ? 0 : 1]), render::kWideSet);
  render::endBlend();

  // 7. Space label.
  const float r = s.keyWidth / s.keyHeight;
  render::beginBlend();
  f.letterStart();
  T(0.0f, -3.0f);
  S(5.0f, 1.0f);
  if (f.mode1) {
    S(1.0f, r / 0.6f);
  } else {
    S(0.6f / r, 1.0f);
    S(1.2f, 1.2f);
  }
  render::drawQuad(name(t.spaceLabelTexture), render::kWideSet);
  render::endBlend();

  // 8. Key balloon over the held key, with its glyph enlarged one key height higher.
  if (heldShown && s.surfaceMode != 0 && s.popMode != 0) {
    const float rowY = 2.0f * static_cast<float>(row);
    render::beginBlend();
    f.letterStart();
    T(heldX, 4.0f - rowY);
    f.aspect();
    T(0.0f, 0.04f);
    S(1.05f, 1.054f);
    S(0.895f, 0.884f);
    S(1.5f, 1.5f);
    render::drawQuad(name(t.charKeyTextures[2]), render::kFullSet);
    if (heldGlyph < kKeyCount) {
      f.letterStart();
      T(heldX, 5.0f - rowY);
      f.aspect();
      T(0.0f, -0.05f);
      S(1.05f, 1.054f);
      S(0.895f, 0.884f);
      S(0.65f, 0.65f);
      render::drawQuad(name(glyphs[heldGlyph]), render::kFullSet);
    }
    render::endBlend();
  }
}

void drawNumberPad(const Frame& f) {
  const KeyboardSession& s = f.s;
  const MainTextureSet& t = f.t;
  const std::uint32_t type = s.currentKbdType;
  const std::uint32_t row = s.touchRow, column = s.touchColumn;
  const std::uint32_t releasedKey = s.keyReleased[3], releasedDone = s.keyReleased[2];
  const bool highlight = s.kbdMode == 0 && releasedKey != 1;
  auto held = [&](std::uint32_t c, std::uint32_t r) { return highlight && column == c && row == r; };

  // 1. Key faces. Digit cells use face 0 at rest and 1 when held; the two function keys above
  // the done key the other way round.
  render::beginBlend();
  for (int n = 0; n < 12; ++n) {
    const int c = n % 3, r = n / 3;
    if (type == 2 && n == 11) continue;  // merged into position 10
    const bool merged = type == 2 && n == 10;
    f.padStart();
    T(merged ? 0.0f : static_cast<float>(2 * c - 3), static_cast<float>(3 - 2 * r));
    S(merged ? 1.96065f : 0.96065f, 0.93617f);
    render::drawQuad(name(t.padKeyTextures[held(merged ? 1 : c, r) ? 1 : 0]), render::kFullSet);
  }
  for (int r = 0; r < 2; ++r) {
    f.padStart();
    T(3.0f, static_cast<float>(3 - 2 * r));
    S(0.96065f, 0.93617f);
    render::drawQuad(name(t.padKeyTextures[held(3, r) ? 0 : 1]), render::kFullSet);
  }
  f.padStart();
  T(3.0f, -2.0f);
  S(1.0f, 2.0f);
  S(0.96065f, 0.96809f);
  render::drawQuad(name(t.padDoneKeyTextures[(s.kbdMode != 0 || releasedDone == 1) ? 0 : 1]), render::kFullSet);
  render::endBlend();

  // 2. Glyphs and labels.
  render::beginBlend();
  for (int n = 0; n < 10; ++n) {
    f.padStart();
    T(static_cast<float>(2 * (n % 3) - 3), static_cast<float>(3 - 2 * (n / 3)));
    f.padAspect(2.0f);
    S(0.44f, 0.44f);
    render::drawQuad(name(t.padDigitTextures[n]), render::kFullSet);
  }
  if (type == 1) {
    f.padStart();
    T(-1.0f, -3.0f);
    f.padAspect(2.0f);
    S(0.4f, 0.4f);
    render::drawQuad(name(t.padLabelTextures[2]), render::kFullSet);
    f.padStart();
    T(1.0f, -3.0f);
    f.padAspect(0.5f);
    S(0.72f, 0.72f);
    render::drawQuad(name(t.padLabelTextures[1]), render::kFullSet);
  }
  f.padStart();
  T(3.0f, 3.0f);
  f.padAspect(1.0f);
  S(0.6f, 0.6f);
  render::drawQuad(name(t.padLabelTextures[3]), render::kFullSet);
  f.padStart();
  T(3.0f, 1.0f);
  if (s.switchMode == 1) {
    S(padSwitchLabelX(f.mode1), 1.0f);
    S(0.64f, 0.64f);
    render::drawQuad(name(t.labelTextures[0]), render::kFullSet);
  } else {
    f.padAspect(0.5f);
    S(0.72f, 0.72f);
    render::drawQuad(name(t.padLabelTextures[0]), render::kFullSet);
  }
  f.padStart();
  T(3.0f, -2.0f);
  f.padAspect(0.5f);
  S(0.72f, 0.72f);
  render::drawQuad(name(t.labelTextures[releasedDone != 0 ? 2 : 3]), render::kFullSet);
  render::endBlend();

  // 3. The merged bottom key's label (type 2) or the done key's icon (type 1).
  if (type == 2) {
    const float r = 2.5f * s.keyWidth / s.keyHeight;
    render::beginBlend();
    f.padStart();
    T(0.0f, -3.0f);
    S(5.0f, 1.0f);
    if (r > 0.6f)
      S(0.6f / r, 1.0f);
    else
      S(1.0f, r / 0.6f);
    render::drawQuad(name(t.spaceLabelTexture), render::kWideSet);
    render::endBlend();
  } else if (type == 1) {
    render::beginBlend();
    f.padStart();
    T(3.0f, -3.0f);
    f.padAspect(1.0f);
    T(0.0f, -0.3f);
    S(0.4f, 0.4f);
    render::drawQuad(name(t.padDoneIconTexture), render::kFullSet);
    render::endBlend();
  }
}

}  // namespace

void mainSurfaceCreated(KeyboardSession& s) {
  std::lock_guard<std::recursive_mutex> guard(s.lock);
  buildLayout(s);
  render::applySurfaceState();
  uploadMainTextures(s);
}

void mainSurfaceChanged(KeyboardSession& s, int width, int height, int variant) {
  if (width < 1 || height < 1) return;
  applySurfaceGeometry(s, width, height, variant);
  glViewport(0, 0, width, height);
}

void mainDrawFrame(const KeyboardSession& s) {
  const MainTextureSet& t = s.mainTextures;
  render::clearFrame();
  render::drawBackground(name(t.backgroundTexture));
  const Frame f{s, t, s.surfaceMode == 1, s.columnFraction, s.rowFraction, s.keyAspect};
  if (s.currentKbdType == 0)
    drawLetterKeyboard(f);
  else
    drawNumberPad(f);
}

}  // namespace tessel
