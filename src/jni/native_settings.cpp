// Native entry points of QNKbdJniLib that configure a session (the setters and public keys).
//
// Same contract as native_session.cpp: the handle is pinned exclusively through a SessionRef
// (no setter replaces a string while an operation reads it) and a bad one (negative, 20 or
// more, or an empty slot) makes the call return at once, 0 for the public-key
// methods. A string argument that is null, or whose characters cannot be obtained, does the
// same; the characters are released before returning. Managed types are narrowed here exactly
// once: a jbyte keeps its low 8 bits with their sign, a jshort its 16 bits with their sign, a
// jboolean becomes true/false. Validation of the values belongs to session/settings.cpp.
#include <jni.h>

#include <cstdint>

#include "crypto/secure_buffer.h"
#include "jni/jni_support.h"
#include "session/session.h"
#include "session/settings.h"

using tessel::KeyboardSession;
using tessel::Access;
using tessel::SessionRef;
namespace jni = tessel::jni;

namespace {

constexpr jint kNotStored = 0;

// Runs op(session, chars) for a live session and a readable string and returns its result, or
// `refused` without running it (and when it throws).
template <typename R, typename Op>
R withText(JNIEnv* env, jint handle, jstring text, R refused, Op op) noexcept {
  if (text == nullptr || handle < 0) return refused;
  jni::Utf8Chars chars(env, text);
  if (chars.get() == nullptr) return refused;
  SessionRef s(handle, Access::kExclusive);
  if (!s) return refused;
  return jni::shield<R>(refused, [&] { return static_cast<R>(op(*s, chars.get())); });
}

// The setters that report nothing.
template <typename Op>
void withText(JNIEnv* env, jint handle, jstring text, Op op) noexcept {
  withText(env, handle, text, false, [&op](KeyboardSession& s, const char* t) {
    op(s, t);
    return true;
  });
}

// The public-key setters, which report 1 (taken) or 0 (refused).
template <typename Op>
jint keyText(JNIEnv* env, jint handle, jstring text, Op op) noexcept {
  return withText(env, handle, text, kNotStored, op);
}

template <typename Op>
void withSession(jint handle, Op op) noexcept {
  SessionRef s(handle, Access::kExclusive);
  if (!s) return;
  jni::shieldVoid([&] { op(*s); });
}

inline bool flag(jboolean b) noexcept { return b != JNI_FALSE; }
inline std::int16_t bits16(jshort v) noexcept { return static_cast<std::int16_t>(v); }

}  // namespace

