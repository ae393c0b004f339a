// Differential test of the pattern engine against PCRE2 (interpreter) and std::regex.
//
// Patterns are generated from the syntax the engines share (literals, '.', named classes,
// \d \w \s and their complements, bracket sets with ranges, negation and named classes,
// alternation, capturing groups, * + ? {m} {m,} {m,n} with reluctant and possessive forms)
// with a fixed seed, rendered once per engine, and matched against generated texts (random
// bytes and strings sampled from the pattern itself, so that both outcomes are common).
// PCRE2 runs with PCRE2_ANCHORED | PCRE2_ENDANCHORED | PCRE2_DOTALL (whole-text match, '.'
// takes every byte); std::regex (ECMAScript, regex_match) checks match/no-match only, on the
// patterns it can express.
//
// Required agreement: match/no-match with both peers, always; group spans with PCRE2, always,
// except where rule (1) below explains the difference.
// Translation between the syntaxes (rules of ours, not disagreements): a top-level
// "[:name:]" is "[[:name:]]" to the peers; '?' or '+' after a fixed count is consumed and
// ignored in our syntax, so the peers get the plain count; '.' is "[\s\S]" for std::regex.
// Rule (1), the one known source of different group spans: in our loops an iteration that
// consumes nothing ends the loop (a mandatory one stands for all remaining mandatory ones),
// whereas PCRE2 unrolls bounded counts into copies that go on iterating after an empty
// iteration. Both reach the same end positions, so the outcome never differs, but a group
// repeated by such a loop can report a different iteration. It is accepted only for patterns
// that repeat a group able to match the empty text, and group 0 must still agree; the count
// of such cases is printed.
#include <gtest/gtest.h>

#include <cstdint>
#include <cstdio>
#include <cctype>
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

// Deterministic across standard libraries: only the raw engine output is used.
// Texts are made of letters, digits, punctuation (including the set syntax's own '-' and '_'),
// white space and two bytes outside every class.
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

struct ClassInfo {
  const char* name;
  int (*predicate)(int);
  const char* escape;  // \d-style spelling, or null
};

int isWord(int c) { return std::isalnum(c) || c == '_'; }

const ClassInfo kClasses[] = {
    {"alnum", isalnum, nullptr}, {"alpha", isalpha, nullptr}, {"digit", isdigit, "d"},
    {"lower", islower, nullptr}, {"upper", isupper, nullptr}, {"punct", ispunct, nullptr},
    {"space", isspace, "s"},     {"print", isprint, nullptr}, {"xdigit", isxdigit, nullptr},
    {"word", isWord, "w"},
};

bool inClass(const ClassInfo& c, std::uint8_t b) { return b < 0x80 && c.predicate(b) != 0; }

// Pattern tree of the generator, rendered for each engine and sampled for texts.
struct GenNode {
  enum Kind { kLiteral, kAny, kClass, kSet, kGroup, kAlt, kSeq, kRepeat } kind = kLiteral;
  std::uint8_t byte = 0;
  const ClassInfo* cls = nullptr;
  bool negated = false;
  bool escapeForm = false;           // \d rather than [:digit:]
  std::vector<bool> members;         // kSet: 256 flags after negation
  std::string setBody;               // kSet: text between the brackets
  bool setHasNegatedClass = false;   // std::regex cannot express [:^name:]
  std::vector<GenNode> children;
  int min = 0, max = 0;              // kRepeat; max -1 = unbounded
  int mode = 0;                      // 0 greedy, 1 reluctant, 2 possessive
  int quantifierForm = 0;            // 0 {..}, 1 '*', 2 '+', 3 '?'
};

class Generator {
 public:
  explicit Generator(Rng& rng) : rng_(rng) {}

  GenNode pattern() { return alternation(0); }

 private:
  GenNode alternation(int depth) {
    if (depth < 3 && rng_.chance(25)) {
      GenNode alt;
      alt.kind = GenNode::kAlt;
      const int n = 2 + rng_.below(2);
      for (int i = 0; i < n; ++i) alt.children.push_back(sequence(depth));
      return alt;
    }
    return sequence(depth);
  }

