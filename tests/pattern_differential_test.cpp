// Differential test of the pattern engine against std::regex (always) and PCRE2 (when built
// with it; otherwise that half reports itself skipped).
//
// Patterns are generated with a fixed seed from the syntax the engines share: literals, '.',
// named classes and \d \w \s, bracket sets, alternation, groups, back-references \g{N},
// anchors ^ $ \b \B \A \z \Z \G, and * + ? {m} {m,} {m,n} in greedy, reluctant and possessive
// forms. Texts are random, sampled from the pattern, or sampled and mutated.
// PCRE2 runs anchored at both ends with DOTALL; it must agree on match/no-match and on every
// group span, except where the no-progress rule of our whole-text driver applies ("(||)b*|a"
// does not match "a"; counted). std::regex (ECMAScript) checks match/no-match on the patterns
// it expresses the same way: no back-references, anchors or possessive forms.
#include <gtest/gtest.h>

#include <cctype>
#include <cstdint>
#include <cstdio>
#include <random>
#if defined(__GNUC__) && !defined(__clang__)
// libstdc++'s regex compiler trips a false -Wmaybe-uninitialized under sanitizer builds.
#pragma GCC diagnostic ignored "-Wmaybe-uninitialized"
#endif
#include <regex>
#include <string>
#include <vector>

#include "pattern/pattern_engine.h"

#if defined(TESSEL_HAVE_PCRE2)
#define PCRE2_CODE_UNIT_WIDTH 8
#include <pcre2.h>
#endif

using namespace tessel;

namespace {

class Rng {
 public:
  explicit Rng(std::uint32_t seed) : engine_(seed) {}
  int below(int n) { return static_cast<int>(engine_() % static_cast<std::uint32_t>(n)); }
  bool chance(int percent) { return below(100) < percent; }
  char textByte() {
    static const char kUniverse[] = "abcAB12!-_ \n\x80\xFF";
    return kUniverse[below(sizeof kUniverse - 1)];
  }

 private:
  std::mt19937 engine_;
};

int isWord(int c) { return std::isalnum(c) || c == '_'; }
struct ClassInfo {
  const char* name;
  int (*predicate)(int);
  char escape;  // \d-style letter, or 0
};
const ClassInfo kClasses[] = {{"alnum", isalnum, 0}, {"alpha", isalpha, 0}, {"digit", isdigit, 'd'},
                              {"lower", islower, 0}, {"upper", isupper, 0}, {"punct", ispunct, 0},
                              {"space", isspace, 's'}, {"print", isprint, 0}, {"word", isWord, 'w'}};

// One generated pattern, rendered for each engine while it is built; `sampler` makes texts.
struct Generated {
  std::string ours, pcre, ecma;
  bool ecmaOk = true;
};

class Generator {
 public:
  explicit Generator(Rng& rng) : rng_(rng) {}

  Generated make() {
    Generated g;
    groups_ = 0;
    alternation(0, g);
    return g;
  }

 private:
  void add(Generated& g, const std::string& ours, const std::string& pcre, const std::string& ecma) {
    g.ours += ours;
    g.pcre += pcre;
    g.ecma += ecma;
  }

  // Returns whether the piece can match the empty text.
  bool alternation(int depth, Generated& g) {
    const int n = depth < 3 && rng_.chance(25) ? 2 + rng_.below(2) : 1;
    bool empty = false;
    for (int i = 0; i < n; ++i) {
      if (i > 0) add(g, "|", "|", "|");
      const int items = rng_.below(4) + (depth == 0 ? 1 : 0);
      bool all = true;
      for (int k = 0; k < items; ++k) all = quantified(depth, g) && all;
      empty = empty || all;
    }
    return empty;
  }

  bool quantified(int depth, Generated& g) {
    if (!rng_.chance(45)) return atom(depth, g);
    const int form = rng_.below(4);
    int lo = 0, hi = -1;
    std::string q;
    if (form == 0) {
      lo = rng_.below(3);
      hi = rng_.chance(30) ? -1 : lo + rng_.below(3);
      q = "{" + std::to_string(lo) + (hi == lo ? "" : hi < 0 ? "," : "," + std::to_string(hi)) + "}";
    } else {
      lo = form == 2 ? 1 : 0;
      hi = form == 3 ? 1 : -1;
      q = form == 1 ? "*" : form == 2 ? "+" : "?";
    }
    const bool group = depth < 2 && rng_.chance(20);
    if (group) add(g, "(", "(", "(");
    const bool empty = group ? groupBody(depth, g) : atom(depth, g, true);
    if (group) add(g, ")", ")", ")");
    const int mode = rng_.below(10);
    std::string suffix = mode < 6 ? "" : mode < 8 ? "?" : "+";
    if (suffix == "+") g.ecmaOk = false;
    const bool fixed = hi == lo;
    add(g, q + suffix, q + (fixed ? "" : suffix), q + (fixed ? "" : suffix));
    return empty || lo == 0;
  }

