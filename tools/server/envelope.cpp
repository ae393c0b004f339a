// Server-side opener on OpenSSL's libcrypto: envelope layout checks, RSA unwrap, RC4, payload
// layouts per encryption type. RC4 lives in OpenSSL 3's legacy provider, so it is fetched from
// a private library context (the caller's default context is left exactly as it was).
// Everything that held opened bytes is wiped before release; messages never carry plaintext.
#include "server/envelope.h"

#include <openssl/bio.h>
#include <openssl/bn.h>
#include <openssl/core_names.h>
#include <openssl/crypto.h>
#include <openssl/evp.h>
#include <openssl/pem.h>
#include <openssl/provider.h>
#include <openssl/rsa.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <sstream>

namespace tessel::server {
namespace {

const unsigned char kSimpleBlobHeader[12] = {0x01, 0x02, 0x00, 0x00, 0x01, 0x68,
                                             0x00, 0x00, 0x00, 0xA4, 0x00, 0x00};

bool fail(std::string* error, const std::string& message) {
  if (error != nullptr) *error = message;
  return false;
}

// Wipes a string when it goes out of scope.
struct WipeOnExit {
  std::string& s;
  ~WipeOnExit() { wipeString(&s); }
};

int hexValue(char c) {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  return -1;
}

bool hexToBytes(const std::string& hex, std::string* out, const char* what, std::string* error) {
  if (hex.size() % 2 != 0) return fail(error, std::string(what) + ": odd number of hex digits");
  out->assign(hex.size() / 2, '\0');
  for (std::size_t k = 0; k < out->size(); ++k) {
    const int hi = hexValue(hex[2 * k]), lo = hexValue(hex[2 * k + 1]);
    if (hi < 0 || lo < 0) return fail(error, std::string(what) + ": not hexadecimal");
    (*out)[k] = static_cast<char>(hi * 16 + lo);
  }
  return true;
}

std::string bytesToHex(const std::string& bytes, bool upper) {
  const char* digits = upper ? "0123456789ABCDEF" : "0123456789abcdef";
  std::string out;
  out.reserve(bytes.size() * 2);
  for (unsigned char b : bytes) {
    out += digits[b >> 4];
    out += digits[b & 15];
  }
  return out;
}

bool base64ToBytes(const std::string& text, std::string* out, const char* what, std::string* error) {
  if (text.empty()) return fail(error, std::string(what) + ": empty");
  if (text.size() > (1u << 30)) return fail(error, std::string(what) + ": too long");
  EVP_ENCODE_CTX* ctx = EVP_ENCODE_CTX_new();
  if (ctx == nullptr) return fail(error, "out of memory");
  out->assign(text.size() / 4 * 3 + 3, '\0');
  int n = 0, tail = 0;
  EVP_DecodeInit(ctx);
  const int rc = EVP_DecodeUpdate(ctx, reinterpret_cast<unsigned char*>(&(*out)[0]), &n,
                                  reinterpret_cast<const unsigned char*>(text.data()),
                                  static_cast<int>(text.size()));
  const int rcFinal = rc < 0 ? -1 : EVP_DecodeFinal(ctx, reinterpret_cast<unsigned char*>(&(*out)[n]), &tail);
  EVP_ENCODE_CTX_free(ctx);
  if (rc < 0 || rcFinal < 0) {
    wipeString(out);
    return fail(error, std::string(what) + ": not valid base64 (corrupt or truncated)");
  }
  out->resize(static_cast<std::size_t>(n + tail));
  return true;
}

// Eight ASCII digits at p as a number.
bool readDecimal8(const unsigned char* p, std::size_t* value) {
  std::size_t v = 0;
  for (int k = 0; k < 8; ++k) {
    if (p[k] < '0' || p[k] > '9') return false;
    v = v * 10 + (p[k] - '0');
  }
  *value = v;
  return true;
}

OSSL_LIB_CTX* legacyContext() {
  static OSSL_LIB_CTX* ctx = [] {
    OSSL_LIB_CTX* c = OSSL_LIB_CTX_new();
    if (c != nullptr) {
      OSSL_PROVIDER_load(c, "default");
      OSSL_PROVIDER_load(c, "legacy");
    }
    return c;
  }();
  return ctx;
}

// One cipher pass (ECB or stream) over data with an OpenSSL cipher; `skip` bytes of keystream
// are consumed first (RC4).
bool cipherPass(const char* name, OSSL_LIB_CTX* libctx, bool encrypt, const std::string& key,
                std::size_t skip, const std::string& in, std::string* out, std::string* error) {
  EVP_CIPHER* cipher = EVP_CIPHER_fetch(libctx, name, nullptr);
  if (cipher == nullptr)
    return fail(error, std::string("OpenSSL has no ") + name + " (is the legacy provider installed?)");
  EVP_CIPHER_CTX* ctx = EVP_CIPHER_CTX_new();
  bool ok = ctx != nullptr &&
            EVP_CipherInit_ex2(ctx, cipher, nullptr, nullptr, encrypt ? 1 : 0, nullptr) == 1 &&
            EVP_CIPHER_CTX_set_key_length(ctx, static_cast<int>(key.size())) == 1 &&
            EVP_CipherInit_ex2(ctx, nullptr, reinterpret_cast<const unsigned char*>(key.data()),
                               nullptr, -1, nullptr) == 1 &&
            EVP_CIPHER_CTX_set_padding(ctx, 0) == 1;
  int n = 0;
  if (ok && skip > 0) {
    std::string zeros(skip, '\0'), junk(skip + 32, '\0');
    ok = EVP_CipherUpdate(ctx, reinterpret_cast<unsigned char*>(&junk[0]), &n,
                          reinterpret_cast<const unsigned char*>(zeros.data()), static_cast<int>(skip)) == 1;
    wipeString(&junk);
  }
  out->assign(in.size() + 32, '\0');
  int total = 0;
  if (ok && !in.empty()) {
    ok = EVP_CipherUpdate(ctx, reinterpret_cast<unsigned char*>(&(*out)[0]), &n,
                          reinterpret_cast<const unsigned char*>(in.data()), static_cast<int>(in.size())) == 1;
    total = n;
  }
  if (ok) {
    ok = EVP_CipherFinal_ex(ctx, reinterpret_cast<unsigned char*>(&(*out)[total]), &n) == 1;
    total += n;
  }
  EVP_CIPHER_CTX_free(ctx);
  EVP_CIPHER_free(cipher);
  if (!ok) {
    wipeString(out);
    return fail(error, std::string(name) + " failed");
  }
  out->resize(static_cast<std::size_t>(total));
  return true;
}

bool rsaDecrypt(const PrivateKey& key, int padding, const std::string& cipher, std::string* plain,
                std::string* error) {
  if (!key.loaded()) return fail(error, "no private key loaded");
  if (cipher.size() != key.size())
    return fail(error, "RSA value of " + std::to_string(cipher.size()) + " bytes does not match the " +
                           std::to_string(key.size()) + "-byte key (foreign key?)");
  EVP_PKEY_CTX* ctx = EVP_PKEY_CTX_new(key.get(), nullptr);
  if (ctx == nullptr) return fail(error, "out of memory");
  bool ok = EVP_PKEY_decrypt_init(ctx) == 1 && EVP_PKEY_CTX_set_rsa_padding(ctx, padding) == 1;
  // Newer OpenSSL answers a bad PKCS#1 block with random bytes unless told otherwise; a server
  // that reports errors per message wants the explicit failure. Unknown on 3.0: ignored.
  if (ok && padding == RSA_PKCS1_PADDING) EVP_PKEY_CTX_ctrl_str(ctx, "rsa_pkcs1_implicit_rejection", "0");
  std::size_t n = 0;
  ok = ok && EVP_PKEY_decrypt(ctx, nullptr, &n, reinterpret_cast<const unsigned char*>(cipher.data()),
                              cipher.size()) == 1;
  if (ok) {
    plain->assign(n, '\0');
    ok = EVP_PKEY_decrypt(ctx, reinterpret_cast<unsigned char*>(&(*plain)[0]), &n,
                          reinterpret_cast<const unsigned char*>(cipher.data()), cipher.size()) == 1;
    if (ok) {
      plain->resize(n);
    } else {
      wipeString(plain);
    }
  }
  EVP_PKEY_CTX_free(ctx);
  if (!ok) return fail(error, "RSA decryption failed (wrong key or corrupt value)");
  return true;
}

}  // namespace

void wipeString(std::string* s) {
  if (s == nullptr || s->empty()) return;
  OPENSSL_cleanse(&(*s)[0], s->size());
  s->clear();
}

// ---- PrivateKey

PrivateKey::~PrivateKey() { EVP_PKEY_free(key_); }

PrivateKey::PrivateKey(PrivateKey&& other) noexcept : key_(other.key_) { other.key_ = nullptr; }

PrivateKey& PrivateKey::operator=(PrivateKey&& other) noexcept {
  if (this != &other) {
    EVP_PKEY_free(key_);
    key_ = other.key_;
    other.key_ = nullptr;
  }
  return *this;
}

bool PrivateKey::loadPem(const std::string& pem, std::string* error) {
  BIO* bio = BIO_new_mem_buf(pem.data(), static_cast<int>(pem.size()));
  if (bio == nullptr) return fail(error, "out of memory");
  EVP_PKEY* key = PEM_read_bio_PrivateKey(bio, nullptr, nullptr, nullptr);
  BIO_free(bio);
  if (key == nullptr) return fail(error, "not a PEM private key");
  if (EVP_PKEY_get_base_id(key) != EVP_PKEY_RSA) {
    EVP_PKEY_free(key);
    return fail(error, "not an RSA private key");
  }
  EVP_PKEY_free(key_);
  key_ = key;
  return true;
}

bool PrivateKey::loadPemFile(const std::string& path, std::string* error) {
  std::ifstream in(path, std::ios::binary);
  if (!in) return fail(error, "cannot read " + path);
  std::ostringstream text;
  text << in.rdbuf();
  std::string pem = text.str();
  WipeOnExit wipe{pem};
  if (!loadPem(pem, error)) return fail(error, path + ": " + *error);
  return true;
}

std::size_t PrivateKey::size() const {
  return key_ == nullptr ? 0 : static_cast<std::size_t>(EVP_PKEY_get_size(key_));
}

std::string PrivateKey::modulusHex() const {
  if (key_ == nullptr) return std::string();
  BIGNUM* n = nullptr;
  if (EVP_PKEY_get_bn_param(key_, OSSL_PKEY_PARAM_RSA_N, &n) != 1) return std::string();
  char* hex = BN_bn2hex(n);
  std::string out = hex != nullptr ? hex : "";
  OPENSSL_free(hex);
  BN_free(n);
  return out;
}

// ---- envelope

std::size_t envelopeDrop(int type) {
  if (type == 1 || type == 33) return 625;
  if (type == 88) return 768;
  return 512;
}

namespace {

bool checkLayout(const std::string& raw, EnvelopeLayout* layout, std::string* error) {
  const auto* p = reinterpret_cast<const unsigned char*>(raw.data());
  if (raw.size() < 8 + 12) return fail(error, "envelope truncated: " + std::to_string(raw.size()) + " bytes");
  std::size_t blob = 0;
  if (!readDecimal8(p, &blob)) return fail(error, "envelope does not start with an 8-digit key length");
  if (blob < 12 + 1) return fail(error, "envelope key length field " + std::to_string(blob) + " is too small");
  if (std::memcmp(p + 8, kSimpleBlobHeader, sizeof kSimpleBlobHeader) != 0)
    return fail(error, "envelope key header is not an RC4 SIMPLEBLOB wrapped with RSA");
  if (raw.size() < 8 + blob + 8)
    return fail(error, "envelope truncated inside the wrapped key (" + std::to_string(raw.size()) + " bytes)");
  std::size_t length = 0;
  if (!readDecimal8(p + 8 + blob, &length)) return fail(error, "envelope content length field is not 8 digits");
  const std::size_t expected = 8 + blob + 8 + length;
  if (raw.size() < expected)
    return fail(error, "envelope truncated: " + std::to_string(raw.size()) + " of " + std::to_string(expected) + " bytes");
  if (raw.size() > expected)
    return fail(error, "envelope has " + std::to_string(raw.size() - expected) + " bytes after its content");
  layout->keyBlobLength = blob;
  layout->rsaLength = blob - 12;
  layout->contentLength = length;
  layout->totalLength = raw.size();
  return true;
}

}  // namespace

bool parseEnvelope(const std::string& base64, EnvelopeLayout* layout, std::string* error) {
  std::string raw;
  WipeOnExit wipe{raw};
  if (!base64ToBytes(base64, &raw, "envelope", error)) return false;
  return checkLayout(raw, layout, error);
}

bool openEnvelope(const std::string& base64, const PrivateKey& key, std::size_t drop,
                  std::string* content, std::string* error) {
  std::string raw, wrappedKey, rc4Key;
  WipeOnExit w1{raw}, w2{wrappedKey}, w3{rc4Key};
  EnvelopeLayout layout;
  if (!base64ToBytes(base64, &raw, "envelope", error) || !checkLayout(raw, &layout, error)) return false;
  if (!key.loaded()) return fail(error, "no application-platform private key loaded");
  if (layout.rsaLength != key.size())
    return fail(error, "envelope key is wrapped for a " + std::to_string(layout.rsaLength * 8) +
                           "-bit key, the private key has " + std::to_string(key.size() * 8) + " bits (foreign envelope?)");
  wrappedKey.assign(raw, 20, layout.rsaLength);
  std::reverse(wrappedKey.begin(), wrappedKey.end());  // stored least significant byte first
  if (!rsaDecrypt(key, RSA_PKCS1_PADDING, wrappedKey, &rc4Key, error))
    return fail(error, "cannot unwrap the envelope key: " + *error);
  if (rc4Key.size() != 16)
    return fail(error, "envelope key is " + std::to_string(rc4Key.size()) + " bytes, expected 16");
  const std::string sealed(raw, 8 + layout.keyBlobLength + 8, layout.contentLength);
  return cipherPass("RC4", legacyContext(), true, rc4Key, drop, sealed, content, error);
}

bool splitWrapped(const std::string& content, Wrapped* out, std::string* error, bool atLastColon) {
  if (content.size() < 2) return fail(error, "wrapped content too short");
  const std::size_t colon = atLastColon ? content.rfind(':') : content.find(':', 1);
  if (colon == std::string::npos || colon == 0) return fail(error, "wrapped content has no ':' after the timestamp");
  const char letter = content[0];
  if (std::strchr("EWMSTR", letter) == nullptr || letter == '\0')
    return fail(error, "wrapped content does not start with a strength letter");
  out->strength = letter;
  out->timestamp.assign(content, 1, colon - 1);
  out->payload.assign(content, colon + 1, std::string::npos);
  return true;
}

// ---- RSA payloads

bool rsaPkcs1Decrypt(const PrivateKey& key, const std::string& cipher, std::string* plain, std::string* error) {
  return rsaDecrypt(key, RSA_PKCS1_PADDING, cipher, plain, error);
}

bool rsaRawDecrypt(const PrivateKey& key, const std::string& cipher, std::string* block, std::string* error) {
  return rsaDecrypt(key, RSA_NO_PADDING, cipher, block, error);
}

bool openPkcs1Hex(const PrivateKey& key, const std::string& hex, std::string* plain, std::string* error) {
  std::string cipher;
  return hexToBytes(hex, &cipher, "RSA value", error) && rsaPkcs1Decrypt(key, cipher, plain, error);
}

bool openPkcs1Base64(const PrivateKey& key, const std::string& b64, std::string* plain, std::string* error) {
  std::string cipher;
  return base64ToBytes(b64, &cipher, "RSA value", error) && rsaPkcs1Decrypt(key, cipher, plain, error);
}

bool parseKeyouBlock(const std::string& block, std::string* message, std::string* error) {
  if (block.size() < 3) return fail(error, "Keyou block too short");
  // The tens "digit" of a length of 100 or more runs past '9' in ASCII; read it as a value.
  const int tens = static_cast<unsigned char>(block[0]) - '0';
  const int units = static_cast<unsigned char>(block[1]) - '0';
  if (tens < 0 || units < 0 || units > 9) return fail(error, "Keyou block does not start with a length");
  const std::size_t m = static_cast<std::size_t>(tens * 10 + units);
  if (m == 0 || m + 2 > block.size()) return fail(error, "Keyou block length " + std::to_string(m) + " out of range");
  message->assign(block, 2, m);
  return true;
}

bool openKeyouHex(const PrivateKey& key, const std::string& hex, std::string* plain, std::string* error) {
  std::string cipher, block;
  WipeOnExit w{block};
  return hexToBytes(hex, &cipher, "RSA value", error) && rsaRawDecrypt(key, cipher, &block, error) &&
         parseKeyouBlock(block, plain, error);
}

bool openKeyouBase64(const PrivateKey& key, const std::string& b64, std::string* plain, std::string* error) {
  std::string cipher, block;
  WipeOnExit w{block};
  return base64ToBytes(b64, &cipher, "RSA value", error) && rsaRawDecrypt(key, cipher, &block, error) &&
         parseKeyouBlock(block, plain, error);
}

bool parseLengthPrefixedPair(const std::string& pair, std::string* timestamp, std::string* text,
                             std::string* error) {
  // "%02d": two digits below 100, three from 100 on. Try both widths for each length and take
  // the reading that consumes the pair exactly.
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
      text->assign(pair, w1 + tsLen + w2, textLen);
      return true;
    }
  }
  return fail(error, "length-prefixed pair is malformed");
}

