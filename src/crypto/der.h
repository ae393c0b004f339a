// Reader of an RSA public key in DER (PKCS#1 RSAPublicKey) given as hex text.
#pragma once

#include "crypto/secure_buffer.h"

namespace tessel {

// The hex text (odd length read with a leading "0") must decode to a SEQUENCE whose content is
// exactly two INTEGERs, the second being 01 00 01. Returns the modulus as upper-case hex with
// its leading zero bytes skipped, or absent.
SecureBuffer derPublicKeyToModulusHex(const char* hexText) noexcept;

}  // namespace tessel
