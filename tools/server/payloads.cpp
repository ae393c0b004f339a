// Payload layouts per type (see payloads.h). Decrypted bytes never reach a message.
#include "server/payloads.h"

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <cstring>

#include "server/bytes.h"

namespace tessel::server {
namespace {

bool rejected(std::string* error) { return fail(error, kRejected); }

bool decode(bool hex, const std::string& text, std::string* out, std::string* error) {
  return hex ? fromHex(text, out, "RSA value", error) : fromBase64(text, out, "RSA value", error);
}

// The message of a "Keyou" block: two length digits (the tens "digit" of 100 and more runs past
// '9' in ASCII), the message, filler. Checked with masks over the whole block; an invalid block
// gives the key's synthetic message for `cipher` instead, through the same copy.
std::string keyouMessage(const PrivateKey& key, const std::string& cipher, const std::string& block) {
  const std::size_t k = block.size();
  const auto* b = reinterpret_cast<const unsigned char*>(block.data());
  const std::uint32_t b0 = b[0], b1 = b[1];
  const std::uint32_t digits = ~ctLt(b0, '0') & ~ctLt(b1, '0') & ~ctLt('9', b1);
  const std::uint32_t m = ctSelect(digits, (b0 - '0') * 10 + (b1 - '0'), 0);
  const std::uint32_t valid = digits & ~ctIsZero(m) & ~ctLt(static_cast<std::uint32_t>(k - 2), m);
  std::string synthetic = key.syntheticMessage(cipher, 0);
  const std::uint32_t synthIndex = static_cast<std::uint32_t>(k - synthetic.size());
  synthetic.insert(0, synthIndex, '\0');
  const std::uint32_t from = ctSelect(valid, 2, synthIndex);
  const std::uint32_t length = ctSelect(valid, m, static_cast<std::uint32_t>(k) - synthIndex);
  std::string out(length, '\0');
  const auto* s = reinterpret_cast<const unsigned char*>(synthetic.data());
  for (std::size_t j = 0; j < length; ++j) out[j] = static_cast<char>(ctSelect(valid, b[from + j], s[from + j]));
  wipeString(&synthetic);
  return out;
}

bool openKeyou(bool hex, const PrivateKey& key, const std::string& text, std::string* plain, std::string* error) {
  std::string cipher, block;
  Wiped w{block};
  if (!decode(hex, text, &cipher, error) || !key.decryptRaw(cipher, &block, error)) return false;
  wipeString(plain);
  *plain = keyouMessage(key, cipher, block);
  return true;
}

bool openPkcs1(bool hex, const PrivateKey& key, const std::string& text, std::size_t length, std::string* plain,
               std::string* error) {
  std::string cipher;
  return decode(hex, text, &cipher, error) && key.decryptPkcs1(cipher, length, plain, error);
}

}  // namespace

bool openPkcs1Hex(const PrivateKey& key, const std::string& hex, std::string* plain, std::string* error) {
  return openPkcs1(true, key, hex, 0, plain, error);
}

bool openPkcs1Base64(const PrivateKey& key, const std::string& b64, std::string* plain, std::string* error) {
  return openPkcs1(false, key, b64, 0, plain, error);
}

bool openKeyouHex(const PrivateKey& key, const std::string& hex, std::string* plain, std::string* error) {
  return openKeyou(true, key, hex, plain, error);
}

bool openKeyouBase64(const PrivateKey& key, const std::string& b64, std::string* plain, std::string* error) {
  return openKeyou(false, key, b64, plain, error);
}

bool parseLengthPrefixedPair(const std::string& pair, std::string* timestamp, std::string* text,
                             std::string* error) {
  auto number = [&](std::size_t at, std::size_t width, std::size_t* v) {
    if (at + width > pair.size()) return false;
    std::size_t value = 0;
    for (std::size_t k = at; k < at + width; ++k) {
      if (pair[k] < '0' || pair[k] > '9') return false;
      value = value * 10 + static_cast<std::size_t>(pair[k] - '0');
    }
    if ((width == 3) != (value >= 100)) return false;
    *v = value;
    return true;
  };
  for (std::size_t w1 = 2; w1 <= 3; ++w1) {
    std::size_t tsLen = 0;
    if (!number(0, w1, &tsLen) || w1 + tsLen > pair.size()) continue;
    for (std::size_t w2 = 2; w2 <= 3; ++w2) {
      std::size_t textLen = 0;
      if (!number(w1 + tsLen, w2, &textLen) || w1 + tsLen + w2 + textLen != pair.size()) continue;
      timestamp->assign(pair, w1, tsLen);
      wipeString(text);
      text->assign(pair, w1 + tsLen + w2, textLen);
      return true;
    }
  }
  return rejected(error);
}

bool openType5(const PrivateKey& enc, const std::string& payload, std::string* sha1Hex, std::string* error) {
  if (payload.size() < 4 || payload.compare(payload.size() - 4, 4, "0001") != 0) return rejected(error);
  std::string cipher;
  if (!fromHex(payload.substr(0, payload.size() - 4), &cipher, "type 5 payload", error)) return false;
  std::reverse(cipher.begin(), cipher.end());
  return enc.decryptPkcs1(cipher, 40, sha1Hex, error);
}

bool openType19(const PrivateKey& enc, const std::string& payload, std::string* text, std::string* error) {
  std::string plain;
  Wiped w{plain};
  if (!openPkcs1Hex(enc, payload, &plain, error)) return false;
  if (plain.size() < 5 || plain.compare(0, 3, "011") != 0) return rejected(error);
  const std::size_t digits = plain.size() - 5 < 100 ? 2 : 3;
  const std::size_t n = plain.size() - 3 - digits;
  char expected[24];
  std::snprintf(expected, sizeof expected, "%02zu", n);
  if (plain.compare(3, digits, expected) != 0) return rejected(error);
  wipeString(text);
  text->assign(plain, 3 + digits, n);
  return true;
}

bool openType38(const PrivateKey& enc, const std::string& payload, std::string* pin, std::string* error) {
  if (payload.size() <= 16) return rejected(error);
  std::string block, der, plainBlock, hex;
  Wiped w1{der}, w2{plainBlock}, w3{hex};
  if (!fromHex(payload.substr(0, 16), &block, "type 38 PIN block", error) ||
      !openPkcs1(true, enc, payload.substr(16), 30, &der, error))
    return false;
  static const unsigned char kHead[4] = {0x30, 0x1C, 0x04, 0x10};
  static const unsigned char kTail[10] = {0x04, 0x08, 0x99, 0x99, 0x99, 0x99, 0x99, 0x99, 0x99, 0x99};
  if (std::memcmp(der.data(), kHead, 4) != 0 || std::memcmp(der.data() + 20, kTail, 10) != 0) return rejected(error);
  if (!cipherPass("DES-EDE-ECB", false, der.substr(4, 16), 0, block, &plainBlock, error)) return false;
  hex = toHex(plainBlock, true);
  const std::size_t f = hex.find('F');
  const std::size_t n = f == std::string::npos ? hex.size() : f;
  if (n > 12 || hex.find_first_not_of("0123456789") < n ||
      (f != std::string::npos && hex.find_first_not_of('F', f) != std::string::npos))
    return rejected(error);
  wipeString(pin);
  pin->assign(hex, 0, n);
  return true;
}

bool derivePinKey68(const std::string& masterHex, const std::string& aHex, const std::string& bHex,
                    std::string* pinKey, std::string* error) {
  std::string master, a, b, working;
  Wiped w1{master}, w2{a}, w3{b}, w4{working};
  if (masterHex.size() != 32 || aHex.size() != 32 || bHex.size() != 32)
    return fail(error, "type 68 keys must be 32 hex characters each");
  return fromHex(masterHex, &master, "master key", error) && fromHex(aHex, &a, "A", error) &&
         fromHex(bHex, &b, "B", error) && cipherPass("DES-EDE-ECB", false, master, 0, a, &working, error) &&
         cipherPass("DES-EDE-ECB", false, working, 0, b, pinKey, error);
}

bool openType68(const PrivateKey& enc, const std::string& payload, const std::string& pinKey,
                std::string* pin, std::string* error) {
  if (pinKey.size() != 16) return fail(error, "type 68 needs the 16-byte PIN key");
  std::string sealed, block, hex;
  Wiped w1{sealed}, w2{block}, w3{hex};
  if (!openPkcs1(true, enc, payload, 8, &sealed, error)) return false;
  if (!cipherPass("DES-EDE-ECB", false, pinKey, 0, sealed, &block, error)) return false;
  hex = toHex(block, true);
  const std::size_t n = static_cast<std::size_t>(hex[1] >= 'A' ? hex[1] - 'A' + 10 : hex[1] - '0');
  if (hex[0] != '0' || n < 4 || n > 12 || hex.find_first_not_of("0123456789", 2) < 2 + n ||
      hex.find_first_not_of('F', 2 + n) != std::string::npos)
    return rejected(error);
  wipeString(pin);
  pin->assign(hex, 2, n);
  return true;
}

bool openPayload(Inner inner, const std::string& value, const PrivateKey& key, const std::string& pinKey,
                 std::string* content, std::string* pairTimestamp, std::string* error) {
  switch (inner) {
    case Inner::KeyouHex: return openKeyouHex(key, value, content, error);
    case Inner::KeyouBase64: return openKeyouBase64(key, value, content, error);
    case Inner::Pkcs1Hex: case Inner::HashedRsa: return openPkcs1Hex(key, value, content, error);
    case Inner::Pkcs1Base64: return openPkcs1Base64(key, value, content, error);
    case Inner::PairPkcs1Hex:
    case Inner::PairPkcs1Base64: {
      std::string plain;
      Wiped w{plain};
      return openPkcs1(inner == Inner::PairPkcs1Hex, key, value, 0, &plain, error) &&
             parseLengthPrefixedPair(plain, pairTimestamp, content, error);
    }
    case Inner::Type5: return openType5(key, value, content, error);
    case Inner::Type19: return openType19(key, value, content, error);
    case Inner::Type38: return openType38(key, value, content, error);
    case Inner::Type68: return openType68(key, value, pinKey, content, error);
    case Inner::None: case Inner::Text: case Inner::Hashed: break;
  }
  return fail(error, "nothing to open");
}

bool checkSealedShape(Inner inner, const std::string& payload, std::string* error) {
  std::string rsa = payload, raw;
  bool ok = true;
  if (inner == Inner::KeyouBase64 || inner == Inner::Pkcs1Base64 || inner == Inner::PairPkcs1Base64) {
    ok = fromBase64(payload, &raw, "payload", nullptr);
  } else {
    if (inner == Inner::Type5) {
      ok = rsa.size() > 4 && rsa.compare(rsa.size() - 4, 4, "0001") == 0;
      if (ok) rsa.resize(rsa.size() - 4);
    } else if (inner == Inner::Type38) {
      ok = rsa.size() > 16 && fromHex(rsa.substr(0, 16), &raw, "payload", nullptr);
      if (ok) rsa.erase(0, 16);
    }
    ok = ok && fromHex(rsa, &raw, "payload", nullptr);
  }
  if (!ok || raw.size() < 64) return rejected(error);
  return true;
}

}  // namespace tessel::server
