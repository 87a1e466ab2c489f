// kxacore ini: dump, get, set and convert INI files in the native form or as
// property lists.

#include <filesystem>
#include <iostream>
#include <memory>
#include <string>

#include "kxacore/Files/Text/KXCIniFile.h"
#include "kxacore/Files/Text/KXCIniFileSerialization.h"
#include "tools/kxacore/Commands.h"

namespace {

struct IniOptions {
  std::string file;
  std::string output;
  std::string format = "native";
  std::string from = "native";
  std::string to = "native";
  std::string section;
  std::string key;
  std::string value;
  bool json = false;
};

std::int64_t formatNumber(const std::string& name) {
  return name == "plist" ? KXCIniFileFormatPropertyList : KXCIniFileFormatNative;
}

std::unique_ptr<KXCIniFile> readIni(const std::string& path, const std::string& format) {
  auto ini = KXCIniFile::iniWithContentsOfFile(path, formatNumber(format));
  if (!ini) {
    throw KXACommandError(path + ": cannot be read as " +
                          (format == "plist" ? "a property list" : "a native INI file"));
  }
  return ini;
}

void writeIni(const KXCIniFile& ini, const std::string& path, const std::string& format) {
  if (!ini.writeToFile(path, formatNumber(format))) throw KXACommandError(path + ": cannot be written");
}

void runDump(const IniOptions& options) {
  const auto ini = readIni(options.file, options.format);
  if (!options.json) {
    std::cout << KXCIniFileNativeSerializator::stringFromIni(*ini);
    return;
  }
  nlohmann::ordered_json sections = nlohmann::ordered_json::object();
  for (const auto& [name, content] : ini->content()) {
    nlohmann::ordered_json entries = nlohmann::ordered_json::object();
    for (const auto& [key, value] : *content) entries[key] = value;
    sections[name] = std::move(entries);
  }
  printJsonLine(sections);
}

void runGet(const IniOptions& options) {
  const auto ini = readIni(options.file, options.format);
  const auto section = ini->sectionForName(options.section);
  if (!section) throw KXACommandError("no section \"" + options.section + "\" in " + options.file);
  const auto found = section->content().find(options.key);
  if (found == section->content().end()) {
    throw KXACommandError("no key \"" + options.key + "\" in section \"" + options.section + "\"");
  }
  if (options.json) {
    printJsonLine({{"section", options.section}, {"key", options.key}, {"value", found->second}});
  } else {
    std::cout << found->second << '\n';
  }
}

void runSet(const IniOptions& options) {
  // Both forms read these keys as the section's own properties, so an entry
  // of that name would not come back.
  if (options.key == "name" || options.key == "content") {
    throw KXACommandError("the key \"" + options.key +
                          "\" names a property of the section and cannot be stored as an entry");
  }
  // A missing file starts empty; an unreadable one is never overwritten.
  std::error_code error;
  const bool exists = std::filesystem::exists(options.file, error);
  auto ini = exists ? readIni(options.file, options.format) : KXCIniFile::iniFile();
  auto section = ini->sectionForName(options.section);
  if (!section) {
    section = KXCIniSection::sectionWithName(options.section);
    ini->setSection(*section);
  }
  static_cast<void>(section->setValue(options.value, options.key));
  writeIni(*ini, options.file, options.format);
  if (options.json) {
    printJsonLine({{"file", options.file},
                   {"section", options.section},
                   {"key", options.key},
                   {"value", options.value}});
  }
}

void runConvert(const IniOptions& options) {
  const auto ini = readIni(options.file, options.from);
  writeIni(*ini, options.output, options.to);
  if (options.json) {
    printJsonLine({{"input", options.file},
                   {"output", options.output},
                   {"from", options.from},
                   {"to", options.to},
                   {"sections", ini->content().size()}});
  }
}

void addFormatOption(CLI::App& verb, const char* name, std::string& target, const char* help) {
  verb.add_option(name, target, help)->check(CLI::IsMember({"native", "plist"}));
}

}  // namespace

void registerIniCommands(CLI::App& app) {
  CLI::App* ini = app.add_subcommand("ini", "INI files: native text or property list");
  ini->require_subcommand(1);
  auto options = std::make_shared<IniOptions>();
  constexpr const char* kFormatHelp = "native (default) or plist (XML or binary to read, XML written)";

  CLI::App* dump = ini->add_subcommand("dump", "Print every section and key");
  dump->add_option("FILE", options->file, "The INI file")->required();
  addFormatOption(*dump, "--format", options->format, kFormatHelp);
  dump->add_flag("--json", options->json, "One object: section name to an object of key to value");
  dump->callback([options] { runDump(*options); });

  CLI::App* get = ini->add_subcommand("get", "Print the value of KEY in SECTION");
  get->add_option("FILE", options->file, "The INI file")->required();
  get->add_option("SECTION", options->section, "Section name")->required();
  get->add_option("KEY", options->key, "Key")->required();
  addFormatOption(*get, "--format", options->format, kFormatHelp);
  get->add_flag("--json", options->json, "One object: section, key, value");
  get->callback([options] { runGet(*options); });

  CLI::App* set = ini->add_subcommand(
      "set", "Set KEY in SECTION to VALUE and rewrite the file atomically (created when missing)");
  set->add_option("FILE", options->file, "The INI file")->required();
  set->add_option("SECTION", options->section, "Section name (created when missing)")->required();
  set->add_option("KEY", options->key, "Key")->required();
  set->add_option("VALUE", options->value, "Value (may be empty)")->required();
  addFormatOption(*set, "--format", options->format, kFormatHelp);
  set->add_flag("--json", options->json, "One object: file, section, key, value");
  set->callback([options] { runSet(*options); });

  CLI::App* convert = ini->add_subcommand("convert", "Read IN in one form and write OUT in another");
  convert->add_option("IN", options->file, "The file to read")->required();
  convert->add_option("OUT", options->output, "The file to write (atomically)")->required();
  addFormatOption(*convert, "--from", options->from, "Form of IN: native or plist");
  addFormatOption(*convert, "--to", options->to, "Form of OUT: native or plist");
  convert->add_flag("--json", options->json, "One object: input, output, from, to, sections");
  convert->callback([options] { runConvert(*options); });
}
