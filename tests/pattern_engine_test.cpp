// Pattern engine: match tables, golden node-tree dumps, malformed patterns that must never
// match, the class table, the result layout, flags, hostile patterns and small native stacks.
#include <gtest/gtest.h>

#include <pthread.h>

#include <chrono>
#include <cstdint>
#include <cstring>
#include <string>
#include <vector>

#include "pattern/char_class.h"
#include "pattern/match.h"
#include "pattern/pattern_engine.h"

using namespace tessel;

namespace {

bool whole(const char* pattern, const std::string& text, std::uint32_t flags = 0) {
  PatternEngine e(pattern, flags);
  return e.matches(reinterpret_cast<const std::uint8_t*>(text.data()), text.size());
}

MatchResult spans(const char* pattern, const std::string& text, std::uint32_t flags = 0) {
  PatternEngine e(pattern, flags);
  return e.matchExact(text.data(), text.size());
}

}  // namespace

// Whole-text behaviour, including the documented edge cases of the accepts and rule patterns.
TEST(PatternMatch, Table) {
  struct Case {
    const char* pattern;
    std::string text;
    bool expected;
  } cases[] = {
      {"[0-9]{0,}", "", true},
      {"[:digit:]+", "", false},
      {"[:digit:]+", "0123", true},
      {"[:digit:]+", "12a", false},
      {"[:^digit:]+", "abc", true},
      {"[:^digit:]+", "ab1", false},
      {"([0-9]{0,})|(.{0,5})", "12345678", true},
      {"([0-9]{0,})|(.{0,5})", "ab!x", true},
      {"([0-9]{0,})|(.{0,5})", "abcdef", false},
      {"([0-9]{0,})|(.{0,5})", "", true},
      {"[a-z]{6,}", "abcde", false},
      {"[a-z]{6,}", "abcdefghij", true},
      {"[:print:]*", "ab\x80", false},
      {"[:print:]*", "a b~", true},
      {"[:print:]*", "a\tb", false},
      {"[:print:]*[:digit:]+[:print:]*", "abc1def", true},
      {"[:print:]*[:digit:]+[:print:]*", "abcdef", false},
      {"[[:digit:][:punct:]]+", "1!2@", true},
      {"[[:digit:][:punct:]]+", "1!a", false},
      {"[[:alpha:][:digit:][:punct:]]{0,16}", "Abc1!xyz", true},
      {"[[:alpha:][:digit:][:punct:]]{0,16}", "aaaaaaaaaaaaaaaaa", false},  // 17
      {"[[:alpha:][:digit:][:punct:]]{0,16}", "ab cd", false},
      {"[[:^digit:]x]+", "ax!", true},
      {"[^a-c]+", "xyz", true},
      {"[^a-c]+", "xaz", false},
      {"[a-]+", "a-a", true},
      {"[]+", "a", false},        // empty set: matches no byte
      {"[^]+", "\x01\xFF", true},  // negated empty set: every byte
      {".+", "a\nb", true},        // '.' includes newline
      {"a{3}", "aaa", true},
      {"a{3}?", "aaa", true},      // the '?' after a fixed count is consumed
      {"a{3}+", "aaa", true},
      {"a{3,1}", "aaa", true},     // n < m: maximum becomes m
      {"a{3,1}", "aa", false},
      {"a{0}", "", true},
      {"a{0}b", "b", true},
      {"a{0,0}+", "", true},
      {"ab|cd", "cd", true},
      {"ab|cd", "abcd", false},
      {"(ab)*", "ababab", true},
      {"(a|ab)(c|bcd)(d*)", "abcd", true},
      {"a*+a", "aaa", false},      // possessive gives nothing back
      {"(a|ab)*+c", "ababc", false},  // the loop's first way stops after "a"
      {"(ab|a)*+c", "ababc", true},
      {"(a|ab)*+b", "ab", true},
      {"a+?b", "aaab", true},
      {"\\d\\D\\s\\S\\w\\W", "1a b_!", true},
      {"\\Qa.b*\\E", "a.b*", true},
      {"\\Qa.b*\\E", "axbb", false},
      {"\\LAB\\E", "ab", true},
      {"\\LAB\\EC", "abC", true},
      {"\\UaB\\Ec", "ABc", true},
      {"\\x41\\x{42}\\u0043", "ABC", true},
      {"\\t\\n\\r\\f\\v\\a\\e", "\t\n\r\f\v\a\x1B", true},
      {"\\*\\+\\?\\.\\[\\(", "*+?.[(", true},
      {"]", "]", true},            // ']' outside a set is a plain byte
      {"a-b", "a-b", true},
      {"(?#note)a(?#more)b", "ab", true},
      {"(a)(b)\\2\\1", "abba", true},
      {"(a)(b)\\g{-1}\\k<1>", "abba", true},
      {"(a)\\1", "ab", false},
      {"(a)|b\\1", "b", false},    // a back-reference to a group that did not take part fails
      {"^ab$", "ab", true},
      {"\\Aab\\z", "ab", true},
      {"ab$\\n", "ab\n", true},
      {"ab\\Z\\n", "ab\n", true},
      {"ab\\z\\n", "ab\n", false},
      {"a\\b b", "a b", true},
      {"a\\Bb", "ab", true},
      {"a\\bb", "ab", false},
      {"\\Ga", "a", true},
      {"a\\G", "a", false},
      {"(a*)*b", "aaab", true},
      {"(a?){3}", "", true},
      {"(a?){1000000000}", "a", true},  // a mandatory empty iteration stands for the rest
      {"x\\0", "x0", true},             // \0 stands for '0'
      {"\\-\\]", "-]", true},
  };
  for (const Case& c : cases)
    EXPECT_EQ(whole(c.pattern, c.text), c.expected) << c.pattern << " on '" << c.text << "'";
}

