// Hex and base64 codecs. Table-driven, no locale, no branches on secret data beyond the
// lenient hex lookup (which is a table read).
#include "crypto/codec.h"

#include <cstring>

namespace tessel {
namespace {

const char kHexUpper[] = "0123456789ABCDEF";
const char kHexLower[] = "0123456789abcdef";
const char kBase64[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

// Value of a hex digit, or -1 for anything else.
inline int hexValue(unsigned char c) noexcept {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  return -1;
}

inline bool isSkippedSpace(unsigned char c) noexcept {
  return c == ' ' || c == '\f' || c == '\n' || c == '\r' || c == '\t' || c == '\v';
}

SecureBuffer encodeHex(const std::uint8_t* bytes, std::size_t n, const char* digits) noexcept {
  if (n > (SIZE_MAX - 1) / 2) return SecureBuffer();
  SecureBuffer out = SecureBuffer::allocate(2 * n);
  if (!out) return out;
  char* p = out.c_str();
  for (std::size_t k = 0; k < n; ++k) {
    p[2 * k] = digits[bytes[k] >> 4];
    p[2 * k + 1] = digits[bytes[k] & 15];
  }
  return out;
}

// Shared by both decoders: digits are the nibble values of the significant characters.
SecureBuffer decodeHex(const char* text, bool skipSpace) noexcept {
  if (text == nullptr) return SecureBuffer();
  std::size_t digits = 0;
  for (const char* p = text; *p; ++p)
    if (!skipSpace || !isSkippedSpace(static_cast<unsigned char>(*p))) ++digits;
  SecureBuffer out = SecureBuffer::allocate((digits + 1) / 2);
  if (!out) return out;
  // An odd count behaves as if a "0" stood in front: the first digit fills a low nibble.
  std::size_t nibble = digits & 1;
  for (const char* p = text; *p; ++p) {
    const unsigned char c = static_cast<unsigned char>(*p);
    if (skipSpace && isSkippedSpace(c)) continue;
    const int v = hexValue(c);
    const unsigned value = v < 0 ? 0u : static_cast<unsigned>(v);
    std::uint8_t& b = out.data()[nibble / 2];
    b = static_cast<std::uint8_t>((nibble & 1) ? (b | value) : (value << 4));
    ++nibble;
  }
  return out;
}

}  // namespace

SecureBuffer hexEncode(const std::uint8_t* bytes, std::size_t n) noexcept {
  return encodeHex(bytes, n, kHexUpper);
}

SecureBuffer hexEncodeLower(const std::uint8_t* bytes, std::size_t n) noexcept {
  return encodeHex(bytes, n, kHexLower);
}

SecureBuffer hexDecode(const char* text) noexcept { return decodeHex(text, false); }

SecureBuffer hexDecodeSkippingSpace(const char* text) noexcept { return decodeHex(text, true); }

bool isHexText(const char* text) noexcept {
  if (text == nullptr || *text == '\0') return false;
  for (const char* p = text; *p; ++p)
    if (hexValue(static_cast<unsigned char>(*p)) < 0) return false;
  return true;
}

SecureBuffer base64Encode(const std::uint8_t* bytes, std::size_t n) noexcept {
  if (n > (SIZE_MAX / 4) * 3 - 3) return SecureBuffer();
  SecureBuffer out = SecureBuffer::allocate((n + 2) / 3 * 4);
  if (!out) return out;
  char* p = out.c_str();
  std::size_t k = 0;
  for (; k + 3 <= n; k += 3) {
    const std::uint32_t v = (std::uint32_t{bytes[k]} << 16) | (std::uint32_t{bytes[k + 1]} << 8) | bytes[k + 2];
    *p++ = kBase64[v >> 18];
    *p++ = kBase64[(v >> 12) & 63];
    *p++ = kBase64[(v >> 6) & 63];
    *p++ = kBase64[v & 63];
  }
  if (k < n) {
    std::uint32_t v = std::uint32_t{bytes[k]} << 16;
    if (k + 1 < n) v |= std::uint32_t{bytes[k + 1]} << 8;
    *p++ = kBase64[v >> 18];
    *p++ = kBase64[(v >> 12) & 63];
    *p++ = (k + 1 < n) ? kBase64[(v >> 6) & 63] : '=';
    *p++ = '=';
  }
  return out;
}

SecureBuffer base64Decode(const char* text, std::size_t length) noexcept {
  if (text == nullptr || length % 4 != 0) return SecureBuffer();
  static const struct Table {
    signed char v[256];
    Table() {
      std::memset(v, -1, sizeof v);
      for (int k = 0; k < 64; ++k) v[static_cast<unsigned char>(kBase64[k])] = static_cast<signed char>(k);
    }
  } table;
  std::size_t pad = 0;
  if (length >= 4 && text[length - 1] == '=') pad = (text[length - 2] == '=') ? 2 : 1;
  SecureBuffer out = SecureBuffer::allocate(length / 4 * 3 - pad);
  if (!out) return out;
  std::uint8_t* o = out.data();
  for (std::size_t k = 0; k < length; k += 4) {
    const bool last = (k + 4 == length);
    std::uint32_t v = 0;
    for (std::size_t q = 0; q < 4; ++q) {
      const unsigned char c = static_cast<unsigned char>(text[k + q]);
      int d = table.v[c];
      if (d < 0) {
        if (!(last && c == '=' && q >= 4 - pad)) return SecureBuffer();
        d = 0;
      }
      v = (v << 6) | static_cast<std::uint32_t>(d);
    }
    // Non-canonical encodings (stray bits under the padding) are refused.
    if (last && pad == 2 && (v & 0xFFFF) != 0) return SecureBuffer();
    if (last && pad == 1 && (v & 0xFF) != 0) return SecureBuffer();
    *o++ = static_cast<std::uint8_t>(v >> 16);
    if (!(last && pad == 2)) *o++ = static_cast<std::uint8_t>(v >> 8);
    if (!(last && pad >= 1)) *o++ = static_cast<std::uint8_t>(v);
  }
  return out;
}

}  // namespace tessel
