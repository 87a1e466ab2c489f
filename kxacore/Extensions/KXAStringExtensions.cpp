#include "kxacore/Extensions/KXAStringExtensions.h"

#include <limits>

namespace {

constexpr bool isAsciiSpace(unsigned char c) noexcept {
  return c == ' ' || c == '\t' || c == '\n' || c == '\r' || c == '\f' || c == '\v';
}

constexpr bool isDigit(char c) noexcept { return c >= '0' && c <= '9'; }

// Accumulates digits from `pos`; returns the end position. Clamps on overflow.
std::size_t readDigits(std::string_view text, std::size_t pos, bool negative,
                       std::int64_t& value) noexcept {
  constexpr std::int64_t kMax = std::numeric_limits<std::int64_t>::max();
  constexpr std::int64_t kMin = std::numeric_limits<std::int64_t>::min();
  std::int64_t result = 0;
  bool clamped = false;
  while (pos < text.size() && isDigit(text[pos])) {
    const int digit = text[pos] - '0';
    if (!clamped) {
      if (negative) {
        if (result < (kMin + digit) / 10) clamped = true; else result = result * 10 - digit;
      } else {
        if (result > (kMax - digit) / 10) clamped = true; else result = result * 10 + digit;
      }
      if (clamped) result = negative ? kMin : kMax;
    }
    ++pos;
  }
  value = result;
  return pos;
}

}  // namespace

bool kxa_isSpaceAt(std::string_view text, std::size_t pos, std::size_t& length) {
  length = 0;
  if (pos >= text.size()) return false;
  const auto b0 = static_cast<unsigned char>(text[pos]);
  if (b0 < 0x80) {
    if (isAsciiSpace(b0)) length = 1;
    return length != 0;
  }
  const auto at = [&](std::size_t i) {
    return pos + i < text.size() ? static_cast<unsigned char>(text[pos + i]) : 0;
  };
  if (b0 == 0xC2 && (at(1) == 0x85 || at(1) == 0xA0)) {
    length = 2;
  } else if (b0 == 0xE1 && at(1) == 0x9A && at(2) == 0x80) {
    length = 3;  // U+1680
  } else if (b0 == 0xE2 && at(1) == 0x80 &&
             ((at(2) >= 0x80 && at(2) <= 0x8A) || at(2) == 0xA8 || at(2) == 0xA9 ||
              at(2) == 0xAF)) {
    length = 3;  // U+2000..U+200A, U+2028, U+2029, U+202F
  } else if (b0 == 0xE2 && at(1) == 0x81 && at(2) == 0x9F) {
    length = 3;  // U+205F
  } else if (b0 == 0xE3 && at(1) == 0x80 && at(2) == 0x80) {
    length = 3;  // U+3000
  }
  return length != 0;
}

std::string_view kxa_trim(std::string_view text) {
  std::size_t begin = 0;
  std::size_t length = 0;
  while (kxa_isSpaceAt(text, begin, length)) begin += length;
  std::size_t end = text.size();
  // Walk back over trailing spaces: find the start of the last UTF-8 sequence.
  while (end > begin) {
    std::size_t start = end - 1;
    while (start > begin && (static_cast<unsigned char>(text[start]) & 0xC0) == 0x80) --start;
    if (!kxa_isSpaceAt(text, start, length) || start + length != end) break;
    end = start;
  }
  return text.substr(begin, end - begin);
}

void kxa_trimInPlace(std::string& text) {
  const std::string_view trimmed = kxa_trim(text);
  const auto offset = static_cast<std::size_t>(trimmed.data() - text.data());
  const std::size_t size = trimmed.size();
  text.erase(0, offset);
  text.resize(size);
}

std::int64_t kxa_integerValue(std::string_view text) {
  std::size_t pos = 0;
  std::size_t length = 0;
  while (kxa_isSpaceAt(text, pos, length)) pos += length;
  bool negative = false;
  if (pos < text.size() && (text[pos] == '+' || text[pos] == '-')) {
    negative = text[pos] == '-';
    ++pos;
  }
  std::int64_t value = 0;
  readDigits(text, pos, negative, value);
  return value;
}

std::vector<std::string_view> kxa_splitLines(std::string_view text) {
  std::vector<std::string_view> lines;
  std::size_t start = 0;
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (text[i] != '\n' && text[i] != '\r') continue;
    lines.push_back(text.substr(start, i - start));
    if (text[i] == '\r' && i + 1 < text.size() && text[i + 1] == '\n') ++i;
    start = i + 1;
  }
  if (start < text.size()) lines.push_back(text.substr(start));
  return lines;
}

