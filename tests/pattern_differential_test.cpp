// The pattern engine against PCRE2 (skipped when not built in), on patterns generated with a
// fixed seed from the shared syntax: literals, '.', classes, sets, alternation, groups, \g{N},
// anchors, and * + ? {m} {m,} {m,n} greedy, reluctant, possessive. PCRE2 (anchored at both ends,
// DOTALL) must agree on the outcome and every group span. A second generator makes loops that can
// match empty in several ways and repeated groups followed by their back-reference, over texts
// long enough for the memo to start: there the memoising search must agree with plain
// backtracking of the same program, span for span (always), and with PCRE2.
#include <gtest/gtest.h>

#include <algorithm>
#include <cctype>
#include <cstdint>
#include <cstdio>
#include <random>
#include <string>
#include <vector>

#include "pattern/pattern_engine.h"

#if defined(TESSEL_HAVE_PCRE2)
#define PCRE2_CODE_UNIT_WIDTH 8
#include <pcre2.h>
#endif

using namespace tessel;

namespace {

// One generated pattern, rendered for each engine while it is built.
struct Generated {
  std::string ours, pcre;
  void add(const std::string& o, const std::string& p) { ours += o, pcre += p; }
  void add(const std::string& all) { add(all, all); }
};

class Generator {
 public:
  Generated make() {
    Generated g;
    groups_ = 0;
    alternation(0, g);
    return g;
  }

  // Random bytes, or the pattern's own literals sampled (matches become common), or those mutated.
  std::string text(const Generated& g, int kind) {
    std::string s;
    if (kind == 0) {
      for (int i = below(8); i > 0; --i) s += textByte();
      return s;
    }
    for (char c : g.ours) {
      if (std::isalnum(static_cast<unsigned char>(c)) || c == '!' || c == '_' || c == '-') {
        if (chance(70)) s += c;
        if (chance(20)) s += c;
      }
    }
    if (kind == 2 && !s.empty()) s[static_cast<std::size_t>(below(static_cast<int>(s.size())))] = textByte();
    if (s.size() > 16) s.resize(16);
    return s;
  }

 private:
  int below(int n) { return static_cast<int>(engine_() % static_cast<std::uint32_t>(n)); }
  bool chance(int percent) { return below(100) < percent; }
  char textByte() { return "abcAB12!-_ \n\x80\xFF"[below(14)]; }

  void alternation(int depth, Generated& g) {
    for (int i = depth < 3 && chance(25) ? 1 + below(2) : 0; i >= 0; --i) {
      for (int k = below(4) + (depth == 0 ? 1 : 0); k > 0; --k) quantified(depth, g);
      if (i > 0) g.add("|");
    }
  }

  void group(int depth, Generated& g) {
    ++groups_;
    g.add("(");
    alternation(depth + 1, g);
    g.add(")");
  }

  void quantified(int depth, Generated& g) {
    if (!chance(45)) return atom(depth, g, false);
    static const char* const forms[] = {"*", "+", "?", "{0}", "{1}", "{2}", "{0,}", "{1,}", "{2,}",
                                        "{0,1}", "{0,2}", "{1,2}", "{1,3}", "{2,4}"};
    const int form = below(14);
    if (depth < 2 && chance(20)) group(depth, g);
    else atom(depth, g, true);
    const int mode = below(10);
    const std::string suffix = mode < 6 ? "" : mode < 8 ? "?" : "+";
    const bool fixed = form >= 3 && form <= 5;  // our '?' or '+' after a fixed count does nothing
    g.add(forms[form] + suffix, forms[form] + (fixed ? "" : suffix));
  }

  void atom(int depth, Generated& g, bool repeated) {
    static const char* const classes[] = {"alnum", "alpha", "digit", "lower", "upper", "punct", "space", "print"};
    static const char* const items[] = {"a", "c", "A", "1", "!", "_", "a-c", "0-9", " -/", "[:digit:]", "[:^alpha:]"};
    static const char* const anchors[] = {"^", "$", "\\b", "\\B", "\\A", "\\z", "\\Z", "\\G"};
    const int k = below(depth < 3 ? 100 : 80);
    if (k < 35) {
      g.add(std::string(1, "abcA1!-_"[below(8)]));
    } else if (k < 40) {
      g.add(".");
    } else if (k < 45) {
      g.add(std::string("\\") + "dDsSwW"[below(6)]);
    } else if (k < 50) {
      const std::string name = classes[below(8)];
      const bool neg = chance(25);
      g.add((neg ? "[:^" : "[:") + name + ":]", (neg ? "[^[:" : "[[:") + name + ":]]");
    } else if (k < 62) {
      std::string body = chance(25) ? "[^" : "[";
      for (int i = below(3); i >= 0; --i) body += items[below(11)];
      g.add(body + "]");
    } else if (k < 70 && groups_ > 0) {  // a back-reference to a group opened so far
      g.add("\\g{" + std::to_string(1 + below(groups_)) + "}");
    } else if (k < 80 && !repeated) {  // PCRE2 refuses to repeat an assertion
      g.add(anchors[below(8)]);
    } else {
      group(depth, g);
    }
  }