extern "C" {

// ---- limits, pattern and keyboard appearance

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeAccepts(JNIEnv* env, jclass,
                                                                              jint handle, jstring pattern) {
  withText(env, handle, pattern, [](KeyboardSession& s, const char* t) { tessel::setAccepts(s, t); });
}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeMinLength(JNIEnv*, jclass, jint handle,
                                                                                jshort n) {
  withSession(handle, [n](KeyboardSession& s) { tessel::setMinLength(s, bits16(n)); });
}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeMaxLength(JNIEnv*, jclass, jint handle,
                                                                                jshort n) {
  withSession(handle, [n](KeyboardSession& s) { tessel::setMaxLength(s, bits16(n)); });
}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeKbdRandom(JNIEnv*, jclass, jint handle,
                                                                                jboolean on) {
  withSession(handle, [on](KeyboardSession& s) { tessel::setKbdRandom(s, flag(on)); });
}

// Kept for the managed interface: vibration is the app's business.
JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeKbdVibrator(JNIEnv*, jclass, jint,
                                                                                  jint) {}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeKbdType(JNIEnv*, jclass, jint handle,
                                                                              jshort type) {
  withSession(handle, [type](KeyboardSession& s) { tessel::setKbdType(s, bits16(type)); });
}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeKbdStyle(JNIEnv*, jclass, jint handle,
                                                                               jshort style) {
  withSession(handle, [style](KeyboardSession& s) { tessel::setKbdStyle(s, bits16(style)); });
}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeKbdMode(JNIEnv*, jclass, jint handle,
                                                                              jshort mode) {
  withSession(handle, [mode](KeyboardSession& s) { tessel::setKbdMode(s, bits16(mode)); });
}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativePopMode(JNIEnv*, jclass, jint handle,
                                                                              jboolean on) {
  withSession(handle, [on](KeyboardSession& s) { tessel::setPopMode(s, flag(on)); });
}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeSwitchMode(JNIEnv*, jclass, jint handle,
                                                                                 jshort mode) {
  withSession(handle, [mode](KeyboardSession& s) { tessel::setSwitchMode(s, bits16(mode)); });
}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeFinishMode(JNIEnv*, jclass, jint handle,
                                                                                 jshort mode) {
  withSession(handle, [mode](KeyboardSession& s) { tessel::setFinishMode(s, bits16(mode)); });
}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeMode(JNIEnv*, jclass, jint handle,
                                                                           jshort mode) {
  withSession(handle, [mode](KeyboardSession& s) { tessel::setMode(s, bits16(mode)); });
}

// ---- output settings

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeEncryptType(JNIEnv*, jclass,
                                                                                  jint handle, jbyte type) {
  withSession(handle, [type](KeyboardSession& s) { tessel::setEncryptType(s, static_cast<std::int8_t>(type)); });
}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeContentType(JNIEnv*, jclass,
                                                                                  jint handle, jint type) {
  withSession(handle, [type](KeyboardSession& s) { tessel::setContentType(s, static_cast<std::int32_t>(type)); });
}

// The code is taken up to its first zero byte or the end of the array, whichever comes first,
// and only when its first byte is non-zero. The array's elements are released (without copying
// back) as soon as the library holds its own copy.
JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeChallengeCode(JNIEnv* env, jclass,
                                                                                    jint handle,
                                                                                    jbyteArray code) {
  if (handle < 0 || code == nullptr) return;
  const jsize n = env->GetArrayLength(code);
  if (jni::clearPendingException(env) || n <= 0) return;
  jbyte* elements = env->GetByteArrayElements(code, nullptr);
  if (elements == nullptr) {
    jni::clearPendingException(env);
    return;
  }
  // The managed array carries no terminator: the copy adds one. It is made before the session
  // is pinned, so no JNI call runs while the session's opLock is held.
  tessel::SecureBuffer text;
  if (elements[0] != 0) text = tessel::SecureBuffer::copyOf(elements, static_cast<std::size_t>(n));
  env->ReleaseByteArrayElements(code, elements, JNI_ABORT);
  if (!text) return;
  SessionRef s(handle, Access::kExclusive);
  if (!s) return;
  jni::shieldVoid([&] { tessel::setChallengeCode(*s, text.c_str()); });
}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeKbdFactor(JNIEnv* env, jclass,
                                                                                jint handle, jstring text) {
  withText(env, handle, text, [](KeyboardSession& s, const char* t) { tessel::setKbdFactor(s, t); });
}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeAlgorithmCode(JNIEnv* env, jclass,
                                                                                    jint handle, jstring text) {
  withText(env, handle, text, [](KeyboardSession& s, const char* t) { tessel::setAlgorithmCode(s, t); });
}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeHashRandom(JNIEnv* env, jclass,
                                                                                 jint handle, jstring text) {
  withText(env, handle, text, [](KeyboardSession& s, const char* t) { tessel::setHashRandom(s, t); });
}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeDictionaryFilter(JNIEnv* env, jclass,
                                                                                       jint handle,
                                                                                       jstring text) {
  withText(env, handle, text, [](KeyboardSession& s, const char* t) { tessel::setDictionaryFilter(s, t); });
}

// ---- public keys

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeAppPlat(JNIEnv* env, jclass,
                                                                              jint handle, jstring key,
                                                                              jboolean isDer) {
  withText(env, handle, key, [isDer](KeyboardSession& s, const char* t) { tessel::setAppPlat(s, t, flag(isDer)); });
}

JNIEXPORT void JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativeEncryPlat(JNIEnv* env, jclass,
                                                                                jint handle, jstring key,
                                                                                jboolean isDer) {
  withText(env, handle, key,
           [isDer](KeyboardSession& s, const char* t) { tessel::setEncryPlat(s, t, flag(isDer)); });
}

JNIEXPORT jint JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativePublicKeyAppModulus(JNIEnv* env, jclass,
                                                                                          jint handle,
                                                                                          jstring hex) {
  return keyText(env, handle, hex, [](KeyboardSession& s, const char* t) {
    tessel::setAppPlat(s, t, false);
    return 1;
  });
}

JNIEXPORT jint JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativePublicKeyAppDER(JNIEnv* env, jclass,
                                                                                      jint handle,
                                                                                      jstring der) {
  return keyText(env, handle, der, [](KeyboardSession& s, const char* t) {
    tessel::setAppPlat(s, t, true);
    return 1;
  });
}

JNIEXPORT jint JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativePublicKeyAppBlob(JNIEnv* env, jclass,
                                                                                       jint handle,
                                                                                       jstring blob) {
  return keyText(env, handle, blob,
                 [](KeyboardSession& s, const char* t) { return tessel::setAppPlatBlob(s, t); });
}

JNIEXPORT jint JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativePublicKeyModulus(JNIEnv* env, jclass,
                                                                                       jint handle,
                                                                                       jstring hex) {
  return keyText(env, handle, hex, [](KeyboardSession& s, const char* t) {
    tessel::setEncryPlat(s, t, false);
    return 1;
  });
}

JNIEXPORT jint JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativePublicKeyDER(JNIEnv* env, jclass,
                                                                                   jint handle, jstring der) {
  return keyText(env, handle, der, [](KeyboardSession& s, const char* t) {
    tessel::setEncryPlat(s, t, true);
    return 1;
  });
}

JNIEXPORT jint JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativePublicKeyBlob(JNIEnv* env, jclass,
                                                                                    jint handle,
                                                                                    jstring blob) {
  return keyText(env, handle, blob,
                 [](KeyboardSession& s, const char* t) { return tessel::setEncryPlatBlob(s, t); });
}

JNIEXPORT jint JNICALL Java_com_qn_tessel_plugin_QNKbdJniLib_setNativePublicKeyECC(JNIEnv* env, jclass,
                                                                                   jint handle, jstring x,
                                                                                   jstring y) {
  if (x == nullptr || y == nullptr) return kNotStored;
  jni::Utf8Chars xChars(env, x);
  if (xChars.get() == nullptr) return kNotStored;
  jni::Utf8Chars yChars(env, y);
  if (yChars.get() == nullptr) return kNotStored;
  SessionRef s(handle, Access::kExclusive);
  if (!s) return kNotStored;
  return jni::shield<jint>(kNotStored, [&] { return tessel::setEccKey(*s, xChars.get(), yChars.get()); });
}

}  // extern "C"