  bool groupBody(int depth, Generated& g) {
    ++groups_;
    return alternation(depth + 1, g);
  }

  bool atom(int depth, Generated& g, bool repeated = false) {
    const int k = rng_.below(depth < 3 ? 100 : 80);
    if (k < 35) {
      static const char lits[] = "abcA1!-_";
      const std::string c(1, lits[rng_.below(8)]);
      add(g, c, c, c);
      return false;
    }
    if (k < 40) {
      add(g, ".", ".", "[\\s\\S]");
      return false;
    }
    if (k < 50) {
      const ClassInfo& c = kClasses[rng_.below(9)];
      const bool neg = rng_.chance(25);
      if (c.escape != 0 && rng_.chance(60)) {
        const std::string e = std::string("\\") + static_cast<char>(neg ? std::toupper(c.escape) : c.escape);
        add(g, e, e, e);
      } else if (c.escape == 'w') {
        add(g, "a", "a", "a");
      } else {
        const std::string body = std::string("[:") + c.name + ":]";
        add(g, std::string("[:") + (neg ? "^" : "") + c.name + ":]", (neg ? "[^" : "[") + body + "]",
            (neg ? "[^" : "[") + body + "]");
      }
      return false;
    }
    if (k < 62) {
      static const char* const items[] = {"a", "c", "A", "1", "!", "_", "a-c", "0-9", " -/", "[:digit:]", "[:^alpha:]"};
      std::string body = rng_.chance(25) ? "^" : "";
      for (int i = rng_.below(3); i >= 0; --i) body += items[rng_.below(11)];
      if (body.find("[:^") != std::string::npos) g.ecmaOk = false;
      add(g, "[" + body + "]", "[" + body + "]", "[" + body + "]");
      return false;
    }
    if (k < 70 && groups_ > 0) {  // a back-reference to a group opened so far
      const std::string r = "\\g{" + std::to_string(1 + rng_.below(groups_)) + "}";
      add(g, r, r, "");
      g.ecmaOk = false;
      return true;
    }
    if (k < 80 && !repeated) {  // PCRE2 refuses to repeat an assertion
      static const char* const anchors[] = {"^", "$", "\\b", "\\B", "\\A", "\\z", "\\Z", "\\G"};
      const std::string a = anchors[rng_.below(8)];
      add(g, a, a, a);
      g.ecmaOk = false;
      return true;
    }
    add(g, "(", "(", "(");
    const bool empty = groupBody(depth, g);
    add(g, ")", ")", ")");
    return empty;
  }

