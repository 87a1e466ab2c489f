// File: KXGCharacterSet.h
//
// Which character set a GEDCOM file is written in, from its first bytes:
// a byte-order mark first (UTF-8, UTF-16 LE/BE), else the NUL pattern of
// UTF-16 without one, else the header's "1 CHAR" value.
//
//   auto set = KXGDetectCharacterSet(firstBytes);
//   set.encoding;     // kKXCANSELStringEncoding for "1 CHAR ANSEL"
//   set.declared;     // "ANSEL"
//
// CHAR values and what they read as (ASCII case-insensitive, spaces, "-"
// and "_" ignored):
//   ANSEL                                   ANSEL (the library's own decoder)
//   UTF-8, UTF8                             UTF-8
//   UNICODE, UTF-16, UTF16, UCS-2           UTF-16 (byte order from the BOM or NULs)
//   ASCII, US-ASCII                         ASCII
//   ANSI, WINDOWS, CP1252, WINDOWS-1252     Windows-1252 (what Windows exporters mean)
//   LATIN1, ISO-8859-1, ISO8859-1           ISO Latin-1
//   IBMPC, IBM PC, IBM WINDOWS, IBM DOS,    code page 437: the DOS code page of the
//   CP437, DOS                              programs that wrote "IBMPC"
//   CP850                                   code page 850
//   MACINTOSH, MACROMAN, MAC                Mac Roman
// A file with no CHAR line is read as ANSEL when it holds no UTF-8 sequence
// (the old default), else as UTF-8: the reader decides that on its first
// non-ASCII line, as it does for a declaration the bytes contradict.
//
// Thread safety: pure functions; any thread.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>

#include "kxacore/Files/Text/KXCStringEncoding.h"

struct KXGCharacterSet {
  KXCStringEncoding encoding = kKXCUTF8StringEncoding;
  // How many leading bytes are a byte-order mark (to skip).
  std::size_t bomLength = 0;
  // The CHAR value as written, "" when the header has none (or it was not found).
  std::string declared;
  // True when a CHAR line was found but its value is unknown.
  bool unknownDeclaration = false;
  // True when the encoding comes from a byte-order mark or the NUL pattern.
  bool fromBytes = false;
};

// The encoding a CHAR value names; nullopt for an unknown one.
[[nodiscard]] std::optional<KXCStringEncoding> KXGEncodingForCharValue(std::string_view value);

// A display name for the summary: "ANSEL", "UTF-8", "UTF-16LE", "Windows-1252" ...
[[nodiscard]] std::string KXGEncodingDisplayName(KXCStringEncoding encoding);

// Looks at `head` (the first few KB of the file; fewer when the file is
// short). Never fails: with nothing to go on, UTF-8.
[[nodiscard]] KXGCharacterSet KXGDetectCharacterSet(std::span<const std::uint8_t> head);
