// kxacore name parse: splits personal names into title, given names, family
// name, nickname and suffix, from arguments or a file of one name a line.

#include <cstdint>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <memory>
#include <string>
#include <vector>

#include "kxacore/Data/Names/KXDNameParser.h"
#include "kxacore/Extensions/KXAStringExtensions.h"
#include "tools/kxacore/Commands.h"

namespace {

struct ParseOptions {
  bool json = false;
  std::string file;
  std::vector<std::string> names;
};

// "4 (title, nickname)": the number a caller scripts against, and its reading.
std::string describeOutcome(std::int64_t outcome) {
  std::string names;
  const std::pair<std::int64_t, const char*> bits[] = {
      {kKXDNameEmptyInput, "empty input"},
      {kKXDNameTitleFound, "title"},
      {kKXDNameNickNameFound, "nickname"},
      {kKXDNameFamilyAbsent, "no family"},
      {kKXDNameGivenAbsent, "no given"},
  };
  for (const auto& [bit, name] : bits) {
    if ((outcome & bit) == 0) continue;
    if (!names.empty()) names += ", ";
    names += name;
  }
  return std::to_string(outcome) + (names.empty() ? "" : " (" + names + ")");
}

void print(const KXDNameParser& parser, const std::string& input, std::int64_t outcome,
           bool json) {
  if (json) {
    printJsonLine({{"input", input},
                   {"title", parser.title()},
                   {"given", parser.given()},
                   {"family", parser.family()},
                   {"nickname", parser.nickName()},
                   {"suffix", parser.suffix()},
                   {"fullName", parser.fullName()},
                   {"outcome", outcome}});
    return;
  }
  std::cout << '"' << input << "\"\n"
            << "  title:    " << parser.title() << '\n'
            << "  given:    " << parser.given() << '\n'
            << "  family:   " << parser.family() << '\n'
            << "  nickname: " << parser.nickName() << '\n'
            << "  suffix:   " << parser.suffix() << '\n'
            << "  fullName: " << parser.fullName() << '\n'
            << "  outcome:  " << describeOutcome(outcome) << '\n';
}

void runParse(const ParseOptions& options) {
  std::vector<std::string> names = options.names;
  if (!options.file.empty()) {
    std::ifstream in(options.file, std::ios::binary);
    // A directory opens on Linux and then reads as nothing.
    std::error_code error;
    if (!in || std::filesystem::is_directory(options.file, error)) {
      throw KXACommandError("cannot read " + options.file);
    }
    const std::string contents((std::istreambuf_iterator<char>(in)),
                               std::istreambuf_iterator<char>());
    if (in.bad()) throw KXACommandError("cannot read " + options.file);
    for (const std::string_view line : kxa_splitLines(contents)) names.emplace_back(line);
  }
  if (names.empty()) throw KXACommandError("no names: give TEXT arguments or --file");
  // One parser for the whole run, as an importer would use it: an empty line
  // reports bit 2 and shows the fields of the name before it.
  KXDNameParser parser;
  for (const std::string& name : names) {
    const std::int64_t outcome = parser.parseName(name);
    print(parser, name, outcome, options.json);
  }
}

}  // namespace

void registerNameCommands(CLI::App& app) {
  CLI::App* name = app.add_subcommand("name", "Personal names");
  name->require_subcommand(1);

  auto options = std::make_shared<ParseOptions>();
  CLI::App* parse = name->add_subcommand(
      "parse", "Split each name into title, given names, family, nickname and suffix");
  parse->add_flag("--json", options->json, "One JSON object per name");
  parse->add_option("--file", options->file, "Read names from FILE, one a line");
  parse->add_option("TEXT", options->names, "Names to parse");
  parse->callback([options] { runParse(*options); });
}
