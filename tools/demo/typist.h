// The demo's user: looks at the keyboard (the session's current layout, unmasked the way the
// screen shows it) and turns each character into taps at key centres, switching the symbol
// page and shift as a person would.
#pragma once

#include <functional>
#include <string>

namespace tessel {
struct KeyboardSession;
}

namespace demo {

struct Tap {
  float x, y;
  std::string what;  // "key 'T'", "shift", "page switch", "done" (the demo prints no plaintext)
};

class Typist {
 public:
  // onTap is called between the touch down and the touch up of every tap (the key is held),
  // so the caller can draw the frame a user sees at that moment.
  Typist(tessel::KeyboardSession& session, std::function<void(const Tap&)> onTap)
      : session_(session), onTap_(std::move(onTap)) {}

  // Types one character; false when the character is on no key of this layout.
  bool type(char c);
  // Presses done; returns what the touch up returned (1 for done).
  int done();

 private:
  int tap(const Tap& t);
  tessel::KeyboardSession& session_;
  std::function<void(const Tap&)> onTap_;
};

}  // namespace demo
