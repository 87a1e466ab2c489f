#include "kxacore/Gedcom/KXGCharacterSet.h"

#include <array>
#include <utility>

#include "kxacore/Extensions/KXAStringExtensions.h"

namespace {

// CHAR values folded to upper case without spaces, "-" and "_".
constexpr std::array<std::pair<std::string_view, KXCStringEncoding>, 26> kCharValues = {{
    {"ANSEL", kKXCANSELStringEncoding},
    {"UTF8", kKXCUTF8StringEncoding},
    {"UNICODE", kKXCUnicodeStringEncoding},
    {"UTF16", kKXCUnicodeStringEncoding},
    {"UCS2", kKXCUnicodeStringEncoding},
    {"ASCII", kKXCASCIIStringEncoding},
    {"USASCII", kKXCASCIIStringEncoding},
    {"ANSI", kKXCWindowsCP1252StringEncoding},
    {"WINDOWS", kKXCWindowsCP1252StringEncoding},
    {"CP1252", kKXCWindowsCP1252StringEncoding},
    {"WINDOWS1252", kKXCWindowsCP1252StringEncoding},
    {"ANSIWINDOWS", kKXCWindowsCP1252StringEncoding},
    {"LATIN1", kKXCISOLatin1StringEncoding},
    {"ISO88591", kKXCISOLatin1StringEncoding},
    {"ISOLATIN1", kKXCISOLatin1StringEncoding},
    {"IBMPC", kKXCDOSLatinUSStringEncoding},
    {"IBMWINDOWS", kKXCDOSLatinUSStringEncoding},
    {"IBMDOS", kKXCDOSLatinUSStringEncoding},
    {"CP437", kKXCDOSLatinUSStringEncoding},
    {"DOS", kKXCDOSLatinUSStringEncoding},
    {"MSDOS", kKXCDOSLatinUSStringEncoding},
    {"CP850", kKXCDOSLatin1StringEncoding},
    {"IBM850", kKXCDOSLatin1StringEncoding},
    {"MACINTOSH", kKXCMacOSRomanStringEncoding},
    {"MACROMAN", kKXCMacOSRomanStringEncoding},
    {"MAC", kKXCMacOSRomanStringEncoding},
}};

std::string foldCharValue(std::string_view value) {
  std::string folded;
  for (const char c : value) {
    if (c == ' ' || c == '-' || c == '_' || c == '\t') continue;
    folded.push_back(c >= 'a' && c <= 'z' ? static_cast<char>(c - 'a' + 'A') : c);
  }
  return folded;
}

// The value of the first "1 CHAR" line among the first lines of `head`,
// read as ASCII-compatible bytes (every encoding named there is).
std::optional<std::string> findCharValue(std::string_view head) {
  std::size_t pos = 0;
  bool inHeader = false;
  while (pos < head.size()) {
    std::size_t end = head.find_first_of("\r\n", pos);
    const bool complete = end != std::string_view::npos;
    if (!complete) end = head.size();
    const std::string_view line = kxa_trim(head.substr(pos, end - pos));
    pos = end + 1;
    if (line.empty()) continue;
    if (line.front() == '0') {
      // Only the header record names the character set.
      if (inHeader) return std::nullopt;
      inHeader = true;
      continue;
    }
    if (line.size() < 6 || line.substr(0, 2) != "1 ") continue;
    std::string_view rest = kxa_trim(line.substr(2));
    if (rest.substr(0, 4) != "CHAR" || (rest.size() > 4 && rest[4] != ' ')) continue;
    // The last line of a cut head may be cut too: trust it only when complete.
    if (!complete) return std::nullopt;
    return std::string(kxa_trim(rest.substr(4)));
  }
  return std::nullopt;
}

}  // namespace

std::optional<KXCStringEncoding> KXGEncodingForCharValue(std::string_view value) {
  const std::string folded = foldCharValue(value);
  for (const auto& [name, encoding] : kCharValues) {
    if (folded == name) return encoding;
  }
  return std::nullopt;
}

