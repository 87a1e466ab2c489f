// kxacore zip: writing, reading and testing zip archives. Passwords never
// come from the command line (where other users could read them): they come
// from KXA_ZIP_PASSWORD or the first line of --password-file.

#include <unistd.h>

#include <cstdint>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "kxacore/Files/Archives/KXFArchiver.h"
#include "kxacore/Files/Archives/KXFFileExtractHelper.h"
#include "kxacore/Files/Archives/KXFUnarchiver.h"
#include "tools/kxacore/Commands.h"

namespace fs = std::filesystem;

namespace {

struct ZipOptions {
  std::string archive;
  std::vector<std::string> paths;
  std::string destination;
  std::string entry;
  std::string passwordFile;
  bool append = false;
  int level = -1;
  bool json = false;
};

// Exit status 2 without a usage text: the archive itself is unusable.
[[noreturn]] void failArchive(const std::string& message) {
  std::cerr << "kxacore: " << message << '\n';
  throw CLI::RuntimeError(2);
}

std::optional<std::string> passwordFrom(const ZipOptions& options) {
  if (!options.passwordFile.empty()) {
    std::ifstream in(options.passwordFile, std::ios::binary);
    std::string line;
    if (!in || !std::getline(in, line)) failArchive("cannot read the password file " + options.passwordFile);
    if (!line.empty() && line.back() == '\r') line.pop_back();
    return line;
  }
  if (const char* value = std::getenv("KXA_ZIP_PASSWORD"); value != nullptr && *value != '\0') return value;
  return std::nullopt;
}

std::string methodName(unsigned long method) {
  switch (method) {
    case 0:
      return "stored";
    case 8:
      return "deflate";
    case 12:
      return "bzip2";
    case 14:
      return "lzma";
    case 99:
      return "aes";
    default:
      return "method " + std::to_string(method);
  }
}

std::string isoTime(std::optional<std::time_t> time) {
  if (!time) return "";
  std::tm local{};
  if (localtime_r(&*time, &local) == nullptr) return "";
  char text[32];
  std::strftime(text, sizeof text, "%Y-%m-%dT%H:%M:%S", &local);
  return text;
}

nlohmann::ordered_json entryObject(const KXFArchiveEntryInfo& info, const std::string& status,
                                   const std::string& message) {
  nlohmann::ordered_json object;
  object["name"] = info.name;
  object["size"] = info.size;
  object["compressedSize"] = info.compressedSize;
  object["crc"] = info.crc;
  object["encrypted"] = info.encrypted;
  object["method"] = methodName(info.method);
  object["modified"] = isoTime(info.modified);
  object["status"] = status;
  object["message"] = message;
  return object;
}

void printSummary(const std::string& archive, std::size_t entries, std::size_t failed) {
  nlohmann::ordered_json summary;
  summary["archive"] = archive;
  summary["entries"] = entries;
  summary["failed"] = failed;
  summary["status"] = failed == 0 ? "ok" : "failed";
  printJsonLine(summary);
}

// Entry failures on stderr, one line each, then exit status 1.
void finish(std::size_t failed) {
  if (failed > 0) throw KXACommandError(std::to_string(failed) + (failed == 1 ? " entry" : " entries") + " failed");
}

// Progress on a terminal, as a bar on stderr.
class ProgressBar {
 public:
  ProgressBar(bool enabled, std::uint64_t total) : enabled_(enabled && ::isatty(STDERR_FILENO) && total > 0),
                                                   total_(total) {}
  ProgressBar(const ProgressBar&) = delete;
  ProgressBar& operator=(const ProgressBar&) = delete;
  ~ProgressBar() {
    if (shown_) std::cerr << "\r" << std::string(60, ' ') << "\r" << std::flush;
  }
  void advance(std::uint64_t bytes) {
    done_ += bytes;
    if (!enabled_) return;
    const int percent = static_cast<int>(std::min<std::uint64_t>(100, done_ * 100 / total_));
    if (percent == lastPercent_) return;
    lastPercent_ = percent;
    shown_ = true;
    std::cerr << "\r[" << std::string(static_cast<std::size_t>(percent / 2), '#')
              << std::string(static_cast<std::size_t>(50 - percent / 2), ' ') << "] " << percent << "%" << std::flush;
  }

