// Pattern engine: match tables, golden node-tree dumps, malformed patterns that must never
// match, the named classes against the C library, flags, hostile patterns and small stacks.
// Group spans of the syntax shared with PCRE2 are checked in pattern_differential_test.cpp;
// the span rows here are the rules of our own.
#include <gtest/gtest.h>

#include <pthread.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cstdint>
#include <cstring>
#include <string>

#include "pattern/match.h"
#include "pattern/pattern_engine.h"

using namespace tessel;

namespace {

const std::uint8_t* bytes(const std::string& s) { return reinterpret_cast<const std::uint8_t*>(s.data()); }

bool whole(const char* pattern, const std::string& text, std::uint32_t flags = 0) {
  return PatternEngine(pattern, flags).matches(bytes(text), text.size());
}

MatchResult spans(const char* pattern, const std::string& text, std::uint32_t flags = 0) {
  return PatternEngine(pattern, flags).matchExact(text.data(), text.size());
}

}  // namespace

// Whole-text behaviour, including the documented edge cases of the accepts and rule patterns.
TEST(PatternMatch, Table) {
  struct Case {
    const char* pattern;
    std::string text;
    bool expected;
  } cases[] = {
      {"[0-9]{0,}", "", true},          {"[:digit:]+", "", false},       {"[:digit:]+", "12a", false},
      {"[:^digit:]+", "abc", true},     {"[:^digit:]+", "ab1", false},   {"([0-9]{0,})|(.{0,5})", "abcdef", false},
      {"[:print:]*", "ab\x80", false},  {"[:print:]*", "a\tb", false},   {"[:print:]*", "a b~", true},
      {"[a-z]{6,}", "abcde", false},    {"[a-z]{6,}", "abcdefghij", true},
      {"[[:alpha:][:digit:][:punct:]]{0,16}", "Abc1!xyz", true},
      {"[[:alpha:][:digit:][:punct:]]{0,16}", "aaaaaaaaaaaaaaaaa", false},  // 17
      {"[[:alpha:][:digit:][:punct:]]{0,16}", "ab cd", false},
      {"[[:^digit:]x]+", "ax!", true},  {"[^a-c]+", "xaz", false},      {"[a-]+", "a-a", true},
      {"[]+", "a", false},              // empty set: matches no byte
      {"[^]+", "\x01\xFF", true},       // negated empty set: every byte
      {".+", "a\nb", true},             // '.' includes newline
      {"a{3}?", "aaa", true},           // the '?' after a fixed count is consumed
      {"a{3}+", "aaa", true},           {"a{3,1}", "aaa", true},         // n < m: maximum becomes m
      {"a{3,1}", "aa", false},          {"a{0}b", "b", true},            {"a{0,0}+", "", true},
      {"ab|cd", "abcd", false},         {"a|", "", true},                {"|a", "a", true},
      {"a*+a", "aaa", false},           // possessive gives nothing back
      {"(a|ab)*+c", "ababc", false},    // the loop's first way stops after "a"
      {"(ab|a)*+c", "ababc", true},     {"(a|ab)*+b", "ab", true},       {"a+?b", "aaab", true},
      {"\\d\\D\\s\\S\\w\\W", "1a b_!", true},
      {"\\Qa.b*\\E", "a.b*", true},     {"\\Qa.b*\\E", "axbb", false},   {"\\LAB\\EC", "abC", true},
      {"\\UaB\\Ec", "ABc", true},       {"\\x41\\x{42}\\u0043", "ABC", true},
      {"\\t\\n\\r\\f\\v\\a\\e", "\t\n\r\f\v\a\x1B", true},
      {"\\*\\+\\?\\.\\[\\(", "*+?.[(", true},
      {"]", "]", true},                 // ']' outside a set is a plain byte
      {"a-b", "a-b", true},             {"(?#note)a(?#more)b", "ab", true},
      {"(a)(b)\\2\\1", "abba", true},   {"(a)(b)\\g{-1}\\k<1>", "abba", true},  {"(a)\\1", "ab", false},
      {"(a)|b\\1", "b", false},         // a back-reference to a group that did not take part fails
      {"^ab$", "ab", true},             {"\\Aab\\z", "ab", true},        {"ab$\\n", "ab\n", true},
      {"ab\\Z\\n", "ab\n", true},       {"ab\\z\\n", "ab\n", false},     {"a\\b b", "a b", true},
      {"a\\Bb", "ab", true},            {"a\\bb", "ab", false},          {"\\Ga", "a", true},
      {"a\\G", "a", false},             {"(a*)*b", "aaab", true},        {"(a?){3}", "", true},
      {"(a?){1000000000}", "a", true},  // a mandatory empty iteration stands for the rest
      {"x\\0", "x0", true},             // \0 stands for '0'
      {"\\-\\]", "-]", true},
  };
  for (const Case& c : cases)
    EXPECT_EQ(whole(c.pattern, c.text), c.expected) << c.pattern << " on '" << c.text << "'";
  EXPECT_TRUE(wholeMatch("[:alnum:]+", bytes("ab1"), 3));
  EXPECT_FALSE(wholeMatch("[:alnum:]+", bytes("ab!"), 3));
  EXPECT_TRUE(wholeMatch("a*", nullptr, 0));
}

