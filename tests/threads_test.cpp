// The threading model under stress, meant for ThreadSanitizer (tools/run_tsan.sh) but run by
// every build: one UI thread touches, sets and reads output while one GL thread per surface
// draws frames and now and then recreates its surface, on real Mesa GLES 1.1 contexts (one per
// thread, as the app's renderers have). A second session's keyboard is drawn on a fourth GL
// thread, so the process-wide texture sets are replaced while another surface draws from them.
//
// The contexts run on Mesa's softpipe unless GALLIUM_DRIVER says otherwise: llvmpipe's shader
// JIT (LLVM) has process-wide state that TSan reports as racy when several contexts compile at
// once, and under TSan it now and then faults inside the driver with four contexts drawing.
// softpipe has no JIT, draws these small surfaces fast enough and needs no suppressions.
//
// Only the two surface-created handlers take the session lock; touches, setters, getters,
// surface changes and draw frames meet on RelaxedField members. Under TSan any plain field
// shared between these threads shows up as a data race and fails the run. Iterations are
// bounded: the GL threads draw until the UI thread is done (at least a minimum of frames,
// at most a cap), so a slow sanitized build only takes longer, never hangs.
#include <gtest/gtest.h>

#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <cstdint>
#include <cstring>
#include <functional>
#include <string>
#include <thread>
#include <vector>

#include "crypto/measure.h"
#include "input/layout.h"
#include "input/touch.h"
#include "pattern/strength.h"
#include "render/surfaces.h"
#include "session/output.h"
#include "session/session.h"
#include "session/settings.h"
#include "support/egl_context.h"