bool openType5(const PrivateKey& enc, const std::string& payload, std::string* sha1Hex, std::string* error) {
  if (payload.size() < 4 || payload.compare(payload.size() - 4, 4, "0001") != 0)
    return fail(error, "type 5 payload does not end in 0001");
  std::string cipher;
  if (!hexToBytes(payload.substr(0, payload.size() - 4), &cipher, "type 5 payload", error)) return false;
  std::reverse(cipher.begin(), cipher.end());
  if (!rsaPkcs1Decrypt(enc, cipher, sha1Hex, error)) return false;
  if (sha1Hex->size() != 40) {
    wipeString(sha1Hex);
    return fail(error, "type 5 payload does not hold a SHA-1 hex digest");
  }
  return true;
}

bool openType19(const PrivateKey& enc, const std::string& payload, std::string* text, std::string* error) {
  std::string plain;
  WipeOnExit w{plain};
  if (!openPkcs1Hex(enc, payload, &plain, error)) return false;
  if (plain.size() < 5 || plain.compare(0, 3, "011") != 0) return fail(error, "type 19 block does not start with 011");
  // "%02d" of the text length: two digits below 100, three from 100 on.
  const std::size_t digits = plain.size() - 5 < 100 ? 2 : 3;
  const std::size_t n = plain.size() - 3 - digits;
  char expected[24];
  std::snprintf(expected, sizeof expected, "%02zu", n);
  if (plain.compare(3, digits, expected) != 0) return fail(error, "type 19 length does not match its text");
  text->assign(plain, 3 + digits, n);
  return true;
}

