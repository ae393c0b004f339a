// Session-level content output against an envelope built with OpenSSL, in one run.
//
//   content48  contentOutput(type 48), what getNativeContent runs: salted MD5 of the text,
//              strength letter, envelope under the built-in 1024-bit default modulus (RC4 drop
//              512 + RSA PKCS#1 + base64).
//   content47  contentOutput(type 47), what getNativePinContent runs: the same plus PKCS#1 RSA
//              of the value under a 2048-bit encryption key inside the envelope.
//   openssl48 / openssl47: the same envelopes made with OpenSSL (RAND_bytes, EVP RC4 from the
//              legacy provider, EVP_PKEY_encrypt PKCS#1, EVP_EncodeBlock) from the same wrapped
//              string, so the peer does the RC4 + RSA + base64 work and nothing else.
//
//   content48_osslrand / content47_osslrand: ours again, with the random source swapped for
//              OpenSSL's RAND_bytes (the peer's source), to show what the kernel's getrandom
//              costs (one call per request: two per output for type 48, three for type 47).
//
// After the run the ratios ours / OpenSSL are printed (targets: at most 1.0 for type 48, at
// most 0.9 for type 47).
#include <benchmark/benchmark.h>
#include <openssl/core_names.h>
#include <openssl/evp.h>
#include <openssl/param_build.h>
#include <openssl/provider.h>
#include <openssl/rand.h>
#include <openssl/rsa.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <map>
#include <stdexcept>
#include <string>
#include <vector>

#include "crypto/moduli.h"
#include "crypto/random.h"
#include "session/output.h"
#include "session/session.h"
#include "session/settings.h"

namespace {

const char kTimestamp[] = "1700000000";
const char kPassword[] = "Kqhzmw7!";

EVP_PKEY* publicKeyFromHex(const char* modulusHex) {
  BIGNUM* n = nullptr;
  BIGNUM* e = nullptr;
  BN_hex2bn(&n, modulusHex);
  BN_hex2bn(&e, "10001");
  OSSL_PARAM_BLD* bld = OSSL_PARAM_BLD_new();
  OSSL_PARAM_BLD_push_BN(bld, OSSL_PKEY_PARAM_RSA_N, n);
  OSSL_PARAM_BLD_push_BN(bld, OSSL_PKEY_PARAM_RSA_E, e);
  OSSL_PARAM* params = OSSL_PARAM_BLD_to_param(bld);
  EVP_PKEY_CTX* ctx = EVP_PKEY_CTX_new_from_name(nullptr, "RSA", nullptr);
  EVP_PKEY* key = nullptr;
  if (EVP_PKEY_fromdata_init(ctx) != 1 || EVP_PKEY_fromdata(ctx, &key, EVP_PKEY_PUBLIC_KEY, params) != 1)
    throw std::runtime_error("public key");
  EVP_PKEY_CTX_free(ctx);
  OSSL_PARAM_free(params);
  OSSL_PARAM_BLD_free(bld);
  BN_free(n);
  BN_free(e);
  return key;
}

std::string modulusHexOf(EVP_PKEY* key) {
  BIGNUM* n = nullptr;
  EVP_PKEY_get_bn_param(key, OSSL_PKEY_PARAM_RSA_N, &n);
  char* hex = BN_bn2hex(n);
  std::string out = hex;
  OPENSSL_free(hex);
  BN_free(n);
  return out;
}

struct Fixture {
  EVP_PKEY* app = nullptr;   // public half of the built-in default modulus
  EVP_PKEY* enc = nullptr;   // fresh 2048-bit key
  std::string encHex;
  EVP_CIPHER* rc4 = nullptr;
  int handle = -1;