namespace {

// Byte length of the line end starting at text[i], 0 when there is none.
std::size_t newlineLengthAt(std::string_view text, std::size_t i) noexcept {
  const auto byte = static_cast<unsigned char>(text[i]);
  if (byte == '\r') return (i + 1 < text.size() && text[i + 1] == '\n') ? 2 : 1;
  if (byte >= 0x0A && byte <= 0x0C) return 1;  // LF, VT, FF
  if (byte == 0xC2) {  // U+0085
    return (i + 1 < text.size() && static_cast<unsigned char>(text[i + 1]) == 0x85) ? 2 : 0;
  }
  if (byte == 0xE2 && i + 2 < text.size() && static_cast<unsigned char>(text[i + 1]) == 0x80) {
    const auto last = static_cast<unsigned char>(text[i + 2]);
    return (last == 0xA8 || last == 0xA9) ? 3 : 0;  // U+2028, U+2029
  }
  return 0;
}

}  // namespace

std::vector<std::string_view> kxa_componentsSeparatedByNewline(std::string_view text) {
  std::vector<std::string_view> lines;
  std::size_t start = 0;
  std::size_t i = 0;
  while (i < text.size()) {
    const std::size_t length = newlineLengthAt(text, i);
    if (length == 0) {
      ++i;
      continue;
    }
    lines.push_back(text.substr(start, i - start));
    i += length;
    start = i;
  }
  if (start < text.size()) lines.push_back(text.substr(start));
  return lines;
}

std::vector<std::string_view> kxa_split(std::string_view text, std::string_view separator) {
  std::vector<std::string_view> pieces;
  if (separator.empty()) {
    pieces.push_back(text);
    return pieces;
  }
  std::size_t start = 0;
  while (true) {
    const std::size_t found = text.find(separator, start);
    if (found == std::string_view::npos) break;
    pieces.push_back(text.substr(start, found - start));
    start = found + separator.size();
  }
  pieces.push_back(text.substr(start));
  return pieces;
}

std::string kxa_asciiLower(std::string_view text) {
  std::string lower(text);
  for (char& c : lower) {
    if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
  }
  return lower;
}

namespace {
// Length of the well-formed UTF-8 sequence at `pos`, or 0 when malformed.
std::size_t utf8SequenceLength(std::string_view text, std::size_t pos) noexcept {
  const auto b0 = static_cast<unsigned char>(text[pos]);
  if (b0 < 0x80) return 1;
  std::size_t need = 0;
  std::uint32_t min = 0;
  std::uint32_t cp = 0;
  if ((b0 & 0xE0) == 0xC0) { need = 2; min = 0x80; cp = b0 & 0x1F; }
  else if ((b0 & 0xF0) == 0xE0) { need = 3; min = 0x800; cp = b0 & 0x0F; }
  else if ((b0 & 0xF8) == 0xF0) { need = 4; min = 0x10000; cp = b0 & 0x07; }
  else return 0;
  if (pos + need > text.size()) return 0;
  for (std::size_t i = 1; i < need; ++i) {
    const auto b = static_cast<unsigned char>(text[pos + i]);
    if ((b & 0xC0) != 0x80) return 0;
    cp = (cp << 6) | (b & 0x3F);
  }
  if (cp < min || cp > 0x10FFFF || (cp >= 0xD800 && cp <= 0xDFFF)) return 0;
  return need;
}
}  // namespace

std::size_t kxa_utf16Length(std::string_view utf8) {
  std::size_t units = 0;
  for (std::size_t pos = 0; pos < utf8.size();) {
    const std::size_t length = utf8SequenceLength(utf8, pos);
    if (length == 0) { ++units; ++pos; continue; }
    units += length == 4 ? 2 : 1;
    pos += length;
  }
  return units;
}

bool kxa_isValidUTF8(std::string_view text) {
  for (std::size_t pos = 0; pos < text.size();) {
    const std::size_t length = utf8SequenceLength(text, pos);
    if (length == 0) return false;
    pos += length;
  }
  return true;
}

std::size_t KXAScanner::skippedPosition() const noexcept {
  std::size_t pos = pos_;
  std::size_t length = 0;
  while (kxa_isSpaceAt(text_, pos, length)) pos += length;
  return pos;
}

bool KXAScanner::scanInteger(std::int64_t& value) noexcept {
  std::size_t pos = skippedPosition();
  bool negative = false;
  if (pos < text_.size() && (text_[pos] == '+' || text_[pos] == '-')) {
    negative = text_[pos] == '-';
    ++pos;
  }
  if (pos >= text_.size() || !isDigit(text_[pos])) return false;
  pos_ = readDigits(text_, pos, negative, value);
  return true;
}

bool KXAScanner::scanString(std::string_view literal) noexcept {
  const std::size_t pos = skippedPosition();
  if (text_.substr(pos).starts_with(literal)) {
    pos_ = pos + literal.size();
    return true;
  }
  return false;
}

bool KXAScanner::isAtEnd() const noexcept { return skippedPosition() >= text_.size(); }
