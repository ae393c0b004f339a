// The unit quad, the texture-coordinate sets and the small GL sequences every surface repeats.
#include "render/gl_draw.h"

#include "render/sampled_fractions.h"

namespace tessel::render {

const GLfloat kUnitQuad[12] = {-1.0f, 1.0f, -0.0f, 1.0f, 1.0f, -0.0f, -1.0f, -1.0f, -0.0f, 1.0f, -1.0f, -0.0f};
const GLfloat kFullSet[8] = {0.0f, 0.0f, 1.0f, 0.0f, 0.0f, 1.0f, 1.0f, 1.0f};
const GLfloat kWideSet[8] = {0.0f, 0.0f, 1.0f, 0.0f, 0.0f, kSampledHeight, 1.0f, kSampledHeight};
const GLfloat kSquareSet[8] = {0.0f, 0.0f, kSquareWidth, 0.0f, 0.0f, kSampledHeight, kSquareWidth, kSampledHeight};
const GLfloat kShiftSet[8] = {0.0f, 0.0f, kShiftWidth, 0.0f, 0.0f, kSampledHeight, kShiftWidth, kSampledHeight};
const GLfloat kBarSet[8] = {0.0f, 0.0f, kBarWidth, 0.0f, 0.0f, kSampledHeight, kBarWidth, kSampledHeight};

void drawQuad(GLuint texture, const GLfloat* texCoords, bool resetMatrix) {
  glBindTexture(GL_TEXTURE_2D, texture);
  glTexCoordPointer(2, GL_FLOAT, 0, texCoords);
  glVertexPointer(3, GL_FLOAT, 0, kUnitQuad);
  glDrawArrays(GL_TRIANGLE_STRIP, 0, 4);
  if (resetMatrix) glLoadIdentity();
}

void beginBlend() {
  glEnable(GL_BLEND);
  glBlendFunc(GL_SRC_ALPHA, GL_ONE_MINUS_SRC_ALPHA);
}

void endBlend() { glDisable(GL_BLEND); }

void applySurfaceState() {
  glShadeModel(GL_SMOOTH);
  glEnable(GL_TEXTURE_2D);
  glEnable(GL_DEPTH_TEST);
  glDepthFunc(GL_LEQUAL);
  glHint(GL_PERSPECTIVE_CORRECTION_HINT, GL_NICEST);
  glEnableClientState(GL_VERTEX_ARRAY);
  glEnableClientState(GL_TEXTURE_COORD_ARRAY);
}

void clearFrame() {
  glTexEnvx(GL_TEXTURE_ENV, GL_TEXTURE_ENV_MODE, GL_MODULATE);
  glClearColor(0.0f, 0.0f, 0.0f, 0.0f);
  glClear(GL_COLOR_BUFFER_BIT | GL_DEPTH_BUFFER_BIT);
  glLoadIdentity();
  glMatrixMode(GL_MODELVIEW);
}

void drawBackground(GLuint texture) {
  glTranslatef(0.0f, 0.0f, 1.0f);
  drawQuad(texture, kFullSet);
}

}  // namespace tessel::render
