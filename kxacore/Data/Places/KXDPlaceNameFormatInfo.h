// File: KXDPlaceNameFormatInfo.h
//
// KXDPlaceNameFormatInfo prints KXDPlaceName values: the place subclass of
// the format engine (KXDFormatInfo). Named formats, for a place with geo4
// "Main St", no geo3, geo2 "Ohio" and country "USA", when the user's home
// country is "USA":
//
//   "G"   Main St, Ohio         all levels; the home country left out
//   "GC"  Main St, Ohio, USA    all levels and the country, always
//   "CM"  Ohio                  without geo4; the home country left out
//   "SP"  Main St               the most local level present
//   "FN"  Main St, Ohio, USA    all levels and the country, always
//
// Missing levels leave no empty slots: every run of ", " becomes one and
// commas and spaces are trimmed from both ends. A free-text place prints its
// text under every named format. Rules worth knowing:
//   - the home country is left out only when the place has some level below
//     it, so a place that is only "USA" prints "USA" even at home;
//   - "CM" prints the country only when the place has a geo4 (so geo2
//     "Ohio", country "USA" prints "Ohio" whatever the home country); the
//     files and reports people keep depend on this, so it stays;
//   - in both tests a level set to "" counts (only an absent level does
//     not), though it prints nothing: geo4 "" and country "USA" print ""
//     under "G" at home.
//
// Any other format is a template of the terms cy (country) and g1 to g4
// (the levels); everything else is literal text and an absent level prints
// nothing: "g4 in cy" gives "Main St in USA". No tidying and no free text
// here: a user format of a free-text place prints its literal parts only.
//
// The home country is the entry of homeCountriesArray() at the integer
// preference "KXADateNameHomeCountry", read at every call; index 0 ("None")
// or an index out of range means no home country.
//
// Thread safety: as KXDFormatInfo. The formatter keeps no state between or
// during calls beyond the engine's own; the place being printed travels to
// replaceTerm() as the engine's context, so one formatter may serve many
// threads (each call locks it, as the engine does).
#pragma once

#include <array>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "kxacore/Data/Format/KXDFormatInfo.h"

class KXCRegExp;

// Named formats. "G" (general) is the engine's kKXDFormatGeneral.
inline constexpr std::string_view kKXDPlaceNameFormatGeneralWithCountry = "GC";
inline constexpr std::string_view kKXDPlaceNameFormatInfoCommon = "CM";
inline constexpr std::string_view kKXDPlaceNameFormatInfoSimple = "SP";
inline constexpr std::string_view kKXDPlaceNameFormatInfoFullName = "FN";
// Terms of user formats.
inline constexpr std::string_view kKXDPlaceNameFormatInfoCountry = "cy";
inline constexpr std::string_view kKXDPlaceNameFormatInfoGeo1 = "g1";
inline constexpr std::string_view kKXDPlaceNameFormatInfoGeo2 = "g2";
inline constexpr std::string_view kKXDPlaceNameFormatInfoGeo3 = "g3";
inline constexpr std::string_view kKXDPlaceNameFormatInfoGeo4 = "g4";

// Integer preference: the user's home country, an index into
// KXDPlaceNameFormatInfo::homeCountriesArray().
inline constexpr std::string_view kKXAPreferencesDateNameHomeCountryKey = "KXADateNameHomeCountry";

