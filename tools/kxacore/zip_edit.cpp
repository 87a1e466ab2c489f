// kxacore zip edit: editing an archive in place through KXFLibZipArchiver.
// Every change is checked and recorded first; the archive is written once at
// the end, and only when every change went through, so a failed run leaves
// it byte for byte as it was.

#include <unistd.h>
#include <zip.h>

#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "kxacore/Files/Archives/KXFLibZipArchiver.h"
#include "tools/kxacore/Commands.h"

namespace {

namespace fs = std::filesystem;

struct ZipEditOptions {
  std::string archive;
  std::vector<std::string> adds;
  std::vector<std::string> replaces;
  std::vector<std::string> renames;
  std::vector<std::string> deletes;
  std::string passwordFile;
  bool aes = false;
  bool json = false;
};

enum class EditKind { kDelete, kRename, kReplace, kAdd };

struct EditStep {
  EditKind kind;
  std::string source;  // the file added, or the old name of a rename
  std::string name;    // the entry as it is after the step
  std::optional<std::string> failure;
  nlohmann::ordered_json deletedEntry;  // a deleted entry's facts, read before it goes
};

const char* kindName(EditKind kind) {
  switch (kind) {
    case EditKind::kDelete: return "delete";
    case EditKind::kRename: return "rename";
    case EditKind::kReplace: return "replace";
    case EditKind::kAdd: return "add";
  }
  return "";
}

// "FILE=NAME" or "FILE" (named after the file). A whole argument naming an
// existing file is taken as FILE, so paths holding '=' still work.
EditStep fileStep(EditKind kind, const std::string& argument, const char* option) {
  std::error_code error;
  const std::size_t equals = argument.find('=');
  if (equals == std::string::npos || fs::exists(argument, error)) {
    const std::string name = fs::path(argument).filename().string();
    if (name.empty()) throw CLI::ValidationError(option, "\"" + argument + "\" names no file");
    return {kind, argument, name, std::nullopt, {}};
  }
  if (equals == 0 || equals + 1 == argument.size()) {
    throw CLI::ValidationError(option, "expected FILE=NAME, got \"" + argument + "\"");
  }
  return {kind, argument.substr(0, equals), argument.substr(equals + 1), std::nullopt, {}};
}

EditStep renameStep(const std::string& argument) {
  const std::size_t equals = argument.find('=');
  if (equals == std::string::npos || equals == 0 || equals + 1 == argument.size()) {
    throw CLI::ValidationError("--rename", "expected OLD=NEW, got \"" + argument + "\"");
  }
  return {EditKind::kRename, argument.substr(0, equals), argument.substr(equals + 1), std::nullopt, {}};
}

// Deletions first and additions last, so "--delete a --add x=a" and
// "--rename a=b --add x=a" do what they say.
std::vector<EditStep> plannedSteps(const ZipEditOptions& options) {
  std::vector<EditStep> steps;
  for (const auto& name : options.deletes) steps.push_back({EditKind::kDelete, name, name, std::nullopt, {}});
  for (const auto& argument : options.renames) steps.push_back(renameStep(argument));
  for (const auto& argument : options.replaces) steps.push_back(fileStep(EditKind::kReplace, argument, "--replace"));
  for (const auto& argument : options.adds) steps.push_back(fileStep(EditKind::kAdd, argument, "--add"));
  return steps;
}

std::optional<std::string> readPassword(const ZipEditOptions& options) {
  if (!options.passwordFile.empty()) {
    std::ifstream stream(options.passwordFile, std::ios::binary);
    std::string line;
    if (!stream || !std::getline(stream, line)) {
      throw CLI::ValidationError("--password-file", options.passwordFile + ": cannot be read");
    }
    if (!line.empty() && line.back() == '\r') line.pop_back();
    return line;
  }
  if (const char* value = std::getenv("KXA_ZIP_PASSWORD")) return std::string(value);
  return std::nullopt;
}

// Collects what the archiver reports, for the step being made.
class EditDelegate : public KXFLibZipArchiverDelegate {
 public:
  explicit EditDelegate(bool showProgress) : showProgress_(showProgress) {}
  void archiverDidRaiseError(KXFLibZipArchiver&, std::int64_t code, std::string_view description) override {
    zip_error_t error;
    zip_error_init_with_code(&error, static_cast<int>(code));
    lastError_ = std::string(description) + " (" + zip_error_strerror(&error) + ")";
    zip_error_fini(&error);
  }
  void archiverProgress(KXFLibZipArchiver&, double fraction) override {
    if (!showProgress_) return;
    constexpr int kWidth = 30;
    const int filled = static_cast<int>(fraction * kWidth);
    std::cerr << '\r' << '[' << std::string(static_cast<std::size_t>(filled), '#')
              << std::string(static_cast<std::size_t>(kWidth - filled), ' ') << "] "
              << static_cast<int>(fraction * 100) << '%' << (fraction >= 1.0 ? "\n" : "") << std::flush;
  }
  std::string takeError() { return std::exchange(lastError_, "the archive refused the change"); }