bool openType38(const PrivateKey& enc, const std::string& payload, std::string* pin, std::string* error) {
  if (payload.size() <= 16) return fail(error, "type 38 payload too short");
  std::string block, der, plainBlock, hex;
  WipeOnExit w1{der}, w2{plainBlock}, w3{hex};
  if (!hexToBytes(payload.substr(0, 16), &block, "type 38 PIN block", error) ||
      !openPkcs1Hex(enc, payload.substr(16), &der, error))
    return false;
  static const unsigned char kHead[4] = {0x30, 0x1C, 0x04, 0x10};
  static const unsigned char kTail[10] = {0x04, 0x08, 0x99, 0x99, 0x99, 0x99, 0x99, 0x99, 0x99, 0x99};
  if (der.size() != 30 || std::memcmp(der.data(), kHead, 4) != 0 || std::memcmp(der.data() + 20, kTail, 10) != 0)
    return fail(error, "type 38 key value is not the expected DER SEQUENCE");
  if (!cipherPass("DES-EDE-ECB", nullptr, false, der.substr(4, 16), 0, block, &plainBlock, error)) return false;
  hex = bytesToHex(plainBlock, true);
  const std::size_t f = hex.find('F');
  const std::string digits = hex.substr(0, f);
  if (digits.size() > 12 || digits.find_first_not_of("0123456789") != std::string::npos ||
      (f != std::string::npos && hex.find_first_not_of('F', f) != std::string::npos))
    return fail(error, "type 38 block is not digits padded with F");
  *pin = digits;
  return true;
}

