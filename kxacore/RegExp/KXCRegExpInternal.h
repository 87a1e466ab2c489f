// Byte helpers shared by the two expression classes. Not part of the
// library's interface.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "kxacore/Extensions/KXAStringExtensions.h"

namespace kxc_internal {

// The offset just past the UTF-8 character at `pos`: one lead byte and the
// continuation bytes after it. Always moves at least one byte, so a scan that
// steps past an empty match makes progress even on invalid UTF-8.
[[nodiscard]] inline std::size_t nextCharacter(std::string_view text, std::size_t pos) noexcept {
  ++pos;
  while (pos < text.size() && (static_cast<unsigned char>(text[pos]) & 0xC0) == 0x80) ++pos;
  return pos;
}

// True at the end of `text` and where no UTF-8 continuation byte stands.
[[nodiscard]] inline bool isCharacterBoundary(std::string_view text, std::size_t pos) noexcept {
  return pos >= text.size() || (static_cast<unsigned char>(text[pos]) & 0xC0) != 0x80;
}

// The bytes [start, end) of `text`; empty for a group that took no part (-1)
// or for offsets that do not fit the text.
[[nodiscard]] inline std::string_view bytesInRange(std::string_view text, std::int64_t start,
                                                   std::int64_t end) noexcept {
  if (start < 0 || end < start || static_cast<std::uint64_t>(end) > text.size()) return {};
  return text.substr(static_cast<std::size_t>(start), static_cast<std::size_t>(end - start));
}

// A group's text as a string, or nullopt when its bytes are not UTF-8 (a
// group that ends inside a character): such bytes are no text.
[[nodiscard]] inline std::optional<std::string> decodedText(std::string_view bytes) {
  if (!kxa_isValidUTF8(bytes)) return std::nullopt;
  return std::string(bytes);
}

}  // namespace kxc_internal
