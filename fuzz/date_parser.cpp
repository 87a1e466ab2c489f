// Arbitrary bytes into the date parser, and whatever comes out into text.
// Besides crashes it checks two promises: the shortcuts never change a
// result, and the cache answers as a fresh parse does.
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "kxacore/Data/Dates/KXDDateParser.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static KXDDateParser& fast = *KXDDateParser::dateParser().release();
  static KXDDateParser& slow = []() -> KXDDateParser& {
    auto parser = KXDDateParser::dateParser();
    parser->setUsesShortcuts(false);
    return *parser.release();
  }();
  static KXDDateParser& cached = []() -> KXDDateParser& {
    auto parser = KXDDateParser::dateParser();
    parser->enableCache(256);
    return *parser.release();
  }();

  // The first byte picks the settings, so their branches are reached too.
  if (size > 0) {
    const std::uint8_t flags = data[0];
    KXDDateParser::setDayBeforeMonth(flags & 1);
    KXDDateParser::setCenturyTreatment((flags >> 1) & 3);
    KXDDateParser::setDoubleDateTreatment((flags >> 3) & 3);
    KXDDateParser::setCommonEra(flags & 0x20);
    KXDDateParser::setAncientDateTypeWarning(!(flags & 0x40));
    KXDDateParser::setDoubleDateCutoffYear(flags & 0x80 ? 1582 : 1753);
  }
  const std::string_view text(reinterpret_cast<const char*>(data), size);
  fast.parseDate(text);
  slow.parseDate(text);
  if (fast.firstDateCode() != slow.firstDateCode() ||
      fast.secondDateCode() != slow.secondDateCode() || fast.qualifier() != slow.qualifier() ||
      fast.errors() != slow.errors() || fast.matchedPatterns() != slow.matchedPatterns()) {
    __builtin_trap();
  }

  // The cache is keyed by text alone, so only compare within one setting:
  // a hit made under other settings may rightly differ.
  cached.disableCache();
  cached.enableCache(256);
  const auto first = cached.dateFromString(text);
  const auto again = cached.dateFromString(text);
  if (first.has_value() != fast.date().has_value() || first.has_value() != again.has_value() ||
      (first && (first->encodeToRecordData() != again->encodeToRecordData() ||
                 first->encodeToRecordData() != fast.date()->encodeToRecordData()))) {
    __builtin_trap();
  }

  if (const auto& date = fast.date()) {
    const std::string shown = date->stringWithGeneralFormat();
    (void)shown;
  }
  const std::string message = fast.parseErrorString();
  (void)message;
  return 0;
}
