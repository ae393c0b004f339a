// The session's output operations. Each works on the typed text only inside a ContentGuard, so
// the content is resealed on every way out; every copy of the text they make is a SecureBuffer.
#include "session/output.h"

#include <cstring>
#include <utility>

#include "crypto/codec.h"
#include "crypto/md5.h"
#include "crypto/moduli.h"
#include "crypto/rc4.h"
#include "crypto/sha1.h"
#include "crypto/wipe.h"
#include "output/dispatcher.h"
#include "session/session.h"

namespace tessel {

SecureBuffer contentOutput(KeyboardSession& session, int type, const char* timestamp) noexcept {
  ContentStore& store = *session.content;
  const char* const keyPair[2] = {builtinDefaultModulus(), session.encryPlat};
  SecureBuffer result;
  ErrorCode code = kErrAllocation;
  {
    ContentGuard guard(store);
    // The dispatcher reads a NUL-terminated text of exactly `length` bytes, followed by the
    // hash-random suffix when one is set: build it in a wiped temporary.
    const std::size_t length = guard.length();
    const char* suffix = store.hashRandomSuffix != nullptr ? store.hashRandomSuffix : "";
    const std::size_t suffixLength = std::strlen(suffix);
    SecureBuffer text = SecureBuffer::allocate(length + suffixLength);
    if (text) {
      std::memcpy(text.data(), guard.text(), length);
      std::memcpy(text.data() + length, suffix, suffixLength);
      code = encryptionDispatch(type, keyPair, &result, text.c_str(), timestamp);
    }
  }
  store.lastError = code;
  return result;
}

SecureBuffer encryptedPinCode(KeyboardSession& session) noexcept {
  ContentStore& store = *session.content;
  if (store.challengeCode == nullptr) {
    store.lastError = static_cast<ErrorCode>(kErrChallengeCodeEmpty);
    return SecureBuffer();
  }
  std::uint8_t key[20];
  sha1(store.challengeCode, std::strlen(store.challengeCode), key);
  Rc4State rc4;
  rc4Init(rc4, key, sizeof key);
  wipeObject(key);

  const std::size_t length = store.length;
  SecureBuffer copy = SecureBuffer::allocate(length);
  if (!copy) {
    wipeObject(rc4);
    store.lastError = static_cast<ErrorCode>(kErrPinCodeSpace);
    return SecureBuffer();
  }
  {
    ContentGuard guard(store);
    std::memcpy(copy.data(), guard.text(), length);
  }
  rc4Crypt(rc4, copy.data(), copy.data(), copy.size());
  wipeObject(rc4);

  SecureBuffer text = base64Encode(copy.data(), copy.size());
  if (!text || text.size() == 0) {
    store.lastError = static_cast<ErrorCode>(kErrPinCodeEncryption);
    return SecureBuffer();
  }
  store.lastError = kOk;
  return text;
}

SecureBuffer computeMeasureValue(KeyboardSession& session) noexcept {
  if (session.content->length == 0) return SecureBuffer();
  ContentGuard guard(*session.content);
  return md5HexLower(guard.text(), guard.length());
}

}  // namespace tessel