  GenNode sequence(int depth) {
    GenNode seq;
    seq.kind = GenNode::kSeq;
    const int n = rng_.below(4) + (depth == 0 ? 1 : 0);
    for (int i = 0; i < n; ++i) seq.children.push_back(quantified(depth));
    return seq;
  }

  // Inside a repeated group only bounded counts are generated, so that no pattern needs
  // exponential time in either engine.
  GenNode quantified(int depth) {
    if (!rng_.chance(45)) return atom(depth);
    GenNode r;
    r.kind = GenNode::kRepeat;
    r.quantifierForm = rng_.below(4);
    if (repeatDepth_ > 0 && (r.quantifierForm == 1 || r.quantifierForm == 2)) r.quantifierForm = 0;
    switch (r.quantifierForm) {
      case 1: r.min = 0; r.max = -1; break;
      case 2: r.min = 1; r.max = -1; break;
      case 3: r.min = 0; r.max = 1; break;
      default:
        r.min = rng_.below(3);
        r.max = (repeatDepth_ == 0 && rng_.chance(30)) ? -1 : r.min + rng_.below(3);
        break;
    }
    const int m = rng_.below(10);
    r.mode = m < 6 ? 0 : (m < 8 ? 1 : 2);
    ++repeatDepth_;
    r.children.push_back(atom(depth));
    --repeatDepth_;
    return r;
  }

  GenNode atom(int depth) {
    const int k = rng_.below(depth < 3 ? 100 : 70);
    GenNode n;
    if (k < 35) {
      n.kind = GenNode::kLiteral;
      static const char lits[] = "abcA1!-_";
      n.byte = static_cast<std::uint8_t>(lits[rng_.below(8)]);
    } else if (k < 42) {
      n.kind = GenNode::kAny;
    } else if (k < 55) {
      n.kind = GenNode::kClass;
      n.cls = &kClasses[rng_.below(sizeof kClasses / sizeof kClasses[0])];
      n.escapeForm = n.cls->escape != nullptr && (std::string(n.cls->name) == "word" || rng_.chance(50));
      n.negated = rng_.chance(25);
    } else if (k < 70) {
      n = set();
    } else {
      n.kind = GenNode::kGroup;
      n.children.push_back(alternation(depth + 1));
    }
    return n;
  }

  GenNode set() {
    GenNode n;
    n.kind = GenNode::kSet;
    n.members.assign(256, false);
    const bool negated = rng_.chance(25);
    if (negated) n.setBody += '^';
    const int items = 1 + rng_.below(3);
    for (int i = 0; i < items; ++i) {
      const int k = rng_.below(10);
      if (k < 4) {
        static const char singles[] = "abcA12!_";
        const char c = singles[rng_.below(8)];
        n.setBody += c;
        n.members[static_cast<std::uint8_t>(c)] = true;
      } else if (k < 7) {
        static const char* const ranges[] = {"a-c", "A-Z", "0-9", "b-b", " -/", "a-z"};
        const char* r = ranges[rng_.below(6)];
        n.setBody += r;
        for (int b = static_cast<std::uint8_t>(r[0]); b <= static_cast<std::uint8_t>(r[2]); ++b) n.members[b] = true;
      } else {
        const ClassInfo& c = kClasses[rng_.below(9)];  // not "word": it has no bracket name
        const bool neg = rng_.chance(20);
        n.setBody += std::string("[:") + (neg ? "^" : "") + c.name + ":]";
        if (neg) n.setHasNegatedClass = true;
        for (int b = 0; b < 256; ++b)
          if (inClass(c, static_cast<std::uint8_t>(b)) != neg) n.members[b] = true;
      }
    }
    if (negated)
      for (int b = 0; b < 256; ++b) n.members[b] = !n.members[b];
    return n;
  }