  std::mt19937 engine_{20240611u};
  int groups_ = 0;
};

constexpr int kPatterns = 4000;
constexpr int kTextsPerPattern = 24;

// Calls check(pattern, engine, text) for every generated case; it returns false on a failure,
// and ten failures end the run.
template <typename Check>
void forEachCase(Check check) {
  Generator gen;
  int failures = 0;
  for (int p = 0; p < kPatterns && failures < 10; ++p) {
    const Generated g = gen.make();
    const PatternEngine engine(g.ours.c_str());
    if (engine.status() == PatternEngine::Status::kTooLarge) continue;  // over the weight bound
    ASSERT_EQ(engine.status(), PatternEngine::Status::kCompiled) << g.ours;
    for (int t = 0; t < kTextsPerPattern; ++t) failures += check(g, engine, gen.text(g, t % 3)) ? 0 : 1;
  }
}

#if defined(TESSEL_HAVE_PCRE2)
// PCRE2's result (anchored at both ends, DOTALL, plus `options`) in our layout; `limited` when it
// gave up.
MatchResult pcre2Match(const std::string& pattern, const std::string& text, bool* limited, std::uint32_t options = 0) {
  int error = 0;
  PCRE2_SIZE offset = 0;
  pcre2_code* code = pcre2_compile(reinterpret_cast<PCRE2_SPTR>(pattern.data()), pattern.size(),
                                   PCRE2_ANCHORED | PCRE2_ENDANCHORED | PCRE2_DOTALL | options, &error, &offset, nullptr);
  pcre2_match_data* data = pcre2_match_data_create_from_pattern(code, nullptr);
  const int rc = pcre2_match(code, reinterpret_cast<PCRE2_SPTR>(text.data()), text.size(), 0, 0, data, nullptr);
  const std::uint32_t groups = pcre2_get_ovector_count(data) - 1;
  const PCRE2_SIZE* ov = pcre2_get_ovector_pointer(data);
  MatchResult r{1, static_cast<std::int32_t>(groups)};
  for (std::uint32_t i = 0; rc > 0 && i < 2 * (groups + 1); ++i)
    r.push_back(i < 2 * static_cast<std::uint32_t>(rc) && ov[i] != PCRE2_UNSET ? static_cast<std::int32_t>(ov[i]) : -1);
  pcre2_match_data_free(data);
  pcre2_code_free(code);
  *limited = rc < 0 && rc != PCRE2_ERROR_NOMATCH;
  return rc > 0 ? r : MatchResult{};
}
#endif

TEST(PatternDifferential, GeneratedPatternsAgreeWithPcre2) {
#if !defined(TESSEL_HAVE_PCRE2)
  GTEST_SKIP() << "built without PCRE2";
#else
  int compared = 0, matched = 0, withBackrefs = 0, bounded = 0;
  forEachCase([&](const Generated& g, const PatternEngine& engine, std::string text) {
    if (engine.hasBackrefs() && text.size() > 10) text.resize(10);  // keeps the bounded searches short
    MatchContext context;
    const MatchResult got = engine.matchExact(text.data(), text.size(), &context);
    bool limited = false;
    const MatchResult want = pcre2Match(g.pcre, text, &limited);
    if (limited || context.gaveUp()) return ++bounded > 0;
    ++compared, matched += want.empty() ? 0 : 1, withBackrefs += engine.hasBackrefs() ? 1 : 0;
    EXPECT_EQ(got, want) << g.ours << " on " << testing::PrintToString(text) << " (ours, then PCRE2)";
    return got == want;
  });
  std::printf("PCRE2: %d comparisons (%d matches, %d with back-references), not compared (a search "
              "limit reached) %d\n", compared, matched, withBackrefs, bounded);
  EXPECT_TRUE(compared > 80000 && matched > compared / 20 && bounded < compared / 100);
#endif
}

// Loops over "q" and "w" that can match empty in several ways ("(q?|q){1,4}", "(|w)*?"), and
// repeated groups followed by a back-reference to them.
class LoopGenerator {
 public:
  std::string pattern() {
    std::string p;
    closed_.clear();
    alternation(p, 0);
    return p;
  }
  // Up to 20 bytes, mostly 'q' and 'w'; long enough for the memo to start on its own.
  std::string text() {
    std::string t;
    for (int i = below(21); i > 0; --i) t += "qqwwqwx"[below(chance(90) ? 6 : 7)];
    return t;
  }

