// Native entry points of QNKbdJniLib for the session's life, its surfaces, touches and outputs.
//
// Each method converts its managed arguments, pins the session through a SessionRef (null for
// a negative handle, one of 20 or more, or an empty slot: all refused alike, with the value the
// method documents for a bad handle), calls one session-level operation and converts the result
// back. Touches and outputs pin exclusively (the session's opLock); frames, surface callbacks
// and the length pin shared and never wait for them. Result texts arrive as SecureBuffers: the managed copy is made first, then the buffer
// goes out of scope and is wiped. No method leaves a managed exception pending, and no C++
// exception can cross into the JVM (jni::shield). The setters live in native_settings.cpp.
#include <jni.h>

#include <cmath>
#include <cstdint>

#include "crypto/error_table.h"
#include "input/touch.h"
#include "jni/jni_support.h"
#include "jni/version.h"
#include "render/surfaces.h"
#include "session/output.h"
#include "session/sealed_text.h"
#include "session/session.h"

using tessel::KeyboardSession;
using tessel::Access;
using tessel::SessionRef;
namespace jni = tessel::jni;

namespace {

// Encryption types of the two content outputs.
constexpr int kContentType = 48;
constexpr int kPinContentType = 47;

jstring contentOutputOf(JNIEnv* env, jint handle, jstring timestamp, int type) noexcept {
  if (handle < 0) return nullptr;
  jni::Utf8Chars stamp(env, timestamp);
  // A timestamp that was given but whose characters cannot be read fails the call rather than
  // being passed on as "no timestamp".
  if (timestamp != nullptr && stamp.get() == nullptr) return nullptr;
  SessionRef s(handle, Access::kExclusive);
  if (!s) return nullptr;
  return jni::shield<jstring>(nullptr, [&] {
    tessel::SecureBuffer out = tessel::contentOutput(*s, type, stamp.get());
    return jni::newJavaString(env, out);
  });
}

}  // namespace

