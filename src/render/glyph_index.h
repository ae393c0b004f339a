// How a layout character picks its glyph image: glyphIndexOf, keypadIndexOf, SymbolIndexTable.
//
// Header-only and constexpr so that the artwork generator (tools/artgen) draws each glyph at
// exactly the index the library will look it up by; the two can never disagree.
//
// Glyph groups hold 26 images each. Letters index by letter - 'a' (or - 'A'); on the symbol
// pages indexes 0..9 are the digits and 10..25 the punctuation of that page, where each index is
// shared by two characters, one per page (SymbolIndexTable). The pad digit group is stored in
// calculator keypad order, top row first: 7 8 9 / 4 5 6 / 1 2 3 / 0.
#pragma once

#include <cstdint>

namespace tessel {

// Printable punctuation (codes 33..126 less digits and letters) -> glyph index 10..25, stored
// by code - 33. Digit and letter slots hold 255 and are never consulted.
inline constexpr std::uint8_t kSymbolIndexTable[94] = {
    12, 19, 14, 15, 16, 18, 18, 20, 21, 19, 25, 20, 22, 21, 24,  // ! " # $ % & ' ( ) * + , - . /
    255, 255, 255, 255, 255, 255, 255, 255, 255, 255,             // 0..9
    16, 17, 22, 24, 23, 25, 13,                                   // : ; < = > ? @
    255, 255, 255, 255, 255, 255, 255, 255, 255, 255, 255, 255, 255,  // A..M
    255, 255, 255, 255, 255, 255, 255, 255, 255, 255, 255, 255, 255,  // N..Z
    12, 14, 13, 17, 23, 10,                                       // [ \ ] ^ _ `
    255, 255, 255, 255, 255, 255, 255, 255, 255, 255, 255, 255, 255,  // a..m
    255, 255, 255, 255, 255, 255, 255, 255, 255, 255, 255, 255, 255,  // n..z
    10, 15, 11, 11,                                               // { | } ~
};

// 'a'..'z' -> c - 'a'; 'A'..'Z' -> c - 'A'; '0'..'9' -> c - '0'; other codes 33..126 ->
// kSymbolIndexTable[c - 33]; anything else -> -1.
constexpr int glyphIndexOf(std::uint8_t c) noexcept {
  if (c >= 'a' && c <= 'z') return c - 'a';
  if (c >= 'A' && c <= 'Z') return c - 'A';
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 33 && c <= 126) return kSymbolIndexTable[c - 33];
  return -1;
}

// Position of digit d in the pad digit group (keypad order). For a non-digit the result is
// (d - '0') as an unsigned byte, which is out of range: callers pass digits only and check.
constexpr unsigned keypadIndexOf(std::uint8_t d) noexcept {
  switch (d) {
    case '7': return 0;
    case '8': return 1;
    case '9': return 2;
    case '4': return 3;
    case '5': return 4;
    case '6': return 5;
    case '1': return 6;
    case '2': return 7;
    case '3': return 8;
    case '0': return 9;
    default: return static_cast<std::uint8_t>(d - '0');
  }
}

}  // namespace tessel
