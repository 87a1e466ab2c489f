#include "kxacore/Files/Text/KXCStringEncoding.h"

#include <unicode/ucnv.h>
#include <unicode/ucnv_cb.h>

#include <algorithm>
#include <array>
#include <bit>
#include <charconv>
#include <cstring>

#include "kxacore/Files/Text/KXCANSELTable.h"

namespace {

constexpr std::array<KXCStringEncodingInfo, 19> kAvailableEncodings{{
    {kKXCASCIIStringEncoding, "ascii", ""},
    {kKXCUTF8StringEncoding, "utf-8", ""},
    {kKXCUnicodeStringEncoding, "utf-16", "UTF-16"},
    {kKXCUTF16BigEndianStringEncoding, "utf-16be", "UTF-16BE"},
    {kKXCUTF16LittleEndianStringEncoding, "utf-16le", "UTF-16LE"},
    {kKXCWindowsCP1252StringEncoding, "windows-1252", ""},
    {kKXCMacOSRomanStringEncoding, "macintosh", "macintosh"},
    {kKXCDOSLatinUSStringEncoding, "cp437", "ibm-437"},
    {kKXCDOSLatin1StringEncoding, "cp850", "ibm-850"},
    {kKXCDOSLatin2StringEncoding, "cp852", "ibm-852"},
    {kKXCWindowsCP1250StringEncoding, "windows-1250", "windows-1250"},
    {kKXCWindowsCP1251StringEncoding, "windows-1251", "windows-1251"},
    {kKXCWindowsCP1253StringEncoding, "windows-1253", "windows-1253"},
    {kKXCWindowsCP1254StringEncoding, "windows-1254", "windows-1254"},
    {kKXCWindowsCP1257StringEncoding, "windows-1257", "windows-1257"},
    {kKXCISOLatin2StringEncoding, "iso-8859-2", "ISO-8859-2"},
    {kKXCISOLatin9StringEncoding, "iso-8859-15", "ISO-8859-15"},
    {kKXCISOLatin1StringEncoding, "iso-8859-1", ""},
    // Kept out of the trial list below: see the header.
    {kKXCANSELStringEncoding, "ansel", ""},
}};
constexpr std::size_t kTrialCount = kAvailableEncodings.size() - 1;

struct Alias {
  std::string_view name;  // normalized: lower case, without '-', '_' and spaces
  KXCStringEncoding encoding;
};

// Besides the CLI names (matched after the same normalization), the names
// users and exchange-file headers commonly give.
constexpr std::array<Alias, 27> kAliases{{
    {"usascii", kKXCASCIIStringEncoding},
    {"unicode", kKXCUnicodeStringEncoding},
    {"ucs2", kKXCUnicodeStringEncoding},
    {"latin1", kKXCISOLatin1StringEncoding},
    {"iso88591", kKXCISOLatin1StringEncoding},
    {"l1", kKXCISOLatin1StringEncoding},
    {"latin2", kKXCISOLatin2StringEncoding},
    {"latin9", kKXCISOLatin9StringEncoding},
    {"cp1250", kKXCWindowsCP1250StringEncoding},
    {"cp1251", kKXCWindowsCP1251StringEncoding},
    {"cp1252", kKXCWindowsCP1252StringEncoding},
    {"ansi", kKXCWindowsCP1252StringEncoding},
    {"cp1253", kKXCWindowsCP1253StringEncoding},
    {"cp1254", kKXCWindowsCP1254StringEncoding},
    {"cp1257", kKXCWindowsCP1257StringEncoding},
    {"mac", kKXCMacOSRomanStringEncoding},
    {"macroman", kKXCMacOSRomanStringEncoding},
    {"macosroman", kKXCMacOSRomanStringEncoding},
    {"ibmpc", kKXCDOSLatinUSStringEncoding},
    {"ibm437", kKXCDOSLatinUSStringEncoding},
    {"ibm850", kKXCDOSLatin1StringEncoding},
    {"ibm852", kKXCDOSLatin2StringEncoding},
    {"dos437", kKXCDOSLatinUSStringEncoding},
    {"dos850", kKXCDOSLatin1StringEncoding},
    {"utf16be", kKXCUTF16BigEndianStringEncoding},
    {"utf16le", kKXCUTF16LittleEndianStringEncoding},
    {"ansiz3947", kKXCANSELStringEncoding},
}};

std::string normalizedName(std::string_view name) {
  std::string normalized;
  normalized.reserve(name.size());
  for (const char c : name) {
    if (c == '-' || c == '_' || c == ' ' || c == '.') continue;
    normalized.push_back((c >= 'A' && c <= 'Z') ? static_cast<char>(c - 'A' + 'a') : c);
  }
  return normalized;
}

std::optional<std::uint64_t> parseNumber(std::string_view text) {
  int base = 10;
  if (text.size() > 2 && text[0] == '0' && (text[1] == 'x' || text[1] == 'X')) {
    text.remove_prefix(2);
    base = 16;
  }
  std::uint64_t value = 0;
  const char* const end = text.data() + text.size();
  const auto [ptr, ec] = std::from_chars(text.data(), end, value, base);
  if (text.empty() || ec != std::errc() || ptr != end) return std::nullopt;
  return value;
}

const KXCStringEncodingInfo* findInfo(KXCStringEncoding encoding) {
  const auto it = std::find_if(kAvailableEncodings.begin(), kAvailableEncodings.end(),
                               [encoding](const KXCStringEncodingInfo& info) { return info.number == encoding; });
  return it == kAvailableEncodings.end() ? nullptr : &*it;
}

constexpr char kReplacementUTF8[] = "\xEF\xBF\xBD";

void appendReplacement(std::string& out) { out.append(kReplacementUTF8, 3); }

// ---- UTF-8: validate and copy in runs ----

enum class SequenceKind { valid, invalid, incomplete };
struct Sequence {
  SequenceKind kind;
  std::size_t length;  // bytes covered: the whole sequence, or its maximal invalid subpart
};

// Classifies the sequence starting at a byte >= 0x80, by the well-formed
// table of the Unicode standard (no overlongs, no surrogates, nothing above
// U+10FFFF). `incomplete` means every byte available is a valid prefix.
Sequence classifyUTF8(const std::uint8_t* bytes, std::size_t available) {
  const std::uint8_t lead = bytes[0];
  std::size_t needed = 0;
  std::uint8_t low = 0x80;
  std::uint8_t high = 0xBF;
  if (lead < 0xC2) return {SequenceKind::invalid, 1};
  if (lead < 0xE0) {
    needed = 2;
  } else if (lead < 0xF0) {
    needed = 3;
    if (lead == 0xE0) low = 0xA0;
    if (lead == 0xED) high = 0x9F;
  } else if (lead < 0xF5) {
    needed = 4;
    if (lead == 0xF0) low = 0x90;
    if (lead == 0xF4) high = 0x8F;
  } else {
    return {SequenceKind::invalid, 1};
  }
  for (std::size_t k = 1; k < needed; ++k) {
    if (k >= available) return {SequenceKind::incomplete, k};
    if (bytes[k] < low || bytes[k] > high) return {SequenceKind::invalid, k};
    low = 0x80;
    high = 0xBF;
  }
  return {SequenceKind::valid, needed};
}

class UTF8Decoder final : public KXCTextDecoder {
 public:
  void decode(std::span<const std::uint8_t> bytes, std::string& out) override {
    const std::uint8_t* const data = bytes.data();
    const std::size_t size = bytes.size();
    std::size_t pos = pendingLength_ > 0 ? completePending(bytes, out) : 0;
    if (pendingLength_ > 0) return;  // the chunk ended inside the held sequence
    std::size_t runStart = pos;
    while (pos < size) {
      // Eight ASCII bytes at a time: the common case in real files.
      while (pos + 8 <= size) {
        std::uint64_t word;
        std::memcpy(&word, data + pos, 8);
        if ((word & 0x8080808080808080ULL) != 0) break;
        pos += 8;
      }
      if (pos >= size) break;
      if (data[pos] < 0x80) {
        ++pos;
        continue;
      }
      const Sequence sequence = classifyUTF8(data + pos, size - pos);
      if (sequence.kind == SequenceKind::valid) {
        pos += sequence.length;
        continue;
      }
      out.append(reinterpret_cast<const char*>(data + runStart), pos - runStart);
      if (sequence.kind == SequenceKind::incomplete) {
        pendingLength_ = size - pos;
        std::memcpy(pending_.data(), data + pos, pendingLength_);
        return;
      }
      appendReplacement(out);
      countInvalidSequence();
      pos += sequence.length;
      runStart = pos;
    }
    out.append(reinterpret_cast<const char*>(data + runStart), size - runStart);
  }

