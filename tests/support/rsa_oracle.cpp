// OpenSSL implementations of the RSA and BN oracles declared in rsa_oracle.h.
#include "support/rsa_oracle.h"

#include <openssl/bn.h>
#include <openssl/core_names.h>
#include <openssl/encoder.h>
#include <openssl/evp.h>
#include <openssl/pem.h>
#include <openssl/rsa.h>

#include <cstdio>
#include <stdexcept>

namespace tessel::test {

struct RsaTestKey::Holder {
  EVP_PKEY* pkey = nullptr;
  ~Holder() { EVP_PKEY_free(pkey); }
};

namespace {

[[noreturn]] void fail(const char* what) { throw std::runtime_error(what); }

std::string upper(std::string s) {
  for (auto& c : s)
    if (c >= 'a' && c <= 'f') c = static_cast<char>(c - 'a' + 'A');
  return s;
}

Bytes decryptWith(EVP_PKEY* pkey, int padding, const Bytes& in) {
  EVP_PKEY_CTX* ctx = EVP_PKEY_CTX_new(pkey, nullptr);
  if (ctx == nullptr || EVP_PKEY_decrypt_init(ctx) <= 0 ||
      EVP_PKEY_CTX_set_rsa_padding(ctx, padding) <= 0) {
    EVP_PKEY_CTX_free(ctx);
    fail("decrypt init");
  }
  std::size_t n = 0;
  EVP_PKEY_decrypt(ctx, nullptr, &n, in.data(), in.size());
  Bytes out(n);
  const int ok = EVP_PKEY_decrypt(ctx, out.data(), &n, in.data(), in.size());
  EVP_PKEY_CTX_free(ctx);
  if (ok <= 0) fail("decrypt");
  out.resize(n);
  return out;
}

using BnPtr = std::unique_ptr<BIGNUM, decltype(&BN_free)>;

BnPtr bn(const std::string& hex) {
  BIGNUM* b = nullptr;
  if (BN_hex2bn(&b, hex.c_str()) == 0) fail("BN_hex2bn");
  return BnPtr(b, &BN_free);
}

std::string hexOf(const BIGNUM* b) {
  // BN_bn2hex writes whole bytes; the library writes no leading zero digit.
  char* s = BN_bn2hex(b);
  std::string out(s);
  OPENSSL_free(s);
  const auto p = out.find_first_not_of('0');
  return p == std::string::npos ? "0" : out.substr(p);
}

}  // namespace

RsaTestKey RsaTestKey::generate(unsigned bits) {
  RsaTestKey k;
  k.key_ = std::make_shared<Holder>();
  k.key_->pkey = EVP_RSA_gen(bits);
  if (k.key_->pkey == nullptr) fail("EVP_RSA_gen");
  return k;
}

RsaTestKey RsaTestKey::fromPemFile(const std::string& path) {
  FILE* f = std::fopen(path.c_str(), "r");
  if (f == nullptr) fail("cannot open PEM file");
  RsaTestKey k;
  k.key_ = std::make_shared<Holder>();
  k.key_->pkey = PEM_read_PrivateKey(f, nullptr, nullptr, nullptr);
  std::fclose(f);
  if (k.key_->pkey == nullptr) fail("PEM_read_PrivateKey");
  return k;
}

std::string RsaTestKey::modulusHex() const {
  BIGNUM* n = nullptr;
  if (!EVP_PKEY_get_bn_param(key_->pkey, OSSL_PKEY_PARAM_RSA_N, &n)) fail("modulus");
  std::string s = hexOf(n);
  BN_free(n);
  return s;
}

std::string RsaTestKey::publicDerHex() const {
  unsigned char* der = nullptr;
  std::size_t len = 0;
  OSSL_ENCODER_CTX* ectx = OSSL_ENCODER_CTX_new_for_pkey(key_->pkey, EVP_PKEY_PUBLIC_KEY, "DER",
                                                         "pkcs1", nullptr);
  if (ectx == nullptr || !OSSL_ENCODER_to_data(ectx, &der, &len)) {
    OSSL_ENCODER_CTX_free(ectx);
    fail("public DER");
  }
  OSSL_ENCODER_CTX_free(ectx);
  std::string hex = upper(toHex(Bytes(der, der + len)));
  OPENSSL_free(der);
  return hex;
}

std::size_t RsaTestKey::bytes() const { return static_cast<std::size_t>(EVP_PKEY_get_size(key_->pkey)); }

Bytes RsaTestKey::rawDecrypt(const Bytes& c) const { return decryptWith(key_->pkey, RSA_NO_PADDING, c); }

Bytes RsaTestKey::pkcs1Decrypt(const Bytes& c) const {
  return decryptWith(key_->pkey, RSA_PKCS1_PADDING, c);
}

Bytes RsaTestKey::rawEncrypt(const Bytes& block) const {
  EVP_PKEY_CTX* ctx = EVP_PKEY_CTX_new(key_->pkey, nullptr);
  if (ctx == nullptr || EVP_PKEY_encrypt_init(ctx) <= 0 ||
      EVP_PKEY_CTX_set_rsa_padding(ctx, RSA_NO_PADDING) <= 0) {
    EVP_PKEY_CTX_free(ctx);
    fail("encrypt init");
  }
  std::size_t n = bytes();
  Bytes out(n);
  const int ok = EVP_PKEY_encrypt(ctx, out.data(), &n, block.data(), block.size());
  EVP_PKEY_CTX_free(ctx);
  if (ok <= 0) fail("encrypt");
  out.resize(n);
  return out;
}

std::string opensslBnMul(const std::string& a, const std::string& b) {
  BnPtr r(BN_new(), &BN_free);
  BN_CTX* ctx = BN_CTX_new();
  BN_mul(r.get(), bn(a).get(), bn(b).get(), ctx);
  BN_CTX_free(ctx);
  return hexOf(r.get());
}

std::pair<std::string, std::string> opensslBnDiv(const std::string& a, const std::string& b) {
  BnPtr q(BN_new(), &BN_free), r(BN_new(), &BN_free);
  BN_CTX* ctx = BN_CTX_new();
  BN_div(q.get(), r.get(), bn(a).get(), bn(b).get(), ctx);
  BN_CTX_free(ctx);
  return {hexOf(q.get()), hexOf(r.get())};
}

std::string opensslBnModExp(const std::string& base, const std::string& exp, const std::string& mod) {
  BnPtr r(BN_new(), &BN_free);
  BN_CTX* ctx = BN_CTX_new();
  BN_mod_exp(r.get(), bn(base).get(), bn(exp).get(), bn(mod).get(), ctx);
  BN_CTX_free(ctx);
  return hexOf(r.get());
}

}  // namespace tessel::test
