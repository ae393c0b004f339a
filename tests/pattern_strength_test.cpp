// Strength ratings, rule verification, dictionary parsing and the session operations, from the
// documented rating rules; rule sets are checked through probe texts whose letters differ
// between every pair of ratings.
#include <gtest/gtest.h>

#include <cstring>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "pattern/password_measures.h"
#include "pattern/strength.h"
#include "session/session.h"
#include "support/keyboard_typist.h"

using namespace tessel;

static const std::uint8_t* bytes(const std::string& s) { return reinterpret_cast<const std::uint8_t*>(s.data()); }

// First in the file so that it races the very first use of the once-compiled predicates.
TEST(StrengthPredicates, FirstUseFromManyThreads) {
  std::vector<std::thread> threads;
  char letters[8] = {};
  for (char& letter : letters) threads.emplace_back([&letter] { letter = rateStrength(48, "ab1!cd"); });
  for (auto& t : threads) t.join();
  for (char c : letters) EXPECT_EQ(c, 'S');
}

namespace {

// Letters each rating gives for the probe texts, in order.
const char* const kProbes[] = {"", "12345", "abcdef", "k3Hq9!", "Password", "abc123"};
const std::string kGeneral = "EWWSSM", kNumeric = "EWWSWM", kStrict = "ETWSWM", kLetters = "WWWWSW",
                  kDefault = "WWMSSS";

std::string signature(std::uint32_t ruleSet) {
  std::string s;
  for (const char* p : kProbes) s += rateStrength(ruleSet, p);
  return s;
}

}  // namespace

TEST(StrengthDispatch, EveryRuleSetUsesItsRating) {
  const std::set<std::uint32_t> general = {
      1,  2,  3,  5,  7,  8,  9,  10, 11, 12, 16, 18, 23, 24, 26, 27, 28, 29, 30, 32, 33,
      36, 37, 38, 39, 40, 41, 42, 43, 44, 45, 46, 49, 50, 51, 52, 53, 54, 55, 58, 59, 60,
      61, 62, 63, 64, 66, 67, 68, 70, 71, 72, 73, 74, 75, 80, 81, 82, 85, 86, 87, 89, 90};
  const std::set<std::uint32_t> numeric = {4, 14, 17, 19, 20, 25, 31, 35, 47, 48, 57, 84};
  const std::set<std::uint32_t> defaults = {0, 13, 15, 21, 22, 56, 65, 69, 76, 77, 78, 79, 83, 88};
  ASSERT_EQ(general.size() + numeric.size() + defaults.size() + 2, 91u);
  for (std::uint32_t r = 0; r <= 90; ++r) {
    std::string expected;
    if (general.count(r)) expected = kGeneral;
    if (numeric.count(r)) expected = kNumeric;
    if (defaults.count(r)) expected = kDefault;
    if (r == 34) expected = kStrict;
    if (r == 6) expected = kLetters;
    EXPECT_EQ(signature(r), expected) << "rule set " << r;
  }
  for (std::uint32_t r : {91u, 255u, 0x80000000u, 0xFFFFFFFFu}) EXPECT_EQ(signature(r), kDefault) << r;
}