TEST(PatternMatch, ResultLayout) {
  const MatchResult r = spans("([0-9]{0,})|(.{0,5})", "ab!x");
  EXPECT_EQ(r, (MatchResult{1, 2, 0, 4, -1, -1, 0, 4}));
  EXPECT_EQ(spans("([0-9]{0,})|(.{0,5})", "123"), (MatchResult{1, 2, 0, 3, 0, 3, -1, -1}));
  EXPECT_EQ(spans("[:alnum:]+", "abc"), (MatchResult{1, 0, 0, 3}));
  EXPECT_TRUE(spans("[:alnum:]+", "ab!").empty());
  EXPECT_EQ(spans("(a|ab)(c|bcd)(d*)", "abcd"), (MatchResult{1, 3, 0, 4, 0, 1, 1, 4, 4, 4}));
  // Greedy loops keep an empty last iteration; captures keep the last iteration's value.
  EXPECT_EQ(spans("(a|)*", "aa"), (MatchResult{1, 1, 0, 2, 2, 2}));
  EXPECT_EQ(spans("((a)|b)*", "ab"), (MatchResult{1, 2, 0, 2, 1, 2, 0, 1}));
  EXPECT_EQ(spans("(x*?)(x*)", "xxx"), (MatchResult{1, 2, 0, 3, 0, 0, 0, 3}));
  // A reluctant loop resumes from where its own last way ended, not from where later
  // nodes left the position.
  EXPECT_EQ(spans("(a+)*?.", "aa"), (MatchResult{1, 1, 0, 2, 0, 1}));
  EXPECT_EQ(spans("(a|aa)*?.", "aa"), (MatchResult{1, 1, 0, 2, 0, 1}));
  // A group inside a zero-count repetition exists but never takes part.
  EXPECT_EQ(spans("(a){0}b", "b"), (MatchResult{1, 1, 0, 1, -1, -1}));
}

