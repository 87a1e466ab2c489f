// String encodings: the platform's encoding numbers, their names, and
// decoders from each encoding to UTF-8, whole or chunk by chunk.
//
//   auto enc = KXCStringEncodingFromName("cp1252");          // 12
//   auto text = KXCDecodeString(bytes, *enc);                 // nullopt if any byte is invalid
//
//   auto decoder = KXCTextDecoder::decoderForEncoding(kKXCANSELStringEncoding);
//   std::string out;
//   while (readChunk(chunk)) decoder->decode(chunk, out);     // any chunk sizes
//   decoder->finish(out);
//   decoder->invalidSequences();                              // how many became U+FFFD
//
// Encodings are the platform's string-encoding numbers (Foundation's
// numbering; the ones above 0x80000000 are the converted core-foundation
// numbers) plus 1537, this library's own number for ANSEL.
//
// UTF-8, ASCII, ISO Latin-1, Windows-1252 and ANSEL are decoded by the library itself,
// table driven, with no allocation per byte: they are what genealogy files
// of a gigabyte use. The other encodings go through ICU converters.
//
// Choices:
// - UTF-8 is decoded byte-exact: a leading byte order mark stays (as
//   U+FEFF). Invalid sequences are replaced by one U+FFFD per maximal
//   subpart (the Unicode recommendation), so overlong forms, surrogates and
//   values above U+10FFFF are invalid.
// - ASCII accepts 0x00 to 0x7F only.
// - UTF-16 (10) reads a byte order mark of either order and drops it; without
//   one it is big-endian. The explicit big- and little-endian encodings keep
//   a leading U+FEFF as text. Unpaired surrogates are invalid.
// - Windows-1252 leaves 0x81, 0x8D, 0x8F, 0x90 and 0x9D undefined, as the
//   code page does: they are invalid, so a file holding them is not taken
//   for Windows-1252 by the fallback (such bytes are typical of DOS code
//   page files: 0x81 is u-umlaut there).
//
// Thread safety: the free functions may be called from any thread. A
// KXCTextDecoder serves one thread at a time; give each thread its own.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>

// Platform string-encoding numbers (Foundation's numbering); 1537 is ANSEL.
using KXCStringEncoding = std::uint64_t;
inline constexpr KXCStringEncoding kKXCASCIIStringEncoding = 1;
inline constexpr KXCStringEncoding kKXCUTF8StringEncoding = 4;
inline constexpr KXCStringEncoding kKXCISOLatin1StringEncoding = 5;
inline constexpr KXCStringEncoding kKXCISOLatin2StringEncoding = 9;
inline constexpr KXCStringEncoding kKXCUnicodeStringEncoding = 10;  // UTF-16 with BOM (BE without one)
inline constexpr KXCStringEncoding kKXCWindowsCP1251StringEncoding = 11;
inline constexpr KXCStringEncoding kKXCWindowsCP1252StringEncoding = 12;
inline constexpr KXCStringEncoding kKXCWindowsCP1253StringEncoding = 13;
inline constexpr KXCStringEncoding kKXCWindowsCP1254StringEncoding = 14;
inline constexpr KXCStringEncoding kKXCWindowsCP1250StringEncoding = 15;
inline constexpr KXCStringEncoding kKXCMacOSRomanStringEncoding = 30;
inline constexpr KXCStringEncoding kKXCUTF16BigEndianStringEncoding = 0x90000100;
inline constexpr KXCStringEncoding kKXCUTF16LittleEndianStringEncoding = 0x94000100;
inline constexpr KXCStringEncoding kKXCDOSLatinUSStringEncoding = 0x80000400;  // code page 437 (IBMPC)
inline constexpr KXCStringEncoding kKXCDOSLatin1StringEncoding = 0x80000410;   // code page 850
inline constexpr KXCStringEncoding kKXCDOSLatin2StringEncoding = 0x80000412;   // code page 852
inline constexpr KXCStringEncoding kKXCISOLatin9StringEncoding = 0x8000020F;   // ISO 8859-15
inline constexpr KXCStringEncoding kKXCWindowsCP1257StringEncoding = 0x80000507;  // Baltic
inline constexpr KXCStringEncoding kKXCANSELStringEncoding = 1537;

