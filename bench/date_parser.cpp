// Dates parsed per second over bench/data/dates-corpus.txt, plus the DATE
// values of ../shared/data/gedcom/*.ged when that folder exists: cache off,
// cache on, and with the shortcuts off (every pattern tried).
//   kxacore_bench_date_parser --benchmark_min_time=0.01
#include <benchmark/benchmark.h>

#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "kxacore/Data/Dates/KXDDateParser.h"
#include "kxacore/Extensions/KXAStringExtensions.h"

namespace {

std::string readFile(const std::filesystem::path& path) {
  std::ifstream in(path, std::ios::binary);
  std::stringstream content;
  content << in.rdbuf();
  return content.str();
}

std::filesystem::path sourceDir() {
  // The bench runs from the build tree; the corpus lives in the source tree.
  for (std::filesystem::path dir = std::filesystem::current_path(); !dir.empty();
       dir = dir.parent_path()) {
    if (std::filesystem::exists(dir / "bench/data/dates-corpus.txt")) return dir;
    if (dir == dir.parent_path()) break;
  }
  return std::filesystem::path(__FILE__).parent_path().parent_path();
}

const std::vector<std::string>& corpus() {
  static const auto& lines = *[] {
    auto* result = new std::vector<std::string>();
    const std::filesystem::path root = sourceDir();
    for (const std::string_view line : kxa_splitLines(readFile(root / "bench/data/dates-corpus.txt"))) {
      result->emplace_back(line);
    }
    // "2 DATE 12 MAR 1850" lines of the shared GEDCOM samples, read in place.
    const std::filesystem::path gedcom = root / "../shared/data/gedcom";
    std::error_code error;
    if (std::filesystem::is_directory(gedcom, error)) {
      for (const auto& entry : std::filesystem::directory_iterator(gedcom, error)) {
        if (entry.path().extension() != ".ged") continue;
        const std::string text = readFile(entry.path());
        for (const std::string_view line : kxa_splitLines(text)) {
          const std::size_t at = line.find(" DATE ");
          if (at == std::string_view::npos || at > 3) continue;
          result->emplace_back(kxa_trim(line.substr(at + 6)));
        }
      }
    }
    return result;
  }();
  return lines;
}

void parseCorpus(benchmark::State& state, bool cache, bool shortcuts) {
  const auto& lines = corpus();
  auto parser = KXDDateParser::dateParser();
  parser->setUsesShortcuts(shortcuts);
  if (cache) parser->enableCache();
  std::size_t parsed = 0;
  for (auto _ : state) {
    for (const std::string& line : lines) {
      auto date = parser->dateFromString(line);
      benchmark::DoNotOptimize(date);
    }
    parsed += lines.size();
  }
  state.SetItemsProcessed(static_cast<std::int64_t>(parsed));
  state.counters["texts"] = static_cast<double>(lines.size());
}

void BM_ParseCacheOff(benchmark::State& state) { parseCorpus(state, false, true); }
void BM_ParseCacheOn(benchmark::State& state) { parseCorpus(state, true, true); }
void BM_ParseNoShortcuts(benchmark::State& state) { parseCorpus(state, false, false); }

BENCHMARK(BM_ParseCacheOff);
BENCHMARK(BM_ParseCacheOn);
BENCHMARK(BM_ParseNoShortcuts);

}  // namespace

BENCHMARK_MAIN();