  void finish(std::string& out) override {
    if (pendingLength_ == 0) return;
    appendReplacement(out);
    countInvalidSequence();
    pendingLength_ = 0;
  }

 private:
  // Joins the held bytes with the start of `bytes`; returns how many bytes of
  // `bytes` the completed (or rejected) sequence used.
  std::size_t completePending(std::span<const std::uint8_t> bytes, std::string& out) {
    std::array<std::uint8_t, 8> joined{};
    std::memcpy(joined.data(), pending_.data(), pendingLength_);
    const std::size_t taken = std::min(bytes.size(), 4 - pendingLength_);
    std::memcpy(joined.data() + pendingLength_, bytes.data(), taken);
    const std::size_t held = pendingLength_;
    const Sequence sequence = classifyUTF8(joined.data(), held + taken);
    if (sequence.kind == SequenceKind::incomplete) {
      std::memcpy(pending_.data(), joined.data(), held + taken);
      pendingLength_ = held + taken;
      return bytes.size();
    }
    if (sequence.kind == SequenceKind::valid) {
      out.append(reinterpret_cast<const char*>(joined.data()), sequence.length);
    } else {
      appendReplacement(out);
      countInvalidSequence();
    }
    pendingLength_ = 0;
    return sequence.length - held;
  }

  std::array<std::uint8_t, 4> pending_{};
  std::size_t pendingLength_ = 0;
};

// ---- ASCII and ISO Latin-1 ----

class ASCIIDecoder final : public KXCTextDecoder {
 public:
  void decode(std::span<const std::uint8_t> bytes, std::string& out) override {
    std::size_t runStart = 0;
    for (std::size_t pos = 0; pos < bytes.size(); ++pos) {
      if (bytes[pos] < 0x80) continue;
      out.append(reinterpret_cast<const char*>(bytes.data() + runStart), pos - runStart);
      appendReplacement(out);
      countInvalidSequence();
      runStart = pos + 1;
    }
    out.append(reinterpret_cast<const char*>(bytes.data() + runStart), bytes.size() - runStart);
  }
  void finish(std::string&) override {}
};

class Latin1Decoder final : public KXCTextDecoder {
 public:
  void decode(std::span<const std::uint8_t> bytes, std::string& out) override {
    const std::size_t start = out.size();
    out.resize(start + 2 * bytes.size());
    char* dst = out.data() + start;
    for (const std::uint8_t byte : bytes) {
      if (byte < 0x80) {
        *dst++ = static_cast<char>(byte);
      } else {
        *dst++ = static_cast<char>(0xC0 | (byte >> 6));
        *dst++ = static_cast<char>(0x80 | (byte & 0x3F));
      }
    }
    out.resize(static_cast<std::size_t>(dst - out.data()));
  }
  void finish(std::string&) override {}
};

// ---- Windows-1252 ----

// The code page's 0x80 to 0x9F; 0 marks the five bytes it leaves undefined.
// ICU maps those to C1 controls, which would make every byte acceptable and
// hide DOS code page files from the fallback; the rest is Latin-1.
constexpr std::array<char16_t, 32> kWindows1252High{{
    0x20AC, 0, 0x201A, 0x0192, 0x201E, 0x2026, 0x2020, 0x2021, 0x02C6, 0x2030, 0x0160, 0x2039, 0x0152, 0, 0x017D, 0,
    0, 0x2018, 0x2019, 0x201C, 0x201D, 0x2022, 0x2013, 0x2014, 0x02DC, 0x2122, 0x0161, 0x203A, 0x0153, 0, 0x017E,
    0x0178}};

class Windows1252Decoder final : public KXCTextDecoder {
 public:
  void decode(std::span<const std::uint8_t> bytes, std::string& out) override {
    const std::size_t start = out.size();
    out.resize(start + 3 * bytes.size());
    char* dst = out.data() + start;
    for (const std::uint8_t byte : bytes) {
      std::uint32_t c = byte;
      if (byte >= 0x80 && byte < 0xA0) {
        c = kWindows1252High[byte - 0x80];
        if (c == 0) {
          countInvalidSequence();
          c = 0xFFFD;
        }
      }
      dst = appendUTF8(dst, c);
    }
    out.resize(static_cast<std::size_t>(dst - out.data()));
  }
  void finish(std::string&) override {}

