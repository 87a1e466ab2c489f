// Place records from arbitrary bytes: decode, encode again, format.
//
// Properties checked (abort on failure):
//   - a decoded place hands its record back verbatim and equals its copy,
//     with the same hash;
//   - the re-encoded record has the layout of its form: eight "/" for a
//     structured place; three "/" and one "|" for a free text whose text
//     holds neither separator;
//   - a structured place decodes from its encoding to the same levels
//     (absent and empty both come back absent) and code, and its coordinates
//     to within the ten written decimals;
//   - a free text holding neither separator comes back with the same text;
//   - one round trip later the record is a fixed point;
//   - every named format prints what the layout rules give when spelled
//     out literally ("%@, %@, ..." of every field, then the "(, )+"
//     expression and the trim), which checks the formatter's shortcuts;
//   - a user format prints without failing.
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <optional>
#include <string>
#include <string_view>

#include "kxacore/Data/Places/KXDPlaceName.h"
#include "kxacore/Data/Places/KXDPlaceNameFormatInfo.h"
#include "kxacore/Platform/KXAStringFormat.h"
#include "kxacore/Platform/KXAUserDefaults.h"
#include "kxacore/RegExp/KXCRegExp.h"

namespace {

void check(bool condition) {
  if (!condition) std::abort();
}

bool nonEmpty(const std::optional<std::string>& text) { return text && !text->empty(); }

// The record keeps no difference between absent and empty.
bool sameLevel(const std::optional<std::string>& a, const std::optional<std::string>& b) {
  return a.value_or("") == b.value_or("");
}

// Ten decimals keep 0.5e-10; the float read back adds at most half its ulp.
// A coordinate that rounds below epsilon comes back absent (zero).
bool sameCoordinate(float written, float read) {
  if (!KXDPlaceName::hasCoordinate(written)) return read == 0.0f;
  if (!std::isfinite(written)) return true;  // "inf" is not a number to the reader
  const double tolerance = 0.6e-10 + std::fabs(static_cast<double>(written)) * 1e-7;
  return std::fabs(static_cast<double>(written) - read) <= tolerance;
}

std::size_t count(std::string_view text, char c) {
  std::size_t n = 0;
  for (const char byte : text) n += byte == c;
  return n;
}

KXDPlaceName reencoded(const KXDPlaceName& place) {
  return KXDPlaceName::placeNameWithPlaceName(place, place.latitude(), place.longitude(),
                                              place.code());
}

std::string literalTidy(std::string_view text) {
  std::string out = KXDPlaceNameFormatInfo::removeDuplicates().replaceAllMatches(text, ", ");
  const std::size_t begin = out.find_first_not_of(", ");
  if (begin == std::string::npos) return {};
  return out.substr(begin, out.find_last_not_of(", ") + 1 - begin);
}

// The named layouts, spelled out the long way.
std::string literalDisplay(const KXDPlaceName& p, std::string_view format, std::string_view home) {
  if (nonEmpty(p.rawText())) return *p.rawText();
  const std::string g4 = p.geo4().value_or(""), g3 = p.geo3().value_or(""),
                    g2 = p.geo2().value_or(""), g1 = p.geo1().value_or(""),
                    cy = p.country().value_or("");
  const bool someLevel = p.geo4() || p.geo3() || p.geo2() || p.geo1();
  const bool atHome = !home.empty() && p.country() && *p.country() == home && someLevel;
  if (format == "G" && atHome) return literalTidy(KXAStringWithFormat("%@, %@, %@, %@", g4, g3, g2, g1));
  if (format == "G" || format == "GC" || format == "FN") {
    return literalTidy(KXAStringWithFormat("%@, %@, %@, %@, %@", g4, g3, g2, g1, cy));
  }
  if (format == "CM") {
    if (atHome) return literalTidy(KXAStringWithFormat("%@, %@, %@", g3, g2, g1));
    return literalTidy(
        KXAStringWithFormat("%@, %@, %@, %@", g3, g2, g1, p.geo4() ? cy : std::string()));
  }
  for (const std::string* level : {&g4, &g3, &g2, &g1}) {
    if (!level->empty()) return literalTidy(*level);
  }
  return literalTidy(cy);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string_view input(reinterpret_cast<const char*>(data), size);
  const KXDPlaceName place = KXDPlaceName::placeNameWithRecordData(input);
  check(place.recordData() == input);
  const KXDPlaceName copy = place;
  check(copy == place);  // decoding never yields NaN
  check(copy.hash() == place.hash());
  static_cast<void>(place.description());

  const KXDPlaceName fresh = reencoded(place);
  check(fresh == place);
  const std::string record = fresh.recordData();
  const bool freeText = nonEmpty(place.rawText());
  const bool plainText =
      freeText && place.rawText()->find_first_of("/|") == std::string::npos;
  if (!freeText) check(count(record, '/') == 8);
  if (plainText) check(count(record, '/') == 3 && count(record, '|') == 1);

  const bool finite = std::isfinite(place.latitude()) && std::isfinite(place.longitude());
  const KXDPlaceName back = KXDPlaceName::placeNameWithRecordData(record);
  if (finite && (!freeText || plainText)) {
    check(back.code() == place.code());
    check(sameCoordinate(place.latitude(), back.latitude()));
    check(sameCoordinate(place.longitude(), back.longitude()));
    if (freeText) {
      check(back.rawText() == place.rawText());
    } else {
      check(!back.rawText());
      check(sameLevel(back.geo4(), place.geo4()) && sameLevel(back.geo3(), place.geo3()) &&
            sameLevel(back.geo2(), place.geo2()) && sameLevel(back.geo1(), place.geo1()) &&
            sameLevel(back.country(), place.country()));
    }
    const std::string again = reencoded(back).recordData();
    check(reencoded(KXDPlaceName::placeNameWithRecordData(again)).recordData() == again);
  }

  // The first byte picks a home country, so both sides of the rule run.
  const std::int64_t home = size > 0 ? static_cast<std::int64_t>(data[0]) : 0;
  KXAUserDefaults::setInteger(kKXAPreferencesDateNameHomeCountryKey, home);
  const std::string_view homeName = KXDPlaceNameFormatInfo::homeCountry();
  for (const std::string_view format : {"G", "GC", "CM", "SP", "FN"}) {
    check(place.stringWithFormat(format) == literalDisplay(place, format, homeName));
  }
  static_cast<void>(place.stringWithFormat("g4, g3 (g2) g1 cy x"));
  return 0;
}
