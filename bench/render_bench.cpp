// One keyboard frame on Mesa's llvmpipe (GLES 1.1, offscreen 1080 x 720): frames per second
// including glFinish, set against the library's own CPU time per frame. And start-up: for the
// keyboard and both pop-ups, the time from surface created to the first drawn frame (layout
// build, texture upload, geometry, one frame, glFinish) on a fresh context, with the library's
// own CPU share of it and the pixel bytes it uploads. And the memory that 300 re-creations of
// the three surfaces in one context leave behind.
//
// To tell the library's cost apart from the driver's, this program interposes the GL entry
// points a frame uses: the library (linked statically) calls these definitions, which count
// the call and forward it to the real driver (dlsym RTLD_NEXT), or, in the "null driver"
// pass, return at once. The null pass is then exactly the library's own work per frame (matrix
// chains, state reads, conditions, plus one call per GL entry point), and the call count says
// how much it asks of the driver.
//
//   cmake -S . -B build-bench -G Ninja -DTESSEL_BUILD_BENCH=ON
//   cmake --build build-bench --target render_bench && build-bench/bench/render_bench
#include <benchmark/benchmark.h>

#include <GLES/gl.h>
#include <dlfcn.h>
#include <time.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <algorithm>
#include <string>

#include "render/surfaces.h"
#include "session/session.h"
#include "common/egl_pbuffer.h"

namespace {

bool gNullDriver = false;
long gCalls = 0;

template <typename F>
F real(const char* name) {
  static_assert(sizeof(F) == sizeof(void*), "function pointer");
  void* p = dlsym(RTLD_NEXT, name);
  if (p == nullptr) {
    std::fprintf(stderr, "render_bench: no %s in the GL library\n", name);
    std::abort();
  }
  F f;
  std::memcpy(&f, &p, sizeof f);
  return f;
}

}  // namespace