 private:
  static char* appendUTF8(char* dst, std::uint32_t c) {
    if (c < 0x80) {
      *dst++ = static_cast<char>(c);
    } else if (c < 0x800) {
      *dst++ = static_cast<char>(0xC0 | (c >> 6));
      *dst++ = static_cast<char>(0x80 | (c & 0x3F));
    } else {
      *dst++ = static_cast<char>(0xE0 | (c >> 12));
      *dst++ = static_cast<char>(0x80 | ((c >> 6) & 0x3F));
      *dst++ = static_cast<char>(0x80 | (c & 0x3F));
    }
    return dst;
  }
};

// ---- ANSEL ----

// ANSEL puts a combining mark before its letter, Unicode after it. The walk
// swaps each character with the previous output unit whenever the previous
// input byte was a mark (unless the character is a CR). Only the output unit
// after a mark can still move, so the decoder holds back exactly that one
// unit: always the first mark of a run of marks.
class ANSELDecoder final : public KXCTextDecoder {
 public:
  void decode(std::span<const std::uint8_t> bytes, std::string& out) override {
    using namespace kxc_ansel_internal;
    // Most genealogy text is ASCII, one byte out per byte in, with some
    // room for diacritics so that a whole file is not copied by a late
    // growth. Reserving does not write the memory; decoding piece by piece
    // into a small buffer and appending writes the output once (sizing the
    // string first would write it twice, zeros first).
    out.reserve(out.size() + bytes.size() + bytes.size() / 8);
    const std::uint8_t* src = bytes.data();
    const std::uint8_t* const end = src + bytes.size();
    // The state lives in locals during the loop: stores through `dst` (a
    // char pointer) could alias the members and force a reload per byte.
    bool holding = holding_;
    std::uint8_t held = held_;
    while (src < end) {
      const std::uint8_t* const pieceEnd = src + std::min<std::size_t>(kPieceSize, static_cast<std::size_t>(end - src));
      char* const piece = pieceBuffer_.get();
      char* dst = piece;
      while (src < pieceEnd) {
        if (holding) {
          const std::uint8_t byte = *src++;
          if (byte == 0x0D) {
            dst = put(dst, held);
            dst = put(dst, byte);
            holding = false;
            continue;
          }
          // The current character takes the held unit's place; the held
          // unit moves on and stays held while the current byte is a mark.
          dst = put(dst, byte);
          if (!isCombiningMark(byte)) {
            dst = put(dst, held);
            holding = false;
          }
          continue;
        }
        // The hot path: no mark pending. ASCII is copied as it is, sixteen
        // bytes at a time; any other byte is one table store.
        if (pieceEnd - src >= 16) {
          std::uint64_t words[2];
          std::memcpy(words, src, 16);
          std::memcpy(dst, src, 16);  // the ASCII prefix is right; the rest is overwritten
          const std::size_t ascii = asciiPrefixLength(words[0], words[1]);
          src += ascii;
          dst += ascii;
          if (ascii == 16) continue;
        }
        const std::uint8_t byte = *src++;
        if (isCombiningMark(byte)) {
          held = byte;
          holding = true;
        } else {
          dst = put(dst, byte);
        }
      }
      out.append(piece, static_cast<std::size_t>(dst - piece));
    }
    holding_ = holding;
    held_ = held;
  }