std::string KXGEncodingDisplayName(KXCStringEncoding encoding) {
  switch (encoding) {
    case kKXCANSELStringEncoding: return "ANSEL";
    case kKXCUTF8StringEncoding: return "UTF-8";
    case kKXCASCIIStringEncoding: return "ASCII";
    case kKXCUTF16LittleEndianStringEncoding: return "UTF-16LE";
    case kKXCUTF16BigEndianStringEncoding: return "UTF-16BE";
    case kKXCUnicodeStringEncoding: return "UTF-16";
    case kKXCWindowsCP1252StringEncoding: return "Windows-1252";
    case kKXCISOLatin1StringEncoding: return "ISO-8859-1";
    case kKXCDOSLatinUSStringEncoding: return "CP437";
    case kKXCDOSLatin1StringEncoding: return "CP850";
    case kKXCMacOSRomanStringEncoding: return "Mac Roman";
    default: break;
  }
  const auto info = KXCStringEncodingInfoFor(encoding);
  return info ? std::string(info->name) : std::to_string(encoding);
}

KXGCharacterSet KXGDetectCharacterSet(std::span<const std::uint8_t> head) {
  KXGCharacterSet result;
  const auto startsWith = [&](std::initializer_list<std::uint8_t> bytes) {
    return head.size() >= bytes.size() && std::equal(bytes.begin(), bytes.end(), head.begin());
  };
  if (startsWith({0xEF, 0xBB, 0xBF})) {
    result.bomLength = 3;
    result.fromBytes = true;
  } else if (startsWith({0xFF, 0xFE})) {
    result.encoding = kKXCUTF16LittleEndianStringEncoding;
    result.bomLength = 2;
    result.fromBytes = true;
  } else if (startsWith({0xFE, 0xFF})) {
    result.encoding = kKXCUTF16BigEndianStringEncoding;
    result.bomLength = 2;
    result.fromBytes = true;
  } else if (head.size() >= 2 && head[0] == '0' && head[1] == 0) {
    // "0 HEAD" in UTF-16 without a mark: the NUL follows or precedes the digit.
    result.encoding = kKXCUTF16LittleEndianStringEncoding;
    result.fromBytes = true;
  } else if (head.size() >= 2 && head[0] == 0 && head[1] == '0') {
    result.encoding = kKXCUTF16BigEndianStringEncoding;
    result.fromBytes = true;
  }

  std::string ascii;
  if (result.encoding == kKXCUTF16LittleEndianStringEncoding ||
      result.encoding == kKXCUTF16BigEndianStringEncoding) {
    // The CHAR line is ASCII: keep the low byte of each unit that has a zero high byte.
    const std::size_t first = result.bomLength;
    const bool little = result.encoding == kKXCUTF16LittleEndianStringEncoding;
    for (std::size_t i = first; i + 1 < head.size(); i += 2) {
      const std::uint8_t low = little ? head[i] : head[i + 1];
      const std::uint8_t high = little ? head[i + 1] : head[i];
      ascii.push_back(high == 0 ? static_cast<char>(low) : '?');
    }
  } else {
    ascii.assign(reinterpret_cast<const char*>(head.data()) + result.bomLength,
                 head.size() - result.bomLength);
  }

  if (const auto value = findCharValue(ascii)) {
    result.declared = *value;
    const auto declared = KXGEncodingForCharValue(*value);
    if (!declared) {
      result.unknownDeclaration = true;
    } else if (!result.fromBytes) {
      result.encoding = *declared;
      // UNICODE without a mark or NULs is a contradiction the reader reports;
      // the bytes are ASCII-compatible, so read them as UTF-8.
      if (result.encoding == kKXCUnicodeStringEncoding) result.encoding = kKXCUTF8StringEncoding;
    }
  } else if (!result.fromBytes) {
    result.encoding = kKXCANSELStringEncoding;
  }
  return result;
}