TEST(PatternMatch, TwoEmptyWaysInARowEndTheSearch) {
  // The whole-text match gives up when two successive ways of matching both end at the start.
  EXPECT_FALSE(spans("(a*?|)(|)", "a").empty()) << "one empty way, then progress";
  EXPECT_TRUE(spans("(a*?|)(||)", "a").empty()) << "two empty ways in a row";
  EXPECT_FALSE(spans("(a*?|)(||)", "").empty()) << "nothing to consume: the first way matches";
}

TEST(PatternMatch, NoTreeMatchesNothing) {
  for (const char* p : {static_cast<const char*>(nullptr), ""}) {
    PatternEngine e(p);
    EXPECT_FALSE(e.hasTree());
    EXPECT_EQ(e.dump(), "none");
    EXPECT_TRUE(e.matchExact("", 0).empty());
    EXPECT_TRUE(e.matchExact("a", 1).empty());
  }
  EXPECT_FALSE(wholeMatch(nullptr, reinterpret_cast<const std::uint8_t*>(""), 0));
  EXPECT_FALSE(wholeMatch("", reinterpret_cast<const std::uint8_t*>(""), 0));
  EXPECT_TRUE(wholeMatch("[:alnum:]+", reinterpret_cast<const std::uint8_t*>("ab1"), 3));
  EXPECT_FALSE(wholeMatch("[:alnum:]+", reinterpret_cast<const std::uint8_t*>("ab!"), 3));
  EXPECT_TRUE(wholeMatch("a*", nullptr, 0));
}

// Malformed patterns compile to an engine without a tree: never a match, never a crash.
TEST(PatternMatch, MalformedNeverMatches) {
  const char* const patterns[] = {
      "(", ")", "(a", "a)", "((a)", "(a))", "[", "[a", "[a-", "[[:digit:]", "[:digit:",
      "[:digit", "[:foo:]", "[[:foo:]]", "[:DIGIT:]", "[:digit]", "*", "+a", "?", "{1}",
      "a|*", "(*a)", "a**", "a*{2}", "a{2}{3}", "a+*", "a??+", "a{", "a{1", "a{1,", "a{,2}",
      "a{x}", "a{1,x}", "a{2147483648}", "a{1,99999999999}", "}", "a}", "{", "[z-a]",
      "\\", "a\\", "(?#open", "\\x{}", "\\x{100}", "\\u", "\\u0100", "\\g", "\\g{}",
      "\\k<1", "\\1", "(a)\\2", "\\g{-1}", "(a)\\g{-2}", "[\\A]", "[\\1]", "[\\g1]",
      "a|", "|a" /* well formed: see below */,
  };
  for (const char* p : patterns) {
    if (std::strcmp(p, "a|") == 0 || std::strcmp(p, "|a") == 0) continue;
    PatternEngine e(p);
    EXPECT_FALSE(e.hasTree()) << p << " -> " << e.dump();
    for (const char* text : {"", "a", "aa", "1", "(", "abc"})
      EXPECT_TRUE(e.matchExact(text, std::strlen(text)).empty()) << p << " on " << text;
  }
  // An empty alternative is well formed.
  EXPECT_TRUE(whole("a|", ""));
  EXPECT_TRUE(whole("|a", "a"));
  // Nesting beyond the cap is refused rather than recursed into.
  std::string deep(PatternEngine::kMaxNesting + 1, '(');
  deep += "a";
  deep += std::string(PatternEngine::kMaxNesting + 1, ')');
  PatternEngine tooDeep(deep.c_str());
  EXPECT_EQ(tooDeep.status(), PatternEngine::Status::kTooDeep);
  EXPECT_FALSE(tooDeep.matches(reinterpret_cast<const std::uint8_t*>("a"), 1));
  std::string ok(PatternEngine::kMaxNesting, '(');
  ok += "a";
  ok += std::string(PatternEngine::kMaxNesting, ')');
  EXPECT_TRUE(whole(ok.c_str(), "a"));
}