bool derivePinKey68(const std::string& masterHex, const std::string& aHex, const std::string& bHex,
                    std::string* pinKey, std::string* error) {
  std::string master, a, b, working;
  WipeOnExit w1{master}, w2{a}, w3{b}, w4{working};
  if (masterHex.size() != 32 || aHex.size() != 32 || bHex.size() != 32)
    return fail(error, "type 68 keys must be 32 hex characters each");
  return hexToBytes(masterHex, &master, "master key", error) && hexToBytes(aHex, &a, "A", error) &&
         hexToBytes(bHex, &b, "B", error) &&
         cipherPass("DES-EDE-ECB", nullptr, false, master, 0, a, &working, error) &&
         cipherPass("DES-EDE-ECB", nullptr, false, working, 0, b, pinKey, error);
}

bool openType68(const PrivateKey& enc, const std::string& payload, const std::string& pinKey,
                std::string* pin, std::string* error) {
  if (pinKey.size() != 16) return fail(error, "type 68 needs the 16-byte PIN key");
  std::string sealed, block;
  WipeOnExit w1{sealed}, w2{block};
  if (!openPkcs1Hex(enc, payload, &sealed, error)) return false;
  if (sealed.size() != 8) return fail(error, "type 68 payload is not one 8-byte block");
  if (!cipherPass("DES-EDE-ECB", nullptr, false, pinKey, 0, sealed, &block, error)) return false;
  const std::string hex = bytesToHex(block, true);
  const std::size_t n = static_cast<std::size_t>(hexValue(hex[1]));
  if (hex[0] != '0' || n < 4 || n > 12) return fail(error, "type 68 block is not an ISO 9564 format 0 block");
  const std::string digits = hex.substr(2, n);
  if (digits.find_first_not_of("0123456789") != std::string::npos ||
      hex.find_first_not_of('F', 2 + n) != std::string::npos)
    return fail(error, "type 68 block is not an ISO 9564 format 0 block (wrong PIN key?)");
  *pin = digits;
  return true;
}