  Rng& rng_;
  int repeatDepth_ = 0;
};

enum class Dialect { kOurs, kPcre, kEcma };

// Renders a tree; false when the dialect cannot express it.
bool render(const GenNode& n, Dialect d, std::string& out) {
  switch (n.kind) {
    case GenNode::kLiteral:  // the generator's literals are special in no dialect
      out += static_cast<char>(n.byte);
      return true;
    case GenNode::kAny:
      out += d == Dialect::kEcma ? "[\\s\\S]" : ".";
      return true;
    case GenNode::kClass:
      if (n.escapeForm) {
        out += '\\';
        out += n.negated ? static_cast<char>(std::toupper(n.cls->escape[0])) : n.cls->escape[0];
        return true;
      }
      if (d == Dialect::kOurs) {
        out += std::string("[:") + (n.negated ? "^" : "") + n.cls->name + ":]";
      } else {
        out += std::string(n.negated ? "[^" : "[") + "[:" + n.cls->name + ":]]";
      }
      return true;
    case GenNode::kSet:
      if (d == Dialect::kEcma && n.setHasNegatedClass) return false;
      out += '[' + n.setBody + ']';
      return true;
    case GenNode::kGroup:
      out += '(';
      if (!render(n.children[0], d, out)) return false;
      out += ')';
      return true;
    case GenNode::kAlt:
      for (std::size_t i = 0; i < n.children.size(); ++i) {
        if (i > 0) out += '|';
        if (!render(n.children[i], d, out)) return false;
      }
      return true;
    case GenNode::kSeq:
      for (const GenNode& c : n.children)
        if (!render(c, d, out)) return false;
      return true;
    case GenNode::kRepeat: {
      if (d == Dialect::kEcma && n.mode == 2) return false;
      if (!render(n.children[0], d, out)) return false;  // always an atom
      switch (n.quantifierForm) {
        case 1: out += '*'; break;
        case 2: out += '+'; break;
        case 3: out += '?'; break;
        default:
          out += '{' + std::to_string(n.min);
          if (n.max != n.min) out += n.max < 0 ? std::string(",") : ',' + std::to_string(n.max);
          out += '}';
          break;
      }
      const bool fixed = n.max == n.min;
      if (fixed && d != Dialect::kOurs) return true;  // our fixed counts ignore the modifier
      if (n.mode == 1) out += '?';
      if (n.mode == 2) out += '+';
      return true;
    }
  }
  return false;
}

// A text the pattern may well match: a random walk through the tree.
void sample(const GenNode& n, Rng& rng, std::string& out) {
  auto pickByte = [&](auto&& member) {
    for (int tries = 0; tries < 8; ++tries) {
      const auto b = static_cast<std::uint8_t>(rng.textByte());
      if (member(b)) {
        out += static_cast<char>(b);
        return;
      }
    }
    out += 'a';
  };
  switch (n.kind) {
    case GenNode::kLiteral: out += static_cast<char>(n.byte); return;
    case GenNode::kAny: pickByte([](std::uint8_t) { return true; }); return;
    case GenNode::kClass:
      pickByte([&](std::uint8_t b) { return inClass(*n.cls, b) != n.negated; });
      return;
    case GenNode::kSet: pickByte([&](std::uint8_t b) { return static_cast<bool>(n.members[b]); }); return;
    case GenNode::kGroup: sample(n.children[0], rng, out); return;
    case GenNode::kAlt: sample(n.children[static_cast<std::size_t>(rng.below(static_cast<int>(n.children.size())))], rng, out); return;
    case GenNode::kSeq:
      for (const GenNode& c : n.children) sample(c, rng, out);
      return;
    case GenNode::kRepeat: {
      const int hi = n.max < 0 ? n.min + 3 : n.max;
      const int count = n.min + rng.below(hi - n.min + 1);
      for (int i = 0; i < count; ++i) sample(n.children[0], rng, out);
      return;
    }
  }
}

