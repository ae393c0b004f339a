// Key layouts (letters, two symbol pages, number pad), shuffling, masking and geometry.
//
// Tables, each byte the character minus keyMask (mod 256), indexed row 0 -> 0..9,
// row 1 -> 10..18, row 2 -> 19..25:
//   letters        "qwertyuiop" "asdfghjkl" "zxcvbnm" (upper case is the byte minus 32)
//   symbolsLower   "1234567890" "`~!@#$%^&" "*()-_=+"
//   symbolsUpper   the same digits as symbolsLower, "{}[]\|:;'" and "\",.<>/?"
//   padDigits      "1234567890", read as a 4 x 3 grid by the number pad
// With kbdRandom each row is shuffled within itself (n random transpositions drawn from
// rand48Next()); both symbol pages always share one digit order. Builds configured with
// TESSEL_STRONG_LAYOUT_RANDOM shuffle each row uniformly (Fisher-Yates) from the operating
// system's random source instead, never reseed from the clock, and draw keyMask from 1..31.
//
// Key grid (kw = keyWidth, kh = keyHeight, rows of kh from the top):
//   full keyboard row 0: 10 keys from x = 0; row 1: 9 keys from 0.3 kw (dead zones x <= 0.3 kw
//   and x >= width - 0.7 kw); row 2: shift [0, 1.5 kw), 7 keys from 1.5 kw, delete above 8.5 kw;
//   row 3: switch [0, 2.5 kw), space up to 7.5 kw, done after.
//   number pad: four columns of 2.5 kw; digits in columns 0-2, then "." and done (type 1) in
//   row 3; column 3: delete, clear (or back to letters), and a done key two rows tall.
#pragma once

namespace tessel {

struct KeyboardSession;

// Builds the layout unless layoutBuilt is 1: columnCount 10, rowCount 4, all highlight flags
// released, tables filled (and shuffled when kbdRandom), masked, symbolPage = kbdPage, then the
// generator is reseeded with the current time. The caller holds session.lock. Unmasked
// characters never reach the session's fields.
void buildLayout(KeyboardSession& session) noexcept;

// Geometry of a surface change (width, height >= 1, checked by the caller); no GL call, the
// caller sets the viewport. Variant 0 or 1 is stored as surfaceMode (0 also resets rowCount
// to 4); any other variant picks 1 when the previous keyWidth / keyHeight is exactly 0.6f,
// else 0 with rowCount 4. Then keyWidth = width / columnCount, keyHeight = height / rowCount
// and the fractions drawing uses, all in single precision.
void applySurfaceGeometry(KeyboardSession& session, int width, int height, int variant) noexcept;

}  // namespace tessel
