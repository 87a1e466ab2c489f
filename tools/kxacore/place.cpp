// kxacore place decode | format | encode: place records, their fields and
// their display texts.

#include <charconv>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <iostream>
#include <memory>
#include <optional>
#include <string>
#include <system_error>
#include <vector>

#include "kxacore/Data/Places/KXDPlaceName.h"
#include "kxacore/Data/Places/KXDPlaceNameFormatInfo.h"
#include "kxacore/Extensions/KXAStringExtensions.h"
#include "kxacore/Platform/KXAUserDefaults.h"
#include "tools/kxacore/Commands.h"

namespace {

struct PlaceOptions {
  bool json = false;
  std::string homeCountry;  // index or name; empty: the stored preference
  // decode
  std::vector<std::string> records;
  std::string file;
  // format
  std::string format;
  // encode: each string counts only when its option was given
  std::string geo4, geo3, geo2, geo1, country, text, code, latitude, longitude;
};

// An option's value, or none when the option was not on the command line:
// --geo3 "" is an empty level, no --geo3 an absent one.
std::optional<std::string> given(const CLI::App& command, const char* name,
                                 const std::string& value) {
  if (command.get_option(name)->count() == 0) return std::nullopt;
  return value;
}

// Sets the home-country preference from "--home-country": an index into the
// list (0 for none) or a country's name, matched exactly, then ignoring
// ASCII case.
void applyHomeCountry(const std::string& value) {
  if (value.empty()) return;
  const auto& countries = KXDPlaceNameFormatInfo::homeCountriesArray();
  std::int64_t index = 0;
  const auto [end, error] = std::from_chars(value.data(), value.data() + value.size(), index);
  if (error == std::errc() && end == value.data() + value.size()) {
    if (index < 0 || index >= static_cast<std::int64_t>(countries.size())) {
      throw KXACommandError("home country index out of range (0 to " +
                            std::to_string(countries.size() - 1) + "): " + value);
    }
    KXAUserDefaults::setInteger(kKXAPreferencesDateNameHomeCountryKey, index);
    return;
  }
  std::optional<std::size_t> found;
  for (std::size_t i = 0; i < countries.size() && !found; ++i) {
    if (countries[i] == value) found = i;
  }
  const std::string lower = kxa_asciiLower(value);
  for (std::size_t i = 0; i < countries.size() && !found; ++i) {
    if (kxa_asciiLower(countries[i]) == lower) found = i;
  }
  if (!found) {
    throw KXACommandError("unknown home country: \"" + value +
                          "\" (give a name from the list or its index, 0 for none)");
  }
  KXAUserDefaults::setInteger(kKXAPreferencesDateNameHomeCountryKey,
                              static_cast<std::int64_t>(*found));
}

std::int64_t parseCode(const std::string& text) {
  std::int64_t value = 0;
  const std::string_view trimmed = kxa_trim(text);
  const auto [end, error] =
      std::from_chars(trimmed.data(), trimmed.data() + trimmed.size(), value);
  if (trimmed.empty() || error != std::errc() || end != trimmed.data() + trimmed.size()) {
    throw KXACommandError("--code needs a 64-bit integer, not \"" + text + "\"");
  }
  return value;
}

float parseCoordinate(const char* option, const std::string& text) {
  float value = 0;
  const std::string_view trimmed = kxa_trim(text);
  const auto [end, error] = std::from_chars(trimmed.data(), trimmed.data() + trimmed.size(),
                                            value, std::chars_format::general);
  if (trimmed.empty() || error != std::errc() || end != trimmed.data() + trimmed.size()) {
    throw KXACommandError(std::string(option) + " needs a number of degrees, not \"" + text +
                          "\"");
  }
  return value;
}

nlohmann::ordered_json jsonText(const std::optional<std::string>& text) {
  return text ? nlohmann::ordered_json(*text) : nlohmann::ordered_json(nullptr);
}

// A coordinate as the shortest decimal that reads back as the same float
// (39.7817 rather than the double 39.78170013427734); null when the record
// would leave it out. JSON has no infinity: those print as null too.
nlohmann::ordered_json jsonCoordinate(float value) {
  if (!KXDPlaceName::hasCoordinate(value)) return nullptr;
  char buffer[64];
  const auto result = std::to_chars(buffer, buffer + sizeof buffer, value);
  double widened = 0;
  static_cast<void>(std::from_chars(buffer, result.ptr, widened));
  return widened;
}

std::string textCoordinate(float value) {
  if (!KXDPlaceName::hasCoordinate(value)) return "(none)";
  char buffer[64];
  const auto result = std::to_chars(buffer, buffer + sizeof buffer, value);
  return std::string(buffer, result.ptr);
}

void printPlace(const KXDPlaceName& place, const std::string& display, bool json,
                const std::string* format = nullptr) {
  if (json) {
    nlohmann::ordered_json object = {{"record", place.recordData()},
                                     {"rawText", jsonText(place.rawText())},
                                     {"geo4", jsonText(place.geo4())},
                                     {"geo3", jsonText(place.geo3())},
                                     {"geo2", jsonText(place.geo2())},
                                     {"geo1", jsonText(place.geo1())},
                                     {"country", jsonText(place.country())},
                                     {"code", place.code()},
                                     {"latitude", jsonCoordinate(place.latitude())},
                                     {"longitude", jsonCoordinate(place.longitude())}};
    if (format) object["format"] = *format;
    object["display"] = display;
    printJsonLine(object);
    return;
  }
  const auto field = [](const std::optional<std::string>& text) {
    return text ? '"' + *text + '"' : std::string("(absent)");
  };
  std::cout << place.recordData() << '\n'
            << "  rawText    " << field(place.rawText()) << '\n'
            << "  geo4       " << field(place.geo4()) << '\n'
            << "  geo3       " << field(place.geo3()) << '\n'
            << "  geo2       " << field(place.geo2()) << '\n'
            << "  geo1       " << field(place.geo1()) << '\n'
            << "  country    " << field(place.country()) << '\n'
            << "  code       " << place.code() << '\n'
            << "  latitude   " << textCoordinate(place.latitude()) << '\n'
            << "  longitude  " << textCoordinate(place.longitude()) << '\n';
  if (format) std::cout << "  format     " << *format << '\n';
  std::cout << "  display    " << display << '\n';
}

void runDecode(const PlaceOptions& options) {
  applyHomeCountry(options.homeCountry);
  std::vector<std::string> records = options.records;
  if (!options.file.empty()) {
    std::error_code error;
    std::ifstream in;
    if (!std::filesystem::is_directory(options.file, error)) in.open(options.file, std::ios::binary);
    if (!in.is_open() || !in) throw KXACommandError("cannot read " + options.file);
    const std::string text{std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
    if (in.bad()) throw KXACommandError("cannot read " + options.file);
    // One record per line; blank lines are separators, not empty records.
    for (std::string_view line : kxa_splitLines(text)) {
      if (!line.empty()) records.emplace_back(line);
    }
  }
  if (records.empty() && options.file.empty()) {
    throw KXACommandError("give at least one RECORD or --file FILE");
  }
  for (const std::string& record : records) {
    const KXDPlaceName place = KXDPlaceName::placeNameWithRecordData(record);
    printPlace(place, place.stringWithGeneralFormat(), options.json);
  }
}

void runFormat(const PlaceOptions& options) {
  applyHomeCountry(options.homeCountry);
  for (const std::string& record : options.records) {
    const KXDPlaceName place = KXDPlaceName::placeNameWithRecordData(record);
    const std::string display = place.stringWithFormat(options.format);
    if (options.json) {
      printPlace(place, display, true, &options.format);
    } else {
      std::cout << display << '\n';
    }
  }
}

void runEncode(const CLI::App& command, const PlaceOptions& options) {
  applyHomeCountry(options.homeCountry);
  const std::int64_t code = command.get_option("--code")->count() ? parseCode(options.code) : 0;
  const float latitude =
      command.get_option("--lat")->count() ? parseCoordinate("--lat", options.latitude) : 0;
  const float longitude =
      command.get_option("--lon")->count() ? parseCoordinate("--lon", options.longitude) : 0;
  const std::optional<std::string> text = given(command, "--text", options.text);
  const KXDPlaceName place =
      text ? KXDPlaceName::placeNameWithText(text, code, latitude, longitude)
           : KXDPlaceName::placeNameWithGeo1(
                 given(command, "--geo1", options.geo1), given(command, "--geo2", options.geo2),
                 given(command, "--geo3", options.geo3), given(command, "--geo4", options.geo4),
                 given(command, "--country", options.country), code, latitude, longitude);
  if (options.json) {
    printPlace(place, place.stringWithGeneralFormat(), true);
  } else {
    std::cout << place.recordData() << '\n';
  }
}

void addHomeCountry(CLI::App* command, PlaceOptions& options) {
  command->add_option("--home-country", options.homeCountry,
                      "Home country for the display: an index into the list (0 for none) or a "
                      "name such as USA; left out of G and CM texts");
}

}  // namespace

void registerPlaceCommands(CLI::App& app) {
  CLI::App* place = app.add_subcommand("place", "Place records: decode, format and encode");
  place->require_subcommand(1);

  auto decodeOptions = std::make_shared<PlaceOptions>();
  CLI::App* decode = place->add_subcommand(
      "decode", "Print the fields and general display text of each place RECORD");
  decode->add_flag("--json", decodeOptions->json, "One JSON object per record");
  decode->add_option("--file", decodeOptions->file, "Read records from FILE, one per line");
  addHomeCountry(decode, *decodeOptions);
  decode->add_option("RECORD", decodeOptions->records, "Place records such as /a/b/c/d/e///");
  decode->callback([decodeOptions] { runDecode(*decodeOptions); });

  auto formatOptions = std::make_shared<PlaceOptions>();
  CLI::App* format =
      place->add_subcommand("format", "Print each place RECORD in a named or user format");
  format->add_option("--format", formatOptions->format,
                     "G, GC, CM, SP, FN, or a user format of the terms cy, g1, g2, g3, g4")
      ->required();
  addHomeCountry(format, *formatOptions);
  format->add_flag("--json", formatOptions->json, "One JSON object per record");
  format->add_option("RECORD", formatOptions->records, "Place records")->required();
  format->callback([formatOptions] { runFormat(*formatOptions); });

  auto encodeOptions = std::make_shared<PlaceOptions>();
  CLI::App* encode = place->add_subcommand("encode", "Print the record of a place built from parts");
  encode->add_option("--geo4", encodeOptions->geo4, "Most local level (a street, a village)");
  encode->add_option("--geo3", encodeOptions->geo3, "Third level");
  encode->add_option("--geo2", encodeOptions->geo2, "Second level");
  encode->add_option("--geo1", encodeOptions->geo1, "Level just below the country");
  encode->add_option("--country", encodeOptions->country, "Country");
  CLI::Option* text =
      encode->add_option("--text", encodeOptions->text, "Free text instead of levels");
  for (const char* level : {"--geo4", "--geo3", "--geo2", "--geo1", "--country"}) {
    text->excludes(encode->get_option(level));
  }
  encode->add_option("--code", encodeOptions->code, "Place code (0: none)");
  encode->add_option("--lat", encodeOptions->latitude, "Latitude in degrees");
  encode->add_option("--lon", encodeOptions->longitude, "Longitude in degrees");
  addHomeCountry(encode, *encodeOptions);
  encode->add_flag("--json", encodeOptions->json, "A JSON object with the fields");
  encode->callback([encode, encodeOptions] { runEncode(*encode, *encodeOptions); });
}
