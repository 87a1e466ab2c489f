// Dates formatted per second: the named layouts, a user format, ranges, and
// the result cache on and off. Run with --benchmark_min_time=0.01 for a
// quick look.
#include <benchmark/benchmark.h>

#include <memory>
#include <string>
#include <vector>

#include "kxacore/Data/Dates/KXDDate.h"
#include "kxacore/Data/Dates/KXDDateFormatInfo.h"
#include "kxacore/Platform/KXALocale.h"

namespace {

// A spread of everyday dates: qualifiers, dual years, partial dates.
std::vector<KXDDate> sampleDates() {
  std::vector<KXDDate> dates;
  for (std::int64_t i = 0; i < 256; ++i) {
    const std::int64_t year = 1600 + i;
    const std::int64_t month = i % 13;        // 0: unknown
    const std::int64_t day = (i * 7) % 29;    // 0: unknown
    const std::uint64_t modifier = (i % 4) | ((i % 5 == 0) ? 0x10 : 0);
    dates.emplace_back(year, month, day, modifier);
  }
  return dates;
}

std::vector<KXDDate> sampleRanges() {
  std::vector<KXDDate> ranges;
  for (std::int64_t i = 0; i < 256; ++i) {
    const KXDDate first(1800 + i, 1 + i % 12, 1 + i % 28);
    const KXDDate second(1800 + i + (i % 2), 1 + (i + 1) % 12, 1 + (i + 3) % 28);
    ranges.push_back(*KXDDate::dateWithRecordDate1(first.code(), second.code()));
  }
  return ranges;
}

void formatDates(benchmark::State& state, const std::vector<KXDDate>& dates,
                 std::string_view format, bool cached) {
  KXALocale::setCurrentLocaleIdentifier("en_US");
  KXDDateFormatInfo formatter;
  if (cached) formatter.setCache(std::make_shared<KXDFormatCache>());
  std::size_t i = 0;
  for (auto _ : state) {
    auto text = formatter.stringForObject(dates[i++ & 255], format);
    benchmark::DoNotOptimize(text);
  }
  state.SetItemsProcessed(state.iterations());
}

void BM_FormatGeneral(benchmark::State& state) {
  static const auto dates = sampleDates();
  formatDates(state, dates, kKXDFormatGeneral, state.range(0) != 0);
}
BENCHMARK(BM_FormatGeneral)->Arg(0)->Arg(1)->ArgName("cache");

void BM_FormatMonthDayYear(benchmark::State& state) {
  static const auto dates = sampleDates();
  formatDates(state, dates, kKXDFormatDateMonDY, state.range(0) != 0);
}
BENCHMARK(BM_FormatMonthDayYear)->Arg(0)->Arg(1)->ArgName("cache");

void BM_FormatUserFormat(benchmark::State& state) {
  static const auto dates = sampleDates();
  formatDates(state, dates, "mod d. Mmmm yyyy", state.range(0) != 0);
}
BENCHMARK(BM_FormatUserFormat)->Arg(0)->Arg(1)->ArgName("cache");

void BM_FormatRange(benchmark::State& state) {
  static const auto ranges = sampleRanges();
  formatDates(state, ranges, kKXDFormatGeneral, state.range(0) != 0);
}
BENCHMARK(BM_FormatRange)->Arg(0)->Arg(1)->ArgName("cache");

// The date's own entry point: preference read, shared formatter, default format.
void BM_DateStringWithGeneralFormat(benchmark::State& state) {
  KXALocale::setCurrentLocaleIdentifier("en_US");
  static const auto dates = sampleDates();
  std::size_t i = 0;
  for (auto _ : state) {
    auto text = dates[i++ & 255].stringWithGeneralFormat();
    benchmark::DoNotOptimize(text);
  }
  state.SetItemsProcessed(state.iterations());
}
BENCHMARK(BM_DateStringWithGeneralFormat);

}  // namespace

BENCHMARK_MAIN();