 private:
  bool enabled_;
  bool shown_ = false;
  std::uint64_t total_;
  std::uint64_t done_ = 0;
  int lastPercent_ = -1;
};

// Collects what a reading run reports, per entry name.
class ReadingDelegate : public KXFUnarchiverDelegate {
 public:
  ReadingDelegate(bool quiet, ProgressBar& bar) : quiet_(quiet), bar_(bar) {}
  void unarchiverDidRaiseError(KXFUnarchiver&, std::int64_t code, const std::string& description) override {
    const std::string message = description + " (code " + std::to_string(code) + ")";
    failures_[current_] = message;
    if (!quiet_) std::cerr << "kxacore: " << (current_.empty() ? "archive" : current_) << ": " << message << '\n';
  }
  void unarchiverWillUnarchiveFileTo(KXFUnarchiver&, const std::string& fileName, bool, bool&, bool&) override {
    current_ = fileName;
    for (char& c : current_) {
      if (c == '\\') c = '/';
    }
    lastHandled_ = 0;
  }
  void unarchiverUnarchivingFileTo(KXFUnarchiver&, const std::string&, std::uint64_t handled, bool&) override {
    bar_.advance(handled - lastHandled_);
    lastHandled_ = handled;
  }
  [[nodiscard]] const std::map<std::string, std::string>& failures() const noexcept { return failures_; }

 private:
  bool quiet_;
  ProgressBar& bar_;
  std::string current_;
  std::uint64_t lastHandled_ = 0;
  std::map<std::string, std::string> failures_;
};

std::unique_ptr<KXFUnarchiver> openForReading(const ZipOptions& options) {
  auto unarchiver = KXFUnarchiver::withPath(options.archive, passwordFrom(options));
  if (!unarchiver) failArchive("cannot open " + options.archive + " as a zip archive");
  return unarchiver;
}

std::vector<KXFArchiveEntryInfo> entriesOf(KXFUnarchiver& unarchiver, const std::string& archive) {
  auto entries = unarchiver.entries();
  if (!entries) failArchive("cannot read the directory of " + archive);
  return std::move(*entries);
}

// Reports every entry of `entries` with the failures a run collected.
std::size_t reportEntries(const std::vector<KXFArchiveEntryInfo>& entries,
                          const std::map<std::string, std::string>& failures, bool json) {
  std::size_t failed = 0;
  for (const auto& entry : entries) {
    const auto failure = failures.find(entry.name);
    const bool ok = failure == failures.end();
    if (!ok) ++failed;
    if (json) printJsonLine(entryObject(entry, ok ? "ok" : "failed", ok ? "" : failure->second));
  }
  // A failure that matches no listed name (the archive itself) still counts.
  for (const auto& [name, message] : failures) {
    bool listed = false;
    for (const auto& entry : entries) listed = listed || entry.name == name;
    if (!listed) ++failed;
  }
  return failed;
}

void runExtract(const ZipOptions& options) {
  auto unarchiver = openForReading(options);
  const auto entries = entriesOf(*unarchiver, options.archive);
  ProgressBar bar(!options.json, unarchiver->totalNumberOfBytes());
  ReadingDelegate delegate(options.json, bar);
  unarchiver->setDelegate(&delegate);
  const bool finished = unarchiver->unarchiveFileTo(options.destination);
  std::size_t failed = reportEntries(entries, delegate.failures(), options.json);
  if (!finished && failed == 0) failed = 1;
  if (options.json) printSummary(options.archive, entries.size(), failed);
  finish(failed);
}

void runTest(const ZipOptions& options) {
  auto unarchiver = openForReading(options);
  const auto entries = entriesOf(*unarchiver, options.archive);
  ProgressBar bar(!options.json, unarchiver->totalNumberOfBytes());
  ReadingDelegate delegate(options.json, bar);
  unarchiver->setDelegate(&delegate);
  const bool finished = unarchiver->enumerateFilesWithBlock([](const std::string&, std::vector<std::uint8_t>&, bool&) {});
  std::size_t failed = reportEntries(entries, delegate.failures(), options.json);
  if (!finished && failed == 0) failed = 1;
  if (options.json) {
    printSummary(options.archive, entries.size(), failed);
  } else if (failed == 0) {
    std::cout << options.archive << ": " << entries.size() << " entries OK\n";
  }
  finish(failed);
}

void runList(const ZipOptions& options) {
  auto unarchiver = openForReading(options);
  const auto entries = entriesOf(*unarchiver, options.archive);
  for (const auto& entry : entries) {
    if (options.json) {
      printJsonLine(entryObject(entry, "ok", ""));
    } else {
      std::cout << entry.size << '\t' << entry.compressedSize << '\t' << isoTime(entry.modified) << '\t'
                << (entry.encrypted ? "*" : "") << entry.name << '\n';
    }
  }
  if (options.json) printSummary(options.archive, entries.size(), 0);
}

void runCat(const ZipOptions& options) {
  auto unarchiver = openForReading(options);
  const auto entries = entriesOf(*unarchiver, options.archive);
  ProgressBar bar(false, 0);
  ReadingDelegate delegate(options.json, bar);
  unarchiver->setDelegate(&delegate);
  KXFFileExtractHelper helper;
  const auto bytes = helper.extractDataForFile(options.entry, *unarchiver);
  // The helper does not pass errors on; a second walk with our delegate names them.
  if (!bytes) {
    unarchiver->enumerateFilesWithBlock([&](const std::string& name, std::vector<std::uint8_t>&, bool& stop) {
      stop = name == options.entry;
    });
  }
  const KXFArchiveEntryInfo* info = nullptr;
  for (const auto& entry : entries) {
    if (entry.name == options.entry) info = &entry;
  }
  if (options.json) {
    KXFArchiveEntryInfo missing;
    missing.name = options.entry;
    const auto failure = delegate.failures().find(options.entry);
    const std::string message = bytes ? "" : failure != delegate.failures().end() ? failure->second : "no such entry";
    printJsonLine(entryObject(info ? *info : missing, bytes ? "ok" : "failed", message));
  } else if (bytes) {
    std::cout.write(reinterpret_cast<const char*>(bytes->data()), static_cast<std::streamsize>(bytes->size()));
    std::cout.flush();
  }
  if (!bytes && info == nullptr) throw KXACommandError(options.entry + ": no such entry in " + options.archive);
  if (!bytes) throw KXACommandError(options.entry + ": cannot be read");
}

void runCheckPassword(const ZipOptions& options) {
  const auto password = passwordFrom(options);
  if (!password) failArchive("no password: set KXA_ZIP_PASSWORD or give --password-file");
  if (!KXFUnarchiver::withPath(options.archive)) failArchive("cannot open " + options.archive + " as a zip archive");
  const bool isProtected = KXFUnarchiver::isProtectedArchiveAtPath(options.archive);
  const bool correct = KXFUnarchiver::isCorrectPassword(*password, options.archive);
  if (options.json) {
    nlohmann::ordered_json object;
    object["archive"] = options.archive;
    object["protected"] = isProtected;
    object["correct"] = correct;
    printJsonLine(object);
  } else {
    std::cout << (correct ? "correct" : "wrong") << '\n';
  }
  if (!correct) throw KXACommandError("the password does not open the first entry of " + options.archive);
}

// Collects archiver failures for the per-entry report.
class WritingDelegate : public KXFArchiverDelegate {
 public:
  WritingDelegate(bool quiet, ProgressBar& bar) : quiet_(quiet), bar_(bar) {}
  void archiverDidRaiseError(KXFArchiver&, std::int64_t code, const std::string& description) override {
    message_ = description + " (code " + std::to_string(code) + ")";
    if (!quiet_) std::cerr << "kxacore: " << current_ << ": " << message_ << '\n';
  }
  void archiverArchivingFileWithName(KXFArchiver&, const std::string&, std::uint64_t handled, bool&) override {
    bar_.advance(handled - lastHandled_);
    lastHandled_ = handled;
  }
  void begin(const std::string& name) {
    current_ = name;
    message_.clear();
    lastHandled_ = 0;
  }
  [[nodiscard]] const std::string& message() const noexcept { return message_; }

