// Any entry point from any thread. The real native entry points are compiled into this suite and
// called, by handle, from several threads through a minimal in-process JNIEnv, with GL surfaces
// on real Mesa GLES 1.1 contexts. The test command runs it in the release build, under
// ASan+UBSan and under TSan (tools/run_tsan.sh): a use after free, a data race, a torn seal or a
// lost character fails the run. Every loop is bounded by a count, never by the clock alone.
//
// The contexts run on Mesa's softpipe unless GALLIUM_DRIVER says otherwise: llvmpipe's shader
// JIT has process-wide state that TSan reports when several contexts compile at once.
#include <gtest/gtest.h>

#include <jni.h>

#include <algorithm>
#include <atomic>
#include <cstdlib>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "com_qn_tessel_plugin_QNKbdJniLib.h"
#include "server/password_check.h"
#include "session/session.h"
#include "common/egl_pbuffer.h"
#include "support/openssl_oracle.h"

#define JNI(method) Java_com_qn_tessel_plugin_QNKbdJniLib_##method

namespace tessel { extern std::int32_t (*cursorClockMicros)(); }

namespace tessel::test {
namespace {

using host::GlesContext;

// ---- a JNIEnv with only what the entry points call: strings and byte arrays as plain objects

struct FakeString {
  std::string text;
};
struct FakeBytes {
  std::vector<jbyte> bytes;
};

const char* JNICALL getUtf(JNIEnv*, jstring s, jboolean* copy) {
  if (copy != nullptr) *copy = JNI_FALSE;
  return reinterpret_cast<FakeString*>(s)->text.c_str();
}
void JNICALL releaseUtf(JNIEnv*, jstring, const char*) {}
jstring JNICALL newUtf(JNIEnv*, const char* utf) { return reinterpret_cast<jstring>(new FakeString{utf}); }
jboolean JNICALL noException(JNIEnv*) { return JNI_FALSE; }
void JNICALL clearException(JNIEnv*) {}
jsize JNICALL arrayLength(JNIEnv*, jarray a) {
  return static_cast<jsize>(reinterpret_cast<FakeBytes*>(a)->bytes.size());
}
jbyte* JNICALL byteElements(JNIEnv*, jbyteArray a, jboolean*) { return reinterpret_cast<FakeBytes*>(a)->bytes.data(); }
void JNICALL releaseByteElements(JNIEnv*, jbyteArray, jbyte*, jint) {}
jbyteArray JNICALL newBytes(JNIEnv*, jsize n) {
  return reinterpret_cast<jbyteArray>(new FakeBytes{std::vector<jbyte>(static_cast<std::size_t>(n))});
}
void JNICALL setBytes(JNIEnv*, jbyteArray a, jsize start, jsize n, const jbyte* from) {
  std::copy(from, from + n, reinterpret_cast<FakeBytes*>(a)->bytes.begin() + start);
}
void JNICALL deleteRef(JNIEnv*, jobject o) { delete reinterpret_cast<FakeBytes*>(o); }

JNIEnv* env() {
  static const JNINativeInterface_ table = [] {
    JNINativeInterface_ t{};
    t.GetStringUTFChars = getUtf;
    t.ReleaseStringUTFChars = releaseUtf;
    t.NewStringUTF = newUtf;
    t.ExceptionCheck = noException;
    t.ExceptionClear = clearException;
    t.GetArrayLength = arrayLength;
    t.GetByteArrayElements = byteElements;
    t.ReleaseByteArrayElements = releaseByteElements;
    t.NewByteArray = newBytes;
    t.SetByteArrayRegion = setBytes;
    t.DeleteLocalRef = deleteRef;
    return t;
  }();
  static JNIEnv e{&table};
  return &e;
}

// A managed-side string argument, alive for the call.
struct Arg {
  FakeString value;
  explicit Arg(std::string s) : value{std::move(s)} {}
  operator jstring() { return reinterpret_cast<jstring>(&value); }  // NOLINT: argument sugar
};

std::optional<std::string> take(jstring s) {
  if (s == nullptr) return std::nullopt;
  std::unique_ptr<FakeString> owned(reinterpret_cast<FakeString*>(s));
  return owned->text;
}

bool takeBytes(jbyteArray a) {
  std::unique_ptr<FakeBytes> owned(reinterpret_cast<FakeBytes*>(a));
  return owned != nullptr && !owned->bytes.empty();
}

// ---- the app's side

constexpr int kWidth = 320, kHeight = 200;  // keys 32 x 50 pixels

int openKeyboard(const std::string& name) {
  const int h = JNI(createNativeSession)(env(), nullptr, Arg(name));
  JNI(setNativeAccepts)(env(), nullptr, h, Arg("[[:print:]]*"));
  JNI(setNativeMaxLength)(env(), nullptr, h, 64);
  FakeBytes code{{'c', 'o', 'd', 'e'}};
  JNI(setNativeChallengeCode)(env(), nullptr, h, reinterpret_cast<jbyteArray>(&code));
  return h;
}

// All three surfaces of a keyboard in the current context (created, changed).
void createSurfaces(int h) {
  JNI(setNativeSurfaceCreated)(env(), nullptr, h);
  JNI(setNativeSurfaceChanged)(env(), nullptr, h, kWidth, kHeight, 1);
  JNI(setNativePopSurfaceCreated)(env(), nullptr, h);
  JNI(setNativePopSurfaceChanged)(env(), nullptr, h, kWidth, kHeight / 4);
  JNI(setNativePopTopSurfaceCreated)(env(), nullptr, h);
  JNI(setNativePopTopSurfaceChanged)(env(), nullptr, h, kWidth, kHeight / 4);
}

void drawAll(int h, int frame) {
  JNI(setNativeDrawFrame)(env(), nullptr, h);
  JNI(setNativePopDrawFrame)(env(), nullptr, h, frame % 2 == 0);
  JNI(setNativePopTopDrawFrame)(env(), nullptr, h);
}

// Taps the top-row key of the unshuffled letter keyboard that holds c (one of "qwertyuiop").
int tap(int h, char c) {
  const float x = (static_cast<float>(std::string("qwertyuiop").find(c)) + 0.5f) * kWidth / 10.0f;
  const float y = 0.5f * kHeight / 4.0f;
  JNI(setNativeTouchPos)(env(), nullptr, h, 0, x, y);
  return JNI(setNativeTouchPos)(env(), nullptr, h, 1, x, y);
}

std::optional<std::string> measure(int h) { return take(JNI(getNativeMeasureValue)(env(), nullptr, h)); }

// Every getter once; returns the measure value.
std::optional<std::string> everyGetter(int h) {
  take(JNI(getNativeContent)(env(), nullptr, h, Arg("2026-11-23 12:00:00")));
  take(JNI(getNativePinContent)(env(), nullptr, h, nullptr));
  takeBytes(JNI(getNativeEncryptedPinCode)(env(), nullptr, h));
  JNI(getNativeDegree)(env(), nullptr, h);
  JNI(getNativeVerify)(env(), nullptr, h);
  JNI(getNativeContentLen)(env(), nullptr, h);
  take(JNI(getNativeLastError)(env(), nullptr, h));
  return measure(h);
}

void destroyAll() {
  for (int h = 0; h < kSessionSlots; ++h) JNI(destroyNativeSession)(env(), nullptr, h);
}

// A GL thread: draws the three surfaces of whatever handle `target` holds, re-creating them now
// and then and whenever `shown` is set (a new keyboard in the slot), until `stop`; counts frames.
struct Renderer {
  std::atomic<int> target{-1};
  std::atomic<bool> shown{false};
  std::atomic<bool> stop{false};
  std::atomic<int> frames{0};
  unsigned glError = 0;
  std::string contextError;
  std::thread thread;