 private:
  bool showProgress_;
  std::string lastError_ = "the archive refused the change";
};

std::optional<std::string> sourceProblem(const std::string& source) {
  std::error_code error;
  if (!fs::is_regular_file(source, error)) {
    return fs::exists(source, error) ? source + " is not a regular file" : source + " does not exist";
  }
  if (!std::ifstream(source, std::ios::binary)) return source + " cannot be read";
  return std::nullopt;
}

std::string isoTime(std::time_t time) {
  std::tm local{};
  localtime_r(&time, &local);
  char text[32];
  std::strftime(text, sizeof text, "%Y-%m-%dT%H:%M:%S", &local);
  return text;
}

std::string methodName(std::uint16_t method) {
  switch (method) {
    case ZIP_CM_STORE: return "stored";
    case ZIP_CM_DEFLATE: return "deflate";
    case ZIP_CM_BZIP2: return "bzip2";
    default: return "method " + std::to_string(method);
  }
}

// The entry keys from libzip's statistics; null where unknown.
nlohmann::ordered_json entryFacts(zip_t* archive, const std::string& name) {
  nlohmann::ordered_json facts = {{"name", name},          {"size", nullptr},     {"compressedSize", nullptr},
                                  {"crc", nullptr},        {"encrypted", nullptr}, {"method", nullptr},
                                  {"modified", nullptr}};
  zip_stat_t stat;
  if (!archive || zip_stat(archive, name.c_str(), 0, &stat) != 0) return facts;
  if (stat.valid & ZIP_STAT_SIZE) facts["size"] = stat.size;
  if (stat.valid & ZIP_STAT_COMP_SIZE) facts["compressedSize"] = stat.comp_size;
  if (stat.valid & ZIP_STAT_CRC) {
    char crc[9];
    std::snprintf(crc, sizeof crc, "%08x", static_cast<unsigned>(stat.crc));
    facts["crc"] = crc;
  }
  if (stat.valid & ZIP_STAT_ENCRYPTION_METHOD) facts["encrypted"] = stat.encryption_method != ZIP_EM_NONE;
  if (stat.valid & ZIP_STAT_COMP_METHOD) facts["method"] = methodName(stat.comp_method);
  if (stat.valid & ZIP_STAT_MTIME) facts["modified"] = isoTime(stat.mtime);
  return facts;
}

// Such names would let an extracting tool write outside its destination.
constexpr const char* kUnsafeName = "unsafe entry name (absolute, a drive, '..' or a trailing '/')";

// Checks one step against the archive as it stands and records it; the
// failure, if any, is kept on the step.
void applyStep(KXFLibZipArchiver& archiver, EditDelegate& delegate, EditStep& step) {
  switch (step.kind) {
    case EditKind::kDelete:
      if (!archiver.checkContainsFile(step.name)) {
        step.failure = "no such entry";
        return;
      }
      step.deletedEntry = entryFacts(archiver.zipFile(), step.name);
      if (!archiver.deleteFile(step.name)) step.failure = "cannot be deleted";
      return;
    case EditKind::kRename:
      if (!KXFLibZipArchiver::isSafeEntryName(step.name)) {
        step.failure = kUnsafeName;
      } else if (!archiver.checkContainsFile(step.source)) {
        step.failure = "no entry " + step.source + " to rename";
      } else if (archiver.checkContainsFile(step.name)) {
        step.failure = "an entry of that name already exists";
      } else if (!archiver.renameFile(step.source, step.name)) {
        step.failure = "cannot rename " + step.source;
      }
      return;
    case EditKind::kReplace:
    case EditKind::kAdd: {
      const bool replacing = step.kind == EditKind::kReplace;
      if (!KXFLibZipArchiver::isSafeEntryName(step.name)) {
        step.failure = kUnsafeName;
      } else if (replacing && !archiver.checkContainsFile(step.name)) {
        step.failure = "no such entry to replace";
      } else if (!replacing && archiver.checkContainsFile(step.name)) {
        step.failure = "already in the archive (use --replace)";
      } else if (auto problem = sourceProblem(step.source)) {
        step.failure = std::move(problem);
      } else if (!archiver.addFileToArchiveAtPath(step.source, step.name, replacing)) {
        step.failure = delegate.takeError();
      }
      return;
    }
  }
}

void reportSteps(const ZipEditOptions& options, const std::vector<EditStep>& steps, bool committed,
                 const std::optional<std::string>& closeFailure) {
  zip_t* written = nullptr;
  int openError = 0;
  if (options.json && committed) written = zip_open(options.archive.c_str(), ZIP_RDONLY, &openError);
  for (const EditStep& step : steps) {
    if (step.failure) std::cerr << step.name << ": " << *step.failure << '\n';
    if (!options.json) continue;
    nlohmann::ordered_json object =
        step.kind == EditKind::kDelete && committed ? step.deletedEntry : entryFacts(written, step.name);
    if (object.is_null()) object = entryFacts(nullptr, step.name);
    object["status"] = committed ? "ok" : step.failure || closeFailure ? "failed" : "discarded";
    object["message"] = step.failure       ? *step.failure
                        : closeFailure     ? *closeFailure
                        : committed        ? std::string(kindName(step.kind)) + (step.kind == EditKind::kRename ? " from " + step.source : std::string())
                                           : std::string("not written: another change failed");
    object["operation"] = kindName(step.kind);
    printJsonLine(object);
  }
  if (written) zip_discard(written);
}

void runEdit(const ZipEditOptions& options) {
  std::vector<EditStep> steps = plannedSteps(options);
  std::optional<std::string> password;
  if (options.aes) {
    password = readPassword(options);
    if (!password || password->empty()) {
      throw CLI::ValidationError("--aes", "needs a password in KXA_ZIP_PASSWORD or --password-file");
    }
  }
  auto archiver = KXFLibZipArchiver::archiverForPath(options.archive, password, true);
  if (!archiver) throw CLI::ValidationError(options.archive, "cannot be opened as a zip archive");
  EditDelegate delegate(!options.json && ::isatty(STDERR_FILENO));
  archiver->setDelegate(&delegate);

  std::size_t failed = 0;
  for (EditStep& step : steps) {
    applyStep(*archiver, delegate, step);
    if (step.failure) ++failed;
  }
  std::optional<std::string> closeFailure;
  bool committed = false;
  if (failed > 0) {
    archiver->discardChanges();
  } else {
    committed = archiver->close();
    if (!committed) closeFailure = "the archive could not be written (a file changed or vanished?)";
  }
  reportSteps(options, steps, committed, closeFailure);
  if (options.json) {
    printJsonLine({{"archive", options.archive},
                   {"changes", steps.size()},
                   {"failed", closeFailure ? steps.size() : failed},
                   {"committed", committed},
                   {"status", committed ? "ok" : "failed"}});
  }
  if (closeFailure) throw KXACommandError(options.archive + ": " + *closeFailure + "; it was left unchanged");
  if (failed > 0) {
    throw KXACommandError(std::to_string(failed) + " of " + std::to_string(steps.size()) +
                          " changes failed; " + options.archive + " was left unchanged");
  }
}

}  // namespace

