// Whether the C++ opener's time tells a forged envelope from a genuine one. Four classes of
// type-48 envelope (valid; bad PKCS#1 padding; good padding around a 15-byte key; good padding
// around a wrong 16-byte key), 256 different envelopes per class (a forgery opens to random
// content: many of them average out its parse), OPENS opens of each (default 20,000;
// TESSEL_TIMING_OPENS overrides) in interleaved rounds whose class order is shuffled, each open
// timed on its own. It reports per class the median and, for each forged class, the median
// difference to the valid class with a bootstrap 95% confidence interval (1,000 resamples).
// Target on a quiet machine: every interval contains 0 and lies within ±50 ns. No peer: the
// valid class is the reference. The Java opener's counterpart lives beside
// tools/server/java/bench/OpenerBench.java.
#include <benchmark/benchmark.h>
#include <openssl/evp.h>
#include <openssl/rsa.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <random>
#include <stdexcept>
#include <string>
#include <vector>

#include "server/bytes.h"
#include "server/tessel_opener.h"

namespace {

using tessel::server::PrivateKey;

// Raw RSA with the key's public half (the bench's own forger).
std::string rawEncrypt(const PrivateKey& key, const std::string& block) {
  EVP_PKEY_CTX* ctx = EVP_PKEY_CTX_new(key.get(), nullptr);
  std::string out(key.size(), '\0');
  std::size_t n = out.size();
  const bool ok = ctx != nullptr && EVP_PKEY_encrypt_init(ctx) == 1 &&
                  EVP_PKEY_CTX_set_rsa_padding(ctx, RSA_NO_PADDING) == 1 &&
                  EVP_PKEY_encrypt(ctx, reinterpret_cast<unsigned char*>(&out[0]), &n,
                                   reinterpret_cast<const unsigned char*>(block.data()), block.size()) == 1;
  EVP_PKEY_CTX_free(ctx);
  if (!ok) throw std::runtime_error("raw RSA");
  return out;
}

// 00 02 | non-zero filler | 00 | message, or 00 01 ... when `badType`.
std::string padded(std::size_t k, const std::string& message, bool badType, std::mt19937& rng) {
  std::string b(k, '\0');
  b[1] = badType ? 1 : 2;
  for (std::size_t i = 2; i < k - message.size() - 1; ++i) b[i] = static_cast<char>(1 + rng() % 255);
  b.replace(k - message.size(), message.size(), message);
  return b;
}

std::string envelope(const PrivateKey& key, const std::string& wrapped, const std::string& rc4Key,
                     const std::string& content) {
  std::string sealed, error;
  if (!tessel::server::cipherPass("RC4", true, rc4Key, 512, content, &sealed, &error)) throw std::runtime_error(error);
  std::string reversed(wrapped.rbegin(), wrapped.rend());
  char digits[16];
  std::snprintf(digits, sizeof digits, "%08zu", key.size() + 12);
  std::string raw = digits + std::string("\x01\x02\x00\x00\x01\x68\x00\x00\x00\xA4\x00\x00", 12) + reversed;
  std::snprintf(digits, sizeof digits, "%08zu", content.size());
  raw += digits + sealed;
  std::string b64(4 * ((raw.size() + 2) / 3) + 1, '\0');
  const int n = EVP_EncodeBlock(reinterpret_cast<unsigned char*>(&b64[0]),
                                reinterpret_cast<const unsigned char*>(raw.data()), static_cast<int>(raw.size()));
  b64.resize(static_cast<std::size_t>(n));
  return b64;
}

double median(std::vector<double> v) {
  std::nth_element(v.begin(), v.begin() + v.size() / 2, v.end());
  return v[v.size() / 2];
}

void BM_OpenTiming(benchmark::State& state) {
  const int bits = static_cast<int>(state.range(0));
  PrivateKey key;
  std::string error;
  const std::string pem = std::string(TESSEL_DATA_DIR) +
                          (bits == 2048 ? "/dispatch_enc_key_2048.pem" : "/dispatch_app_key_1024.pem");
  if (!key.loadPemFile(pem, &error)) return state.SkipWithError(error.c_str());
  const std::size_t opens = std::getenv("TESSEL_TIMING_OPENS") ? std::strtoul(std::getenv("TESSEL_TIMING_OPENS"), nullptr, 10)
                                                              : 20000;
  const char* names[] = {"valid", "bad_padding", "wrong_length_key", "wrong_16_byte_key"};
  constexpr int kClasses = 4, kEnvelopesPerClass = 256;
  std::mt19937 rng(48);
  std::vector<std::string> envelopes[kClasses];
  const std::string content = "S1700000000:Kqhzmw7!pepper";
  for (int e = 0; e < kEnvelopesPerClass; ++e) {
    std::string rc4(16, '\0'), other(16, '\0');
    for (auto& c : rc4) c = static_cast<char>(rng());
    for (auto& c : other) c = static_cast<char>(rng());
    const std::size_t k = key.size();
    envelopes[0].push_back(envelope(key, rawEncrypt(key, padded(k, rc4, false, rng)), rc4, content));
    envelopes[1].push_back(envelope(key, rawEncrypt(key, padded(k, rc4, true, rng)), rc4, content));
    envelopes[2].push_back(envelope(key, rawEncrypt(key, padded(k, rc4.substr(1), false, rng)), rc4.substr(1), content));
    envelopes[3].push_back(envelope(key, rawEncrypt(key, padded(k, other, false, rng)), rc4, content));
  }
  tessel::server::OpenKeys keys;
  keys.app = &key;
  std::vector<double> samples[kClasses];
  for (auto _ : state) {
    int order[kClasses] = {0, 1, 2, 3};
    for (std::size_t round = 0; round < opens + 200; ++round) {
      std::shuffle(order, order + kClasses, rng);
      for (int c : order) {
        const std::string& output = envelopes[c][round % kEnvelopesPerClass];
        tessel::server::Opened opened;  // its wiping destructor runs outside the timed span
        const auto t0 = std::chrono::steady_clock::now();
        const bool ok = tessel::server::openOutput(48, output, keys, &opened, &error);
        const auto t1 = std::chrono::steady_clock::now();
        benchmark::DoNotOptimize(ok);
        if (round >= 200) samples[c].push_back(std::chrono::duration<double, std::nano>(t1 - t0).count());  // warmed up
      }
    }
  }
  state.counters["valid_median_ns"] = median(samples[0]);
  std::printf("%d-bit key, %zu opens per class: valid median %.0f ns\n", bits, opens, median(samples[0]));
  for (int c = 1; c < kClasses; ++c) {
    const double diff = median(samples[c]) - median(samples[0]);
    std::vector<double> boot, a(opens), b(opens);
    std::uniform_int_distribution<std::size_t> pick(0, opens - 1);
    for (int r = 0; r < 1000; ++r) {
      for (std::size_t i = 0; i < opens; ++i) {
        a[i] = samples[c][pick(rng)];
        b[i] = samples[0][pick(rng)];
      }
      boot.push_back(median(a) - median(b));
    }
    std::sort(boot.begin(), boot.end());
    const double lo = boot[24], hi = boot[974];
    state.counters[std::string(names[c]) + "_diff_ns"] = diff;
    state.counters[std::string(names[c]) + "_ci_lo_ns"] = lo;
    state.counters[std::string(names[c]) + "_ci_hi_ns"] = hi;
    std::printf("  %-18s median %.0f ns, difference %+.1f ns, 95%% CI [%+.1f, %+.1f]%s\n", names[c],
                median(samples[c]), diff, lo, hi, lo <= 0 && hi >= 0 && lo >= -50 && hi <= 50 ? "" : "  (outside target)");
  }
}
BENCHMARK(BM_OpenTiming)->Arg(1024)->Arg(2048)->Iterations(1)->Repetitions(1)->Unit(benchmark::kMillisecond);

}  // namespace

BENCHMARK_MAIN();
