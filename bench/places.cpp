// Place records decoded, encoded and formatted per second.
//
// Corpus: bench/data/places-corpus.txt (found from the working directory, the
// program's folder upwards, or $KXA_SOURCE_DIR). When the shared GEDCOM
// samples sit beside the checkout (../shared/data/gedcom/*.ged), their PLAC
// lines are turned into records and decoded as a second corpus.
//
//   kxacore_bench_places --benchmark_min_time=0.01

#include <benchmark/benchmark.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <iterator>
#include <string>
#include <string_view>
#include <vector>

#include "kxacore/Data/Places/KXDPlaceName.h"
#include "kxacore/Data/Places/KXDPlaceNameFormatInfo.h"
#include "kxacore/Extensions/KXAStringExtensions.h"
#include "kxacore/Platform/KXAUserDefaults.h"

namespace {

namespace fs = std::filesystem;

std::string readFile(const fs::path& path) {
  std::ifstream in(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

// The checkout's root: the first folder holding bench/data/places-corpus.txt.
fs::path sourceRoot() {
  std::vector<fs::path> starts;
  if (const char* env = std::getenv("KXA_SOURCE_DIR")) starts.emplace_back(env);
  starts.push_back(fs::current_path());
  std::error_code error;
  if (const fs::path self = fs::read_symlink("/proc/self/exe", error); !error) {
    starts.push_back(self.parent_path());
  }
  for (fs::path dir : starts) {
    for (; !dir.empty(); dir = dir.parent_path()) {
      if (fs::exists(dir / "bench/data/places-corpus.txt")) return dir;
      if (dir == dir.root_path()) break;
    }
  }
  return {};
}

std::vector<std::string> corpusRecords() {
  std::vector<std::string> records;
  const fs::path root = sourceRoot();
  if (root.empty()) return records;
  const std::string text = readFile(root / "bench/data/places-corpus.txt");
  for (std::string_view line : kxa_splitLines(text)) {
    if (!line.empty()) records.emplace_back(line);
  }
  return records;
}

// "Harewood, Yorkshire, England": most local first, as GEDCOM writes places.
// Up to five parts become levels (the last one the country); longer places
// become free text. Places holding "/" or "|" cannot be stored: skipped.
std::vector<std::string> gedcomRecords() {
  std::vector<std::string> records;
  const fs::path root = sourceRoot();
  std::error_code error;
  const fs::path folder = root.empty() ? fs::path() : root / "../shared/data/gedcom";
  if (folder.empty() || !fs::is_directory(folder, error)) return records;
  for (const auto& entry : fs::directory_iterator(folder, error)) {
    if (entry.path().extension() != ".ged") continue;
    const std::string text = readFile(entry.path());
    for (std::string_view line : kxa_splitLines(text)) {
      line = kxa_trim(line);
      const std::size_t tag = line.find(" PLAC ");
      if (tag == std::string_view::npos || tag > 3) continue;
      const std::string_view place = kxa_trim(line.substr(tag + 6));
      if (place.empty() || place.find_first_of("/|") != std::string_view::npos) continue;
      const std::vector<std::string_view> parts = kxa_split(place, ",");
      // Appended piece by piece: GCC 12 misreads string operator+ chains at
      // -O3 (a false -Wrestrict).
      std::string record = "/";
      if (parts.size() > 5) {
        record.append(place).append("|//");
      } else {
        // geo4, geo3, geo2, geo1, country: the parts fill the last slots.
        for (std::size_t slot = 0; slot < 5; ++slot) {
          if (slot >= 5 - parts.size()) record.append(kxa_trim(parts[slot - (5 - parts.size())]));
          record.append("/");
        }
        record.append("//");
      }
      records.push_back(std::move(record));
    }
  }
  return records;
}

const std::vector<std::string>& corpus() {
  static const auto& records = *new std::vector<std::string>(corpusRecords());
  return records;
}

const std::vector<std::string>& gedcom() {
  static const auto& records = *new std::vector<std::string>(gedcomRecords());
  return records;
}

const std::vector<KXDPlaceName>& decodedCorpus() {
  static const auto& places = *new std::vector<KXDPlaceName>([] {
    std::vector<KXDPlaceName> out;
    for (const std::string& record : corpus()) {
      out.push_back(KXDPlaceName::placeNameWithRecordData(record));
    }
    return out;
  }());
  return places;
}

void decodeAll(benchmark::State& state, const std::vector<std::string>& records) {
  if (records.empty()) {
    state.SkipWithError("no records (corpus not found)");
    return;
  }
  std::size_t bytes = 0;
  for (const std::string& record : records) bytes += record.size();
  for (auto _ : state) {
    for (const std::string& record : records) {
      KXDPlaceName place = KXDPlaceName::placeNameWithRecordData(record);
      benchmark::DoNotOptimize(place);
    }
  }
  state.SetItemsProcessed(state.iterations() * static_cast<std::int64_t>(records.size()));
  state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(bytes));
}

void BM_DecodeCorpus(benchmark::State& state) { decodeAll(state, corpus()); }
BENCHMARK(BM_DecodeCorpus);

void BM_DecodeGedcomPlaces(benchmark::State& state) { decodeAll(state, gedcom()); }
BENCHMARK(BM_DecodeGedcomPlaces);

void BM_EncodeCorpus(benchmark::State& state) {
  // Dropping the stored record makes recordData() encode the fields.
  std::vector<KXDPlaceName> places;
  for (const KXDPlaceName& place : decodedCorpus()) {
    places.push_back(KXDPlaceName::placeNameWithPlaceName(place, place.latitude(),
                                                          place.longitude(), place.code()));
  }
  for (auto _ : state) {
    for (const KXDPlaceName& place : places) benchmark::DoNotOptimize(place.recordData());
  }
  state.SetItemsProcessed(state.iterations() * static_cast<std::int64_t>(places.size()));
}
BENCHMARK(BM_EncodeCorpus);

void BM_HashCorpus(benchmark::State& state) {
  const std::vector<KXDPlaceName>& places = decodedCorpus();
  for (auto _ : state) {
    for (const KXDPlaceName& place : places) benchmark::DoNotOptimize(place.hash());
  }
  state.SetItemsProcessed(state.iterations() * static_cast<std::int64_t>(places.size()));
}
BENCHMARK(BM_HashCorpus);

// Home country USA, so "G" and "CM" take the omission path for US places.
void formatAll(benchmark::State& state, std::string_view format) {
  KXAUserDefaults::setInteger(kKXAPreferencesDateNameHomeCountryKey, 220);
  const std::vector<KXDPlaceName>& places = decodedCorpus();
  if (places.empty()) {
    state.SkipWithError("no records (corpus not found)");
    return;
  }
  for (auto _ : state) {
    for (const KXDPlaceName& place : places) {
      benchmark::DoNotOptimize(place.stringWithFormat(format));
    }
  }
  state.SetItemsProcessed(state.iterations() * static_cast<std::int64_t>(places.size()));
}

void BM_FormatGeneral(benchmark::State& state) { formatAll(state, "G"); }
BENCHMARK(BM_FormatGeneral);

void BM_FormatCommon(benchmark::State& state) { formatAll(state, "CM"); }
BENCHMARK(BM_FormatCommon);

void BM_FormatUser(benchmark::State& state) { formatAll(state, "g4 (g3), g1 in cy"); }
BENCHMARK(BM_FormatUser);

}  // namespace

BENCHMARK_MAIN();
