// Key layouts: filling, row shuffling and masking of the key tables, and the key grid geometry.
//
// Exposes buildLayout and applySurfaceGeometry (input/layout.h). The tables are assembled in
// local arrays, masked there, and only then stored into the session's shared fields, so a draw
// call on another thread never sees an unmasked character; the local copies are wiped after.
#include "input/layout.h"

#include <cmath>
#include <cstddef>
#include <cstdint>
#include <ctime>
#include <limits>
#include <utility>

#include "crypto/wipe.h"
#include "crypto/rand48.h"
#include "session/session.h"

namespace tessel {

namespace {

constexpr char kLetterRows[] = "qwertyuiop" "asdfghjkl" "zxcvbnm";
constexpr char kDigits[] = "1234567890";
// Rows 1 and 2 of both symbol pages are consecutive pieces of this set: 0-8, 9-15, 16-24, 25-31.
constexpr char kPunctuation[] = "`~!@#$%^&*()-_=+{}[]\\|:;'\",.<>/?";
static_assert(sizeof kLetterRows - 1 == kKeyCount, "26 letter keys");
static_assert(sizeof kPunctuation - 1 == 32, "32 punctuation keys");

// Row starts and lengths inside a 26-key table.
constexpr std::size_t kRowStart[3] = {0, 10, 19};
constexpr std::size_t kRowLength[3] = {10, 9, 7};

// n random transpositions (not a uniform permutation; the key positions are what users have
// always seen from this generator, so the draw sequence is kept).
void shuffleRow(std::uint8_t* row, std::size_t n) noexcept {
  for (std::size_t i = 0; i < n; ++i) {
    const auto a = static_cast<std::size_t>(rand48Next()) % n;
    const auto b = static_cast<std::size_t>(rand48Next()) % n;
    std::swap(row[a], row[b]);
  }
}

// Fisher-Yates: every one of the n! orders equally likely.
void shuffleRowUniform(std::uint8_t* row, std::size_t n) noexcept {
  for (std::size_t i = n; i > 1; --i) {
    const std::size_t j = osRandomBelow(static_cast<std::uint32_t>(i));
    std::swap(row[i - 1], row[j]);
  }
}

void fillRow(std::uint8_t* row, const char* source, std::size_t n, bool shuffle) noexcept {
  for (std::size_t i = 0; i < n; ++i) row[i] = static_cast<std::uint8_t>(source[i]);
  if (!shuffle) return;
  if (kStrongLayoutRandom) {
    shuffleRowUniform(row, n);
  } else {
    shuffleRow(row, n);
  }
}

template <std::size_t N>
void storeMasked(RelaxedField<std::uint8_t> (&field)[N], const std::uint8_t (&keys)[N], std::uint8_t mask) noexcept {
  for (std::size_t i = 0; i < N; ++i) field[i] = static_cast<std::uint8_t>(keys[i] - mask);
}

// a / b in single precision with the IEEE result for b = 0 (a session whose layout was never
// built has columnCount 0), spelled out so no float-divide-by-zero check can trip.
float divide(float a, float b) noexcept {
  if (b != 0.0f) return a / b;
  constexpr float kInf = std::numeric_limits<float>::infinity();
  if (a == 0.0f || std::isnan(a)) return std::numeric_limits<float>::quiet_NaN();
  return (a > 0.0f) == !std::signbit(b) ? kInf : -kInf;
}

}  // namespace

void buildLayout(KeyboardSession& session) noexcept {
  if (session.layoutBuilt == 1) return;
  session.columnCount = 10;
  session.rowCount = 4;
  session.anyKeyReleased = 1;
  for (auto& flag : session.keyReleased) flag = 1;

  const bool shuffle = session.kbdRandom != 0;
  std::uint8_t letters[kKeyCount];
  std::uint8_t lower[kKeyCount];
  std::uint8_t upper[kKeyCount];
  std::uint8_t pad[kPadKeyCount];
  // The order of the fills is the order of the generator draws.
  for (int r = 0; r < 3; ++r) fillRow(letters + kRowStart[r], kLetterRows + kRowStart[r], kRowLength[r], shuffle);
  fillRow(lower, kDigits, 10, shuffle);
  fillRow(lower + 10, kPunctuation, 9, shuffle);
  fillRow(lower + 19, kPunctuation + 9, 7, shuffle);
  fillRow(pad, kDigits, kPadKeyCount, shuffle);
  // Both symbol pages show one digit order.
  for (std::size_t i = 0; i < 10; ++i) upper[i] = lower[i];
  fillRow(upper + 10, kPunctuation + 16, 9, shuffle);
  fillRow(upper + 19, kPunctuation + 25, 7, shuffle);

  const std::uint8_t mask = session.keyMask;
  storeMasked(session.letters, letters, mask);
  storeMasked(session.symbolsLower, lower, mask);
  storeMasked(session.symbolsUpper, upper, mask);
  storeMasked(session.padDigits, pad, mask);
  wipeObject(letters);
  wipeObject(lower);
  wipeObject(upper);
  wipeObject(pad);

  session.layoutBuilt = 1;
  session.symbolPage = static_cast<std::uint32_t>(static_cast<std::int32_t>(session.kbdPage.load()));
  // Seeded after the shuffles: the next build draws from the state this seeding leaves. A
  // strong-random build draws nothing from this stream, so it has nothing to seed.
  if (!kStrongLayoutRandom) rand48Seed(static_cast<long>(std::time(nullptr)));
}


void applySurfaceGeometry(KeyboardSession& session, int width, int height, int variant) noexcept {
  const auto v = static_cast<std::uint32_t>(variant);
  if (v < 2) {
    session.surfaceMode = v;
    if (v == 0) session.rowCount = 4;
  } else if (divide(session.keyWidth, session.keyHeight) == 0.6f) {
    session.surfaceMode = 1;
  } else {
    session.surfaceMode = 0;
    session.rowCount = 4;
  }
  session.surfaceWidth = width;
  session.surfaceHeight = height;
  const float columns = static_cast<float>(session.columnCount.load());
  const float rows = static_cast<float>(session.rowCount.load());
  const float keyWidth = divide(static_cast<float>(width), columns);
  const float keyHeight = divide(static_cast<float>(height), rows);
  session.keyWidth = keyWidth;
  session.keyHeight = keyHeight;
  session.keyAspect = divide(keyWidth, keyHeight);
  session.columnFraction = divide(1.0f, columns);
  session.rowFraction = divide(1.0f, rows);
  session.rowFractionCopy = divide(1.0f, rows);
  session.gapFraction = 0.1f;
}

}  // namespace tessel
