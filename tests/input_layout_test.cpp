// Key layout building, shuffling, masking, rebuild rules and surface geometry.
//
// The expected layout texts are written out here independently of the library's own tables.
// glibc's lrand48/srand48 serve as the oracle for the generator draws and the reseeding.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <ctime>
#include <string>

#include "input/layout.h"
#include "input/rand48.h"
#include "session/session.h"

namespace tessel {
namespace {

const char* const kLetters[3] = {"qwertyuiop", "asdfghjkl", "zxcvbnm"};
const char* const kLower[3] = {"1234567890", "`~!@#$%^&", "*()-_=+"};
const char* const kUpper[3] = {"1234567890", "{}[]\\|:;'", "\",.<>/?"};
constexpr int kRowStart[3] = {0, 10, 19};
constexpr int kRowLength[3] = {10, 9, 7};

class LayoutTest : public ::testing::Test {
 protected:
  void SetUp() override {
    handle_ = createSession(::testing::UnitTest::GetInstance()->current_test_info()->name());
    ASSERT_GE(handle_, 0);
    s_ = sessionAt(handle_);
  }
  void TearDown() override { destroySession(handle_); }

  std::string row(const RelaxedField<std::uint8_t>* table, int r) const {
    std::string out;
    for (int i = 0; i < kRowLength[r]; ++i) out += static_cast<char>(static_cast<std::uint8_t>(table[kRowStart[r] + i] + s_->keyMask));
    return out;
  }
  std::string pad() const {
    std::string out;
    for (auto& b : s_->padDigits) out += static_cast<char>(static_cast<std::uint8_t>(b + s_->keyMask));
    return out;
  }
  std::string snapshot() const {
    std::string out;
    for (auto& b : s_->letters) out += static_cast<char>(b.load());
    for (auto& b : s_->symbolsLower) out += static_cast<char>(b.load());
    for (auto& b : s_->symbolsUpper) out += static_cast<char>(b.load());
    for (auto& b : s_->padDigits) out += static_cast<char>(b.load());
    return out;
  }

