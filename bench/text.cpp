// Text decoding throughput beside memcpy of the same bytes, in one run:
// ANSEL to UTF-8 (whole buffer, reused output), UTF-8 validation, and UTF-8
// line reading through the streaming reader, with the ratios printed at the end.
//
//   kxacore_bench_text --benchmark_min_time=0.5
//
// Input: the shared ANSEL sample (TGC55C.ged) and a UTF-8 one (Queen.ged) when
// ../shared is present, tiled to 32 MiB; otherwise generated text of the same
// mix. bytes_per_second counts input bytes.

#include <benchmark/benchmark.h>

#include "bench/KXABenchReporter.h"

#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <map>
#include <random>
#include <string>
#include <vector>

#include "kxacore/Files/Text/KXCFileLineReader.h"
#include "kxacore/Files/Text/KXCStringEncoding.h"

namespace {

constexpr std::size_t kInputSize = 32 << 20;

std::vector<std::uint8_t> readFile(const std::filesystem::path& path) {
  std::ifstream in(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

std::vector<std::uint8_t> tiled(std::vector<std::uint8_t> sample) {
  std::vector<std::uint8_t> bytes;
  bytes.reserve(kInputSize + sample.size());
  while (bytes.size() < kInputSize) bytes.insert(bytes.end(), sample.begin(), sample.end());
  bytes.resize(kInputSize);
  return bytes;
}

// Record-like lines; one in four carries a diacritic (a mark before its letter
// in ANSEL, a two-byte letter in UTF-8).
std::vector<std::uint8_t> generated(bool ansel) {
  std::mt19937 random(7);
  std::string text;
  while (text.size() < 4096) {
    text += "2 NAME Johann /M";
    if (random() % 4 == 0) text += ansel ? "\xE8u" : "\xC3\xBC";
    text += "ller/\n2 DATE 12 MAR 1850\n2 PLAC Stuttgart, W\xC3\xBCrttemberg\n";
  }
  return {text.begin(), text.end()};
}

const std::filesystem::path kShared = std::filesystem::path(KXA_SOURCE_DIR) / ".." / "shared" / "data" / "gedcom";

const std::vector<std::uint8_t>& anselInput() {
  static const std::vector<std::uint8_t> bytes = tiled(
      std::filesystem::exists(kShared / "TGC55C.ged") ? readFile(kShared / "TGC55C.ged") : generated(true));
  return bytes;
}

const std::vector<std::uint8_t>& utf8Input() {
  static const std::vector<std::uint8_t> bytes = tiled(
      std::filesystem::exists(kShared / "Queen.ged") ? readFile(kShared / "Queen.ged") : generated(false));
  return bytes;
}

void memcpyOf(benchmark::State& state, const std::vector<std::uint8_t>& input) {
  std::vector<std::uint8_t> copy(input.size());
  for (auto _ : state) {
    std::memcpy(copy.data(), input.data(), input.size());
    benchmark::DoNotOptimize(copy.data());
    benchmark::ClobberMemory();
  }
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * input.size()));
}

void decodeWith(benchmark::State& state, KXCStringEncoding encoding, const std::vector<std::uint8_t>& input) {
  const auto decoder = KXCTextDecoder::decoderForEncoding(encoding);
  // Touched once before timing, as memcpy's destination is: page faults of a
  // fresh buffer would otherwise be counted against the decoder alone.
  std::string out;
  decoder->decode(input, out);
  decoder->finish(out);
  for (auto _ : state) {
    out.clear();
    decoder->decode(input, out);
    decoder->finish(out);
    benchmark::DoNotOptimize(out.data());
  }
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * input.size()));
}

void BM_MemcpyANSELBytes(benchmark::State& state) { memcpyOf(state, anselInput()); }
void BM_ANSELDecode(benchmark::State& state) { decodeWith(state, kKXCANSELStringEncoding, anselInput()); }
void BM_MemcpyUTF8Bytes(benchmark::State& state) { memcpyOf(state, utf8Input()); }
void BM_UTF8Decode(benchmark::State& state) { decodeWith(state, kKXCUTF8StringEncoding, utf8Input()); }
void BM_Windows1252Decode(benchmark::State& state) {
  decodeWith(state, kKXCWindowsCP1252StringEncoding, utf8Input());
}
void BM_MacRomanDecodeICU(benchmark::State& state) { decodeWith(state, kKXCMacOSRomanStringEncoding, utf8Input()); }

void BM_UTF8LineReading(benchmark::State& state) {
  const auto path = std::filesystem::temp_directory_path() / "kxacore-bench-lines.txt";
  {
    const auto& input = utf8Input();
    std::ofstream(path, std::ios::binary).write(reinterpret_cast<const char*>(input.data()),
                                                static_cast<std::streamsize>(input.size()));
  }
  std::size_t lines = 0;
  for (auto _ : state) {
    auto reader = KXCFileLineReader::withFilePath(path, kKXCUTF8StringEncoding);
    while (auto line = reader->readLine()) {
      benchmark::DoNotOptimize(line->data());
      ++lines;
    }
  }
  std::filesystem::remove(path);
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * utf8Input().size()));
  state.counters["lines"] = benchmark::Counter(static_cast<double>(lines), benchmark::Counter::kIsRate);
}

BENCHMARK(BM_MemcpyANSELBytes);
BENCHMARK(BM_ANSELDecode);
BENCHMARK(BM_MemcpyUTF8Bytes);
BENCHMARK(BM_UTF8Decode);
BENCHMARK(BM_UTF8LineReading);
BENCHMARK(BM_Windows1252Decode);
BENCHMARK(BM_MacRomanDecodeICU);

}  // namespace

int main(int argc, char** argv) {
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;
  KXABenchReporter reporter;
  benchmark::RunSpecifiedBenchmarks(&reporter);
  std::printf("\ninput: %s\n", std::filesystem::exists(kShared / "TGC55C.ged") ? "shared GEDCOM samples, tiled to 32 MiB"
                                                                                 : "generated text, 32 MiB");
  reporter.printRatio("ANSEL decode", "BM_ANSELDecode", "BM_MemcpyANSELBytes", "memcpy");
  reporter.printRatio("UTF-8 decode (validate and copy)", "BM_UTF8Decode", "BM_MemcpyUTF8Bytes", "memcpy");
  reporter.printRatio("UTF-8 line reading", "BM_UTF8LineReading", "BM_MemcpyUTF8Bytes", "memcpy");
  reporter.printRatio("Windows-1252 decode", "BM_Windows1252Decode", "BM_MemcpyUTF8Bytes", "memcpy");
  reporter.printRatio("Mac Roman decode (ICU)", "BM_MacRomanDecodeICU", "BM_MemcpyUTF8Bytes", "memcpy");
  benchmark::Shutdown();
  return 0;
}
