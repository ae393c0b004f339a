// Strength ratings, rule verification, dictionary parsing and the session operations, from the
// documented rules; rule sets are told apart by probe texts rated differently by each rating.
#include <gtest/gtest.h>

#include <cstring>
#include <map>
#include <string>
#include <thread>
#include <vector>

#include "pattern/pattern_engine.h"
#include "pattern/strength.h"
#include "session/sealed_text.h"
#include "session/session.h"
#include "session/settings.h"
#include "support/keyboard_typist.h"

using namespace tessel;

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

// Which rating each rule set uses, ten per row: General, Numeric, strict (X), Letters, Default.
TEST(StrengthDispatch, EveryRuleSetUsesItsRating) {
  const std::string ratings = "DGGGNGLGGG GGGDNDGNGN NDDGGNGGGG GNGGXNGGGG GGGGGGGNNG "
                              "GGGGGGDNGG GGGGGDGGGD GGGGGGDDDD GGGDNGGGDG G";
  const std::map<char, std::string> signatures = {
      {'G', kGeneral}, {'N', kNumeric}, {'X', kStrict}, {'L', kLetters}, {'D', kDefault}};
  std::uint32_t ruleSet = 0;
  for (char rating : ratings) {
    if (rating == ' ') continue;
    EXPECT_EQ(signature(ruleSet), signatures.at(rating)) << "rule set " << ruleSet;
    ++ruleSet;
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
      // runs go by byte value, wrap within digits and each case, never start at punctuation
      {1, "XYZAB1!q", 'M'}, {1, "BAZYX1!q", 'M'}, {1, "6789:;!q", 'M'}, {1, "!\"#$%1!q", 'S'},
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

// Reason codes in their order: empty, short (unsigned), pattern (none, empty, malformed, rule
// set 36's class mix), trivial (60, 84, 4; only with fullCheck), dictionary (exact, case-
// sensitive), required classes (a tab spoils every class; other bits ignored).
TEST(Verify, ReasonCodesInOrder) {
  const char* const alnum = "[:alnum:]+";
  const char* const words = "123456,qwerty";
  struct Case {  // the columns after the expected code default to the common case
    std::uint32_t ruleSet;
    const char* text;
    int expected;
    const char* accepts = "[:alnum:]+";
    bool full = true;
    std::uint32_t minLength = 0;
    std::uint32_t classes = 0;
    const char* dictionary = nullptr;
  } cases[] = {
      {48, "", -1}, {48, "abc12", -2, nullptr, true, 6}, {48, "abc123", 0, alnum, true, 6},
      {48, "abc123", -2, alnum, true, 0xFFFFFFFFu}, {48, "abc123", -3, nullptr}, {48, "abc123", -3, ""},
      {48, "abc12!", -3}, {48, "abc123", -3, "[:alnum:"}, {36, "abcdef", -3, nullptr},
      {36, "123456", -3, nullptr}, {36, "!!!!!!", -3, nullptr}, {36, "12!!34", 0, nullptr},
      {36, "ab12", 0, nullptr}, {36, "ab!", 0}, {36, "    ", 0, nullptr}, {60, "aaaaaa", -4},
      {60, "456789", -4}, {60, "321098", -4}, {60, "xyzab", -4}, {60, "FEDCBA", -4}, {60, "a", -4},
      {60, "aaaaaa", 0, alnum, false}, {60, "abd123", 0}, {84, "123456", -4}, {4, "777777", -4},
      {4, "abcdef", 0}, {48, "123456", 0}, {48, "qwerty", -5, alnum, true, 0, 0, words},
      {48, "QWERTY", 0, alnum, true, 0, 0, words}, {48, "qwerty", 0, alnum, false, 0, 0, words},
      {48, "qwert", 0, alnum, true, 0, 0, words}, {60, "aaaaaa", -4, alnum, true, 0, 0, "aaaaaa"},
      {48, "abcdef", -5, alnum, true, 0, 1, "abcdef"}, {48, "abcdef", -6, alnum, true, 6, 3},
      {48, "abc123", 0, alnum, true, 6, 3}, {48, "123456", -6, alnum, true, 0, 2},
      {48, "abc123", -6, alnum, true, 0, 4}, {48, "abc!23", 0, ".+", true, 0, 7},
      {48, "abc\tdef1", -6, ".+", true, 0, 2}, {48, "abc123", 0, alnum, true, 0, 8},
      {48, "abc123", 0, alnum, false, 0, 4},
  };
  for (const Case& c : cases) {
    PasswordRule rule;
    rule.minLength = c.minLength;
    const PatternEngine accepts(c.accepts);  // a null pattern never matches, like no pattern
    rule.accepts = &accepts;
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
  type("Password");  // 'W' under rule set 48, 'S' under the general and default ratings
  const std::string sealed = kb.restingBuffer();
  ASSERT_EQ(sealed.find("Password"), std::string::npos);
  EXPECT_EQ(sessionDegree(s), 'W');
  EXPECT_EQ(kb.restingBuffer(), sealed) << "content must be sealed again, unchanged";
  type("abcdef");
  EXPECT_EQ(sessionVerify(s), -3) << "no accepts pattern set";
  setAccepts(s, "[:alnum:]+");
  s.minLength = 6;
  s.content->contentType = 3;
  const std::string sealedAgain = kb.restingBuffer();
  EXPECT_EQ(sessionVerify(s), -6);
  EXPECT_EQ(kb.restingBuffer(), sealedAgain);
  type("abc123");
  EXPECT_EQ(sessionVerify(s), 0);
  ASSERT_TRUE(replaceOwnedText(s.content->dictionaryFilter, "x,abc123"));
  EXPECT_EQ(sessionVerify(s), -5);
  s.minLength = 7;
  EXPECT_EQ(sessionVerify(s), -2);
  releaseOwnedText(s.content->dictionaryFilter);  // the session's release deliberately keeps it
}
