// GLFW window mode of the demo: context creation, the surfaces' regions, mouse-to-touch mapping,
// the top pop-up's offscreen texture, the done report and the framebuffer screenshot.
#include "window.h"

#define GLFW_INCLUDE_NONE
#include <EGL/egl.h>
#include <GLES/gl.h>
#include <GLES/glext.h>
#include <GLFW/glfw3.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <vector>

#include "crypto/error_table.h"
#include "input/touch.h"
#include "offscreen.h"
#include "render/surfaces.h"
#include "render/textures.h"
#include "road.h"
#include "session/output.h"
#include "session/sealed_text.h"
#include "session/session.h"

namespace demo {

using namespace tessel;

namespace {

const char kTitle[] = "Tessel keyboard demo";
const std::uint32_t kBackdrop = 0x20242AFF;  // behind the surfaces, as in the offscreen frames

std::string g_glfwError;

void rememberGlfwError(int, const char* text) { g_glfwError = text ? text : "unknown GLFW error"; }

// What the callbacks share with the loop. Regions are in framebuffer pixels; the keyboard is the
// bottom kbH rows, the pop-ups the popH rows above it.
struct WindowState {
  KeyboardSession* session = nullptr;
  int winW = 0, winH = 0, fbW = 0, fbH = 0, popH = 0, kbH = 0;
  double cursorX = 0, cursorY = 0;  // window units, origin top-left
  bool pressed = false;             // a press that started on the keyboard is in progress
  bool doneReleased = false;
};

WindowState& stateOf(GLFWwindow* window) { return *static_cast<WindowState*>(glfwGetWindowUserPointer(window)); }

// Window units -> keyboard-surface pixels (origin top-left of the keyboard), through the
// framebuffer scale and below the pop-up region.
void toKeyboard(const WindowState& w, double cx, double cy, float* x, float* y) {
  const double sx = w.winW > 0 ? static_cast<double>(w.fbW) / w.winW : 1.0;
  const double sy = w.winH > 0 ? static_cast<double>(w.fbH) / w.winH : 1.0;
  *x = static_cast<float>(cx * sx);
  *y = static_cast<float>(cy * sy - w.popH);
}

void onMouseButton(GLFWwindow* window, int button, int action, int) {
  WindowState& w = stateOf(window);
  if (button != GLFW_MOUSE_BUTTON_LEFT) return;
  float x, y;
  toKeyboard(w, w.cursorX, w.cursorY, &x, &y);
  if (action == GLFW_PRESS) {
    // Only a press on the keyboard's surface reaches it; the pop-ups take no touches.
    if (x < 0 || y < 0 || x >= static_cast<float>(w.fbW) || y >= static_cast<float>(w.kbH)) return;
    w.pressed = true;
    touch(*w.session, 0, x, y);
  } else if (action == GLFW_RELEASE && w.pressed) {
    // Like a touch that left its view, the release goes to the keyboard wherever it happens.
    w.pressed = false;
    if (touch(*w.session, 1, x, y) == 1) w.doneReleased = true;
  }
}

void onCursor(GLFWwindow* window, double cx, double cy) {
  WindowState& w = stateOf(window);
  w.cursorX = cx;
  w.cursorY = cy;
  if (!w.pressed) return;
  float x, y;
  toKeyboard(w, cx, cy, &x, &y);
  touch(*w.session, 2, x, y);
}

void onKey(GLFWwindow* window, int key, int, int action, int) {
  if (key == GLFW_KEY_ESCAPE && action == GLFW_PRESS) glfwSetWindowShouldClose(window, GLFW_TRUE);
}

// The window's native context API first (GLX on X11), then EGL, which some Mesa setups need
// for an OpenGL ES context.
GLFWwindow* openWindow(int width, int height, const char** api) {
  glfwDefaultWindowHints();
  glfwWindowHint(GLFW_CLIENT_API, GLFW_OPENGL_ES_API);
  glfwWindowHint(GLFW_CONTEXT_VERSION_MAJOR, 1);
  glfwWindowHint(GLFW_CONTEXT_VERSION_MINOR, 1);
  const struct {
    int hint;
    const char* name;
  } apis[] = {{GLFW_NATIVE_CONTEXT_API, "native"}, {GLFW_EGL_CONTEXT_API, "EGL"}};
  for (const auto& candidate : apis) {
    glfwWindowHint(GLFW_CONTEXT_CREATION_API, candidate.hint);
    if (GLFWwindow* window = glfwCreateWindow(width, height, kTitle, nullptr, nullptr)) {
      *api = candidate.name;
      return window;
    }
  }
  return nullptr;
}

// The top pop-up's own surface: a texture behind a framebuffer object (GL_OES_framebuffer_object),
// sized to the pop-up region rounded up to powers of two, since OpenGL ES 1.1 does not promise
// other texture sizes. Its frame is blended over the field pop-up, as the app's transparent
// top pop-up surface sits over the field pop-up's.
class KeyOverlay {
 public:
  bool init() {
    if (!glfwExtensionSupported("GL_OES_framebuffer_object")) return false;
    gen_ = reinterpret_cast<PFNGLGENFRAMEBUFFERSOESPROC>(glfwGetProcAddress("glGenFramebuffersOES"));
    bind_ = reinterpret_cast<PFNGLBINDFRAMEBUFFEROESPROC>(glfwGetProcAddress("glBindFramebufferOES"));
    attach_ = reinterpret_cast<PFNGLFRAMEBUFFERTEXTURE2DOESPROC>(glfwGetProcAddress("glFramebufferTexture2DOES"));
    status_ = reinterpret_cast<PFNGLCHECKFRAMEBUFFERSTATUSOESPROC>(
        glfwGetProcAddress("glCheckFramebufferStatusOES"));
    delete_ = reinterpret_cast<PFNGLDELETEFRAMEBUFFERSOESPROC>(glfwGetProcAddress("glDeleteFramebuffersOES"));
    available_ = gen_ && bind_ && attach_ && status_ && delete_;
    return available_;
  }

