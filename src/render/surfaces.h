// The three GL surfaces: keyboard, field pop-up and top pop-up. Called on the app's GL threads
// with a current OpenGL ES 1.x context.
#pragma once

namespace tessel {

struct KeyboardSession;

void mainSurfaceCreated(KeyboardSession& s);   // takes s.lock: layout build + texture upload
void mainSurfaceChanged(KeyboardSession& s, int width, int height, int variant);  // no lock
void mainDrawFrame(const KeyboardSession& s);  // no lock

void popSurfaceCreated(KeyboardSession& s);
void popSurfaceChanged(KeyboardSession& s, int width, int height);
void popDrawFrame(const KeyboardSession& s, bool showField);

void popTopSurfaceCreated(KeyboardSession& s);  // takes s.lock: layout build + upload
void popTopSurfaceChanged(KeyboardSession& s, int width, int height);
void popTopDrawFrame(const KeyboardSession& s);

}  // namespace tessel
