// Arbitrary bytes into the date parser, and whatever comes out into text.
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "kxacore/Data/Dates/KXDDateParser.h"

namespace {

// The formatter's text once KXDDate has one; until then the record data.
template <class Date>
std::string render(const Date& date) {
  if constexpr (requires { date.stringWithGeneralFormat(); }) {
    return date.stringWithGeneralFormat();
  } else {
    return date.encodeToRecordData();
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static KXDDateParser& parser = *KXDDateParser::dateParser().release();
  // The first byte picks the settings, so their branches are reached too.
  if (size > 0) {
    const std::uint8_t flags = data[0];
    KXDDateParser::setDayBeforeMonth(flags & 1);
    KXDDateParser::setCenturyTreatment((flags >> 1) & 3);
    KXDDateParser::setDoubleDateTreatment((flags >> 3) & 3);
    KXDDateParser::setCommonEra(flags & 0x20);
    parser.setUsesShortcuts(!(flags & 0x40));
  }
  const std::string_view text(reinterpret_cast<const char*>(data), size);
  parser.parseDate(text);
  if (const auto& date = parser.date()) {
    const std::string shown = render(*date);
    (void)shown;
  }
  const std::string message = parser.parseErrorString();
  (void)message;
  return 0;
}
