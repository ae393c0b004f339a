// Pattern engine behaviour tables and the intended differences from PCRE2; agreement with PCRE2
// and std::regex on generated patterns is in pattern_differential_test.cpp.
#include <gtest/gtest.h>

#include <pthread.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cstdint>
#include <cstring>
#include <functional>
#include <string>

#include "pattern/pattern_engine.h"

#if defined(TESSEL_HAVE_PCRE2)
#define PCRE2_CODE_UNIT_WIDTH 8
#include <pcre2.h>
#endif

using namespace tessel;

namespace {

const std::uint8_t* bytes(const std::string& s) { return reinterpret_cast<const std::uint8_t*>(s.data()); }

bool whole(const std::string& pattern, const std::string& text, std::uint32_t flags = 0) {
  return PatternEngine(pattern.c_str(), flags).matches(bytes(text), text.size());
}

MatchResult spans(const char* pattern, const std::string& text, std::uint32_t flags = 0) {
  return PatternEngine(pattern, flags).matchExact(text.data(), text.size());
}

struct Row { const char* pattern; std::string text; bool expected; };

template <std::size_t N>
void expectRows(const Row (&rows)[N]) {
  for (const Row& r : rows) EXPECT_EQ(whole(r.pattern, r.text), r.expected) << r.pattern << " on " << r.text;
}

// Runs body on a 256 KiB thread (room for AddressSanitizer's frames, far below recursion's need).
void onSmallStack(std::function<void()> body) {
  pthread_attr_t attr;
  ASSERT_EQ(pthread_attr_init(&attr), 0);
  const long platformMinimum = sysconf(_SC_THREAD_STACK_MIN);  // 128 KiB on some aarch64
  const std::size_t size = std::max<std::size_t>(256 * 1024, static_cast<std::size_t>(platformMinimum));
  ASSERT_EQ(pthread_attr_setstacksize(&attr, size), 0);
  const auto run = [](void* f) -> void* {
    (*static_cast<std::function<void()>*>(f))();
    return nullptr;
  };
  pthread_t thread;
  ASSERT_EQ(pthread_create(&thread, &attr, run, &body), 0);
  ASSERT_EQ(pthread_join(thread, nullptr), 0);
  pthread_attr_destroy(&attr);
}

}  // namespace

// Whole-text behaviour, including the documented edge cases of the accepts and rule patterns.
TEST(PatternMatch, Table) {
  const Row rows[] = {
      {"[0-9]{0,}", "", true}, {"[:digit:]+", "", false}, {"[:digit:]+", "12a", false},
      {"([0-9]{0,})|(.{0,5})", "abcdef", false}, {"[:print:]*", "ab\x80", false}, {"[:print:]*", "a\tb", false},
      {"[:print:]*", "a b~", true}, {"[[:alpha:][:digit:][:punct:]]{0,16}", "Abc1!xyz", true},
      {"[[:alpha:][:digit:][:punct:]]{0,16}", "aaaaaaaaaaaaaaaaa", false},  // 17
      {"[[:^digit:]x]+", "ax!", true}, {"[a-]+", "a-a", true}, {"[b-b]", "b", true}, {"[]+", "a", false},
      {"[^]+", "\x01\xFF", true}, {"a{3}?", "aaa", true}, {"a{3}+", "aaa", true}, {"a{3,1}", "aaa", true},
      {"a{3,1}", "aaaa", false}, {"a{0,0}+", "", true}, {"(a|ab)*+c", "ababc", false},
      {"(ab|a)*+c", "ababc", true}, {"\\Qa.b*\\E", "a.b*", true}, {"\\Qa.b*\\E", "axbb", false},
      {"\\LAB\\EC", "abC", true}, {"\\UaB\\Ec", "ABc", true}, {"\\x41\\x{42}\\u0043", "ABC", true},
      {"\\t\\n\\r\\f\\v\\a\\e", "\t\n\r\f\v\a\x1B", true}, {"\\*\\+\\?\\.\\[\\(\\-\\]", "*+?.[(-]", true},
      {"]", "]", true}, {"a-b", "a-b", true}, {"(?#note)a(?#more)b", "ab", true},
      {"(a)(b)\\g2\\k<1>\\g{-1}\\k{1}", "abbaba", true},
      {"(a)|b\\g1", "b", false},  // a back-reference to a group that did not take part fails
      {"ab$\\n", "ab\n", true}, {"ab\\Z\\n", "ab\n", true}, {"ab\\z\\n", "ab\n", false}, {"a\\G", "a", false},
      {"x\\0", "x0", true}, {"a\\1", "a1", true}, {"\\9\\0", "90", true}, {"[a-z\\]+", "ab\\", true}, {"[qwe\\]+", "q", true}, {"[\\d]", "5", false},
      {"[\\d]", "d", true}, {"[\\]]", "\\]", true},
  };
  expectRows(rows);
  EXPECT_TRUE(PatternEngine("a*").matches(nullptr, 0));
}

