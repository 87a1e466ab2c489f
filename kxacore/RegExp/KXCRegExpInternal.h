// Byte helpers shared by the two expression classes. Not part of the
// library's interface.
#pragma once

#include <cstdint>
#include <string_view>

namespace kxc_internal {

// The offset just past the UTF-8 character at `pos`: one lead byte and the
// continuation bytes after it. Always moves at least one byte, so a scan that
// steps past an empty match makes progress even on invalid UTF-8.
[[nodiscard]] inline std::size_t nextCharacter(std::string_view text, std::size_t pos) noexcept {
  ++pos;
  while (pos < text.size() && (static_cast<unsigned char>(text[pos]) & 0xC0) == 0x80) ++pos;
  return pos;
}

// The bytes [start, end) of `text`; empty for a group that took no part (-1)
// or for offsets that do not fit the text.
[[nodiscard]] inline std::string_view bytesInRange(std::string_view text, std::int64_t start,
                                                   std::int64_t end) noexcept {
  if (start < 0 || end < start || static_cast<std::uint64_t>(end) > text.size()) return {};
  return text.substr(static_cast<std::size_t>(start), static_cast<std::size_t>(end - start));
}

}  // namespace kxc_internal
