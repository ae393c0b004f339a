// Key-press accepts check and strength rating: our pattern engine against std::regex and
// PCRE2 (interpreter, no JIT), side by side in one run.
//
// The key-press check compiles the accepts pattern and matches it against the whole content.
// Each peer does the same work: compile its equivalent pattern and run one whole-text match
// (std::regex_match; pcre2_compile with PCRE2_ANCHORED | PCRE2_ENDANCHORED, a match-data block
// from the pattern, pcre2_match, and the frees). The library itself compiles the pattern once,
// at setAccepts; "ours_keypress" measures that path (the match alone). Texts are letters, digits and punctuation; at lengths above 16 the
// "{0,16}" pattern fails, as it would for the user's seventeenth key. After the runs a table
// prints our CPU time and the peer/ours ratios per case (above 1 means we are faster).
// Targets: std::regex/ours >= 5 and PCRE2/ours >= 1 up to length 64.
//
// Hostile key presses: patterns that make a backtracking search explode, each on a
// 4092-byte text that matches, one that does not, and one that does not although it holds
// the byte the pattern requires (so no quick scan can refuse it). The pattern is compiled
// once, as setAccepts does; the row times the match alone. Target: at most 100 ms and 32 MB
// of match state ("peak_bytes", the heap at its largest) per key press for every pattern the
// engine compiles; "compiled" is 0 for a pattern refused as too heavy (it never matches). The
// set holds the heaviest shapes that still compile next to the refused ones. PCRE2 runs the
// same compile and match with its default limits (a hit counts as "limit").
#include <benchmark/benchmark.h>

#include <algorithm>
#include <cstdio>
#include <map>
#include <random>
#include <regex>
#include <string>
#include <vector>

#include "pattern/pattern_engine.h"
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
    const tessel::PatternEngine engine(c->ours);
    tessel::MatchContext context;
    matched = engine.matches(bytes, text.size(), &context);
    benchmark::DoNotOptimize(matched);
  }
  state.counters["matched"] = matched;
}

