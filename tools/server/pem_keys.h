// The bank's RSA private keys, loaded from PEM, and the two private-key operations the opener
// needs: raw RSA, and PKCS#1 v1.5 type-2 decryption with implicit rejection.
//
// Implicit rejection: a block whose padding is wrong, or whose message is not of the length the
// caller expects, does not fail. It yields a synthetic message derived from the ciphertext under
// a secret only the key owner has, so a forged value goes on through the same cipher and the
// same parse as a genuine one and fails (if at all) where any wrong key would. The derivation is
// the one of the IETF draft on implicit rejection for PKCS#1 v1.5, also used by OpenSSL 3.2:
//   KDK = HMAC-SHA-256(key = SHA-256(d as k big-endian bytes), message = ciphertext as k bytes)
//   PRF(label, bits) = HMAC-SHA-256(KDK, u16(i) | label | u16(bits)) for i = 0, 1, ... concatenated
//   message = the last L bytes of PRF("message", 8k), where L is the expected length when there
//   is one, else chosen from PRF("length", 2048) as the draft says (the last 16-bit candidate,
//   masked to the bit width of k-10, that is below k-10).
// The padding check runs over the whole block with masks: no branch or early return on a
// decrypted byte.
#pragma once

#include <cstddef>
#include <string>

typedef struct evp_pkey_st EVP_PKEY;

namespace tessel::server {

// An RSA private key loaded from PEM (PKCS#8 or traditional "RSA PRIVATE KEY"). Immutable once
// loaded; its const operations may run on several threads at once.
class PrivateKey {
 public:
  PrivateKey() = default;
  ~PrivateKey();
  PrivateKey(PrivateKey&& other) noexcept;
  PrivateKey& operator=(PrivateKey&& other) noexcept;
  PrivateKey(const PrivateKey&) = delete;
  PrivateKey& operator=(const PrivateKey&) = delete;

  bool loadPem(const std::string& pem, std::string* error);
  // Reads the file (at most 64 KiB) into a buffer that is wiped, then loadPem.
  bool loadPemFile(const std::string& path, std::string* error);
  bool loaded() const { return key_ != nullptr; }
  // Modulus length in bytes (k); 0 when nothing is loaded.
  std::size_t size() const;
  // The public modulus as upper-case hex, the form the device library is configured with.
  std::string modulusHex() const;
  EVP_PKEY* get() const { return key_; }

  // c^d mod n as exactly k bytes. False (a public-byte error) when no key is loaded or when the
  // value is not k bytes. A value not below the modulus gives k zero bytes, which hold no
  // message: it is rejected like any other forgery.
  bool decryptRaw(const std::string& cipher, std::string* block, std::string* error) const;
  // PKCS#1 v1.5 type 2 with implicit rejection (see above). expectedLength 0: any length.
  // False only for decryptRaw's public-byte errors; *message is then empty.
  bool decryptPkcs1(const std::string& cipher, std::size_t expectedLength, std::string* message,
                    std::string* error) const;
  // The synthetic message for `cipher` (k bytes): `length` bytes, or with length 0 the draft's
  // length choice. What decryptPkcs1 and the "Keyou" blocks fall back to.
  std::string syntheticMessage(const std::string& cipher, std::size_t length) const;

 private:
  EVP_PKEY* key_ = nullptr;
  unsigned char dHash_[32] = {};  // SHA-256 of the private exponent: the key of the KDK
};

}  // namespace tessel::server
