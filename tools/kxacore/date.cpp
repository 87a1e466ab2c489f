// kxacore date encode | decode | to-sdn | from-sdn: record codes, record data
// and the three calendars' day numbers.
#include <algorithm>
#include <charconv>
#include <cstdint>
#include <iostream>
#include <limits>
#include <memory>
#include <optional>
#include <sstream>
#include <string>
#include <string_view>
#include <vector>

#include "kxacore/Data/Dates/KXDDate.h"
#include "kxacore/Extensions/KXAStringExtensions.h"
#include "tools/kxacore/Commands.h"

namespace {

using Json = nlohmann::ordered_json;

// Decimal with an optional sign, or (when allowed) 0x hexadecimal. The
// whole argument must be the number: "12abc" is an error, not 12.
std::int64_t parseInteger(std::string_view text, std::string_view what, bool allowHex = false) {
  const auto fail = [&]() -> std::int64_t {
    throw KXACommandError(std::string(what) + " must be " +
                          (allowHex ? "a decimal or 0x hexadecimal integer" : "an integer") +
                          ", not '" + std::string(text) + "'");
  };
  std::string_view digits = text;
  bool negative = false;
  if (!digits.empty() && (digits.front() == '+' || digits.front() == '-')) {
    negative = digits.front() == '-';
    digits.remove_prefix(1);
  }
  int base = 10;
  if (allowHex && digits.size() > 2 && digits[0] == '0' && (digits[1] == 'x' || digits[1] == 'X')) {
    digits.remove_prefix(2);
    base = 16;
  }
  if (digits.empty()) return fail();
  std::uint64_t magnitude = 0;
  const auto [end, error] =
      std::from_chars(digits.data(), digits.data() + digits.size(), magnitude, base);
  if (error == std::errc::result_out_of_range) {
    throw KXACommandError(std::string(what) + " is out of range: '" + std::string(text) + "'");
  }
  if (error != std::errc() || end != digits.data() + digits.size()) return fail();
  constexpr auto kMax = static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max());
  if (magnitude > kMax + (negative ? 1 : 0)) {
    throw KXACommandError(std::string(what) + " is out of range: '" + std::string(text) + "'");
  }
  // Negating in unsigned arithmetic reaches INT64_MIN without overflow.
  return static_cast<std::int64_t>(negative ? 0 - magnitude : magnitude);
}

// The calendar arithmetic takes 32-bit parts; refuse what it would truncate.
std::int32_t parsePart(std::string_view text, std::string_view what) {
  const std::int64_t value = parseInteger(text, what);
  if (value < std::numeric_limits<std::int32_t>::min() ||
      value > std::numeric_limits<std::int32_t>::max()) {
    throw KXACommandError(std::string(what) + " does not fit in 32 bits: '" + std::string(text) +
                          "'");
  }
  return static_cast<std::int32_t>(value);
}

enum class Calendar { kGregorian, kJulian, kJewish };

Calendar parseCalendar(std::string_view name) {
  const std::string lower = kxa_asciiLower(name);
  if (lower == "gregorian") return Calendar::kGregorian;
  if (lower == "julian") return Calendar::kJulian;
  if (lower == "jewish") return Calendar::kJewish;
  throw KXACommandError("unknown calendar '" + std::string(name) +
                        "' (use gregorian, julian or jewish)");
}

const char* calendarName(Calendar calendar) {
  switch (calendar) {
    case Calendar::kGregorian: return "gregorian";
    case Calendar::kJulian: return "julian";
    case Calendar::kJewish: return "jewish";
  }
  return "";
}

// Plain output: texts always go in quotes (so "12:" is not mistaken for a
// code), other strings only when they hold spaces, quotes or control bytes;
// control bytes (the 0x02 text marker) are escaped.
std::string quotedText(std::string_view text, bool always = false) {
  const bool plain = !always && !text.empty() &&
                     std::none_of(text.begin(), text.end(), [](char c) {
                       const auto byte = static_cast<unsigned char>(c);
                       return byte <= 0x20 || byte == 0x7F || c == '"' || c == '\\' || c == '=';
                     });
  if (plain) return std::string(text);
  std::string out = "\"";
  for (const char c : text) {
    const auto byte = static_cast<unsigned char>(c);
    if (c == '"' || c == '\\') {
      out += '\\';
      out += c;
    } else if (byte < 0x20 || byte == 0x7F) {
      constexpr char kHex[] = "0123456789abcdef";
      out += "\\x";
      out += kHex[byte >> 4];
      out += kHex[byte & 0xF];
    } else {
      out += c;
    }
  }
  return out + '"';
}

std::string hexModifier(std::uint64_t modifier) {
  std::ostringstream out;
  out << "0x" << std::hex;
  out.width(3);
  out.fill('0');
  out << modifier;
  return out.str();
}

