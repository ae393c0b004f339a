// What pinning a session costs an entry point. Every call now pins the session it finds (the
// table mutex and one counter each way); touches, setters and outputs also take the session's
// opLock. Each pair runs the same library operation on a raw pointer, as the entry points did
// before sessions were pinned (one atomic load), and through a SessionRef, as they do now; the
// difference is what a call pays for never meeting a freed or half-sealed session.
//
//   cmake -S . -B build-bench -G Ninja -DTESSEL_BUILD_BENCH=ON
//   cmake --build build-bench --target session_bench && build-bench/bench/session_bench
#include <benchmark/benchmark.h>

#include "input/layout.h"
#include "input/touch.h"
#include "session/session.h"
#include "session/settings.h"

namespace {

using tessel::Access;
using tessel::KeyboardSession;
using tessel::SessionRef;

// A keyboard whose key presses dispatch fully but add nothing (maxLength 0), so every
// iteration does the same work.
struct Keyboard {
  int handle = tessel::createSession("bench-session");
  KeyboardSession* raw = tessel::sessionAt(handle);
  Keyboard() {
    tessel::buildLayout(*raw);
    tessel::applySurfaceGeometry(*raw, 1080, 720, 1);
  }
  ~Keyboard() { tessel::destroySession(handle); }
};

// A press and release of the 'q' key's cell.
int press(KeyboardSession& s) { return tessel::touch(s, 0, 54.0f, 90.0f) + tessel::touch(s, 1, 54.0f, 90.0f); }

void BM_Touch(benchmark::State& state) {
  Keyboard kb;
  const bool pinned = state.range(0) != 0;
  for (auto _ : state) {
    if (pinned) {
      SessionRef s(kb.handle, Access::kExclusive);
      benchmark::DoNotOptimize(press(*s));
    } else {
      benchmark::DoNotOptimize(press(*kb.raw));
    }
  }
  state.SetLabel(pinned ? "pinned, exclusive (now)" : "raw pointer (before)");
}
BENCHMARK(BM_Touch)->Arg(0)->Arg(1);

void BM_ContentLen(benchmark::State& state) {
  Keyboard kb;
  const bool pinned = state.range(0) != 0;
  for (auto _ : state) {
    if (pinned) {
      SessionRef s(kb.handle);
      benchmark::DoNotOptimize(tessel::contentLength(*s));
    } else {
      benchmark::DoNotOptimize(tessel::contentLength(*kb.raw));
    }
  }
  state.SetLabel(pinned ? "pinned, shared (now)" : "raw pointer (before)");
}
BENCHMARK(BM_ContentLen)->Arg(0)->Arg(1);

// What a frame or a surface callback adds: one shared pin per surface and frame.
void BM_PinOnly(benchmark::State& state) {
  Keyboard kb;
  const auto access = state.range(0) != 0 ? Access::kExclusive : Access::kShared;
  for (auto _ : state) {
    SessionRef s(kb.handle, access);
    benchmark::DoNotOptimize(s.get());
  }
  state.SetLabel(access == Access::kShared ? "shared (frames, surfaces, length)" : "exclusive (touches, setters, outputs)");
}
BENCHMARK(BM_PinOnly)->Arg(0)->Arg(1);

}  // namespace

BENCHMARK_MAIN();