void registerZipEditCommand(CLI::App& zipCommand) {
  auto options = std::make_shared<ZipEditOptions>();
  CLI::App* edit = zipCommand.add_subcommand(
      "edit",
      "Add, replace, rename and delete entries, all written at the end or not at all. "
      "Order: deletions, renames, replacements, additions. A missing ARCHIVE is created.");
  edit->add_option("ARCHIVE", options->archive, "The zip archive to edit")->required();
  edit->add_option("--add", options->adds, "Add FILE as NAME (default: its file name); NAME must be new")
      ->type_name("FILE[=NAME]")
      ->allow_extra_args(false);
  edit->add_option("--replace", options->replaces, "Replace the existing entry NAME with FILE")
      ->type_name("FILE[=NAME]")
      ->allow_extra_args(false);
  edit->add_option("--rename", options->renames, "Rename entry OLD to NEW")
      ->type_name("OLD=NEW")
      ->allow_extra_args(false);
  edit->add_option("--delete", options->deletes, "Delete entry NAME")->type_name("NAME")->allow_extra_args(false);
  edit->add_flag("--aes", options->aes,
                 "Encrypt added and replaced entries with AES-128 (password from KXA_ZIP_PASSWORD or "
                 "--password-file)");
  edit->add_option("--password-file", options->passwordFile, "Read the password from the first line of FILE");
  edit->add_flag("--json", options->json,
                 "One object per change (name, size, compressedSize, crc, encrypted, method, modified, "
                 "status, message, operation), then a summary");
  edit->callback([options] { runEdit(*options); });
}
