// Replays the inputs the fuzz targets once broke on (tests/data/fuzz_regressions, listed with
// their history in the README there), with the checks of the target that found them, so the
// fault cannot come back between fuzzing runs. Each file name starts with its target's name.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "pattern/match.h"
#include "pattern/pattern_engine.h"
#include "pattern/strength.h"

using namespace tessel;

namespace {

const std::string kDir = std::string(TESSEL_TEST_DATA_DIR) + "/fuzz_regressions";

std::vector<std::string> inputsOf(const std::string& target) {
  std::vector<std::string> files;
  for (const auto& entry : std::filesystem::directory_iterator(kDir)) {
    const std::string name = entry.path().filename().string();
    if (name.rfind(target + "-", 0) == 0) files.push_back(entry.path().string());
  }
  std::sort(files.begin(), files.end());
  return files;
}

std::string readFile(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  return std::string(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
}

// pattern_fuzzer layout: flags, rule set, pattern length, pattern, text.
struct PatternInput {
  std::uint32_t flags = 0;
  std::uint32_t ruleSet = 0;
  std::string pattern, text;
};

PatternInput decodePatternInput(const std::string& data) {
  PatternInput in;
  if (data.size() < 3) return in;
  const auto* d = reinterpret_cast<const std::uint8_t*>(data.data());
  in.flags = ((d[0] & 1) ? PatternEngine::kExtended : 0) | ((d[0] & 2) ? PatternEngine::kRightToLeft : 0);
  in.ruleSet = d[1];
  const std::size_t n = std::min<std::size_t>(d[2], data.size() - 3);
  in.pattern = data.substr(3, n);
  in.text = data.substr(3 + n);
  return in;
}

TEST(FuzzRegression, EveryFileBelongsToAKnownTarget) {
  std::size_t known = 0, all = 0;
  for (const auto& entry : std::filesystem::directory_iterator(kDir)) {
    const std::string name = entry.path().filename().string();
    if (name == "README.md") continue;
    ++all;
    if (name.rfind("pattern-", 0) == 0) ++known;
  }
  EXPECT_EQ(known, all) << "a regression input without a replay in this file";
  EXPECT_GE(all, 1u);
}

// The match never runs past its budget (stepsUsed() <= stepBudget + 1), a match that runs out
// reports no match, matchExact and matches agree, and the result has its documented shape.
TEST(FuzzRegression, PatternInputsKeepTheStepBudget) {
  for (const std::string& path : inputsOf("pattern")) {
    SCOPED_TRACE(path);
    const PatternInput in = decodePatternInput(readFile(path));
    const auto* text = reinterpret_cast<const std::uint8_t*>(in.text.data());
    const PatternEngine engine(in.pattern.data(), in.pattern.size(), in.flags);
    for (const std::int64_t budget : {std::int64_t{1000}, std::int64_t{100000}, kDefaultPatternStepBudget}) {
      SCOPED_TRACE(budget);
      MatchContext context;
      context.stepBudget = budget;
      const MatchResult result = engine.matchExact(text, in.text.size(), &context);
      EXPECT_LE(context.stepsUsed(), budget + 1);
      if (context.stepsUsed() > budget) {
        EXPECT_TRUE(result.empty());
      }
      if (!result.empty()) {
        ASSERT_EQ(result.size(), 2 + 2 * static_cast<std::size_t>(result[1] + 1));
        EXPECT_EQ(result[0], 1);
        EXPECT_EQ(result[2], 0);
        EXPECT_EQ(result[3], static_cast<std::int32_t>(in.text.size()));
      }
      MatchContext second;
      second.stepBudget = budget;
      EXPECT_EQ(engine.matches(text, in.text.size(), &second), !result.empty());
    }
    const char letter = rateStrength(in.ruleSet, std::string(in.text.c_str()).c_str());
    EXPECT_TRUE(letter != 0 && std::strchr("EWMSTR", letter) != nullptr) << letter;
  }
}

}  // namespace