  void finish(std::string& out) override {
    if (!holding_) return;
    const auto& entry = kxc_ansel_internal::kUTF8[held_];
    out.append(entry.bytes, entry.length);
    holding_ = false;
  }

 private:
  static constexpr std::uint64_t kHighBits = 0x8080808080808080ULL;

  // Bytes before the first one with its high bit set, of sixteen in memory order.
  static std::size_t asciiPrefixLength(std::uint64_t first, std::uint64_t second) {
    const std::uint64_t high = (first & kHighBits) != 0 ? first & kHighBits : second & kHighBits;
    const std::size_t base = (first & kHighBits) != 0 ? 0 : 8;
    if (high == 0) return 16;
    if constexpr (std::endian::native == std::endian::little) {
      return base + static_cast<std::size_t>(std::countr_zero(high)) / 8;
    } else {
      return base + static_cast<std::size_t>(std::countl_zero(high)) / 8;
    }
  }

  // Input bytes decoded into the piece buffer before it is appended.
  static constexpr std::size_t kPieceSize = 4096;
  // Room past three bytes per input byte: the unit held over from the
  // previous piece, and what four-byte stores and sixteen-byte copies write
  // beyond the bytes they keep.
  static constexpr std::size_t kSlack = 16;

  static char* put(char* dst, std::uint8_t byte) {
    const auto& entry = kxc_ansel_internal::kUTF8[byte];
    std::memcpy(dst, entry.bytes, 4);
    return dst + entry.length;
  }