 private:
  int below(int n) { return static_cast<int>(engine_() % static_cast<std::uint32_t>(n)); }
  bool chance(int percent) { return below(100) < percent; }

  void alternation(std::string& p, int depth) {
    for (int i = chance(30) ? 1 : 0; i >= 0; --i) {
      for (int k = below(depth == 0 ? 3 : 2) + (depth == 0 || chance(70) ? 1 : 0); k > 0; --k) piece(p, depth);
      if (i > 0) p += '|';
    }
  }
  void piece(std::string& p, int depth) {
    static const char* const quantifiers[] = {"?", "*", "+", "{0,2}", "{1,3}", "{1,4}", "{2}", "*?",
                                              "??", "{0,3}?", "+?", "*+", "?+", "{1,2}+"};
    const int k = below(100);
    if (k < 32 || depth >= 2) {
      p += k < 28 ? std::string(1, "qw"[below(2)]) : std::string("[qw]");
    } else if (k < 44 && !closed_.empty()) {
      p += "\\g{" + std::to_string(closed_[static_cast<std::size_t>(below(static_cast<int>(closed_.size())))]) + "}";
    } else {
      const int group = static_cast<int>(std::count(p.begin(), p.end(), '(')) + 1;
      p += '(';
      alternation(p, depth + 1);
      p += ')';
      closed_.push_back(group);
    }
    if (chance(60)) p += quantifiers[below(14)];
  }

  std::mt19937 engine_{20261125u};
  std::vector<int> closed_;
};

// The memo (from the first step, and as the key press runs it) against plain backtracking of
// the same program, span for span; and against PCRE2 where it is built in.
TEST(PatternDifferential, MemoAgreesWithPlainBacktracking) {
  LoopGenerator gen;
  int compared = 0, matched = 0, withBackrefs = 0, limited = 0;
  for (int p = 0; p < 5300 && !HasFailure(); ++p) {
    const std::string pattern = gen.pattern();
    const PatternEngine engine(pattern.c_str());
    ASSERT_EQ(engine.status(), PatternEngine::Status::kCompiled) << pattern;
    for (int t = 0; t < 21; ++t) {
      const std::string text = gen.text();
      MatchContext plain, memo, key;
      plain.setMemo(MatchContext::Memo::kNever);
      memo.setMemo(MatchContext::Memo::kAlways);
      const MatchResult want = engine.matchExact(text.data(), text.size(), &plain);
      if (plain.gaveUp() && ++limited > 0) break;  // an explosive pattern: its other texts cost as much
      ++compared, matched += want.empty() ? 0 : 1, withBackrefs += engine.hasBackrefs() ? 1 : 0;
      EXPECT_EQ(engine.matchExact(text.data(), text.size(), &memo), want) << pattern << " on " << text;
      EXPECT_EQ(engine.matches(reinterpret_cast<const std::uint8_t*>(text.data()), text.size(), &key), !want.empty())
          << pattern << " on " << text;
#if defined(TESSEL_HAVE_PCRE2)
      bool peerLimited = false;
      // Optimised, PCRE2 refuses "qq" under "q{1,3}((w{2})?+q)+?".
      const MatchResult peer = pcre2Match(pattern, text, &peerLimited, PCRE2_NO_AUTO_POSSESS | PCRE2_NO_START_OPTIMIZE);
      EXPECT_TRUE(peerLimited || peer == want) << pattern << " on " << text << ": PCRE2 " << testing::PrintToString(peer);
#endif
    }
  }
  std::printf("memo against plain: %d comparisons (%d matches, %d with back-references), %d patterns stopped at "
              "the plain search's limit\n", compared, matched, withBackrefs, limited);
  EXPECT_TRUE(compared >= 100000 && matched > compared / 10 && withBackrefs > compared / 5);
}

}  // namespace
