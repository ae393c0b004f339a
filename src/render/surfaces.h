// The three GL surfaces: keyboard, field pop-up and top pop-up. Called on the app's GL threads
// with a current OpenGL ES 1.x context; the caller has pinned the session (an empty slot or a
// negative handle never gets here).
//
// Created: GL state (smooth shading, 2D textures, depth test LEQUAL, nicest perspective hint,
// vertex and texture-coordinate arrays) and a fresh texture set for that surface
// (render/textures.h), under s.lock: two threads must not renew one set at once. The keyboard's
// and the top pop-up's creation also build the key layout (input/layout.h) under the same hold,
// so creating either may be what reshuffles the keys.
// Changed: width or height below 1 does nothing. The keyboard's applies the grid geometry
// (input/layout.h) and sets the viewport; the pop-ups' only set the viewport.
// Draw frame: no lock; reads whatever the last touch left (a frame may mix old and new values).
// The pop-ups draw nothing unless layoutBuilt is 1. Nothing here changes the session.
#pragma once

namespace tessel {

struct KeyboardSession;

void mainSurfaceCreated(KeyboardSession& s);   // takes s.lock: layout build + texture upload
void mainSurfaceChanged(KeyboardSession& s, int width, int height, int variant);  // no lock
void mainDrawFrame(const KeyboardSession& s);  // no lock

// Field pop-up: the masked field (one dot per character, at most 19 on the letter keyboard and
// 18 on the pad, and a cursor blinking every 800 ms) when showField, and in every case the
// upper part of the key balloon while a top-row letter-keyboard key is held in surface mode 1.
void popSurfaceCreated(KeyboardSession& s);    // takes s.lock: upload only, no layout build
void popSurfaceChanged(KeyboardSession& s, int width, int height);
void popDrawFrame(const KeyboardSession& s, bool showField);

// Top pop-up: the enlarged glyph of that held top-row key (first symbol page on either page).
void popTopSurfaceCreated(KeyboardSession& s);  // takes s.lock: layout build + upload
void popTopSurfaceChanged(KeyboardSession& s, int width, int height);
void popTopDrawFrame(const KeyboardSession& s);

}  // namespace tessel
