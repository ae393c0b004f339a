// The steps both demo modes share (offscreen run and window): the check lines, the demo's keys,
// the session's settings, and the backend's opening of the content envelope. Everything printed
// here is what an app or a backend may see: lengths, letters, codes, envelopes' contents after
// hashing; never typed text.
#pragma once

#include <string>

#include "crypto/secure_buffer.h"
#include "server/tessel_opener.h"

namespace demo {

// The hash salt of the demo's settings (setHashRandom "1:" + salt): the backend needs it too.
extern const char kSalt[];

void step(const char* text);            // "  text"
void check(bool ok, const char* what);  // "  ok   what" or "  FAIL what"; counts failures
int failures();

// The source tree's path of a file the demo reads (keys).
std::string sourcePath(const char* relative);

// The backend's private keys: the built-in default application key (opens the envelopes) and the
// demo's encryption key (its modulus goes into the session's settings).
struct BackendKeys {
  tessel::server::PrivateKey app, enc;
  bool load(std::string* error);
  tessel::server::OpenKeys openKeys() const;
};

// Creates and configures the demo's session as an app would (prints the "App side" lines):
// accepts [[:alnum:][:punct:]]{1,16}, length 8..16, content type 7, a dictionary, the salt and
// enc's modulus; shuffled keys unless `shuffle` is false. Returns the handle, or -1.
int createDemoSession(const tessel::server::PrivateKey& enc, bool shuffle);

// The current UTC time as YYYYMMDDhhmmss, the timestamp an app passes to getNativeContent.
std::string utcTimestamp();

// Opens a type-48 content output with the server library: prints a check line and, when it
// opened, "strength 'X', timestamp T, salted value V". False when absent or not opened.
bool openContent(const tessel::SecureBuffer& content, const tessel::server::OpenKeys& keys,
                 tessel::server::Opened* opened);

// Writes an output of `type` (47 or 48) to dir/name as one line of base64, so a backend can open
// it, and returns the tessel_open command that does so from the repository root with the demo
// keys and, when given, the stored password and the salt. Empty when the file cannot be written.
std::string saveForBackend(const std::string& dir, const char* name, int type, const tessel::SecureBuffer& output,
                           const char* password);

}  // namespace demo
