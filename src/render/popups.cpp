// The two pop-up surfaces: the field pop-up (masked input field with a blinking cursor, plus
// the upper part of the key balloon for a held top-row key) and the top pop-up (the enlarged
// glyph of that key). Neither ever draws a typed character: the field shows one dot each.
//
// Both are meant to sit directly above the keyboard, one key row high: their x grid is the
// keyboard's ten columns (S(columnFraction, 1)) and their y runs -1..1, so the balloon and
// glyph continue exactly where the keyboard surface cuts them off.
//
// CursorBlink is process-wide and unguarded (all sessions share one blink rhythm); it compares
// only the microseconds within the current second, so a pause of more than a second between
// frames is measured modulo one second. That is the intended behaviour.
#include <sys/time.h>

#include <cstdint>
#include <mutex>

#include "input/layout.h"
#include "render/gl_draw.h"
#include "render/surfaces.h"
#include "render/textures.h"
#include "session/session.h"

namespace tessel {

using render::S;
using render::T;

// The wall clock's microseconds within the second; a hook so that tests can drive the blink.
std::int32_t (*cursorClockMicros)() = [] {
  timeval now{};
  gettimeofday(&now, nullptr);
  return static_cast<std::int32_t>(now.tv_usec);
};

namespace {

struct CursorBlink {
  RelaxedField<std::int32_t> lastToggle;  // microseconds within the second
  RelaxedField<std::int32_t> phase;       // 1 = visible
};
CursorBlink gBlink;

// True when the cursor is to be drawn; flips the phase once 800 ms have passed.
bool cursorVisible() {
  const std::int32_t u = cursorClockMicros();
  const std::int32_t last = gBlink.lastToggle;
  const std::int32_t elapsed = u > last ? u - last : u + 1000000 - last;
  if (elapsed < 800001) return gBlink.phase == 1;
  gBlink.lastToggle = u;
  gBlink.phase = gBlink.phase == 1 ? 0 : 1;
  return gBlink.phase == 1;
}

// A held top-row key of the letter keyboard, shown on the pop-ups (popMode is not consulted).
bool topRowHeld(const KeyboardSession& s) {
  return s.currentKbdType == 0 && s.anyKeyReleased == 0 && s.surfaceMode != 0 && s.kbdMode == 0 &&
         s.keyReleased[3] != 1 && s.touchRow == 0;
}

void aspect(const KeyboardSession& s) { render::aspect(s.surfaceMode == 1, s.keyAspect); }

float topRowX(std::uint32_t column) { return 2.0f * static_cast<float>(column) - 9.0f; }

void drawField(const KeyboardSession& s) {
  const PopTextureSet& t = s.popTextures;
  const bool pad = s.currentKbdType != 0;
  const bool mode1 = s.surfaceMode == 1;

  glTranslatef(0.0f, 0.0f, 1.0f);  // the frame lies at the background's depth and covers it
  if (pad) {
    T(0.0f, -0.173f);
    S(0.94375f, 0.827f);
  } else {
    S(0.9815f, 0.73f);
  }
  render::drawQuad(t.frame.load(), render::kFullSet);

  // Dots and cursor on a grid of 1/20 of the width, sized by the keyboard's key aspect.
  const int limit = pad ? 18 : 19;
  const int length = static_cast<int>(s.content->length.load());
  const int n = length < limit ? length : limit;
  const float r = (static_cast<float>(s.surfaceWidth.load()) / 10.0f) /
                  (static_cast<float>(s.surfaceHeight.load()) * 0.25f);
  const float unit = 0.5f * s.gapFraction;
  auto place = [&](float x) {
    if (pad) T(0.0f, -0.173f);
    S(unit, 1.0f);
    T(x, 0.0f);
    if (mode1)
      S(2.0f / r, 1.0f);
    else
      S(2.0f, r);
  };
  render::beginBlend();
  for (int k = 0; k < n; ++k) {
    place(static_cast<float>(2 * k - (pad ? 17 : 18)));
    S(0.24f, 0.24f);
    render::drawQuad(t.dot.load(), render::kFullSet);
  }
  if (cursorVisible()) {
    place(static_cast<float>(2 * n - (pad ? 18 : 19)));
    S(0.24f, 0.36f);
    render::drawQuad(t.cursor.load(), render::kFullSet);
  }
  render::endBlend();
}

}  // namespace

void popSurfaceCreated(KeyboardSession& s) {
  std::lock_guard<std::recursive_mutex> guard(s.lock);
  render::applySurfaceState();
  uploadPopTextures(s);
}

void popSurfaceChanged(KeyboardSession&, int width, int height) {
  if (width < 1 || height < 1) return;
  glViewport(0, 0, width, height);
}

void popDrawFrame(const KeyboardSession& s, bool showField) {
  if (s.layoutBuilt != 1) return;
  const PopTextureSet& t = s.popTextures;
  render::clearFrame();
  if (showField) {
    render::drawBackground(t.background.load());
    drawField(s);
  }
  if (!topRowHeld(s)) return;
  // The balloon's upper part; blending stays on and the matrix is left as it is (the next
  // frame's clear resets it).
  render::beginBlend();
  S(s.columnFraction, 1.0f);
  T(topRowX(s.touchColumn), -1.0f);
  aspect(s);
  T(0.0f, 0.04f);
  S(1.05f, 1.054f);
  S(0.895f, 0.884f);
  S(1.5f, 1.5f);
  render::drawQuad(t.balloon.load(), render::kFullSet, false);
}

void popTopSurfaceCreated(KeyboardSession& s) {
  std::lock_guard<std::recursive_mutex> guard(s.lock);
  buildLayout(s);
  render::applySurfaceState();
  uploadPopTopTextures(s);
}

void popTopSurfaceChanged(KeyboardSession&, int width, int height) {
  if (width < 1 || height < 1) return;
  glViewport(0, 0, width, height);
}

void popTopDrawFrame(const KeyboardSession& s) {
  if (s.layoutBuilt != 1) return;
  render::clearFrame();
  const std::uint32_t c = s.touchColumn;
  if (!topRowHeld(s) || c >= 10) return;
  const PopTopTextureSet& t = s.popTopTextures;
  // The top pop-up holds first-page symbols only: the second page shows the first page's glyph.
  const TextureName& glyph = s.symbolPage != 0 ? t.symbols[c] : (s.shiftOn != 0 ? t.shiftedLetters[c] : t.letters[c]);
  render::beginBlend();
  S(s.columnFraction, 1.0f);
  T(topRowX(c), 0.0f);
  aspect(s);
  T(0.0f, -0.05f);
  S(0.65f, 0.65f);
  render::drawQuad(glyph.load(), render::kFullSet, false);
}

}  // namespace tessel