// Ratings at their boundaries, and examples of each rating the probe texts above do not reach.
TEST(StrengthRatings, BoundariesAndExamples) {
  const struct { std::uint32_t ruleSet; const char* text; char expected; } cases[] = {
      // general: 5/6 bytes; runs against ceil(n/2); one class without runs is medium
      {1, "k3Hq9", 'W'}, {1, "k3Hq9!", 'S'}, {1, "abcq9!", 'M'}, {1, "abXq9!", 'S'}, {1, "abcXq9!", 'S'},
      {1, "abcdq9!", 'M'}, {1, "aaaXq9!", 'S'}, {1, "aaaaq9!", 'M'}, {1, "dcbaq9!", 'M'}, {1, "kqhzmwa", 'M'},
      {1, "abcdkqh", 'W'}, {1, "abcdefgh", 'W'}, {1, "kqhzmw", 'M'},
      // numeric: 5 bytes; frequency against 2n/3; two classes; a space or tab is a third kind
      {48, "k3Hq9", 'W'}, {48, "aaaa123", 'W'}, {48, "aaa1234", 'M'}, {48, "aaaaa123", 'W'},
      {48, "aaaa1234", 'M'}, {48, "!!!!12", 'W'}, {48, "ab!!cd", 'M'}, {48, "!@#$%^", 'W'},
      {48, "ab 123", 'S'}, {48, "abc\t12", 'S'}, {48, "aaaa12", 'W'}, {48, "123456", 'W'},
      // strict: short, sequences with wraps, runs and frequency against floor(n/2)
      {34, "k3Hq9", 'T'}, {34, "5670919", 'R'}, {34, "5690817", 'W'}, {34, "5095059", 'R'},
      {34, "50950871", 'W'}, {34, "9876", 'T'}, {34, "098765", 'T'}, {34, "111111", 'T'}, {34, "123456", 'T'},
      {34, "901234", 'T'}, {34, "654321", 'T'}, {34, "112233", 'W'}, {34, "121314", 'R'},
      // letters-required: 7 bytes, digits only, one case, runs with wraps, repeats
      {6, "Passwor", 'W'}, {6, "12345678", 'W'}, {6, "PASSWORD", 'M'}, {6, "zyxwvuts", 'W'},
      {6, "yzabcdef", 'W'}, {6, "aaaaaaaa", 'W'}, {6, "password", 'M'}, {6, "pass1234", 'S'},
      // default: five bytes of anything, six letters of one case, digits only
      {0, "abcde", 'W'}, {0, "ABCDEF", 'M'}, {0, "abcdef1", 'S'}, {0, "abcDEF", 'S'}, {0, "12345678901", 'W'},
  };
  for (const auto& c : cases) EXPECT_EQ(rateStrength(c.ruleSet, c.text), c.expected) << c.ruleSet << " " << c.text;
  EXPECT_EQ(rateStrength(48, nullptr), 'E');
}

TEST(StrengthMeasures, Table) {
  struct Case {
    std::string text; std::size_t maxFreq, repeat, ascending, descending; bool same, ascDigit,
    descDigit, ascLetter, descLetter;
  } cases[] = {
      {"", 0, 0, 0, 0, true, true, true, true, true}, {"a", 1, 1, 1, 1, true, true, true, true, true},
      {"abc", 1, 1, 3, 1, false, true, false, true, false},     // byte values only
      {"89:", 1, 1, 2, 1, false, false, false, true, false},    // ':' follows '9' by value
      {"890", 1, 1, 3, 1, false, true, false, false, false}, {"yzab", 1, 1, 4, 1, false, false, false, true, false},
      {"YZAB", 1, 1, 4, 1, false, false, false, true, false}, {"10987", 1, 1, 1, 5, false, false, true, false, false},
      {"baZY", 1, 1, 1, 2, false, false, false, false, false}, {"BAZY", 1, 1, 1, 4, false, false, false, false, true},
      {"!\"#$", 1, 1, 1, 1, false, true, false, true, false},  // no run starts at punctuation
      {"aabbbc", 3, 3, 2, 1, false, false, false, false, false},
      {"121314", 3, 1, 2, 2, false, false, false, false, false},
      {"a\x80\x81", 1, 1, 1, 1, false, false, false, false, false},
  };
  for (const Case& c : cases) {
    const std::uint8_t* t = bytes(c.text);
    const std::size_t n = c.text.size();
    EXPECT_EQ(std::vector<std::size_t>({maxCharFrequency(t, n), longestRepeatRun(t, n), longestAscendingRun(t, n),
                                        longestDescendingRun(t, n)}),
              std::vector<std::size_t>({c.maxFreq, c.repeat, c.ascending, c.descending})) << c.text;
    EXPECT_EQ(std::vector<bool>({isAllSameChar(t, n), isAscendingDigitRun(t, n), isDescendingDigitRun(t, n),
                                 isAscendingLetterRun(t, n), isDescendingLetterRun(t, n)}),
              std::vector<bool>({c.same, c.ascDigit, c.descDigit, c.ascLetter, c.descLetter})) << c.text;
  }
}