// Spans under our own rules: result layout, captures of repeated groups, reluctant resumption.
TEST(PatternMatch, ResultLayoutAndOwnSpanRules) {
  EXPECT_EQ(spans("([0-9]{0,})|(.{0,5})", "ab!x"), (MatchResult{1, 2, 0, 4, -1, -1, 0, 4}));
  EXPECT_TRUE(spans("[:alnum:]+", "ab!").empty());
  // Greedy loops keep an empty last iteration; captures keep the last iteration's value.
  EXPECT_EQ(spans("(a|)*", "aa"), (MatchResult{1, 1, 0, 2, 2, 2}));
  EXPECT_EQ(spans("((a)|b)*", "ab"), (MatchResult{1, 2, 0, 2, 1, 2, 0, 1}));
  // A reluctant loop resumes from where its own last way ended, not from where later nodes
  // left the position.
  EXPECT_EQ(spans("(a+)*?.", "aa"), (MatchResult{1, 1, 0, 2, 0, 1}));
  EXPECT_EQ(spans("(a|aa)*?.", "aa"), (MatchResult{1, 1, 0, 2, 0, 1}));
  // A group inside a zero-count repetition exists but never takes part.
  EXPECT_EQ(spans("(a){0}b", "b"), (MatchResult{1, 1, 0, 1, -1, -1}));
  // The no-progress rule: the whole-text match gives up when two successive ways of matching
  // both end at the start.
  EXPECT_FALSE(spans("(a*?|)(|)", "a").empty()) << "one empty way, then progress";
  EXPECT_TRUE(spans("(a*?|)(||)", "a").empty()) << "two empty ways in a row";
  EXPECT_FALSE(spans("(a*?|)(||)", "").empty()) << "nothing to consume: the first way matches";
}

