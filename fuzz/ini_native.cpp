// Native INI text from arbitrary bytes: read, write, read again, and carry
// the result through the property-list form.
//
// Properties checked (abort on failure):
//   - the reader refuses exactly the inputs that are not UTF-8;
//   - every section name is at least two bytes and has no surrounding white
//     space, and no key or value holds a line end;
//   - what the writer prints is UTF-8 and reads back;
//   - sections whose text is plain (no control characters, which XML cannot
//     carry) survive the XML property list unchanged.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>

#include "kxacore/Extensions/KXAStringExtensions.h"
#include "kxacore/Files/Text/KXCIniFile.h"
#include "kxacore/Files/Text/KXCIniFileSerialization.h"

namespace {

void check(bool condition) {
  if (!condition) std::abort();
}

bool hasLineEnd(std::string_view text) {
  return kxa_componentsSeparatedByNewline(std::string(text) + "x").size() != 1;
}

bool plain(std::string_view text) {
  for (const char c : text) {
    if (static_cast<unsigned char>(c) < 0x20 && c != '\t') return false;
  }
  return true;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string_view input(reinterpret_cast<const char*>(data), size);
  const auto ini = KXCIniFileNativeSerializator::iniFromString(input);
  check(static_cast<bool>(ini) == kxa_isValidUTF8(input));
  if (!ini) return 0;

  bool allPlain = true;
  for (const auto& [name, content] : ini->content()) {
    check(name.size() >= 2 && kxa_trim(name) == name && !hasLineEnd(name));
    allPlain = allPlain && plain(name);
    for (const auto& [key, value] : *content) {
      check(!hasLineEnd(key) && !hasLineEnd(value));
      allPlain = allPlain && plain(key) && plain(value);
    }
  }
  static_cast<void>(ini->description());

  const std::string written = KXCIniFileNativeSerializator::stringFromIni(*ini);
  check(kxa_isValidUTF8(written));
  check(static_cast<bool>(KXCIniFileNativeSerializator::iniFromString(written)));

  if (allPlain) {
    const std::string xml = KXCIniFilePropertyListSerializator::xmlFromIni(*ini);
    const auto back = KXCIniFilePropertyListSerializator::iniFromData(
        {reinterpret_cast<const std::uint8_t*>(xml.data()), xml.size()});
    check(back && back->sectionsNames() == ini->sectionsNames());
    for (const auto& [name, content] : ini->content()) {
      check(*back->content().find(name)->second == *content);
    }
  }
  return 0;
}