TEST(StrengthPredicates, Table) {
  using P = ClassPredicate;
  // Columns: AllDigits ContainsDigit AllLetters ContainsLetter AllLower AllUpper AllPunct
  // ContainsPunct AllAlnum DigitsPunct LettersPunct.
  struct Case { std::string text; const char* expected; } cases[] = {
      {"", "00000000000"}, {"123", "11000000110"}, {"abc", "00111000101"},
      {"ABC", "00110100101"}, {"aB", "00110000101"}, {"!?", "00000011011"},
      {"a1", "01010000100"},
      {"a 1", "01010000000"},     // space: printable, in no other class
      {"a\t1", "00000000000"},    // tab: not printable
      {"a1\x80", "00000000000"},  // high byte: no class at all
      {"a!", "00010001001"}, {"1!", "01000001010"}, {"a1!", "01010001000"},
  };
  for (const Case& c : cases) {
    for (int p = 0; p < kClassPredicateCount; ++p) {
      const bool want = c.expected[p] == '1';
      EXPECT_EQ(classPredicate(static_cast<P>(p), bytes(c.text), c.text.size()), want)
          << classPredicatePattern(static_cast<P>(p)) << " on '" << c.text << "'";
    }
  }
}

// Reason codes in their order: empty, short (unsigned), pattern (none, empty, malformed, rule
// set 36's class mix), trivial (60, 84, 4; only with fullCheck), dictionary (exact, case-
// sensitive), required classes (a tab spoils every class; other bits ignored).
TEST(Verify, ReasonCodesInOrder) {
  const char* const alnum = "[:alnum:]+";
  struct Case {
    std::uint32_t ruleSet; const char* text; bool full; std::uint32_t minLength; const char* accepts;
    std::uint32_t classes; const char* dictionary; int expected;
  } cases[] = {
      {48, "", true, 0, alnum, 0, nullptr, -1}, {48, "abc12", true, 6, nullptr, 0, nullptr, -2},
      {48, "abc123", true, 6, alnum, 0, nullptr, 0}, {48, "abc123", true, 0xFFFFFFFFu, alnum, 0, nullptr, -2},
      {48, "abc123", true, 0, nullptr, 0, nullptr, -3}, {48, "abc123", true, 0, "", 0, nullptr, -3},
      {48, "abc12!", true, 0, alnum, 0, nullptr, -3}, {48, "abc123", true, 0, "[:alnum:", 0, nullptr, -3},
      {36, "abcdef", true, 0, nullptr, 0, nullptr, -3}, {36, "123456", true, 0, nullptr, 0, nullptr, -3},
      {36, "!!!!!!", true, 0, nullptr, 0, nullptr, -3}, {36, "12!!34", true, 0, nullptr, 0, nullptr, 0},
      {36, "ab12", true, 0, nullptr, 0, nullptr, 0}, {36, "ab!", true, 0, alnum, 0, nullptr, 0},
      {36, "    ", true, 0, nullptr, 0, nullptr, 0}, {60, "aaaaaa", true, 0, alnum, 0, nullptr, -4},
      {60, "456789", true, 0, alnum, 0, nullptr, -4}, {60, "321098", true, 0, alnum, 0, nullptr, -4},
      {60, "xyzab", true, 0, alnum, 0, nullptr, -4}, {60, "FEDCBA", true, 0, alnum, 0, nullptr, -4},
      {60, "a", true, 0, alnum, 0, nullptr, -4}, {60, "aaaaaa", false, 0, alnum, 0, nullptr, 0},
      {60, "abd123", true, 0, alnum, 0, nullptr, 0}, {84, "123456", true, 0, alnum, 0, nullptr, -4},
      {4, "777777", true, 0, alnum, 0, nullptr, -4}, {4, "abcdef", true, 0, alnum, 0, nullptr, 0},
      {48, "123456", true, 0, alnum, 0, nullptr, 0}, {48, "qwerty", true, 0, alnum, 0, "123456,qwerty", -5},
      {48, "QWERTY", true, 0, alnum, 0, "123456,qwerty", 0},
      {48, "qwerty", false, 0, alnum, 0, "123456,qwerty", 0},
      {48, "qwert", true, 0, alnum, 0, "123456,qwerty", 0}, {60, "aaaaaa", true, 0, alnum, 0, "aaaaaa", -4},
      {48, "abcdef", true, 0, alnum, 1, "abcdef", -5}, {48, "abcdef", true, 6, alnum, 3, nullptr, -6},
      {48, "abc123", true, 6, alnum, 3, nullptr, 0}, {48, "123456", true, 0, alnum, 2, nullptr, -6},
      {48, "abc123", true, 0, alnum, 4, nullptr, -6}, {48, "abc!23", true, 0, ".+", 7, nullptr, 0},
      {48, "abc\tdef1", true, 0, ".+", 2, nullptr, -6}, {48, "abc123", true, 0, alnum, 8, nullptr, 0},
      {48, "abc123", false, 0, alnum, 4, nullptr, 0},
  };
  for (const Case& c : cases) {
    PasswordRule rule;
    rule.minLength = c.minLength;
    rule.acceptsPattern = c.accepts;
    rule.requiredClasses = c.classes;
    ASSERT_TRUE(parseDictionary(c.dictionary, &rule.dictionary));
    EXPECT_EQ(verifyPassword(c.ruleSet, c.text, c.full, rule), c.expected) << c.ruleSet << " " << c.text;
    releasePasswordRule(rule);
  }
}

