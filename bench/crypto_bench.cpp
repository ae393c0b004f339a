// Crypto primitives against OpenSSL, side by side in one run: the RSA public operation at 1024
// and 2048 bits (ours from hex text to hex text, OpenSSL's raw EVP encryption on a prepared
// key), and MD5, SHA-1 and two-key Triple DES ECB throughput over 16 KiB buffers (SHA-1 also
// over 64 bytes, where the per-message cost shows). After the runs a table gives each ratio
// next to its target:
//   RSA time ours / OpenSSL <= 1.1; throughput ours / OpenSSL >= 0.8 (MD5, 3DES), >= 0.9 (SHA-1).
#include <benchmark/benchmark.h>
#include <openssl/evp.h>
#include <openssl/rsa.h>

#include <cstdio>
#include <map>
#include <string>
#include <vector>

#include "crypto/codec.h"
#include "crypto/md5.h"
#include "crypto/rsa.h"
#include "crypto/sha1.h"
#include "crypto/tdes.h"

namespace {

constexpr std::size_t kBufferSize = 16 * 1024;

std::vector<std::uint8_t> pattern(std::size_t n) {
  std::vector<std::uint8_t> v(n);
  for (std::size_t i = 0; i < n; ++i) v[i] = static_cast<std::uint8_t>(i * 131 + 7);
  return v;
}

struct RsaFixture {
  EVP_PKEY* key = nullptr;
  EVP_PKEY_CTX* ctx = nullptr;
  std::string modulusHex, blockHex;
  std::vector<std::uint8_t> block;
  std::size_t k = 0;

  explicit RsaFixture(unsigned bits) {
    key = EVP_RSA_gen(bits);
    BIGNUM* n = nullptr;
    EVP_PKEY_get_bn_param(key, "n", &n);
    char* hex = BN_bn2hex(n);
    modulusHex = hex;
    OPENSSL_free(hex);
    BN_free(n);
    k = static_cast<std::size_t>(EVP_PKEY_get_size(key));
    block = pattern(k);
    block[0] = 0x00;  // below the modulus
    block[1] = 0x02;
    tessel::SecureBuffer h = tessel::hexEncode(block.data(), block.size());
    blockHex = h.c_str();
    ctx = EVP_PKEY_CTX_new(key, nullptr);
    EVP_PKEY_encrypt_init(ctx);
    EVP_PKEY_CTX_set_rsa_padding(ctx, RSA_NO_PADDING);
  }
  ~RsaFixture() {
    EVP_PKEY_CTX_free(ctx);
    EVP_PKEY_free(key);
  }
};

RsaFixture& rsaFixture(unsigned bits) {
  static RsaFixture f1024(1024), f2048(2048);
  return bits == 1024 ? f1024 : f2048;
}

void BM_RsaPublic_Ours(benchmark::State& state) {
  RsaFixture& f = rsaFixture(static_cast<unsigned>(state.range(0)));
  for (auto _ : state) {
    tessel::SecureBuffer c = tessel::rsaPublicHex(f.modulusHex.c_str(), f.blockHex.c_str());
    benchmark::DoNotOptimize(c.data());
  }
}

void BM_RsaPublic_OpenSsl(benchmark::State& state) {
  RsaFixture& f = rsaFixture(static_cast<unsigned>(state.range(0)));
  std::vector<std::uint8_t> out(f.k);
  for (auto _ : state) {
    std::size_t n = out.size();
    EVP_PKEY_encrypt(f.ctx, out.data(), &n, f.block.data(), f.block.size());
    benchmark::DoNotOptimize(out.data());
  }
}

BENCHMARK(BM_RsaPublic_Ours)->Arg(1024)->Arg(2048)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_RsaPublic_OpenSsl)->Arg(1024)->Arg(2048)->Unit(benchmark::kMicrosecond);

std::size_t messageSize(const benchmark::State& state) { return static_cast<std::size_t>(state.range(0)); }

template <void (*Digest)(const void*, std::size_t, std::uint8_t*)>
void oursDigest(benchmark::State& state) {
  const auto data = pattern(messageSize(state));
  std::uint8_t d[20];
  for (auto _ : state) {
    Digest(data.data(), data.size(), d);
    benchmark::DoNotOptimize(d);
  }
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * data.size()));
}

void opensslDigest(benchmark::State& state, const EVP_MD* md) {
  const auto data = pattern(messageSize(state));
  unsigned char d[EVP_MAX_MD_SIZE];
  EVP_MD_CTX* ctx = EVP_MD_CTX_new();
  for (auto _ : state) {
    unsigned n = 0;
    EVP_DigestInit_ex(ctx, md, nullptr);
    EVP_DigestUpdate(ctx, data.data(), data.size());
    EVP_DigestFinal_ex(ctx, d, &n);
    benchmark::DoNotOptimize(d);
  }
  EVP_MD_CTX_free(ctx);
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * data.size()));
}

