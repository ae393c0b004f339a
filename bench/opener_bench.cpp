// Opening envelopes on the server: the C++ opener (tools/server, OpenSSL) on type-48 envelopes
// that the device library's dispatcher sealed for a 1024-bit and a 2048-bit key. Its peer is the
// Java opener (tools/server/java) on the very same envelopes: with TESSEL_OPENER_ENVELOPES set to
// a directory, the envelopes are written there as envelope_<bits>.txt for bench/opener_bench.sh,
// which runs both and prints the ratio of envelopes opened per second.
#include <benchmark/benchmark.h>

#include <cstdlib>
#include <fstream>
#include <stdexcept>
#include <string>

#include "output/dispatcher.h"
#include "server/tessel_opener.h"

namespace {

const char kTimestamp[] = "1700000000";
const char kText[] = "Kqhzmw7!::::::::::pepper::::::::::S";

struct Case {
  tessel::server::PrivateKey key;
  std::string envelope;
};

Case& caseFor(int bits) {
  static Case cases[2];
  Case& c = cases[bits == 2048 ? 1 : 0];
  if (!c.envelope.empty()) return c;
  std::string error;
  const std::string pem = std::string(TESSEL_DATA_DIR) +
                          (bits == 2048 ? "/dispatch_enc_key_2048.pem" : "/dispatch_app_key_1024.pem");
  if (!c.key.loadPemFile(pem, &error)) throw std::runtime_error(error);
  const std::string modulus = c.key.modulusHex();
  const char* const keys[2] = {modulus.c_str(), nullptr};
  tessel::SecureBuffer out;
  if (tessel::encryptionDispatch(48, keys, &out, kText, kTimestamp) != 0) throw std::runtime_error("dispatch");
  c.envelope = out.c_str();
  if (const char* dir = std::getenv("TESSEL_OPENER_ENVELOPES")) {
    std::ofstream(std::string(dir) + "/envelope_" + std::to_string(bits) + ".txt") << c.envelope;
  }
  return c;
}

void open(benchmark::State& state) {
  Case& c = caseFor(static_cast<int>(state.range(0)));
  tessel::server::OpenKeys keys;
  keys.app = &c.key;
  tessel::server::Opened opened;
  std::string error;
  for (auto _ : state) {
    if (!tessel::server::openOutput(48, c.envelope, keys, &opened, &error)) state.SkipWithError(error.c_str());
    benchmark::DoNotOptimize(opened.content.data());
  }
  state.SetItemsProcessed(state.iterations());
}
BENCHMARK(open)->Arg(1024)->Arg(2048)->Unit(benchmark::kMicrosecond);

}  // namespace

BENCHMARK_MAIN();
