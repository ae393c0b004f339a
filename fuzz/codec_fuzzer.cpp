// Fuzzes the hex and base64 codecs against small reference decoders written here, plus the
// round trips: hexDecode(hexEncode(b)) == b, base64Decode(base64Encode(b)) == b, and for every
// base64 text the decoder accepts, base64Encode(base64Decode(t)) == t (canonical input only).
//
// Input: the raw bytes are the byte string for the encoders and the base64 text; the bytes up
// to the first NUL are the hex text.
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string>

#include "crypto/codec.h"
#include "fuzz_support.h"

namespace {

using tessel::SecureBuffer;

const char kAlphabet[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

int nibble(unsigned char c) {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  return -1;
}

int base64Value(unsigned char c) {
  const char* at = c != 0 ? std::strchr(kAlphabet, c) : nullptr;
  return at != nullptr ? static_cast<int>(at - kAlphabet) : -1;
}

// Lenient hex: odd length gets a leading "0", other characters count as 0.
std::string referenceHexDecode(const std::string& text) {
  const std::string t = (text.size() % 2 ? "0" : "") + text;
  std::string out;
  for (std::size_t k = 0; k < t.size(); k += 2) {
    const int hi = nibble(static_cast<unsigned char>(t[k]));
    const int lo = nibble(static_cast<unsigned char>(t[k + 1]));
    out += static_cast<char>(((hi < 0 ? 0 : hi) << 4) | (lo < 0 ? 0 : lo));
  }
  return out;
}

// Canonical base64: length a multiple of four, alphabet only, at most two final "=", zero bits
// under the padding.
bool referenceBase64Valid(const std::uint8_t* p, std::size_t n) {
  if (n % 4 != 0) return false;
  std::size_t pad = 0;
  while (pad < 2 && pad < n && p[n - 1 - pad] == '=') ++pad;
  for (std::size_t k = 0; k < n - pad; ++k)
    if (base64Value(p[k]) < 0) return false;
  if (pad == 1 && (base64Value(p[n - 2]) & 3) != 0) return false;
  if (pad == 2 && (base64Value(p[n - 3]) & 15) != 0) return false;
  return true;
}

std::string bytesOf(const SecureBuffer& b) {
  FUZZ_CHECK(b);
  return std::string(reinterpret_cast<const char*>(b.data()), b.size());
}

void checkHex(const std::string& text) {
  const std::string decoded = bytesOf(tessel::hexDecode(text.c_str()));
  FUZZ_CHECK(decoded.size() == (text.size() + 1) / 2);
  FUZZ_CHECK(decoded == referenceHexDecode(text));

  std::string noSpace;
  for (char c : text)
    if (std::strchr(" \f\n\r\t\v", c) == nullptr) noSpace += c;
  FUZZ_CHECK(bytesOf(tessel::hexDecodeSkippingSpace(text.c_str())) == referenceHexDecode(noSpace));

  bool allHex = !text.empty();
  for (char c : text) allHex = allHex && nibble(static_cast<unsigned char>(c)) >= 0;
  FUZZ_CHECK(tessel::isHexText(text.c_str()) == allHex);
  if (allHex) {
    std::string upper = (text.size() % 2 ? "0" : "") + text;
    for (char& c : upper)
      if (c >= 'a' && c <= 'f') c = static_cast<char>(c - 'a' + 'A');
    const SecureBuffer again = tessel::hexEncode(reinterpret_cast<const std::uint8_t*>(decoded.data()), decoded.size());
    FUZZ_CHECK(bytesOf(again) == upper);
  }
}

void checkEncoders(const std::uint8_t* data, std::size_t size) {
  const std::string original(reinterpret_cast<const char*>(data), size);
  for (bool upper : {true, false}) {
    const SecureBuffer hex = upper ? tessel::hexEncode(data, size) : tessel::hexEncodeLower(data, size);
    const std::string h = bytesOf(hex);
    FUZZ_CHECK(h.size() == 2 * size && std::strlen(hex.c_str()) == h.size());
    FUZZ_CHECK(tessel_fuzz::isHexOf(h, upper));
    FUZZ_CHECK(bytesOf(tessel::hexDecode(hex.c_str())) == original);
  }
  const SecureBuffer b64 = tessel::base64Encode(data, size);
  const std::string t = bytesOf(b64);
  FUZZ_CHECK(t.size() == (size + 2) / 3 * 4 && std::strlen(b64.c_str()) == t.size());
  FUZZ_CHECK(referenceBase64Valid(b64.data(), b64.size()));
  FUZZ_CHECK(bytesOf(tessel::base64Decode(b64.c_str(), b64.size())) == original);
}

void checkBase64Decode(const std::uint8_t* data, std::size_t size) {
  const SecureBuffer decoded = tessel::base64Decode(reinterpret_cast<const char*>(data), size);
  FUZZ_CHECK(static_cast<bool>(decoded) == referenceBase64Valid(data, size));
  if (!decoded) return;
  FUZZ_CHECK(decoded.size() <= size / 4 * 3);
  const SecureBuffer again = tessel::base64Encode(decoded.data(), decoded.size());
  FUZZ_CHECK(bytesOf(again) == std::string(reinterpret_cast<const char*>(data), size));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size > 8192) return 0;
  const std::string text(reinterpret_cast<const char*>(data), strnlen(reinterpret_cast<const char*>(data), size));
  checkHex(text);
  checkEncoders(data, size);
  checkBase64Decode(data, size);
  return 0;
}