void md5Ours(const void* p, std::size_t n, std::uint8_t* d) { tessel::md5(p, n, d); }
void sha1Ours(const void* p, std::size_t n, std::uint8_t* d) { tessel::sha1(p, n, d); }
void BM_Md5_Ours(benchmark::State& s) { oursDigest<md5Ours>(s); }
void BM_Md5_OpenSsl(benchmark::State& s) { opensslDigest(s, EVP_md5()); }
void BM_Sha1_Ours(benchmark::State& s) { oursDigest<sha1Ours>(s); }
void BM_Sha1_OpenSsl(benchmark::State& s) { opensslDigest(s, EVP_sha1()); }
BENCHMARK(BM_Md5_Ours)->Arg(kBufferSize);
BENCHMARK(BM_Md5_OpenSsl)->Arg(kBufferSize);
BENCHMARK(BM_Sha1_Ours)->Arg(kBufferSize)->Arg(64);
BENCHMARK(BM_Sha1_OpenSsl)->Arg(kBufferSize)->Arg(64);

const std::uint8_t kTdesKey[16] = {0x01, 0x23, 0x45, 0x67, 0x89, 0xAB, 0xCD, 0xEF,
                                   0xFE, 0xDC, 0xBA, 0x98, 0x76, 0x54, 0x32, 0x10};

void BM_Tdes_Ours(benchmark::State& state) {
  auto data = pattern(kBufferSize);
  tessel::TripleDesContext ctx;
  tessel::tdes2SetKeyEncrypt(ctx, kTdesKey);
  for (auto _ : state) {
    for (std::size_t i = 0; i < data.size(); i += 8) tessel::tdesCryptEcb(ctx, &data[i], &data[i]);
    benchmark::DoNotOptimize(data.data());
  }
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * kBufferSize));
}

void BM_Tdes_OpenSsl(benchmark::State& state) {
  auto data = pattern(kBufferSize);
  std::vector<std::uint8_t> out(kBufferSize + 8);
  EVP_CIPHER_CTX* ctx = EVP_CIPHER_CTX_new();
  EVP_EncryptInit_ex(ctx, EVP_des_ede_ecb(), nullptr, kTdesKey, nullptr);
  EVP_CIPHER_CTX_set_padding(ctx, 0);
  for (auto _ : state) {
    int n = 0;
    EVP_EncryptUpdate(ctx, out.data(), &n, data.data(), static_cast<int>(data.size()));
    benchmark::DoNotOptimize(out.data());
  }
  EVP_CIPHER_CTX_free(ctx);
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * kBufferSize));
}
BENCHMARK(BM_Tdes_Ours);
BENCHMARK(BM_Tdes_OpenSsl);

// Remembers each run's CPU time so the ratios can be printed after the usual table. CPU time
// rather than wall time: the build machines are shared, and time spent preempted is neither
// side's cost.
class RatioReporter : public benchmark::ConsoleReporter {
 public:
  void ReportRuns(const std::vector<Run>& runs) override {
    for (const Run& r : runs)
      if (r.run_type == Run::RT_Iteration) times[r.benchmark_name()] = r.GetAdjustedCPUTime();
    ConsoleReporter::ReportRuns(runs);
  }
  std::map<std::string, double> times;
};

}  // namespace

int main(int argc, char** argv) {
  benchmark::Initialize(&argc, argv);
  RatioReporter reporter;
  benchmark::RunSpecifiedBenchmarks(&reporter);
  struct Pair {
    const char* what;
    const char* ours;
    const char* peer;
    bool timeRatio;  // true: ours / peer time (lower is better); false: throughput ratio
    double target;
  } pairs[] = {
      {"RSA public op 1024 (time ratio)", "BM_RsaPublic_Ours/1024", "BM_RsaPublic_OpenSsl/1024", true, 1.1},
      {"RSA public op 2048 (time ratio)", "BM_RsaPublic_Ours/2048", "BM_RsaPublic_OpenSsl/2048", true, 1.1},
      {"MD5 16 KiB throughput ratio", "BM_Md5_Ours/16384", "BM_Md5_OpenSsl/16384", false, 0.8},
      {"SHA-1 16 KiB throughput ratio", "BM_Sha1_Ours/16384", "BM_Sha1_OpenSsl/16384", false, 0.9},
      {"SHA-1 64 B throughput ratio", "BM_Sha1_Ours/64", "BM_Sha1_OpenSsl/64", false, 0.9},
      {"3DES-EDE2 ECB throughput ratio", "BM_Tdes_Ours", "BM_Tdes_OpenSsl", false, 0.8},
  };
  std::printf("\n%-34s %10s %10s  %s\n", "ours vs OpenSSL", "ratio", "target", "verdict");
  for (const Pair& p : pairs) {
    const auto a = reporter.times.find(p.ours), b = reporter.times.find(p.peer);
    if (a == reporter.times.end() || b == reporter.times.end() || a->second <= 0 || b->second <= 0)
      continue;
    const double ratio = p.timeRatio ? a->second / b->second : b->second / a->second;
    const bool met = p.timeRatio ? ratio <= p.target : ratio >= p.target;
    std::printf("%-34s %10.2f %8s%.2g  %s\n", p.what, ratio, p.timeRatio ? "<= " : ">= ", p.target,
                met ? "met" : "MISSED");
  }
  benchmark::Shutdown();
  return 0;
}