extern "C" {

// ---- lifecycle

JNIEXPORT jint JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_createNativeSession(JNIEnv* env, jclass,
                                                                                 jstring name) {
  if (name == nullptr) return jni::kRefused;
  jni::Utf8Chars chars(env, name);
  // An unreadable name is refused like a null one: 0 would be a valid handle.
  if (chars.get() == nullptr) return jni::kRefused;
  return jni::shield<jint>(jni::kRefused, [&] { return tessel::createSession(chars.get()); });
}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_destroyNativeSession(JNIEnv*, jclass,
                                                                                  jint handle) {
  tessel::destroySession(handle);
}

// ---- keyboard surface

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeSurfaceCreated(JNIEnv*, jclass,
                                                                                     jint handle) {
  SessionRef s(handle);
  if (!s) return;
  jni::shieldVoid([&] { tessel::mainSurfaceCreated(*s); });
}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeSurfaceChanged(
    JNIEnv*, jclass, jint handle, jint width, jint height, jint variant) {
  SessionRef s(handle);
  if (!s) return;
  jni::shieldVoid([&] { tessel::mainSurfaceChanged(*s, width, height, variant); });
}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeDrawFrame(JNIEnv*, jclass,
                                                                                jint handle) {
  SessionRef s(handle);
  if (!s) return;
  jni::shieldVoid([&] { tessel::mainDrawFrame(*s); });
}

// ---- field pop-up surface

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativePopSurfaceCreated(JNIEnv*, jclass,
                                                                                        jint handle) {
  SessionRef s(handle);
  if (!s) return;
  jni::shieldVoid([&] { tessel::popSurfaceCreated(*s); });
}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativePopSurfaceChanged(
    JNIEnv*, jclass, jint handle, jint width, jint height) {
  SessionRef s(handle);
  if (!s) return;
  jni::shieldVoid([&] { tessel::popSurfaceChanged(*s, width, height); });
}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativePopDrawFrame(JNIEnv*, jclass,
                                                                                   jint handle,
                                                                                   jboolean showField) {
  SessionRef s(handle);
  if (!s) return;
  jni::shieldVoid([&] { tessel::popDrawFrame(*s, showField != JNI_FALSE); });
}

// ---- top pop-up surface

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativePopTopSurfaceCreated(JNIEnv*, jclass,
                                                                                           jint handle) {
  SessionRef s(handle);
  if (!s) return;
  jni::shieldVoid([&] { tessel::popTopSurfaceCreated(*s); });
}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativePopTopSurfaceChanged(
    JNIEnv*, jclass, jint handle, jint width, jint height) {
  SessionRef s(handle);
  if (!s) return;
  jni::shieldVoid([&] { tessel::popTopSurfaceChanged(*s, width, height); });
}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativePopTopDrawFrame(JNIEnv*, jclass,
                                                                                      jint handle) {
  SessionRef s(handle);
  if (!s) return;
  jni::shieldVoid([&] { tessel::popTopDrawFrame(*s); });
}

// ---- touches and the content

JNIEXPORT jint JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeTouchPos(JNIEnv*, jclass, jint handle,
                                                                               jint action, jfloat x,
                                                                               jfloat y) {
  // NaN passes every margin comparison and would reach the key arithmetic: refuse it here, as
  // a touch outside the surface is refused.
  if (std::isnan(x) || std::isnan(y)) return jni::kRefused;
  SessionRef s(handle, Access::kExclusive);
  if (!s) return jni::kRefused;
  return jni::shield<jint>(jni::kRefused, [&] { return tessel::touch(*s, action, x, y); });
}

JNIEXPORT jint JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_getNativeContentLen(JNIEnv*, jclass,
                                                                                 jint handle) {
  SessionRef s(handle);
  if (!s) return jni::kRefused;
  return tessel::contentLength(*s);
}

JNIEXPORT jint JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_clearNativePlaintext(JNIEnv*, jclass,
                                                                                  jint handle) {
  SessionRef s(handle, Access::kExclusive);
  if (!s) return jni::kRefused;
  tessel::clearContent(*s->content);
  return 0;
}

// ---- outputs

JNIEXPORT jstring JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_getNativeContent(JNIEnv* env, jclass,
                                                                                 jint handle,
                                                                                 jstring timestamp) {
  return contentOutputOf(env, handle, timestamp, kContentType);
}

JNIEXPORT jstring JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_getNativePinContent(JNIEnv* env, jclass,
                                                                                    jint handle,
                                                                                    jstring timestamp) {
  return contentOutputOf(env, handle, timestamp, kPinContentType);
}

JNIEXPORT jshort JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_getNativeDegree(JNIEnv*, jclass,
                                                                               jint handle) {
  SessionRef s(handle, Access::kExclusive);
  if (!s) return jni::kRefused;
  return jni::shield<jshort>(jni::kRefused, [&] {
    // The letter is a signed 8-bit value on every platform, widened with its sign.
    return static_cast<jshort>(static_cast<std::int8_t>(tessel::sessionDegree(*s)));
  });
}

JNIEXPORT jint JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_getNativeVerify(JNIEnv*, jclass, jint handle) {
  SessionRef s(handle, Access::kExclusive);
  if (!s) return jni::kRefused;
  // -4 is what verification reports when its rule cannot be built.
  return jni::shield<jint>(-4, [&] { return tessel::sessionVerify(*s); });
}

// The version answers for any non-negative handle, live session or not.
JNIEXPORT jlong JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_getNativeVersion(JNIEnv*, jclass, jint handle) {
  return handle < 0 ? jlong{jni::kRefused} : jlong{TESSEL_VERSION_NUMBER};
}

JNIEXPORT jstring JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_getNativeStringVersion(JNIEnv* env, jclass,
                                                                                       jint handle) {
  if (handle < 0) return nullptr;
  return jni::newJavaString(env, TESSEL_VERSION_TEXT);
}

JNIEXPORT jstring JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_getNativeLastError(JNIEnv* env, jclass,
                                                                                   jint handle) {
  SessionRef s(handle, Access::kExclusive);
  if (!s) return nullptr;
  return jni::newJavaString(env, tessel::lastErrorText(s->content->lastError));
}

JNIEXPORT jbyteArray JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_getNativeEncryptedPinCode(JNIEnv* env,
                                                                                             jclass,
                                                                                             jint handle) {
  SessionRef s(handle, Access::kExclusive);
  if (!s) return nullptr;
  return jni::shield<jbyteArray>(nullptr, [&] {
    tessel::SecureBuffer code = tessel::encryptedPinCode(*s);
    return jni::newJavaBytes(env, code);
  });
}

JNIEXPORT jstring JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_getNativeMeasureValue(JNIEnv* env, jclass,
                                                                                      jint handle) {
  SessionRef s(handle, Access::kExclusive);
  if (!s) return nullptr;
  return jni::shield<jstring>(nullptr, [&] {
    tessel::SecureBuffer value = tessel::computeMeasureValue(*s);
    return jni::newJavaString(env, value);
  });
}

}  // extern "C"
