// KXDPlaceName: the place of a genealogical fact.
//
// A place is either structured, up to four levels of political division
// plus a country (geo4 is the most local level, geo1 the level just below
// the country), or a free text (rawText). Both kinds carry an integer place
// code (0: none) and a latitude and longitude in degrees, where a magnitude
// below FLT_EPSILON (1.1920929e-7) counts as "no coordinate".
//
//   auto home = KXDPlaceName::placeNameWithGeo1("Illinois", std::nullopt, "Sangamon",
//                                              "Springfield", "USA", 0, 39.7817f, -89.6501f);
//   home.recordData();   // "/Springfield/Sangamon//Illinois/USA//39.7817001343/-89.6501007080"
//   auto back = KXDPlaceName::placeNameWithRecordData(home.recordData());
//   back == home;        // true
//
// Record (one text line; "/" separates fields; there is no escaping, so a
// level cannot hold "/" and a free text cannot hold "|"):
//   structured  /geo4/geo3/geo2/geo1/country/code/latitude/longitude
//   free text   /rawText|code/latitude/longitude
// Absent and empty strings are both written as nothing. The code is written
// in decimal only when non-zero, each coordinate with ten decimals only when
// present; when the longitude is absent nothing follows the last "/". The
// free-text form is used whenever rawText is non-empty.
//
// Absent versus empty: every string field is std::optional. A record that
// leaves a level empty leaves it absent. operator== keeps an absent level
// apart from an empty one (deliberately: equality is per stored value, not
// per display), while records and nameParts() write both as "".
//
// Decoding never fails: a record that is neither form degrades to a free
// text holding the record (without its leading "/"). Fields read before a
// structured attempt failed keep their values, as existing data has always
// been read: a free-text record therefore also carries its first
// "/"-separated pieces in geo4, geo3 ... ("/Cork|//" leaves "Cork|" in
// geo4). Display texts show only rawText for such a place.
//
// Records decode eagerly, when the place is built, and the record string is
// kept: recordData() returns it verbatim until setFromNameParts() or
// placeNameWithPlaceName() drops it, so a caller cannot tell this from
// decoding on first access; decoding up front is what makes every const
// member free of hidden writes.
//
// Thread safety: a value. Copies are independent; const members may be
// called from any number of threads at once; non-const members need
// external synchronisation.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <initializer_list>
#include <optional>
#include <span>
#include <string>
#include <string_view>

class KXDFormatInfo;
class KXDPlaceNameFormatInfo;

class KXDPlaceName {
 public:
  // Magnitude below which a coordinate counts as absent (FLT_EPSILON).
  static constexpr float kCoordinateEpsilon = 1.1920928955078125e-7f;

  // An empty place: every string absent, code and coordinates 0.
  KXDPlaceName() = default;

  // A place decoded from its record (see the file comment). Never fails: a
  // malformed record degrades to free text. The desktop interface gave
  // "none" for a record of none; a caller holding an optional record
  // decides that itself.
  [[nodiscard]] static KXDPlaceName placeNameWithRecordData(std::string_view record);
  // A structured place; rawText stays absent. Note the argument order:
  // geo1 (just below the country) first, geo4 (most local) last.
  [[nodiscard]] static KXDPlaceName placeNameWithGeo1(
      std::optional<std::string> geo1, std::optional<std::string> geo2,
      std::optional<std::string> geo3, std::optional<std::string> geo4,
      std::optional<std::string> country, std::int64_t code, float latitude, float longitude);
  // A free-text place; the levels and the country stay absent.
  [[nodiscard]] static KXDPlaceName placeNameWithText(std::optional<std::string> text,
                                                      std::int64_t code, float latitude,
                                                      float longitude);
  // A copy of `place` with its stored record dropped and the code and
  // coordinates replaced.
  [[nodiscard]] static KXDPlaceName placeNameWithPlaceName(const KXDPlaceName& place,
                                                           float latitude, float longitude,
                                                           std::int64_t code);

