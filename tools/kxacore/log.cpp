// kxacore log write: one entry through a logger set up from the environment,
// the way a host runs it: created (header), the entry, invalidated (footer).

#include <charconv>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "kxacore/Core/KXCLogger.h"
#include "tools/kxacore/Commands.h"

namespace {

struct WriteOptions {
  bool json = false;
  std::optional<std::int64_t> type;
  std::optional<std::string> source;
  std::string text;
};

struct SourcePlace {
  std::string file;
  std::int64_t line = 0;
};

// "FILE:LINE", split at the last colon so a path may hold colons.
SourcePlace parseSource(const std::string& source) {
  const std::size_t colon = source.rfind(':');
  SourcePlace place;
  if (colon == std::string::npos || colon == 0) {
    throw KXACommandError("--source wants FILE:LINE, not \"" + source + "\"");
  }
  place.file = source.substr(0, colon);
  const char* first = source.data() + colon + 1;
  const char* last = source.data() + source.size();
  const auto [end, error] = std::from_chars(first, last, place.line);
  if (first == last || error != std::errc() || end != last) {
    throw KXACommandError("--source wants a line number after the colon, not \"" + source + "\"");
  }
  return place;
}

void runWrite(const WriteOptions& options) {
  // Without --source the entry is plain text ("* [" form, type 0), as the
  // header and footer are; --type needs --source (CLI11 checks that).
  std::optional<SourcePlace> place;
  if (options.source) place = parseSource(*options.source);
  const KXCLogEntry entry = place ? KXCLogEntry(place->file.c_str(), place->line,
                                                options.type.value_or(kKXCLogTypeInfo), options.text)
                                  : KXCLogEntry(options.text);

  // main() has already published a logger when a logging variable is set;
  // otherwise this verb is the host and makes one (level 0, stderr).
  std::shared_ptr<KXCLogger> logger = KXCLogger::sharedLogger();
  if (!logger) {
    logger = std::make_shared<KXCLogger>();
    gLogger.store(logger);
  }
  const bool logged = logger->shouldLogType(entry.type());
  logger->logEntry(entry);
  const bool opened = logger->fileHandle() >= 0;
  const std::optional<std::filesystem::path> file = logger->file();
  logger->invalidate();

  if (!opened) throw KXACommandError("cannot open log file " + (file ? file->string() : ""));
  if (!options.json) return;
  std::string line = entry.logString();
  line.pop_back();  // the newline
  printJsonLine({{"level", logger->level()},
                 {"file", file ? nlohmann::ordered_json(file->string()) : nullptr},
                 {"type", entry.type()},
                 {"logged", logged},
                 {"entry", line}});
}

}  // namespace

void registerLogCommands(CLI::App& app) {
  CLI::App* log = app.add_subcommand("log", "The shared logger");
  log->require_subcommand(1);

  auto options = std::make_shared<WriteOptions>();
  CLI::App* write = log->add_subcommand(
      "write",
      "Write one entry through a logger set up from KXALogLevelKey and KXALogFileKey: "
      "header, entry, footer");
  write->add_flag("--json", options->json, "Print what was written as one JSON object");
  CLI::Option* source =
      write->add_option("--source", options->source, "Source FILE:LINE of the entry");
  write->add_option("--type", options->type,
                    "Entry type: 0 C, 1 E, 2 W, 3 T, 4 I (default), other D")
      ->needs(source);
  write->add_option("TEXT", options->text, "The entry's text")->required();
  write->callback([options] { runWrite(*options); });
}
