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

// One link of a placement chain, after the keyboard's start (letter or pad grid). The aspect
// links depend on the frame: kAspect is render::aspect; kLabel the wide factors of the switch
// and done labels; kPad S(padAspectX, y); kIcon the icon correction, S(1 / keyAspect, 1) T(x, 0)
// in surface mode 1, S(1, keyAspect) T(y, 0) otherwise.
struct Step {
  enum Kind : std::uint8_t { kT, kS, kAspect, kLabel, kPad, kIcon } kind;
  float x, y;
};

constexpr Step kAspectStep{Step::kAspect, 0.0f, 0.0f};
constexpr Step kLabelStep{Step::kLabel, 0.0f, 0.0f};

// Letter keyboard, function keys: faces, then icons and labels (shift, delete, switch, done).
constexpr Step kShiftFace[] = {{Step::kT, -8.5f, -1.0f}, {Step::kS, 1.5f, 1.0f}, {Step::kS, 0.753f, 0.884f},
                               {Step::kT, -0.185f, 0.0f}};
constexpr Step kDeleteFace[] = {{Step::kT, 8.5f, -1.0f}, {Step::kS, 1.5f, 1.0f}, {Step::kS, 0.753f, 0.884f},
                                {Step::kT, 0.185f, 0.0f}};
constexpr Step kSwitchFace[] = {{Step::kT, -7.5f, -3.0f}, {Step::kS, 2.5f, 1.0f}, {Step::kS, 0.9f, 0.9f}};
constexpr Step kDoneFace[] = {{Step::kT, 7.5f, -3.0f}, {Step::kS, 2.5f, 1.0f}, {Step::kS, 0.926f, 0.884f}};
constexpr Step kShiftIcon[] = {{Step::kT, -8.5f, -1.0f}, {Step::kIcon, -0.1f, -0.2f}, {Step::kS, 0.4f, 0.4f}};
constexpr Step kDeleteIcon[] = {{Step::kT, 8.5f, -1.0f}, {Step::kIcon, 0.1f, 0.2f}, {Step::kS, 0.48f, 0.48f}};
constexpr Step kSwitchLabel[] = {{Step::kT, -7.5f, -3.0f}, kLabelStep, {Step::kS, 0.64f, 0.64f}};
constexpr Step kDoneLabel[] = {{Step::kT, 7.5f, -3.0f}, kLabelStep, {Step::kS, 0.36f, 0.36f}};
// Letter keyboard, after T(key centre): a key face, a glyph.
constexpr Step kCharFace[] = {{Step::kS, 0.815f, 0.884f}};
constexpr Step kGlyph[] = {kAspectStep, {Step::kS, 0.3f, 0.3f}};
constexpr Step kSpaceFace[] = {{Step::kT, 0.0f, -3.0f}, {Step::kS, 5.0f, 1.0f}, {Step::kS, 0.963f, 0.884f}};
// The balloon over the held key, after T(x, one row up) and T(x, two rows up).
constexpr Step kBalloon[] = {kAspectStep, {Step::kT, 0.0f, 0.04f}, {Step::kS, 1.05f, 1.054f},
                             {Step::kS, 0.895f, 0.884f}, {Step::kS, 1.5f, 1.5f}};
constexpr Step kBalloonGlyph[] = {kAspectStep, {Step::kT, 0.0f, -0.05f}, {Step::kS, 1.05f, 1.054f},
                                  {Step::kS, 0.895f, 0.884f}, {Step::kS, 0.65f, 0.65f}};