  [[nodiscard]] const std::optional<std::string>& rawText() const noexcept { return rawText_; }
  [[nodiscard]] const std::optional<std::string>& country() const noexcept { return country_; }
  [[nodiscard]] const std::optional<std::string>& geo1() const noexcept { return geo1_; }
  [[nodiscard]] const std::optional<std::string>& geo2() const noexcept { return geo2_; }
  [[nodiscard]] const std::optional<std::string>& geo3() const noexcept { return geo3_; }
  [[nodiscard]] const std::optional<std::string>& geo4() const noexcept { return geo4_; }
  [[nodiscard]] std::int64_t code() const noexcept { return code_; }
  [[nodiscard]] float latitude() const noexcept { return latitude_; }
  [[nodiscard]] float longitude() const noexcept { return longitude_; }

  // True when the coordinate would be written to a record.
  [[nodiscard]] static bool hasCoordinate(float value) noexcept;

  // The stored record while the place has one, else the encoding of its fields.
  [[nodiscard]] std::string recordData() const;
  // True while recordData() returns the record the place was decoded from.
  [[nodiscard]] bool hasStoredRecord() const noexcept { return record_.has_value(); }

  // Place-authority view: exactly five strings, country, geo1, geo2, geo3,
  // geo4, an absent field giving "".
  [[nodiscard]] std::array<std::string, 5> nameParts() const;
  // Drops the stored record, then takes up to five entries in the order of
  // nameParts() and stores each non-empty one. An empty entry keeps the
  // field as it was: this fills or changes levels, never clears them.
  void setFromNameParts(std::span<const std::string> parts);
  void setFromNameParts(std::initializer_list<std::string_view> parts);

  // Every field, for debugging; the layout may change.
  [[nodiscard]] std::string description() const;

  // Display through the shared place formatter (KXDPlaceNameFormatInfo):
  // formatter().stringForObject(*this, format, provider), "" for none. No
  // format means the provider's default format ("G" for the shared
  // formatter); a null provider means the formatter itself. Each call locks
  // the shared formatter (and the provider) for its length.
  [[nodiscard]] std::string stringWithGeneralFormat() const;
  // Format "GC": the country even when it is the home country.
  [[nodiscard]] std::string stringWithGeneralFormatWithCountry() const;
  [[nodiscard]] std::string stringWithFormat(std::string_view format) const;
  [[nodiscard]] std::string stringWithFormatInfo(KXDFormatInfo* provider) const;
  [[nodiscard]] std::string stringWithFormat(std::optional<std::string_view> format,
                                             KXDFormatInfo* provider) const;
  // The formatter every place prints through: the shared instance, which
  // lives for the whole process.
  [[nodiscard]] static KXDPlaceNameFormatInfo& formatter();

  // Equal when code and coordinates are equal as numbers (so +0 equals -0
  // and a NaN coordinate equals nothing) and each string is absent in both
  // or present in both with the same bytes. The stored record takes no part.
  friend bool operator==(const KXDPlaceName& a, const KXDPlaceName& b) noexcept;
  // Consistent with operator==: equal places hash alike.
  [[nodiscard]] std::size_t hash() const noexcept;

 private:
  // Algorithm of the record reader; false when the record was malformed.
  bool decode(std::string_view record);
  bool decodeStructured(std::string_view record);
  bool decodeFreeText(std::string_view record);
  [[nodiscard]] std::string encode() const;

  std::optional<std::string> rawText_;
  std::optional<std::string> country_;
  std::optional<std::string> geo1_, geo2_, geo3_, geo4_;
  std::int64_t code_ = 0;
  float latitude_ = 0;
  float longitude_ = 0;
  std::optional<std::string> record_;  // the record decoded, until dropped
};

template <>
struct std::hash<KXDPlaceName> {
  std::size_t operator()(const KXDPlaceName& place) const noexcept { return place.hash(); }
};
