// The road of one password, driven the way an app drives the library: a session is configured,
// its three GL surfaces are created offscreen on OpenGL ES 1.1, a password is typed by touch on
// the shuffled keyboard, and the outputs are opened again with the server-side tool, as the
// bank's backend would. Frames of what the user sees are written as PNG files, the two outputs
// as .b64 files next to them, with the tessel_open commands that open them.
//
// With --window (when built with GLFW) the keyboard is shown in a window instead and typed by
// hand with the mouse (window.h).
//
// Usage: tessel_demo [--out DIR] [--no-shuffle]
//        tessel_demo --window [--no-shuffle] [--exit-after-done] [--screenshot PATH]
// Exits non-zero if any step fails or the backend's view disagrees with what was typed.

#include <cstdio>
#include <cstring>
#include <string>
#include <sys/stat.h>

#include "crypto/error_table.h"
#include "crypto/moduli.h"
#include "input/touch.h"
#include "offscreen.h"
#include "render/surfaces.h"
#include "road.h"
#include "server/bytes.h"
#include "server/password_check.h"
#include "session/output.h"
#include "session/sealed_text.h"
#include "session/session.h"
#include "typist.h"
#if TESSEL_DEMO_WINDOW
#include "window.h"
#endif

using namespace tessel;
using demo::check;
using demo::step;

namespace {

// The demo's sample password. A real app never sees it: only the keyboard does.
const char kPassword[] = "Tessel#2026";
const int kKeyboardWidth = 1080, kKeyboardHeight = 720, kPopHeight = 180;

std::string md5Hex(const std::string& data) { return server::toHex(server::digest("MD5", data), false); }

// The three surfaces an app would host, and the frames they make.
struct Screen {
  demo::OffscreenSurface topPop{kKeyboardWidth, kPopHeight};
  demo::OffscreenSurface fieldPop{kKeyboardWidth, kPopHeight};
  demo::OffscreenSurface keyboard{kKeyboardWidth, kKeyboardHeight};
  std::string outDir;
  int frame = 0;

  bool ok() const { return topPop.ok() && fieldPop.ok() && keyboard.ok(); }

  void create(KeyboardSession& s) {
    keyboard.makeCurrent();
    mainSurfaceCreated(s);
    mainSurfaceChanged(s, kKeyboardWidth, kKeyboardHeight, 1);
    fieldPop.makeCurrent();
    popSurfaceCreated(s);
    popSurfaceChanged(s, kKeyboardWidth, kPopHeight);
    topPop.makeCurrent();
    popTopSurfaceCreated(s);
    popTopSurfaceChanged(s, kKeyboardWidth, kPopHeight);
  }

  // Draws all three surfaces and lays them out as an app does: the field pop-up right above the
  // keyboard, and the transparent top pop-up over it, so the enlarged key lands in the balloon.
  std::string snapshot(KeyboardSession& s) {
    keyboard.makeCurrent();
    mainDrawFrame(s);
    fieldPop.makeCurrent();
    popDrawFrame(s, true);
    topPop.makeCurrent();
    popTopDrawFrame(s);
    demo::Canvas canvas(kKeyboardWidth, kKeyboardHeight + kPopHeight, 0x20242AFF);
    canvas.paste(demo::readSurface(fieldPop), kKeyboardWidth, kPopHeight, 0, 0);
    canvas.paste(demo::readSurface(topPop), kKeyboardWidth, kPopHeight, 0, 0);
    canvas.paste(demo::readSurface(keyboard), kKeyboardWidth, kKeyboardHeight, 0, kPopHeight);
    char name[64];
    std::snprintf(name, sizeof name, "/frame_%02d.png", frame++);
    const std::string path = outDir + name;
    if (!demo::writePng(path, canvas)) check(false, ("write " + path).c_str());
    return path;
  }
};

}  // namespace

