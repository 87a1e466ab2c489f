// ANSEL and the other decoders from arbitrary bytes.
//
// Input: byte 0 picks the encoding (ANSEL or one of the available list),
// byte 1 seeds the chunk sizes, the rest is the text.
//
// Properties checked (abort on failure):
//   - the output is well-formed UTF-8;
//   - decoding in fuzz-chosen chunks gives the bytes and the invalid count of
//     decoding whole;
//   - the strict whole-buffer decode succeeds exactly when nothing was invalid,
//     and then gives the same text;
//   - ANSEL: the output equals a literal transcription of the mark-swapping
//     walk over UTF-16 units (one unit per byte), and the line reader's
//     one-shot helper agrees.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <span>
#include <string>
#include <vector>

#include "kxacore/Extensions/KXAStringExtensions.h"
#include "kxacore/Files/Text/KXCANSELTable.h"
#include "kxacore/Files/Text/KXCStringEncoding.h"
#include "kxacore/Files/Text/KXCTextFileReader.h"

namespace {

void check(bool condition) {
  if (!condition) std::abort();
}

// The walk as written: a UTF-16 array, swapping in place.
std::string referenceANSEL(std::span<const std::uint8_t> bytes) {
  using kxc_ansel_internal::isCombiningMark;
  std::vector<char16_t> units(bytes.size());
  for (std::size_t i = 0; i < bytes.size(); ++i) {
    const char16_t unit = kxc_ansel_internal::kCodePoints[bytes[i]];
    if (i > 0 && isCombiningMark(bytes[i - 1]) && bytes[i] != 0x0D) {
      units[i] = units[i - 1];
      units[i - 1] = unit;
    } else {
      units[i] = unit;
    }
  }
  std::string out;
  for (const char16_t unit : units) {
    const auto& entry = kxc_ansel_internal::encodeUTF8(unit);
    out.append(entry.bytes, entry.length);
  }
  return out;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size < 2) return 0;
  const auto available = KXCAvailableStringEncodings();
  const std::size_t pick = data[0] % (available.size() + 1);
  const KXCStringEncoding encoding = pick == 0 ? kKXCANSELStringEncoding : available[pick - 1].number;
  unsigned seed = data[1];
  const std::span<const std::uint8_t> text(data + 2, size - 2);

  const auto whole = KXCTextDecoder::decoderForEncoding(encoding);
  check(whole != nullptr);
  std::string expected;
  whole->decode(text, expected);
  whole->finish(expected);
  check(kxa_isValidUTF8(expected));

  const auto pieces = KXCTextDecoder::decoderForEncoding(encoding);
  std::string actual;
  for (std::size_t pos = 0; pos < text.size();) {
    seed = seed * 1103515245u + 12345u;
    const std::size_t length = std::min<std::size_t>((seed >> 16) % 9, text.size() - pos);
    pieces->decode(text.subspan(pos, length), actual);
    pos += length;
  }
  pieces->finish(actual);
  check(actual == expected);
  check(pieces->invalidSequences() == whole->invalidSequences());

  const auto strict = KXCDecodeString(text, encoding);
  check(strict.has_value() == (whole->invalidSequences() == 0));
  if (strict) check(*strict == expected);

  if (encoding == kKXCANSELStringEncoding) {
    check(expected == referenceANSEL(text));
    check(KXCTextFileReader::stringFromANSELData(text) == expected);
  }
  return 0;
}