// Golden node trees: the parse of each construct, including literal merging, quantifier
// modes, the empty node for a zero maximum and the reversed sequence of right-to-left.
TEST(PatternDump, Golden) {
  struct Case {
    const char* pattern;
    std::uint32_t flags;
    const char* dump;
  } cases[] = {
      {"[:alnum:]+", 0, "greedy{1,*}(class(alnum))"},
      {"[[:alpha:][:digit:][:punct:]]{0,16}", 0, "greedy{0,16}(set[!-~])"},
      {"[:print:]*[:digit:]+[:print:]*", 0,
       "seq(greedy{0,*}(class(print)), greedy{1,*}(class(digit)), greedy{0,*}(class(print)))"},
      {"[a-z]{1,}", 0, "greedy{1,*}(set[a-z])"},
      {"[[:digit:][:punct:]]+", 0, "greedy{1,*}(set[!-@[-`{-~])"},
      {"([0-9]{0,})|(.{0,5})", 0,
       "alt(group1(greedy{0,*}(set[0-9])) | group2(greedy{0,5}(any)))"},
      {"([a-z]{6,})|([A-Z]{6,})", 0,
       "alt(group1(greedy{6,*}(set[a-z])) | group2(greedy{6,*}(set[A-Z])))"},
      {"abc", 0, "lit\"abc\""},
      {"abc*", 0, "seq(lit\"ab\", greedy{0,*}(lit\"c\"))"},
      {"a?b+?c*+", 0, "seq(greedy{0,1}(lit\"a\"), reluctant{1,*}(lit\"b\"), possessive{0,*}(lit\"c\"))"},
      {"a{3}", 0, "fixed{3}(lit\"a\")"},
      {"a{3}?", 0, "fixed{3}(lit\"a\")"},
      {"a{2,2}+", 0, "fixed{2}(lit\"a\")"},
      {"a{3,1}", 0, "fixed{3}(lit\"a\")"},
      {"a{2,}", 0, "greedy{2,*}(lit\"a\")"},
      {"a{2,5}?", 0, "reluctant{2,5}(lit\"a\")"},
      {"a{2147483647}", 0, "fixed{2147483647}(lit\"a\")"},
      {"a{0}", 0, "empty"},
      {"(a){0,0}?", 0, "empty"},
      {"()", 0, "group1(empty)"},
      {"a|", 0, "alt(lit\"a\" | empty)"},
      {"[^a-cx]", 0, "set^[a-cx]"},
      {"[ab]", 0, "set[ab]"},
      {"[a\\-z]", 0, "set[\\x2Daz]"},
      {"[:^space:]", 0, "class(^space)"},
      {"\\d\\W", 0, "seq(class(digit), class(^word))"},
      {".", 0, "any"},
      {"^\\A\\b\\B\\G\\Z\\z$", 0,
       "seq(assert(^), assert(\\A), assert(\\b), assert(\\B), assert(\\G), assert(\\Z), assert(\\z), assert($))"},
      {"(a)\\1\\g2\\k{1}(b)", 0, "seq(group1(lit\"a\"), backref(1), backref(2), backref(1), group2(lit\"b\"))"},
      {"\\Qa|b\\E", 0, "lit\"a|b\""},
      {"\\x00\\\"", 0, "lit\"\\x00\\x22\""},
      {"a b#c\n c", PatternEngine::kExtended, "lit\"abc\""},
      {"[ a]", PatternEngine::kExtended, "set[ a]"},
      {"a\\ b", PatternEngine::kExtended, "lit\"a b\""},
      {"ab(c)d", PatternEngine::kRightToLeft, "seq(lit\"d\", group1(lit\"c\"), lit\"ab\")"},
      {"((a|b)+)*", 0, "greedy{0,*}(group1(greedy{1,*}(group2(alt(lit\"a\" | lit\"b\")))))"},
  };
  for (const Case& c : cases) {
    PatternEngine e(c.pattern, c.flags);
    EXPECT_EQ(e.dump(), c.dump) << c.pattern;
  }
}