  std::unique_ptr<char[]> pieceBuffer_ = std::make_unique_for_overwrite<char[]>(kPieceSize * 3 + kSlack);
  std::uint8_t held_ = 0;
  bool holding_ = false;
};

// ---- ICU converters ----

struct ConverterCloser {
  void operator()(UConverter* converter) const { ucnv_close(converter); }
};
using ConverterPtr = std::unique_ptr<UConverter, ConverterCloser>;

class ICUDecoder final : public KXCTextDecoder {
 public:
  explicit ICUDecoder(ConverterPtr converter) : converter_(std::move(converter)) {}

  // Routes invalid input to substituteAndCount; false when ICU refuses, and
  // then the decoder must not be used (it would substitute without counting).
  bool installCallback() {
    UErrorCode status = U_ZERO_ERROR;
    ucnv_setToUCallBack(converter_.get(), &ICUDecoder::substituteAndCount, this, nullptr, nullptr, &status);
    return U_SUCCESS(status);
  }

  void decode(std::span<const std::uint8_t> bytes, std::string& out) override {
    convert(reinterpret_cast<const char*>(bytes.data()), bytes.size(), false, out);
  }

  void finish(std::string& out) override {
    convert(nullptr, 0, true, out);
    if (highSurrogate_ != 0) {
      appendReplacement(out);
      countInvalidSequence();
      highSurrogate_ = 0;
    }
    ucnv_resetToUnicode(converter_.get());
  }

 private:
  // Replaces every unassigned or illegal sequence by U+FFFD and counts it;
  // a sequence cut by the end of the input arrives here on the flush.
  static void substituteAndCount(const void* context, UConverterToUnicodeArgs* args, const char*, int32_t,
                                 UConverterCallbackReason reason, UErrorCode* status) {
    if (reason != UCNV_UNASSIGNED && reason != UCNV_ILLEGAL && reason != UCNV_IRREGULAR) return;
    auto* decoder = static_cast<ICUDecoder*>(const_cast<void*>(context));
    decoder->countInvalidSequence();
    *status = U_ZERO_ERROR;
    static const UChar kReplacement = 0xFFFD;
    ucnv_cbToUWriteUChars(args, &kReplacement, 1, 0, status);
  }

  void convert(const char* source, std::size_t length, bool flush, std::string& out) {
    const char* sourcePos = source;
    const char* const sourceLimit = source + length;
    for (;;) {
      UChar* target = units_.data();
      UErrorCode status = U_ZERO_ERROR;
      ucnv_toUnicode(converter_.get(), &target, units_.data() + units_.size(), &sourcePos, sourceLimit, nullptr,
                     flush, &status);
      appendUTF16(units_.data(), static_cast<std::size_t>(target - units_.data()), out);
      if (status != U_BUFFER_OVERFLOW_ERROR) break;
    }
  }

  // Output of a converter is well-formed UTF-16, but a pair may straddle two
  // fills of the unit buffer, so a high surrogate waits for its partner.
  void appendUTF16(const UChar* units, std::size_t count, std::string& out) {
    for (std::size_t k = 0; k < count; ++k) {
      std::uint32_t c = units[k];
      if (highSurrogate_ != 0) {
        if (c >= 0xDC00 && c <= 0xDFFF) {
          c = 0x10000 + ((highSurrogate_ - 0xD800) << 10) + (c - 0xDC00);
          highSurrogate_ = 0;
          appendCodePoint(c, out);
          continue;
        }
        highSurrogate_ = 0;
        appendReplacement(out);
        countInvalidSequence();
      }
      if (c >= 0xD800 && c <= 0xDBFF) {
        highSurrogate_ = c;
      } else if (c >= 0xDC00 && c <= 0xDFFF) {
        appendReplacement(out);
        countInvalidSequence();
      } else {
        appendCodePoint(c, out);
      }
    }
  }