std::string saltedHashValue(const std::string& password, const std::string& salt, char mode) {
  if (mode != 'S' && mode != 'F') return std::string();
  unsigned char digest[16];
  unsigned int n = 0;
  EVP_Digest(password.data(), password.size(), digest, &n, EVP_md5(), nullptr);
  const std::string h1 = bytesToHex(std::string(reinterpret_cast<char*>(digest), 16), false) + salt;
  EVP_Digest(h1.data(), h1.size(), digest, &n, EVP_md5(), nullptr);
  const std::string h2 = bytesToHex(std::string(reinterpret_cast<char*>(digest), 16), false);
  return mode == 'S' ? h2.substr(8, 16) : h2;
}

// ---- by type

TypeLayout typeLayout(int type) {
  TypeLayout t;
  t.drop = envelopeDrop(type);
  auto wrapped = [&](Inner inner) {
    t.outer = Outer::WrappedEnvelope;
    t.inner = inner;
  };
  switch (type) {
    case 1:
      wrapped(Inner::Text);
      break;
    case 2: case 20: case 27: case 81: case 33:
      wrapped(Inner::KeyouHex);
      break;
    case 12: case 42:
      wrapped(Inner::KeyouBase64);
      break;
    case 10: case 28: case 36: case 40: case 50: case 74: case 82: case 86:
      wrapped(Inner::Pkcs1Hex);
      break;
    case 8: case 51:
      wrapped(Inner::PairPkcs1Hex);
      break;
    case 46:
      wrapped(Inner::PairPkcs1Base64);
      break;
    case 5: wrapped(Inner::Type5); break;
    case 19: wrapped(Inner::Type19); break;
    case 38: wrapped(Inner::Type38); break;
    case 68: wrapped(Inner::Type68); break;
    case 47: case 55: wrapped(Inner::HashedRsa); break;
    case 48: case 59: wrapped(Inner::Hashed); break;
    case 88:
      t.outer = Outer::BareEnvelope;
      t.inner = Inner::Text;
      break;
    case 3: t.outer = Outer::DirectWithEnc; t.inner = Inner::KeyouBase64; break;
    case 4: t.outer = Outer::DirectWithEnc; t.inner = Inner::PairPkcs1Base64; break;
    case 22: t.outer = Outer::DirectWithEnc; t.inner = Inner::PairPkcs1Hex; break;
    case 29: t.outer = Outer::DirectWithEnc; t.inner = Inner::KeyouHex; break;
    case 30: t.outer = Outer::DirectWithEnc; t.inner = Inner::Pkcs1Hex; break;
    case 56: t.outer = Outer::DirectWithApp; t.inner = Inner::Pkcs1Hex; break;
    case 73: t.outer = Outer::DirectWithApp; t.inner = Inner::Pkcs1Base64; break;
    case 21: case 65: case 69: case 76: case 77: case 78: case 79: case 83:
      break;
    default:
      if (type >= 0 && type <= 90) wrapped(Inner::Text);
      break;
  }
  return t;
}