TEST(PatternFlags, RightToLeft) {
  const std::uint32_t rtl = PatternEngine::kRightToLeft;
  EXPECT_TRUE(whole("ab(c)d", "abcd", rtl));
  EXPECT_FALSE(whole("abcd", "dcba", rtl));
  // Right-to-left, the later greedy loop is matched first and takes all it can.
  EXPECT_EQ(spans("(a*)(a*)", "aaa", rtl), (MatchResult{1, 2, 0, 3, 0, 0, 0, 3}));
  EXPECT_EQ(spans("(a*)(a*)", "aaa", 0), (MatchResult{1, 2, 0, 3, 0, 3, 3, 3}));
  EXPECT_EQ(spans("(a+?)(a+)", "aaaa", rtl), (MatchResult{1, 2, 0, 4, 0, 1, 1, 4}));
  EXPECT_TRUE(whole("(ab)\\1", "abab", rtl) == false);  // the reference is met before the group
  EXPECT_TRUE(whole("\\1(ab)", "abab", rtl));
  EXPECT_TRUE(whole("^a$", "a", rtl));
  EXPECT_TRUE(whole("[:digit:]{2,3}x", "12x", rtl));
  EXPECT_FALSE(whole("[:digit:]{2,3}x", "1234x", rtl));
}

TEST(PatternClasses, TableFollowsAscii) {
  int upper = 0, lower = 0, digit = 0, cntrl = 0, punct = 0, space = 0, hex = 0, blank = 0;
  for (int b = 0; b < 256; ++b) {
    const std::uint8_t bits = byteClass(static_cast<std::uint8_t>(b));
    upper += (bits & kClassUpper) != 0;
    lower += (bits & kClassLower) != 0;
    digit += (bits & kClassDigit) != 0;
    cntrl += (bits & kClassControl) != 0;
    punct += (bits & kClassPunct) != 0;
    space += (bits & kClassSpace) != 0;
    hex += (bits & kClassHexLetter) != 0;
    blank += (bits & kClassBlankChar) != 0;
    if (b >= 0x80) {
      EXPECT_EQ(bits, 0) << b;
    }
  }
  EXPECT_EQ(upper, 26);
  EXPECT_EQ(lower, 26);
  EXPECT_EQ(digit, 10);
  EXPECT_EQ(cntrl, 33);
  EXPECT_EQ(punct, 32);
  EXPECT_EQ(space, 6);
  EXPECT_EQ(hex, 12);
  EXPECT_EQ(blank, 1);
  EXPECT_EQ(byteClass('\t'), kClassControl | kClassSpace);
  EXPECT_EQ(byteClass(' '), kClassSpace | kClassBlankChar);
  EXPECT_EQ(byteClass('a'), kClassLower | kClassHexLetter);
  EXPECT_EQ(byteClass('~'), kClassPunct);
  EXPECT_EQ(byteClass(0x7F), kClassControl);
}

// Each named class against the C library in the "C" locale (the locale a fresh process runs
// in), which is what the table reproduces; print is graph plus the space character.
TEST(PatternClasses, NamedClassesMatchCLocale) {
  struct Case {
    const char* name;
    int (*predicate)(int);
  } cases[] = {{"alnum", isalnum}, {"alpha", isalpha}, {"cntrl", iscntrl}, {"digit", isdigit},
               {"graph", isgraph}, {"lower", islower}, {"print", isprint}, {"punct", ispunct},
               {"space", isspace}, {"upper", isupper}, {"xdigit", isxdigit}, {"blank", isblank}};
  for (const Case& c : cases) {
    const std::string pattern = std::string("[:") + c.name + ":]";
    const std::string negated = std::string("[:^") + c.name + ":]";
    PatternEngine e(pattern.c_str());
    PatternEngine n(negated.c_str());
    for (int b = 0; b < 256; ++b) {
      const auto byte = static_cast<std::uint8_t>(b);
      const bool expected = b < 0x80 && c.predicate(b) != 0;
      EXPECT_EQ(e.matches(&byte, 1), expected) << c.name << " " << b;
      EXPECT_EQ(n.matches(&byte, 1), !expected) << c.name << " " << b;
    }
  }
  PatternEngine ascii("[:ascii:]");
  for (int b = 0; b < 256; ++b) {
    const auto byte = static_cast<std::uint8_t>(b);
    EXPECT_EQ(ascii.matches(&byte, 1), b < 0x80);
  }
}

