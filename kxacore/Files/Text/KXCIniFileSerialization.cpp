#include "kxacore/Files/Text/KXCIniFileSerialization.h"

#include <plist/plist.h>

#include <charconv>
#include <cstdlib>
#include <cstring>
#include <cstdio>
#include <limits>
#include <mutex>
#include <optional>
#include <vector>

#include "kxacore/Extensions/KXAStringExtensions.h"
#include "kxacore/Platform/KXAFileUtilities.h"
#include "kxacore/Platform/KXAStringFormat.h"
#include "kxacore/RegExp/KXCRegExpPerl.h"

namespace {

struct FileClose {
  void operator()(std::FILE* file) const { std::fclose(file); }
};

// The whole file; nullopt when it cannot be opened or read (a directory
// opens but fails on reading, and the streams would throw there).
std::optional<std::string> readFile(const std::filesystem::path& path) {
  const std::unique_ptr<std::FILE, FileClose> file(std::fopen(path.c_str(), "rb"));
  if (!file) return std::nullopt;
  std::string bytes;
  char buffer[16384];
  while (const std::size_t n = std::fread(buffer, 1, sizeof buffer, file.get())) {
    bytes.append(buffer, n);
  }
  if (std::ferror(file.get())) return std::nullopt;
  return bytes;
}

// The three expressions of the native form, compiled once. An expression
// object serves one thread at a time, so readers take them under `mutex`.
struct NativePatterns {
  std::mutex mutex;
  std::unique_ptr<KXCRegExpPerl> comment;
  std::unique_ptr<KXCRegExpPerl> header;
  std::unique_ptr<KXCRegExpPerl> keyValue;
};

NativePatterns& nativePatterns() {
  static NativePatterns& patterns = *[] {
    auto* built = new NativePatterns;
    built->comment = KXCRegExpPerl::regExpWithPattern("^([\\s]*#.*)", KXCRegExpPerl::kMultiline);
    built->header = KXCRegExpPerl::regExpWithPattern(
        "^[\\s]*\\[[\\s]*([^\\[\\s].*[^\\s\\]])[\\s]*\\][\\s]*$", KXCRegExpPerl::kMultiline);
    built->keyValue =
        KXCRegExpPerl::regExpWithPattern("^\\s*([^=\\s]*)[^=]*=(.*)", KXCRegExpPerl::kMultiline);
    return built;
  }();
  return patterns;
}

// Group `index` of the last search of `regExp` over `line`.
std::string_view group(const KXCRegExpPerl& regExp, std::string_view line, std::size_t index) {
  const std::span<const int> offsets = regExp.resultVector();
  const int start = offsets[index * 2];
  const int end = offsets[index * 2 + 1];
  if (start < 0 || end < start) return {};
  return line.substr(static_cast<std::size_t>(start), static_cast<std::size_t>(end - start));
}

void readLine(NativePatterns& patterns, std::string_view line, KXCIniFile& ini,
              std::optional<KXCIniSection>& current) {
  if (patterns.comment->executeForString(line, 0)) return;
  if (patterns.header->executeForString(line, 0)) {
    current = KXCIniSection::sectionWithName(group(*patterns.header, line, 1));
    ini.setSection(*current);
    return;
  }
  if (!current) return;
  if (patterns.keyValue->executeForString(line, 0)) {
    static_cast<void>(current->setValue(group(*patterns.keyValue, line, 2),
                                        group(*patterns.keyValue, line, 1)));
    return;
  }
  static_cast<void>(current->setValue(std::string_view(), line));
}

// --- property lists -----------------------------------------------------

struct PlistFree {
  void operator()(plist_t node) const { plist_free(node); }
};
using PlistPtr = std::unique_ptr<void, PlistFree>;

struct PlistXmlFree {
  void operator()(char* xml) const { plist_to_xml_free(xml); }
};

std::string shortestText(double value) {
  char buffer[64];
  const auto result = std::to_chars(buffer, buffer + sizeof buffer, value);
  return std::string(buffer, result.ptr);
}

// The text a number or string node stands for; nullopt for other nodes.
std::optional<std::string> plistValueText(plist_t node) {
  switch (plist_get_node_type(node)) {
    case PLIST_STRING: {
      std::uint64_t length = 0;
      const char* text = plist_get_string_ptr(node, &length);
      if (!text) return std::nullopt;
      std::string value(text, static_cast<std::size_t>(length));
      if (!kxa_isValidUTF8(value)) return std::nullopt;
      return value;
    }
    case PLIST_UINT: {
      std::uint64_t value = 0;
      plist_get_uint_val(node, &value);
      return std::to_string(static_cast<std::int64_t>(value));
    }
    case PLIST_REAL: {
      double value = 0;
      plist_get_real_val(node, &value);
      return shortestText(value);
    }
    case PLIST_BOOLEAN: {
      std::uint8_t value = 0;
      plist_get_bool_val(node, &value);
      return std::string(value ? "1" : "0");
    }
    default:
      return std::nullopt;
  }
}

std::uint64_t bigEndian(const std::uint8_t* bytes, std::size_t width) {
  std::uint64_t value = 0;
  for (std::size_t i = 0; i < width; ++i) value = value << 8 | bytes[i];
  return value;
}

// libplist 2.2 aborts the process (a failed assertion when a dictionary key
// is fetched) on a binary property list whose strings hold a NUL. So every
// string object is checked first; a list that cannot be checked is refused
// too. XML needs no check: its parser cuts strings at a NUL consistently.
bool binaryPlistIsSafe(std::span<const std::uint8_t> data) {
  constexpr std::size_t kTrailerSize = 32;
  if (data.size() < 6 || std::memcmp(data.data(), "bplist", 6) != 0) return true;
  if (data.size() < 8 + kTrailerSize) return false;
  const std::uint8_t* trailer = data.data() + data.size() - kTrailerSize;
  const std::size_t offsetSize = trailer[6];
  const std::uint64_t objectCount = bigEndian(trailer + 8, 8);
  const std::uint64_t tableOffset = bigEndian(trailer + 24, 8);
  if (offsetSize < 1 || offsetSize > 8 || tableOffset > data.size() ||
      objectCount > (data.size() - tableOffset) / offsetSize) {
    return false;
  }
  for (std::uint64_t i = 0; i < objectCount; ++i) {
    const std::uint64_t offset = bigEndian(data.data() + tableOffset + i * offsetSize, offsetSize);
    if (offset >= data.size()) return false;
    const std::uint8_t marker = data[offset];
    const int type = marker >> 4;  // 5: ASCII string, 6: UTF-16 string
    if (type != 5 && type != 6) continue;
    std::uint64_t count = marker & 0xF;
    std::uint64_t position = offset + 1;
    if (count == 0xF) {  // the count follows as an integer object
      if (position >= data.size() || (data[position] >> 4) != 1) return false;
      const std::size_t width = std::size_t{1} << (data[position] & 0xF);
      if (width > 8 || width > data.size() - position - 1) return false;
      count = bigEndian(data.data() + position + 1, width);
      position += 1 + width;
    }
    const std::size_t unit = type == 5 ? 1 : 2;
    if (count > (data.size() - position) / unit) return false;
    for (std::uint64_t j = 0; j < count; ++j) {
      const std::uint8_t* code = data.data() + position + j * unit;
      if (code[0] == 0 && (unit == 1 || code[1] == 0)) return false;
    }
  }
  return true;
}

// Calls visit(key, node) for each entry of a dictionary node.
template <class Visit>
void forEachEntry(plist_t dictionary, Visit&& visit) {
  plist_dict_iter iterator = nullptr;
  plist_dict_new_iter(dictionary, &iterator);
  if (!iterator) return;
  while (true) {
    char* key = nullptr;
    plist_t node = nullptr;
    plist_dict_next_item(dictionary, iterator, &key, &node);
    if (!node) {
      std::free(key);
      break;
    }
    const std::unique_ptr<char, decltype(&std::free)> ownedKey(key, &std::free);
    if (key && kxa_isValidUTF8(key)) visit(std::string_view(key), node);
  }
  std::free(iterator);
}

}  // namespace