  bool available() const { return available_; }

  void resize(int width, int height) {
    if (!available_) return;
    release();
    width_ = width;
    height_ = height;
    textureWidth_ = powerOfTwo(width);
    textureHeight_ = powerOfTwo(height);
    glGenTextures(1, &texture_);
    glBindTexture(GL_TEXTURE_2D, texture_);
    glTexParameterf(GL_TEXTURE_2D, GL_TEXTURE_MIN_FILTER, GL_NEAREST);
    glTexParameterf(GL_TEXTURE_2D, GL_TEXTURE_MAG_FILTER, GL_NEAREST);
    glTexParameterf(GL_TEXTURE_2D, GL_TEXTURE_WRAP_S, GL_CLAMP_TO_EDGE);
    glTexParameterf(GL_TEXTURE_2D, GL_TEXTURE_WRAP_T, GL_CLAMP_TO_EDGE);
    glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, textureWidth_, textureHeight_, 0, GL_RGBA, GL_UNSIGNED_BYTE, nullptr);
    gen_(1, &framebuffer_);
    bind_(GL_FRAMEBUFFER_OES, framebuffer_);
    attach_(GL_FRAMEBUFFER_OES, GL_COLOR_ATTACHMENT0_OES, GL_TEXTURE_2D, texture_, 0);
    const bool complete = status_(GL_FRAMEBUFFER_OES) == GL_FRAMEBUFFER_COMPLETE_OES;
    bind_(GL_FRAMEBUFFER_OES, 0);
    if (!complete) {
      release();
      available_ = false;
      std::printf("  the framebuffer object is incomplete: the enlarged key is left out\n");
    }
  }

  // Draws the top pop-up's frame into the texture; the window's framebuffer is bound again after.
  void render(const KeyboardSession& s) {
    if (!available_) return;
    bind_(GL_FRAMEBUFFER_OES, framebuffer_);
    glViewport(0, 0, width_, height_);
    popTopDrawFrame(s);
    bind_(GL_FRAMEBUFFER_OES, 0);
  }

  // Blends the texture over the current viewport. The frame holds colour already multiplied by
  // its alpha (drawn with SRC_ALPHA blending over transparent black), hence ONE for the source.
  void composite() {
    if (!available_) return;
    const GLfloat s = static_cast<GLfloat>(width_) / textureWidth_;
    const GLfloat t = static_cast<GLfloat>(height_) / textureHeight_;
    const GLfloat quad[8] = {-1, 1, 1, 1, -1, -1, 1, -1};
    const GLfloat texCoords[8] = {0, t, s, t, 0, 0, s, 0};
    glLoadIdentity();
    glDisable(GL_DEPTH_TEST);
    glEnable(GL_BLEND);
    glBlendFunc(GL_ONE, GL_ONE_MINUS_SRC_ALPHA);
    glTexEnvx(GL_TEXTURE_ENV, GL_TEXTURE_ENV_MODE, GL_REPLACE);
    glBindTexture(GL_TEXTURE_2D, texture_);
    glVertexPointer(2, GL_FLOAT, 0, quad);
    glTexCoordPointer(2, GL_FLOAT, 0, texCoords);
    glDrawArrays(GL_TRIANGLE_STRIP, 0, 4);
    glDisable(GL_BLEND);
    glEnable(GL_DEPTH_TEST);
  }

  void release() {
    if (framebuffer_ != 0) delete_(1, &framebuffer_);
    if (texture_ != 0) glDeleteTextures(1, &texture_);
    framebuffer_ = texture_ = 0;
  }

