// Key-press accepts check and strength rating: our pattern engine against std::regex and
// PCRE2 (interpreter, no JIT), side by side in one run.
//
// The key-press check is what the input path does on every key: compile the accepts
// pattern, then match it against the whole content. Each peer does the same work: compile
// its equivalent pattern and run one whole-text match (std::regex_match; pcre2_compile with
// PCRE2_ANCHORED | PCRE2_ENDANCHORED, a match-data block from the pattern, pcre2_match, and
// the frees). Texts are letters, digits and punctuation; at lengths above 16 the
// "{0,16}" pattern fails, as it would for the user's seventeenth key. After the runs a table
// prints our CPU time and the peer/ours ratios per case (above 1 means we are faster).
// Targets: std::regex/ours >= 5 and PCRE2/ours >= 1 up to length 64.
#include <benchmark/benchmark.h>

#include <cstdio>
#include <map>
#include <random>
#include <regex>
#include <string>
#include <vector>

#include "pattern/match.h"
#include "pattern/strength.h"

#if defined(TESSEL_HAVE_PCRE2)
#define PCRE2_CODE_UNIT_WIDTH 8
#include <pcre2.h>
#endif

namespace {

struct AcceptsCase {
  const char* name;
  const char* ours;
  const char* peer;
  const char* alphabet;
};

const AcceptsCase kCases[] = {
    {"alnum+", "[:alnum:]+", "[[:alnum:]]+",
     "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789"},
    {"graph{0,16}", "[[:alpha:][:digit:][:punct:]]{0,16}", "[[:alpha:][:digit:][:punct:]]{0,16}",
     "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789!#$%&*+-./:;<=>?@_~"},
};
const int kLengths[] = {8, 64, 512, 4092};

std::string textFor(const AcceptsCase& c, int length) {
  std::mt19937 rng(static_cast<unsigned>(length));
  const std::string alphabet = c.alphabet;
  std::string s;
  for (int i = 0; i < length; ++i) s += alphabet[rng() % alphabet.size()];
  return s;
}

void BM_Ours(benchmark::State& state, const AcceptsCase* c, int length) {
  const std::string text = textFor(*c, length);
  const auto* bytes = reinterpret_cast<const std::uint8_t*>(text.data());
  bool matched = false;
  for (auto _ : state) {
    matched = tessel::wholeMatch(c->ours, bytes, text.size());
    benchmark::DoNotOptimize(matched);
  }
  state.counters["matched"] = matched;
}

void BM_StdRegex(benchmark::State& state, const AcceptsCase* c, int length) {
  const std::string text = textFor(*c, length);
  bool matched = false;
  for (auto _ : state) {
    std::regex re(c->peer);
    matched = std::regex_match(text, re);
    benchmark::DoNotOptimize(matched);
  }
  state.counters["matched"] = matched;
}

#if defined(TESSEL_HAVE_PCRE2)
void BM_Pcre2(benchmark::State& state, const AcceptsCase* c, int length) {
  const std::string text = textFor(*c, length);
  bool matched = false;
  for (auto _ : state) {
    int error = 0;
    PCRE2_SIZE offset = 0;
    pcre2_code* code = pcre2_compile(reinterpret_cast<PCRE2_SPTR>(c->peer), PCRE2_ZERO_TERMINATED,
                                     PCRE2_ANCHORED | PCRE2_ENDANCHORED, &error, &offset, nullptr);
    pcre2_match_data* data = pcre2_match_data_create_from_pattern(code, nullptr);
    matched = pcre2_match(code, reinterpret_cast<PCRE2_SPTR>(text.data()), text.size(), 0, 0, data,
                          nullptr) >= 0;
    pcre2_match_data_free(data);
    pcre2_code_free(code);
    benchmark::DoNotOptimize(matched);
  }
  state.counters["matched"] = matched;
}
#endif

void BM_RateStrength48(benchmark::State& state) {
  const char* password = "Tr0ub4dor&3xK9q!";  // 16 characters, all three classes
  char letter = 0;
  for (auto _ : state) {
    letter = tessel::rateStrength(48, password);
    benchmark::DoNotOptimize(letter);
  }
  state.counters["letter"] = letter;
}

// Collects the per-iteration CPU time of every run for the ratio table (CPU rather than wall
// time: the ratios stay meaningful on a machine shared with other work).
class RatioReporter : public benchmark::ConsoleReporter {
 public:
  void ReportRuns(const std::vector<Run>& runs) override {
    for (const Run& r : runs)
      if (r.run_type == Run::RT_Iteration && r.iterations > 0)
        times_[r.benchmark_name()] = r.GetAdjustedCPUTime();  // in the run's time unit (ns)
    ConsoleReporter::ReportRuns(runs);
  }
  void printRatios() const {
    std::printf("\n%-14s %6s %12s %14s %12s\n", "accepts", "length", "ours CPU ns", "std::regex/ours",
                "PCRE2/ours");
    for (const AcceptsCase& c : kCases) {
      for (int n : kLengths) {
        const std::string suffix = std::string("/") + c.name + "/" + std::to_string(n);
        const double ours = lookup("ours" + suffix);
        const double regex = lookup("std_regex" + suffix);
        const double pcre = lookup("pcre2" + suffix);
        std::printf("%-14s %6d %12.1f %14.1fx %11.1fx\n", c.name, n, ours, regex / ours,
                    pcre > 0 ? pcre / ours : 0.0);
      }
    }
    std::printf("rateStrength(48, 16 characters): %.1f ns CPU\n", lookup("rateStrength48/16"));
  }

 private:
  double lookup(const std::string& name) const {
    auto it = times_.find(name);
    return it == times_.end() ? 0.0 : it->second;
  }
  std::map<std::string, double> times_;
};

}  // namespace

int main(int argc, char** argv) {
  for (const AcceptsCase& c : kCases) {
    for (int n : kLengths) {
      const std::string suffix = std::string("/") + c.name + "/" + std::to_string(n);
      benchmark::RegisterBenchmark(("ours" + suffix).c_str(), BM_Ours, &c, n);
      benchmark::RegisterBenchmark(("std_regex" + suffix).c_str(), BM_StdRegex, &c, n);
#if defined(TESSEL_HAVE_PCRE2)
      benchmark::RegisterBenchmark(("pcre2" + suffix).c_str(), BM_Pcre2, &c, n);
#endif
    }
  }
  benchmark::RegisterBenchmark("rateStrength48/16", BM_RateStrength48);
  benchmark::Initialize(&argc, argv);
  RatioReporter reporter;
  benchmark::RunSpecifiedBenchmarks(&reporter);
  reporter.printRatios();
  benchmark::Shutdown();
  return 0;
}