namespace {

// Opens an inner value (payload or direct output) of a given kind with `key`.
bool openInner(Inner inner, const std::string& value, const PrivateKey& key, const OpenKeys& keys,
               Opened* out, std::string* error) {
  std::string plain;
  WipeOnExit w{plain};
  switch (inner) {
    case Inner::None:
      return fail(error, "nothing to open");
    case Inner::Text:
    case Inner::Hashed:
      out->content = value;
      break;
    case Inner::KeyouHex:
      if (!openKeyouHex(key, value, &out->content, error)) return false;
      break;
    case Inner::KeyouBase64:
      if (!openKeyouBase64(key, value, &out->content, error)) return false;
      break;
    case Inner::Pkcs1Hex:
    case Inner::HashedRsa:
      if (!openPkcs1Hex(key, value, &out->content, error)) return false;
      break;
    case Inner::Pkcs1Base64:
      if (!openPkcs1Base64(key, value, &out->content, error)) return false;
      break;
    case Inner::PairPkcs1Hex:
    case Inner::PairPkcs1Base64: {
      const bool ok = inner == Inner::PairPkcs1Hex ? openPkcs1Hex(key, value, &plain, error)
                                                   : openPkcs1Base64(key, value, &plain, error);
      std::string ts;
      if (!ok || !parseLengthPrefixedPair(plain, &ts, &out->content, error)) return false;
      if (out->wrapped && ts != out->timestamp)
        return fail(error, "timestamp inside the payload differs from the wrapper's");
      out->timestamp = ts;
      break;
    }
    case Inner::Type5:
      if (!openType5(key, value, &out->content, error)) return false;
      break;
    case Inner::Type19:
      if (!openType19(key, value, &out->content, error)) return false;
      break;
    case Inner::Type38:
      if (!openType38(key, value, &out->content, error)) return false;
      break;
    case Inner::Type68:
      if (keys.pinKey.empty()) return true;  // PIN key not given: leave the payload sealed
      if (!openType68(key, value, keys.pinKey, &out->content, error)) return false;
      break;
  }
  out->contentOpened = true;
  return true;
}

// A payload left sealed (no encryption key given) must still look like what the type carries:
// an RSA value of at least 512 bits as hex or base64, with type 5's "0001" tail or type 38's
// 16-digit block in front. Otherwise the output was made with another type (e.g. 48 opened as
// 47) and would pass unnoticed.
bool checkSealedShape(Inner inner, const std::string& payload, std::string* error) {
  std::string rsa = payload, raw;
  bool ok = true;
  if (inner == Inner::KeyouBase64 || inner == Inner::Pkcs1Base64 || inner == Inner::PairPkcs1Base64) {
    ok = base64ToBytes(payload, &raw, "payload", error);
  } else {
    if (inner == Inner::Type5) {
      ok = rsa.size() > 4 && rsa.compare(rsa.size() - 4, 4, "0001") == 0;
      if (ok) rsa.resize(rsa.size() - 4);
    } else if (inner == Inner::Type38) {
      ok = rsa.size() > 16 && hexToBytes(rsa.substr(0, 16), &raw, "payload", error);
      if (ok) rsa.erase(0, 16);
    }
    ok = ok && hexToBytes(rsa, &raw, "payload", error);
  }
  if (!ok || raw.size() < 64)
    return fail(error, "the payload is not the RSA value this type carries (an output of another type?)");
  return true;
}

}  // namespace

