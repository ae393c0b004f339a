// OpenSSL-backed oracles. RC4 lives in OpenSSL 3's legacy provider; the default provider is
// loaded alongside so the other algorithms keep working in the same process.
#include "support/openssl_oracle.h"

#include <openssl/bn.h>
#include <openssl/evp.h>
#include <openssl/provider.h>

#include <algorithm>
#include <memory>
#include <stdexcept>

namespace tessel::test {
namespace {
void loadProviders() {
  [[maybe_unused]] static const bool loaded = [] {
    OSSL_PROVIDER_load(nullptr, "legacy");
    OSSL_PROVIDER_load(nullptr, "default");
    return true;
  }();
}

// Runs a cipher over whole blocks without padding.
Bytes cipher(const char* name, const Bytes& key, const Bytes& data, bool encrypt, std::size_t drop = 0) {
  loadProviders();
  EVP_CIPHER* c = EVP_CIPHER_fetch(nullptr, name, nullptr);
  EVP_CIPHER_CTX* ctx = EVP_CIPHER_CTX_new();
  Bytes skip(drop), out(drop + data.size() + 16);
  int n = 0, skipped = 0, tail = 0;
  const bool ok = c != nullptr && EVP_CipherInit_ex2(ctx, c, nullptr, nullptr, encrypt ? 1 : 0, nullptr) == 1 &&
                  EVP_CIPHER_CTX_set_key_length(ctx, static_cast<int>(key.size())) == 1 &&
                  EVP_CipherInit_ex2(ctx, nullptr, key.data(), nullptr, encrypt ? 1 : 0, nullptr) == 1 &&
                  EVP_CIPHER_CTX_set_padding(ctx, 0) == 1 &&
                  (drop == 0 ||
                   EVP_CipherUpdate(ctx, out.data(), &skipped, skip.data(), static_cast<int>(drop)) == 1) &&
                  EVP_CipherUpdate(ctx, out.data(), &n, data.data(), static_cast<int>(data.size())) == 1 &&
                  EVP_CipherFinal_ex(ctx, out.data() + n, &tail) == 1;
  EVP_CIPHER_CTX_free(ctx);
  EVP_CIPHER_free(c);
  if (!ok) throw std::runtime_error(std::string("OpenSSL ") + name + " failed (legacy provider missing?)");
  out.resize(static_cast<std::size_t>(n + tail));
  return out;
}
using BnPtr = std::unique_ptr<BIGNUM, decltype(&BN_free)>;
BnPtr bn(const std::string& hex) {
  BIGNUM* b = nullptr;
  if (BN_hex2bn(&b, hex.c_str()) == 0) throw std::runtime_error("BN_hex2bn");
  return BnPtr(b, &BN_free);
}
std::unique_ptr<BN_CTX, decltype(&BN_CTX_free)> bnContext() { return {BN_CTX_new(), &BN_CTX_free}; }
std::string hexOf(const BnPtr& b) {
  // BN_bn2hex writes whole bytes; the library writes no leading zero digit.
  char* s = BN_bn2hex(b.get());
  std::string out(s);
  OPENSSL_free(s);
  return out.substr(std::min(out.find_first_not_of('0'), out.size() - 1));
}
}  // namespace

Bytes opensslRc4(const Bytes& key, const Bytes& data, std::size_t drop) { return cipher("RC4", key, data, true, drop); }

Bytes opensslDesEde(const Bytes& key16, const Bytes& data, bool encrypt) {
  return cipher("DES-EDE-ECB", key16, data, encrypt);
}

Bytes opensslDigest(const char* name, const Bytes& data) {
  loadProviders();
  EVP_MD* md = EVP_MD_fetch(nullptr, name, nullptr);
  Bytes digest(EVP_MAX_MD_SIZE);
  unsigned n = 0;
  const bool ok = md != nullptr && EVP_Digest(data.data(), data.size(), digest.data(), &n, md, nullptr) == 1;
  EVP_MD_free(md);
  if (!ok) throw std::runtime_error(std::string("OpenSSL digest ") + name);
  digest.resize(n);
  return digest;
}

std::string opensslMd5Hex(const std::string& data) { return toHex(opensslDigest("MD5", bytesOf(data))); }
Bytes opensslSha1(const std::string& data) { return opensslDigest("SHA1", bytesOf(data)); }

std::string opensslBase64(const Bytes& data) {
  std::string out(4 * ((data.size() + 2) / 3) + 1, '\0');
  const int n = EVP_EncodeBlock(reinterpret_cast<unsigned char*>(&out[0]), data.data(), static_cast<int>(data.size()));
  out.resize(static_cast<std::size_t>(n));
  return out;
}

std::string opensslBnMul(const std::string& a, const std::string& b) {
  BnPtr r = bn("0");
  BN_mul(r.get(), bn(a).get(), bn(b).get(), bnContext().get());
  return hexOf(r);
}
std::pair<std::string, std::string> opensslBnDiv(const std::string& a, const std::string& b) {
  BnPtr q = bn("0"), r = bn("0");
  BN_div(q.get(), r.get(), bn(a).get(), bn(b).get(), bnContext().get());
  return {hexOf(q), hexOf(r)};
}
std::string opensslBnModExp(const std::string& base, const std::string& exp, const std::string& mod) {
  BnPtr r = bn("0");
  BN_mod_exp(r.get(), bn(base).get(), bn(exp).get(), bn(mod).get(), bnContext().get());
  return hexOf(r);
}

std::string toHex(const Bytes& bytes) {
  std::string s;
  for (auto b : bytes) (s += "0123456789abcdef"[b >> 4]) += "0123456789abcdef"[b & 15];
  return s;
}

Bytes fromHex(const std::string& hex) {
  Bytes out;
  auto v = [](char c) { return (c <= '9') ? c - '0' : (c | 32) - 'a' + 10; };
  for (std::size_t k = 0; k + 1 < hex.size(); k += 2)
    out.push_back(static_cast<std::uint8_t>(v(hex[k]) * 16 + v(hex[k + 1])));
  return out;
}

Bytes bytesOf(const std::string& text) { return Bytes(text.begin(), text.end()); }

std::string dataPath(const std::string& name) { return std::string(TESSEL_TEST_DATA_DIR) + "/" + name; }
std::string outputPath(const std::string& name) { return std::string(TESSEL_TEST_OUTPUT_DIR) + "/" + name; }

}  // namespace tessel::test
