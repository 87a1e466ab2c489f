// The date parser's numeric-date pattern on one date, through both
// expression classes, with and without the PCRE2 JIT, and through raw PCRE2
// as the floor the wrapper adds to.
//
//   kxacore_bench_regex --benchmark_min_time=0.01
//
// items_per_second is matches per second.

#include <benchmark/benchmark.h>

#define PCRE2_CODE_UNIT_WIDTH 8
#include <pcre2.h>

#include <cstring>
#include <memory>

#include "kxacore/RegExp/KXCRegExp.h"
#include "kxacore/RegExp/KXCRegExpPerl.h"

namespace {

constexpr const char* kPattern = "\\b([0-9][0-9]?)[-/\\., ] *([0-9][0-9]?)[-/\\., ] *([0-9]{3,8})";
constexpr const char* kSubject = "12/25/1850";

void perlMatches(benchmark::State& state, bool jit) {
  auto regExp =
      jit ? KXCRegExpPerl::regExpWithPattern(kPattern, KXCRegExpPerl::kCaseless)
          : KXCRegExpPerl::interpretedRegExpWithPattern(kPattern, KXCRegExpPerl::kCaseless);
  if (!regExp || regExp->usesJIT() != jit) {
    state.SkipWithError("pattern did not compile as asked");
    return;
  }
  for (auto _ : state) benchmark::DoNotOptimize(regExp->matchesString(kSubject));
  state.SetItemsProcessed(state.iterations());
}

void BM_PerlJIT(benchmark::State& state) { perlMatches(state, true); }
void BM_PerlInterpreter(benchmark::State& state) { perlMatches(state, false); }

// What a parser pays per date: the search plus a match object with its groups.
void BM_PerlJITMatchObject(benchmark::State& state) {
  auto regExp = KXCRegExpPerl::regExpWithPattern(kPattern, KXCRegExpPerl::kCaseless);
  for (auto _ : state) {
    auto match = regExp->matchForString(kSubject);
    benchmark::DoNotOptimize(match->stringForMatchAtIndex(3));
  }
  state.SetItemsProcessed(state.iterations());
}

void rawPCRE2(benchmark::State& state, bool jit) {
  int error = 0;
  PCRE2_SIZE offset = 0;
  pcre2_code* code = pcre2_compile(reinterpret_cast<PCRE2_SPTR>(kPattern), PCRE2_ZERO_TERMINATED,
                                   PCRE2_UTF | PCRE2_CASELESS, &error, &offset, nullptr);
  if (jit) pcre2_jit_compile(code, PCRE2_JIT_COMPLETE);
  pcre2_match_data* data = pcre2_match_data_create_from_pattern(code, nullptr);
  const auto subject = reinterpret_cast<PCRE2_SPTR>(kSubject);
  const std::size_t length = std::strlen(kSubject);
  for (auto _ : state) {
    benchmark::DoNotOptimize(pcre2_match(code, subject, length, 0, 0, data, nullptr));
  }
  state.SetItemsProcessed(state.iterations());
  pcre2_match_data_free(data);
  pcre2_code_free(code);
}

void BM_RawPCRE2JIT(benchmark::State& state) { rawPCRE2(state, true); }
void BM_RawPCRE2Interpreter(benchmark::State& state) { rawPCRE2(state, false); }

void BM_POSIX(benchmark::State& state) {
  auto regExp = KXCRegExp::regExpWithPattern(kPattern, KXCRegExp::kCaseless);
  if (!regExp || !regExp->matchesString(kSubject)) {
    state.SkipWithError("POSIX pattern did not compile or match");
    return;
  }
  for (auto _ : state) benchmark::DoNotOptimize(regExp->matchesString(kSubject));
  state.SetItemsProcessed(state.iterations());
}

BENCHMARK(BM_PerlJIT);
BENCHMARK(BM_PerlInterpreter);
BENCHMARK(BM_PerlJITMatchObject);
BENCHMARK(BM_RawPCRE2JIT);
BENCHMARK(BM_RawPCRE2Interpreter);
BENCHMARK(BM_POSIX);

}  // namespace

BENCHMARK_MAIN();
