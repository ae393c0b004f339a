// PEM loading, raw RSA and implicit rejection (see pem_keys.h).
#include "server/pem_keys.h"

#include <openssl/bio.h>
#include <openssl/bn.h>
#include <openssl/core_names.h>
#include <openssl/crypto.h>
#include <openssl/evp.h>
#include <openssl/hmac.h>
#include <openssl/pem.h>
#include <openssl/rsa.h>

#include <cstring>
#include <vector>

#include "server/bytes.h"

namespace tessel::server {

PrivateKey::~PrivateKey() {
  EVP_PKEY_free(key_);
  OPENSSL_cleanse(dHash_, sizeof dHash_);
}

PrivateKey::PrivateKey(PrivateKey&& other) noexcept : key_(other.key_) {
  std::memcpy(dHash_, other.dHash_, sizeof dHash_);
  OPENSSL_cleanse(other.dHash_, sizeof dHash_);
  other.key_ = nullptr;
}

PrivateKey& PrivateKey::operator=(PrivateKey&& other) noexcept {
  if (this != &other) {
    EVP_PKEY_free(key_);
    key_ = other.key_;
    std::memcpy(dHash_, other.dHash_, sizeof dHash_);
    OPENSSL_cleanse(other.dHash_, sizeof dHash_);
    other.key_ = nullptr;
  }
  return *this;
}

bool PrivateKey::loadPem(const std::string& pem, std::string* error) {
  ClearsOpenSslErrors clear;
  BIO* bio = BIO_new_mem_buf(pem.data(), static_cast<int>(pem.size()));
  if (bio == nullptr) return fail(error, "out of memory");
  EVP_PKEY* key = PEM_read_bio_PrivateKey(bio, nullptr, nullptr, nullptr);
  BIO_free(bio);
  if (key == nullptr) return fail(error, "not a PEM private key");
  BIGNUM* d = nullptr;
  const int k = EVP_PKEY_get_size(key);
  if (EVP_PKEY_get_base_id(key) != EVP_PKEY_RSA || k <= 0 ||
      EVP_PKEY_get_bn_param(key, OSSL_PKEY_PARAM_RSA_D, &d) != 1) {
    EVP_PKEY_free(key);
    return fail(error, "not an RSA private key");
  }
  std::string dBytes(static_cast<std::size_t>(k), '\0');
  Wiped w{dBytes};
  BN_bn2binpad(d, reinterpret_cast<unsigned char*>(&dBytes[0]), k);
  BN_clear_free(d);
  std::string hash = digest("SHA256", dBytes);
  std::memcpy(dHash_, hash.data(), sizeof dHash_);
  wipeString(&hash);
  EVP_PKEY_free(key_);
  key_ = key;
  return true;
}

bool PrivateKey::loadPemFile(const std::string& path, std::string* error) {
  std::string pem;
  Wiped w{pem};
  if (!readSecretFile(path, 1u << 16, &pem, error)) return false;
  if (!loadPem(pem, error)) return fail(error, path + ": " + *error);
  return true;
}

std::size_t PrivateKey::size() const {
  return key_ == nullptr ? 0 : static_cast<std::size_t>(EVP_PKEY_get_size(key_));
}

std::string PrivateKey::modulusHex() const {
  ClearsOpenSslErrors clear;
  if (key_ == nullptr) return std::string();
  BIGNUM* n = nullptr;
  if (EVP_PKEY_get_bn_param(key_, OSSL_PKEY_PARAM_RSA_N, &n) != 1) return std::string();
  char* hex = BN_bn2hex(n);
  std::string out = hex != nullptr ? hex : "";
  OPENSSL_free(hex);
  BN_free(n);
  return out;
}

bool PrivateKey::decryptRaw(const std::string& cipher, std::string* block, std::string* error) const {
  ClearsOpenSslErrors clear;
  wipeString(block);
  if (!loaded()) return fail(error, "no private key loaded");
  if (cipher.size() != size())
    return fail(error, "RSA value of " + std::to_string(cipher.size()) + " bytes does not match the " +
                           std::to_string(size()) + "-byte key (foreign key?)");
  EVP_PKEY_CTX* ctx = EVP_PKEY_CTX_new(key_, nullptr);
  if (ctx == nullptr) return fail(error, "out of memory");
  std::size_t n = cipher.size();
  block->assign(n, '\0');
  const bool ok = EVP_PKEY_decrypt_init(ctx) == 1 && EVP_PKEY_CTX_set_rsa_padding(ctx, RSA_NO_PADDING) == 1 &&
                  EVP_PKEY_decrypt(ctx, reinterpret_cast<unsigned char*>(&(*block)[0]), &n,
                                   reinterpret_cast<const unsigned char*>(cipher.data()), cipher.size()) == 1 &&
                  n == cipher.size();
  EVP_PKEY_CTX_free(ctx);
  // Raw RSA fails only for a value not below the modulus: it holds no message, like a forgery.
  if (!ok) OPENSSL_cleanse(&(*block)[0], block->size());
  return true;
}

namespace {

// PRF(label, bits) of the implicit-rejection derivation.
std::string prf(const unsigned char* kdk, const char* label, std::size_t bits) {
  std::string out;
  const std::size_t labelLength = std::strlen(label);
  std::vector<unsigned char> in(2 + labelLength + 2);
  std::memcpy(&in[2], label, labelLength);
  in[2 + labelLength] = static_cast<unsigned char>(bits >> 8);
  in[3 + labelLength] = static_cast<unsigned char>(bits);
  unsigned char block[32];
  for (unsigned i = 0; out.size() < bits / 8; ++i) {
    in[0] = static_cast<unsigned char>(i >> 8);
    in[1] = static_cast<unsigned char>(i);
    unsigned int n = 0;
    HMAC(EVP_sha256(), kdk, 32, in.data(), in.size(), block, &n);
    out.append(reinterpret_cast<char*>(block), std::min<std::size_t>(32, bits / 8 - out.size()));
  }
  OPENSSL_cleanse(block, sizeof block);
  return out;
}

}  // namespace

std::string PrivateKey::syntheticMessage(const std::string& cipher, std::size_t length) const {
  ClearsOpenSslErrors clear;
  const std::size_t k = size();
  unsigned char kdk[32];
  unsigned int n = 0;
  HMAC(EVP_sha256(), dHash_, sizeof dHash_, reinterpret_cast<const unsigned char*>(cipher.data()), cipher.size(),
       kdk, &n);
  std::string message = prf(kdk, "message", 8 * k);
  if (length == 0) {
    std::string candidates = prf(kdk, "length", 128 * 2 * 8);
    const std::uint32_t maxLength = static_cast<std::uint32_t>(k - 10);
    std::uint32_t mask = maxLength;
    mask |= mask >> 1;
    mask |= mask >> 2;
    mask |= mask >> 4;
    mask |= mask >> 8;
    std::uint32_t chosen = 0;
    for (std::size_t i = 0; i < candidates.size(); i += 2) {
      const std::uint32_t candidate =
          ((static_cast<unsigned char>(candidates[i]) << 8) | static_cast<unsigned char>(candidates[i + 1])) & mask;
      chosen = ctSelect(ctLt(candidate, maxLength), candidate, chosen);
    }
    wipeString(&candidates);
    length = chosen;
  }
  OPENSSL_cleanse(kdk, sizeof kdk);
  std::string out = message.substr(k - std::min(length, k));
  wipeString(&message);
  return out;
}

bool PrivateKey::decryptPkcs1(const std::string& cipher, std::size_t expectedLength, std::string* message,
                              std::string* error) const {
  std::string block;
  Wiped w1{block};
  wipeString(message);
  if (!decryptRaw(cipher, &block, error)) return false;
  const std::size_t k = block.size();
  if (expectedLength > k) expectedLength = k;  // never valid: padding needs 11 bytes
  // The synthetic message sits at the end of a k-byte frame, like the real one, so both are
  // read at the same index.
  std::string synthetic = syntheticMessage(cipher, expectedLength);
  const std::uint32_t synthIndex = static_cast<std::uint32_t>(k - synthetic.size());
  synthetic.insert(0, synthIndex, '\0');
  Wiped w2{synthetic};
  const auto* b = reinterpret_cast<const unsigned char*>(block.data());
  // 00 02, at least 8 non-zero bytes, 00, the message: one mask, whatever the bytes hold.
  std::uint32_t good = ctIsZero(b[0]) & ctEq(b[1], 2);
  std::uint32_t found = 0, zeroIndex = 0;
  for (std::size_t i = 2; i < k; ++i) {
    const std::uint32_t isZero = ctIsZero(b[i]);
    zeroIndex = ctSelect(~found & isZero, static_cast<std::uint32_t>(i), zeroIndex);
    found |= isZero;
  }
  good &= ~ctLt(zeroIndex, 10);
  const std::uint32_t realIndex = zeroIndex + 1;
  if (expectedLength != 0) good &= ctEq(static_cast<std::uint32_t>(k) - realIndex, static_cast<std::uint32_t>(expectedLength));
  const std::uint32_t from = ctSelect(good, realIndex, synthIndex);
  message->assign(k - from, '\0');
  const auto* s = reinterpret_cast<const unsigned char*>(synthetic.data());
  for (std::size_t i = from, j = 0; i < k; ++i, ++j) (*message)[j] = static_cast<char>(ctSelect(good, b[i], s[i]));
  return true;
}

}  // namespace tessel::server
