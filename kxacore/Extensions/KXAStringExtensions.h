// Small helpers on UTF-8 strings that the rest of the library leans on:
// trimming, the leading-integer reading of record data, newline splitting,
// and a forward-only scanner for record data.
//
// All functions are pure and may be called from any thread. Functions that
// return std::string_view return a slice of their argument: the argument
// must outlive the result.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

// True for ASCII white space and line breaks and for the Unicode space
// separators (U+00A0, U+1680, U+2000..U+200A, U+2028, U+2029, U+202F,
// U+205F, U+3000, U+0085) encoded as UTF-8 at `text[pos]`; `length` is set
// to the byte length of the space (0 when it is not one).
[[nodiscard]] bool kxa_isSpaceAt(std::string_view text, std::size_t pos, std::size_t& length);

// `text` without leading and trailing white space and line breaks.
[[nodiscard]] std::string_view kxa_trim(std::string_view text);
// In-place twin of kxa_trim.
void kxa_trimInPlace(std::string& text);

// The leading-integer reading of a string: skips leading white space, reads
// an optional sign and the decimal digits that follow, and stops at the
// first other character. No digits gives 0; overflow clamps to the int64
// limits. "12abc" is 12, "  -7" is -7, "abc" is 0.
[[nodiscard]] std::int64_t kxa_integerValue(std::string_view text);

// Splits at "\n", "\r\n" and "\r"; a final line break adds no empty line.
// The views point into `text`.
[[nodiscard]] std::vector<std::string_view> kxa_splitLines(std::string_view text);

// Splits at every line end of the platform's newline set: LF, CR LF (one
// end), lone CR, VT, FF, NEL (U+0085), LINE SEPARATOR (U+2028) and
// PARAGRAPH SEPARATOR (U+2029); no CR is left in a line. As with
// kxa_splitLines, a final line end adds no empty line, so a file of N
// lines gives N pieces; an empty text gives none. Views point into `text`.
[[nodiscard]] std::vector<std::string_view> kxa_componentsSeparatedByNewline(
    std::string_view text);

// Splits at every occurrence of `separator` (empty pieces kept, nothing
// trimmed). An empty `text` gives one empty piece. Views point into `text`.
[[nodiscard]] std::vector<std::string_view> kxa_split(std::string_view text,
                                                      std::string_view separator);

// ASCII-only lower case copy (bytes >= 0x80 are left as they are).
[[nodiscard]] std::string kxa_asciiLower(std::string_view text);

// Number of UTF-16 code units needed for the UTF-8 text; invalid bytes
// count as one unit each (as a replacement character would).
[[nodiscard]] std::size_t kxa_utf16Length(std::string_view utf8);

// True when `text` is well-formed UTF-8.
[[nodiscard]] bool kxa_isValidUTF8(std::string_view text);

// A forward-only reader over record data. Like a platform string scanner,
// it skips white space and line breaks before every token, and isAtEnd()
// is true when only such characters remain. The scanned text must outlive
// the scanner. Not thread-safe; cheap to create.
class KXAScanner {
 public:
  explicit KXAScanner(std::string_view text) noexcept : text_(text) {}

  // Reads an optionally signed decimal integer. On failure returns false and
  // leaves the position unchanged. Values beyond int64 clamp to its limits.
  [[nodiscard]] bool scanInteger(std::int64_t& value) noexcept;
  // Consumes `literal` when it is next (after skipped spaces).
  [[nodiscard]] bool scanString(std::string_view literal) noexcept;
  [[nodiscard]] bool isAtEnd() const noexcept;
  [[nodiscard]] std::size_t scanLocation() const noexcept { return pos_; }

 private:
  std::size_t skippedPosition() const noexcept;
  std::string_view text_;
  std::size_t pos_ = 0;
};
