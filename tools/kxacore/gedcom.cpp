// kxacore gedcom check: checks whole GEDCOM files and reports each problem
// as FILE:LINE: SEVERITY: MESSAGE [CODE], then a summary.

#include <unistd.h>

#include <algorithm>
#include <cstdint>
#include <iostream>
#include <memory>
#include <string>
#include <vector>

#include "kxacore/Extensions/KXAStringExtensions.h"
#include "kxacore/Gedcom/KXGChecker.h"
#include "tools/kxacore/Commands.h"

namespace {

struct CheckOptions {
  std::vector<std::string> files;
  bool json = false;
  std::string select;
  std::string ignore;
  std::string minSeverity = "info";
  KXGCheckOptions check;
};

std::set<std::string, std::less<>> codesFromList(const std::string& list, const char* option) {
  std::set<std::string, std::less<>> codes;
  for (const std::string_view piece : kxa_split(list, ",")) {
    const std::string_view code = kxa_trim(piece);
    if (code.empty()) continue;
    if (KXGCheckCodeInfoForCode(code) == nullptr) {
      throw KXACommandError(std::string("unknown code \"") + std::string(code) + "\" in " + option +
                            " (see kxacore gedcom codes)");
    }
    codes.emplace(code);
  }
  return codes;
}

// A bar on stderr while a terminal watches; cleared before anything else prints.
class ProgressBar {
 public:
  explicit ProgressBar(std::string file) : file_(std::move(file)), active_(isatty(STDERR_FILENO) == 1) {}
  ~ProgressBar() { clear(); }
  ProgressBar(const ProgressBar&) = delete;
  ProgressBar& operator=(const ProgressBar&) = delete;

  void update(std::uint64_t done, std::uint64_t total) {
    if (!active_ || total == 0) return;
    const auto percent = static_cast<int>(done * 100 / total);
    if (percent == lastPercent_) return;
    lastPercent_ = percent;
    constexpr int kWidth = 30;
    const int filled = percent * kWidth / 100;
    std::cerr << "\r" << file_ << " [" << std::string(static_cast<std::size_t>(filled), '#')
              << std::string(static_cast<std::size_t>(kWidth - filled), '.') << "] " << percent
              << "%" << std::flush;
    shown_ = true;
  }
  void clear() {
    if (!shown_) return;
    std::cerr << "\r\033[K" << std::flush;
    shown_ = false;
    lastPercent_ = -1;
  }

 private:
  std::string file_;
  bool active_;
  bool shown_ = false;
  int lastPercent_ = -1;
};

class Printer final : public KXGCheckerDelegate {
 public:
  Printer(std::string file, bool json, ProgressBar& bar)
      : file_(std::move(file)), json_(json), bar_(bar) {}

  void checkerDidFindProblem(KXGChecker&, const KXGFinding& finding) override {
    bar_.clear();
    if (json_) {
      printJsonLine({{"file", file_},
                     {"line", finding.line},
                     {"severity", KXGSeverityName(finding.severity)},
                     {"code", finding.code},
                     {"message", finding.message},
                     {"tag", finding.tag},
                     {"value", finding.value}});
      return;
    }
    std::cout << file_ << ':' << finding.line << ": " << KXGSeverityName(finding.severity) << ": "
              << finding.message << " [" << finding.code << "]\n";
  }

