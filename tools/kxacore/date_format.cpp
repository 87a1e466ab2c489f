// kxacore date format: the display text of stored date record data (a code,
// "code:code" for a range, or text), in the general or a given format.

#include <iostream>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "kxacore/Data/Dates/KXDDate.h"
#include "tools/kxacore/Commands.h"

namespace {

using Json = nlohmann::ordered_json;

struct FormatOptions {
  std::vector<std::string> inputs;
  std::optional<std::string> format;
  bool json = false;
};

// A range's halves hold the codes; a text date has none.
Json codeOf(const KXDDate& date, int half) {
  if (date.isRange()) {
    return half == 1 ? date.firstDate()->code() : date.secondDate()->code();
  }
  if (half == 1 && !date.text()) return date.code();
  return nullptr;
}

void formatOne(const FormatOptions& options, const std::string& input) {
  const std::optional<KXDDate> date = KXDDate::dateWithRecordData(input);
  if (!date) throw KXACommandError("no date in record data '" + input + "'");
  const std::string display = options.format ? date->stringWithFormat(*options.format)
                                             : date->stringWithGeneralFormat();
  if (!options.json) {
    std::cout << display << '\n';
    return;
  }
  printJsonLine({{"input", input},
                 {"record", date->encodeToRecordData()},
                 {"code1", codeOf(*date, 1)},
                 {"code2", codeOf(*date, 2)},
                 {"format", options.format ? Json(*options.format) : Json(nullptr)},
                 {"display", display}});
}

}  // namespace

void registerDateFormatCommand(CLI::App& dateCommand) {
  auto options = std::make_shared<FormatOptions>();
  CLI::App* format = dateCommand.add_subcommand(
      "format", "Print the display text of date record data (a code, CODE:CODE or text)");
  format->add_option("record", options->inputs, "record data: a code, CODE:CODE, or text")
      ->required();
  format->add_option("-f,--format", options->format,
                     "G, DMY, LDMY, MDY, LMDY, or a format of the terms mod d dd m mm Mmm "
                     "Mmmm yyyy (default: the general format)");
  format->add_flag("--json", options->json,
                   "one JSON object per input: input, record, code1, code2, format, display");
  format->callback([options] {
    for (const std::string& input : options->inputs) formatOne(*options, input);
  });
}