  Fixture() {
    OSSL_PROVIDER_load(nullptr, "legacy");
    OSSL_PROVIDER_load(nullptr, "default");
    rc4 = EVP_CIPHER_fetch(nullptr, "RC4", nullptr);
    if (rc4 == nullptr) throw std::runtime_error("RC4 needs the OpenSSL legacy provider");
    app = publicKeyFromHex(tessel::builtinDefaultModulus());
    enc = EVP_RSA_gen(2048);
    encHex = modulusHexOf(enc);
    handle = tessel::createSession("dispatch-bench");
    tessel::KeyboardSession& s = *tessel::sessionAt(handle);
    {
      tessel::ContentGuard guard(*s.content);
      std::memcpy(guard.text(), kPassword, sizeof kPassword - 1);
      s.content->length = sizeof kPassword - 1;
    }
    tessel::setHashRandom(s, "1:s4lt-0123456789");
    tessel::setEncryPlat(s, encHex.c_str(), false);
  }
};

Fixture& fixture() {
  static Fixture* f = new Fixture();
  return *f;
}

std::vector<unsigned char> rsaPkcs1(EVP_PKEY* key, const unsigned char* m, std::size_t n) {
  EVP_PKEY_CTX* ctx = EVP_PKEY_CTX_new(key, nullptr);
  std::size_t outLength = 0;
  EVP_PKEY_encrypt_init(ctx);
  EVP_PKEY_CTX_set_rsa_padding(ctx, RSA_PKCS1_PADDING);
  EVP_PKEY_encrypt(ctx, nullptr, &outLength, m, n);
  std::vector<unsigned char> out(outLength);
  EVP_PKEY_encrypt(ctx, out.data(), &outLength, m, n);
  EVP_PKEY_CTX_free(ctx);
  out.resize(outLength);
  return out;
}

// RC4 (drop 512) + RSA PKCS#1 of the key + the SIMPLEBLOB layout + base64, all by OpenSSL.
std::string opensslEnvelope(const std::string& content) {
  Fixture& f = fixture();
  unsigned char key[16];
  RAND_bytes(key, sizeof key);
  EVP_CIPHER_CTX* ctx = EVP_CIPHER_CTX_new();
  EVP_EncryptInit_ex2(ctx, f.rc4, nullptr, nullptr, nullptr);
  EVP_CIPHER_CTX_set_key_length(ctx, 16);
  EVP_EncryptInit_ex2(ctx, nullptr, key, nullptr, nullptr);
  unsigned char drop[512] = {0};
  int n = 0;
  EVP_EncryptUpdate(ctx, drop, &n, drop, sizeof drop);
  std::vector<unsigned char> sealed(content.size() + 16);
  EVP_EncryptUpdate(ctx, sealed.data(), &n, reinterpret_cast<const unsigned char*>(content.data()),
                    static_cast<int>(content.size()));
  EVP_CIPHER_CTX_free(ctx);
  std::vector<unsigned char> wrapped = rsaPkcs1(f.app, key, sizeof key);
  std::reverse(wrapped.begin(), wrapped.end());
  std::vector<unsigned char> raw;
  char digits[16];
  std::snprintf(digits, sizeof digits, "%08zu", wrapped.size() + 12);
  raw.insert(raw.end(), digits, digits + 8);
  static const unsigned char header[12] = {1, 2, 0, 0, 1, 0x68, 0, 0, 0, 0xA4, 0, 0};
  raw.insert(raw.end(), header, header + 12);
  raw.insert(raw.end(), wrapped.begin(), wrapped.end());
  std::snprintf(digits, sizeof digits, "%08zu", content.size());
  raw.insert(raw.end(), digits, digits + 8);
  raw.insert(raw.end(), sealed.begin(), sealed.begin() + static_cast<long>(content.size()));
  std::string out(4 * (raw.size() + 2) / 3 + 4, '\0');
  const int length = EVP_EncodeBlock(reinterpret_cast<unsigned char*>(&out[0]), raw.data(), static_cast<int>(raw.size()));
  out.resize(static_cast<std::size_t>(length));
  return out;
}

// The wrapped strings the device builds for the two types (letter, timestamp, value).
const std::string kValue = "c359e5975c5a3f45";  // 16 characters, as a salted-hash value is

void content48(benchmark::State& state) {
  Fixture& f = fixture();
  tessel::KeyboardSession& s = *tessel::sessionAt(f.handle);
  for (auto _ : state) {
    tessel::SecureBuffer out = tessel::contentOutput(s, 48, kTimestamp);
    if (!out) state.SkipWithError("content output failed");
    benchmark::DoNotOptimize(out.data());
  }
}

void openssl48(benchmark::State& state) {
  const std::string wrapped = std::string("M") + kTimestamp + ":" + kValue;
  for (auto _ : state) {
    std::string out = opensslEnvelope(wrapped);
    benchmark::DoNotOptimize(out.data());
  }
}

void content47(benchmark::State& state) {
  Fixture& f = fixture();
  tessel::KeyboardSession& s = *tessel::sessionAt(f.handle);
  for (auto _ : state) {
    tessel::SecureBuffer out = tessel::contentOutput(s, 47, kTimestamp);
    if (!out) state.SkipWithError("content output failed");
    benchmark::DoNotOptimize(out.data());
  }
}

void openssl47(benchmark::State& state) {
  Fixture& f = fixture();
  static const char kDigits[] = "0123456789ABCDEF";
  for (auto _ : state) {
    const std::vector<unsigned char> c =
        rsaPkcs1(f.enc, reinterpret_cast<const unsigned char*>(kValue.data()), kValue.size());
    std::string payload;
    for (unsigned char b : c) {
      payload += kDigits[b >> 4];
      payload += kDigits[b & 15];
    }
    std::string out = opensslEnvelope(std::string("M") + kTimestamp + ":" + payload);
    benchmark::DoNotOptimize(out.data());
  }
}

bool opensslRandom(std::uint8_t* buffer, std::size_t n) { return RAND_bytes(buffer, static_cast<int>(n)) == 1; }

void content48_osslrand(benchmark::State& state) {
  tessel::setRandomSourceForTesting(opensslRandom);
  content48(state);
  tessel::setRandomSourceForTesting(nullptr);
}

void content47_osslrand(benchmark::State& state) {
  tessel::setRandomSourceForTesting(opensslRandom);
  content47(state);
  tessel::setRandomSourceForTesting(nullptr);
}

BENCHMARK(content48);
BENCHMARK(openssl48);
BENCHMARK(content48_osslrand);
BENCHMARK(content47);
BENCHMARK(openssl47);
BENCHMARK(content47_osslrand);

// Prints the usual table and keeps each benchmark's CPU time per iteration (the median when
// repetitions are asked for) for the ratios. CPU time, because the build machine is shared: wall
// time there measures the neighbours as much as the code.
class RatioReporter : public benchmark::ConsoleReporter {
 public:
  void ReportRuns(const std::vector<Run>& runs) override {
    for (const Run& run : runs) {
      if (run.error_occurred) continue;
      const bool single = run.run_type == Run::RT_Iteration && run.repetitions <= 1;
      const bool median = run.run_type == Run::RT_Aggregate && run.aggregate_name == "median";
      if (single || median) nanoseconds[run.run_name.function_name] = run.GetAdjustedCPUTime() * toNanoseconds(run);
    }
    ConsoleReporter::ReportRuns(runs);
  }
  std::map<std::string, double> nanoseconds;

