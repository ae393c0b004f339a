// OpenSSL-backed oracles. RC4 lives in OpenSSL 3's legacy provider; the default provider is
// loaded alongside so the other algorithms keep working in the same process.
#include "support/openssl_oracle.h"

#include <openssl/evp.h>
#include <openssl/provider.h>

#include <stdexcept>

namespace tessel::test {
namespace {
void loadProviders() {
  static const bool loaded = [] {
    OSSL_PROVIDER_load(nullptr, "legacy");
    OSSL_PROVIDER_load(nullptr, "default");
    return true;
  }();
  (void)loaded;
}
}  // namespace

Bytes opensslRc4(const Bytes& key, const Bytes& data, std::size_t drop) {
  loadProviders();
  EVP_CIPHER* rc4 = EVP_CIPHER_fetch(nullptr, "RC4", nullptr);
  if (rc4 == nullptr) throw std::runtime_error("OpenSSL has no RC4 (legacy provider missing)");
  EVP_CIPHER_CTX* ctx = EVP_CIPHER_CTX_new();
  EVP_EncryptInit_ex2(ctx, rc4, nullptr, nullptr, nullptr);
  EVP_CIPHER_CTX_set_key_length(ctx, static_cast<int>(key.size()));
  EVP_EncryptInit_ex2(ctx, nullptr, key.data(), nullptr, nullptr);
  Bytes skip(drop), junk(drop + 16);
  int n = 0;
  if (drop) EVP_EncryptUpdate(ctx, junk.data(), &n, skip.data(), static_cast<int>(drop));
  Bytes out(data.size() + 16);
  EVP_EncryptUpdate(ctx, out.data(), &n, data.data(), static_cast<int>(data.size()));
  out.resize(static_cast<std::size_t>(n));
  EVP_CIPHER_CTX_free(ctx);
  EVP_CIPHER_free(rc4);
  return out;
}

std::string toHex(const Bytes& bytes) {
  static const char digits[] = "0123456789abcdef";
  std::string s;
  for (auto b : bytes) {
    s += digits[b >> 4];
    s += digits[b & 15];
  }
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