  int handle_ = -1;
  KeyboardSession* s_ = nullptr;
};

// The stored bytes are the characters minus the mask: unmasked they read as the standard layout.
TEST_F(LayoutTest, UnshuffledTablesReadAsTheStandardLayout) {
  s_->kbdPage = 1;
  s_->keyReleased[4] = 0;
  const std::string standard = std::string(kLetters[0]) + kLetters[1] + kLetters[2] + kLower[0] + kLower[1] +
                               kLower[2] + kUpper[0] + kUpper[1] + kUpper[2] + "1234567890";
  for (int mask : {0, 31}) {
    SCOPED_TRACE("mask " + std::to_string(mask));
    s_->keyMask = static_cast<std::uint8_t>(mask);
    s_->layoutBuilt = 0;
    buildLayout(*s_);
    std::string unmasked;
    for (int r = 0; r < 3; ++r) unmasked += row(s_->letters, r);
    for (int r = 0; r < 3; ++r) unmasked += row(s_->symbolsLower, r);
    for (int r = 0; r < 3; ++r) unmasked += row(s_->symbolsUpper, r);
    EXPECT_EQ(unmasked + pad(), standard);
  }
  EXPECT_EQ(s_->symbolPage, 1u);
  EXPECT_EQ(s_->keyReleased[4], 1u);
}

// The draws are n transpositions per row, a before b, rows in a fixed order; glibc's lrand48
// replays them here.
TEST_F(LayoutTest, ShuffleDrawsFollowTheGeneratorInRowOrder) {
  s_->kbdRandom = 1;
  ::srand48(4242);
  buildLayout(*s_);
  ::srand48(4242);
  auto shuffled = [](std::string keys) {
    const long n = static_cast<long>(keys.size());
    for (long i = 0; i < n; ++i) {
      const long a = ::lrand48() % n;
      const long b = ::lrand48() % n;
      std::swap(keys[a], keys[b]);
    }
    return keys;
  };
  std::string letters[3], lower[3], upper[3];
  for (int r = 0; r < 3; ++r) letters[r] = shuffled(kLetters[r]);
  for (int r = 0; r < 3; ++r) lower[r] = shuffled(kLower[r]);
  const std::string padDigits = shuffled("1234567890");
  for (int r = 1; r < 3; ++r) upper[r] = shuffled(kUpper[r]);
  for (int r = 0; r < 3; ++r) {
    EXPECT_EQ(row(s_->letters, r), letters[r]);
    EXPECT_EQ(row(s_->symbolsLower, r), lower[r]);
  }
  EXPECT_EQ(row(s_->symbolsUpper, 0), lower[0]);
  EXPECT_EQ(row(s_->symbolsUpper, 1), upper[1]);
  EXPECT_EQ(row(s_->symbolsUpper, 2), upper[2]);
  EXPECT_EQ(pad(), padDigits);
}

TEST_F(LayoutTest, GeneratorIsReseededWithTheTimeAfterTheBuild) {
  const long before = static_cast<long>(std::time(nullptr));
  buildLayout(*s_);
  const long next = rand48Next();
  const long after = static_cast<long>(std::time(nullptr));
  bool matched = false;
  for (long t = before; t <= after; ++t) {
    ::srand48(t);
    matched = matched || ::lrand48() == next;
  }
  EXPECT_TRUE(matched);
}

TEST_F(LayoutTest, RebuildsOnlyAfterLayoutBuiltIsCleared) {
  s_->kbdRandom = 1;
  buildLayout(*s_);
  const std::string first = snapshot();
  s_->kbdPage = 1;
  s_->keyMask = static_cast<std::uint8_t>((s_->keyMask + 1) & 31);
  buildLayout(*s_);  // a second surface creation
  EXPECT_EQ(snapshot(), first);
  EXPECT_EQ(s_->symbolPage, 0u);
  s_->layoutBuilt = 0;
  buildLayout(*s_);
  EXPECT_NE(snapshot(), first);
  EXPECT_EQ(s_->symbolPage, 1u);
}

// Variant 0 forces four rows, 1 keeps the row count, 2 picks 1 after keys of exactly 0.6 width to
// height (600 x 400 on four rows: 60 x 100), else 0 with four rows; unknown variants act as 2.
const struct {
  const char* name;
  int previousWidth, rowsBefore, width, height, variant;
  std::uint32_t surfaceMode;
  float keyWidth, keyHeight;
} kGeometryCases[] = {
    {"variant0", 0, 3, 1000, 400, 0, 0, 100, 100},
    {"variant1KeepsRows", 0, 3, 1000, 300, 1, 1, 100, 100},
    {"variant2AfterSixTenths", 600, 5, 800, 400, 2, 1, 80, 80},
    {"variant2Otherwise", 1000, 3, 800, 400, 2, 0, 80, 100},
    {"bigVariant", 601, 3, 800, 400, 7, 0, 80, 100},
};

TEST_F(LayoutTest, SurfaceGeometryVariants) {
  buildLayout(*s_);
  for (const auto& c : kGeometryCases) {
    SCOPED_TRACE(c.name);
    s_->rowCount = 4;
    s_->keyWidth = s_->keyHeight = 0;
    if (c.previousWidth != 0) applySurfaceGeometry(*s_, c.previousWidth, 400, 0);
    s_->rowCount = c.rowsBefore;
    applySurfaceGeometry(*s_, c.width, c.height, c.variant);
    EXPECT_EQ(s_->surfaceMode, c.surfaceMode);
    EXPECT_EQ(s_->keyWidth, c.keyWidth);
    EXPECT_EQ(s_->keyHeight, c.keyHeight);
  }
}

// A surface change before any build sees columnCount 0: no trap, and the keys are unusable.
TEST_F(LayoutTest, GeometryWithoutALayoutDoesNotTrap) {
  applySurfaceGeometry(*s_, 100, 100, 0);
  EXPECT_TRUE(std::isinf(s_->keyWidth.load()));
  EXPECT_FLOAT_EQ(s_->keyHeight, 25.0f);
}

}  // namespace
}  // namespace tessel