 private:
  static double toNanoseconds(const Run& run) {
    switch (run.time_unit) {
      case benchmark::kMillisecond: return 1e6;
      case benchmark::kMicrosecond: return 1e3;
      case benchmark::kSecond: return 1e9;
      default: return 1.0;
    }
  }
};

}  // namespace

int main(int argc, char** argv) {
  benchmark::Initialize(&argc, argv);
  fixture();
  RatioReporter reporter;
  benchmark::RunSpecifiedBenchmarks(&reporter);
  for (const char* type : {"48", "47"}) {
    const auto peer = reporter.nanoseconds.find(std::string("openssl") + type);
    if (peer == reporter.nanoseconds.end()) continue;
    for (const char* variant : {"", "_osslrand"}) {
      const auto ours = reporter.nanoseconds.find(std::string("content") + type + variant);
      if (ours == reporter.nanoseconds.end()) continue;
      std::printf("type %s%s: ours %.1f us, OpenSSL %.1f us CPU per output, ratio %.2f (target <= %s)\n", type,
                  *variant ? " with RAND_bytes as our random source" : "", ours->second / 1e3, peer->second / 1e3,
                  ours->second / peer->second, type[1] == '8' ? "1.0" : "0.9");
    }
  }
  benchmark::Shutdown();
  return 0;
}