// Whether a tree can match the empty text, and whether it repeats something that can.
bool canBeEmpty(const GenNode& n) {
  switch (n.kind) {
    case GenNode::kLiteral: case GenNode::kAny: case GenNode::kClass: case GenNode::kSet: return false;
    case GenNode::kGroup: return canBeEmpty(n.children[0]);
    case GenNode::kAlt:
      for (const GenNode& c : n.children)
        if (canBeEmpty(c)) return true;
      return false;
    case GenNode::kSeq:
      for (const GenNode& c : n.children)
        if (!canBeEmpty(c)) return false;
      return true;
    case GenNode::kRepeat: return n.min == 0 || canBeEmpty(n.children[0]);
  }
  return false;
}

bool repeatsEmptyCapable(const GenNode& n) {
  if (n.kind == GenNode::kRepeat && n.children[0].kind == GenNode::kGroup && canBeEmpty(n.children[0]))
    return true;
  for (const GenNode& c : n.children)
    if (repeatsEmptyCapable(c)) return true;
  return false;
}

std::string randomText(Rng& rng) {
  std::string s;
  const int n = rng.below(8);
  for (int i = 0; i < n; ++i) s += rng.textByte();
  return s;
}

std::string mutate(std::string s, Rng& rng) {
  if (s.empty() || rng.chance(30)) {
    s.insert(s.begin() + rng.below(static_cast<int>(s.size()) + 1), rng.textByte());
  } else if (rng.chance(50)) {
    s.erase(s.begin() + rng.below(static_cast<int>(s.size())));
  } else {
    s[static_cast<std::size_t>(rng.below(static_cast<int>(s.size())))] = rng.textByte();
  }
  return s;
}

std::string printable(const std::string& s) {
  std::string out;
  for (unsigned char c : s) {
    if (c >= 0x20 && c < 0x7F) {
      out += static_cast<char>(c);
    } else {
      char buf[8];
      std::snprintf(buf, sizeof buf, "\\x%02X", c);
      out += buf;
    }
  }
  return out;
}

struct Stats {
  int patterns = 0;
  int comparisons = 0;
  int matches = 0;
  int ecmaComparisons = 0;
  int spanComparisons = 0;
  int peerLimited = 0;
  int explainedSpans = 0;
  int noProgressStops = 0;
};

#if defined(TESSEL_HAVE_PCRE2)

class PcrePattern {
 public:
  explicit PcrePattern(const std::string& pattern) {
    int error = 0;
    PCRE2_SIZE offset = 0;
    code_ = pcre2_compile(reinterpret_cast<PCRE2_SPTR>(pattern.data()), pattern.size(),
                          PCRE2_ANCHORED | PCRE2_ENDANCHORED | PCRE2_DOTALL, &error, &offset, nullptr);
    if (code_ != nullptr) data_ = pcre2_match_data_create_from_pattern(code_, nullptr);
  }
  ~PcrePattern() {
    if (data_ != nullptr) pcre2_match_data_free(data_);
    if (code_ != nullptr) pcre2_code_free(code_);
  }
  bool ok() const { return code_ != nullptr; }
  int captureCount() const {
    std::uint32_t n = 0;
    pcre2_pattern_info(code_, PCRE2_INFO_CAPTURECOUNT, &n);
    return static_cast<int>(n);
  }
  // Our result layout, or empty for no match; `limited` when PCRE2 gave up.
  MatchResult match(const std::string& text, bool* limited) const {
    *limited = false;
    const int rc = pcre2_match(code_, reinterpret_cast<PCRE2_SPTR>(text.data()), text.size(), 0, 0, data_, nullptr);
    if (rc == PCRE2_ERROR_NOMATCH) return {};
    if (rc < 0) {
      *limited = true;
      return {};
    }
    const int groups = captureCount();
    const PCRE2_SIZE* ov = pcre2_get_ovector_pointer(data_);
    MatchResult r{1, groups};
    for (int g = 0; g <= groups; ++g) {
      const bool set = g < rc && ov[2 * g] != PCRE2_UNSET;
      r.push_back(set ? static_cast<std::int32_t>(ov[2 * g]) : -1);
      r.push_back(set ? static_cast<std::int32_t>(ov[2 * g + 1]) : -1);
    }
    return r;
  }

