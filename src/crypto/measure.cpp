// The measure value: MD5 of the typed text, shown as lower-case hex. The text is read through
// a ContentGuard, so it is unsealed only for the digest and resealed on the way out.
#include "crypto/measure.h"

#include "crypto/md5.h"
#include "session/session.h"

namespace tessel {

SecureBuffer computeMeasureValue(KeyboardSession& session) noexcept {
  if (session.content->length == 0) return SecureBuffer();
  ContentGuard guard(*session.content);
  return md5HexLower(guard.text(), guard.length());
}

}  // namespace tessel
