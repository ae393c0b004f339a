// DER reader for an RSA public key (PKCS#1 RSAPublicKey: SEQUENCE { INTEGER n, INTEGER e }).
//
// Only the one shape is accepted, and every length is checked against what is left before a
// byte is read, so hostile input cannot walk off the buffer:
//   - the text must be hex digits only (no leniency here: a key with stray characters is not a
//     key); an odd count reads as if a "0" stood in front;
//   - lengths are definite and minimal (short form, or 0x81 / 0x82 with no wasted byte); longer
//     length fields cannot describe a key we can use and are refused;
//   - the SEQUENCE fills the input exactly and holds exactly the two INTEGERs;
//   - the exponent is exactly 02 03 01 00 01 (65537);
//   - the modulus has at least one non-zero byte and at most 280 significant bytes (2240 bits,
//     the BigNumber capacity). Its leading zero bytes are skipped; a top byte of 0x80 or more
//     without the DER sign byte is read as unsigned, as sloppy encoders write it.
#include "crypto/der.h"

#include <cstdint>

#include "crypto/codec.h"

namespace tessel {
namespace {

constexpr std::size_t kMaxModulusBytes = 280;

struct Cursor {
  const std::uint8_t* p;
  std::size_t left;
};

// Reads tag and length; on success the cursor stands on the content, whose length is *length
// and which lies entirely within the input.
bool readHeader(Cursor& c, std::uint8_t tag, std::size_t* length) noexcept {
  if (c.left < 2 || c.p[0] != tag) return false;
  const std::uint8_t first = c.p[1];
  std::size_t header = 2, value = 0;
  if (first < 0x80) {
    value = first;
  } else if (first == 0x81) {
    if (c.left < 3 || c.p[2] < 0x80) return false;
    value = c.p[2];
    header = 3;
  } else if (first == 0x82) {
    if (c.left < 4 || c.p[2] == 0) return false;
    value = (static_cast<std::size_t>(c.p[2]) << 8) | c.p[3];
    header = 4;
  } else {
    return false;  // indefinite (0x80) or a length field we will never need
  }
  if (value > c.left - header) return false;
  c.p += header;
  c.left -= header;
  *length = value;
  return true;
}

}  // namespace

SecureBuffer derPublicKeyToModulusHex(const char* hexText) noexcept {
  if (!isHexText(hexText)) return SecureBuffer();
  const SecureBuffer der = hexDecode(hexText);
  if (!der) return SecureBuffer();

  Cursor c{der.data(), der.size()};
  std::size_t sequenceLength = 0, modulusLength = 0, exponentLength = 0;
  if (!readHeader(c, 0x30, &sequenceLength) || sequenceLength != c.left) return SecureBuffer();
  if (!readHeader(c, 0x02, &modulusLength) || modulusLength == 0) return SecureBuffer();
  const std::uint8_t* modulus = c.p;
  c.p += modulusLength;
  c.left -= modulusLength;
  if (!readHeader(c, 0x02, &exponentLength) || exponentLength != 3 || c.left != 3 ||
      c.p[0] != 0x01 || c.p[1] != 0x00 || c.p[2] != 0x01)
    return SecureBuffer();

  while (modulusLength > 0 && *modulus == 0) {
    ++modulus;
    --modulusLength;
  }
  if (modulusLength == 0 || modulusLength > kMaxModulusBytes) return SecureBuffer();
  return hexEncode(modulus, modulusLength);
}

}  // namespace tessel