// A back-reference sees its group's last completed capture on the current way only.
TEST(PatternBackrefs, InsideOwnGroupSeesOnlyCompletedCaptures) {
  const Row rows[] = {{"(a|\\g1b)", "ab", false},          {"(.|\\g1x){3}", "1-1x", false},
                      {"^(xa|=?\\g1a){2}$", "xa=xaaa", false}, {"(a.?\\g1?)c", "aaac", false},
                      {"(a|\\g1b){2}", "aab", true},           {"(.|\\g1x){3}", "1--x", true}};
  expectRows(rows);
  EXPECT_EQ(spans("(a|b\\g1)+", "aba"), (MatchResult{1, 1, 0, 3, 1, 3}));
}

// An optional iteration that consumes nothing still counts, so a later back-reference sees it.
TEST(PatternBackrefs, EmptyIterationsKeepTheirCaptures) {
  EXPECT_EQ(spans("(a|)*?\\g1", "a"), (MatchResult{1, 1, 0, 1, 1, 1}));
  EXPECT_EQ(spans("(.?){2}\\g1", "xx"), (MatchResult{1, 1, 0, 2, 0, 1}));
  EXPECT_EQ(spans("()*?\\g1", ""), (MatchResult{1, 1, 0, 0, 0, 0}));
}

// Empty iterations end a loop, never the match: many empty ways before a later alternative.
TEST(PatternMatch, EveryAlternativeStaysReachable) {
  const Row rows[] = {{"((q?|q){1,4})*|..", "qw", true},  {"(|b)*?(b(|){4}){0,2}", "bbb", true},
                      {"([a-z]?){0,2}|[0-9]+", "1", true}, {"([A-Z]?){1,32}|[0-9]+", "1", true},
                      {"([a-z]?[0-9]?){1,16}|[:punct:]+", "!", true}, {"(||)b*(){0}|a", "a", true},
                      {"(||)(a|)*|aab", "aab", true}, {"(a*?|)(||)", "b", false}};
  expectRows(rows);
}

// Malformed, null, empty and too large patterns give an engine without a program: no match.
TEST(PatternMatch, MalformedNeverMatches) {
  const char* const patterns[] = {
      nullptr, "", "(", ")", "(a", "a)", "((a)", "(a))", "[", "[a", "[a-", "[[:digit:]", "[:digit:",
      "[:digit", "[:foo:]", "[[:foo:]]", "[:DIGIT:]", "[:digit]", "*", "+a", "?", "{1}", "a|*", "(*a)",
      "a**", "a*{2}", "a{2}{3}", "a+*", "a??+", "a{", "a{1", "a{1,", "a{,2}", "a{x}", "a{1,x}",
      "a{2147483648}", "a{1,99999999999}", "}", "a}", "{", "[z-a]", "\\", "a\\", "(?#open", "\\x{}",
      "\\x{100}", "\\u", "\\u0100", "\\g", "\\g{}", "\\k<1", "(a)\\g2", "\\g{-1}", "(a)\\g{-2}",
      "(ab){2000000}", "((a|b){1000}){1000}", "(a|b){0,80000}", "(a{0,1000}){0,1000}b|a*",
  };
  for (const char* p : patterns) {
    const char* name = p != nullptr ? p : "(null)";
    PatternEngine e(p);
    EXPECT_NE(e.status(), PatternEngine::Status::kCompiled) << name;
    for (const char* text : {"", "a", "aa", "1", "(", "abc"})
      EXPECT_TRUE(e.matchExact(text, std::strlen(text)).empty()) << name << " on " << text;
    EXPECT_FALSE(e.matches(bytes(""), 0));
  }
  EXPECT_EQ(PatternEngine("(ab){2000000}").status(), PatternEngine::Status::kTooLarge);
}

