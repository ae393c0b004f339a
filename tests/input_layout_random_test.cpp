// Randomness of shuffled layouts and session masks. A build with TESSEL_STRONG_LAYOUT_RANDOM
// must shuffle each row uniformly, draw masks from 1..31 and give every process its own first
// layout; the default build keeps its clock-seeded stream, whose fixed first layout the README
// documents. The uniformity thresholds are chi-square critical values at p = 1e-6, fixed here.
#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <set>
#include <string>
#include <vector>

#include "input/layout.h"
#include "crypto/rand48.h"
#include "session/session.h"

namespace tessel {
namespace {

// Source rows: letters 0-2, symbolsLower 0-2, symbolsUpper 1-2, padDigits.
const char* const kRows[] = {"qwertyuiop", "asdfghjkl", "zxcvbnm", "1234567890", "`~!@#$%^&",
                             "*()-_=+", "{}[]\\|:;'", "\",.<>/?", "1234567890"};
constexpr double kChi2Rows81 = 156.45;  // 10 letters x 10 positions: 81 degrees of freedom
constexpr double kChi2Masks30 = 82.04;  // 31 mask values: 30 degrees of freedom

std::string unmask(const RelaxedField<std::uint8_t>* table, int start, int n, std::uint8_t mask) {
  std::string out;
  for (int i = 0; i < n; ++i) out += static_cast<char>(static_cast<std::uint8_t>(table[start + i] + mask));
  return out;
}

// The nine shuffled rows of a fresh build, unmasked, in kRows order, then symbolsUpper row 0.
std::vector<std::string> buildRows(KeyboardSession& s) {
  s.kbdRandom = 1;
  s.layoutBuilt = 0;
  buildLayout(s);
  const std::uint8_t m = s.keyMask;
  return {unmask(s.letters, 0, 10, m),      unmask(s.letters, 10, 9, m),      unmask(s.letters, 19, 7, m),
          unmask(s.symbolsLower, 0, 10, m), unmask(s.symbolsLower, 10, 9, m), unmask(s.symbolsLower, 19, 7, m),
          unmask(s.symbolsUpper, 10, 9, m), unmask(s.symbolsUpper, 19, 7, m), unmask(s.padDigits, 0, 10, m),
          unmask(s.symbolsUpper, 0, 10, m)};
}

TEST(LayoutRandomTest, RowsKeepTheirKeysAndBothSymbolPagesOneDigitOrder) {
  for (int i = 0; i < 300; ++i) {
    const int h = createSession(("invariants" + std::to_string(i % 40)).c_str());
    KeyboardSession* s = sessionAt(h);
    const auto rows = buildRows(*s);
    for (int r = 0; r < 9; ++r) {
      std::string sorted = rows[r], expected = kRows[r];
      std::sort(sorted.begin(), sorted.end());
      std::sort(expected.begin(), expected.end());
      EXPECT_EQ(sorted, expected) << "row " << r << " reads " << rows[r];
    }
    EXPECT_EQ(rows[9], rows[3]);
    EXPECT_LE(s->keyMask, 31);
    if (kStrongLayoutRandom) {
      EXPECT_GE(s->keyMask, 1) << "a strong-random session stores its keys unmasked";
      for (int k = 0; k < 10; ++k) EXPECT_NE(static_cast<char>(s->letters[k].load()), rows[0][k]);
    }
    destroySession(h);
  }
  // A strong-random build neither draws from nor reseeds the lrand48 stream.
  const int h = createSession("stream");
  rand48Seed(77);
  buildRows(*sessionAt(h));
  const long next = rand48Next();
  ::srand48(77);
  if (kStrongLayoutRandom) {
    EXPECT_EQ(next, ::lrand48());
  }
  destroySession(h);
}

TEST(LayoutRandomTest, RowZeroAndTheMasksAreUniform) {
  constexpr int kBuilds = 20000, kMasks = 31000;
  const int h = createSession("uniformity");
  double counts[10][10] = {};
  for (int i = 0; i < kBuilds; ++i) {
    const std::string row = buildRows(*sessionAt(h))[0];
    for (int p = 0; p < 10; ++p) counts[std::string(kRows[0]).find(row[p])][p] += 1;
  }
  destroySession(h);
  double chi2Rows = 0, chi2Masks = 0, masks[32] = {};
  for (auto& letter : counts) {
    for (double c : letter) chi2Rows += (c - kBuilds / 10.0) * (c - kBuilds / 10.0) / (kBuilds / 10.0);
  }
  for (int i = 0; i < kMasks; ++i) masks[drawKeyMask()] += 1;
  for (int v = 1; v < 32; ++v) chi2Masks += (masks[v] - kMasks / 31.0) * (masks[v] - kMasks / 31.0) / (kMasks / 31.0);
  std::printf("row 0 over %d builds: chi-square %.1f (81 df, limit %.2f); masks over %d draws: chi-square %.1f "
              "(30 df, limit %.2f), %g zeros\n", kBuilds, chi2Rows, kChi2Rows81, kMasks, chi2Masks, kChi2Masks30, masks[0]);
  if (!kStrongLayoutRandom) GTEST_SKIP() << "the default build shuffles from the clock-seeded stream";
  EXPECT_LT(chi2Rows, kChi2Rows81);
  EXPECT_LT(chi2Masks, kChi2Masks30);
  EXPECT_EQ(masks[0], 0);
}

// Each child process prints the first layout it builds (mask and letter rows).
TEST(LayoutRandomTest, FirstLayoutOfAProcess) {
  if (std::getenv("TESSEL_FIRST_LAYOUT_CHILD") != nullptr) {
    const int h = createSession("first");
    const auto rows = buildRows(*sessionAt(h));
    std::printf("LAYOUT %d %s%s%s\n", sessionAt(h)->keyMask, rows[0].c_str(), rows[1].c_str(), rows[2].c_str());
    destroySession(h);
    return;
  }
  char self[4096] = {};
  ASSERT_GT(::readlink("/proc/self/exe", self, sizeof self - 1), 0);
  ::setenv("TESSEL_FIRST_LAYOUT_CHILD", "1", 1);
  std::set<std::string> layouts;
  for (int i = 0; i < 3; ++i) {
    FILE* child = ::popen(("'" + std::string(self) + "' --gtest_filter=LayoutRandomTest.FirstLayoutOfAProcess").c_str(), "r");
    ASSERT_NE(child, nullptr);
    char line[256];
    while (std::fgets(line, sizeof line, child) != nullptr) {
      if (std::string(line).rfind("LAYOUT ", 0) == 0) layouts.insert(line);
    }
    EXPECT_EQ(::pclose(child), 0);
  }
  ::unsetenv("TESSEL_FIRST_LAYOUT_CHILD");
  ASSERT_FALSE(layouts.empty());
  std::printf("first layouts: %s", layouts.begin()->c_str());
  EXPECT_EQ(layouts.size(), kStrongLayoutRandom ? 3u : 1u);
}

}  // namespace
}  // namespace tessel
