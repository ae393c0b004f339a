// OpenSSL-backed RSA and big-number oracles for the crypto suites (test-only).
//
// RsaTestKey owns an OpenSSL key pair: generated fresh or read from a PEM file. It exposes
// what the library consumes (modulus hex, PKCS#1 RSAPublicKey DER hex) and what only the key
// owner can do (raw and PKCS#1 v1.5 decryption), so tests check our public operation against
// an independent private operation.
#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "support/openssl_oracle.h"

namespace tessel::test {

class RsaTestKey {
 public:
  // A fresh key pair with exponent 65537.
  static RsaTestKey generate(unsigned bits);
  // The private key in a PEM file (text before the BEGIN line is ignored).
  static RsaTestKey fromPemFile(const std::string& path);

  // Upper-case hex of the modulus, no leading zeros.
  std::string modulusHex() const;
  // The public key as PKCS#1 RSAPublicKey DER, in upper-case hex.
  std::string publicDerHex() const;
  std::size_t bytes() const;  // k

  // c^d mod n as exactly k bytes (RSA_NO_PADDING). Throws on failure.
  Bytes rawDecrypt(const Bytes& ciphertext) const;
  // PKCS#1 v1.5 type 2 decryption; throws when the block does not unpad.
  Bytes pkcs1Decrypt(const Bytes& ciphertext) const;
  // PKCS#1 v1.5 encryption by OpenSSL (for the benchmark's peer and round trips).
  Bytes rawEncrypt(const Bytes& block) const;

 private:
  struct Holder;
  std::shared_ptr<Holder> key_;
};

// Big-number oracle over upper-case hex texts ("0" for zero), computed by OpenSSL's BN.
std::string opensslBnMul(const std::string& a, const std::string& b);
// Quotient and remainder.
std::pair<std::string, std::string> opensslBnDiv(const std::string& a, const std::string& b);
std::string opensslBnModExp(const std::string& base, const std::string& exp, const std::string& mod);

}  // namespace tessel::test
