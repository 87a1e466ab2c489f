#include "kxacore/Data/Format/KXCEnumStrings.h"

#include <algorithm>
#include <vector>

#include "kxacore/Extensions/KXAStringExtensions.h"

std::optional<std::string> KXCEnumUtils::stringWithEnumStrings(
    std::span<const KXCEnumStrings> entries, std::uint64_t value) {
  std::optional<std::string> result;
  for (const KXCEnumStrings& entry : entries) {
    if (entry.enumValue() == value) return entry.stringValue();
    if ((entry.enumValue() & ~value) != 0) continue;
    if (result) {
      result->append(", ").append(entry.stringValue());
    } else {
      result = entry.stringValue();
    }
  }
  return result;
}

std::uint64_t KXCEnumUtils::enumValueWithStrings(std::span<const KXCEnumStrings> entries,
                                                 std::string_view string, bool* hasErrors) {
  const std::vector<std::string_view> pieces = kxa_split(string, ", ");
  std::uint64_t value = 0;
  std::size_t matched = 0;
  for (const KXCEnumStrings& entry : entries) {
    if (std::find(pieces.begin(), pieces.end(), entry.stringValue()) == pieces.end()) continue;
    value |= entry.enumValue();
    ++matched;
  }
  if (hasErrors) *hasErrors = matched < pieces.size();
  return value;
}