namespace {

std::vector<std::string> parsed(const char* text) {
  char** list = nullptr;
  EXPECT_TRUE(parseDictionary(text, &list));
  std::vector<std::string> out{list == nullptr ? "<null>" : ""};
  for (char** e = list; e != nullptr && *e != nullptr; ++e) out.push_back(*e);
  freeDictionary(list);
  return out;
}

using Words = std::vector<std::string>;

}  // namespace

// One-byte entries survive only at the end; the list grows at a comma and at the last byte.
TEST(Dictionary, Parsing) {
  std::string many, ten = "e0,e1,e2,e3,e4,e5,e6,e7,e8,e9,z";
  Words manyWords{""}, tenWords{"", "e0", "e1", "e2", "e3", "e4", "e5", "e6", "e7", "e8", "e9", "z"};
  for (int i = 100; i < 125; ++i) manyWords.push_back("w" + std::to_string(i)), many += "w" + std::to_string(i) + ",";
  const struct { const char* text; Words expected; } cases[] = {  // "" first: no null list
      {"abc,x,def", {"", "abc", "def"}}, {"abc,x", {"", "abc", "x"}}, {"x", {"", "x"}}, {"x,", {""}},
      {"ab,", {"", "ab"}}, {",ab", {"", "ab"}}, {"a,,b", {"", "b"}}, {",,", {""}}, {",", {""}}, {"", {""}},
      {nullptr, {"<null>"}}, {"a b,c d", {"", "a b", "c d"}},  // spaces are part of entries
      {many.c_str(), manyWords}, {ten.c_str(), tenWords},
  };
  for (const auto& c : cases) EXPECT_EQ(parsed(c.text), c.expected) << (c.text ? c.text : "(null)");
}

// Session operations: rule set 48 for the degree, the rule built from the session's settings
// for verify, and the content sealed again unchanged after each.
TEST(StrengthSession, DegreeAndVerifyFromTheSettingsReseal) {
  test::ScopedKeyboard kb("strength-test", 100, 40, false, nullptr, 4092);
  KeyboardSession& s = kb.session();
  const auto type = [&](const std::string& text) {
    ContentGuard guard(*s.content);
    std::memset(guard.text(), 0, kContentBufferSize);
    std::memcpy(guard.text(), text.data(), text.size());
    s.content->length = static_cast<std::uint16_t>(text.size());
  };
  EXPECT_EQ(sessionDegree(s), 'E');
  EXPECT_EQ(sessionVerify(s), -1);
  for (const char* d : {"abc123M", "123456W", "ab1!cdS"}) {  // text, then the degree letter
    const std::string text(d, 6);
    type(text);
    const std::string sealed = kb.restingBuffer();
    ASSERT_EQ(sealed.find(text), std::string::npos);
    EXPECT_EQ(sessionDegree(s), d[6]) << text;
    EXPECT_EQ(kb.restingBuffer(), sealed) << "content must be sealed again, unchanged";
  }
  type("abcdef");
  EXPECT_EQ(sessionVerify(s), -3) << "no accepts pattern set";
  ASSERT_TRUE(replaceOwnedText(s.accepts, "[:alnum:]+"));
  s.minLength = 6;
  s.content->contentType = 3;
  const std::string sealed = kb.restingBuffer();
  EXPECT_EQ(sessionVerify(s), -6);
  EXPECT_EQ(kb.restingBuffer(), sealed);
  EXPECT_EQ(kb.text(), "abcdef");
  type("abc123");
  EXPECT_EQ(sessionVerify(s), 0);
  ASSERT_TRUE(replaceOwnedText(s.content->dictionaryFilter, "x,abc123"));
  EXPECT_EQ(sessionVerify(s), -5);
  s.minLength = 7;
  EXPECT_EQ(sessionVerify(s), -2);
  releaseOwnedText(s.content->dictionaryFilter);  // the session's release deliberately keeps it
}