 private:
  bool quiet_;
  ProgressBar& bar_;
  std::string current_;
  std::string message_;
  std::uint64_t lastHandled_ = 0;
};

// (source, entry name) pairs: a file as its own name, a folder's files
// recursively with names relative to the folder given.
std::vector<std::pair<fs::path, std::string>> sourcesOf(const std::vector<std::string>& paths) {
  std::vector<std::pair<fs::path, std::string>> sources;
  for (const std::string& given : paths) {
    const fs::path path(given);
    std::error_code error;
    if (fs::is_directory(path, error)) {
      std::vector<std::pair<fs::path, std::string>> inFolder;
      for (auto it = fs::recursive_directory_iterator(path, error); !error && it != fs::recursive_directory_iterator();
           it.increment(error)) {
        if (it->is_regular_file(error)) {
          inFolder.emplace_back(it->path(), it->path().lexically_relative(path).generic_string());
        }
      }
      if (error) throw KXACommandError("cannot read the folder " + given + ": " + error.message());
      std::sort(inFolder.begin(), inFolder.end(), [](const auto& a, const auto& b) { return a.second < b.second; });
      sources.insert(sources.end(), inFolder.begin(), inFolder.end());
    } else {
      sources.emplace_back(path, path.filename().generic_string());
    }
  }
  return sources;
}

void runCreate(const ZipOptions& options) {
  if (options.level < -1 || options.level > 9) throw CLI::ValidationError("--level", "must be -1 to 9");
  const auto sources = sourcesOf(options.paths);
  std::uint64_t totalBytes = 0;
  for (const auto& [source, name] : sources) {
    std::error_code error;
    const auto size = fs::file_size(source, error);
    if (!error) totalBytes += size;
  }
  auto archiver = KXFArchiver::forPath(options.archive, passwordFrom(options), options.append);
  if (!archiver) failArchive("cannot open " + options.archive + " for writing");
  archiver->setCompressionLevel(options.level);
  ProgressBar bar(!options.json, totalBytes);
  WritingDelegate delegate(options.json, bar);
  archiver->setDelegate(&delegate);
  std::map<std::string, std::string> failures;
  for (const auto& [source, name] : sources) {
    delegate.begin(name);
    if (!archiver->addFileToArchiveAtPath(source, name)) {
      failures[name] = delegate.message().empty() ? "cannot add" : delegate.message();
    }
  }
  if (!archiver->close()) failArchive("cannot finish writing " + options.archive);
  std::size_t failed = failures.size();
  if (options.json) {
    auto unarchiver = KXFUnarchiver::withPath(options.archive);
    std::map<std::string, KXFArchiveEntryInfo> written;
    if (auto entries = unarchiver ? unarchiver->entries() : std::nullopt) {
      for (auto& entry : *entries) written[entry.name] = std::move(entry);
    }
    for (const auto& [source, name] : sources) {
      const auto failure = failures.find(name);
      KXFArchiveEntryInfo info;
      info.name = name;
      const auto found = written.find(name);
      if (failure == failures.end() && found != written.end()) info = found->second;
      printJsonLine(entryObject(info, failure == failures.end() ? "ok" : "failed",
                                failure == failures.end() ? "" : failure->second));
    }
    printSummary(options.archive, sources.size(), failed);
  }
  finish(failed);
}

void addPasswordOption(CLI::App* verb, ZipOptions& options) {
  verb->add_option("--password-file", options.passwordFile,
                   "Read the password from the first line of this file (else KXA_ZIP_PASSWORD)");
}

}  // namespace

