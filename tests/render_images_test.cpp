// The embedded image table and the glyph lookups: group sizes, shared pixel data, the symbol
// index table against the two symbol pages' character sets, and artwork properties the
// renderer relies on (transparent outside the sampled part, opaque key interiors, glyph ink
// thick enough to survive nearest-neighbour minification).
#include <gtest/gtest.h>

#include <algorithm>
#include <cctype>
#include <cstdlib>
#include <set>
#include <string>
#include <vector>

#include "render/glyph_index.h"
#include "render/image_table.h"

namespace tessel {
namespace {

using namespace images;

// The character sets of the two symbol pages' punctuation rows (first page: punctuation set
// characters 0..15, second page: 16..31).
const std::string kFirstPage = "`~!@#$%^&*()-_=+";
const std::string kSecondPage = "{}[]\\|:;'\",.<>/?";

std::uint8_t alphaAt(const TextureImage& img, int x, int y) {
  return img.pixels[(static_cast<std::size_t>(y) * img.width + x) * 4 + 3];
}

TEST(GlyphIndex, LettersDigitsAndRejects) {
  struct Case {
    int c, expected;
  } cases[] = {{'a', 0}, {'z', 25}, {'A', 0}, {'Z', 25}, {'0', 0}, {'9', 9}, {'.', 21}, {')', 21}, {'`', 10},
               {'{', 10}, {'~', 11}, {'?', 25}, {'+', 25}, {' ', -1}, {0, -1}, {127, -1}, {200, -1}, {32, -1}};
  for (const Case& k : cases) EXPECT_EQ(glyphIndexOf(static_cast<std::uint8_t>(k.c)), k.expected) << k.c;
}

// Each symbol index 10..25 holds one character of each page; letter and digit slots hold 255.
TEST(GlyphIndex, EachSymbolIndexHoldsOneCharacterOfEachPageAndKeypadOrder) {
  std::set<int> first, second, all;
  for (char c : kFirstPage) first.insert(glyphIndexOf(static_cast<std::uint8_t>(c)));
  for (char c : kSecondPage) second.insert(glyphIndexOf(static_cast<std::uint8_t>(c)));
  for (int i = 10; i <= 25; ++i) all.insert(i);
  EXPECT_EQ(first, all);
  EXPECT_EQ(second, all);
  for (int code = 33; code <= 126; ++code)
    EXPECT_TRUE(!std::isalnum(code) || kSymbolIndexTable[code - 33] == 255) << code;
  const char order[] = "7894561230";
  for (unsigned i = 0; i < 10; ++i) EXPECT_EQ(keypadIndexOf(static_cast<std::uint8_t>(order[i])), i);
  EXPECT_GE(keypadIndexOf('.'), 10u);  // out of range: callers must pass digits
}

TEST(ImageTable, GroupsHaveTheirSizesAndIndexes) {
  struct Group {
    const char* name;
    const ImageGroup& g;
    std::vector<std::pair<int, int>> sizes;
  };
  const std::vector<std::pair<int, int>> glyphs(26, {64, 128});
  const Group groups[] = {
      {"letters", kLetterGlyphs, glyphs},
      {"shifted", kShiftedLetterGlyphs, glyphs},
      {"symbols", kSymbolGlyphs, glyphs},
      {"symbols2", kSymbolShiftGlyphs, glyphs},
      {"pad digits", kPadDigitGlyphs, {glyphs.begin(), glyphs.begin() + 10}},
      {"char keys", kCharKeys, {{128, 256}, {128, 256}, {128, 256}}},
      {"space", kSpaceKeys, {{512, 256}, {512, 256}}},        {"space label", kSpaceLabel, {{256, 128}}},
      {"shift/delete", kShiftDeleteKeys, {{128, 256}, {128, 256}}},
      {"switch", kSwitchKeys, {{256, 256}, {256, 256}}},      {"done", kDoneKeys, {{128, 128}, {256, 256}}},
      {"icons", kIcons, {{64, 64}, {64, 64}, {64, 64}, {64, 64}}},
      {"labels", kLabels, {{256, 128}, {256, 128}, {128, 64}, {128, 64}, {256, 128}}},
      {"pad keys", kPadKeys, {{256, 128}, {256, 128}}},      {"pad done", kPadDoneKeys, {{128, 128}, {256, 256}}},
      {"pad labels", kPadLabels, {{128, 64}, {128, 64}, {64, 128}, {64, 64}}},
      {"pad done icon", kPadDoneIcon, {{64, 64}}},           {"cursor", kCursor, {{64, 64}}},
  };
  for (const Group& g : groups) {
    ASSERT_EQ(g.g.count, static_cast<int>(g.sizes.size())) << g.name;
    for (int i = 0; i < g.g.count; ++i) {
      const TextureImage& r = g.g[i];
      EXPECT_TRUE(r.index == i && r.width == g.sizes[i].first && r.height == g.sizes[i].second && r.reserved == 0 &&
                  r.pixels != nullptr) << g.name << " #" << i;
    }
  }
}

TEST(ImageTable, SharedPixelData) {
  for (int d = 0; d < 10; ++d) {
    const auto* pad = kPadDigitGlyphs[static_cast<int>(keypadIndexOf(static_cast<std::uint8_t>('0' + d)))].pixels;
    EXPECT_EQ(kSymbolGlyphs[d].pixels, pad) << d;
    EXPECT_EQ(kSymbolShiftGlyphs[d].pixels, pad) << d;
  }
  EXPECT_EQ(kPadLabels[2].pixels, kSymbolShiftGlyphs[21].pixels);
  EXPECT_EQ(kPadLabels[3].pixels, kIcons[0].pixels);
  EXPECT_EQ(kDoneKeys[1].pixels, kSwitchKeys[1].pixels);
}

// Key faces are sampled only in part (texture-coordinate sets square, shift, bar, wide): the
// rest of each image must be transparent, and the centre of the sampled part opaque.
TEST(Artwork, KeyFacesLiveWhereTheyAreSampled) {
  struct Face {
    const char* name;
    const TextureImage& img;
    double s, t;  // sampled fraction of width and height
  } faces[] = {
      {"char", kCharKeys[0], 0.625, 0.625},        {"char held", kCharKeys[1], 0.625, 0.625},
      {"shift", kShiftDeleteKeys[0], 0.9375, 0.625}, {"shift held", kShiftDeleteKeys[1], 0.9375, 0.625},
      {"switch", kSwitchKeys[0], 0.9765, 0.625},   {"switch held", kSwitchKeys[1], 0.9765, 0.625},
      {"done", kDoneKeys[0], 0.9765, 0.625},       {"space", kSpaceKeys[0], 1.0, 0.625},
      {"space held", kSpaceKeys[1], 1.0, 0.625},   {"pad", kPadKeys[0], 1.0, 1.0},
      {"pad alt", kPadKeys[1], 1.0, 1.0},          {"pad done", kPadDoneKeys[0], 1.0, 1.0},
      {"pad done held", kPadDoneKeys[1], 1.0, 1.0},
  };
  for (const Face& f : faces) {
    SCOPED_TRACE(f.name);
    const int sw = static_cast<int>(f.s * f.img.width), sh = static_cast<int>(f.t * f.img.height);
    EXPECT_EQ(alphaAt(f.img, sw / 2, sh / 2), 255);
    EXPECT_EQ(alphaAt(f.img, 0, 0), 0);  // rounded corner
    int stray = 0;
    for (int y = 0; y < f.img.height; ++y)
      for (int x = 0; x < f.img.width; ++x)
        if ((x >= sw || y >= sh) && alphaAt(f.img, x, y) != 0) ++stray;
    EXPECT_EQ(stray, 0);
  }
}

// Held pictures must be told apart from released ones at a glance.
TEST(Artwork, HeldFacesDifferClearly) {
  auto centre = [](const TextureImage& img, double s, double t) {
    const std::uint8_t* p = img.pixels + (static_cast<std::size_t>(t * img.height / 2) * img.width +
                                          static_cast<std::size_t>(s * img.width / 2)) * 4;
    return (p[0] + p[1] + p[2]) / 3;
  };
  struct Pair {
    const char* name;
    const TextureImage &released, &held;
    double s, t;
  } pairs[] = {
      {"char", kCharKeys[0], kCharKeys[1], 0.625, 0.625},
      {"shift/delete", kShiftDeleteKeys[0], kShiftDeleteKeys[1], 0.9375, 0.625},
      {"switch", kSwitchKeys[0], kSwitchKeys[1], 0.9765, 0.625},
      {"space", kSpaceKeys[0], kSpaceKeys[1], 1.0, 0.625},
      {"pad", kPadKeys[0], kPadKeys[1], 1.0, 1.0},
      {"pad done", kPadDoneKeys[0], kPadDoneKeys[1], 1.0, 1.0},
  };
  for (const Pair& p : pairs) EXPECT_GT(std::abs(centre(p.released, p.s, p.t) - centre(p.held, p.s, p.t)), 40) << p.name;
}

// Ink rows of an image (alpha >= 128): first and last.
std::pair<int, int> inkRows(const TextureImage& img) {
  int top = img.height, bottom = -1;
  for (int y = 0; y < img.height; ++y)
    for (int x = 0; x < img.width; ++x)
      if (alphaAt(img, x, y) >= 128) top = std::min(top, y), bottom = std::max(bottom, y);
  return {top, bottom};
}

// Every glyph has ink, stays inside its image with a margin (clamp-to-edge would smear an edge
// pixel), and its thinnest strokes keep 4 texels so that a 2x nearest minification (surface
// mode 0) keeps them: at 90% of the ink, the shorter of the horizontal and vertical runs through
// the texel is at least 4 (the rest are stroke ends and joins).
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
  } labels[] = {{"ABC", kLabels[0], 0.9},      {"?123", kLabels[1], 0.9},     {"Done", kLabels[2], 1.01},
                {"Done held", kLabels[3], 1.01}, {"123", kLabels[4], 0.9},      {"Clear", kPadLabels[0], 0.95},
                {"OK", kPadLabels[1], 0.95},     {"#+=", kIcons[3], 1.125}};
  for (const Label& l : labels) {
    const auto rows = inkRows(l.img);
    EXPECT_NEAR((rows.second - rows.first + 1) * l.pxPerTexel, 30, 6) << l.name;
  }
}

TEST(Artwork, PlainImagesAreOpaqueWhereDrawnWithoutBlending) {
  for (const std::uint8_t* p : {kBackgroundPixels, kFieldFramePixels}) {
    int translucent = 0;
    for (int k = 0; k < kPlainImageSize * kPlainImageSize; ++k) translucent += p[k * 4 + 3] != 255;
    EXPECT_EQ(translucent, 0);
  }
  EXPECT_EQ(kMaskDotPixels[(32 * 64 + 32) * 4 + 3], 255);  // the dot's centre
  EXPECT_EQ(kMaskDotPixels[3], 0);                         // transparent corner
}

}  // namespace
}  // namespace tessel
