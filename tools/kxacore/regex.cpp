// kxacore regex match: every match of a pattern in each subject, with byte
// offsets and groups, through either expression engine.

#include <cstdint>
#include <iostream>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "kxacore/RegExp/KXCRegExp.h"
#include "kxacore/RegExp/KXCRegExpPerl.h"
#include "tools/kxacore/Commands.h"

namespace {

struct MatchOptions {
  bool perl = false;  // the default; the flag only documents the choice
  bool posix = false;
  bool caseless = false;
  bool json = false;
  std::string pattern;
  std::vector<std::string> subjects;
};

struct Group {
  std::int64_t start = -1;  // -1: took no part
  std::int64_t end = -1;
};

// One match as both engines can describe it: group 0 first.
using Groups = std::vector<Group>;

std::string text(const std::string& subject, const Group& group) {
  return subject.substr(static_cast<std::size_t>(group.start),
                        static_cast<std::size_t>(group.end - group.start));
}

void print(const MatchOptions& options, const std::string& subject,
           const std::vector<Groups>& matches) {
  const char* engine = options.posix ? "posix" : "perl";
  if (options.json) {
    nlohmann::ordered_json matchList = nlohmann::ordered_json::array();
    for (const Groups& groups : matches) {
      nlohmann::ordered_json groupList = nlohmann::ordered_json::array();
      for (std::size_t i = 1; i < groups.size(); ++i) {
        const bool took = groups[i].start >= 0;
        groupList.push_back({{"index", i},
                             {"start", groups[i].start},
                             {"end", groups[i].end},
                             {"text", took ? nlohmann::ordered_json(text(subject, groups[i]))
                                           : nlohmann::ordered_json(nullptr)}});
      }
      matchList.push_back({{"start", groups[0].start},
                           {"end", groups[0].end},
                           {"text", text(subject, groups[0])},
                           {"groups", std::move(groupList)}});
    }
    printJsonLine({{"subject", subject},
                   {"engine", engine},
                   {"matched", !matches.empty()},
                   {"matches", std::move(matchList)}});
    return;
  }
  std::cout << '"' << subject << "\" (" << engine << "): ";
  if (matches.empty()) {
    std::cout << "no match\n";
    return;
  }
  std::cout << matches.size() << (matches.size() == 1 ? " match\n" : " matches\n");
  for (const Groups& groups : matches) {
    std::cout << "  [" << groups[0].start << ", " << groups[0].end << ") \""
              << text(subject, groups[0]) << "\"\n";
    for (std::size_t i = 1; i < groups.size(); ++i) {
      std::cout << "    group " << i << ": ";
      if (groups[i].start < 0) {
        std::cout << "no part\n";
      } else {
        std::cout << '[' << groups[i].start << ", " << groups[i].end << ") \""
                  << text(subject, groups[i]) << "\"\n";
      }
    }
  }
}

std::vector<Groups> perlMatches(KXCRegExpPerl& regExp, const std::string& subject) {
  std::vector<Groups> result;
  for (const KXCRegExpPerlMatch& match : regExp.matchesArrayForString(subject)) {
    Groups groups(static_cast<std::size_t>(match.numGroups()));
    for (std::size_t i = 0; i < groups.size(); ++i) {
      groups[i] = {match.matches()[i * 2], match.matches()[i * 2 + 1]};
    }
    result.push_back(std::move(groups));
  }
  return result;
}

std::vector<Groups> posixMatches(const KXCRegExp& regExp, const std::string& subject) {
  // The match evaluator is the one POSIX operation that hands out groups.
  std::vector<Groups> result;
  static_cast<void>(regExp.replaceAllMatchesWithMatchEvaluator(
      subject, [&](const KXCRegExpMatch& match) {
        Groups groups(static_cast<std::size_t>(match.numGroups()));
        for (std::size_t i = 0; i < groups.size(); ++i) {
          groups[i] = {match.matches()[i * 2], match.matches()[i * 2 + 1]};
        }
        result.push_back(std::move(groups));
        return std::string();
      }));
  return result;
}

void runMatch(const MatchOptions& options) {
  std::string error;
  if (options.posix) {
    const auto regExp = KXCRegExp::regExpWithPattern(
        options.pattern, KXCRegExp::kExtended | (options.caseless ? KXCRegExp::kCaseless : 0),
        &error);
    if (!regExp) throw KXACommandError("pattern does not compile: " + error);
    for (const std::string& subject : options.subjects) {
      print(options, subject, posixMatches(*regExp, subject));
    }
    return;
  }
  const auto regExp = KXCRegExpPerl::regExpWithPattern(
      options.pattern, KXCRegExpPerl::kUTF8 | (options.caseless ? KXCRegExpPerl::kCaseless : 0),
      &error);
  if (!regExp) throw KXACommandError("pattern does not compile: " + error);
  for (const std::string& subject : options.subjects) {
    print(options, subject, perlMatches(*regExp, subject));
  }
}

}  // namespace

void registerRegexCommands(CLI::App& app) {
  CLI::App* regex = app.add_subcommand("regex", "Regular expressions (Perl-style and POSIX)");
  regex->require_subcommand(1);

  auto options = std::make_shared<MatchOptions>();
  CLI::App* match = regex->add_subcommand(
      "match", "Print every match of PATTERN in each SUBJECT, with byte offsets and groups");
  CLI::Option* perl = match->add_flag("--perl", options->perl,
                                      "Perl-compatible expression (PCRE2, UTF-8; the default)");
  match->add_flag("--posix", options->posix, "POSIX extended expression")->excludes(perl);
  match->add_flag("--caseless", options->caseless, "Ignore case");
  match->add_flag("--json", options->json, "One JSON object per subject");
  match->add_option("PATTERN", options->pattern, "The expression")->required();
  match->add_option("SUBJECT", options->subjects, "Texts to search")->required();
  match->callback([options] { runMatch(*options); });
}
