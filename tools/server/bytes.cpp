// Codecs, wiping, ciphers and secret files of the server-side opener (see bytes.h).
#include "server/bytes.h"

#include <fcntl.h>
#include <openssl/crypto.h>
#include <openssl/err.h>
#include <openssl/evp.h>
#include <openssl/provider.h>
#include <unistd.h>

#include <cerrno>

namespace tessel::server {

const char kRejected[] = "output rejected";

bool fail(std::string* error, const std::string& message) {
  if (error != nullptr) *error = message;
  return false;
}

void wipeString(std::string* s) {
  if (s == nullptr) return;
  if (!s->empty()) OPENSSL_cleanse(&(*s)[0], s->size());
  s->clear();
}

ClearsOpenSslErrors::~ClearsOpenSslErrors() { ERR_clear_error(); }

std::string toHex(const std::string& bytes, bool upper) {
  const char* digits = upper ? "0123456789ABCDEF" : "0123456789abcdef";
  std::string out;
  out.reserve(bytes.size() * 2);
  for (unsigned char b : bytes) {
    out += digits[b >> 4];
    out += digits[b & 15];
  }
  return out;
}

namespace {

int hexValue(char c) {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  return -1;
}

// Symbol values, 0xFF for bytes outside the alphabet: one lookup per symbol, no branch on it.
struct Base64Table {
  unsigned char value[256];
  constexpr Base64Table() : value() {
    for (int k = 0; k < 256; ++k) value[k] = 0xFF;
    const char* alphabet = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
    for (int k = 0; k < 64; ++k) value[static_cast<unsigned char>(alphabet[k])] = static_cast<unsigned char>(k);
  }
};
constexpr Base64Table kBase64;

}  // namespace

bool fromHex(const std::string& hex, std::string* out, const char* what, std::string* error) {
  wipeString(out);
  if (hex.size() % 2 != 0) return fail(error, std::string(what) + ": odd number of hex digits");
  out->assign(hex.size() / 2, '\0');
  for (std::size_t k = 0; k < out->size(); ++k) {
    const int hi = hexValue(hex[2 * k]), lo = hexValue(hex[2 * k + 1]);
    if (hi < 0 || lo < 0) {
      wipeString(out);
      return fail(error, std::string(what) + ": not hexadecimal");
    }
    (*out)[k] = static_cast<char>(hi * 16 + lo);
  }
  return true;
}

bool fromBase64(const std::string& text, std::string* out, const char* what, std::string* error) {
  wipeString(out);
  if (text.empty()) return fail(error, std::string(what) + ": empty");
  const std::size_t n = text.size();
  std::size_t pad = 0;
  if (n >= 2 && text[n - 1] == '=') pad = text[n - 2] == '=' ? 2 : 1;
  if (n % 4 != 0) return fail(error, std::string(what) + ": not valid base64 (corrupt or truncated)");
  out->assign((n - pad) * 3 / 4, '\0');
  std::uint32_t group = 0, bad = 0;
  std::size_t at = 0;
  for (std::size_t k = 0; k < n - pad; ++k) {
    const std::uint32_t v = kBase64.value[static_cast<unsigned char>(text[k])];
    bad |= v & 0x40;
    group = (group << 6) | (v & 0x3F);
    if (k % 4 == 3) {
      (*out)[at++] = static_cast<char>(group >> 16);
      (*out)[at++] = static_cast<char>(group >> 8);
      (*out)[at++] = static_cast<char>(group);
      group = 0;
    }
  }
  if (bad != 0) {
    wipeString(out);
    return fail(error, std::string(what) + ": not valid base64 (corrupt or truncated)");
  }
  // The last group: 2 symbols give 1 byte (4 unused bits), 3 symbols 2 bytes (2 unused bits).
  const std::uint32_t unused = pad == 2 ? (group & 0xF) : pad == 1 ? (group & 0x3) : 0;
  if (unused != 0) {
    wipeString(out);
    return fail(error, std::string(what) + ": not valid base64 (not canonical)");
  }
  if (pad == 2) (*out)[at] = static_cast<char>(group >> 4);
  if (pad == 1) {
    (*out)[at] = static_cast<char>(group >> 10);
    (*out)[at + 1] = static_cast<char>(group >> 2);
  }
  group = 0;
  return true;
}

bool readAtMost(const std::string& path, std::size_t limit, std::string* out, std::string* error) {
  wipeString(out);
  const int fd = path == "-" ? 0 : ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
  if (fd < 0) return fail(error, "cannot read " + path);
  // One buffer, never grown (growing would leave a copy in freed heap).
  out->assign(limit, '\0');
  std::size_t used = 0;
  bool ok = true;
  while (used < out->size()) {
    const ssize_t n = ::read(fd, &(*out)[used], out->size() - used);
    if (n < 0 && errno == EINTR) continue;
    if (n < 0) ok = false;
    if (n <= 0) break;
    used += static_cast<std::size_t>(n);
  }
  if (fd != 0) ::close(fd);
  if (!ok) {
    wipeString(out);
    return fail(error, "cannot read " + path);
  }
  OPENSSL_cleanse(&(*out)[used], out->size() - used);
  out->resize(used);
  return true;
}

bool readSecretFile(const std::string& path, std::size_t max, std::string* out, std::string* error) {
  if (!readAtMost(path, max + 1, out, error)) return false;
  if (out->size() <= max) return true;
  wipeString(out);
  return fail(error, path + " holds more than " + std::to_string(max) + " bytes");
}

namespace {

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

}  // namespace

bool cipherPass(const char* name, bool encrypt, const std::string& key, std::size_t skip,
                const std::string& in, std::string* out, std::string* error) {
  ClearsOpenSslErrors clear;
  EVP_CIPHER* cipher = EVP_CIPHER_fetch(std::string(name) == "RC4" ? legacyContext() : nullptr, name, nullptr);
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
  wipeString(out);
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
  EVP_CIPHER_CTX_free(ctx);  // cleanses the key schedule
  EVP_CIPHER_free(cipher);
  if (!ok) {
    wipeString(out);
    return fail(error, std::string(name) + " failed");
  }
  OPENSSL_cleanse(&(*out)[total], out->size() - static_cast<std::size_t>(total));
  out->resize(static_cast<std::size_t>(total));
  return true;
}

std::string digest(const char* name, const std::string& data) {
  ClearsOpenSslErrors clear;
  unsigned char md[EVP_MAX_MD_SIZE];
  unsigned int n = 0;
  EVP_MD* md5 = EVP_MD_fetch(nullptr, name, nullptr);
  if (md5 == nullptr || EVP_Digest(data.data(), data.size(), md, &n, md5, nullptr) != 1) n = 0;
  EVP_MD_free(md5);
  std::string out(reinterpret_cast<char*>(md), n);
  OPENSSL_cleanse(md, sizeof md);
  return out;
}

}  // namespace tessel::server