// Number pad, after T(cell centre): a key face, the merged bottom key (type 2), a digit.
constexpr Step kPadFace[] = {{Step::kS, 0.96065f, 0.93617f}};
constexpr Step kPadMergedFace[] = {{Step::kS, 1.96065f, 0.93617f}};
constexpr Step kPadDigit[] = {{Step::kPad, 0.0f, 2.0f}, {Step::kS, 0.44f, 0.44f}};
// Number pad, function keys and labels (type 1 adds the two bottom labels and the done icon).
constexpr Step kPadDoneFace[] = {{Step::kT, 3.0f, -2.0f}, {Step::kS, 1.0f, 2.0f}, {Step::kS, 0.96065f, 0.96809f}};
constexpr Step kPadLabelLeft[] = {{Step::kT, -1.0f, -3.0f}, {Step::kPad, 0.0f, 2.0f}, {Step::kS, 0.4f, 0.4f}};
constexpr Step kPadLabelRight[] = {{Step::kT, 1.0f, -3.0f}, {Step::kPad, 0.0f, 0.5f}, {Step::kS, 0.72f, 0.72f}};
constexpr Step kPadDeleteLabel[] = {{Step::kT, 3.0f, 3.0f}, {Step::kPad, 0.0f, 1.0f}, {Step::kS, 0.6f, 0.6f}};
constexpr Step kPadSwitchLabel[] = {{Step::kT, 3.0f, 1.0f}, {Step::kPad, 0.0f, 0.5f}, {Step::kS, 0.72f, 0.72f}};
constexpr Step kPadDoneLabel[] = {{Step::kT, 3.0f, -2.0f}, {Step::kPad, 0.0f, 0.5f}, {Step::kS, 0.72f, 0.72f}};
constexpr Step kPadDoneIcon[] = {{Step::kT, 3.0f, -3.0f}, {Step::kPad, 0.0f, 1.0f}, {Step::kT, 0.0f, -0.3f},
                                 {Step::kS, 0.4f, 0.4f}};

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

  void apply(const Step& step) const {
    switch (step.kind) {
      case Step::kT: T(step.x, step.y); break;
      case Step::kS: S(step.x, step.y); break;
      case Step::kAspect: render::aspect(mode1, keyAspect); break;
      case Step::kLabel:
        if (mode1)
          S(2.0f / keyAspect, 1.0f);
        else
          S(2.0f, keyAspect);
        break;
      case Step::kPad: S(padAspectX(mode1), step.y); break;
      case Step::kIcon:
        if (mode1) {
          S(1.0f / keyAspect, 1.0f);
          T(step.x, 0.0f);
        } else {
          S(1.0f, keyAspect);
          T(step.y, 0.0f);
        }
        break;
    }
  }
  template <std::size_t N>
  void chain(const Step (&steps)[N]) const {
    for (const Step& step : steps) apply(step);
  }

  // A quad on the letter grid: start, an optional translation, the chain, the texture.
  template <std::size_t N>
  void letter(const Step (&steps)[N], const TextureName& texture, const GLfloat* set) const {
    letterStart();
    chain(steps);
    render::drawQuad(texture.load(), set);
  }
  template <std::size_t N>
  void letterAt(float x, float y, const Step (&steps)[N], const TextureName& texture, const GLfloat* set) const {
    letterStart();
    T(x, y);
    chain(steps);
    render::drawQuad(texture.load(), set);
  }
  template <std::size_t N>
  void pad(const Step (&steps)[N], const TextureName& texture) const {
    padStart();
    chain(steps);
    render::drawQuad(texture.load(), render::kFullSet);
  }
  template <std::size_t N>
  void padAt(float x, float y, const Step (&steps)[N], const TextureName& texture) const {
    padStart();
    T(x, y);
    chain(steps);
    render::drawQuad(texture.load(), render::kFullSet);
  }
};

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
  auto face = [&](const TextureName (&pair)[2], std::size_t flag) -> const TextureName& {
    return pair[released[flag] == 1 ? 0 : 1];
  };

  // 1. Function key faces; 2. their icons and labels.
  render::beginBlend();
  f.letter(kShiftFace, face(t.shiftDeleteKeyTextures, 4), render::kShiftSet);
  f.letter(kDeleteFace, face(t.shiftDeleteKeyTextures, 5), render::kShiftSet);
  f.letter(kSwitchFace, face(t.switchKeyTextures, 0), render::kBarSet);
  f.letter(kDoneFace, face(t.doneKeyTextures, 2), render::kBarSet);
  render::endBlend();
  render::beginBlend();
  f.letter(kShiftIcon, t.iconTextures[symbols ? 3 : (s.shiftOn != 0 ? 2 : 1)], render::kFullSet);
  f.letter(kDeleteIcon, t.iconTextures[0], render::kFullSet);
  f.letter(kSwitchLabel, t.labelTextures[s.switchMode == 1 ? 4 : (symbols ? 0 : 1)], render::kFullSet);
  f.letter(kDoneLabel, t.labelTextures[released[2] == 1 ? 2 : 3], render::kFullSet);
  render::endBlend();

  // 3. Character key faces.
  float x, y;
  render::beginBlend();
  for (int i = 0; i < static_cast<int>(kKeyCount); ++i) {
    keyCentre(i, x, y);
    f.letterAt(x, y, kCharFace, t.charKeyTextures[0], render::kSquareSet);
  }
  render::endBlend();

  // The held key: rows 0..2 only; row-2 columns count from 1 (the shift key is column 0).
  const std::uint32_t row = s.touchRow, column = s.touchColumn;
  const bool heldShown = s.anyKeyReleased == 0 && released[3] != 1 && s.kbdMode == 0 && row <= 2;
  const float heldX = 2.0f * static_cast<float>(column) - (row == 0 ? 9.0f : 8.0f);
  const float rowY = 2.0f * static_cast<float>(row);
  const std::uint32_t heldGlyph = column + (row == 0 ? 0 : row == 1 ? 10 : 18);  // unsigned: wraps high

  // 4. Held key face.
  if (heldShown) {
    render::beginBlend();
    f.letterAt(heldX, 3.0f - rowY, kCharFace, t.charKeyTextures[1], render::kSquareSet);
    render::endBlend();
  }

  // 5. Glyphs.
  const TextureName* glyphs = currentGlyphs(s, t);
  render::beginBlend();
  for (int i = 0; i < static_cast<int>(kKeyCount); ++i) {
    keyCentre(i, x, y);
    f.letterAt(x, y, kGlyph, glyphs[i], render::kFullSet);
  }
  render::endBlend();

  // 6. Space key face.
  render::beginBlend();
  f.letter(kSpaceFace, face(t.spaceKeyTextures, 1), render::kWideSet);
  render::endBlend();

  // 7. Space label, scaled to the key's own aspect.
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
  render::drawQuad(t.spaceLabelTexture.load(), render::kWideSet);
  render::endBlend();

  // 8. Key balloon over the held key, with its glyph enlarged one key height higher.
  if (heldShown && s.surfaceMode != 0 && s.popMode != 0) {
    render::beginBlend();
    f.letterAt(heldX, 4.0f - rowY, kBalloon, t.charKeyTextures[2], render::kFullSet);
    if (heldGlyph < kKeyCount) f.letterAt(heldX, 5.0f - rowY, kBalloonGlyph, glyphs[heldGlyph], render::kFullSet);
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
  auto cellX = [](int c) { return static_cast<float>(2 * c - 3); };
  auto cellY = [](int r) { return static_cast<float>(3 - 2 * r); };

  // 1. Key faces. Digit cells use face 0 at rest and 1 when held; the two function keys above
  // the done key the other way round.
  render::beginBlend();
  for (int n = 0; n < 12; ++n) {
    const int c = n % 3, r = n / 3;
    if (type == 2 && n == 11) continue;  // merged into position 10
    if (type == 2 && n == 10)
      f.padAt(0.0f, cellY(r), kPadMergedFace, t.padKeyTextures[held(1, r) ? 1 : 0]);
    else
      f.padAt(cellX(c), cellY(r), kPadFace, t.padKeyTextures[held(c, r) ? 1 : 0]);
  }
  for (int r = 0; r < 2; ++r) f.padAt(3.0f, cellY(r), kPadFace, t.padKeyTextures[held(3, r) ? 0 : 1]);
  f.pad(kPadDoneFace, t.padDoneKeyTextures[(s.kbdMode != 0 || releasedDone == 1) ? 0 : 1]);
  render::endBlend();

  // 2. Glyphs and labels.
  render::beginBlend();
  for (int n = 0; n < 10; ++n) f.padAt(cellX(n % 3), cellY(n / 3), kPadDigit, t.padDigitTextures[n]);
  if (type == 1) {
    f.pad(kPadLabelLeft, t.padLabelTextures[2]);
    f.pad(kPadLabelRight, t.padLabelTextures[1]);
  }
  f.pad(kPadDeleteLabel, t.padLabelTextures[3]);
  if (s.switchMode == 1) {
    f.padStart();
    T(3.0f, 1.0f);
    S(padSwitchLabelX(f.mode1), 1.0f);
    S(0.64f, 0.64f);
    render::drawQuad(t.labelTextures[0].load(), render::kFullSet);
  } else {
    f.pad(kPadSwitchLabel, t.padLabelTextures[0]);
  }
  f.pad(kPadDoneLabel, t.labelTextures[releasedDone != 0 ? 2 : 3]);
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
    render::drawQuad(t.spaceLabelTexture.load(), render::kWideSet);
    render::endBlend();
  } else if (type == 1) {
    render::beginBlend();
    f.pad(kPadDoneIcon, t.padDoneIconTexture);
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
  render::drawBackground(t.backgroundTexture.load());
  const Frame f{s, t, s.surfaceMode == 1, s.columnFraction, s.rowFraction, s.keyAspect};
  if (s.currentKbdType == 0)
    drawLetterKeyboard(f);
  else
    drawNumberPad(f);
}

}  // namespace tessel
