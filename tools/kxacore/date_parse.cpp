// kxacore date parse: reads free-text genealogical dates and prints the
// record data, the display text and the ranked problem of each.
#include <charconv>
#include <cstdint>
#include <fstream>
#include <iostream>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "kxacore/Data/Dates/KXDDateParser.h"
#include "kxacore/Extensions/KXAStringExtensions.h"
#include "tools/kxacore/Commands.h"

namespace {

using Json = nlohmann::ordered_json;

struct ParseOptions {
  std::vector<std::string> texts;
  std::string file;
  bool json = false;
  bool dayBeforeMonth = false;
  std::string century = "unset";
  std::string doubleDates = "unset";
  std::optional<std::string> cutoff;
  bool commonEra = false;
  std::string format;
};

// yes -> 2, no -> 1, unset -> 0: the parser's stored values.
std::int64_t treatment(const std::string& value, std::string_view option) {
  if (value == "yes") return 2;
  if (value == "no") return 1;
  if (value == "unset") return 0;
  throw KXACommandError(std::string(option) + " must be yes, no or unset, not '" + value + "'");
}

std::int64_t cutoffYear(const std::string& text) {
  std::int64_t year = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), year);
  if (error != std::errc() || end != text.data() + text.size()) {
    throw KXACommandError("--cutoff must be a year, not '" + text + "'");
  }
  return year;
}

// The formatter's text once KXDDate has one; until then the record data.
template <class Date>
std::string displayOf(const Date& date, const std::string& format) {
  if constexpr (requires { date.stringWithFormat(std::string_view(format)); }) {
    return format.empty() ? date.stringWithGeneralFormat() : date.stringWithFormat(format);
  } else {
    return date.encodeToRecordData();
  }
}

std::vector<std::string> readLines(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  if (!in) throw KXACommandError("cannot read '" + path + "'");
  const std::string content((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
  if (in.bad()) throw KXACommandError("cannot read '" + path + "'");
  std::vector<std::string> lines;
  for (const std::string_view line : kxa_splitLines(content)) lines.emplace_back(line);
  return lines;
}

void printResult(const std::string& input, KXDDateParser& parser, const ParseOptions& options) {
  const auto& date = parser.date();
  const std::string display = date ? displayOf(*date, options.format) : std::string();
  if (options.json) {
    Json errors = Json::array();
    for (const KXDParseErrorInfo& e : parser.errors()) {
      errors.push_back({{"reason", e.reason()}, {"data", e.data()}, {"second", e.secondDateError()}});
    }
    Json object{
        {"input", input},
        {"record", date ? Json(date->encodeToRecordData()) : Json(nullptr)},
        {"code1", parser.firstDateCode()},
        {"code2", parser.secondDateCode()},
        {"display", display},
        {"qualifier", parser.qualifier()},
        {"errorCode", parser.errorCode()},
        {"severity", parser.errorSeverity()},
        {"message", parser.parseErrorString()},
        {"errorText", parser.errorDateString()},
        {"errors", std::move(errors)},
    };
    printJsonLine(object);
    return;
  }
  std::string line = input + " => ";
  line += date ? display + " [" + date->encodeToRecordData() + "]" : std::string("(no date)");
  if (parser.errorCode() != 0) {
    line += parser.errorSeverity() == 2 ? "; warning " : "; error ";
    line += std::to_string(parser.errorCode()) + ": " + parser.parseErrorString();
  }
  std::cout << line << '\n';
}

}  // namespace

void registerDateParseCommand(CLI::App& dateCommand) {
  auto options = std::make_shared<ParseOptions>();
  CLI::App* verb = dateCommand.add_subcommand(
      "parse", "Read free-text dates (abt 12 Mar 1750/51, bet 1800 and 1810, BIC ...)");
  verb->add_option("TEXT", options->texts, "Texts to parse, one date each");
  verb->add_option("--file", options->file, "Read the texts from FILE, one a line");
  verb->add_flag("--json", options->json, "One JSON object per text");
  verb->add_flag("--day-before-month", options->dayBeforeMonth,
                 "Read all-number dates day first (25/12/1850)");
  verb->add_option("--century", options->century,
                   "Read two-digit years in this century: yes, no or unset (warn)");
  verb->add_option("--double-dates", options->doubleDates,
                   "Make dual years of early-year dates before the cutoff: yes, no or unset (warn)");
  verb->add_option("--cutoff", options->cutoff, "Double-date cutoff year (default 1753)");
  verb->add_flag("--common-era", options->commonEra, "The user writes BCE/CE rather than BC/AD");
  verb->add_option("--format", options->format, "Display format (default: the general format)");
  verb->callback([options] {
    if (options->texts.empty() && options->file.empty()) {
      throw KXACommandError("give TEXT arguments or --file FILE");
    }
    std::vector<std::string> texts = options->texts;
    if (!options->file.empty()) {
      std::vector<std::string> lines = readLines(options->file);
      texts.insert(texts.end(), lines.begin(), lines.end());
    }
    // Creating a parser resets the era settings, so it comes first.
    auto parser = KXDDateParser::dateParser();
    KXDDateParser::setDayBeforeMonth(options->dayBeforeMonth);
    KXDDateParser::setCenturyTreatment(treatment(options->century, "--century"));
    KXDDateParser::setDoubleDateTreatment(treatment(options->doubleDates, "--double-dates"));
    if (options->cutoff) KXDDateParser::setDoubleDateCutoffYear(cutoffYear(*options->cutoff));
    KXDDateParser::setCommonEra(options->commonEra);
    for (const std::string& text : texts) {
      parser->parseDate(text);
      printResult(text, *parser, *options);
    }
  });
}