// The countries a user may pick as home, in English. Index 0 means none.
// The indexes are stored in preferences: never reorder, insert or remove
// (former names such as Yugoslavia stay; England, Scotland, Wales and
// Northern Ireland are separate entries).
inline constexpr std::array<std::string_view, 233> kKXDPlaceNameHomeCountries = {
    "None", "Afghanistan", "Albania", "Algeria", "Andorra", "Angola", "Anguilla", "Antarctica",
    "Antigua and Barbuda", "Argentina", "Armenia", "Aruba", "Australia", "Austria", "Azerbaijan",
    "Bahamas", "Bahrain", "Bangladesh", "Barbados", "Belarus", "Belgium", "Belize", "Benin",
    "Bermuda", "Bhutan", "Bolivia", "Bosnia", "Botswana", "Bouvet Island", "Brazil",
    "Brunei Darussalam", "Bulgaria", "Burkina Faso", "Burundi", "Cambodia", "Cameroon", "Canada",
    "Cape Verde", "Cayman Islands", "Central African Republic", "Chad", "Channel Islands",
    "Chile", "China", "Christmas Island", "Cocos Islands", "Colombia", "Comoros", "Congo",
    "Cook Islands", "Costa Rica", "Cote D'Ivoire", "Croatia", "Cuba", "Cyprus", "Czech Republic",
    "Denmark", "Djibouti", "Dominica", "Dominican Republic", "East Timor", "Ecuador", "Egypt",
    "El Salvador", "England", "Equatorial Guinea", "Eritrea", "Estonia", "Ethiopia",
    "Falkland Islands", "Faroe Islands", "Fiji", "Finland", "France", "French Guiana",
    "French Polynesia", "French Southern Territories", "Gabon", "Gambia",
    "Georgia (Republic of)", "Germany", "Ghana", "Gibraltar", "Greece", "Greenland", "Grenada",
    "Guadeloupe", "Guatemala", "Guinea", "Guinea-Bissau", "Guyana", "Haiti",
    "Heard and Mc Donald Islands", "Honduras", "Hungary", "Iceland", "India", "Indonesia",
    "Iran", "Iraq", "Ireland", "Isle of Man", "Israel", "Italy", "Jamaica", "Japan", "Jordan",
    "Kazakhstan", "Kenya", "Kiribati", "Kuwait", "Kyrgyzstan",
    "Lao People's Democratic Republic", "Latvia", "Lebanon", "Lesotho", "Liberia",
    "Libyan Arab Jamahiriya", "Liechtenstein", "Lithuania", "Luxembourg", "Macedonia",
    "Madagascar", "Malawi", "Malaysia", "Maldives", "Mali", "Malta", "Marshall Islands",
    "Martinique", "Mauritania", "Mauritius", "Mayotte", "Mexico", "Micronesia", "Moldova",
    "Monaco", "Mongolia", "Montserrat", "Morocco", "Mozambique", "Myanmar", "Namibia", "Nauru",
    "Nepal", "Netherlands", "Netherlands Antilles", "New Caledonia", "New Zealand", "Nicaragua",
    "Niger", "Nigeria", "Niue", "Norfolk Island", "North Korea", "Northern Ireland", "Norway",
    "Oman", "Pakistan", "Palau", "Panama", "Papua New Guinea", "Paraguay", "Peru", "Philippines",
    "Pitcairn", "Poland", "Portugal", "Qatar", "Reunion", "Romania", "Russia", "Rwanda", "Samoa",
    "San Marino", "Sao Tome and Principe", "Saudi Arabia", "Scotland", "Senegal", "Seychelles",
    "Sierra Leone", "Singapore", "Slovakia", "Slovenia", "Solomon Islands", "Somalia",
    "South Africa", "South Georgia and the South Sandwich Islands", "South Korea", "Spain",
    "Sri Lanka", "St Helena", "St Kitts and Nevis", "St Lucia", "St Pierre and Miquelon",
    "St Vincent and the Grenadines", "Sudan", "Suriname", "Svalbard and Jan Mayen Islands",
    "Swaziland", "Sweden", "Switzerland", "Syrian Arab Republic", "Taiwan", "Tajikistan",
    "Tanzania", "Thailand", "Togo", "Tokelau", "Tonga", "Trinidad and Tobago", "Tunisia",
    "Turkey", "Turkmenistan", "Turks and Caicos Islands", "Tuvalu", "Uganda", "Ukraine",
    "United Arab Emirates", "Uruguay", "USA", "Uzbekistan", "Vanuatu", "Venezuela", "Vietnam",
    "Virgin Islands (British)", "Wales", "Wallis and Futuna Islands", "Western Sahara", "Yemen",
    "Yugoslavia", "Zambia", "Zimbabwe",
};
static_assert(kKXDPlaceNameHomeCountries.front() == "None" &&
              kKXDPlaceNameHomeCountries[1] == "Afghanistan" &&
              kKXDPlaceNameHomeCountries[36] == "Canada" &&
              kKXDPlaceNameHomeCountries[220] == "USA" &&
              kKXDPlaceNameHomeCountries.back() == "Zimbabwe");

class KXDPlaceNameFormatInfo : public KXDFormatInfo {
 public:
  explicit KXDPlaceNameFormatInfo(std::string_view defaultFormat = kKXDFormatGeneral);
  ~KXDPlaceNameFormatInfo() override;

  [[nodiscard]] std::unique_ptr<KXDFormatInfo> clone() const override;

  // The formatter every place prints through, made on first use with format
  // "G" and never released.
  [[nodiscard]] static std::shared_ptr<KXDPlaceNameFormatInfo> defaultFormatter();

  // The 233 entries of kKXDPlaceNameHomeCountries.
  [[nodiscard]] static const std::array<std::string_view, 233>& homeCountriesArray() noexcept {
    return kKXDPlaceNameHomeCountries;
  }
  // The entry at the home-country preference when it is above 0 and below
  // 233, else "". The view is into the static table.
  [[nodiscard]] static std::string_view homeCountry();

  // Every run of ", " becomes one, then commas and spaces are trimmed from
  // both ends: ", , Ohio, " gives "Ohio".
  static void tidy(std::string& text);
  // "(, )+", compiled once: what tidy() collapses.
  [[nodiscard]] static const KXCRegExp& removeDuplicates();

  // ---- KXDFormatInfo hooks ------------------------------------------------

  // A KXDPlaceName under a named format: the layouts above. Under any other
  // format, and for other objects: the base substitution.
  [[nodiscard]] std::optional<std::string> innerStringForObject(KXDFormatObject object,
                                                                std::string_view format,
                                                                KXDFormatInfo* provider) override;
  // The place being formatted (a const KXDPlaceName*), for replaceTerm().
  [[nodiscard]] std::any contextInfoForObject(KXDFormatObject object) const override;
  // cy and g1 to g4 of the place in `contextInfo`; an absent field drops
  // the term. Any other term, or no place, is kept as written.
  [[nodiscard]] std::optional<std::string> replaceTerm(std::string_view term,
                                                       const std::any& contextInfo) override;

 protected:
  KXDPlaceNameFormatInfo(const KXDPlaceNameFormatInfo& other);
};