  static void appendCodePoint(std::uint32_t c, std::string& out) {
    if (c < 0x80) {
      out.push_back(static_cast<char>(c));
    } else if (c < 0x800) {
      const char encoded[] = {static_cast<char>(0xC0 | (c >> 6)), static_cast<char>(0x80 | (c & 0x3F))};
      out.append(encoded, 2);
    } else if (c < 0x10000) {
      const char encoded[] = {static_cast<char>(0xE0 | (c >> 12)), static_cast<char>(0x80 | ((c >> 6) & 0x3F)),
                              static_cast<char>(0x80 | (c & 0x3F))};
      out.append(encoded, 3);
    } else {
      const char encoded[] = {static_cast<char>(0xF0 | (c >> 18)), static_cast<char>(0x80 | ((c >> 12) & 0x3F)),
                              static_cast<char>(0x80 | ((c >> 6) & 0x3F)), static_cast<char>(0x80 | (c & 0x3F))};
      out.append(encoded, 4);
    }
  }

  ConverterPtr converter_;
  std::array<UChar, 4096> units_{};
  std::uint32_t highSurrogate_ = 0;
};

bool startsWith(std::span<const std::uint8_t> bytes, std::uint8_t first, std::uint8_t second) {
  return bytes.size() >= 2 && bytes[0] == first && bytes[1] == second;
}

}  // namespace

KXCTextDecoder::~KXCTextDecoder() = default;

std::unique_ptr<KXCTextDecoder> KXCTextDecoder::decoderForEncoding(KXCStringEncoding encoding) {
  switch (encoding) {
    case kKXCUTF8StringEncoding:
      return std::make_unique<UTF8Decoder>();
    case kKXCASCIIStringEncoding:
      return std::make_unique<ASCIIDecoder>();
    case kKXCISOLatin1StringEncoding:
      return std::make_unique<Latin1Decoder>();
    case kKXCANSELStringEncoding:
      return std::make_unique<ANSELDecoder>();
    case kKXCWindowsCP1252StringEncoding:
      return std::make_unique<Windows1252Decoder>();
    default:
      break;
  }
  const KXCStringEncodingInfo* const info = findInfo(encoding);
  if (info == nullptr || info->icuName.empty()) return nullptr;
  UErrorCode status = U_ZERO_ERROR;
  ConverterPtr converter(ucnv_open(std::string(info->icuName).c_str(), &status));
  if (U_FAILURE(status) || !converter) return nullptr;
  auto decoder = std::make_unique<ICUDecoder>(std::move(converter));
  if (!decoder->installCallback()) return nullptr;
  return decoder;
}

std::span<const KXCStringEncodingInfo> KXCAvailableStringEncodings() {
  return std::span<const KXCStringEncodingInfo>(kAvailableEncodings.data(), kTrialCount);
}

bool KXCStringEncodingIsTriable(KXCStringEncoding encoding, std::span<const std::uint8_t> bytes) {
  switch (encoding) {
    case kKXCUnicodeStringEncoding:
      return startsWith(bytes, 0xFE, 0xFF) || startsWith(bytes, 0xFF, 0xFE);
    case kKXCUTF16BigEndianStringEncoding:
      return startsWith(bytes, 0xFE, 0xFF);
    case kKXCUTF16LittleEndianStringEncoding:
      return startsWith(bytes, 0xFF, 0xFE);
    case kKXCANSELStringEncoding:
      return false;
    default:
      return findInfo(encoding) != nullptr;
  }
}

std::optional<KXCStringEncodingInfo> KXCStringEncodingInfoFor(KXCStringEncoding encoding) {
  const KXCStringEncodingInfo* const info = findInfo(encoding);
  if (info == nullptr) return std::nullopt;
  return *info;
}

std::optional<KXCStringEncoding> KXCStringEncodingFromName(std::string_view nameOrNumber) {
  if (const auto number = parseNumber(nameOrNumber)) {
    if (findInfo(*number) == nullptr) return std::nullopt;
    return *number;
  }
  const std::string normalized = normalizedName(nameOrNumber);
  if (normalized.empty()) return std::nullopt;
  for (const KXCStringEncodingInfo& info : kAvailableEncodings) {
    if (normalizedName(info.name) == normalized) return info.number;
  }
  for (const Alias& alias : kAliases) {
    if (alias.name == normalized) return alias.encoding;
  }
  return std::nullopt;
}

std::optional<std::string> KXCDecodeString(std::span<const std::uint8_t> bytes, KXCStringEncoding encoding) {
  const std::unique_ptr<KXCTextDecoder> decoder = KXCTextDecoder::decoderForEncoding(encoding);
  if (!decoder) return std::nullopt;
  std::string text;
  text.reserve(bytes.size() + bytes.size() / 8);
  decoder->decode(bytes, text);
  decoder->finish(text);
  if (decoder->invalidSequences() != 0) return std::nullopt;
  return text;
}