struct KXCStringEncodingInfo {
  KXCStringEncoding number;
  std::string_view name;     // the CLI name: "utf-8", "windows-1252", "ansel", ...
  std::string_view icuName;  // empty for the library's own decoders
};

// The available encodings in trial order: the order in which a reader that
// was given the wrong encoding tries the others. Strict ones come first, so
// the first that decodes without error is likely the right one:
//   ascii, utf-8            multi-byte UTF-8 almost never happens by accident
//   utf-16, -be, -le        tried only when the bytes start with a byte order mark
//                           (any even-length text would otherwise pass)
//   windows-1252            the most common legacy encoding; 5 undefined bytes
//   macintosh               Mac Roman; defines every byte, so the encodings
//                           below are reached only when asked for by name
//   cp437, cp850, cp852, windows-1250, -1251, -1253, -1254, -1257,
//   iso-8859-2, iso-8859-15
//   iso-8859-1              accepts every byte: last
// ANSEL is not in this list (it is not a platform encoding and must never be
// guessed: it would silently turn Latin-1 letters into combining marks); it is
// decoded when asked for by name or number.
// The list is static and the views stay valid for the life of the program.
std::span<const KXCStringEncodingInfo> KXCAvailableStringEncodings();

// True when the fallback may try `encoding` on `bytes`: false for the UTF-16
// encodings unless `bytes` starts with a byte order mark of their order, and
// for ANSEL and unknown encodings.
bool KXCStringEncodingIsTriable(KXCStringEncoding encoding, std::span<const std::uint8_t> bytes);

// The description of `encoding` (ANSEL included); nullopt when unknown.
std::optional<KXCStringEncodingInfo> KXCStringEncodingInfoFor(KXCStringEncoding encoding);

// Name (case-insensitive; the usual aliases such as "utf8", "latin1", "cp1252")
// or decimal number -> encoding; nullopt when unknown.
std::optional<KXCStringEncoding> KXCStringEncodingFromName(std::string_view nameOrNumber);

// Whole-buffer strict decode to UTF-8: nullopt when the encoding is unknown or
// any byte sequence is invalid in it.
std::optional<std::string> KXCDecodeString(std::span<const std::uint8_t> bytes, KXCStringEncoding encoding);

// Streaming decoder: bytes in, UTF-8 out, chunk by chunk, for files too large to load.
class KXCTextDecoder {
 public:
  // nullptr when the encoding is unknown (or ICU lacks its converter).
  static std::unique_ptr<KXCTextDecoder> decoderForEncoding(KXCStringEncoding encoding);
  virtual ~KXCTextDecoder();
  KXCTextDecoder(const KXCTextDecoder&) = delete;
  KXCTextDecoder& operator=(const KXCTextDecoder&) = delete;

  // Appends the UTF-8 form of `bytes` to `out`. A byte sequence that is invalid in the encoding becomes U+FFFD and is
  // counted. A sequence cut at the end of the chunk (a partial UTF-8 or UTF-16 unit, an ANSEL combining mark whose
  // letter is in the next chunk) is held back until the next call or finish(), so chunk boundaries never change the output:
  // decoding in pieces gives the same bytes as decoding whole.
  virtual void decode(std::span<const std::uint8_t> bytes, std::string& out) = 0;
  // Flushes what was held back (a cut sequence at the very end counts as invalid).
  // The decoder is then ready for a new text; the count is kept.
  virtual void finish(std::string& out) = 0;
  // Number of invalid sequences replaced so far.
  std::uint64_t invalidSequences() const noexcept { return invalidSequences_; }

 protected:
  KXCTextDecoder() = default;
  void countInvalidSequence() noexcept { ++invalidSequences_; }

 private:
  std::uint64_t invalidSequences_ = 0;
};