 private:
  static int powerOfTwo(int n) {
    int p = 1;
    while (p < n) p *= 2;
    return p;
  }

  bool available_ = false;
  PFNGLGENFRAMEBUFFERSOESPROC gen_ = nullptr;
  PFNGLBINDFRAMEBUFFEROESPROC bind_ = nullptr;
  PFNGLFRAMEBUFFERTEXTURE2DOESPROC attach_ = nullptr;
  PFNGLCHECKFRAMEBUFFERSTATUSOESPROC status_ = nullptr;
  PFNGLDELETEFRAMEBUFFERSOESPROC delete_ = nullptr;
  GLuint framebuffer_ = 0, texture_ = 0;
  int width_ = 0, height_ = 0, textureWidth_ = 1, textureHeight_ = 1;
};

// An app's surfaces lose their GL context with the keyboard, and their textures with it; the
// demo keeps one context, so the three sets' textures must go before the surfaces are created
// again. In an EGL context the library deletes them itself; under GLX it cannot tell the
// context apart, so the demo does.
void deleteSurfaceTextures(const KeyboardSession& s) {
  if (eglGetCurrentContext() != EGL_NO_CONTEXT) return;
  auto remove = [](const TextureName* names, int count) {
    for (int k = 0; k < count; ++k) {
      const GLuint name = names[k].load();
      if (name != 0) glDeleteTextures(1, &name);
    }
  };
  forEachEntry(s.mainTextures, remove);
  forEachEntry(s.popTextures, remove);
  forEachEntry(s.popTopTextures, remove);
}

void createSurfaces(KeyboardSession& s) {
  mainSurfaceCreated(s);
  popSurfaceCreated(s);
  popTopSurfaceCreated(s);
}

// Surface sizes follow the framebuffer: the pop-ups take a fifth of its height.
void changeSurfaces(KeyboardSession& s, WindowState& w, KeyOverlay& overlay) {
  w.popH = w.fbH / 5;
  w.kbH = w.fbH - w.popH;
  mainSurfaceChanged(s, w.fbW, w.kbH, 1);
  popSurfaceChanged(s, w.fbW, w.popH);
  popTopSurfaceChanged(s, w.fbW, w.popH);
  overlay.resize(w.fbW, w.popH);
}

// One frame of the three surfaces. Each draw starts from the state its own context would have
// (no blending: the pop-up's draw leaves it on), inside its own viewport and scissor box.
void drawFrame(const KeyboardSession& s, const WindowState& w, KeyOverlay& overlay) {
  glDisable(GL_SCISSOR_TEST);
  glClearColor(((kBackdrop >> 24) & 255) / 255.0f, ((kBackdrop >> 16) & 255) / 255.0f,
               ((kBackdrop >> 8) & 255) / 255.0f, 1.0f);
  glClear(GL_COLOR_BUFFER_BIT | GL_DEPTH_BUFFER_BIT);

  glDisable(GL_BLEND);
  overlay.render(s);

  glEnable(GL_SCISSOR_TEST);
  glViewport(0, 0, w.fbW, w.kbH);
  glScissor(0, 0, w.fbW, w.kbH);
  glDisable(GL_BLEND);
  mainDrawFrame(s);

  glViewport(0, w.kbH, w.fbW, w.popH);
  glScissor(0, w.kbH, w.fbW, w.popH);
  glDisable(GL_BLEND);
  popDrawFrame(s, true);
  overlay.composite();
  glDisable(GL_SCISSOR_TEST);
}

// The back buffer as drawn (before the swap), written as an opaque PNG.
bool writeScreenshot(const std::string& path, int width, int height) {
  Canvas canvas(width, height, kBackdrop);
  canvas.rgba = tessel::host::readFramebuffer(width, height);
  for (std::size_t k = 3; k < canvas.rgba.size(); k += 4) canvas.rgba[k] = 255;
  return writePng(path, canvas);
}

// What the app and then the backend see when done is released: no plaintext.
void reportDone(KeyboardSession& s, const server::OpenKeys& keys, int count, const std::string& outDir) {
  std::printf("\nDone released (%d): app side\n", count);
  std::printf("  getNativeContentLen -> %d\n", contentLength(s));
  std::printf("  getNativeDegree -> '%c' (E empty, W weak, M medium, S strong)\n", sessionDegree(s));
  std::printf("  getNativeVerify -> %d (0 passes the rule)\n", sessionVerify(s));
  const std::string timestamp = utcTimestamp();
  SecureBuffer content = contentOutput(s, 48, timestamp.c_str());
  std::printf("  getNativeContent(\"%s\") -> %zu base64 characters, last error \"%s\"\n", timestamp.c_str(),
              content ? content.size() : 0, lastErrorText(s.content->lastError));
  std::printf("Backend side\n");
  if (!content) {
    step("no content output to open");
    return;
  }
  server::Opened opened;
  openContent(content, keys, &opened);
  const std::string name = "window_content_" + std::to_string(count) + ".b64";
  const std::string command = saveForBackend(outDir, name.c_str(), 48, content, nullptr);
  check(!command.empty(), ("content output saved as " + outDir + "/" + name).c_str());
  if (!command.empty()) std::printf("  open it again from the repository root:\n    %s\n", command.c_str());
}

}  // namespace

