// Conversions shared by the native entry points of com.qn.tessel.plugin.QNKbdJniLib.
//
// Private to src/jni: nothing here is exported (exports.map keeps only the Java_* names global).
// Every helper is written so that no managed exception is ever left pending when an entry point
// returns: a JNI call that can throw (string and array allocation, UTF-8 extraction) is followed
// by ExceptionCheck/ExceptionClear, and the entry point reports the failure through its own
// documented result (null, 0 or -1) instead.
#pragma once

#include <jni.h>

#include <cstddef>

#include "crypto/secure_buffer.h"

namespace tessel::jni {

// Result of a refused call, for the entry points that return something.
constexpr jint kRefused = -1;

// True, after clearing it, when the last JNI call left an exception pending.
inline bool clearPendingException(JNIEnv* env) noexcept {
  if (env->ExceptionCheck() == JNI_FALSE) return false;
  env->ExceptionClear();
  return true;
}

// The modified UTF-8 characters of a managed string, released on scope exit.
// get() is null when the reference is null or the characters could not be obtained (the
// platform's OutOfMemoryError is cleared, not propagated).
class Utf8Chars {
 public:
  Utf8Chars(JNIEnv* env, jstring s) noexcept : env_(env), string_(s) {
    if (s == nullptr) return;
    chars_ = env->GetStringUTFChars(s, nullptr);
    if (chars_ == nullptr) clearPendingException(env);
  }
  ~Utf8Chars() {
    if (chars_ != nullptr) env_->ReleaseStringUTFChars(string_, chars_);
  }
  Utf8Chars(const Utf8Chars&) = delete;
  Utf8Chars& operator=(const Utf8Chars&) = delete;

  const char* get() const noexcept { return chars_; }

 private:
  JNIEnv* env_;
  jstring string_;
  const char* chars_ = nullptr;
};

// A managed string holding the text of `text` (read with c_str()); null when `text` is absent
// or the string cannot be made. The caller's buffer is wiped when it goes out of scope.
inline jstring newJavaString(JNIEnv* env, const SecureBuffer& text) noexcept {
  if (!text) return nullptr;
  jstring s = env->NewStringUTF(text.c_str());
  if (clearPendingException(env)) return nullptr;
  return s;
}

inline jstring newJavaString(JNIEnv* env, const char* text) noexcept {
  if (text == nullptr) return nullptr;
  jstring s = env->NewStringUTF(text);
  if (clearPendingException(env)) return nullptr;
  return s;
}

// A managed byte[] with the payload bytes of `bytes` (no terminator); null when absent, when
// the payload does not fit a Java array, or when the array cannot be made.
inline jbyteArray newJavaBytes(JNIEnv* env, const SecureBuffer& bytes) noexcept {
  if (!bytes) return nullptr;
  if (bytes.size() > static_cast<std::size_t>(0x7fffffff)) return nullptr;
  const jsize n = static_cast<jsize>(bytes.size());
  jbyteArray array = env->NewByteArray(n);
  if (array == nullptr || clearPendingException(env)) return nullptr;
  env->SetByteArrayRegion(array, 0, n, reinterpret_cast<const jbyte*>(bytes.data()));
  if (clearPendingException(env)) {
    env->DeleteLocalRef(array);
    return nullptr;
  }
  return array;
}

// Runs `body` and turns any C++ exception into `fallback`, so that nothing can unwind through
// the JVM's frames (which would abort the process).
template <typename R, typename F>
inline R shield(R fallback, F&& body) noexcept {
  try {
    return body();
  } catch (...) {
    return fallback;
  }
}

template <typename F>
inline void shieldVoid(F&& body) noexcept {
  try {
    body();
  } catch (...) {
  }
}

}  // namespace tessel::jni