// Malformed, null and empty patterns give an engine without a tree: never a match, never a
// crash; nesting beyond the cap is refused rather than recursed into.
TEST(PatternMatch, MalformedNeverMatches) {
  const char* const patterns[] = {
      nullptr, "", "(", ")", "(a", "a)", "((a)", "(a))", "[", "[a", "[a-", "[[:digit:]", "[:digit:",
      "[:digit", "[:foo:]", "[[:foo:]]", "[:DIGIT:]", "[:digit]", "*", "+a", "?", "{1}", "a|*", "(*a)",
      "a**", "a*{2}", "a{2}{3}", "a+*", "a??+", "a{", "a{1", "a{1,", "a{,2}", "a{x}", "a{1,x}",
      "a{2147483648}", "a{1,99999999999}", "}", "a}", "{", "[z-a]", "\\", "a\\", "(?#open", "\\x{}",
      "\\x{100}", "\\u", "\\u0100", "\\g", "\\g{}", "\\k<1", "\\1", "(a)\\2", "\\g{-1}", "(a)\\g{-2}",
      "[\\A]", "[\\1]", "[\\g1]",
  };
  for (const char* p : patterns) {
    const char* name = p != nullptr ? p : "(null)";
    PatternEngine e(p);
    EXPECT_FALSE(e.hasTree()) << name << " -> " << e.dump();
    if (p == nullptr || *p == '\0') {
      EXPECT_EQ(e.dump(), "none");
    }
    for (const char* text : {"", "a", "aa", "1", "(", "abc"})
      EXPECT_TRUE(e.matchExact(text, std::strlen(text)).empty()) << name << " on " << text;
    EXPECT_FALSE(wholeMatch(p, bytes(""), 0));
  }
  const auto nested = [](int depth) {
    return std::string(static_cast<std::size_t>(depth), '(') + "a" + std::string(static_cast<std::size_t>(depth), ')');
  };
  PatternEngine tooDeep(nested(PatternEngine::kMaxNesting + 1).c_str());
  EXPECT_EQ(tooDeep.status(), PatternEngine::Status::kTooDeep);
  EXPECT_FALSE(tooDeep.matches(bytes("a"), 1));
  EXPECT_TRUE(whole(nested(PatternEngine::kMaxNesting).c_str(), "a"));
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
      {"[[:digit:][:punct:]]+", 0, "greedy{1,*}(set[!-@[-`{-~])"},
      {"([0-9]{0,})|(.{0,5})", 0, "alt(group1(greedy{0,*}(set[0-9])) | group2(greedy{0,5}(any)))"},
      {"abc*", 0, "seq(lit\"ab\", greedy{0,*}(lit\"c\"))"},
      {"a?b+?c*+", 0, "seq(greedy{0,1}(lit\"a\"), reluctant{1,*}(lit\"b\"), possessive{0,*}(lit\"c\"))"},
      {"a{3}?", 0, "fixed{3}(lit\"a\")"},          {"a{2,2}+", 0, "fixed{2}(lit\"a\")"},
      {"a{3,1}", 0, "fixed{3}(lit\"a\")"},         {"a{2,}", 0, "greedy{2,*}(lit\"a\")"},
      {"a{2,5}?", 0, "reluctant{2,5}(lit\"a\")"},  {"a{2147483647}", 0, "fixed{2147483647}(lit\"a\")"},
      {"a{0}", 0, "empty"},                        {"(a){0,0}?", 0, "empty"},
      {"()", 0, "group1(empty)"},                  {"a|", 0, "alt(lit\"a\" | empty)"},
      {"[^a-cx]", 0, "set^[a-cx]"},                {"[a\\-z]", 0, "set[\\x2Daz]"},
      {"[:^space:]", 0, "class(^space)"},          {"\\d\\W", 0, "seq(class(digit), class(^word))"},
      {"^\\A\\b\\B\\G\\Z\\z$", 0,
       "seq(assert(^), assert(\\A), assert(\\b), assert(\\B), assert(\\G), assert(\\Z), assert(\\z), assert($))"},
      {"(a)\\1\\g2\\k{1}(b)", 0, "seq(group1(lit\"a\"), backref(1), backref(2), backref(1), group2(lit\"b\"))"},
      {"\\Qa|b\\E", 0, "lit\"a|b\""},              {"\\x00\\\"", 0, "lit\"\\x00\\x22\""},
      {"a b#c\n c", PatternEngine::kExtended, "lit\"abc\""},
      {"[ a]", PatternEngine::kExtended, "set[ a]"},
      {"a\\ b", PatternEngine::kExtended, "lit\"a b\""},
      {"ab(c)d", PatternEngine::kRightToLeft, "seq(lit\"d\", group1(lit\"c\"), lit\"ab\")"},
      {"((a|b)+)*", 0, "greedy{0,*}(group1(greedy{1,*}(group2(alt(lit\"a\" | lit\"b\")))))"},
  };
  for (const Case& c : cases) EXPECT_EQ(PatternEngine(c.pattern, c.flags).dump(), c.dump) << c.pattern;
}

TEST(PatternFlags, RightToLeft) {
  const std::uint32_t rtl = PatternEngine::kRightToLeft;
  EXPECT_TRUE(whole("ab(c)d", "abcd", rtl));
  EXPECT_FALSE(whole("abcd", "dcba", rtl));
  // Right-to-left, the later greedy loop is matched first and takes all it can.
  EXPECT_EQ(spans("(a*)(a*)", "aaa", rtl), (MatchResult{1, 2, 0, 3, 0, 0, 0, 3}));
  EXPECT_EQ(spans("(a+?)(a+)", "aaaa", rtl), (MatchResult{1, 2, 0, 4, 0, 1, 1, 4}));
  EXPECT_FALSE(whole("(ab)\\1", "abab", rtl));  // the reference is met before the group
  EXPECT_TRUE(whole("\\1(ab)", "abab", rtl));
  EXPECT_TRUE(whole("^a$", "a", rtl));
  EXPECT_TRUE(whole("[:digit:]{2,3}x", "12x", rtl));
  EXPECT_FALSE(whole("[:digit:]{2,3}x", "1234x", rtl));
}

