// Names parsed per second by KXDNameParser, over the project's own corpus
// (bench/data/names-corpus.txt, several languages and every shape the parser
// knows) and, when the shared GEDCOM samples sit beside the repository, over
// the NAME lines of those files as found.
//
//   kxacore_bench_names --benchmark_min_time=0.01
//
// items_per_second is names per second on one thread. KXA_NAMES_FILE names
// another file of one name a line instead of the corpus (the comparison
// script uses it to hand both parsers the same names).

#include <benchmark/benchmark.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "kxacore/Data/Names/KXDNameParser.h"
#include "kxacore/Extensions/KXAStringExtensions.h"

namespace {

const std::filesystem::path kBenchDir = std::filesystem::path(__FILE__).parent_path();

std::vector<std::string> readLines(const std::filesystem::path& path) {
  std::ifstream in(path, std::ios::binary);
  std::stringstream contents;
  contents << in.rdbuf();
  const std::string text = contents.str();  // the lines are views into it
  std::vector<std::string> lines;
  for (const std::string_view line : kxa_splitLines(text)) {
    if (!kxa_trim(line).empty()) lines.emplace_back(line);
  }
  return lines;
}

const std::vector<std::string>& corpus() {
  static const std::vector<std::string>& names = *new std::vector<std::string>([] {
    const char* file = std::getenv("KXA_NAMES_FILE");
    return readLines(file && *file ? std::filesystem::path(file)
                                   : kBenchDir / "data" / "names-corpus.txt");
  }());
  return names;
}

// "1 NAME Given /Family/" lines of ../shared/data/gedcom/*.ged, bytes as they
// stand (some files are not UTF-8; the parser takes that too).
const std::vector<std::string>& gedcomNames() {
  static const std::vector<std::string>& names = *new std::vector<std::string>([] {
    std::vector<std::string> found;
    const auto folder = kBenchDir.parent_path().parent_path() / "shared" / "data" / "gedcom";
    std::error_code error;
    for (const auto& entry : std::filesystem::directory_iterator(folder, error)) {
      if (entry.path().extension() != ".ged") continue;
      for (const std::string& line : readLines(entry.path())) {
        const std::string_view trimmed = kxa_trim(line);
        const std::size_t tag = trimmed.find(" NAME ");
        if (tag == 1 && trimmed.size() > 7) found.emplace_back(trimmed.substr(7));
      }
    }
    return found;
  }());
  return names;
}

void parseAll(benchmark::State& state, const std::vector<std::string>& names) {
  if (names.empty()) {
    state.SkipWithError("no names found");
    return;
  }
  KXDNameParser parser;
  parser.parseName("warm up");  // builds the shared expressions
  for (auto _ : state) {
    for (const std::string& name : names) benchmark::DoNotOptimize(parser.parseName(name));
  }
  state.SetItemsProcessed(state.iterations() * static_cast<std::int64_t>(names.size()));
  state.counters["names"] = static_cast<double>(names.size());
}

void BM_ParseCorpus(benchmark::State& state) { parseAll(state, corpus()); }
void BM_ParseGedcomNames(benchmark::State& state) { parseAll(state, gedcomNames()); }

// Single shapes: the cheapest path, the commonest, and one that runs every step.
void parseOne(benchmark::State& state, const char* name) {
  KXDNameParser parser;
  for (auto _ : state) benchmark::DoNotOptimize(parser.parseName(name));
  state.SetItemsProcessed(state.iterations());
}
void BM_ParsePlainForm(benchmark::State& state) { parseOne(state, "John Paul /Smith/"); }
void BM_ParseWords(benchmark::State& state) { parseOne(state, "Maria de la Cruz"); }
void BM_ParseEverything(benchmark::State& state) {
  parseOne(state, "Dr. John \"Jack\" (Johnny) Smith Jr. III");
}

// A fresh parser object per name: what a caller pays that does not keep one.
// The expressions are compiled once per process, so this measures only the
// object's set-up on top of a parse.
void BM_FreshParserPerName(benchmark::State& state) {
  for (auto _ : state) {
    KXDNameParser parser;
    benchmark::DoNotOptimize(parser.parseName("Wg Cdr Guy Gibson"));
  }
  state.SetItemsProcessed(state.iterations());
}

BENCHMARK(BM_ParseCorpus);
BENCHMARK(BM_ParseGedcomNames);
BENCHMARK(BM_ParsePlainForm);
BENCHMARK(BM_ParseWords);
BENCHMARK(BM_ParseEverything);
BENCHMARK(BM_FreshParserPerName);

}  // namespace

BENCHMARK_MAIN();
