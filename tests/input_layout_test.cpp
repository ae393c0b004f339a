// Key layout building, masking, reseeding and surface geometry. The expected layout texts are
// written out here independently of the library's own tables; glibc's lrand48/srand48 serve as
// the oracle for the reseeding. (Rebuild rules: input_touch_test; shuffles: typing and random.)
#include <gtest/gtest.h>

#include <cmath>
#include <cstdlib>
#include <ctime>
#include <string>

#include "input/layout.h"
#include "crypto/rand48.h"
#include "session/session.h"
#include "support/keyboard_typist.h"

namespace tessel {
namespace {

class LayoutTest : public ::testing::Test {
 protected:
  void SetUp() override {
    handle_ = createSession(::testing::UnitTest::GetInstance()->current_test_info()->name());
    ASSERT_GE(handle_, 0);
    s_ = sessionAt(handle_);
  }
  void TearDown() override { destroySession(handle_); }

  int handle_ = -1;
  KeyboardSession* s_ = nullptr;
};

std::string allKeys(const test::KeyMap& m) { return m.letters + m.symbolsLower + m.symbolsUpper + m.padDigits; }

// The stored bytes are the characters minus the mask: unmasked they read as the standard layout.
TEST_F(LayoutTest, UnshuffledTablesReadAsTheStandardLayout) {
  s_->kbdPage = 1;
  s_->keyReleased[4] = 0;
  for (int mask : {0, 31}) {
    s_->keyMask = static_cast<std::uint8_t>(mask);
    s_->layoutBuilt = 0;
    buildLayout(*s_);
    EXPECT_EQ(allKeys(test::KeyMap::fromSession(*s_)), allKeys(test::KeyMap::standard())) << "mask " << mask;
  }
  EXPECT_EQ(s_->symbolPage, 1u);
  EXPECT_EQ(s_->keyReleased[4], 1u);
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