int runWindow(KeyboardSession& s, const server::OpenKeys& keys, const WindowOptions& options) {
  // Line by line even into a pipe: whoever drives the window reads the geometry line first.
  std::setvbuf(stdout, nullptr, _IOLBF, 0);
  glfwSetErrorCallback(rememberGlfwError);
  if (!glfwInit()) {
    std::printf("  FAIL no window system: %s\n", g_glfwError.c_str());
    return 1;
  }
  const char* api = "";
  GLFWwindow* window = openWindow(options.width, options.width * 5 / 6, &api);
  if (window == nullptr) {
    std::printf("  FAIL no window with an OpenGL ES 1.1 context: %s\n", g_glfwError.c_str());
    glfwTerminate();
    return 1;
  }
  glfwMakeContextCurrent(window);
  glfwSwapInterval(1);

  WindowState state;
  state.session = &s;
  glfwSetWindowUserPointer(window, &state);
  glfwSetMouseButtonCallback(window, onMouseButton);
  glfwSetCursorPosCallback(window, onCursor);
  glfwSetKeyCallback(window, onKey);
  glfwGetCursorPos(window, &state.cursorX, &state.cursorY);

  KeyOverlay overlay;
  overlay.init();
  createSurfaces(s);
  glfwGetWindowSize(window, &state.winW, &state.winH);
  glfwGetFramebufferSize(window, &state.fbW, &state.fbH);
  changeSurfaces(s, state, overlay);
  std::printf("  surfaces created on %s (%s, %s context)\n", reinterpret_cast<const char*>(glGetString(GL_VERSION)),
              reinterpret_cast<const char*>(glGetString(GL_RENDERER)), api);
  std::printf("  window %dx%d (framebuffer %dx%d): field pop-up %dx%d on top, keyboard %dx%d below\n", state.winW,
              state.winH, state.fbW, state.fbH, state.fbW, state.popH, state.fbW, state.kbH);
  if (!overlay.available()) step("no GL_OES_framebuffer_object: the enlarged key over the balloon is left out");
  std::printf("\nUser side: type with the mouse; Done opens the content envelope%s; Escape quits\n",
              options.exitAfterDone ? " and quits" : "");

  const auto screenshot = [&] {
    if (options.screenshot.empty()) return;
    check(writeScreenshot(options.screenshot, state.fbW, state.fbH), ("screenshot " + options.screenshot).c_str());
  };
  int dones = 0;
  bool finished = false;
  while (!glfwWindowShouldClose(window)) {
    int winW, winH, fbW, fbH;
    glfwGetWindowSize(window, &winW, &winH);
    glfwGetFramebufferSize(window, &fbW, &fbH);
    if (fbW > 0 && fbH > 0 && (fbW != state.fbW || fbH != state.fbH || winW != state.winW || winH != state.winH)) {
      state.winW = winW;
      state.winH = winH;
      state.fbW = fbW;
      state.fbH = fbH;
      changeSurfaces(s, state, overlay);
    }
    if (state.doneReleased) {
      state.doneReleased = false;
      reportDone(s, keys, ++dones, options.outDir);
      // Shown again, as an app shows its keyboard once more: new surfaces, a new layout.
      deleteSurfaceTextures(s);
      createSurfaces(s);
      changeSurfaces(s, state, overlay);
      drawFrame(s, state, overlay);
      screenshot();
      if (options.exitAfterDone) {
        finished = true;
        break;
      }
      std::printf("\nThe keyboard is shown again; the field keeps its text (delete with the delete key)\n");
    } else {
      drawFrame(s, state, overlay);
    }
    glfwSwapBuffers(window);
    glfwWaitEventsTimeout(0.1);  // wakes for input at once; the field's cursor blinks at 800 ms
  }
  if (!finished) {
    drawFrame(s, state, overlay);
    screenshot();
  }
  overlay.release();
  glfwDestroyWindow(window);
  glfwTerminate();
  std::printf("\n%s\n", failures() == 0 ? "Window closed." : "Window closed: a check FAILED.");
  return failures() == 0 ? 0 : 1;
}

}  // namespace demo