// The key press as the library runs it: the accepts pattern is compiled once, when it is set
// (setAccepts), so a key pays only the whole-text match with a fresh context.
void BM_OursKeyPress(benchmark::State& state, const AcceptsCase* c, int length) {
  const std::string text = textFor(*c, length);
  const auto* bytes = reinterpret_cast<const std::uint8_t*>(text.data());
  const tessel::PatternEngine engine(c->ours);
  bool matched = false;
  for (auto _ : state) {
    tessel::MatchContext context;
    matched = engine.matches(bytes, text.size(), &context);
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

struct HostileCase {
  std::string name;
  std::string pattern;
  char last;  // the byte a matching text ends with
};

// "(…(a)*…)*b|a*" with `levels` loops around "(a)*".
std::string nestedLoops(int levels) {
  std::string p = "(a)*";
  for (int i = 0; i < levels; ++i) p = "(" + p + ")*";
  return p + "b|a*";
}
// "(a|aa|…|a^n)*c|a*".
std::string growingAlternatives(int n) {
  std::string p = "(a";
  for (int i = 2; i <= n; ++i) p += "|" + std::string(static_cast<std::size_t>(i), 'a');
  return p + ")*c|a*";
}
std::string manyAlternatives(int n) {
  std::string p = "(a";
  for (int i = 0; i < n; ++i) p += "|a" + std::to_string(i);
  return p + ")*b|a*";
}

const std::vector<HostileCase> kHostile = {
    {"(a*)*b", "(a*)*b", 'b'},
    {"(a|aa)*c", "(a|aa)*c", 'c'},
    {"((a+)*)+b", "((a+)*)+b", 'b'},
    {"(.*){20}x", "(.*){20}x", 'x'},
    {"(a*)*b|a*", "(a*)*b|a*", 'b'},
    {"(q*)*x4|.*", "(q*)*(q*)*(q*)*(q*)*z|.*", 'z'},
    {"digit+alpha+punct", "[:print:]*[:digit:][:print:]*[:alpha:][:print:]*[:punct:][:print:]*", '!'},
    {"digit+alpha", "[:print:]*[:digit:][:print:]*[:alpha:][:print:]*", 'a'},
    // The heaviest of their shapes that compile.
    {"nested24", nestedLoops(23), 'b'},
    {"(a{0,1000}){0,226}b|a*", "(a{0,1000}){0,226}b|a*", 'b'},
    {"(.*.*){203}x|.*", "(.*.*){203}x|.*", 'x'},
    {"(a|…|a^42)*c|a*", growingAlternatives(42), 'c'},
    {"((a*)*){0,92}b|a*", "((a*)*){0,92}b|a*", 'b'},
    {"(a?){340}b?", "(a?){340}b?", 'b'},
    // Refused as too heavy.
    {"nested30", nestedLoops(29), 'b'},
    {"nested100", nestedLoops(99), 'b'},
    {"(a{0,1000}){0,1000}b|a*", "(a{0,1000}){0,1000}b|a*", 'b'},
    {"(a|…|a^1000)*c|a*", growingAlternatives(1000), 'c'},
    {"alt50000", manyAlternatives(50000), 'b'},
    {"(a|b?){20000}c?", "(a|b?){20000}c?", 'c'},
    {"(a?){20000}b?", "(a?){20000}b?", 'b'},
};
const char* const kHostileTexts[] = {"match", "nomatch", "nomatch_required"};

std::string hostileText(const HostileCase& c, int kind) {
  const std::size_t n = 4092;
  if (c.last == '!' || c.last == 'a') {  // the "contains" rules: digit, then letter, then punctuation
    std::string s(n, 'k');
    s[0] = '7';
    if (kind == 1) s[0] = 'k';  // no digit at all
    if (kind == 2) s.back() = '7';  // classes present, punctuation or letter only before the digit
    if (kind == 2) s[0] = c.last == '!' ? '!' : 'k';
    if (kind == 0) s.back() = c.last;
    return s;
  }
  if (kind == 0) return std::string(n - 1, 'a') + c.last;
  if (kind == 1) return std::string(n, 'a');
  return std::string(n / 2, 'a') + c.last + std::string(n - n / 2 - 1, 'a');
}

void BM_HostileOurs(benchmark::State& state, const HostileCase* c, int kind) {
  const std::string text = hostileText(*c, kind);
  const tessel::PatternEngine engine(c->pattern.c_str());
  bool matched = false;
  std::size_t peak = 0;
  for (auto _ : state) {
    tessel::MatchContext context;
    matched = engine.matches(reinterpret_cast<const std::uint8_t*>(text.data()), text.size(), &context);
    peak = std::max(peak, context.peakBytes());
    benchmark::DoNotOptimize(matched);
  }
  state.counters["matched"] = matched;
  state.counters["peak_bytes"] = static_cast<double>(peak);
  state.counters["compiled"] = engine.status() == tessel::PatternEngine::Status::kCompiled;
}

#if defined(TESSEL_HAVE_PCRE2)
void BM_HostilePcre2(benchmark::State& state, const HostileCase* c, int kind) {
  const std::string text = hostileText(*c, kind);
  int rc = 0;
  for (auto _ : state) {
    int error = 0;
    PCRE2_SIZE offset = 0;
    std::string peer = c->pattern;
    for (const char* name : {"print", "digit", "alpha", "punct"}) {
      const std::string from = std::string("[:") + name + ":]", to = "[" + from + "]";
      for (std::size_t at = peer.find(from); at != std::string::npos; at = peer.find(from, at + to.size()))
        peer.replace(at, from.size(), to);
    }
    pcre2_code* code = pcre2_compile(reinterpret_cast<PCRE2_SPTR>(peer.c_str()), PCRE2_ZERO_TERMINATED,
                                     PCRE2_ANCHORED | PCRE2_ENDANCHORED | PCRE2_DOTALL, &error, &offset, nullptr);
    if (code == nullptr) {  // refused (too large)
      rc = PCRE2_ERROR_NOMEMORY;
      continue;
    }
    pcre2_match_data* data = pcre2_match_data_create_from_pattern(code, nullptr);
    rc = pcre2_match(code, reinterpret_cast<PCRE2_SPTR>(text.data()), text.size(), 0, 0, data, nullptr);
    pcre2_match_data_free(data);
    pcre2_code_free(code);
    benchmark::DoNotOptimize(rc);
  }
  state.counters["matched"] = rc >= 0;
  state.counters["limit"] = rc < 0 && rc != PCRE2_ERROR_NOMATCH;
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
    std::printf("\n%-22s %-17s %14s %14s\n", "hostile, 4092 bytes", "text", "ours CPU ms", "PCRE2/ours");
    double worst = 0;
    for (const HostileCase& c : kHostile) {
      for (const char* kind : kHostileTexts) {
        const std::string suffix = "/" + c.name + "/" + kind;
        const double ours = lookup("hostile_ours" + suffix), pcre = lookup("hostile_pcre2" + suffix);
        worst = std::max(worst, ours);
        std::printf("%-22s %-17s %14.4f %13.1fx\n", c.name.c_str(), kind, ours / 1e6, pcre > 0 ? pcre / ours : 0.0);
      }
    }
    std::printf("worst hostile key press: %.4f ms CPU\n", worst / 1e6);
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
      if (n <= 64) benchmark::RegisterBenchmark(("ours_keypress" + suffix).c_str(), BM_OursKeyPress, &c, n);
#if defined(TESSEL_HAVE_PCRE2)
      benchmark::RegisterBenchmark(("pcre2" + suffix).c_str(), BM_Pcre2, &c, n);
#endif
    }
  }
  benchmark::RegisterBenchmark("rateStrength48/16", BM_RateStrength48);
  for (const HostileCase& c : kHostile) {
    for (int kind = 0; kind < 3; ++kind) {
      const std::string suffix = "/" + c.name + "/" + kHostileTexts[kind];
      benchmark::RegisterBenchmark(("hostile_ours" + suffix).c_str(), BM_HostileOurs, &c, kind);
#if defined(TESSEL_HAVE_PCRE2)
      benchmark::RegisterBenchmark(("hostile_pcre2" + suffix).c_str(), BM_HostilePcre2, &c, kind);
#endif
    }
  }
  benchmark::Initialize(&argc, argv);
  RatioReporter reporter;
  benchmark::RunSpecifiedBenchmarks(&reporter);
  reporter.printRatios();
  benchmark::Shutdown();
  return 0;
}
