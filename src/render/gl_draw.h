// Drawing conventions shared by the three surfaces (internal to render/).
//
// Fixed-function GL ES 1.x: the projection stays identity, so model-view coordinates are
// normalised device coordinates. Every picture is the one unit quad (a 4-vertex triangle
// strip over [-1, 1]^2), placed by a chain of glScalef / glTranslatef calls that post-multiply
// (S and T below), textured with one of five texture-coordinate sets, and followed by
// glLoadIdentity. A texture-coordinate t of 0 is the image's first row, the top of the quad.
//
// Texture-coordinate sets (s, t of vertices top-left, top-right, bottom-left, bottom-right; the
// fractions are in sampled_fractions.h):
//   full   whole image                 background, glyphs, icons, labels, pad keys
//   wide   s 0..1,      t 0..0.625     space key face and label
//   square s 0..0.625,  t 0..0.625     character key faces
//   shift  s 0..0.9375, t 0..0.625     shift and delete faces
//   bar    s 0..0.9765, t 0..0.625     switch and done faces
#pragma once

#include <GLES/gl.h>

#include <cstdint>
#include <cstring>

namespace tessel::render {

extern const GLfloat kUnitQuad[12];
extern const GLfloat kFullSet[8];
extern const GLfloat kWideSet[8];
extern const GLfloat kSquareSet[8];
extern const GLfloat kShiftSet[8];
extern const GLfloat kBarSet[8];

inline void S(GLfloat x, GLfloat y) { glScalef(x, y, 1.0f); }
inline void T(GLfloat x, GLfloat y) { glTranslatef(x, y, 0.0f); }

// A single-precision value given by its bit pattern (some scale factors are fixed to the bit).
inline float floatFromBits(std::uint32_t bits) {
  float f;
  std::memcpy(&f, &bits, sizeof f);
  return f;
}

// Binds the texture, points the arrays at the unit quad and `texCoords`, draws the strip and,
// unless told otherwise, resets the model-view to identity.
void drawQuad(GLuint texture, const GLfloat* texCoords, bool resetMatrix = true);

// The aspect correction that keeps glyphs and icons undistorted on a key of aspect keyAspect:
// S(1 / keyAspect, 2) in surface mode 1, S(1, 2 keyAspect) otherwise.
inline void aspect(bool mode1, float keyAspect) {
  if (mode1)
    S(1.0f / keyAspect, 2.0f);
  else
    S(1.0f, 2.0f * keyAspect);
}

// glEnable(GL_BLEND) with src-alpha / one-minus-src-alpha; endBlend disables it.
void beginBlend();
void endBlend();

// State of every surface-created handler: smooth shading, 2D textures, depth test LEQUAL,
// nicest perspective hint, vertex and texture-coordinate arrays.
void applySurfaceState();

// Start of every frame: texture environment modulate, clear colour and depth to transparent
// black / far, model-view identity.
void clearFrame();

// The background quad: at depth 1, over the whole viewport, no blending.
void drawBackground(GLuint texture);

}  // namespace tessel::render