// Each named class and its negation on every byte against the C library in the "C" locale
// (the locale a fresh process runs in), which is what the class table reproduces.
TEST(PatternClasses, NamedClassesMatchCLocale) {
  struct Case {
    const char* name;
    int (*predicate)(int);
  } cases[] = {{"alnum", isalnum}, {"alpha", isalpha}, {"cntrl", iscntrl},   {"digit", isdigit},
               {"graph", isgraph}, {"lower", islower}, {"print", isprint},   {"punct", ispunct},
               {"space", isspace}, {"upper", isupper}, {"xdigit", isxdigit}, {"blank", isblank},
               {"ascii", [](int) { return 1; }}};
  for (const Case& c : cases) {
    PatternEngine e((std::string("[:") + c.name + ":]").c_str());
    PatternEngine n((std::string("[:^") + c.name + ":]").c_str());
    for (int b = 0; b < 256; ++b) {
      const auto byte = static_cast<std::uint8_t>(b);
      const bool expected = b < 0x80 && c.predicate(b) != 0;
      EXPECT_EQ(e.matches(&byte, 1), expected) << c.name << " " << b;
      EXPECT_EQ(n.matches(&byte, 1), !expected) << c.name << " " << b;
    }
  }
}

TEST(PatternContext, ReusedAcrossEnginesAndGroupCounts) {
  MatchContext ctx;
  std::string twenty;
  for (int i = 0; i < 20; ++i) twenty += "(a)";
  const std::string t(20, 'a');
  const MatchResult r = PatternEngine(twenty.c_str()).matchExact(t.data(), t.size(), &ctx);
  ASSERT_EQ(r.size(), 2u + 2u * 21u);
  EXPECT_EQ(r[1], 20);
  EXPECT_EQ(r[2 + 2 * 20], 19);
  EXPECT_EQ(PatternEngine("(b)+").matchExact("bb", 2, &ctx), (MatchResult{1, 1, 0, 2, 1, 2}));
  // Deep backtracking state grows the context's stack beyond its inline room.
  const std::string longText = std::string(3000, 'a') + 'c';
  EXPECT_TRUE(PatternEngine("((a)|b)*c").matches(bytes(longText), longText.size(), &ctx));
  EXPECT_GT(ctx.capacity, MatchContext::kInlineStack);
}

