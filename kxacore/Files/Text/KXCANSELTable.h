// Internal: the ANSEL (ANSI/NISO Z39.47) byte to Unicode table, and its
// UTF-8 form, shared by the whole-buffer and the streaming decoders.
#pragma once

#include <array>
#include <cstdint>

namespace kxc_ansel_internal {

// The standard mapping for every code ANSEL defines; the byte's own Latin-1
// value for the others, except five bytes that genealogy files use for
// control and joiner characters (0x88, 0x89, 0x8D, 0x8E) and for the sharp s
// (0xCF), which several exchange formats added to the character set.
constexpr std::array<char16_t, 256> makeCodePoints() {
  std::array<char16_t, 256> table{};
  for (unsigned byte = 0; byte < 256; ++byte) table[byte] = static_cast<char16_t>(byte);
  table[0x88] = 0x0098;
  table[0x89] = 0x009C;
  table[0x8D] = 0x200D;
  table[0x8E] = 0x200C;
  table[0xCF] = 0x00DF;
  // Spacing graphics.
  table[0xA1] = 0x0141;  // L with stroke
  table[0xA2] = 0x00D8;  // O with stroke
  table[0xA3] = 0x0110;  // D with stroke
  table[0xA4] = 0x00DE;  // thorn
  table[0xA5] = 0x00C6;  // AE
  table[0xA6] = 0x0152;  // OE
  table[0xA7] = 0x02B9;  // soft sign (prime)
  table[0xA8] = 0x00B7;  // middle dot
  table[0xA9] = 0x266D;  // music flat
  table[0xAA] = 0x00AE;  // registered
  table[0xAB] = 0x00B1;  // plus-minus
  table[0xAC] = 0x01A0;  // O with horn
  table[0xAD] = 0x01AF;  // U with horn
  table[0xAE] = 0x02BC;  // alif
  table[0xB0] = 0x02BB;  // ayn
  table[0xB1] = 0x0142;  // l with stroke
  table[0xB2] = 0x00F8;  // o with stroke
  table[0xB3] = 0x0111;  // d with stroke
  table[0xB4] = 0x00FE;  // thorn
  table[0xB5] = 0x00E6;  // ae
  table[0xB6] = 0x0153;  // oe
  table[0xB7] = 0x02BA;  // hard sign
  table[0xB8] = 0x0131;  // dotless i
  table[0xB9] = 0x00A3;  // pound
  table[0xBA] = 0x00F0;  // eth
  table[0xBC] = 0x01A1;  // o with horn
  table[0xBD] = 0x01B0;  // u with horn
  table[0xC0] = 0x00B0;  // degree
  table[0xC1] = 0x2113;  // script l
  table[0xC2] = 0x2117;  // sound recording copyright
  table[0xC3] = 0x00A9;  // copyright
  table[0xC4] = 0x266F;  // music sharp
  table[0xC5] = 0x00BF;  // inverted question mark
  table[0xC6] = 0x00A1;  // inverted exclamation mark
  // Combining diacritics, written before their letter in ANSEL.
  table[0xE0] = 0x0309;  // hook above
  table[0xE1] = 0x0300;  // grave
  table[0xE2] = 0x0301;  // acute
  table[0xE3] = 0x0302;  // circumflex
  table[0xE4] = 0x0303;  // tilde
  table[0xE5] = 0x0304;  // macron
  table[0xE6] = 0x0306;  // breve
  table[0xE7] = 0x0307;  // dot above
  table[0xE8] = 0x0308;  // diaeresis
  table[0xE9] = 0x030C;  // caron
  table[0xEA] = 0x030A;  // ring above
  table[0xEB] = 0xFE20;  // ligature, left half
  table[0xEC] = 0xFE21;  // ligature, right half
  table[0xED] = 0x0315;  // comma above right
  table[0xEE] = 0x030B;  // double acute
  table[0xEF] = 0x0310;  // candrabindu
  table[0xF0] = 0x0327;  // cedilla
  table[0xF1] = 0x0328;  // ogonek
  table[0xF2] = 0x0323;  // dot below
  table[0xF3] = 0x0324;  // diaeresis below
  table[0xF4] = 0x0325;  // ring below
  table[0xF5] = 0x0333;  // double low line
  table[0xF6] = 0x0332;  // low line
  table[0xF7] = 0x0326;  // comma below
  table[0xF8] = 0x031C;  // left half ring below
  table[0xF9] = 0x032E;  // breve below
  table[0xFA] = 0xFE22;  // double tilde, left half
  table[0xFB] = 0xFE23;  // double tilde, right half
  table[0xFE] = 0x0313;  // comma above
  return table;
}

inline constexpr std::array<char16_t, 256> kCodePoints = makeCodePoints();

// A byte whose character ANSEL writes before its base letter. 0xFC and 0xFD
// are undefined and do not count.
constexpr bool isCombiningMark(std::uint8_t byte) { return (byte >= 0xE0 && byte <= 0xFB) || byte == 0xFE; }

// One table entry in UTF-8: up to three bytes plus the count that is
// meaningful; the decoder stores all four bytes and advances by the count,
// which avoids a branch per byte.
struct UTF8Entry {
  char bytes[4];
  std::uint32_t length;
};

constexpr char byteAt(std::uint32_t value) { return static_cast<char>(static_cast<std::uint8_t>(value)); }

constexpr UTF8Entry encodeUTF8(char16_t unit) {
  const std::uint32_t c = unit;
  if (c < 0x80) return {{byteAt(c), 0, 0, 0}, 1};
  if (c < 0x800) return {{byteAt(0xC0 | (c >> 6)), byteAt(0x80 | (c & 0x3F)), 0, 0}, 2};
  return {{byteAt(0xE0 | (c >> 12)), byteAt(0x80 | ((c >> 6) & 0x3F)), byteAt(0x80 | (c & 0x3F)), 0}, 3};
}

constexpr std::array<UTF8Entry, 256> makeUTF8Table() {
  std::array<UTF8Entry, 256> table{};
  for (unsigned byte = 0; byte < 256; ++byte) table[byte] = encodeUTF8(kCodePoints[byte]);
  return table;
}

inline constexpr std::array<UTF8Entry, 256> kUTF8 = makeUTF8Table();

}  // namespace kxc_ansel_internal