void registerZipCommands(CLI::App& app) {
  CLI::App* zip = app.add_subcommand("zip", "zip archives")->require_subcommand(1);

  auto createOptions = std::make_shared<ZipOptions>();
  CLI::App* create = zip->add_subcommand("create", "Write files and folders (recursively) into an archive");
  create->add_option("ARCHIVE", createOptions->archive, "Archive to write")->required();
  create->add_option("PATH", createOptions->paths, "Files and folders to add")->required();
  create->add_flag("--append", createOptions->append, "Add to an existing archive instead of replacing it");
  create->add_option("--level", createOptions->level, "Deflate level 0-9 (default: zlib's)");
  addPasswordOption(create, *createOptions);
  create->add_flag("--json", createOptions->json, "One JSON object per entry and a summary object");
  create->callback([createOptions] { runCreate(*createOptions); });

  auto extractOptions = std::make_shared<ZipOptions>();
  CLI::App* extract = zip->add_subcommand("extract", "Extract every entry below a folder");
  extract->add_option("ARCHIVE", extractOptions->archive, "Archive to read")->required();
  extract->add_option("DEST", extractOptions->destination, "Destination folder (created when missing)")->required();
  addPasswordOption(extract, *extractOptions);
  extract->add_flag("--json", extractOptions->json, "One JSON object per entry and a summary object");
  extract->callback([extractOptions] { runExtract(*extractOptions); });

  auto listOptions = std::make_shared<ZipOptions>();
  CLI::App* list = zip->add_subcommand("list", "List the entries: size, compressed size, date, name (* encrypted)");
  list->add_option("ARCHIVE", listOptions->archive, "Archive to read")->required();
  list->add_flag("--json", listOptions->json, "One JSON object per entry and a summary object");
  list->callback([listOptions] { runList(*listOptions); });

  auto testOptions = std::make_shared<ZipOptions>();
  CLI::App* test = zip->add_subcommand("test", "Read every entry and check its CRC");
  test->add_option("ARCHIVE", testOptions->archive, "Archive to read")->required();
  addPasswordOption(test, *testOptions);
  test->add_flag("--json", testOptions->json, "One JSON object per entry and a summary object");
  test->callback([testOptions] { runTest(*testOptions); });

  auto catOptions = std::make_shared<ZipOptions>();
  CLI::App* cat = zip->add_subcommand("cat", "Write one entry's bytes to stdout");
  cat->add_option("ARCHIVE", catOptions->archive, "Archive to read")->required();
  cat->add_option("ENTRY", catOptions->entry, "Entry name")->required();
  addPasswordOption(cat, *catOptions);
  cat->add_flag("--json", catOptions->json, "The entry's JSON object instead of its bytes");
  cat->callback([catOptions] { runCat(*catOptions); });

  auto checkOptions = std::make_shared<ZipOptions>();
  CLI::App* check = zip->add_subcommand("check-password", "Say whether the password opens the first entry");
  check->add_option("ARCHIVE", checkOptions->archive, "Archive to read")->required();
  addPasswordOption(check, *checkOptions);
  check->add_flag("--json", checkOptions->json, "One JSON object: archive, protected, correct");
  check->callback([checkOptions] { runCheckPassword(*checkOptions); });
}