 private:
  pcre2_code* code_ = nullptr;
  pcre2_match_data* data_ = nullptr;
};

std::string describe(const MatchResult& r) {
  if (r.empty()) return "no match";
  std::string s;
  for (std::size_t i = 2; i < r.size(); i += 2)
    s += "(" + std::to_string(r[i]) + "," + std::to_string(r[i + 1]) + ")";
  return s;
}

TEST(PatternDifferential, GeneratedPatternsAgreeWithPcre2AndStdRegex) {
  Rng rng(20240611u);
  Generator gen(rng);
  Stats stats;
  int failures = 0;
  constexpr int kPatterns = 4000;
  constexpr int kTextsPerPattern = 24;
  for (int p = 0; p < kPatterns && failures < 20; ++p) {
    const GenNode tree = gen.pattern();
    std::string ours, pcre, ecma;
    if (!render(tree, Dialect::kOurs, ours) || !render(tree, Dialect::kPcre, pcre)) continue;
    const bool withEcma = render(tree, Dialect::kEcma, ecma);
    const bool emptyIterations = repeatsEmptyCapable(tree);
    PatternEngine engine(ours.c_str());
    PcrePattern peer(pcre);
    ASSERT_TRUE(peer.ok()) << pcre;
    ASSERT_TRUE(engine.hasTree()) << ours;
    ASSERT_EQ(engine.groupCount(), peer.captureCount()) << ours;
    std::regex ecmaRegex;
    if (withEcma) ecmaRegex.assign(ecma, std::regex::ECMAScript);
    ++stats.patterns;
    std::string sampled;
    for (int t = 0; t < kTextsPerPattern; ++t) {
      std::string text;
      if (t % 3 == 0) {
        text = randomText(rng);
      } else {
        text.clear();
        sample(tree, rng, text);
        if (t % 3 == 2) text = mutate(text, rng);
      }
      if (text.size() > 24) text.resize(24);
      MatchContext context;
      const MatchResult got = engine.matchExact(text.data(), text.size(), &context);
      bool limited = false;
      const MatchResult want = peer.match(text, &limited);
      if (limited) {  // the peer gave up (its match limit): nothing to compare
        ++stats.peerLimited;
        continue;
      }
      ++stats.comparisons;
      if (!want.empty()) ++stats.matches;
      // Rule of ours: the whole-text match stops when two successive ways of matching both end
      // at the start ("(||)|." does not match "c"); a peer searches on. Only that case may
      // turn a peer's match into our no-match.
      if (got.empty() && !want.empty() && context.stoppedWithoutProgress) {
        ++stats.noProgressStops;
        continue;
      }
      if (got.empty() != want.empty()) {
        ADD_FAILURE() << "match differs: ours " << ours << " pcre " << pcre << " text '" << printable(text)
                      << "' ours " << describe(got) << " pcre " << describe(want);
        ++failures;
        continue;
      }
      if (!got.empty()) {
        ++stats.spanComparisons;
        if (got != want && emptyIterations && got[2] == want[2] && got[3] == want[3]) {
          ++stats.explainedSpans;  // rule (1) in the file comment
        } else if (got != want) {
          ADD_FAILURE() << "spans differ: ours " << ours << " text '" << printable(text) << "' ours "
                        << describe(got) << " pcre " << describe(want) << "\n  dump " << engine.dump();
          ++failures;
        }
      }
      if (withEcma && text.size() <= 10) {  // libstdc++'s matcher is exponential on longer ones
        ++stats.ecmaComparisons;
        const bool ecmaMatch = std::regex_match(text, ecmaRegex);
        if (ecmaMatch != !got.empty()) {
          ADD_FAILURE() << "std::regex differs: " << ecma << " text '" << printable(text) << "' ecma " << ecmaMatch;
          ++failures;
        }
      }
    }
  }
  std::printf("patterns %d, comparisons %d (%d matches, %d span checks), std::regex checks %d, "
              "PCRE2 limit hits %d, span differences explained by rule (1): %d, "
              "no-progress stops: %d\n",
              stats.patterns, stats.comparisons, stats.matches, stats.spanComparisons,
              stats.ecmaComparisons, stats.peerLimited, stats.explainedSpans, stats.noProgressStops);
  EXPECT_LT(stats.noProgressStops, stats.comparisons / 50) << "the no-progress rule is for odd patterns only";
  EXPECT_GT(stats.patterns, 2000);
  EXPECT_GT(stats.matches, stats.comparisons / 5);
}

