// The measure value: MD5 of the typed text, shown as lower-case hex. The text is read through
// a ContentGuard, so it is unsealed only for the digest and resealed on the way out.
#include "crypto/measure.h"

#include "crypto/codec.h"
#include "crypto/md5.h"
#include "crypto/wipe.h"
#include "session/session.h"

namespace tessel {

SecureBuffer computeMeasureValue(KeyboardSession& session) noexcept {
  if (session.content->length == 0) return SecureBuffer();
  std::uint8_t digest[16];
  {
    ContentGuard guard(*session.content);
    md5(guard.text(), guard.length(), digest);
  }
  SecureBuffer text = hexEncodeLower(digest, sizeof digest);
  wipeObject(digest);
  return text;
}

}  // namespace tessel
