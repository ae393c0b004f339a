// Fuzzes the DER public-key reader and the key setters built on it (DER hex, key blob) on a live
// session.
//
// Input: byte 0 chooses the form, the rest is the key. Bit 0 set: the rest is binary DER (or
// blob) bytes and is hex-encoded here, so mutations work on the structure rather than on hex
// digits; bit 1 set: white space is sprinkled into that hex (the blob decoder skips it).
// Otherwise the rest is used as text as it stands, up to its first NUL.
//
// Checks: an accepted key is non-empty upper-case hex with a non-zero first byte, at most 280
// bytes, and its bytes occur in the decoded input; the DER setter stores exactly what the
// reader returns; the blob setter returns 1 for any text and stores what the reader makes of
// the reversed bytes after the 20-byte header.
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string>

#include "crypto/codec.h"
#include "crypto/der.h"
#include "fuzz_support.h"
#include "session/session.h"
#include "session/settings.h"

namespace {

using tessel::SecureBuffer;

void checkModulus(const SecureBuffer& modulus, const char* keyText) {
  if (!modulus) return;
  const std::string hex(modulus.c_str(), modulus.size());
  FUZZ_CHECK(!hex.empty() && hex.size() % 2 == 0 && hex.size() <= 560);
  FUZZ_CHECK(std::strlen(modulus.c_str()) == hex.size());
  FUZZ_CHECK(tessel_fuzz::isHexOf(hex, true));
  FUZZ_CHECK(hex[0] != '0' || hex[1] != '0');
  const SecureBuffer bytes = tessel::hexDecode(hex.c_str());
  const SecureBuffer input = tessel::hexDecode(keyText);
  FUZZ_CHECK(bytes && input);
  const std::string haystack(reinterpret_cast<const char*>(input.data()), input.size());
  const std::string needle(reinterpret_cast<const char*>(bytes.data()), bytes.size());
  FUZZ_CHECK(haystack.find(needle) != std::string::npos);
}

bool sameText(const char* a, const SecureBuffer& b) {
  if (!b) return a == nullptr;
  return a != nullptr && std::strcmp(a, b.c_str()) == 0;
}

// What the blob setters must store, derived here step by step; *derText is the DER hex the
// reversed key bytes form.
SecureBuffer expectedBlobKey(const char* blobText, std::string* derText) {
  std::string digits;
  for (const char* p = blobText; *p; ++p)
    if (std::strchr(" \f\n\r\t\v", *p) == nullptr) digits += *p;
  const SecureBuffer blob = tessel::hexDecode(digits.c_str());
  FUZZ_CHECK(blob);
  std::string reversed;
  for (std::size_t k = blob.size(); k > 20; --k) reversed += static_cast<char>(blob.data()[k - 1]);
  const SecureBuffer hex =
      tessel::hexEncode(reinterpret_cast<const std::uint8_t*>(reversed.data()), reversed.size());
  FUZZ_CHECK(hex);
  derText->assign(hex.c_str(), hex.size());
  return tessel::derPublicKeyToModulusHex(hex.c_str());
}

std::string keyText(const std::uint8_t* data, std::size_t size) {
  if (size == 0) return std::string();
  const std::uint8_t form = data[0];
  ++data;
  --size;
  if ((form & 1) == 0) return std::string(reinterpret_cast<const char*>(data), strnlen(reinterpret_cast<const char*>(data), size));
  const SecureBuffer hex = tessel::hexEncode(data, size);
  std::string text(hex.c_str(), hex.size());
  if (form & 2) {
    std::string spaced;
    for (std::size_t k = 0; k < text.size(); ++k) {
      spaced += text[k];
      const unsigned pick = (form >> 2) + k;
      if (k % 7 == (form >> 5)) spaced += " \n\t\r\f\v"[pick % 6];
    }
    text.swap(spaced);
  }
  return text;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size > 4096) return 0;
  const std::string text = keyText(data, size);

  const SecureBuffer modulus = tessel::derPublicKeyToModulusHex(text.c_str());
  checkModulus(modulus, text.c_str());

  static const int handle = tessel::createSession("der-fuzzer");
  tessel::KeyboardSession* session = tessel::sessionAt(handle);
  FUZZ_CHECK(session != nullptr);

  tessel::setEncryPlat(*session, text.c_str(), true);
  FUZZ_CHECK(sameText(session->encryPlat, modulus));
  tessel::setAppPlat(*session, text.c_str(), true);
  FUZZ_CHECK(sameText(session->appPlat, modulus));
  tessel::setAppPlat(*session, text.c_str(), false);
  FUZZ_CHECK(session->appPlat != nullptr && text == session->appPlat);

  std::string derText;
  const SecureBuffer blobKey = expectedBlobKey(text.c_str(), &derText);
  checkModulus(blobKey, derText.c_str());
  FUZZ_CHECK(tessel::setEncryPlatBlob(*session, text.c_str()) == 1);
  FUZZ_CHECK(sameText(session->encryPlat, blobKey));
  FUZZ_CHECK(tessel::setAppPlatBlob(*session, text.c_str()) == 1);
  FUZZ_CHECK(sameText(session->appPlat, blobKey));
  return 0;
}