TEST(PatternContext, ReusedAcrossEnginesAndGroupCounts) {
  MatchContext ctx;
  PatternEngine many("(a)(a)(a)(a)(a)(a)(a)(a)(a)(a)(a)(a)(a)(a)(a)(a)(a)(a)(a)(a)");
  std::string t(20, 'a');
  MatchResult r = many.matchExact(t.data(), t.size(), &ctx);
  ASSERT_EQ(r.size(), 2u + 2u * 21u);
  EXPECT_EQ(r[1], 20);
  EXPECT_EQ(r[2 + 2 * 20], 19);
  PatternEngine few("(b)+");
  EXPECT_EQ(few.matchExact("bb", 2, &ctx), (MatchResult{1, 1, 0, 2, 1, 2}));
  // Deep backtracking state grows the context's stack beyond its inline room.
  PatternEngine nested("((a)|b)*c");
  std::string long_(3000, 'a');
  long_ += 'c';
  EXPECT_TRUE(nested.matches(reinterpret_cast<const std::uint8_t*>(long_.data()), long_.size(), &ctx));
  EXPECT_GT(ctx.capacity, MatchContext::kInlineStack);
}

// ---- hostile patterns: exponential backtracking stays bounded by the step budget.

namespace {

struct HostileCase {
  const char* pattern;
  char fill;
  char last;
};

constexpr HostileCase kHostile[] = {
    {"(a*)*b", 'a', 'a'},  {"(a|aa)*c", 'a', 'a'},   {"(a+)+$", 'a', 'b'},
    {"(a|a)*b", 'a', 'a'}, {"((a+)*)+b", 'a', 'a'},  {"(a*?)*?b", 'a', 'a'},
    {"(.*)*x", 'a', 'a'},  {"(a+)+b", 'a', 'a'},     {"([:alnum:]*)*!", 'a', 'a'},
};

}  // namespace

// Each hostile pattern, at every length, against a reduced budget (keeps the suite fast);
// then the worst of them at full length against the real default budget. Wall time is not
// asserted here; bench/pattern_bench.cpp and the report give the measured worst case.
TEST(PatternHostile, FinishWithinBudgetAtEveryLength) {
  for (const HostileCase& h : kHostile) {
    PatternEngine e(h.pattern);
    ASSERT_TRUE(e.hasTree()) << h.pattern;
    for (std::size_t n : {std::size_t{1}, std::size_t{20}, std::size_t{64}, std::size_t{4092}}) {
      std::string text(n - 1, h.fill);
      text += h.last;
      MatchContext ctx;
      ctx.stepBudget = 100000;
      EXPECT_FALSE(e.matches(reinterpret_cast<const std::uint8_t*>(text.data()), text.size(), &ctx))
          << h.pattern << " n=" << n;
      EXPECT_LE(ctx.stepsUsed(), ctx.stepBudget + 1) << h.pattern;
    }
  }
  for (const char* p : {"(a*)*b", "((a+)*)+b", "([:alnum:]*)*!"}) {
    PatternEngine e(p);
    const std::string text(4092, 'a');
    MatchContext ctx;
    EXPECT_FALSE(e.matches(reinterpret_cast<const std::uint8_t*>(text.data()), text.size(), &ctx)) << p;
    EXPECT_EQ(ctx.stepsUsed(), kDefaultPatternStepBudget + 1) << p << " gave up on the budget";
  }
  // A smaller budget gives up sooner, and a sufficient one still finds a real match.
  PatternEngine e("(a|aa)*c");
  std::string text(30, 'a');
  text += 'c';
  MatchContext small;
  small.stepBudget = 10;
  EXPECT_FALSE(e.matches(reinterpret_cast<const std::uint8_t*>(text.data()), text.size(), &small));
  MatchContext normal;
  EXPECT_TRUE(e.matches(reinterpret_cast<const std::uint8_t*>(text.data()), text.size(), &normal));
}