 private:
  std::string file_;
  bool json_;
  ProgressBar& bar_;
};

void printSummary(const std::string& file, const KXGSummary& summary, bool json) {
  if (json) {
    nlohmann::ordered_json byCode = nlohmann::ordered_json::object();
    for (const auto& [code, count] : summary.byCode) byCode[code] = count;
    printJsonLine({{"summary",
                    {{"file", file},
                     {"lines", summary.lines},
                     {"records", summary.records},
                     {"individuals", summary.individuals},
                     {"families", summary.families},
                     {"dates", summary.dates},
                     {"names", summary.names},
                     {"places", summary.places},
                     {"errors", summary.errors},
                     {"warnings", summary.warnings},
                     {"infos", summary.infos},
                     {"encoding", summary.encoding},
                     {"bytes", summary.bytes},
                     {"byCode", byCode}}}});
    return;
  }
  std::cout << "Summary of " << file << '\n'
            << "  " << summary.lines << " lines, " << summary.records << " records, "
            << summary.individuals << " individuals, " << summary.families << " families\n"
            << "  values read: " << summary.dates << " dates, " << summary.names << " names, "
            << summary.places << " places\n"
            << "  character set: " << summary.encoding << '\n'
            << "  findings: " << summary.errors << " errors, " << summary.warnings
            << " warnings, " << summary.infos << " infos\n";
  for (const auto& [code, count] : summary.byCode) {
    const KXGCheckCodeInfo* info = KXGCheckCodeInfoForCode(code);
    std::cout << "    " << code << " ("
              << (info ? KXGSeverityName(info->severity) : std::string_view("?")) << "): " << count
              << '\n';
  }
}

void runCheck(CheckOptions options) {
  const auto severity = KXGSeverityFromName(options.minSeverity);
  if (!severity) throw KXACommandError("--min-severity takes error, warning or info");
  options.check.minimumSeverity = *severity;
  options.check.selectedCodes = codesFromList(options.select, "--select");
  options.check.ignoredCodes = codesFromList(options.ignore, "--ignore");
  for (const int* threshold : {&options.check.maxAge, &options.check.minParentAge,
                               &options.check.maxMotherAge, &options.check.maxFatherAge}) {
    if (*threshold < 0 || *threshold > 1000) throw KXACommandError("ages are 0 to 1000 years");
  }

  std::vector<std::string> unreadable;
  std::uint64_t errors = 0;
  for (const std::string& file : options.files) {
    ProgressBar bar(file);
    Printer printer(file, options.json, bar);
    KXGChecker checker(options.check, &printer);
    const bool ok = checker.checkFile(
        file, [&bar](std::uint64_t done, std::uint64_t total) { bar.update(done, total); });
    bar.clear();
    if (!ok && checker.summary().bytes == 0) {
      std::cout << std::flush;
      std::cerr << "kxacore: cannot read " << file << '\n';
      unreadable.push_back(file);
      continue;
    }
    printSummary(file, checker.summary(), options.json);
    errors += checker.summary().errors;
  }
  std::cout << std::flush;
  // 2: a file could not be read at all (CLI11 passes the status through main).
  if (!unreadable.empty()) throw CLI::RuntimeError(2);
  if (errors > 0) throw KXACommandError(std::to_string(errors) + (errors == 1 ? " error" : " errors") + " found");
}

void runCodes(bool json) {
  for (const KXGCheckCodeInfo& info : KXGCheckCodes()) {
    if (json) {
      printJsonLine({{"code", info.code},
                     {"severity", KXGSeverityName(info.severity)},
                     {"meaning", info.meaning},
                     {"example", info.example}});
    } else {
      std::cout << info.code << " (" << KXGSeverityName(info.severity) << "): " << info.meaning
                << '\n';
    }
  }
}

}  // namespace

void registerGedcomCommands(CLI::App& app) {
  CLI::App* gedcom = app.add_subcommand("gedcom", "Whole GEDCOM files");
  gedcom->require_subcommand(1);

  auto options = std::make_shared<CheckOptions>();
  CLI::App* check = gedcom->add_subcommand(
      "check", "Check GEDCOM files: lines, character set, dates, names, places, links, ages");
  check->add_option("FILE", options->files, "GEDCOM files to check")->required();
  check->add_flag("--json", options->json, "One JSON object per finding, then a summary object");
  check->add_option("--select", options->select, "Report only these codes (CODE,...)");
  check->add_option("--ignore", options->ignore, "Never report these codes (CODE,...)");
  check->add_option("--min-severity", options->minSeverity,
                    "Report nothing below this severity: error, warning or info (default)");
  check->add_option("--max-age", options->check.maxAge, "Oldest plausible age at death (120)");
  check->add_option("--min-parent-age", options->check.minParentAge,
                    "Youngest plausible parent at a child's birth (12)");
  check->add_option("--max-mother-age", options->check.maxMotherAge,
                    "Oldest plausible mother at a child's birth (55)");
  check->add_option("--max-father-age", options->check.maxFatherAge,
                    "Oldest plausible father at a child's birth (90)");
  check->callback([options] { runCheck(*options); });

  auto codesJson = std::make_shared<bool>(false);
  CLI::App* codes = gedcom->add_subcommand("codes", "List every finding code of gedcom check");
  codes->add_flag("--json", *codesJson, "One JSON object per code");
  codes->callback([codesJson] { runCodes(*codesJson); });
}