// --- serializators -------------------------------------------------------

std::unique_ptr<KXCIniFileSerializator> KXCIniFileSerializator::serializatorForFormat(
    std::int64_t format) {
  if (format == KXCIniFileFormatPropertyList) {
    return std::make_unique<KXCIniFilePropertyListSerializator>();
  }
  if (format == KXCIniFileFormatNative) return std::make_unique<KXCIniFileNativeSerializator>();
  return nullptr;
}

std::unique_ptr<KXCIniFile> KXCIniFileSerializator::iniFromFile(
    const std::filesystem::path&) const {
  return nullptr;
}

bool KXCIniFileSerializator::writeIni(const KXCIniFile&, const std::filesystem::path&) const {
  return false;
}

std::unique_ptr<KXCIniFile> KXCIniFileNativeSerializator::iniFromFile(
    const std::filesystem::path& path) const {
  const std::optional<std::string> text = readFile(path);
  if (!text) return nullptr;
  return iniFromString(*text);
}

std::unique_ptr<KXCIniFile> KXCIniFileNativeSerializator::iniFromString(std::string_view text) {
  if (!kxa_isValidUTF8(text)) return nullptr;
  if (text.starts_with("\xEF\xBB\xBF")) text.remove_prefix(3);
  auto ini = KXCIniFile::iniFile();
  NativePatterns& patterns = nativePatterns();
  if (!patterns.comment || !patterns.header || !patterns.keyValue) return nullptr;
  const std::scoped_lock lock(patterns.mutex);
  std::optional<KXCIniSection> current;
  for (const std::string_view line : kxa_componentsSeparatedByNewline(text)) {
    if (!line.empty()) readLine(patterns, line, *ini, current);
  }
  return ini;
}

