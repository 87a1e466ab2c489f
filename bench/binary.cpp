// 7-bit encoded integers and length-prefixed strings written and read per
// second through KXCDataWriter and KXCDataReader, beside a bare loop that
// encodes the same integers into a preallocated array (the floor the
// classes add to).
//
//   kxacore_bench_binary --benchmark_min_time=0.5
//
// items_per_second is values per second on one thread; bytes_per_second
// counts the encoded stream.

#include <benchmark/benchmark.h>

#include <cstdint>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include "kxacore/Files/Text/KXCDataReader.h"
#include "kxacore/Files/Text/KXCDataWriter.h"

namespace {

constexpr std::size_t kCount = 4096;

// Every encoded length from 1 to 5 bytes, small values the most common, as
// in real streams of counts and lengths.
const std::vector<std::uint32_t>& integers() {
  static const std::vector<std::uint32_t>& values = *new std::vector<std::uint32_t>([] {
    std::mt19937 random(42);
    std::vector<std::uint32_t> out;
    for (std::size_t i = 0; i < kCount; ++i) {
      const int bits = std::vector<int>{7, 7, 7, 14, 14, 21, 28, 32}[random() % 8];
      const std::uint64_t limit = (std::uint64_t{1} << bits) - 1;
      out.push_back(static_cast<std::uint32_t>(random() % (limit + 1)));
    }
    return out;
  }());
  return values;
}

// Names and places of a few to a few hundred bytes, some beyond ASCII.
const std::vector<std::string>& strings() {
  static const std::vector<std::string>& values = *new std::vector<std::string>([] {
    std::mt19937 random(7);
    const std::vector<std::string> pieces = {"Johann", "M\xC3\xBCller", "Stra\xC3\x9F" "e", "of",
                                             "Saint-\xC3\x89tienne", "1750", "Anna Maria"};
    std::vector<std::string> out;
    for (std::size_t i = 0; i < kCount; ++i) {
      std::string text;
      const std::size_t words = 1 + random() % (i % 16 == 0 ? 40 : 4);
      for (std::size_t w = 0; w < words; ++w) text.append(pieces[random() % pieces.size()]).append(" ");
      out.push_back(text);
    }
    return out;
  }());
  return values;
}

std::vector<std::uint8_t> encodedIntegers() {
  KXCDataWriter writer;
  for (const std::uint32_t v : integers()) writer.write7BitEncodedInt(v);
  return writer.data();
}

std::vector<std::uint8_t> encodedStrings() {
  KXCDataWriter writer;
  for (const std::string& s : strings()) writer.writeString(s);
  return writer.data();
}

// The writers append to one buffer, emptied per round but keeping its
// capacity: the encoding is measured, not the allocator growing a fresh one.
void BM_Write7BitInt(benchmark::State& state) {
  const std::size_t bytes = encodedIntegers().size();
  const auto buffer = std::make_shared<KXCDataWriter::Buffer>();
  for (auto _ : state) {
    buffer->clear();
    KXCDataWriter writer(buffer);
    for (const std::uint32_t v : integers()) writer.write7BitEncodedInt(v);
    benchmark::DoNotOptimize(writer.data().data());
  }
  state.SetItemsProcessed(static_cast<std::int64_t>(state.iterations() * kCount));
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * bytes));
}

void BM_Write7BitIntBareLoop(benchmark::State& state) {
  std::vector<std::uint8_t> out(kCount * 5);
  for (auto _ : state) {
    std::uint8_t* p = out.data();
    for (std::uint32_t v : integers()) {
      while (v >= 0x80) {
        *p++ = static_cast<std::uint8_t>(v | 0x80);
        v >>= 7;
      }
      *p++ = static_cast<std::uint8_t>(v);
    }
    benchmark::DoNotOptimize(p);
    benchmark::ClobberMemory();
  }
  state.SetItemsProcessed(static_cast<std::int64_t>(state.iterations() * kCount));
}

void BM_Read7BitInt(benchmark::State& state) {
  const std::vector<std::uint8_t> bytes = encodedIntegers();
  for (auto _ : state) {
    KXCDataReader reader(bytes.data(), bytes.size());
    std::uint32_t sum = 0;
    for (std::size_t i = 0; i < kCount; ++i) sum += static_cast<std::uint32_t>(reader.get7BitEncodedInt());
    benchmark::DoNotOptimize(sum);
  }
  state.SetItemsProcessed(static_cast<std::int64_t>(state.iterations() * kCount));
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * bytes.size()));
}

void BM_WriteString(benchmark::State& state) {
  const std::size_t bytes = encodedStrings().size();
  const auto buffer = std::make_shared<KXCDataWriter::Buffer>();
  for (auto _ : state) {
    buffer->clear();
    KXCDataWriter writer(buffer);
    for (const std::string& s : strings()) writer.writeString(s);
    benchmark::DoNotOptimize(writer.data().data());
  }
  state.SetItemsProcessed(static_cast<std::int64_t>(state.iterations() * kCount));
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * bytes));
}

void BM_ReadString(benchmark::State& state) {
  const std::vector<std::uint8_t> bytes = encodedStrings();
  for (auto _ : state) {
    KXCDataReader reader(bytes.data(), bytes.size());
    std::size_t total = 0;
    for (std::size_t i = 0; i < kCount; ++i) total += reader.getString()->size();
    benchmark::DoNotOptimize(total);
  }
  state.SetItemsProcessed(static_cast<std::int64_t>(state.iterations() * kCount));
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * bytes.size()));
}

}  // namespace

BENCHMARK(BM_Write7BitInt);
BENCHMARK(BM_Write7BitIntBareLoop);
BENCHMARK(BM_Read7BitInt);
BENCHMARK(BM_WriteString);
BENCHMARK(BM_ReadString);
BENCHMARK_MAIN();
