// Test-only JNI helper (in libtessel_jvm_helpers.so): an offscreen OpenGL ES 1.1 context for the
// JVM suite, so the keyboard's surface callbacks run from Java exactly as an app's GL renderer
// thread runs them, and the frame can be read back into Java.
//
// com.qn.tessel.test.EglContext calls these on its GL thread: create() makes the same Mesa
// surfaceless context and pbuffer the C++ suites use (tools/common/egl_pbuffer.h) current on
// the calling thread, or returns 0 with the reason in lastError(); readPixels() returns the RGBA
// bytes of the pbuffer, top row first (null on failure); release() destroys it.
#include <jni.h>

#include <cstdint>
#include <new>
#include <string>
#include <vector>

#include "common/egl_pbuffer.h"

using tessel::host::GlesContext;

static thread_local std::string g_error;

static GlesContext* fromHandle(jlong handle) { return reinterpret_cast<GlesContext*>(static_cast<std::intptr_t>(handle)); }

extern "C" {

JNIEXPORT jlong JNICALL Java_com_qn_tessel_test_EglContext_nativeCreate(JNIEnv*, jclass, jint width, jint height) {
  auto* c = width > 0 && height > 0 ? new (std::nothrow) GlesContext(width, height) : nullptr;
  g_error = c == nullptr ? "bad size or no memory" : c->ok() ? "" : c->error();
  if (c != nullptr && !c->ok()) {
    delete c;
    c = nullptr;
  }
  return static_cast<jlong>(reinterpret_cast<std::intptr_t>(c));
}

JNIEXPORT jstring JNICALL Java_com_qn_tessel_test_EglContext_nativeLastError(JNIEnv* env, jclass) {
  return env->NewStringUTF(g_error.c_str());
}

JNIEXPORT jbyteArray JNICALL Java_com_qn_tessel_test_EglContext_nativeReadPixels(JNIEnv* env, jclass, jlong handle) {
  GlesContext* c = fromHandle(handle);
  if (c == nullptr || !c->makeCurrent()) return nullptr;
  glFinish();
  const std::vector<std::uint8_t> rgba = c->readRgba();
  jbyteArray out = env->NewByteArray(static_cast<jsize>(rgba.size()));
  if (out != nullptr)
    env->SetByteArrayRegion(out, 0, static_cast<jsize>(rgba.size()), reinterpret_cast<const jbyte*>(rgba.data()));
  return out;  // null with OutOfMemoryError pending when the array could not be made
}

JNIEXPORT void JNICALL Java_com_qn_tessel_test_EglContext_nativeRelease(JNIEnv*, jclass, jlong handle) {
  delete fromHandle(handle);
  eglReleaseThread();
}

}  // extern "C"