// One date as JSON: the same keys for every kind, null where a number has no
// meaning (every number of a text date; the code of a range).
Json dateJson(const KXDDate& date) {
  Json object;
  const bool isText = date.text().has_value();
  const bool isKeyword = !isText && !date.isRange() && date.dateType() == 1;
  const auto number = [&](auto value) { return isText ? Json(nullptr) : Json(value); };
  object["code"] = isText || date.isRange() ? Json(nullptr) : Json(date.code());
  object["record"] = date.encodeToRecordData();
  object["year"] = number(date.year());
  object["month"] = number(date.month());
  object["day"] = number(date.day());
  object["modifier"] = number(date.modifier());
  object["sdn"] = number(date.serialDayNumber());
  object["sortDate1"] = date.sortDate1();
  object["sortDate2"] = date.sortDate2();
  object["dayOfWeek"] = number(date.dayOfWeek());
  object["weekDay"] = isText ? Json(nullptr) : Json(date.weekDay());
  object["keyword"] = isKeyword ? Json(date.dateEnumeration()) : Json(nullptr);
  object["text"] = isText ? Json(*date.text()) : Json(nullptr);
  object["isRange"] = date.isRange();
  object["first"] = date.isRange() ? dateJson(*date.firstDate()) : Json(nullptr);
  object["second"] = date.isRange() ? dateJson(*date.secondDate()) : Json(nullptr);
  return object;
}

std::string datePlain(const KXDDate& date) {
  std::ostringstream out;
  if (date.text()) {
    out << "text=" << quotedText(*date.text(), true)
        << " record=" << quotedText(date.encodeToRecordData(), true)
        << " sortDate1=" << date.sortDate1();
    return out.str();
  }
  if (date.isRange()) {
    out << "isRange=true record=" << date.encodeToRecordData();
  } else {
    out << "code=" << date.code() << " record=" << date.encodeToRecordData();
  }
  out << " year=" << date.year() << " month=" << date.month() << " day=" << date.day()
      << " modifier=" << hexModifier(date.modifier()) << " sdn=" << date.serialDayNumber()
      << " sortDate1=" << date.sortDate1();
  if (date.isRange()) out << " sortDate2=" << date.sortDate2();
  out << " dayOfWeek=" << date.dayOfWeek() << " weekDay=" << quotedText(date.weekDay());
  if (!date.isRange() && date.dateType() == 1) out << " keyword=" << date.dateEnumeration();
  if (date.isRange()) {
    out << " first=(" << datePlain(*date.firstDate()) << ") second=("
        << datePlain(*date.secondDate()) << ")";
  }
  return out.str();
}

void printCalendarDay(Calendar calendar, const KXDCalendarDate& day, std::int64_t sdn, bool json) {
  if (json) {
    Json object;
    object["calendar"] = calendarName(calendar);
    object["year"] = day.year;
    object["month"] = day.month;
    object["day"] = day.day;
    object["sdn"] = sdn;
    printJsonLine(object);
  } else {
    std::cout << "calendar=" << calendarName(calendar) << " year=" << day.year
              << " month=" << day.month << " day=" << day.day << " sdn=" << sdn << '\n';
  }
}

struct DateOptions {
  std::string year, month, day;
  std::string modifier = "0";
  std::string calendar = "gregorian";
  std::string sdn;
  std::vector<std::string> inputs;
  bool json = false;
};

void addEncode(CLI::App& date) {
  auto options = std::make_shared<DateOptions>();
  CLI::App* verb = date.add_subcommand(
      "encode", "Record code of a Gregorian date; 0 marks an unknown year, month or day");
  verb->add_option("YEAR", options->year, "Year, negative for BC (no year 0); 0 = unknown")
      ->required();
  verb->add_option("MONTH", options->month, "Month 1-12; 0 = unknown")->required();
  verb->add_option("DAY", options->day, "Day 1-31; 0 = unknown")->required();
  verb->add_option("--modifier", options->modifier,
                   "Modifier bits, decimal or 0x hex: 1 before, 2 after, 3 about, 0x8 quarter, "
                   "0x10 dual year, 0x100 calculated");
  verb->add_flag("--json", options->json, "One JSON object per result");
  verb->callback([options] {
    const std::int32_t year = parsePart(options->year, "YEAR");
    const std::int32_t month = parsePart(options->month, "MONTH");
    const std::int32_t day = parsePart(options->day, "DAY");
    const std::int64_t modifier = parseInteger(options->modifier, "--modifier", true);
    if (modifier < 0 || static_cast<std::uint64_t>(modifier) > kKXDModifierMask) {
      throw KXACommandError("--modifier must be within 0..0x1ff, not '" + options->modifier + "'");
    }
    const KXDDate value(year, month, day, static_cast<std::uint64_t>(modifier));
    if (options->json) {
      printJsonLine(dateJson(value));
    } else {
      std::cout << datePlain(value) << '\n';
    }
  });
}