// The per-frame entry points, interposed. Each forwards unless the null driver is on.
#define TESSEL_FORWARD(name, params, args)                         \
  extern "C" GL_API void GL_APIENTRY name params {                 \
    static const auto next = real<void(GL_APIENTRY*) params>(#name); \
    ++gCalls;                                                      \
    if (!gNullDriver) next args;                                   \
  }

TESSEL_FORWARD(glTexEnvx, (GLenum a, GLenum b, GLfixed c), (a, b, c))
TESSEL_FORWARD(glClearColor, (GLfloat a, GLfloat b, GLfloat c, GLfloat d), (a, b, c, d))
TESSEL_FORWARD(glClear, (GLbitfield a), (a))
TESSEL_FORWARD(glLoadIdentity, (void), ())
TESSEL_FORWARD(glMatrixMode, (GLenum a), (a))
TESSEL_FORWARD(glTranslatef, (GLfloat a, GLfloat b, GLfloat c), (a, b, c))
TESSEL_FORWARD(glScalef, (GLfloat a, GLfloat b, GLfloat c), (a, b, c))
TESSEL_FORWARD(glBindTexture, (GLenum a, GLuint b), (a, b))
TESSEL_FORWARD(glTexCoordPointer, (GLint a, GLenum b, GLsizei c, const void* d), (a, b, c, d))
TESSEL_FORWARD(glVertexPointer, (GLint a, GLenum b, GLsizei c, const void* d), (a, b, c, d))
TESSEL_FORWARD(glDrawArrays, (GLenum a, GLint b, GLsizei c), (a, b, c))
TESSEL_FORWARD(glEnable, (GLenum a), (a))
TESSEL_FORWARD(glDisable, (GLenum a), (a))
TESSEL_FORWARD(glBlendFunc, (GLenum a, GLenum b), (a, b))
// Start-up only: state set-up and texture upload.
TESSEL_FORWARD(glShadeModel, (GLenum a), (a))
TESSEL_FORWARD(glHint, (GLenum a, GLenum b), (a, b))
TESSEL_FORWARD(glDepthFunc, (GLenum a), (a))
TESSEL_FORWARD(glEnableClientState, (GLenum a), (a))
TESSEL_FORWARD(glViewport, (GLint a, GLint b, GLsizei c, GLsizei d), (a, b, c, d))
TESSEL_FORWARD(glTexParameterf, (GLenum a, GLenum b, GLfloat c), (a, b, c))
TESSEL_FORWARD(glTexEnvf, (GLenum a, GLenum b, GLfloat c), (a, b, c))
TESSEL_FORWARD(glGenTextures, (GLsizei a, GLuint* b), (a, b))
TESSEL_FORWARD(glDeleteTextures, (GLsizei a, const GLuint* b), (a, b))

namespace {
long long gUploadedBytes = 0;
}

extern "C" GL_API void GL_APIENTRY glTexImage2D(GLenum target, GLint level, GLint internal, GLsizei width,
                                                GLsizei height, GLint border, GLenum format, GLenum type,
                                                const void* pixels) {
  static const auto next =
      real<void(GL_APIENTRY*)(GLenum, GLint, GLint, GLsizei, GLsizei, GLint, GLenum, GLenum, const void*)>("glTexImage2D");
  ++gCalls;
  gUploadedBytes += 4LL * width * height;
  if (!gNullDriver) next(target, level, internal, width, height, border, format, type, pixels);
}

namespace {

using tessel::KeyboardSession;

double threadSeconds() {
  timespec ts{};
  clock_gettime(CLOCK_THREAD_CPUTIME_ID, &ts);
  return static_cast<double>(ts.tv_sec) + ts.tv_nsec * 1e-9;
}

// A keyboard session on its own offscreen surface. `scene` 0: letters with a held key and its
// balloon (the busiest letter frame); 1: the number pad with a held digit.
struct Scene {
  explicit Scene(int scene) : gl(1080, 720) {
    handle = tessel::createSession(("bench-" + std::to_string(scene)).c_str());
    s = tessel::sessionAt(handle);
    if (s == nullptr || !gl.ok()) return;
    tessel::mainSurfaceCreated(*s);
    tessel::mainSurfaceChanged(*s, 1080, 720, 1);
    s->currentKbdType = scene == 0 ? 0 : 1;
    s->anyKeyReleased = 0;
    s->keyReleased[3] = 0;
    s->touchRow = scene == 0 ? 2 : 1;
    s->touchColumn = scene == 0 ? 3 : 1;
  }
  ~Scene() { tessel::destroySession(handle); }
  tessel::host::GlesContext gl;
  int handle = -1;
  KeyboardSession* s = nullptr;
};

void BM_KeyboardFrame(benchmark::State& state) {
  Scene scene(static_cast<int>(state.range(0)));
  if (scene.s == nullptr) {
    state.SkipWithError(("no offscreen GLES 1.1: " + scene.gl.error()).c_str());
    return;
  }
  gNullDriver = false;
  tessel::mainDrawFrame(*scene.s);  // warm-up: first use of each texture
  glFinish();
  double issue = 0;  // caller-thread CPU inside mainDrawFrame (library + driver front end)
  for (auto _ : state) {
    const double t0 = threadSeconds();
    tessel::mainDrawFrame(*scene.s);
    issue += threadSeconds() - t0;
    glFinish();
  }
  const double frames = static_cast<double>(state.iterations());

  // The same frame against the null driver: the library's own CPU time.
  constexpr int kNullFrames = 20000;
  gNullDriver = true;
  gCalls = 0;
  const double t0 = threadSeconds();
  for (int k = 0; k < kNullFrames; ++k) tessel::mainDrawFrame(*scene.s);
  const double own = (threadSeconds() - t0) / kNullFrames;
  const double calls = static_cast<double>(gCalls) / kNullFrames;
  gNullDriver = false;

  state.counters["fps"] = benchmark::Counter(frames, benchmark::Counter::kIsRate);
  state.counters["issue_us"] = issue / frames * 1e6;
  state.counters["own_us"] = own * 1e6;
  state.counters["gl_calls"] = calls;
  state.counters["own_share_of_issue"] = own / (issue / frames);
}
BENCHMARK(BM_KeyboardFrame)->Arg(0)->Arg(1)->ArgName("pad")->Unit(benchmark::kMillisecond)->UseRealTime();

// Surface created -> changed -> first frame drawn, as the app's GL thread runs them.
struct SurfaceKind {
  const char* name;
  int width, height;
  void (*created)(KeyboardSession&);
  void (*changed)(KeyboardSession&, int, int);
  void (*draw)(const KeyboardSession&);
};
void keyboardChanged(KeyboardSession& s, int w, int h) { tessel::mainSurfaceChanged(s, w, h, 1); }
void fieldDraw(const KeyboardSession& s) { tessel::popDrawFrame(s, true); }
const SurfaceKind kSurfaces[] = {
    {"keyboard", 1080, 720, tessel::mainSurfaceCreated, keyboardChanged, tessel::mainDrawFrame},
    {"field pop-up", 1080, 160, tessel::popSurfaceCreated, tessel::popSurfaceChanged, fieldDraw},
    {"top pop-up", 240, 320, tessel::popTopSurfaceCreated, tessel::popTopSurfaceChanged, tessel::popTopDrawFrame},
};

void startUp(const SurfaceKind& kind, KeyboardSession& s) {
  kind.created(s);
  kind.changed(s, kind.width, kind.height);
  kind.draw(s);
}

// Each iteration runs on a fresh context (made outside the timing) so that the textures of the
// previous start-up, which the library never deletes, do not pile up in the driver.
void BM_StartUp(benchmark::State& state) {
  const SurfaceKind& kind = kSurfaces[state.range(0)];
  // A compact artwork build inflates what each start-up uploads, and frees it after: that is in
  // both the wall time and the library's own CPU (tools/perf_table.sh runs both builds).
#if TESSEL_COMPACT_ARTWORK
  state.SetLabel(std::string(kind.name) + ", compact artwork");
#else
  state.SetLabel(kind.name);
#endif
  const int handle = tessel::createSession("bench-start-up");
  KeyboardSession* s = tessel::sessionAt(handle);
  if (s != nullptr && state.range(0) != 0) {  // the pop-ups come up after the keyboard has its layout
    gNullDriver = true;
    startUp(kSurfaces[0], *s);
    gNullDriver = false;
  }
  double wall = 0;
  long long bytes = 0;
  for (auto _ : state) {
    state.PauseTiming();
    {
      tessel::host::GlesContext gl(kind.width, kind.height);
      if (s == nullptr || !gl.ok()) {
        state.SkipWithError(("no offscreen GLES 1.1: " + gl.error()).c_str());
        break;
      }
      gNullDriver = false;
      gUploadedBytes = 0;
      state.ResumeTiming();
      timespec t0{}, t1{};
      clock_gettime(CLOCK_MONOTONIC, &t0);
      startUp(kind, *s);
      glFinish();
      clock_gettime(CLOCK_MONOTONIC, &t1);
      state.PauseTiming();
      wall += static_cast<double>(t1.tv_sec - t0.tv_sec) + (t1.tv_nsec - t0.tv_nsec) * 1e-9;
      bytes = gUploadedBytes;
    }
    state.ResumeTiming();
  }
  // The same start-up against the null driver: the library's own CPU time.
  constexpr int kNullRuns = 200;
  gNullDriver = true;
  const double c0 = threadSeconds();
  if (s != nullptr)
    for (int k = 0; k < kNullRuns; ++k) startUp(kind, *s);
  const double own = (threadSeconds() - c0) / kNullRuns;
  gNullDriver = false;
  tessel::destroySession(handle);
  const double perStartUp = wall / static_cast<double>(std::max<std::int64_t>(1, state.iterations()));
  state.counters["start_up_ms"] = perStartUp * 1e3;
  state.counters["own_us"] = own * 1e6;
  state.counters["own_share_pct"] = 100 * own / perStartUp;
  state.counters["upload_MB"] = static_cast<double>(bytes) / 1e6;
}
BENCHMARK(BM_StartUp)->DenseRange(0, 2)->ArgName("surface")->Unit(benchmark::kMillisecond)->Iterations(15);

// The process's resident memory in MiB (llvmpipe keeps textures in it).
double residentMiB() {
  long pages = 0, resident = 0;
  if (std::FILE* f = std::fopen("/proc/self/statm", "r")) {
    if (std::fscanf(f, "%ld %ld", &pages, &resident) != 2) resident = 0;
    std::fclose(f);
  }
  return static_cast<double>(resident) * static_cast<double>(sysconf(_SC_PAGESIZE)) / (1024.0 * 1024.0);
}

// An app that keeps one GL context and shows its keyboard again after each done (a reshuffle):
// all three surfaces created, changed and drawn once per round, `rounds` rounds in one context.
// Reports how much the resident memory grew from the end of the first round to the last.
void BM_TextureGrowth(benchmark::State& state) {
  tessel::host::GlesContext gl(1080, 720);
  const int handle = tessel::createSession("bench-growth");
  KeyboardSession* s = tessel::sessionAt(handle);
  if (s == nullptr || !gl.ok()) {
    state.SkipWithError(("no offscreen GLES 1.1: " + gl.error()).c_str());
    return;
  }
  s->kbdRandom = 1;
  gNullDriver = false;
  auto round = [&] {
    for (const SurfaceKind& kind : kSurfaces) startUp(kind, *s);
    glFinish();
  };
  double growth = 0, wall = 0;
  for (auto _ : state) {
    round();
    const double first = residentMiB();
    timespec t0{}, t1{};
    clock_gettime(CLOCK_MONOTONIC, &t0);
    for (std::int64_t k = 1; k < state.range(0); ++k) round();
    clock_gettime(CLOCK_MONOTONIC, &t1);
    growth = residentMiB() - first;
    wall = static_cast<double>(t1.tv_sec - t0.tv_sec) + (t1.tv_nsec - t0.tv_nsec) * 1e-9;
  }
  tessel::destroySession(handle);
  state.counters["growth_MiB"] = growth;
  state.counters["round_ms"] = wall * 1e3 / static_cast<double>(state.range(0) - 1);
}
BENCHMARK(BM_TextureGrowth)->Arg(300)->ArgName("rounds")->Unit(benchmark::kMillisecond)->Iterations(1)->UseRealTime();

}  // namespace

BENCHMARK_MAIN();
