// Property lists (XML or binary) from arbitrary bytes, read as INI files.
//
// Properties checked (abort on failure):
//   - every name, key and value read is UTF-8;
//   - what we write as XML reads back to the same sections when their text
//     is plain (XML cannot carry control characters);
//   - the native writer prints UTF-8.
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

bool plain(std::string_view text) {
  for (const char c : text) {
    if (static_cast<unsigned char>(c) < 0x20 && c != '\t' && c != '\n') return false;
    if (c == '\0') return false;
  }
  return true;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const auto ini = KXCIniFilePropertyListSerializator::iniFromData({data, size});
  if (!ini) return 0;
  bool allPlain = true;
  for (const auto& [name, content] : ini->content()) {
    check(kxa_isValidUTF8(name));
    allPlain = allPlain && plain(name);
    for (const auto& [key, value] : *content) {
      check(kxa_isValidUTF8(key) && kxa_isValidUTF8(value));
      allPlain = allPlain && plain(key) && plain(value);
    }
  }
  check(kxa_isValidUTF8(KXCIniFileNativeSerializator::stringFromIni(*ini)));
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