// The library's own patterns (strength predicates, default rating, typical accepts
// patterns) against PCRE2 on every text of up to four bytes over letters of both cases, a
// digit, punctuation, space, tab and a byte outside every class.
TEST(PatternDifferential, SystemPatternsOnEveryShortText) {
  const struct {
    const char* ours;
    const char* pcre;
  } patterns[] = {
      {"[:digit:]+", "[[:digit:]]+"},
      {"[:print:]*[:digit:]+[:print:]*", "[[:print:]]*[[:digit:]]+[[:print:]]*"},
      {"[:alpha:]+", "[[:alpha:]]+"},
      {"[:print:]*[:alpha:]+[:print:]*", "[[:print:]]*[[:alpha:]]+[[:print:]]*"},
      {"[a-z]{1,}", "[a-z]{1,}"},
      {"[A-Z]{1,}", "[A-Z]{1,}"},
      {"[:punct:]+", "[[:punct:]]+"},
      {"[:print:]*[:punct:]+[:print:]*", "[[:print:]]*[[:punct:]]+[[:print:]]*"},
      {"[:alnum:]+", "[[:alnum:]]+"},
      {"[[:digit:][:punct:]]+", "[[:digit:][:punct:]]+"},
      {"[[:alpha:][:punct:]]+", "[[:alpha:][:punct:]]+"},
      {"([0-9]{0,})|(.{0,5})", "([0-9]{0,})|(.{0,5})"},
      {"([a-z]{6,})|([A-Z]{6,})", "([a-z]{6,})|([A-Z]{6,})"},
      {"[[:alpha:][:digit:][:punct:]]{0,16}", "[[:alpha:][:digit:][:punct:]]{0,16}"},
      {"[:^space:]{2,3}", "[^[:space:]]{2,3}"},
      {"[[:upper:]][[:lower:]]+[:digit:]?", "[[:upper:]][[:lower:]]+[[:digit:]]?"},
      {"([a-z]|[:digit:])+?!?", "([a-z]|[[:digit:]])+?!?"},
  };
  const std::string alphabet = std::string("aZ5! \t") + '\x80';
  std::vector<std::string> texts{""};
  for (std::size_t from = 0, len = 1; len <= 4; ++len) {
    const std::size_t to = texts.size();
    for (std::size_t i = from; i < to; ++i)
      for (char c : alphabet) texts.push_back(texts[i] + c);
    from = to;
  }
  int compared = 0;
  for (const auto& p : patterns) {
    PatternEngine engine(p.ours);
    PcrePattern peer(p.pcre);
    ASSERT_TRUE(engine.hasTree() && peer.ok()) << p.ours;
    for (const std::string& text : texts) {
      bool limited = false;
      const MatchResult want = peer.match(text, &limited);
      ASSERT_FALSE(limited);
      ASSERT_EQ(engine.matchExact(text.data(), text.size()), want) << p.ours << " on '" << printable(text) << "'";
      ++compared;
    }
  }
  EXPECT_EQ(compared, static_cast<int>(texts.size() * (sizeof patterns / sizeof patterns[0])));
}

#endif  // TESSEL_HAVE_PCRE2

}  // namespace