int main(int argc, char** argv) {
  std::string outDir = "demo-frames";
  bool shuffle = true, window = false;
#if TESSEL_DEMO_WINDOW
  demo::WindowOptions windowOptions;
#endif
  for (int k = 1; k < argc; ++k) {
    const std::string arg = argv[k];
    if (arg == "--out" && k + 1 < argc) {
      outDir = argv[++k];
    } else if (arg == "--no-shuffle") {
      shuffle = false;
    } else if (arg == "--window") {
      window = true;
#if TESSEL_DEMO_WINDOW
    } else if (arg == "--exit-after-done") {
      windowOptions.exitAfterDone = true;
    } else if (arg == "--screenshot" && k + 1 < argc) {
      windowOptions.screenshot = argv[++k];
#endif
    } else {
      std::fprintf(stderr,
                   "usage: tessel_demo [--out DIR] [--no-shuffle]\n"
                   "       tessel_demo --window [--no-shuffle] [--exit-after-done] [--screenshot PATH]\n");
      return 2;
    }
  }
#if !TESSEL_DEMO_WINDOW
  if (window) {
    std::fprintf(stderr, "tessel_demo: --window needs GLFW (libglfw3-dev) when the demo is configured\n");
    return 2;
  }
#endif
  mkdir(outDir.c_str(), 0755);

  std::printf(window ? "Tessel demo: the keyboard in a window, typed by hand\n\n"
                     : "Tessel demo: one password from the keyboard to the bank's backend\n\n");
  std::printf("App side\n");
  demo::BackendKeys backendKeys;
  std::string error;
  if (!backendKeys.load(&error)) {
    std::printf("  FAIL loading the demo keys: %s\n", error.c_str());
    return 1;
  }
  const int handle = demo::createDemoSession(backendKeys.enc, shuffle);
  KeyboardSession* s = sessionAt(handle);
  if (s == nullptr) return 1;
#if TESSEL_DEMO_WINDOW
  if (window) {
    windowOptions.outDir = outDir;
    const int status = demo::runWindow(*s, backendKeys.openKeys(), windowOptions);
    destroySession(handle);
    return status;
  }
#endif

  Screen screen;
  screen.outDir = outDir;
  if (!screen.ok()) {
    std::printf("  FAIL %s\n", screen.keyboard.error().c_str());
    return 1;
  }
  screen.create(*s);
  step("surfaces created on OpenGL ES 1.1 (offscreen): keyboard 1080x720, field and key pop-ups 1080x180");
  std::printf("  the layout is %s: the top row reads ", shuffle ? "shuffled" : "fixed");
  for (int k = 0; k < 10; ++k) std::printf("%c", static_cast<char>(s->letters[k] + s->keyMask));
  std::printf("\n");

  std::printf("\nUser side (%d characters, typed by touch; the demo reads the screen to find keys)\n",
              static_cast<int>(std::strlen(kPassword)));
  int taps = 0;
  demo::Typist typist(*s, [&](const demo::Tap& tap) {
    ++taps;
    screen.snapshot(*s);
    (void)tap;
  });
  bool typed = true;
  for (const char* p = kPassword; *p; ++p) typed = typist.type(*p) && typed;
  check(typed, "every character found on the keyboard (with one shift and a page switch)");
  const int doneResult = typist.done();
  screen.snapshot(*s);
  std::printf("  %d taps (the last one on done), frames in %s/frame_00.png .. frame_%02d.png\n", taps,
              outDir.c_str(), screen.frame - 1);
  check(doneResult == 1, "done key released: setNativeTouchPos returned 1");

  std::printf("\nApp side again (no plaintext crosses the boundary)\n");
  const int length = contentLength(*s);
  std::printf("  getNativeContentLen -> %d\n", length);
  check(length == static_cast<int>(std::strlen(kPassword)), "length matches the characters typed");
  const char degree = sessionDegree(*s);
  std::printf("  getNativeDegree -> '%c' (E empty, W weak, M medium, S strong)\n", degree);
  const int verify = sessionVerify(*s);
  std::printf("  getNativeVerify -> %d (0 passes the rule)\n", verify);
  SecureBuffer measure = computeMeasureValue(*s);
  std::printf("  getNativeMeasureValue -> %s\n", measure ? measure.c_str() : "(none)");
  check(measure && md5Hex(kPassword) == measure.c_str(), "measure value is the MD5 of the text");

  const std::string timestamp = demo::utcTimestamp();
  SecureBuffer content = contentOutput(*s, 48, timestamp.c_str());
  std::printf("  getNativeContent(\"%s\") -> %zu base64 characters, last error \"%s\"\n", timestamp.c_str(),
              content ? content.size() : 0, lastErrorText(s->content->lastError));
  SecureBuffer pinContent = contentOutput(*s, 47, timestamp.c_str());
  std::printf("  getNativePinContent(\"%s\") -> %zu base64 characters, last error \"%s\"\n", timestamp.c_str(),
              pinContent ? pinContent.size() : 0, lastErrorText(s->content->lastError));

  std::printf("\nBackend side (tools/server with the demo private keys)\n");
  const std::string expected = server::saltedHashValue(kPassword, demo::kSalt, 'S');
  const server::OpenKeys keys = backendKeys.openKeys();
  server::Opened opened;
  if (demo::openContent(content, keys, &opened))
    check(opened.payload == expected && opened.timestamp == timestamp,
          "salted value = MD5(MD5(password) + salt)[8..24), computed by the backend from its own copy");
  server::Opened openedPin;
  const bool openedPinContent =
      pinContent && server::openOutput(47, pinContent.c_str(), keys, &openedPin, &error);
  check(openedPinContent && openedPin.contentOpened && openedPin.content == expected,
        openedPinContent ? "PIN content: envelope and inner RSA payload opened, same salted value"
                         : ("PIN content: " + error).c_str());

  const std::string commands[] = {
      demo::saveForBackend(outDir, "content_48.b64", 48, content, kPassword),
      demo::saveForBackend(outDir, "pin_content_47.b64", 47, pinContent, kPassword)};
  check(!commands[0].empty() && !commands[1].empty(), ("both outputs saved in " + outDir).c_str());
  std::printf("\nOpen them yourself, from the repository root, as the bank's backend does (demo keys,\n"
              "stored password and salt); each prints the opened fields and \"password: match\":\n");
  for (const std::string& command : commands) std::printf("  %s\n", command.c_str());

  destroySession(handle);
  const bool passed = demo::failures() == 0;
  std::printf("\n%s\n", passed ? "Demo finished: every check passed." : "Demo FAILED.");
  return passed ? 0 : 1;
}
