// RSA public operation over hex texts, on BigNumber. The padded block (x) and its power are
// secrets of the caller: both are wiped before returning, on every path.
#include "crypto/rsa.h"

#include "crypto/bignum.h"
#include "crypto/wipe.h"

namespace tessel {
namespace {
constexpr std::uint32_t kPublicExponent = 65537;
}

std::size_t rsaModulusBytes(const char* modulusHex) noexcept {
  BigNumber n;
  if (!bnRead(modulusHex, 16, n)) return 0;
  return (bnBitLength(n) + 7) / 8;
}

SecureBuffer rsaPublicHex(const char* modulusHex, const char* dataHex) noexcept {
  static const char kDigits[] = "0123456789ABCDEF";
  BigNumber n, x;
  SecureBuffer out;
  if (modulusHex == nullptr || dataHex == nullptr) return out;
  const bool readable = bnRead(modulusHex, 16, n) && bnRead(dataHex, 16, x);
  if (readable && n.count != 0 && bnCompare(x, n) < 0) {
    const std::size_t k = (bnBitLength(n) + 7) / 8;
    BigNumber y;
    if (bnModExp(x, bnFromU64(kPublicExponent), n, y)) {
      // Exactly 2k digits: y < n < 2^(8k), so the leading zeros are part of the fixed width.
      out = SecureBuffer::allocate(2 * k);
      if (out)
        for (std::size_t d = 0; d < 2 * k; ++d) {
          const std::size_t nibble = 2 * k - 1 - d;
          out.c_str()[d] = kDigits[(y.limbs[nibble / 8] >> (4 * (nibble % 8))) & 15u];
        }
    }
    wipeObject(y);
  }
  wipeObject(x);
  return out;
}

}  // namespace tessel
