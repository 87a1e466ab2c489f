// Whole GEDCOM files checked per second by KXGChecker, in process: the file
// in memory, a new checker per run (so value caches start empty, as in a
// real check), every check on and findings dropped. One benchmark per file
// of ../shared/data/gedcom beside the repository, or of the folder named by
// KXA_GEDCOM_DIR; bytes_per_second is the throughput.
//
//   kxacore_bench_gedcom --benchmark_min_time=0.5
//
// bench/compare_read_gedcom.py runs this beside read-gedcom.

#include <benchmark/benchmark.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "kxacore/Gedcom/KXGChecker.h"

namespace {

void checkFile(benchmark::State& state, const std::string& bytes) {
  const std::span<const std::uint8_t> data(reinterpret_cast<const std::uint8_t*>(bytes.data()),
                                           bytes.size());
  for (auto _ : state) {
    KXGChecker checker;
    checker.appendBytes(data);
    checker.finish();
    benchmark::DoNotOptimize(checker.summary().errors);
  }
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * bytes.size()));
}

}  // namespace

int main(int argc, char** argv) {
  const char* folder = std::getenv("KXA_GEDCOM_DIR");
  const std::filesystem::path directory =
      folder && *folder ? std::filesystem::path(folder)
                        : std::filesystem::path(__FILE__).parent_path().parent_path().parent_path() /
                              "shared" / "data" / "gedcom";
  std::vector<std::filesystem::path> files;
  std::error_code error;
  for (const auto& entry : std::filesystem::directory_iterator(directory, error)) {
    if (entry.path().extension() == ".ged") files.push_back(entry.path());
  }
  std::sort(files.begin(), files.end());
  // Reserved up front: the benchmarks keep pointers to the contents.
  std::vector<std::string> contents;
  contents.reserve(files.size());
  for (const auto& path : files) {
    std::ifstream in(path, std::ios::binary);
    const std::string* bytes = &contents.emplace_back((std::istreambuf_iterator<char>(in)),
                                                      std::istreambuf_iterator<char>());
    benchmark::RegisterBenchmark(("BM_Check/" + path.filename().string()).c_str(),
                                 [bytes](benchmark::State& state) { checkFile(state, *bytes); })
        ->Unit(benchmark::kMillisecond);
  }
  benchmark::Initialize(&argc, argv);
  benchmark::RunSpecifiedBenchmarks();
  benchmark::Shutdown();
  return 0;
}
