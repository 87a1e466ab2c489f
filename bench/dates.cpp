// Calendar conversions, record codes and record-data parsing.
#include <benchmark/benchmark.h>

#include <array>
#include <string>
#include <vector>

#include "kxacore/Data/Dates/KXDDate.h"

namespace {

// Walks a spread of days so that no branch of the conversions is favoured.
constexpr std::int64_t kFirstSdn = 2000000;  // 4 January 763
constexpr std::int64_t kSpan = 500000;

template <typename FromSdn>
void convertFromSdn(benchmark::State& state, FromSdn fromSdn) {
  std::int64_t sdn = kFirstSdn;
  for (auto _ : state) {
    benchmark::DoNotOptimize(fromSdn(sdn));
    sdn = sdn + 7 < kFirstSdn + kSpan ? sdn + 7 : kFirstSdn + (sdn + 7 - kFirstSdn) % kSpan;
  }
  state.SetItemsProcessed(state.iterations());
}

template <typename FromSdn, typename ToSdn>
void convertToSdn(benchmark::State& state, FromSdn fromSdn, ToSdn toSdn) {
  std::vector<KXDCalendarDate> days;
  for (std::int64_t sdn = kFirstSdn; sdn < kFirstSdn + kSpan; sdn += 97) days.push_back(fromSdn(sdn));
  std::size_t i = 0;
  for (auto _ : state) {
    const KXDCalendarDate& day = days[i];
    benchmark::DoNotOptimize(toSdn(static_cast<std::int32_t>(day.year),
                                   static_cast<std::int32_t>(day.month),
                                   static_cast<std::int32_t>(day.day)));
    if (++i == days.size()) i = 0;
  }
  state.SetItemsProcessed(state.iterations());
}

void BM_GregorianFromSdn(benchmark::State& state) {
  convertFromSdn(state, KXDDate::gregorianDateFromSdn);
}
void BM_GregorianToSdn(benchmark::State& state) {
  convertToSdn(state, KXDDate::gregorianDateFromSdn, KXDDate::sdnFromGregorianYear);
}
void BM_JulianFromSdn(benchmark::State& state) { convertFromSdn(state, KXDDate::julianDateFromSdn); }
void BM_JulianToSdn(benchmark::State& state) {
  convertToSdn(state, KXDDate::julianDateFromSdn, KXDDate::sdnFromJulianYear);
}
void BM_JewishFromSdn(benchmark::State& state) { convertFromSdn(state, KXDDate::jewishDateFromSdn); }
void BM_JewishToSdn(benchmark::State& state) {
  convertToSdn(state, KXDDate::jewishDateFromSdn, KXDDate::sdnFromJewishYear);
}

void BM_EncodeRecord(benchmark::State& state) {
  std::int64_t year = 1500;
  for (auto _ : state) {
    benchmark::DoNotOptimize(KXDDate::encodeRecordWithYear(year, 6, 15, kKXDModifierAbout));
    year = year == 2100 ? 1500 : year + 1;
  }
  state.SetItemsProcessed(state.iterations());
}

// A whole value from a code: decode plus sort key.
void BM_DecodeRecord(benchmark::State& state) {
  std::vector<std::int64_t> codes;
  for (std::int64_t year = 1500; year < 2100; ++year) {
    codes.push_back(KXDDate::encodeRecordWithYear(year, year % 12 + 1, year % 28 + 1, 0));
    codes.push_back(KXDDate::encodeRecordWithYear(0, year % 12 + 1, 0, kKXDModifierBefore));
  }
  std::size_t i = 0;
  for (auto _ : state) {
    benchmark::DoNotOptimize(KXDDate::dateWithRecordDate(codes[i]));
    if (++i == codes.size()) i = 0;
  }
  state.SetItemsProcessed(state.iterations());
}

void BM_RecordDataParse(benchmark::State& state) {
  const std::array<std::string, 5> records = {"1255191040", "1255191040:1255195648",
                                              "\x02" "1850", "about the time of the flood", "12:"};
  std::size_t i = 0;
  for (auto _ : state) {
    benchmark::DoNotOptimize(KXDDate::dateWithRecordData(records[i]));
    if (++i == records.size()) i = 0;
  }
  state.SetItemsProcessed(state.iterations());
}

}  // namespace

BENCHMARK(BM_GregorianFromSdn);
BENCHMARK(BM_GregorianToSdn);
BENCHMARK(BM_JulianFromSdn);
BENCHMARK(BM_JulianToSdn);
BENCHMARK(BM_JewishFromSdn);
BENCHMARK(BM_JewishToSdn);
BENCHMARK(BM_EncodeRecord);
BENCHMARK(BM_DecodeRecord);
BENCHMARK(BM_RecordDataParse);

BENCHMARK_MAIN();
