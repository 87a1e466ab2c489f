// Zip throughput beside its peers, in one run on the same bytes: creating an
// archive against raw zlib deflate at the same level (the floor any zip
// writer pays), and extracting it against Info-ZIP's unzip (run as a
// process, when installed), with the ratios printed at the end.
//
//   kxacore_bench_archives --benchmark_min_time=0.5
//
// Input: the shared GEDCOM samples when ../shared is present, tiled to
// 32 MiB; otherwise generated record-like text. bytes_per_second counts
// uncompressed bytes.

#include <benchmark/benchmark.h>

#include "bench/KXABenchReporter.h"
#include <zlib.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <map>
#include <string>
#include <vector>

#include "kxacore/Files/Archives/KXFArchiver.h"
#include "kxacore/Files/Archives/KXFUnarchiver.h"

namespace {

namespace fs = std::filesystem;

constexpr std::size_t kInputSize = 32 << 20;
constexpr int kLevel = 6;

const fs::path kShared = fs::path(KXA_SOURCE_DIR) / ".." / "shared" / "data" / "gedcom";

std::vector<std::uint8_t> sample() {
  std::vector<std::uint8_t> bytes;
  if (fs::exists(kShared / "Queen.ged")) {
    std::ifstream in(kShared / "Queen.ged", std::ios::binary);
    bytes.assign(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
  }
  if (bytes.empty()) {
    const std::string text = "0 @I1@ INDI\n1 NAME Johann /Mueller/\n2 DATE 12 MAR 1850\n2 PLAC Stuttgart\n";
    bytes.assign(text.begin(), text.end());
  }
  std::vector<std::uint8_t> tiled;
  tiled.reserve(kInputSize + bytes.size());
  while (tiled.size() < kInputSize) tiled.insert(tiled.end(), bytes.begin(), bytes.end());
  tiled.resize(kInputSize);
  return tiled;
}

// The input on disk and a scratch folder, made once.
struct Fixture {
  fs::path folder = fs::temp_directory_path() / ("kxacore-bench-zip-" + std::to_string(::getpid()));
  fs::path source = folder / "input.ged";
  fs::path archive = folder / "input.zip";
  std::vector<std::uint8_t> bytes = sample();

  Fixture() {
    fs::create_directories(folder);
    std::ofstream(source, std::ios::binary)
        .write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
    auto archiver = KXFArchiver::forPath(archive);
    archiver->setCompressionLevel(kLevel);
    static_cast<void>(archiver->addFileToArchiveAtPath(source, "input.ged"));
    static_cast<void>(archiver->close());
  }
  ~Fixture() {
    std::error_code ignored;
    fs::remove_all(folder, ignored);
  }
};

Fixture& fixture() {
  static Fixture shared;
  return shared;
}

void BM_CreateArchive(benchmark::State& state) {
  Fixture& f = fixture();
  const fs::path target = f.folder / "created.zip";
  for (auto _ : state) {
    auto archiver = KXFArchiver::forPath(target);
    archiver->setCompressionLevel(kLevel);
    benchmark::DoNotOptimize(archiver->addFileToArchiveAtPath(f.source, "input.ged"));
    benchmark::DoNotOptimize(archiver->close());
  }
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * f.bytes.size()));
}

void BM_RawDeflate(benchmark::State& state) {
  Fixture& f = fixture();
  std::vector<std::uint8_t> output(1 << 16);
  for (auto _ : state) {
    z_stream stream{};
    deflateInit2(&stream, kLevel, Z_DEFLATED, -MAX_WBITS, 8, Z_DEFAULT_STRATEGY);
    stream.next_in = f.bytes.data();
    stream.avail_in = static_cast<uInt>(f.bytes.size());
    int status = Z_OK;
    while (status != Z_STREAM_END) {
      stream.next_out = output.data();
      stream.avail_out = static_cast<uInt>(output.size());
      status = deflate(&stream, Z_FINISH);
    }
    benchmark::DoNotOptimize(stream.total_out);
    deflateEnd(&stream);
  }
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * f.bytes.size()));
}

void BM_ExtractArchive(benchmark::State& state) {
  Fixture& f = fixture();
  for (auto _ : state) {
    auto unarchiver = KXFUnarchiver::withPath(f.archive);
    benchmark::DoNotOptimize(unarchiver->unarchiveFileTo(f.folder / "ours"));
  }
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * f.bytes.size()));
}

void BM_UnzipExtract(benchmark::State& state) {
  Fixture& f = fixture();
  if (std::system("command -v unzip >/dev/null 2>&1") != 0) {
    state.SkipWithError("unzip is not installed");
    return;
  }
  const std::string command = "unzip -qo '" + f.archive.string() + "' -d '" + (f.folder / "unzip").string() + "'";
  for (auto _ : state) benchmark::DoNotOptimize(std::system(command.c_str()));
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * f.bytes.size()));
}

BENCHMARK(BM_CreateArchive)->Unit(benchmark::kMillisecond)->UseRealTime();
BENCHMARK(BM_RawDeflate)->Unit(benchmark::kMillisecond)->UseRealTime();
BENCHMARK(BM_ExtractArchive)->Unit(benchmark::kMillisecond)->UseRealTime();
BENCHMARK(BM_UnzipExtract)->Unit(benchmark::kMillisecond)->UseRealTime();

}  // namespace

int main(int argc, char** argv) {
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;
  KXABenchReporter reporter;
  benchmark::RunSpecifiedBenchmarks(&reporter);
  std::printf("\ninput: %s, level %d\n",
              fs::exists(kShared / "Queen.ged") ? "shared GEDCOM sample, tiled to 32 MiB" : "generated text, 32 MiB",
              kLevel);
  reporter.printRatio("create archive", "BM_CreateArchive/real_time", "BM_RawDeflate/real_time", "raw deflate");
  reporter.printRatio("extract archive", "BM_ExtractArchive/real_time", "BM_UnzipExtract/real_time", "unzip");
  benchmark::Shutdown();
  return 0;
}
