// Artwork properties the renderer relies on, for the theme linked in. Which picture sits on which
// key is checked on the drawn surfaces (render_surface_test).
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <string>
#include <vector>

#include "render/image_table.h"
#include "render/sampled_fractions.h"

namespace tessel {
namespace {

using namespace images;

std::uint8_t alphaAt(const TextureImage& img, int x, int y) { return img.pixels[(static_cast<std::size_t>(y) * img.width + x) * 4 + 3]; }

// Key faces are sampled only in part (the texture-coordinate sets): the rest of each image must be
// transparent, the sampled part's centre opaque, and the held face must stand out at a glance.
TEST(Artwork, KeyFacesLiveWhereSampledAndHeldFacesStandOut) {
  struct Pair {
    const char* name;
    const TextureImage &released, &held;
    double s, t;  // sampled fraction of width and height
  } pairs[] = {{"char", kCharKeys[0], kCharKeys[1], render::kSquareWidth, render::kSampledHeight},
               {"shift/delete", kShiftDeleteKeys[0], kShiftDeleteKeys[1], render::kShiftWidth, render::kSampledHeight},
               {"switch", kSwitchKeys[0], kSwitchKeys[1], render::kBarWidth, render::kSampledHeight},
               {"done", kDoneKeys[0], kSwitchKeys[1], render::kBarWidth, render::kSampledHeight},
               {"space", kSpaceKeys[0], kSpaceKeys[1], 1.0, render::kSampledHeight}, {"pad", kPadKeys[0], kPadKeys[1], 1.0, 1.0},
               {"pad done", kPadDoneKeys[0], kPadDoneKeys[1], 1.0, 1.0}};
  for (const Pair& p : pairs) {
    SCOPED_TRACE(p.name);
    int luma[2];
    for (int k = 0; k < 2; ++k) {
      const TextureImage& img = k ? p.held : p.released;
      const int sw = static_cast<int>(p.s * img.width), sh = static_cast<int>(p.t * img.height);
      const std::uint8_t* c = img.pixels + (static_cast<std::size_t>(sh / 2) * img.width + sw / 2) * 4;
      luma[k] = (c[0] + c[1] + c[2]) / 3;
      EXPECT_TRUE(c[3] == 255 && alphaAt(img, 0, 0) == 0) << "opaque centre, rounded corner";
      int stray = 0;
      for (int y = 0; y < img.height; ++y)
        for (int x = 0; x < img.width; ++x) stray += (x >= sw || y >= sh) && alphaAt(img, x, y) != 0;
      EXPECT_EQ(stray, 0);
    }
    EXPECT_GT(std::abs(luma[0] - luma[1]), 40);
  }
}

// Ink rows of an image (alpha >= 128): first and last.
std::pair<int, int> inkRows(const TextureImage& img) {
  int top = img.height, bottom = -1;
  for (int y = 0; y < img.height; ++y)
    for (int x = 0; x < img.width; ++x)
      if (alphaAt(img, x, y) >= 128) top = std::min(top, y), bottom = std::max(bottom, y);
  return {top, bottom};
}

// Every glyph has ink, a margin (clamp-to-edge would smear an edge pixel), and strokes that survive
// a 2x nearest minification (surface mode 0): for 90% of the ink, the shorter of the horizontal
// and vertical runs through the texel is at least 4 (the rest are stroke ends and joins).
TEST(Artwork, GlyphsHaveInkMarginsAndThickStrokes) {
  for (const ImageGroup* g : {&kLetterGlyphs, &kShiftedLetterGlyphs, &kSymbolGlyphs, &kSymbolShiftGlyphs}) {
    for (int i = 0; i < g->count; ++i) {
      const TextureImage& img = (*g)[i];
      SCOPED_TRACE("glyph " + std::to_string(i));
      auto ink = [&](int x, int y) { return x >= 0 && y >= 0 && x < img.width && y < img.height && alphaAt(img, x, y) >= 128; };
      std::vector<int> widths;
      int edge = 0;
      for (int y = 0; y < img.height; ++y)
        for (int x = 0; x < img.width; ++x) {
          if (!ink(x, y)) continue;
          edge += x < 2 || y < 2 || x >= img.width - 2 || y >= img.height - 2;
          int l = x, r = x, t = y, b = y;
          while (ink(l - 1, y)) --l;
          while (ink(r + 1, y)) ++r;
          while (ink(x, t - 1)) --t;
          while (ink(x, b + 1)) ++b;
          widths.push_back(std::min(r - l + 1, b - t + 1));
        }
      ASSERT_GT(widths.size(), 40u);
      EXPECT_EQ(edge, 0);
      std::sort(widths.begin(), widths.end());
      EXPECT_GE(widths[widths.size() / 10], 4) << "thinnest strokes";
    }
  }
}

// One cap height for the capitals and one x-height for the short lower-case letters, however
// wide the letter (W and M are narrowed to fit, not shrunk); round letters overshoot by a texel.
TEST(Artwork, LettersShareOneHeight) {
  struct Group {
    const ImageGroup& g;
    std::string letters;
  } groups[] = {{kShiftedLetterGlyphs, "ABCDEFGHIKLMNOPRSTUVWXYZ"}, {kLetterGlyphs, "acemnorsuvwxz"}};
  for (const Group& grp : groups) {
    const auto ref = inkRows(grp.g[grp.letters[0] - (grp.letters[0] >= 'a' ? 'a' : 'A')]);
    for (char c : grp.letters) {
      const auto rows = inkRows(grp.g[c - (c >= 'a' ? 'a' : 'A')]);
      EXPECT_NEAR(rows.first, ref.first, 2) << c << ": top";
      EXPECT_NEAR(rows.second, ref.second, 2) << c << ": baseline";
    }
  }
}

// Function-key labels stand at one visual size: their ink height in screen pixels (texels times
// the scale each is drawn at on the 1080 x 720 keyboard in surface mode 1) within 20% of 30 px.
TEST(Artwork, LabelsStandAtOneVisualSize) {
  struct Label {
    const char* name;
    const TextureImage& img;
    double pxPerTexel;
  } labels[] = {{"ABC", kLabels[0], 0.9}, {"?123", kLabels[1], 0.9}, {"Done", kLabels[2], 1.01}, {"Done held", kLabels[3], 1.01},
                {"123", kLabels[4], 0.9}, {"Clear", kPadLabels[0], 0.95}, {"OK", kPadLabels[1], 0.95}, {"#+=", kIcons[3], 1.125}};
  for (const Label& l : labels) {
    const auto rows = inkRows(l.img);
    EXPECT_NEAR((rows.second - rows.first + 1) * l.pxPerTexel, 30, 6) << l.name;
  }
}

TEST(Artwork, PlainImagesAreOpaqueWhereDrawnWithoutBlending) {
  for (const std::uint8_t* p : {kBackgroundPixels, kFieldFramePixels})
    for (int k = 0; k < kPlainImageSize * kPlainImageSize; ++k) ASSERT_EQ(p[k * 4 + 3], 255);
  EXPECT_TRUE(kMaskDotPixels[(32 * 64 + 32) * 4 + 3] == 255 && kMaskDotPixels[3] == 0);  // dot, transparent corner
}

}  // namespace
}  // namespace tessel