  Rng& rng_;
  int groups_ = 0;
};

// A text: random bytes, or a pattern-shaped string built by matching-free sampling from the
// pattern's own literals (good enough to make matches common), or such a string mutated.
std::string makeText(const Generated& g, Rng& rng, int kind) {
  std::string s;
  if (kind == 0) {
    for (int i = rng.below(8); i > 0; --i) s += rng.textByte();
    return s;
  }
  for (char c : g.ours) {
    if (std::isalnum(static_cast<unsigned char>(c)) || c == '!' || c == '_' || c == '-') {
      if (rng.chance(70)) s += c;
      if (rng.chance(20)) s += c;
    }
  }
  if (kind == 2 && !s.empty()) s[static_cast<std::size_t>(rng.below(static_cast<int>(s.size())))] = rng.textByte();
  if (s.size() > 16) s.resize(16);
  return s;
}

std::string printable(const std::string& s) {
  std::string out;
  for (unsigned char c : s) {
    char buf[8];
    std::snprintf(buf, sizeof buf, c >= 0x20 && c < 0x7F ? "%c" : "\\x%02X", c);
    out += buf;
  }
  return out;
}

constexpr int kPatterns = 4000;
constexpr int kTextsPerPattern = 24;

TEST(PatternDifferential, GeneratedPatternsAgreeWithStdRegex) {
  Rng rng(20240611u);
  Generator gen(rng);
  int compared = 0, matched = 0, noProgress = 0, failures = 0;
  for (int p = 0; p < kPatterns && failures < 10; ++p) {
    const Generated g = gen.make();
    if (!g.ecmaOk) continue;
    const PatternEngine engine(g.ours.c_str());
    ASSERT_TRUE(engine.hasTree()) << g.ours;
    const std::regex ecma(g.ecma, std::regex::ECMAScript);
    for (int t = 0; t < kTextsPerPattern; ++t) {
      const std::string text = makeText(g, rng, t % 3);
      if (text.size() > 8) continue;  // libstdc++'s matcher is exponential on longer ones
      MatchContext context;
      const bool ours = engine.matches(reinterpret_cast<const std::uint8_t*>(text.data()), text.size(), &context);
      const bool peer = std::regex_match(text, ecma);
      ++compared;
      matched += ours ? 1 : 0;
      if (!ours && peer && context.stoppedWithoutProgress()) {
        ++noProgress;
      } else if (ours != peer) {
        ADD_FAILURE() << g.ours << " / " << g.ecma << " on '" << printable(text) << "': ours " << ours;
        ++failures;
      }
    }
  }
  std::printf("std::regex: %d comparisons, %d matches, no-progress %d\n", compared, matched, noProgress);
  EXPECT_GT(compared, 15000);
  EXPECT_LT(noProgress, compared / 50);
  EXPECT_GT(matched, compared / 8);
}

#if defined(TESSEL_HAVE_PCRE2)
MatchResult pcreMatch(pcre2_code* code, const std::string& text, bool* limited) {
  pcre2_match_data* data = pcre2_match_data_create_from_pattern(code, nullptr);
  const int rc = pcre2_match(code, reinterpret_cast<PCRE2_SPTR>(text.data()), text.size(), 0, 0, data, nullptr);
  MatchResult r;
  *limited = rc < 0 && rc != PCRE2_ERROR_NOMATCH;
  if (rc > 0) {
    std::uint32_t groups = 0;
    pcre2_pattern_info(code, PCRE2_INFO_CAPTURECOUNT, &groups);
    const PCRE2_SIZE* ov = pcre2_get_ovector_pointer(data);
    r = {1, static_cast<std::int32_t>(groups)};
    for (std::uint32_t i = 0; i < 2 * (groups + 1); ++i)
      r.push_back(i < 2 * static_cast<std::uint32_t>(rc) && ov[i] != PCRE2_UNSET ? static_cast<std::int32_t>(ov[i]) : -1);
  }
  pcre2_match_data_free(data);
  return r;
}

pcre2_code* pcreCompile(const std::string& pattern) {
  int error = 0;
  PCRE2_SIZE offset = 0;
  return pcre2_compile(reinterpret_cast<PCRE2_SPTR>(pattern.data()), pattern.size(),
                       PCRE2_ANCHORED | PCRE2_ENDANCHORED | PCRE2_DOTALL, &error, &offset, nullptr);
}
#endif

TEST(PatternDifferential, GeneratedPatternsAgreeWithPcre2) {
#if !defined(TESSEL_HAVE_PCRE2)
  GTEST_SKIP() << "built without PCRE2";
#else
  Rng rng(20240611u);
  Generator gen(rng);
  int compared = 0, matched = 0, withBackrefs = 0, noProgress = 0, bounded = 0, failures = 0;
  for (int p = 0; p < kPatterns && failures < 10; ++p) {
    const Generated g = gen.make();
    const PatternEngine engine(g.ours.c_str());
    pcre2_code* code = pcreCompile(g.pcre);
    ASSERT_TRUE(engine.hasTree() && code != nullptr) << g.ours;
    for (int t = 0; t < kTextsPerPattern; ++t) {
      std::string text = makeText(g, rng, t % 3);
      if (engine.hasBackrefs() && text.size() > 10) text.resize(10);  // keeps the bounded searches short
      MatchContext context;
      const MatchResult got = engine.matchExact(text.data(), text.size(), &context);
      bool limited = false;
      const MatchResult want = pcreMatch(code, text, &limited);
      if (limited || context.gaveUp()) {
        ++bounded;
        continue;
      }
      ++compared;
      matched += want.empty() ? 0 : 1;
      withBackrefs += engine.hasBackrefs() ? 1 : 0;
      if (got.empty() && !want.empty() && context.stoppedWithoutProgress()) {
        ++noProgress;
      } else if (got != want) {
        std::string a, b;
        for (std::int32_t v : got) a += std::to_string(v) + " ";
        for (std::int32_t v : want) b += std::to_string(v) + " ";
        ADD_FAILURE() << g.ours << " on '" << printable(text) << "': ours [" << a << "] pcre2 [" << b << "]";
        ++failures;
      }
    }
    pcre2_code_free(code);
  }
  std::printf("PCRE2: %d comparisons (%d matches, %d with back-references), no-progress %d, "
              "not compared (a search limit reached) %d\n", compared, matched, withBackrefs, noProgress, bounded);
  EXPECT_GT(compared, 80000);
  EXPECT_GT(matched, compared / 12);
  EXPECT_LT(noProgress + bounded, compared / 100);
#endif
}

}  // namespace