std::string KXCIniFileNativeSerializator::stringFromIni(const KXCIniFile& ini) {
  std::string text;
  for (const auto& [name, content] : ini.content()) {
    text.append(KXAStringWithFormat("[%@]\n", name));
    const KXCIniSection section(name, content);
    for (const auto& entry : *content) {
      const std::string value = section.valueForKey(entry.first).value_or("");
      text.append(value.empty() ? KXAStringWithFormat("%@\n", entry.first)
                                : KXAStringWithFormat("%@=%@\n", entry.first, value));
    }
  }
  return text;
}

bool KXCIniFileNativeSerializator::writeIni(const KXCIniFile& ini,
                                            const std::filesystem::path& path) const {
  return KXAWriteFileAtomically(path, stringFromIni(ini));
}

std::unique_ptr<KXCIniFile> KXCIniFilePropertyListSerializator::iniFromFile(
    const std::filesystem::path& path) const {
  const std::optional<std::string> bytes = readFile(path);
  if (!bytes) return nullptr;
  return iniFromData({reinterpret_cast<const std::uint8_t*>(bytes->data()), bytes->size()});
}

std::unique_ptr<KXCIniFile> KXCIniFilePropertyListSerializator::iniFromData(
    std::span<const std::uint8_t> data) {
  if (data.empty() || data.size() > std::numeric_limits<std::uint32_t>::max()) return nullptr;
  if (!binaryPlistIsSafe(data)) return nullptr;
  plist_t parsed = nullptr;
  plist_from_memory(reinterpret_cast<const char*>(data.data()),
                    static_cast<std::uint32_t>(data.size()), &parsed);
  const PlistPtr root(parsed);
  if (!root || plist_get_node_type(root.get()) != PLIST_DICT) return nullptr;
  auto ini = KXCIniFile::iniFile();
  forEachEntry(root.get(), [&](std::string_view name, plist_t sectionNode) {
    if (plist_get_node_type(sectionNode) != PLIST_DICT) return;
    KXCIniSection section = KXCIniSection::sectionWithName(name);
    auto content = section.sharedContent();
    forEachEntry(sectionNode, [&](std::string_view key, plist_t valueNode) {
      if (std::optional<std::string> value = plistValueText(valueNode)) {
        content->insert_or_assign(std::string(key), std::move(*value));
      }
    });
    ini->setSection(section);
  });
  return ini;
}

std::string KXCIniFilePropertyListSerializator::xmlFromIni(const KXCIniFile& ini) {
  const PlistPtr root(plist_new_dict());
  if (!root) return {};
  for (const auto& [name, content] : ini.content()) {
    plist_t sectionNode = plist_new_dict();
    const KXCIniSection section(name, content);
    for (const auto& entry : *content) {
      const std::string value = section.valueForKey(entry.first).value_or("");
      plist_dict_set_item(sectionNode, entry.first.c_str(), plist_new_string(value.c_str()));
    }
    plist_dict_set_item(root.get(), name.c_str(), sectionNode);
  }
  char* xml = nullptr;
  std::uint32_t length = 0;
  plist_to_xml(root.get(), &xml, &length);
  const std::unique_ptr<char, PlistXmlFree> ownedXml(xml);
  if (!xml) return {};
  return std::string(xml, length);
}

bool KXCIniFilePropertyListSerializator::writeIni(const KXCIniFile& ini,
                                                  const std::filesystem::path& path) const {
  const std::string xml = xmlFromIni(ini);
  return !xml.empty() && KXAWriteFileAtomically(path, xml);
}

std::unique_ptr<KXCIniFile> KXCIniFileSerialization::iniFromFile(const std::filesystem::path& path,
                                                                 std::int64_t format) {
  const auto serializator = KXCIniFileSerializator::serializatorForFormat(format);
  return serializator ? serializator->iniFromFile(path) : nullptr;
}

bool KXCIniFileSerialization::writeIni(const KXCIniFile& ini, const std::filesystem::path& path,
                                       std::int64_t format) {
  const auto serializator = KXCIniFileSerializator::serializatorForFormat(format);
  return serializator && serializator->writeIni(ini, path);
}
