// The server-side opener (tools/server) under a fixed 1024-bit test key: parse, open, password
// check, on every type. The invariant is the one answer: once an output's public bytes are in
// order (strict base64, the envelope's layout, an RSA value of the key's size), every failure
// reads exactly "output rejected", and OpenSSL's error queue is empty after every call.
//
// Input layout: mode, type, flags, then the rest (at most 8 KiB; longer inputs are skipped).
//   mode even: the rest is the output text as the client sent it.
//   mode odd:  the rest is a content that the fuzzer seals itself into an envelope for the type
//              (RC4 key wrapped with PKCS#1 under the test key); flags bit 3 flips one byte of the
//              wrapped block, bit 4 wraps a 15-byte key, bit 5 a wrong 16-byte key.
//   flags bit 0: the app set a hash salt; bit 1: expect timestamp "1700000000"; bit 2: check the
//   password "hello" after opening.
#include <openssl/err.h>
#include <openssl/evp.h>
#include <openssl/rsa.h>

#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string>

#include "fuzz_support.h"
#include "server/bytes.h"
#include "server/password_check.h"
#include "server/tessel_opener.h"

namespace {

using namespace tessel::server;

const PrivateKey& testKey() {
  static PrivateKey key = [] {
    PrivateKey k;
    std::string error;
    if (!k.loadPemFile(TESSEL_TEST_KEY, &error)) {
      std::fprintf(stderr, "%s\n", error.c_str());
      std::abort();
    }
    return k;
  }();
  return key;
}

// The RSA block 00 02 | fixed non-zero filler | 00 | message, raw-encrypted with the public half.
std::string wrap(const std::string& message) {
  const PrivateKey& key = testKey();
  std::string block(key.size(), '\x5a'), out(key.size(), '\0');
  block[0] = 0;
  block[1] = 2;
  block[key.size() - message.size() - 1] = 0;
  block.replace(key.size() - message.size(), message.size(), message);
  EVP_PKEY_CTX* ctx = EVP_PKEY_CTX_new(key.get(), nullptr);
  std::size_t n = out.size();
  FUZZ_CHECK(ctx != nullptr && EVP_PKEY_encrypt_init(ctx) == 1 &&
             EVP_PKEY_CTX_set_rsa_padding(ctx, RSA_NO_PADDING) == 1 &&
             EVP_PKEY_encrypt(ctx, reinterpret_cast<unsigned char*>(&out[0]), &n,
                              reinterpret_cast<const unsigned char*>(block.data()), block.size()) == 1);
  EVP_PKEY_CTX_free(ctx);
  return out;
}

std::string seal(int type, std::uint8_t flags, const std::string& content) {
  const std::string key = "0123456789abcdef";
  std::string wrapped = wrap(flags & 16 ? key.substr(1) : flags & 32 ? "fedcba9876543210" : key);
  if (flags & 8) wrapped[content.size() % wrapped.size()] ^= static_cast<char>(1 + content.size() % 255);
  std::string sealed, error;
  FUZZ_CHECK(cipherPass("RC4", true, flags & 16 ? key.substr(1) : key, typeLayout(type).drop, content, &sealed,
                        &error));
  char digits[16];
  std::snprintf(digits, sizeof digits, "%08zu", wrapped.size() + 12);
  std::string raw = digits + std::string("\x01\x02\x00\x00\x01\x68\x00\x00\x00\xA4\x00\x00", 12) +
                    std::string(wrapped.rbegin(), wrapped.rend());
  std::snprintf(digits, sizeof digits, "%08zu", content.size());
  raw += digits + sealed;
  std::string b64(4 * ((raw.size() + 2) / 3) + 1, '\0');
  b64.resize(static_cast<std::size_t>(EVP_EncodeBlock(reinterpret_cast<unsigned char*>(&b64[0]),
                                                      reinterpret_cast<const unsigned char*>(raw.data()),
                                                      static_cast<int>(raw.size()))));
  return b64;
}

// Whether the output's public bytes are in order for the type, judged without the private key.
bool publicBytesInOrder(int type, const std::string& output) {
  const TypeLayout t = typeLayout(type);
  if (output.size() > kMaxOutputBytes || t.outer == Outer::Unknown) return false;
  if (t.outer == Outer::WrappedEnvelope || t.outer == Outer::BareEnvelope) {
    EnvelopeLayout layout;
    return parseEnvelope(output, &layout, nullptr) && layout.rsaLength == testKey().size();
  }
  const bool hex = t.inner == Inner::KeyouHex || t.inner == Inner::Pkcs1Hex || t.inner == Inner::PairPkcs1Hex;
  std::string raw;
  return (hex ? fromHex(output, &raw, "", nullptr) : fromBase64(output, &raw, "", nullptr)) &&
         raw.size() == testKey().size();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size < 3 || size > 3 + 8192) return 0;
  const std::uint8_t mode = data[0], flags = data[2];
  const int type = data[1] % 92;  // 0..90 and one that produces nothing
  const std::string rest(reinterpret_cast<const char*>(data) + 3, size - 3);
  const std::string output = mode % 2 ? seal(type, flags, rest) : rest;

  OpenKeys keys;
  keys.app = &testKey();
  keys.enc = &testKey();
  keys.saltedHash = flags & 1;
  if (flags & 2) keys.expectedTimestamp = "1700000000";
  Opened opened;
  std::string error;
  bool ok = openOutput(type, output, keys, &opened, &error);
  FUZZ_CHECK(ERR_peek_error() == 0);
  if (ok && (flags & 4)) {
    ok = matchesPassword(type, opened, "hello", keys.saltedHash ? "pepper" : "", 'S');
    FUZZ_CHECK(ERR_peek_error() == 0);
    error = kRejected;  // what the service answers a mismatch
  }
  if (!ok && publicBytesInOrder(type, output)) FUZZ_CHECK(error == kRejected);
  if (!ok && mode % 2 && typeLayout(type).outer != Outer::Unknown && typeLayout(type).outer != Outer::DirectWithEnc &&
      typeLayout(type).outer != Outer::DirectWithApp)
    FUZZ_CHECK(error == kRejected);  // sealed by the fuzzer: only forged or wrong inside
  return 0;
}