TEST(PatternFlags, RightToLeftAndExtended) {
  const std::uint32_t rtl = PatternEngine::kRightToLeft, ext = PatternEngine::kExtended;
  const struct { const char* pattern; const char* text; std::uint32_t flags; bool expected; } rows[] = {
      {"ab(c)d", "abcd", rtl, true}, {"abcd", "dcba", rtl, false}, {"^a$", "a", rtl, true},
      {"(ab)\\g1", "abab", rtl, false},  // the reference is met before the group
      {"\\g1(ab)", "abab", rtl, true},   {"[:digit:]{2,3}x", "12x", rtl, true},
      {"[:digit:]{2,3}x", "1234x", rtl, false}, {"(||)b*|a", "", rtl, true}, {"(||)b*|a", "a", rtl, true},
      {"a b#c\n c", "abc", ext, true},   {"[ a]+", " a", ext, true},    {"a\\ b", "a b", ext, true}};
  for (const auto& r : rows) EXPECT_EQ(whole(r.pattern, r.text, r.flags), r.expected) << r.pattern << r.flags;
  EXPECT_EQ(spans("(a*)(a*)", "aaa", rtl), (MatchResult{1, 2, 0, 3, 0, 0, 0, 3}));  // later loop first
  EXPECT_EQ(spans("(a+?)(a+)", "aaaa", rtl), (MatchResult{1, 2, 0, 4, 0, 1, 1, 4}));
}

// Each named class on every byte against the C library in the "C" locale.
TEST(PatternClasses, NamedClassesMatchCLocale) {
  const struct { const char* name; int (*predicate)(int); } cases[] = {
      {"alnum", isalnum}, {"alpha", isalpha}, {"cntrl", iscntrl},   {"digit", isdigit},
      {"graph", isgraph}, {"lower", islower}, {"print", isprint},   {"punct", ispunct},
      {"space", isspace}, {"upper", isupper}, {"xdigit", isxdigit}, {"blank", isblank},
      {"ascii", [](int) { return 1; }}};
  for (const auto& c : cases) {
    const PatternEngine e((std::string("[:") + c.name + ":]").c_str());
    for (int b = 0; b < 256; ++b) {
      const auto byte = static_cast<std::uint8_t>(b);
      EXPECT_EQ(e.matches(&byte, 1), b < 0x80 && c.predicate(b) != 0) << c.name << " " << b;
    }
  }
}

