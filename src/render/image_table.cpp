// The image records over the assembled pixel data (images/images.S). Everything here is a
// compile-time constant: the records are address constants into the read-only data, so no
// initialisation code runs and nothing is copied.
#include "render/image_table.h"

#include "render/glyph_index.h"
#include "render/images/image_data.h"

namespace tessel::images {

namespace {

template <int N>
struct Records {
  TextureImage r[N];
};

constexpr std::size_t bytesOf(int w, int h) { return static_cast<std::size_t>(w) * h * 4; }

constexpr TextureImage record(int index, int w, int h, const std::uint8_t* pixels) {
  return TextureImage{index, w, h, pixels, 0};
}

// N equally sized images stored back to back.
template <int N>
constexpr Records<N> strip(const std::uint8_t* base, int w, int h) {
  Records<N> out{};
  for (int i = 0; i < N; ++i) out.r[i] = record(i, w, h, base + bytesOf(w, h) * i);
  return out;
}

// A symbol page: digits from the pad digit images, punctuation (indexes 10..25) from the page.
constexpr Records<26> symbolPage(const std::uint8_t* punctuation) {
  Records<26> out{};
  for (int i = 0; i < 10; ++i)
    out.r[i] = record(i, 64, 128,
                      tessel_img_glyphs_pad_digits + bytesOf(64, 128) * keypadIndexOf(static_cast<std::uint8_t>('0' + i)));
  for (int i = 10; i < 26; ++i) out.r[i] = record(i, 64, 128, punctuation + bytesOf(64, 128) * (i - 10));
  return out;
}

constexpr Records<26> kLetterRecords = strip<26>(tessel_img_glyphs_lower, 64, 128);
constexpr Records<26> kShiftedRecords = strip<26>(tessel_img_glyphs_upper, 64, 128);
constexpr Records<26> kSymbolRecords = symbolPage(tessel_img_glyphs_symbols1);
constexpr Records<26> kSymbolShiftRecords = symbolPage(tessel_img_glyphs_symbols2);
constexpr Records<10> kPadDigitRecords = strip<10>(tessel_img_glyphs_pad_digits, 64, 128);

constexpr TextureImage kCharKeyRecords[] = {
    record(0, 128, 256, tessel_img_key_char),
    record(1, 128, 256, tessel_img_key_char_held),
    record(2, 128, 256, tessel_img_key_balloon),
};
constexpr TextureImage kSpaceKeyRecords[] = {
    record(0, 512, 256, tessel_img_key_space),
    record(1, 512, 256, tessel_img_key_space_held),
};
constexpr TextureImage kSpaceLabelRecords[] = {record(0, 256, 128, tessel_img_label_space)};
constexpr TextureImage kShiftDeleteRecords[] = {
    record(0, 128, 256, tessel_img_key_shift_delete),
    record(1, 128, 256, tessel_img_key_shift_delete_held),
};
constexpr TextureImage kSwitchRecords[] = {
    record(0, 256, 256, tessel_img_key_switch),
    record(1, 256, 256, tessel_img_key_switch_held),
};
constexpr TextureImage kDoneRecords[] = {
    record(0, 128, 128, tessel_img_key_done),
    record(1, 256, 256, tessel_img_key_switch_held),  // shared: the held switch key
};
constexpr TextureImage kIconRecords[] = {
    record(0, 64, 64, tessel_img_icon_delete),
    record(1, 64, 64, tessel_img_icon_shift_off),
    record(2, 64, 64, tessel_img_icon_shift_on),
    record(3, 64, 64, tessel_img_icon_symbol_shift),
};
constexpr TextureImage kLabelRecords[] = {
    record(0, 256, 128, tessel_img_label_to_letters),
    record(1, 256, 128, tessel_img_label_to_symbols),
    record(2, 128, 64, tessel_img_label_done),
    record(3, 128, 64, tessel_img_label_done_held),
    record(4, 256, 128, tessel_img_label_to_pad),
};
constexpr TextureImage kPadKeyRecords[] = {
    record(0, 256, 128, tessel_img_key_pad),
    record(1, 256, 128, tessel_img_key_pad_alt),
};
constexpr TextureImage kPadDoneRecords[] = {
    record(0, 128, 128, tessel_img_key_pad_done),
    record(1, 256, 256, tessel_img_key_pad_done_held),
};
constexpr TextureImage kPadLabelRecords[] = {
    record(0, 128, 64, tessel_img_label_pad_clear),
    record(1, 128, 64, tessel_img_label_pad_ok),
    record(2, 64, 128, tessel_img_glyphs_symbols2 + bytesOf(64, 128) * (glyphIndexOf('.') - 10)),  // shared
    record(3, 64, 64, tessel_img_icon_delete),                                                     // shared
};
constexpr TextureImage kPadDoneIconRecords[] = {record(0, 64, 64, tessel_img_icon_pad_done)};
constexpr TextureImage kCursorRecords[] = {record(0, 64, 64, tessel_img_cursor)};

template <int N>
constexpr ImageGroup group(const Records<N>& r) {
  return ImageGroup{r.r, N};
}
template <int N>
constexpr ImageGroup group(const TextureImage (&r)[N]) {
  return ImageGroup{r, N};
}

}  // namespace

const ImageGroup kLetterGlyphs = group(kLetterRecords);
const ImageGroup kShiftedLetterGlyphs = group(kShiftedRecords);
const ImageGroup kSymbolGlyphs = group(kSymbolRecords);
const ImageGroup kSymbolShiftGlyphs = group(kSymbolShiftRecords);
const ImageGroup kPadDigitGlyphs = group(kPadDigitRecords);
const ImageGroup kCharKeys = group(kCharKeyRecords);
const ImageGroup kSpaceKeys = group(kSpaceKeyRecords);
const ImageGroup kSpaceLabel = group(kSpaceLabelRecords);
const ImageGroup kShiftDeleteKeys = group(kShiftDeleteRecords);
const ImageGroup kSwitchKeys = group(kSwitchRecords);
const ImageGroup kDoneKeys = group(kDoneRecords);
const ImageGroup kIcons = group(kIconRecords);
const ImageGroup kLabels = group(kLabelRecords);
const ImageGroup kPadKeys = group(kPadKeyRecords);
const ImageGroup kPadDoneKeys = group(kPadDoneRecords);
const ImageGroup kPadLabels = group(kPadLabelRecords);
const ImageGroup kPadDoneIcon = group(kPadDoneIconRecords);
const ImageGroup kCursor = group(kCursorRecords);

const std::uint8_t* const kBackgroundPixels = tessel_img_background;
const std::uint8_t* const kFieldFramePixels = tessel_img_field_frame;
const std::uint8_t* const kMaskDotPixels = tessel_img_mask_dot;

}  // namespace tessel::images