bool openOutput(int type, const std::string& output, const OpenKeys& keys, Opened* out, std::string* error) {
  *out = Opened();
  const TypeLayout t = typeLayout(type);
  switch (t.outer) {
    case Outer::Unknown:
      return fail(error, "encryption type " + std::to_string(type) + " produces no output");
    case Outer::DirectWithEnc:
      if (keys.enc == nullptr) return fail(error, "type " + std::to_string(type) + " needs the encryption-platform key");
      return openInner(t.inner, output, *keys.enc, keys, out, error);
    case Outer::DirectWithApp:
      if (keys.app == nullptr) return fail(error, "type " + std::to_string(type) + " needs the application-platform key");
      return openInner(t.inner, output, *keys.app, keys, out, error);
    case Outer::BareEnvelope:
    case Outer::WrappedEnvelope:
      break;
  }
  if (keys.app == nullptr) return fail(error, "envelopes need the application-platform key");
  std::string content;
  WipeOnExit w{content};
  if (!openEnvelope(output, *keys.app, t.drop, &content, error)) return false;
  if (t.outer == Outer::BareEnvelope) {
    out->content = content;
    out->contentOpened = true;
    return true;
  }
  Wrapped parts;
  const bool plainText = t.inner == Inner::Text || (t.inner == Inner::Hashed && !keys.saltedHash);
  if (!splitWrapped(content, &parts, error, !plainText)) return false;
  out->wrapped = true;
  out->strength = parts.strength;
  out->timestamp = parts.timestamp;
  out->payload = parts.payload;
  wipeString(&parts.payload);
  if (t.inner == Inner::Text || t.inner == Inner::Hashed) return openInner(t.inner, out->payload, *keys.app, keys, out, error);
  if (keys.enc == nullptr) return checkSealedShape(t.inner, out->payload, error);  // stays sealed
  return openInner(t.inner, out->payload, *keys.enc, keys, out, error);
}

bool matchesPassword(int type, const Opened& opened, const std::string& password, const std::string& salt,
                     char mode) {
  if (!opened.contentOpened) return false;
  const Inner inner = typeLayout(type).inner;
  std::string expected;
  WipeOnExit w{expected};
  if ((inner == Inner::Hashed || inner == Inner::HashedRsa) && !salt.empty()) {
    expected = saltedHashValue(password, salt, mode);
  } else if (inner == Inner::Type5) {
    unsigned char digest[20];
    unsigned int n = 0;
    EVP_Digest(password.data(), password.size(), digest, &n, EVP_sha1(), nullptr);
    expected = bytesToHex(std::string(reinterpret_cast<char*>(digest), sizeof digest), true);
    OPENSSL_cleanse(digest, sizeof digest);
  } else {
    expected = password;
  }
  if (expected.empty() && !password.empty()) return false;  // unknown mode
  return expected.size() == opened.content.size() &&
         CRYPTO_memcmp(expected.data(), opened.content.data(), expected.size()) == 0;
}

}  // namespace tessel::server
