// Test-only JNI helper (in libtessel_jvm_helpers.so): the encryption dispatcher of the core that
// libTesselVIP.so is built from, so the JVM suite can make every type 0..90 (the 51 native
// methods only ever pass 47 and 48; null when it refuses), and the deployment's type-68 master keys.
#include <jni.h>

#include "output/dispatch_payloads.h"
#include "output/dispatcher.h"

namespace {

struct Utf {
  JNIEnv* env;
  jstring s;
  const char* chars;
  Utf(JNIEnv* e, jstring str) : env(e), s(str), chars(str ? e->GetStringUTFChars(str, nullptr) : nullptr) {}
  ~Utf() {
    if (chars) env->ReleaseStringUTFChars(s, chars);
  }
};

}  // namespace

extern "C" JNIEXPORT jstring JNICALL Java_com_qn_tessel_test_OutputTests_dispatch(
    JNIEnv* env, jclass, jint type, jstring app, jstring enc, jstring text, jstring timestamp) {
  const Utf a(env, app), e(env, enc), t(env, text), ts(env, timestamp);
  const char* const keys[2] = {a.chars, e.chars};
  tessel::SecureBuffer out;
  if (tessel::encryptionDispatch(type, keys, &out, t.chars, ts.chars) != 0) return nullptr;
  return env->NewStringUTF(out.c_str());
}

extern "C" JNIEXPORT jbyteArray JNICALL Java_com_qn_tessel_test_OutputTests_masterPinKey(JNIEnv* env, jclass, jchar selector) {
  tessel::SecureBuffer key;
  if (tessel::masterPinKey(static_cast<char>(selector), &key) != 0) return nullptr;
  jbyteArray out = env->NewByteArray(16);
  if (out) env->SetByteArrayRegion(out, 0, 16, reinterpret_cast<const jbyte*>(key.data()));
  return out;
}
