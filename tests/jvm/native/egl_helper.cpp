// Test-only JNI helper (libtessel_egl_test.so): an offscreen OpenGL ES 1.1 context for the JVM
// suite, so the keyboard's surface callbacks run from Java exactly as an app's GL renderer
// thread runs them, and the frame can be read back into Java.
//
// com.qn.tessel.test.EglContext calls these on its GL thread: create() makes a Mesa surfaceless
// display, a GLES 1.x context and a pbuffer of the requested size, and makes them current on
// the calling thread; readPixels() returns the RGBA bytes of the pbuffer (bottom row first, as
// glReadPixels gives them); release() unbinds and destroys everything. Failures are reported as
// a 0 handle / null array plus a message from lastError(); nothing throws.
#include <EGL/egl.h>
#include <EGL/eglext.h>
#include <GLES/gl.h>
#include <jni.h>

#include <cstdint>
#include <cstdio>
#include <new>
#include <string>

namespace {

struct Context {
  EGLDisplay display = EGL_NO_DISPLAY;
  EGLContext context = EGL_NO_CONTEXT;
  EGLSurface surface = EGL_NO_SURFACE;
  int width = 0;
  int height = 0;
};

thread_local std::string g_error;

void fail(const char* what) {
  char text[160];
  std::snprintf(text, sizeof text, "%s (EGL error 0x%04X)", what, static_cast<unsigned>(eglGetError()));
  g_error = text;
}

void destroy(Context* c) {
  if (c->display != EGL_NO_DISPLAY) {
    eglMakeCurrent(c->display, EGL_NO_SURFACE, EGL_NO_SURFACE, EGL_NO_CONTEXT);
    if (c->surface != EGL_NO_SURFACE) eglDestroySurface(c->display, c->surface);
    if (c->context != EGL_NO_CONTEXT) eglDestroyContext(c->display, c->context);
    eglReleaseThread();
  }
  delete c;
}

Context* create(int width, int height) {
  g_error.clear();
  if (width < 1 || height < 1) {
    g_error = "bad size";
    return nullptr;
  }
  auto getPlatformDisplay =
      reinterpret_cast<PFNEGLGETPLATFORMDISPLAYEXTPROC>(eglGetProcAddress("eglGetPlatformDisplayEXT"));
  if (getPlatformDisplay == nullptr) {
    fail("eglGetPlatformDisplayEXT missing");
    return nullptr;
  }
  auto* c = new (std::nothrow) Context;
  if (c == nullptr) return nullptr;
  c->width = width;
  c->height = height;
  c->display = getPlatformDisplay(EGL_PLATFORM_SURFACELESS_MESA, EGL_DEFAULT_DISPLAY, nullptr);
  EGLint major = 0, minor = 0;
  if (c->display == EGL_NO_DISPLAY || !eglInitialize(c->display, &major, &minor)) {
    fail("no surfaceless display");
    c->display = EGL_NO_DISPLAY;
    destroy(c);
    return nullptr;
  }
  const EGLint configAttributes[] = {EGL_SURFACE_TYPE, EGL_PBUFFER_BIT, EGL_RENDERABLE_TYPE, EGL_OPENGL_ES_BIT,
                                     EGL_RED_SIZE, 8, EGL_GREEN_SIZE, 8, EGL_BLUE_SIZE, 8, EGL_ALPHA_SIZE, 8,
                                     EGL_DEPTH_SIZE, 16, EGL_NONE};
  EGLConfig config = nullptr;
  EGLint count = 0;
  if (!eglBindAPI(EGL_OPENGL_ES_API) || !eglChooseConfig(c->display, configAttributes, &config, 1, &count) ||
      count < 1) {
    fail("no GLES 1.x pbuffer config");
    destroy(c);
    return nullptr;
  }
  const EGLint contextAttributes[] = {EGL_CONTEXT_CLIENT_VERSION, 1, EGL_NONE};
  c->context = eglCreateContext(c->display, config, EGL_NO_CONTEXT, contextAttributes);
  const EGLint surfaceAttributes[] = {EGL_WIDTH, width, EGL_HEIGHT, height, EGL_NONE};
  if (c->context != EGL_NO_CONTEXT) c->surface = eglCreatePbufferSurface(c->display, config, surfaceAttributes);
  if (c->context == EGL_NO_CONTEXT || c->surface == EGL_NO_SURFACE ||
      !eglMakeCurrent(c->display, c->surface, c->surface, c->context)) {
    fail("cannot make a GLES 1.x pbuffer context current");
    destroy(c);
    return nullptr;
  }
  return c;
}

Context* fromHandle(jlong handle) { return reinterpret_cast<Context*>(static_cast<std::intptr_t>(handle)); }

}  // namespace

extern "C" {

JNIEXPORT jlong JNICALL Java_com_qn_tessel_test_EglContext_nativeCreate(JNIEnv*, jclass, jint width, jint height) {
  return static_cast<jlong>(reinterpret_cast<std::intptr_t>(create(width, height)));
}

JNIEXPORT jstring JNICALL Java_com_qn_tessel_test_EglContext_nativeLastError(JNIEnv* env, jclass) {
  jstring s = env->NewStringUTF(g_error.c_str());
  if (env->ExceptionCheck()) {
    env->ExceptionClear();
    return nullptr;
  }
  return s;
}

JNIEXPORT jstring JNICALL Java_com_qn_tessel_test_EglContext_nativeRenderer(JNIEnv* env, jclass) {
  const GLubyte* renderer = glGetString(GL_RENDERER);
  jstring s = env->NewStringUTF(renderer != nullptr ? reinterpret_cast<const char*>(renderer) : "");
  if (env->ExceptionCheck()) {
    env->ExceptionClear();
    return nullptr;
  }
  return s;
}

JNIEXPORT jbyteArray JNICALL Java_com_qn_tessel_test_EglContext_nativeReadPixels(JNIEnv* env, jclass,
                                                                                 jlong handle) {
  Context* c = fromHandle(handle);
  if (c == nullptr || eglGetCurrentContext() != c->context) return nullptr;
  const jsize n = static_cast<jsize>(c->width) * c->height * 4;
  jbyteArray out = env->NewByteArray(n);
  if (out == nullptr || env->ExceptionCheck()) {
    env->ExceptionClear();
    return nullptr;
  }
  jbyte* pixels = env->GetByteArrayElements(out, nullptr);
  if (pixels == nullptr) {
    env->ExceptionClear();
    return nullptr;
  }
  glFinish();
  glPixelStorei(GL_PACK_ALIGNMENT, 1);
  glReadPixels(0, 0, c->width, c->height, GL_RGBA, GL_UNSIGNED_BYTE, pixels);
  env->ReleaseByteArrayElements(out, pixels, 0);
  return out;
}

JNIEXPORT void JNICALL Java_com_qn_tessel_test_EglContext_nativeRelease(JNIEnv*, jclass, jlong handle) {
  Context* c = fromHandle(handle);
  if (c != nullptr) destroy(c);
}

}  // extern "C"