  void start() {
    thread = std::thread([this] {
      GlesContext gl(kWidth, kHeight);
      if (!gl.ok()) {
        contextError = gl.error();
        return;
      }
      for (int frame = 0; !stop.load() && frame < 200000; ++frame) {
        const int h = target.load();
        if (frame % 16 == 0 || shown.exchange(false)) createSurfaces(h);
        drawAll(h, frame);
        if (const GLenum e = glGetError(); e != GL_NO_ERROR && glError == 0) glError = e;
        frames.fetch_add(1);
      }
    });
  }
  void show(int h) {
    target.store(h);
    shown.store(true);
    waitFrames(2);
  }
  void waitFrames(int n) const {
    const int until = frames.load() + n;
    while (frames.load() < until && contextError.empty()) std::this_thread::yield();
  }
  void finish() {
    stop.store(true);
    thread.join();
    EXPECT_TRUE(contextError.empty()) << contextError;
    EXPECT_EQ(glError, 0u);
  }
};

class AnyThread : public ::testing::Test {
 protected:
  static void SetUpTestSuite() { setenv("GALLIUM_DRIVER", "softpipe", 0); }
  void SetUp() override { destroyAll(); }
  void TearDown() override { destroyAll(); }
};

// The app never destroys: the 21st distinct create evicts the keyboard being drawn.
TEST_F(AnyThread, EvictionWhileDrawing) {
  Renderer gl;
  gl.start();
  for (int round = 0; round < 6; ++round) {
    gl.show(openKeyboard("visible"));
    for (int k = 0; k < 25; ++k) openKeyboard("other-" + std::to_string(k));
    EXPECT_NE(JNI(createNativeSession)(env(), nullptr, Arg("visible")), -1);
    gl.waitFrames(2);
    destroyAll();
  }
  gl.finish();
}

// Destroy and re-create while one thread types and another draws the same handle.
TEST_F(AnyThread, DestroyWhileTypingOrDrawing) {
  Renderer gl;
  gl.start();
  gl.show(openKeyboard("typed"));
  std::atomic<bool> stop{false};
  std::atomic<int> taps{0};
  std::thread typist([&] {
    for (int k = 0; !stop.load() && k < 400000; ++k) taps += tap(gl.target.load(), "qwertyuiop"[k % 10]) >= 0;
  });
  for (int round = 0; round < 16; ++round) {
    const int h = gl.target.load();
    JNI(destroyNativeSession)(env(), nullptr, h);
    EXPECT_EQ(JNI(getNativeContentLen)(env(), nullptr, h), -1) << "a call after destroy finds nothing";
    gl.show(openKeyboard("typed"));
  }
  stop.store(true);
  typist.join();
  gl.finish();
  EXPECT_GT(taps.load(), 0);
}

// Typing while two threads call every getter: each measure value is the MD5 of what had been
// typed so far, and at the end the text is whole. With an unguarded seal, overlapping
// operations re-seal each other's work and the stored text changes for good.
TEST_F(AnyThread, TwoReadersAtOnceLoseNothing) {
  const std::string text = "pqowieurytqp";
  std::set<std::string> prefixes;
  for (std::size_t n = 1; n <= text.size(); ++n) prefixes.insert(opensslMd5Hex(text.substr(0, n)));

  GlesContext gl(kWidth, kHeight);
  ASSERT_TRUE(gl.ok()) << gl.error();
  const int h = openKeyboard("readers");
  JNI(setNativeHashRandom)(env(), nullptr, h, Arg("1:stress-salt"));
  createSurfaces(h);
  std::atomic<bool> typed{false};
  std::atomic<int> wrong{0}, reads{0};
  auto reader = [&] {
    for (int k = 0; k < 30000 && !(typed.load() && k > 2000); ++k) {
      const std::optional<std::string> value = k % 8 == 0 ? everyGetter(h) : measure(h);
      reads.fetch_add(1);
      if (value && prefixes.count(*value) == 0) wrong.fetch_add(1);
    }
  };
  std::thread a(reader), b(reader);
  for (char c : text) {
    EXPECT_EQ(tap(h, c), 0);
    std::this_thread::yield();
  }
  typed.store(true);
  a.join();
  b.join();
  EXPECT_EQ(wrong.load(), 0) << "of " << reads.load() << " reads";
  EXPECT_EQ(JNI(getNativeContentLen)(env(), nullptr, h), static_cast<jint>(text.size()));
  EXPECT_EQ(measure(h), opensslMd5Hex(text));

  // The backend gets the salted value of exactly that text.
  server::PrivateKey key;
  std::string error;
  ASSERT_TRUE(key.loadPemFile(dataPath("builtin_default_key.pem"), &error)) << error;
  server::OpenKeys keys;
  keys.app = &key;
  server::Opened opened;
  const std::optional<std::string> envelope = take(JNI(getNativeContent)(env(), nullptr, h, Arg("ts")));
  ASSERT_TRUE(envelope);
  ASSERT_TRUE(server::openOutput(48, *envelope, keys, &opened, &error)) << error;
  EXPECT_EQ(opened.payload, server::saltedHashValue(text, "stress-salt", 'S'));
  releaseOwnedText(sessionAt(h)->content->hashRandomSuffix);  // destroy keeps it by design
}

// Texture sets belong to their keyboard and their context. In one context two keyboards each
// draw their own layout, and surfaces made again replace their textures rather than add to them.
// Made in another context, a keyboard's sets leave their old names alone (there the numbers are
// another keyboard's), and never delete names another keyboard's set holds (a new context may get
// a destroyed one's handle back). Each keyboard's field pop-up draws from its own set.
TEST_F(AnyThread, TexturesBelongToTheirKeyboardAndContext) {
  const auto clock = cursorClockMicros;
  cursorClockMicros = [] { static std::int32_t micros = 0; return ++micros; };  // the cursor keeps its phase
  GlesContext x(kWidth, kHeight), y(kWidth, kHeight);
  ASSERT_TRUE(x.ok() && y.ok()) << x.error() << y.error();
  const int a = openKeyboard("keyboard-a"), b = openKeyboard("keyboard-b");
  JNI(setNativeKbdRandom)(env(), nullptr, b, JNI_TRUE);
  auto frame = [&](GlesContext& gl, int h) { return gl.makeCurrent(), JNI(setNativeDrawFrame)(env(), nullptr, h), gl.readRgba(); };
  auto field = [&](GlesContext& gl, int h) {
    gl.makeCurrent();
    JNI(setNativePopSurfaceChanged)(env(), nullptr, h, kWidth, kHeight);
    return JNI(setNativePopDrawFrame)(env(), nullptr, h, JNI_TRUE), gl.readRgba();
  };
  auto live = [] { int n = 0; for (GLuint k = 1; k < 2048; ++k) n += glIsTexture(k); return n; };
  x.makeCurrent();
  createSurfaces(a);
  const std::vector<std::uint8_t> fieldA = field(x, a);
  y.makeCurrent();  // b's field pop-up first: its names here are the numbers of a's keyboard in x
  JNI(setNativePopSurfaceCreated)(env(), nullptr, b);
  JNI(setNativePopTopSurfaceCreated)(env(), nullptr, b);
  EXPECT_EQ(field(x, a), fieldA) << "keyboard a's field pop-up draws with keyboard b's names";
  y.makeCurrent();
  GLuint own = 0;  // the app's own texture in y, numbered like one of a's in x
  glGenTextures(1, &own), glBindTexture(GL_TEXTURE_2D, own);
  createSurfaces(a);
  EXPECT_TRUE(glIsTexture(own)) << "keyboard a deleted its names of context x in context y";
  const int once = live();
  for (int k = 0; k < 3; ++k) createSurfaces(a);
  EXPECT_EQ(live(), once) << "made again, the surfaces keep their old textures too";
  const std::vector<std::uint8_t> alone = frame(y, a);
  createSurfaces(b);
  ASSERT_NE(frame(y, b), alone) << "keyboard b is not shuffled";
  EXPECT_EQ(frame(y, a), alone) << "keyboard a shows keyboard b's keys";
  PopTextureSet& stale = sessionAt(b)->popTextures;  // stamped with y, holding a's numbers
  const PopTextureSet& held = sessionAt(a)->popTextures;
  stale.background = held.background, stale.frame = held.frame, stale.dot = held.dot;
  stale.cursor = held.cursor, stale.balloon = held.balloon;
  const std::vector<std::uint8_t> fieldAinY = field(y, a);
  JNI(setNativePopSurfaceCreated)(env(), nullptr, b);
  EXPECT_EQ(field(y, a), fieldAinY) << "a set deleted names that another set holds";
  cursorClockMicros = clock;
}

}  // namespace
}  // namespace tessel::test
