// KXDNameParser on arbitrary bytes: no crash, no sanitizer report, fields
// that stay slices of the input, and shortcuts that agree with the full scans.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string_view>

#include "kxacore/Data/Names/KXDNameParser.h"
#include "kxacore/Data/Names/KXDNameParserInternal.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string_view input(reinterpret_cast<const char*>(data), size);
  static KXDNameParser& parser = *new KXDNameParser();
  const std::int64_t outcome = parser.parseName(input);
  if ((outcome & ~std::int64_t{2 | 4 | 8 | 16 | 32}) != 0) std::abort();
  // A parse reports absent fields only for a blank input to a fresh parser.
  if ((outcome & 2) == 0 && (outcome & (16 | 32)) != 0) std::abort();
  if ((outcome & 2) == 0 && parser.originalName() != input) std::abort();
  static_cast<void>(parser.fullName());

  if (kxd_internal::firstTitleMatch(input, true) != kxd_internal::firstTitleMatch(input, false)) {
    std::abort();
  }
  if (kxd_internal::knownSuffixesIn(input, true) != kxd_internal::knownSuffixesIn(input, false)) {
    std::abort();
  }
  return 0;
}
