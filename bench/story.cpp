// Story packages: metadata queries of a cached package per second, and the
// safe save of a 10 MB package (copy, libzip edit, fsync, rename) beside
// copying the same file with std::filesystem::copy_file, the floor any
// copy-then-replace write pays. The ratio is printed at the end.
//
//   kxacore_bench_story --benchmark_min_time=0.5

#include <benchmark/benchmark.h>

#include "bench/KXABenchReporter.h"
#include <unistd.h>

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <map>
#include <random>
#include <string>

#include "kxacore/Files/Archives/KXFArchiver.h"
#include "kxacore/Files/Archives/KXFLibZipArchiver.h"
#include "kxacore/Files/Story/KXCQuilloFileManager.h"
#include "kxacore/Platform/KXAImage.h"

namespace {

namespace fs = std::filesystem;

constexpr std::size_t kPackageBytes = 10'000'000;

// A package of about 10 MB: a small image, Data.json, and an incompressible
// attachment that every save has to carry over.
struct Fixture {
  fs::path folder = fs::temp_directory_path() / ("kxacore-bench-story-" + std::to_string(::getpid()));
  fs::path package = folder / "bench.quillo";
  fs::path copy = folder / "copy.quillo";
  fs::path description = folder / "Data.json";
  std::shared_ptr<KXCQuilloFileManager> manager = KXCQuilloFileManager::make();

  Fixture() {
    fs::create_directories(folder);
    KXAImage image(64, 48, KXAPixelLayout::argb32);
    static_cast<void>(image.writeToFile(folder / "image.png"));
    std::ofstream(description) << R"({"id":"bench","spots":[{"playIdx":-1},{"playIdx":0}]})";
    std::mt19937_64 random(42);
    std::string noise(kPackageBytes, '\0');
    for (char& c : noise) c = static_cast<char>(random());
    std::ofstream(folder / "attachment.bin", std::ios::binary) << noise;
    auto archiver = KXFArchiver::forPath(package);
    static_cast<void>(archiver->addFileToArchiveAtPath(description, "Data.json"));
    static_cast<void>(archiver->addFileToArchiveAtPath(folder / "image.png", "bench_story_image.png"));
    static_cast<void>(archiver->addFileToArchiveAtPath(folder / "attachment.bin", "attachment.bin"));
    static_cast<void>(archiver->close());
  }
  ~Fixture() {
    manager->clearCacheForQuilloFileAtURL(package);
    std::error_code ignored;
    fs::remove_all(folder, ignored);
  }
  std::int64_t packageSize() const { return static_cast<std::int64_t>(fs::file_size(package)); }
};

Fixture& fixture() {
  static Fixture shared;
  return shared;
}

void BM_CachedMetadata(benchmark::State& state) {
  Fixture& f = fixture();
  for (auto _ : state) {
    const auto metadata = f.manager->metadataForQuilloFileAtURL(f.package);
    benchmark::DoNotOptimize(metadata->spotCount());
  }
  state.SetItemsProcessed(state.iterations());
}

void BM_SafeSave(benchmark::State& state) {
  Fixture& f = fixture();
  for (auto _ : state) {
    const bool saved = KXCQuilloFileManager::updateArchiveAtURL(f.package, nullptr, [&](KXFLibZipArchiver& archiver) {
      return archiver.addFileToArchiveAtPath(f.description, "Data.json", true);
    });
    if (!saved) state.SkipWithError("save failed");
  }
  state.SetBytesProcessed(state.iterations() * f.packageSize());
}

void BM_CopyFile(benchmark::State& state) {
  Fixture& f = fixture();
  for (auto _ : state) {
    benchmark::DoNotOptimize(fs::copy_file(f.package, f.copy, fs::copy_options::overwrite_existing));
  }
  state.SetBytesProcessed(state.iterations() * f.packageSize());
}

BENCHMARK(BM_CachedMetadata);
BENCHMARK(BM_SafeSave)->Unit(benchmark::kMillisecond)->UseRealTime();
BENCHMARK(BM_CopyFile)->Unit(benchmark::kMillisecond)->UseRealTime();

// Our safe save beside a plain copy of the same file, in real time.
void printSaveRatio(const KXABenchReporter& reporter) {
  const auto save = reporter.realMilliseconds("BM_SafeSave/real_time");
  const auto copy = reporter.realMilliseconds("BM_CopyFile/real_time");
  if (!save || !copy || *copy <= 0) return;
  std::printf("\nsafe save of a %.1f MB package: %.1f ms; copy_file: %.1f ms; ratio %.2fx\n",
              static_cast<double>(fixture().packageSize()) / 1e6, *save, *copy, *save / *copy);
}

}  // namespace

int main(int argc, char** argv) {
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;
  KXABenchReporter reporter;
  benchmark::RunSpecifiedBenchmarks(&reporter);
  printSaveRatio(reporter);
  benchmark::Shutdown();
  return 0;
}