void addDecode(CLI::App& date) {
  auto options = std::make_shared<DateOptions>();
  CLI::App* verb = date.add_subcommand(
      "decode", "Read record codes or record data (\"CODE\", \"CODE1:CODE2\" or text)");
  verb->add_option("INPUT", options->inputs, "A record code or record-data string; several allowed")
      ->required();
  verb->add_flag("--json", options->json, "One JSON object per input");
  verb->callback([options] {
    for (const std::string& input : options->inputs) {
      const std::optional<KXDDate> value = KXDDate::dateWithRecordData(input);
      if (options->json) {
        Json object;
        object["input"] = input;
        object["isDate"] = value.has_value();
        if (value) {
          object.update(dateJson(*value));
        } else {
          for (const char* key : {"code", "record", "year", "month", "day", "modifier", "sdn",
                                  "sortDate1", "sortDate2", "dayOfWeek", "weekDay", "keyword",
                                  "text"}) {
            object[key] = nullptr;
          }
          object["record"] = "";
          object["isRange"] = false;
          object["first"] = nullptr;
          object["second"] = nullptr;
        }
        printJsonLine(object);
      } else if (value) {
        std::cout << "input=" << quotedText(input) << ' ' << datePlain(*value) << '\n';
      } else {
        std::cout << "input=" << quotedText(input) << " no date\n";
      }
    }
  });
}

void addToSdn(CLI::App& date) {
  auto options = std::make_shared<DateOptions>();
  CLI::App* verb = date.add_subcommand("to-sdn", "Serial day number of a day in one calendar");
  verb->add_option("--calendar", options->calendar, "gregorian (default), julian or jewish");
  verb->add_option("YEAR", options->year, "Year (negative for BC; Jewish years from creation)")
      ->required();
  verb->add_option("MONTH", options->month, "Month: 1-12, Jewish 1-13 from Tishri")->required();
  verb->add_option("DAY", options->day, "Day of the month")->required();
  verb->add_flag("--json", options->json, "One JSON object");
  verb->callback([options] {
    const Calendar calendar = parseCalendar(options->calendar);
    const KXDCalendarDate day{parsePart(options->year, "YEAR"), parsePart(options->month, "MONTH"),
                              parsePart(options->day, "DAY")};
    const auto y = static_cast<std::int32_t>(day.year);
    const auto m = static_cast<std::int32_t>(day.month);
    const auto d = static_cast<std::int32_t>(day.day);
    std::int64_t sdn = 0;
    switch (calendar) {
      case Calendar::kGregorian: sdn = KXDDate::sdnFromGregorianYear(y, m, d); break;
      case Calendar::kJulian: sdn = KXDDate::sdnFromJulianYear(y, m, d); break;
      case Calendar::kJewish: sdn = KXDDate::sdnFromJewishYear(y, m, d); break;
    }
    if (sdn == 0) {
      throw KXACommandError(std::string("not a valid ") + calendarName(calendar) + " date: " +
                            options->year + " " + options->month + " " + options->day);
    }
    printCalendarDay(calendar, day, sdn, options->json);
  });
}

void addFromSdn(CLI::App& date) {
  auto options = std::make_shared<DateOptions>();
  CLI::App* verb = date.add_subcommand("from-sdn", "The day of a serial day number in one calendar");
  verb->add_option("--calendar", options->calendar, "gregorian (default), julian or jewish");
  verb->add_option("SDN", options->sdn, "Serial day number (1 = 25 November 4714 BC)")->required();
  verb->add_flag("--json", options->json, "One JSON object");
  verb->callback([options] {
    const Calendar calendar = parseCalendar(options->calendar);
    const std::int64_t sdn = parseInteger(options->sdn, "SDN");
    KXDCalendarDate day;
    switch (calendar) {
      case Calendar::kGregorian: day = KXDDate::gregorianDateFromSdn(sdn); break;
      case Calendar::kJulian: day = KXDDate::julianDateFromSdn(sdn); break;
      case Calendar::kJewish: day = KXDDate::jewishDateFromSdn(sdn); break;
    }
    if (!day.ok()) {
      const std::int64_t first = calendar == Calendar::kJewish ? kKXDJewishSdnOffset + 1 : 1;
      throw KXACommandError("SDN " + options->sdn + " is out of range for the " +
                            calendarName(calendar) + " calendar (" + std::to_string(first) +
                            ".." + std::to_string(kKXDMaxCalendarSdn) + ")");
    }
    printCalendarDay(calendar, day, sdn, options->json);
  });
}

}  // namespace

void registerDateCommands(CLI::App& app) {
  CLI::App* date = app.add_subcommand("date", "Genealogical dates: record codes and calendars");
  date->require_subcommand(1);
  addEncode(*date);
  addDecode(*date);
  addToSdn(*date);
  addFromSdn(*date);
}
