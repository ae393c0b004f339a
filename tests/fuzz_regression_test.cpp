// Replays the inputs the fuzz targets once broke on (tests/data/fuzz_regressions, listed with
// their history in the README there) through the checks of the target that found them. Each
// file name starts with its target's name; only pattern_fuzzer has found any so far.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>

#include "pattern/pattern_engine.h"
#include "pattern/strength.h"

using namespace tessel;

TEST(FuzzRegression, PatternInputsKeepTheResultContract) {
  int replayed = 0;
  for (const auto& entry : std::filesystem::directory_iterator(TESSEL_TEST_DATA_DIR "/fuzz_regressions")) {
    const std::string name = entry.path().filename().string();
    if (name == "README.md") continue;
    ASSERT_EQ(name.rfind("pattern-", 0), 0u) << name << ": an input without a replay here";
    SCOPED_TRACE(name);
    std::ifstream in(entry.path(), std::ios::binary);
    const std::string data((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
    ASSERT_GE(data.size(), 3u);  // pattern_fuzzer layout: flags, rule set, pattern length, pattern, text
    const auto* d = reinterpret_cast<const std::uint8_t*>(data.data());
    const std::size_t n = std::min<std::size_t>(d[2], data.size() - 3);
    const std::uint32_t flags = (d[0] & 1 ? PatternEngine::kExtended : 0) | (d[0] & 2 ? PatternEngine::kRightToLeft : 0);
    const std::string pattern = data.substr(3, n), text = data.substr(3 + n);
    const PatternEngine engine(pattern.data(), pattern.size(), flags);
    const MatchResult r = engine.matchExact(text.data(), text.size());
    if (!r.empty()) {
      ASSERT_EQ(r.size(), 2 + 2 * static_cast<std::size_t>(r[1] + 1));
      EXPECT_TRUE(r[0] == 1 && r[2] == 0 && r[3] == static_cast<std::int32_t>(text.size()));
    }
    EXPECT_EQ(engine.matches(reinterpret_cast<const std::uint8_t*>(text.data()), text.size()), !r.empty());
    const char letter = rateStrength(d[1], text.c_str());
    EXPECT_TRUE(letter != 0 && std::strchr("EWMSTR", letter) != nullptr) << letter;
    ++replayed;
  }
  EXPECT_GE(replayed, 1);
}