// Realistic patterns on full-length texts need a tiny fraction of the budget; bulk scans are
// charged too (one step per 16 bytes).
TEST(PatternHostile, RealisticPatternsStayFarBelowBudget) {
  const std::string text = "7" + std::string(4091, 'a');
  MatchContext ctx;
  PatternEngine e("[:print:]*[:digit:]+[:print:]*");
  EXPECT_TRUE(e.matches(reinterpret_cast<const std::uint8_t*>(text.data()), text.size(), &ctx));
  EXPECT_LT(ctx.stepsUsed(), 5000);
  PatternEngine alnum("[:alnum:]+");
  EXPECT_TRUE(alnum.matches(reinterpret_cast<const std::uint8_t*>(text.data()), text.size(), &ctx));
  EXPECT_EQ(ctx.stepsUsed(), 4092 / 16);
}

// ---- native stack: matching a 4092-byte text on a 64 KiB thread stack

namespace {

struct StackJob {
  bool allMatched = true;
};

void* runOnSmallStack(void* arg) {
  auto* job = static_cast<StackJob*>(arg);
  const std::string digits(4092, '7');
  const std::string mixed = std::string(2046, 'a') + std::string(2046, '1');
  struct Row {
    const char* pattern;
    const std::string* text;
    bool expected;
  } rows[] = {
      {"[:alnum:]+", &digits, true},
      {"[:print:]*[:digit:]+[:print:]*", &mixed, true},
      {"(([:alpha:])|([:digit:]))*", &mixed, true},
      {"(a|1)+?", &mixed, true},
      {"((a*)(1*))*", &mixed, true},
      {"(a*)*b", &digits, false},
      {"(7|77)*8", &digits, false},
  };
  for (const Row& r : rows) {
    PatternEngine e(r.pattern);
    const bool got = e.matches(reinterpret_cast<const std::uint8_t*>(r.text->data()), r.text->size());
    if (got != r.expected) job->allMatched = false;
  }
  // The deepest pattern the parser accepts, matched many times over.
  std::string deep;
  for (int i = 0; i < PatternEngine::kMaxNesting; ++i) deep += "(a|";
  deep += "b";
  for (int i = 0; i < PatternEngine::kMaxNesting; ++i) deep += ")*";
  PatternEngine d(deep.c_str());
  const std::string as(4092, 'a');
  if (!d.hasTree() || !d.matches(reinterpret_cast<const std::uint8_t*>(as.data()), as.size()))
    job->allMatched = false;
  return nullptr;
}

}  // namespace

TEST(PatternStack, FullLengthTextOn64KiBThread) {
  pthread_attr_t attr;
  ASSERT_EQ(pthread_attr_init(&attr), 0);
  // Sanitizer builds use several times the stack per frame; they get a larger margin.
#if defined(__SANITIZE_ADDRESS__)
  const std::size_t size = 1024 * 1024;
#elif defined(__has_feature)
#if __has_feature(address_sanitizer)
  const std::size_t size = 1024 * 1024;
#else
  const std::size_t size = 64 * 1024;
#endif
#else
  const std::size_t size = 64 * 1024;
#endif
  ASSERT_EQ(pthread_attr_setstacksize(&attr, size), 0);
  StackJob job;
  pthread_t thread;
  ASSERT_EQ(pthread_create(&thread, &attr, runOnSmallStack, &job), 0);
  ASSERT_EQ(pthread_join(thread, nullptr), 0);
  pthread_attr_destroy(&attr);
  EXPECT_TRUE(job.allMatched);
}