// Full-length texts (the content buffer holds 4092 bytes), 1000 nested groups and 16 nested loops
// cost heap, not stack; hostile patterns get their true outcome, never a refusal.
TEST(PatternLongText, NoFalseRefusalWithoutBackrefsAtAnyDepth) {
  const std::string as(4092, 'a'), digits(4092, '7'), halves = std::string(2046, 'a') + std::string(2046, '1');
  std::string mixed(4092, 'k');  // a digit, letters, a punctuation mark at the end
  mixed[5] = '7', mixed.back() = '!';
  const std::string deep = std::string(1000, '(') + "a|b" + std::string(1000, ')');
  std::string deepLoops = "b";
  for (int i = 0; i < 16; ++i) deepLoops = "(a|" + deepLoops + ")*";
  const Row rows[] = {
      {"[:print:]*[:digit:][:print:]*[:alpha:][:print:]*[:punct:][:print:]*", mixed, true},
      {"[:print:]*[:digit:][:print:]*[:alpha:][:print:]*[:punct:][:print:]*", mixed.substr(0, 4091), false},
      {"[:print:]*[:digit:][:print:]*[:alpha:][:print:]*", mixed, true},
      {"(a*)*b|a*", as, true},          {"(q*)*(q*)*(q*)*(q*)*z|.*", as, true},
      {"(a*)*b", as, false},            {"(a*)*b", as + "b", true},     {"(a|aa)*c", as, false},
      {"(a|aa)*c", as + "c", true},     {"((a+)*)+b", as, false},        {"(.*){20}x", as, false},
      {"(.*){20}x", as + "x", true},    {"(a{0,1000}){0,200}b", as, false},
      {"(a{0,1000}){0,200}b", as + "b", true},  {"(a|a)*(b|a)", as, true},  {"(a*?)*?c|(a|)+b", as, false},
      {"[:alnum:]+", digits, true},     {"(a|1)+?", halves, true},       {"(([:alpha:])|([:digit:]))*", halves, true},
      {"(7|77)*8", digits, false},      {deep.c_str(), "b", true},       {deepLoops.c_str(), as, true},
  };
  onSmallStack([&] {
    for (const Row& r : rows) {
      MatchContext ctx;
      EXPECT_EQ(PatternEngine(r.pattern).matches(bytes(r.text), r.text.size(), &ctx), r.expected) << r.pattern;
      EXPECT_EQ(PatternEngine(r.pattern).matchExact(r.text.data(), r.text.size()).empty(), !r.expected) << r.pattern;
      EXPECT_FALSE(ctx.gaveUp()) << r.pattern;
    }
  });
}

// With back-references the search is bounded: a hostile one gives up (no match, and says so).
TEST(PatternLongText, BackrefSearchIsBounded) {
  const std::string as(4092, 'a'), text = as + "cb";
  MatchContext ctx;
  EXPECT_FALSE(PatternEngine("(a*)*\\g1c").matches(bytes(text), text.size(), &ctx));
  EXPECT_TRUE(ctx.gaveUp());
  EXPECT_TRUE(PatternEngine("(a*)\\g1").matches(bytes(as), as.size(), &ctx));
  EXPECT_FALSE(ctx.gaveUp());
}

// Where our syntax rules make a pattern mean something else than in PCRE2 (anchored at both
// ends, default options): intended, and checked against PCRE2 itself when it is built in.
TEST(PatternPcre2Differences, IntendedByOurRules) {
  // pcre2: 1 match, 0 no match, -1 refused as malformed
  const struct { const char* pattern; const char* text; bool ours; int pcre2; const char* rule; } rows[] = {
      {"(a)\\1", "a1", true, 0, "an escaped digit stands for itself"},
      {"(a)\\1", "aa", false, 1, "an escaped digit stands for itself"},
      {"[\\d]", "d", true, 0, "a backslash inside a set is a plain byte"},
      {"[:digit:]+", "12", true, -1, "'[:' opens a named class anywhere"},
      {"[[:digit:]x]", "x", true, 1, "named class inside a set: the same"},
      {".", "\n", true, 0, "'.' matches every byte"},
      {"x{a}", "x{a}", false, 1, "only {m}, {m,}, {m,n} are quantifiers; other braces are malformed"},
      {"a{2,1}", "aa", true, -1, "{m,n} with n < m means m"},
  };
  for (const auto& r : rows) {
    EXPECT_EQ(whole(r.pattern, r.text), r.ours) << r.pattern << ": " << r.rule;
#if defined(TESSEL_HAVE_PCRE2)
    int error = 0;
    PCRE2_SIZE offset = 0;
    pcre2_code* code = pcre2_compile(reinterpret_cast<PCRE2_SPTR>(r.pattern), PCRE2_ZERO_TERMINATED,
                                     PCRE2_ANCHORED | PCRE2_ENDANCHORED, &error, &offset, nullptr);
    int peer = -1;
    if (code != nullptr) {
      pcre2_match_data* data = pcre2_match_data_create_from_pattern(code, nullptr);
      peer = pcre2_match(code, reinterpret_cast<PCRE2_SPTR>(r.text), std::strlen(r.text), 0, 0, data, nullptr) > 0;
      pcre2_match_data_free(data);
      pcre2_code_free(code);
    }
    EXPECT_EQ(peer, r.pcre2) << r.pattern << ": " << r.rule;
#endif
  }
}
