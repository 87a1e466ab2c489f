#include "kxacore/Data/Places/KXDPlaceNameFormatInfo.h"

#include <cstdlib>

#include "kxacore/Data/Places/KXDPlaceName.h"
#include "kxacore/Platform/KXAUserDefaults.h"
#include "kxacore/RegExp/KXCRegExp.h"

namespace {

bool present(const std::optional<std::string>& field) { return field && !field->empty(); }

// Appends the non-empty fields joined by ", ". The layouts are "%@, %@, ..."
// with every field, absent ones as "", followed by tidy(); leaving the empty
// fields out gives the same text after tidy() (each would only add one ", "
// to a run that tidy() collapses anyway) and usually spares it the expression.
template <typename... Fields>
void appendJoined(std::string& out, const Fields&... fields) {
  bool first = true;
  const auto one = [&](const std::optional<std::string>& field) {
    if (!present(field)) return;
    if (!first) out += ", ";
    first = false;
    out += *field;
  };
  (one(fields), ...);
}

// The home country is left out only for a place that lies in it and has
// some level below it; a place that is only its country keeps it. A level
// set to "" counts as a level here, as it always has: only an absent one
// does not.
bool omitsHomeCountry(const KXDPlaceName& place) {
  if (!present(place.country())) return false;
  if (!place.geo1() && !place.geo2() && !place.geo3() && !place.geo4()) return false;
  // Read last: the preference store takes a lock.
  const std::string_view home = KXDPlaceNameFormatInfo::homeCountry();
  return !home.empty() && home == *place.country();
}

const std::optional<std::string> kNone;

}  // namespace

KXDPlaceNameFormatInfo::KXDPlaceNameFormatInfo(std::string_view defaultFormat)
    : KXDFormatInfo(defaultFormat, "KXDPlaceNameFormatInfo") {}

KXDPlaceNameFormatInfo::KXDPlaceNameFormatInfo(const KXDPlaceNameFormatInfo& other)
    : KXDFormatInfo(other) {}

KXDPlaceNameFormatInfo::~KXDPlaceNameFormatInfo() = default;

std::unique_ptr<KXDFormatInfo> KXDPlaceNameFormatInfo::clone() const {
  return std::unique_ptr<KXDFormatInfo>(new KXDPlaceNameFormatInfo(*this));
}

std::shared_ptr<KXDPlaceNameFormatInfo> KXDPlaceNameFormatInfo::defaultFormatter() {
  // Never destroyed: places may be printed from other statics' destructors.
  static const auto& shared = *new std::shared_ptr<KXDPlaceNameFormatInfo>(
      std::make_shared<KXDPlaceNameFormatInfo>(kKXDFormatGeneral));
  return shared;
}

std::string_view KXDPlaceNameFormatInfo::homeCountry() {
  const std::int64_t index = KXAUserDefaults::integerForKey(kKXAPreferencesDateNameHomeCountryKey);
  if (index <= 0 || index >= static_cast<std::int64_t>(kKXDPlaceNameHomeCountries.size())) {
    return {};
  }
  return kKXDPlaceNameHomeCountries[static_cast<std::size_t>(index)];
}

const KXCRegExp& KXDPlaceNameFormatInfo::removeDuplicates() {
  static const KXCRegExp& pattern = [] () -> const KXCRegExp& {
    auto compiled = KXCRegExp::regExpWithPattern("(, )+");
    if (!compiled) std::abort();  // a build without a working POSIX engine is unusable
    return *compiled.release();   // lives for the whole process
  }();
  return pattern;
}

void KXDPlaceNameFormatInfo::tidy(std::string& text) {
  // Without ", , " every match is a single ", " replaced by itself: the
  // expression cannot change the text, so skip it (the common case).
  if (text.find(", , ") != std::string::npos) {
    text = removeDuplicates().replaceAllMatches(text, ", ");
  }
  const std::size_t begin = text.find_first_not_of(", ");
  if (begin == std::string::npos) {
    text.clear();
    return;
  }
  text.erase(text.find_last_not_of(", ") + 1);
  text.erase(0, begin);
}

std::optional<std::string> KXDPlaceNameFormatInfo::innerStringForObject(KXDFormatObject object,
                                                                        std::string_view format,
                                                                        KXDFormatInfo* provider) {
  const KXDPlaceName* place = object.get<KXDPlaceName>();
  const bool general = format == kKXDFormatGeneral;
  const bool generalWithCountry = format == kKXDPlaceNameFormatGeneralWithCountry;
  const bool common = format == kKXDPlaceNameFormatInfoCommon;
  const bool simple = format == kKXDPlaceNameFormatInfoSimple;
  const bool fullName = format == kKXDPlaceNameFormatInfoFullName;
  if (!place || !(general || generalWithCountry || common || simple || fullName)) {
    // User formats: the place reaches replaceTerm() through the context.
    return KXDFormatInfo::innerStringForObject(object, format, provider);
  }
  // A free text is the whole display under every named format, untidied.
  if (present(place->rawText())) return *place->rawText();

  const KXDPlaceName& p = *place;
  std::string text;
  text.reserve(64);
  if (general || generalWithCountry) {
    if (general && omitsHomeCountry(p)) {
      appendJoined(text, p.geo4(), p.geo3(), p.geo2(), p.geo1());
    } else {
      appendJoined(text, p.geo4(), p.geo3(), p.geo2(), p.geo1(), p.country());
    }
  } else if (common) {
    if (omitsHomeCountry(p)) {
      appendJoined(text, p.geo3(), p.geo2(), p.geo1());
    } else {
      // The country only with a geo4 (even an empty one): "Ohio, USA"
      // prints "Ohio". Kept as the application has always shown it.
      appendJoined(text, p.geo3(), p.geo2(), p.geo1(), p.geo4() ? p.country() : kNone);
    }
  } else if (simple) {
    for (const auto* level : {&p.geo4(), &p.geo3(), &p.geo2(), &p.geo1(), &p.country()}) {
      if (present(*level)) {
        text = **level;
        break;
      }
    }
  } else {
    appendJoined(text, p.geo4(), p.geo3(), p.geo2(), p.geo1(), p.country());
  }
  tidy(text);
  return text;
}

std::any KXDPlaceNameFormatInfo::contextInfoForObject(KXDFormatObject object) const {
  if (const KXDPlaceName* place = object.get<KXDPlaceName>()) return place;
  return KXDFormatInfo::contextInfoForObject(object);
}

std::optional<std::string> KXDPlaceNameFormatInfo::replaceTerm(std::string_view term,
                                                               const std::any& contextInfo) {
  const auto* const* place = std::any_cast<const KXDPlaceName*>(&contextInfo);
  if (!place || !*place) return KXDFormatInfo::replaceTerm(term, contextInfo);
  const KXDPlaceName& p = **place;
  if (term == kKXDPlaceNameFormatInfoCountry) return p.country();
  if (term == kKXDPlaceNameFormatInfoGeo1) return p.geo1();
  if (term == kKXDPlaceNameFormatInfoGeo2) return p.geo2();
  if (term == kKXDPlaceNameFormatInfoGeo3) return p.geo3();
  if (term == kKXDPlaceNameFormatInfoGeo4) return p.geo4();
  return KXDFormatInfo::replaceTerm(term, contextInfo);
}