// Exponential backtracking stays bounded by the step budget: each hostile pattern at every
// length against a reduced budget (keeps the suite fast), the worst at full length against the
// real default, and realistic patterns far below it. Wall time is measured in bench/, not here.
TEST(PatternHostile, StepBudgetBoundsEveryPattern) {
  const struct {
    const char* pattern;
    char fill, last;
  } hostile[] = {
      {"(a*)*b", 'a', 'a'},  {"(a|aa)*c", 'a', 'a'},  {"(a+)+$", 'a', 'b'},
      {"(a|a)*b", 'a', 'a'}, {"((a+)*)+b", 'a', 'a'}, {"(a*?)*?b", 'a', 'a'},
      {"(.*)*x", 'a', 'a'},  {"(a+)+b", 'a', 'a'},    {"([:alnum:]*)*!", 'a', 'a'},
  };
  for (const auto& h : hostile) {
    PatternEngine e(h.pattern);
    ASSERT_TRUE(e.hasTree()) << h.pattern;
    for (std::size_t n : {std::size_t{1}, std::size_t{20}, std::size_t{64}, std::size_t{4092}}) {
      const std::string text = std::string(n - 1, h.fill) + h.last;
      MatchContext ctx;
      ctx.stepBudget = 100000;
      EXPECT_FALSE(e.matches(bytes(text), text.size(), &ctx)) << h.pattern << " n=" << n;
      EXPECT_LE(ctx.stepsUsed(), ctx.stepBudget + 1) << h.pattern;
    }
  }
  const std::string as(4092, 'a');
  for (const char* p : {"(a*)*b", "((a+)*)+b", "([:alnum:]*)*!"}) {
    MatchContext ctx;
    EXPECT_FALSE(PatternEngine(p).matches(bytes(as), as.size(), &ctx)) << p;
    EXPECT_EQ(ctx.stepsUsed(), kDefaultPatternStepBudget + 1) << p << " gave up on the budget";
  }
  // A smaller budget gives up sooner, and a sufficient one still finds a real match.
  const std::string text = std::string(30, 'a') + 'c';
  PatternEngine e("(a|aa)*c");
  MatchContext small;
  small.stepBudget = 10;
  EXPECT_FALSE(e.matches(bytes(text), text.size(), &small));
  EXPECT_TRUE(e.matches(bytes(text), text.size()));
  // Realistic patterns need a tiny fraction; bulk scans are charged one step per 16 bytes.
  const std::string typed = "7" + std::string(4091, 'a');
  MatchContext ctx;
  EXPECT_TRUE(PatternEngine("[:print:]*[:digit:]+[:print:]*").matches(bytes(typed), typed.size(), &ctx));
  EXPECT_LT(ctx.stepsUsed(), 5000);
  EXPECT_TRUE(PatternEngine("[:alnum:]+").matches(bytes(typed), typed.size(), &ctx));
  EXPECT_EQ(ctx.stepsUsed(), 4092 / 16);
}

// Matching a 4092-byte text on a 64 KiB thread stack (more under AddressSanitizer, whose
// frames are several times larger), including the deepest pattern the parser accepts.
namespace {

void* runOnSmallStack(void* allMatched) {
  const std::string digits(4092, '7'), mixed = std::string(2046, 'a') + std::string(2046, '1');
  std::string deep;
  for (int i = 0; i < PatternEngine::kMaxNesting; ++i) deep += "(a|";
  deep += "b";
  for (int i = 0; i < PatternEngine::kMaxNesting; ++i) deep += ")*";
  const std::string as(4092, 'a');
  const struct {
    const char* pattern;
    const std::string& text;
    bool expected;
  } rows[] = {
      {"[:alnum:]+", digits, true},       {"[:print:]*[:digit:]+[:print:]*", mixed, true},
      {"(a|1)+?", mixed, true},           {"(([:alpha:])|([:digit:]))*", mixed, true},
      {"((a*)(1*))*", mixed, true},       {"(a*)*b", digits, false},
      {"(7|77)*8", digits, false},        {deep.c_str(), as, true},
  };
  for (const auto& r : rows)
    if (PatternEngine(r.pattern).matches(bytes(r.text), r.text.size()) != r.expected)
      *static_cast<bool*>(allMatched) = false;
  return nullptr;
}

#if defined(__has_feature)
#if __has_feature(address_sanitizer)
#define TESSEL_TEST_ASAN 1
#endif
#endif
#if defined(__SANITIZE_ADDRESS__) || defined(TESSEL_TEST_ASAN)
constexpr std::size_t kStackSize = 1024 * 1024;
#else
constexpr std::size_t kStackSize = 64 * 1024;
#endif

}  // namespace

TEST(PatternStack, FullLengthTextOn64KiBThread) {
  pthread_attr_t attr;
  ASSERT_EQ(pthread_attr_init(&attr), 0);
  // glibc on aarch64 refuses stacks below its 128 KiB minimum (kernels there may use 64 KiB
  // pages): the test runs at the platform minimum where that is larger.
  const long platformMinimum = sysconf(_SC_THREAD_STACK_MIN);
  const std::size_t stackSize =
      platformMinimum > 0 ? std::max(kStackSize, static_cast<std::size_t>(platformMinimum)) : kStackSize;
  ASSERT_EQ(pthread_attr_setstacksize(&attr, stackSize), 0);
  bool allMatched = true;
  pthread_t thread;
  ASSERT_EQ(pthread_create(&thread, &attr, runOnSmallStack, &allMatched), 0);
  ASSERT_EQ(pthread_join(thread, nullptr), 0);
  pthread_attr_destroy(&attr);
  EXPECT_TRUE(allMatched);
}