namespace tessel::test {
namespace {

// Small surfaces: llvmpipe's fill rate, not the library, bounds the frame rate.
constexpr int kWidth = 320, kHeight = 200;        // keyboard surface
constexpr int kPopWidth = 320, kPopHeight = 50;   // both pop-ups: one key row above it
constexpr int kRenderers = 4;
constexpr int kUiRounds = 1500;                   // at least, and until every renderer has
constexpr int kMinFrames = 12;                    // drawn this many frames
constexpr int kMaxUiRounds = 200000;
constexpr int kMaxFrames = 4000;
constexpr int kRecreateEvery = 5;                 // frames between surface re-creations

// A small deterministic generator per thread (the library's own sources are not for tests).
struct Lcg {
  std::uint64_t state;
  std::uint32_t next() {
    state = state * 6364136223846793005ULL + 1442695040888963407ULL;
    return static_cast<std::uint32_t>(state >> 33);
  }
  float unit() { return static_cast<float>(next() & 0xFFFFFF) / 16777216.0f; }
};

struct GlThreadReport {
  std::string error;  // context creation failure
  int frames = 0;
  int recreations = 0;
  unsigned glError = 0;
};

// Where the threads meet: renderers count themselves in once their surface exists (or failed)
// and again after kMinFrames frames; the UI thread starts after the first and keeps going until
// the second, and the renderers stop once the UI thread is done.
struct Rendezvous {
  std::atomic<int> surfacesUp{0};
  std::atomic<int> warmedUp{0};
  std::atomic<bool> uiDone{false};
};

// One renderer: its own context, created and current on this thread; `create` runs the
// surface-created (and -changed) handlers, `draw` one frame.
void runRenderer(Rendezvous& meet, int width, int height, const std::function<void(int)>& create,
                 const std::function<void(int)>& draw, GlThreadReport& report) {
  GlesContext gl(width, height);
  if (!gl.ok()) {
    report.error = gl.error();
    meet.surfacesUp.fetch_add(1);
    meet.warmedUp.fetch_add(1);
    return;
  }
  create(0);
  meet.surfacesUp.fetch_add(1);
  int frame = 0;
  for (; frame < kMaxFrames && (frame < kMinFrames || !meet.uiDone.load()); ++frame) {
    if (frame == kMinFrames) meet.warmedUp.fetch_add(1);
    if (frame > 0 && frame % kRecreateEvery == 0) {
      create(frame);
      ++report.recreations;
    }
    draw(frame);
    const GLenum e = glGetError();
    if (e != GL_NO_ERROR && report.glError == 0) report.glError = e;
  }
  if (frame <= kMinFrames) meet.warmedUp.fetch_add(1);
  glFinish();
  report.frames = frame;
}

// The UI thread's work: touches all over the keyboard (done included, which with finish mode 0
// forces a layout rebuild at the next surface creation), the setters the renderers read, and
// the output getters that unseal and reseal the content.
struct UiReport {
  int rounds = 0;
  int releases = 0;
  int doneReleases = 0;
  int outputs = 0;
  int measured = 0;
};

void runUi(KeyboardSession& s, Rendezvous& meet, UiReport& report) {
  while (meet.surfacesUp.load() < kRenderers) std::this_thread::yield();
  Lcg rng{12345};
  for (int round = 0; round < kMaxUiRounds && (round < kUiRounds || meet.warmedUp.load() < kRenderers); ++round) {
    const float x = rng.unit() * kWidth, y = rng.unit() * kHeight;
    touch(s, 0, x, y);
    if (rng.next() % 4 == 0) touch(s, 2, x + 1.0f, y);
    const int up = touch(s, 1, x, y);
    report.releases += up >= 0;
    report.doneReleases += up == 1;

    report.rounds = round + 1;
    switch (round % 11) {
      case 0: setKbdStyle(s, static_cast<std::int16_t>(rng.next() % 4)); break;
      case 1: setPopMode(s, (rng.next() & 1) != 0); break;
      case 2: setKbdMode(s, static_cast<std::int16_t>(rng.next() % 5 == 0)); break;
      case 3: setSwitchMode(s, static_cast<std::int16_t>(rng.next() % 3)); break;
      case 4: setKbdType(s, static_cast<std::int16_t>(rng.next() % 6 == 0 ? 1 + rng.next() % 2 : 0)); break;
      case 5: setKbdRandom(s, (rng.next() & 1) != 0); break;
      case 6: setFinishMode(s, static_cast<std::int16_t>(rng.next() % 4 == 0)); break;
      case 7: {
        SecureBuffer out = contentOutput(s, 48, "20240101120000");
        report.outputs += static_cast<bool>(out);
        break;
      }
      case 8: {
        report.measured += static_cast<bool>(computeMeasureValue(s));
        sessionDegree(s);
        break;
      }
      case 9: sessionVerify(s); break;
      case 10:
        if (contentLength(s) > 24) clearContent(*s.content);
        break;
    }
  }
}

TEST(Threads, UiAndRendererThreadsShareTheSession) {
  setenv("GALLIUM_DRIVER", "softpipe", 0);  // before the first EGL display is opened
  const int handle = createSession("threads");
  const int other = createSession("threads-other");
  ASSERT_GE(handle, 0);
  ASSERT_GE(other, 0);
  KeyboardSession& s = *sessionAt(handle);
  KeyboardSession& o = *sessionAt(other);
  setAccepts(s, "[[:print:]]*");
  setMaxLength(s, 32);
  setMinLength(s, 4);
  setHashRandom(s, "1:threads-salt");
  setKbdRandom(s, true);

  Rendezvous meet;
  GlThreadReport mainReport, popReport, topReport, otherReport;
  std::vector<std::thread> renderers;
  renderers.emplace_back([&] {
    runRenderer(
        meet, kWidth, kHeight,
        [&](int frame) {
          mainSurfaceCreated(s);
          mainSurfaceChanged(s, kWidth, kHeight, frame / kRecreateEvery % 3);  // variant 2: by aspect
        },
        [&](int) { mainDrawFrame(s); }, mainReport);
  });
  renderers.emplace_back([&] {
    runRenderer(
        meet, kPopWidth, kPopHeight,
        [&](int) {
          popSurfaceCreated(s);
          popSurfaceChanged(s, kPopWidth, kPopHeight);
        },
        [&](int frame) { popDrawFrame(s, frame % 3 != 0); }, popReport);
  });
  renderers.emplace_back([&] {
    runRenderer(
        meet, kPopWidth, kPopHeight,
        [&](int) {
          popTopSurfaceCreated(s);
          popTopSurfaceChanged(s, kPopWidth, kPopHeight);
        },
        [&](int) { popTopDrawFrame(s); }, topReport);
  });
  renderers.emplace_back([&] {
    runRenderer(
        meet, kWidth, kHeight,
        [&](int) {
          mainSurfaceCreated(o);
          mainSurfaceChanged(o, kWidth, kHeight, 1);
        },
        [&](int) { mainDrawFrame(o); }, otherReport);
  });

  UiReport ui;
  runUi(s, meet, ui);
  meet.uiDone.store(true);
  for (auto& t : renderers) t.join();

  const std::pair<const char*, const GlThreadReport*> reports[] = {
      {"keyboard", &mainReport}, {"pop-up", &popReport}, {"top pop-up", &topReport}, {"other keyboard", &otherReport}};
  for (const auto& [what, r] : reports) {
    SCOPED_TRACE(what);
    ASSERT_TRUE(r->error.empty()) << r->error;
    EXPECT_GE(r->frames, kMinFrames);
    EXPECT_GT(r->recreations, 0);
    EXPECT_EQ(r->glError, 0u);
  }
  std::printf("UI rounds %d (releases %d, done %d, outputs %d); frames drawn %d/%d/%d/%d, surfaces recreated %d/%d/%d/%d\n",
              ui.rounds, ui.releases, ui.doneReleases, ui.outputs, mainReport.frames, popReport.frames,
              topReport.frames, otherReport.frames, mainReport.recreations, popReport.recreations,
              topReport.recreations, otherReport.recreations);
  // The UI side did real work while the frames were drawn.
  EXPECT_GT(ui.releases, kUiRounds / 4);
  EXPECT_GT(ui.doneReleases, 0);
  EXPECT_GT(ui.outputs, 0);
  EXPECT_GT(ui.measured, 0);

  // The content stayed consistent: within maxLength, sealed at rest, printable when unsealed.
  const std::size_t length = s.content->length;
  EXPECT_LE(length, 32u);
  {
    ContentGuard guard(*s.content);
    for (std::size_t i = 0; i < length; ++i) EXPECT_GE(guard.text()[i], 0x20) << "at " << i;
    EXPECT_EQ(guard.text()[length], 0);
  }
  destroySession(handle);
  destroySession(other);
}

}  // namespace
}  // namespace tessel::test
