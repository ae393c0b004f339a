// The demo's window mode: the session's keyboard in a GLFW window with an OpenGL ES 1.1 context,
// typed by hand with the mouse, the outputs opened by the backend at every done. Built only when
// GLFW is found (TESSEL_DEMO_WINDOW).
//
// One window, one GL context, laid out as an app lays out its three surfaces: the field pop-up
// (a fifth of the height) on top of the keyboard. The keyboard's surface is the bottom of the
// framebuffer; each surface's draw is confined to its region by viewport and scissor, so its
// clear only clears that region. The top pop-up (the enlarged key over the balloon) is drawn into
// an offscreen texture (GL_OES_framebuffer_object) and blended over the field pop-up, where its
// own surface would sit; without that extension the enlarged key is left out.
//
// Mouse: left press on the keyboard = touch down (action 0), drag = move (2), release = up (1),
// in keyboard-surface pixels. Escape or closing the window quits. When done is released the
// length, degree and verdict are printed, the content output (type 48) is opened with the server
// library and its strength, timestamp and salted value printed, and the output is saved with the
// tessel_open command that opens it; then the surfaces are created
// again as when an app shows the keyboard once more (new layout, the field keeps its text).
#pragma once

#include <string>

namespace tessel {
struct KeyboardSession;
namespace server {
struct OpenKeys;
}
}  // namespace tessel

namespace demo {

struct WindowOptions {
  int width = 720;             // window width in screen units; height is width * 5 / 6
  bool exitAfterDone = false;  // quit after the first done
  std::string screenshot;      // PNG of the framebuffer, rewritten after each done and at exit
  std::string outDir = ".";    // where each done's content output is saved (window_content_N.b64)
};

// Runs the window until the user quits (or the first done with exitAfterDone). Prints the
// window's geometry first: "window WxH (framebuffer WxH): field pop-up WxP on top, keyboard WxK".
// Returns 0, or 1 when the window cannot be opened or a check failed.
int runWindow(tessel::KeyboardSession& s, const tessel::server::OpenKeys& keys, const WindowOptions& options);

}  // namespace demo
