// Strength ratings, rule verification, dictionary parsing and the session operations.
// Expected values come from the library's documented rating rules; the rule-set table is
// checked against the published lists of rule sets per rating, through probe texts whose
// letters differ between every pair of ratings.
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

namespace {

const std::uint8_t* bytes(const std::string& s) { return reinterpret_cast<const std::uint8_t*>(s.data()); }

}  // namespace

// First in the file so that it races the very first use of the once-compiled predicates.
TEST(StrengthPredicates, FirstUseFromManyThreads) {
  std::vector<std::thread> threads;
  std::vector<char> letters(8, 0);
  for (int i = 0; i < 8; ++i)
    threads.emplace_back([&letters, i] { letters[static_cast<std::size_t>(i)] = rateStrength(48, "ab1!cd"); });
  for (auto& t : threads) t.join();
  for (char c : letters) EXPECT_EQ(c, 'S');
}

// ---- the rule-set table

namespace {

// Letters each rating gives for the probe texts, in order: "", "12345", "abcdef", "k3Hq9!",
// "Password", "abc123".
const char* const kProbes[] = {"", "12345", "abcdef", "k3Hq9!", "Password", "abc123"};
const std::string kGeneral = "EWWSSM";
const std::string kNumeric = "EWWSWM";
const std::string kStrict = "ETWSWM";
const std::string kLetters = "WWWWSW";
const std::string kDefault = "WWMSSS";

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

// ---- ratings

// Ratings at their boundaries: 5/6 bytes, runs against the ceiling (general) or floor
// (strict) of half the length, frequency against 2n/3 (numeric); plus examples of each rating
// that the probe texts above do not reach.
TEST(StrengthRatings, BoundariesAndExamples) {
  struct Case {
    std::uint32_t ruleSet;
    const char* text;
    char expected;
    const char* why;
  } cases[] = {
      {1, "k3Hq9", 'W', "general: 5 bytes or fewer are weak"},
      {1, "k3Hq9!", 'S', "general: 6 bytes are rated"},
      {48, "k3Hq9", 'W', "numeric: 5 bytes"},
      {34, "k3Hq9", 'T', "strict: 5 bytes are trivial"},
      {1, "abcq9!", 'M', "general, n=6: ascending run 3 reaches ceil(6/2)=3"},
      {1, "abXq9!", 'S', "general, n=6: longest run 2 < 3"},
      {1, "abcXq9!", 'S', "general, n=7: run 3 < ceil(7/2)=4"},
      {1, "abcdq9!", 'M', "general, n=7: run 4 reaches the ceiling"},
      {1, "aaaXq9!", 'S', "general, n=7: repeat run 3 < 4"},
      {1, "aaaaq9!", 'M', "general, n=7: repeat run 4"},
      {1, "dcbaq9!", 'M', "general, n=7: descending run 4"},
      {1, "kqhzmwa", 'M', "general: single class without runs is medium"},
      {1, "abcdkqh", 'W', "general: single class with a long run is weak"},
      {34, "5670919", 'R', "strict, n=7: ascending run 3 reaches floor(7/2)=3"},
      {34, "5690817", 'W', "strict, n=7: runs of 2, each digit at most once"},
      {34, "5095059", 'R', "strict, n=7: a digit three times reaches the floor"},
      {34, "50950871", 'W', "strict, n=8: no digit 4 times, runs of 2"},
      {34, "9876", 'T', "strict: short"},
      {34, "098765", 'T', "strict: descending with the 0-9 wrap"},
      {48, "aaaa123", 'W', "numeric, n=7: frequency 4 reaches 14/3=4"},
      {48, "aaa1234", 'M', "numeric, n=7: frequency 3 < 4"},
      {48, "aaaaa123", 'W', "numeric, n=8: frequency 5 reaches 16/3=5"},
      {48, "aaaa1234", 'M', "numeric, n=8: frequency 4 < 5"},
      {48, "!!!!12", 'W', "numeric: digits and punctuation, frequency 4 = 12/3"},
      {48, "ab!!cd", 'M', "numeric: letters and punctuation"},
      {48, "!@#$%^", 'W', "numeric: punctuation only"},
      {48, "ab 123", 'S', "numeric: a space is outside the two-class checks"},
      {48, "abc\t12", 'S', "numeric: so is a tab"},
      {6, "Passwor", 'W', "letters-required: 7 bytes"},
      {6, "12345678", 'W', "letters-required: digits only"},
      {6, "PASSWORD", 'M', "letters-required: upper case only"},
      {6, "zyxwvuts", 'W', "letters-required: descending letters"},
      {6, "yzabcdef", 'W', "letters-required: ascending with the z-a wrap"},
      {6, "aaaaaaaa", 'W', "letters-required: one letter repeated"},
      {0, "abcde", 'W', "default: five bytes of anything"},
      {0, "ABCDEF", 'M', "default: six upper-case letters"},
      {0, "abcdef1", 'S', "default: letters and a digit"},
      {0, "abcDEF", 'S', "default: both letter cases"},
      {0, "12345678901", 'W', "default: digits only"},
      {48, "aaaa12", 'W', "numeric: frequency 4 = 12/3"},
      {48, "123456", 'W', "numeric: digits only"},
      {34, "111111", 'T', "strict: one digit"},
      {34, "123456", 'T', "strict: ascending"},
      {34, "901234", 'T', "strict: ascending with the 9-0 wrap"},
      {34, "654321", 'T', "strict: descending"},
      {34, "112233", 'W', "strict: pairs"},
      {34, "121314", 'R', "strict: a digit three times in six"},
      {1, "abcdefgh", 'W', "general: one long run"},
      {1, "kqhzmw", 'M', "general: letters alone"},
      {6, "password", 'M', "letters-required: lower case only"},
      {6, "pass1234", 'S', "letters-required: letters and digits"},
  };
  for (const Case& c : cases) EXPECT_EQ(rateStrength(c.ruleSet, c.text), c.expected) << c.why;
  EXPECT_EQ(rateStrength(48, nullptr), 'E');
}

// ---- measures and predicates

TEST(StrengthMeasures, Table) {
  struct Case {
    std::string text;
    std::size_t maxFreq, repeat, ascending, descending;
    bool same, ascDigit, descDigit, ascLetter, descLetter;
  } cases[] = {
      {"", 0, 0, 0, 0, true, true, true, true, true},
      {"a", 1, 1, 1, 1, true, true, true, true, true},
      {"abc", 1, 1, 3, 1, false, true, false, true, false},     // byte values only
      {"89:", 1, 1, 2, 1, false, false, false, true, false},    // ':' follows '9' by value
      {"890", 1, 1, 3, 1, false, true, false, false, false},
      {"yzab", 1, 1, 4, 1, false, false, false, true, false},
      {"YZAB", 1, 1, 4, 1, false, false, false, true, false},
      {"10987", 1, 1, 1, 5, false, false, true, false, false},
      {"baZY", 1, 1, 1, 2, false, false, false, false, false},
      {"BAZY", 1, 1, 1, 4, false, false, false, false, true},
      {"aabbbc", 3, 3, 2, 1, false, false, false, false, false},
      {"!\"#$", 1, 1, 1, 1, false, true, false, true, false},  // no run starts at punctuation
      {"121314", 3, 1, 2, 2, false, false, false, false, false},
      {"a\x80\x81", 1, 1, 1, 1, false, false, false, false, false},
  };
  for (const Case& c : cases) {
    const std::uint8_t* t = bytes(c.text);
    const std::size_t n = c.text.size();
    EXPECT_EQ(maxCharFrequency(t, n), c.maxFreq) << c.text;
    EXPECT_EQ(longestRepeatRun(t, n), c.repeat) << c.text;
    EXPECT_EQ(longestAscendingRun(t, n), c.ascending) << c.text;
    EXPECT_EQ(longestDescendingRun(t, n), c.descending) << c.text;
    EXPECT_EQ(isAllSameChar(t, n), c.same) << c.text;
    EXPECT_EQ(isAscendingDigitRun(t, n), c.ascDigit) << c.text;
    EXPECT_EQ(isDescendingDigitRun(t, n), c.descDigit) << c.text;
    EXPECT_EQ(isAscendingLetterRun(t, n), c.ascLetter) << c.text;
    EXPECT_EQ(isDescendingLetterRun(t, n), c.descLetter) << c.text;
  }
}

TEST(StrengthPredicates, Table) {
  using P = ClassPredicate;
  // Columns: AllDigits ContainsDigit AllLetters ContainsLetter AllLower AllUpper AllPunct
  // ContainsPunct AllAlnum DigitsPunct LettersPunct.
  struct Case {
    std::string text;
    const char* expected;
  } cases[] = {
      {"", "00000000000"},
      {"123", "11000000110"},
      {"abc", "00111000101"},
      {"ABC", "00110100101"},
      {"aB", "00110000101"},
      {"!?", "00000011011"},
      {"a1", "01010000100"},
      {"a 1", "01010000000"},     // space: printable, in no other class
      {"a\t1", "00000000000"},    // tab: not printable
      {"a1\x80", "00000000000"},  // high byte: no class at all
      {"a!", "00010001001"},
      {"1!", "01000001010"},
      {"a1!", "01010001000"},
  };
  for (const Case& c : cases) {
    for (int p = 0; p < kClassPredicateCount; ++p) {
      const bool want = c.expected[p] == '1';
      EXPECT_EQ(classPredicate(static_cast<P>(p), bytes(c.text), c.text.size()), want)
          << classPredicatePattern(static_cast<P>(p)) << " on '" << c.text << "'";
    }
  }
}

// ---- verification

TEST(Verify, ReasonCodesInOrder) {
  const char* const alnum = "[:alnum:]+";
  struct Case {
    std::uint32_t ruleSet;
    const char* text;
    bool full;
    std::uint32_t minLength;
    const char* accepts;
    std::uint32_t classes;
    const char* dictionary;
    int expected;
    const char* why;
  } cases[] = {
      {48, "", true, 0, alnum, 0, nullptr, -1, "empty even with minLength 0"},
      {48, "abc12", true, 6, nullptr, 0, nullptr, -2, "too short is found before the pattern"},
      {48, "abc123", true, 6, alnum, 0, nullptr, 0, "exactly minLength"},
      {48, "abc123", true, 0xFFFFFFFFu, alnum, 0, nullptr, -2, "minLength compared unsigned"},
      {48, "abc123", true, 0, nullptr, 0, nullptr, -3, "no accepted pattern"},
      {48, "abc123", true, 0, "", 0, nullptr, -3, "empty accepted pattern"},
      {48, "abc12!", true, 0, alnum, 0, nullptr, -3, "pattern mismatch"},
      {48, "abc123", true, 0, "[:alnum:", 0, nullptr, -3, "malformed pattern never matches"},
      {36, "abcdef", true, 0, nullptr, 0, nullptr, -3, "36: letters alone"},
      {36, "123456", true, 0, nullptr, 0, nullptr, -3, "36: digits alone"},
      {36, "!!!!!!", true, 0, nullptr, 0, nullptr, -3, "36: punctuation alone"},
      {36, "12!!34", true, 0, nullptr, 0, nullptr, 0, "36: digits and punctuation"},
      {36, "ab12", true, 0, nullptr, 0, nullptr, 0, "36: letters and digits"},
      {36, "ab!", true, 0, alnum, 0, nullptr, 0, "36: ignores the accepted pattern"},
      {36, "    ", true, 0, nullptr, 0, nullptr, 0, "36: no class at all passes"},
      {60, "aaaaaa", true, 0, alnum, 0, nullptr, -4, "60: one character"},
      {60, "456789", true, 0, alnum, 0, nullptr, -4, "60: ascending digits"},
      {60, "321098", true, 0, alnum, 0, nullptr, -4, "60: descending digits with wrap"},
      {60, "xyzab", true, 0, alnum, 0, nullptr, -4, "60: ascending letters with wrap"},
      {60, "FEDCBA", true, 0, alnum, 0, nullptr, -4, "60: descending letters"},
      {60, "a", true, 0, alnum, 0, nullptr, -4, "60: one byte is a trivial run"},
      {60, "aaaaaa", false, 0, alnum, 0, nullptr, 0, "60 without fullCheck stops after the pattern"},
      {60, "abd123", true, 0, alnum, 0, nullptr, 0, "60: not a sequence"},
      {84, "123456", true, 0, alnum, 0, nullptr, -4, "84: ascending digits"},
      {4, "777777", true, 0, alnum, 0, nullptr, -4, "4: one digit"},
      {4, "abcdef", true, 0, alnum, 0, nullptr, 0, "4: letters are not checked for runs"},
      {48, "123456", true, 0, alnum, 0, nullptr, 0, "48 has no trivial step"},
      {48, "qwerty", true, 0, alnum, 0, "123456,qwerty", -5, "dictionary entry"},
      {48, "QWERTY", true, 0, alnum, 0, "123456,qwerty", 0, "dictionary is case-sensitive"},
      {48, "qwerty", false, 0, alnum, 0, "123456,qwerty", 0, "dictionary only with fullCheck"},
      {48, "qwert", true, 0, alnum, 0, "123456,qwerty", 0, "no prefix matching"},
      {60, "aaaaaa", true, 0, alnum, 0, "aaaaaa", -4, "trivial comes before the dictionary"},
      {48, "abcdef", true, 0, alnum, 1, "abcdef", -5, "dictionary comes before the classes"},
      {48, "abcdef", true, 6, alnum, 3, nullptr, -6, "letter present, digit missing"},
      {48, "abc123", true, 6, alnum, 3, nullptr, 0, "both present"},
      {48, "123456", true, 0, alnum, 2, nullptr, -6, "letter missing"},
      {48, "abc123", true, 0, alnum, 4, nullptr, -6, "punctuation missing"},
      {48, "abc!23", true, 0, ".+", 7, nullptr, 0, "all three present"},
      {48, "abc\tdef1", true, 0, ".+", 2, nullptr, -6, "a tab spoils every class check"},
      {48, "abc123", true, 0, alnum, 8, nullptr, 0, "other bits are ignored"},
      {48, "abc123", false, 0, alnum, 4, nullptr, 0, "classes only with fullCheck"},
  };
  for (const Case& c : cases) {
    PasswordRule rule;
    rule.minLength = c.minLength;
    rule.acceptsPattern = c.accepts;
    rule.requiredClasses = c.classes;
    ASSERT_TRUE(parseDictionary(c.dictionary, &rule.dictionary));
    EXPECT_EQ(verifyPassword(c.ruleSet, c.text, c.full, rule), c.expected) << c.why;
    releasePasswordRule(rule);
  }
}

// ---- dictionary list

namespace {

std::vector<std::string> parsed(const char* text) {
  char** list = nullptr;
  EXPECT_TRUE(parseDictionary(text, &list));
  std::vector<std::string> out;
  if (list == nullptr) {
    out.push_back("<null>");
    return out;
  }
  for (char** e = list; *e != nullptr; ++e) out.push_back(*e);
  freeDictionary(list);
  return out;
}

using Words = std::vector<std::string>;

}  // namespace

// One-byte entries survive only at the end; the list grows past its initial ten entries (the
// 25-entry list, and ten entries filling the array before a final one-byte entry).
TEST(Dictionary, Parsing) {
  std::string many, ten;
  Words manyWords, tenWords;
  for (int i = 0; i < 25; ++i) {
    manyWords.push_back("w" + std::to_string(100 + i));
    many += (i ? "," : "") + manyWords.back();
  }
  for (int i = 0; i < 10; ++i) {
    tenWords.push_back("e" + std::to_string(i));
    ten += tenWords.back() + ",";
  }
  ten += "z";
  tenWords.push_back("z");
  const struct {
    const char* text;
    Words expected;
  } cases[] = {
      {"abc,x,def", {"abc", "def"}}, {"abc,x", {"abc", "x"}}, {"x", {"x"}},    {"x,", {}},
      {"ab,", {"ab"}},               {",ab", {"ab"}},         {"a,,b", {"b"}}, {",,", {}},
      {",", {}},                     {"", {}},                {nullptr, {"<null>"}},
      {"a b,c d", {"a b", "c d"}},  // spaces are part of entries
      {many.c_str(), manyWords},     {ten.c_str(), tenWords},
  };
  for (const auto& c : cases) EXPECT_EQ(parsed(c.text), c.expected) << (c.text ? c.text : "(null)");
}

// ---- session operations: rule set 48 for the degree, the rule built from the session's
// settings for verify, and the content sealed again unchanged after each.

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
  const struct {
    const char* text;
    char degree;
  } degrees[] = {{"abc123", 'M'}, {"123456", 'W'}, {"ab1!cd", 'S'}};
  for (const auto& d : degrees) {
    type(d.text);
    const std::string sealed = kb.restingBuffer();
    ASSERT_EQ(sealed.find(d.text), std::string::npos);
    EXPECT_EQ(sessionDegree(s), d.degree) << d.text;
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
