// The road of one password, as an app drives the library.
#include <cstdio>
#include <cstring>

#include "crypto/error_table.h"
#include "session/session.h"

using namespace tessel;

int main() {
  std::printf("Tessel demo\n");
  const int handle = createSession("login-password");
  std::printf("1. createSession(\"login-password\") -> handle %d\n", handle);
  KeyboardSession* session = sessionAt(handle);
  if (session == nullptr) return 1;
  {
    // Stand-in for typing until the keyboard can be driven by touches.
    ContentGuard guard(*session->content);
    const char* typed = "s3cret!";
    std::memcpy(guard.text(), typed, std::strlen(typed));
    session->content->length = static_cast<std::uint16_t>(std::strlen(typed));
  }
  std::printf("2. typed 7 characters; getNativeContentLen -> %d\n", contentLength(*session));
  std::printf("3. the stored bytes are RC4-sealed: ");
  for (int k = 0; k < contentLength(*session); ++k) std::printf("%02X", session->content->plaintext[k]);
  std::printf(" (not the text)\n");
  std::printf("4. createSession(\"login-password\") again -> handle %d (same session)\n",
              createSession("login-password"));
  std::printf("5. error 7 reads \"%s\"; code 100 reads \"%s\"\n", errorMessage(7), lastErrorText(100));
  destroySession(handle);
  std::printf("6. destroyed; sessionAt(%d) is %s\n", handle, sessionAt(handle) ? "live" : "empty");
  return 0;
}
