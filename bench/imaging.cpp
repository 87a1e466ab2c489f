// The blur family on 12-megapixel images, beside memcpy of the same bytes
// and, where OpenCV is installed, beside OpenCV's equivalent filters in the
// same run (single-threaded). Printed at the end: CPU ms per image (the
// machines are shared, so CPU time is steadier than wall time), the ratio to
// OpenCV (below 1.0: faster), the memcpy floor, and whether OpenCV's output
// is byte-identical to ours on the same image.
//
//   kxacore_bench_imaging --benchmark_min_time=0.5 [--instruction_set=N]
//
// --instruction_set=N runs our filters on the N-th instruction set compiled
// in (0 = best; the list is printed first), to measure what SIMD buys; on
// the scalar baseline the per-pixel operations run their plain forms.
//
// Also measured, against memcpy only: the per-pixel operations on the
// 8-bit x 4 image (mask, tint, clear alpha, tone).
//
// Input: a photo-like 4000 x 3000 image (smooth gradients plus grain), as
// one 8-bit channel and as 8-bit x 4 alpha-first pixels, and a flat white
// mask for erosion (the worst case of a rescanning running minimum). The
// 8-bit x 4 rows filter whole pixels (IPL...32BitAlphaFirstImage), all
// four bytes, alpha included, as OpenCV does with CV_8UC4.
// OpenCV pairs that give identical bytes: erode / dilate with a constant 0
// border; our box blur equals two 1-D cv::blur passes with BORDER_REFLECT,
// and the repeated 3-tap blur of radius r equals r 3-tap cv::blur passes
// along the rows and then r down the columns, each with BORDER_REFLECT (the
// once-mirrored padding stays symmetric through the passes). cv::blur 2-D
// (one rounding) is listed beside both blurs too, as the speed to beat.

#include <benchmark/benchmark.h>

#include "bench/KXABenchReporter.h"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <cstdio>
#include <cstring>
#include <map>
#include <random>
#include <string>
#include <vector>

#include "kxacore/Imaging/IPLFastFilters.h"
#include "kxacore/Imaging/IPLPixelOperations.h"

#ifdef KXA_HAVE_OPENCV
#include <opencv2/core.hpp>
#include <opencv2/imgproc.hpp>
#endif

namespace {

constexpr std::size_t kWidth = 4000, kHeight = 3000;

std::vector<std::uint8_t> photoLike(std::size_t channels) {
  std::vector<std::uint8_t> pixels(kWidth * kHeight * channels);
  std::mt19937 random(42);
  std::normal_distribution<double> grain(0, 6);
  for (std::size_t y = 0; y < kHeight; ++y)
    for (std::size_t x = 0; x < kWidth; ++x)
      for (std::size_t c = 0; c < channels; ++c) {
        const double base = 128 + 90 * std::sin(x * 0.003 + c) * std::cos(y * 0.004 - c);
        const double value = channels == 4 && c == 0 ? 255 : base + grain(random);
        pixels[(y * kWidth + x) * channels + c] = static_cast<std::uint8_t>(std::clamp(value, 0.0, 255.0));
      }
  return pixels;
}

const std::vector<std::uint8_t>& grey() {
  static const auto pixels = photoLike(1);
  return pixels;
}
const std::vector<std::uint8_t>& colour() {
  static const auto pixels = photoLike(4);
  return pixels;
}
const std::vector<std::uint8_t>& whiteMask() {
  static const std::vector<std::uint8_t> pixels(kWidth * kHeight, 255);
  return pixels;
}

using Filter = void (*)(const uint8_t*, uint8_t*, size_t, size_t, size_t, size_t, size_t, size_t, size_t);
using PixelFilter = void (*)(const uint8_t*, uint8_t*, size_t, size_t, size_t, size_t, size_t);

enum class Ours { box, repeated3Tap, erode, dilate };

Filter channelFilter(Ours filter) {
  switch (filter) {
    case Ours::box: return IPLBoxBlur;
    case Ours::repeated3Tap: return IPLGaussianBlur;
    case Ours::erode: return IPLErode;
    case Ours::dilate: return IPLDilate;
  }
  return IPLBoxBlur;
}

PixelFilter pixelFilter(Ours filter) {
  switch (filter) {
    case Ours::box: return IPLBoxBlur32BitAlphaFirstImage;
    case Ours::repeated3Tap: return IPLGaussianBlur32BitAlphaFirstImage;
    case Ours::erode: return IPLErode32BitAlphaFirstImage;
    case Ours::dilate: return IPLDilate32BitAlphaFirstImage;
  }
  return IPLBoxBlur32BitAlphaFirstImage;
}

// One filter over a whole image (one channel, or whole 4-byte pixels).
void filterImage(Ours filter, const std::vector<std::uint8_t>& input, std::vector<std::uint8_t>& output,
                 std::size_t channels, std::size_t radius) {
  if (channels == 1) {
    channelFilter(filter)(input.data(), output.data(), kWidth, kHeight, 1, 1, kWidth, kWidth, radius);
  } else {
    pixelFilter(filter)(input.data(), output.data(), kWidth, kHeight, kWidth * 4, kWidth * 4, radius);
  }
}

void runOurs(benchmark::State& state, Ours filter, const std::vector<std::uint8_t>& input,
             std::size_t channels) {
  const auto radius = static_cast<std::size_t>(state.range(0));
  std::vector<std::uint8_t> output(input.size());
  for (auto _ : state) {
    filterImage(filter, input, output, channels, radius);
    benchmark::DoNotOptimize(output.data());
  }
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * input.size()));
}

void BM_Memcpy1(benchmark::State& state) {
  std::vector<std::uint8_t> output(grey().size());
  for (auto _ : state) {
    std::memcpy(output.data(), grey().data(), output.size());
    benchmark::DoNotOptimize(output.data());
  }
}
void BM_Memcpy4(benchmark::State& state) {
  std::vector<std::uint8_t> output(colour().size());
  for (auto _ : state) {
    std::memcpy(output.data(), colour().data(), output.size());
    benchmark::DoNotOptimize(output.data());
  }
}

void BM_Box1(benchmark::State& state) { runOurs(state, Ours::box, grey(), 1); }
void BM_Box4(benchmark::State& state) { runOurs(state, Ours::box, colour(), 4); }
void BM_Repeated3Tap1(benchmark::State& state) { runOurs(state, Ours::repeated3Tap, grey(), 1); }
void BM_Repeated3Tap4(benchmark::State& state) { runOurs(state, Ours::repeated3Tap, colour(), 4); }
void BM_Erode1(benchmark::State& state) { runOurs(state, Ours::erode, grey(), 1); }
void BM_Erode4(benchmark::State& state) { runOurs(state, Ours::erode, colour(), 4); }
void BM_Dilate1(benchmark::State& state) { runOurs(state, Ours::dilate, grey(), 1); }
void BM_Dilate4(benchmark::State& state) { runOurs(state, Ours::dilate, colour(), 4); }
void BM_ErodeWhite(benchmark::State& state) { runOurs(state, Ours::erode, whiteMask(), 1); }

// Per-pixel operations on the 8-bit x 4 image (no OpenCV counterpart with
// the same arithmetic): memcpy is the floor they are measured against.
enum class PixelOperation { mask, tint, tintPremultiplied, clearAlpha, tone };

void runPixelOperation(benchmark::State& state, PixelOperation operation) {
  const auto& input = colour();
  const auto& mask = grey();
  std::vector<std::uint8_t> output(input.size());
  const std::size_t rowBytes = kWidth * 4;
  for (auto _ : state) {
    switch (operation) {
      case PixelOperation::mask:
        IPLApply8BitMaskTo32BitAlphaFirstImage(input.data(), mask.data(), output.data(), kWidth, kHeight,
                                               rowBytes, 1, kWidth, rowBytes, 1, 1, 0);
        break;
      case PixelOperation::tint:
        IPLApplyTintTo32BitAlphaFirstImage(input.data(), output.data(), kWidth, kHeight, rowBytes, rowBytes, 0, 0, 40);
        break;
      case PixelOperation::tintPremultiplied:
        IPLApplyTintTo32BitAlphaFirstImage(input.data(), output.data(), kWidth, kHeight, rowBytes, rowBytes, 0, 1, 40);
        break;
      case PixelOperation::clearAlpha:
        IPLClearAlphaChannelOf32BitAlphaFirstImage(input.data(), output.data(), kWidth, kHeight, rowBytes, rowBytes,
                                                   128, 0, 1);
        break;
      case PixelOperation::tone:
        IPLApplyToneLUTTo32BitARGBImage(input.data(), output.data(), kWidth, kHeight, rowBytes, rowBytes, 0, 0.2f,
                                        0.1f);
        break;
    }
    benchmark::DoNotOptimize(output.data());
  }
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * input.size()));
}

void BM_PixelMask(benchmark::State& state) { runPixelOperation(state, PixelOperation::mask); }
void BM_PixelTint(benchmark::State& state) { runPixelOperation(state, PixelOperation::tint); }
void BM_PixelTintPremultiplied(benchmark::State& state) { runPixelOperation(state, PixelOperation::tintPremultiplied); }
void BM_PixelClearAlpha(benchmark::State& state) { runPixelOperation(state, PixelOperation::clearAlpha); }
void BM_PixelTone(benchmark::State& state) { runPixelOperation(state, PixelOperation::tone); }
BENCHMARK(BM_PixelMask)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_PixelTint)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_PixelTintPremultiplied)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_PixelClearAlpha)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_PixelTone)->Unit(benchmark::kMillisecond);

#define KXA_RADII ->Arg(1)->Arg(5)->Arg(20)->Unit(benchmark::kMillisecond)
BENCHMARK(BM_Memcpy1)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_Memcpy4)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_Box1) KXA_RADII;
BENCHMARK(BM_Box4) KXA_RADII;
BENCHMARK(BM_Repeated3Tap1) KXA_RADII;
BENCHMARK(BM_Repeated3Tap4) KXA_RADII;
BENCHMARK(BM_Erode1) KXA_RADII;
BENCHMARK(BM_Erode4) KXA_RADII;
BENCHMARK(BM_Dilate1) KXA_RADII;
BENCHMARK(BM_Dilate4) KXA_RADII;
BENCHMARK(BM_ErodeWhite) KXA_RADII;

#ifdef KXA_HAVE_OPENCV
cv::Mat matOf(const std::vector<std::uint8_t>& pixels, std::size_t channels) {
  return cv::Mat(static_cast<int>(kHeight), static_cast<int>(kWidth), CV_8UC(static_cast<int>(channels)),
                 const_cast<std::uint8_t*>(pixels.data()));
}

enum class CvFilter { blur2d, blurTwoPasses, threeTapPasses, erode, dilate };

void filterWithOpenCV(CvFilter filter, const cv::Mat& source, cv::Mat& output, cv::Mat& scratch, int radius) {
  const int window = 2 * radius + 1;
  const cv::Mat kernel = cv::getStructuringElement(cv::MORPH_RECT, cv::Size(window, window));
  switch (filter) {
    case CvFilter::blur2d:
      cv::blur(source, output, cv::Size(window, window), cv::Point(-1, -1), cv::BORDER_REFLECT);
      break;
    case CvFilter::blurTwoPasses:
      cv::blur(source, scratch, cv::Size(window, 1), cv::Point(-1, -1), cv::BORDER_REFLECT);
      cv::blur(scratch, output, cv::Size(1, window), cv::Point(-1, -1), cv::BORDER_REFLECT);
      break;
    case CvFilter::threeTapPasses: {
      // radius 3-tap passes along the rows, then radius down the columns.
      const cv::Mat* from = &source;
      if (radius == 0) source.copyTo(output);
      for (int pass = 0; pass < 2 * radius; ++pass) {
        const cv::Size window = pass < radius ? cv::Size(3, 1) : cv::Size(1, 3);
        cv::blur(*from, scratch, window, cv::Point(-1, -1), cv::BORDER_REFLECT);
        cv::swap(output, scratch);
        from = &output;
      }
      break;
    }
    case CvFilter::erode:
      cv::erode(source, output, kernel, cv::Point(-1, -1), 1, cv::BORDER_CONSTANT, cv::Scalar::all(0));
      break;
    case CvFilter::dilate:
      cv::dilate(source, output, kernel, cv::Point(-1, -1), 1, cv::BORDER_CONSTANT, cv::Scalar::all(0));
      break;
  }
}

void runOpenCV(benchmark::State& state, CvFilter filter, const std::vector<std::uint8_t>& input,
               std::size_t channels) {
  cv::setNumThreads(1);
  const int radius = static_cast<int>(state.range(0));
  const cv::Mat source = matOf(input, channels);
  cv::Mat output, scratch;
  for (auto _ : state) {
    filterWithOpenCV(filter, source, output, scratch, radius);
    benchmark::DoNotOptimize(output.data);
  }
  state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * input.size()));
}

// Runs both on the same image once and compares every byte.
bool identicalToOpenCV(Ours ours, CvFilter peer, const std::vector<std::uint8_t>& input, std::size_t channels,
                       std::size_t radius) {
  cv::setNumThreads(1);
  std::vector<std::uint8_t> mine(input.size());
  filterImage(ours, input, mine, channels, radius);
  cv::Mat output, scratch;
  filterWithOpenCV(peer, matOf(input, channels), output, scratch, static_cast<int>(radius));
  return output.isContinuous() && output.total() * output.elemSize() == mine.size() &&
         std::memcmp(output.data, mine.data(), mine.size()) == 0;
}

void BM_CvBlur2D1(benchmark::State& state) { runOpenCV(state, CvFilter::blur2d, grey(), 1); }
void BM_CvBlur2D4(benchmark::State& state) { runOpenCV(state, CvFilter::blur2d, colour(), 4); }
void BM_CvRepeated3Tap1(benchmark::State& state) { runOpenCV(state, CvFilter::threeTapPasses, grey(), 1); }
void BM_CvRepeated3Tap4(benchmark::State& state) { runOpenCV(state, CvFilter::threeTapPasses, colour(), 4); }
void BM_CvBox1(benchmark::State& state) { runOpenCV(state, CvFilter::blurTwoPasses, grey(), 1); }
void BM_CvBox4(benchmark::State& state) { runOpenCV(state, CvFilter::blurTwoPasses, colour(), 4); }
void BM_CvErode1(benchmark::State& state) { runOpenCV(state, CvFilter::erode, grey(), 1); }
void BM_CvErode4(benchmark::State& state) { runOpenCV(state, CvFilter::erode, colour(), 4); }
void BM_CvDilate1(benchmark::State& state) { runOpenCV(state, CvFilter::dilate, grey(), 1); }
void BM_CvDilate4(benchmark::State& state) { runOpenCV(state, CvFilter::dilate, colour(), 4); }
void BM_CvErodeWhite(benchmark::State& state) { runOpenCV(state, CvFilter::erode, whiteMask(), 1); }
BENCHMARK(BM_CvBlur2D1) KXA_RADII;
BENCHMARK(BM_CvBlur2D4) KXA_RADII;
BENCHMARK(BM_CvRepeated3Tap1) KXA_RADII;
BENCHMARK(BM_CvRepeated3Tap4) KXA_RADII;
BENCHMARK(BM_CvBox1) KXA_RADII;
BENCHMARK(BM_CvBox4) KXA_RADII;
BENCHMARK(BM_CvErode1) KXA_RADII;
BENCHMARK(BM_CvErode4) KXA_RADII;
BENCHMARK(BM_CvDilate1) KXA_RADII;
BENCHMARK(BM_CvDilate4) KXA_RADII;
BENCHMARK(BM_CvErodeWhite) KXA_RADII;
#endif

// One row: ours in CPU ms, the peer and the ratio when the peer ran, and
// how many memcpy of the same bytes ours costs. A row whose peer did not run
// is printed only when showWithoutPeer; identical is "yes", "no" or empty
// (not comparable).
void printRow(const KXABenchReporter& reporter, const std::string& ours, const std::string& peer,
              const std::string& floor, bool showWithoutPeer = true, const char* identical = "") {
  const auto mine = reporter.cpuMilliseconds(ours);
  if (!mine) return;
  const auto other = reporter.cpuMilliseconds(peer);
  if (!other && !showWithoutPeer) return;
  const auto copy = reporter.cpuMilliseconds(floor);
  std::printf("%-26s %8.1f ms", ours.c_str(), *mine);
  if (other) std::printf("   %-22s %8.1f ms   ratio %5.2f", peer.c_str(), *other, *mine / *other);
  if (copy) std::printf("   memcpy x%5.1f", *mine / *copy);
  if (other && *identical) std::printf("   identical: %s", identical);
  std::printf("\n");
}

// Takes --instruction_set=N out of argv (Google Benchmark refuses flags it
// does not know) and applies it.
void applyInstructionSet(int& argc, char** argv) {
  const auto names = kxa::ipl::availableInstructionSets();
  std::printf("instruction sets:");
  for (std::size_t i = 0; i < names.size(); ++i) std::printf(" %zu=%s", i, names[i].c_str());
  std::printf("\n");
  const std::string flag = "--instruction_set=";
  int kept = 1;
  for (int i = 1; i < argc; ++i) {
    const std::string argument = argv[i];
    if (argument.rfind(flag, 0) == 0) {
      const int index = std::atoi(argument.c_str() + flag.size());
      kxa::ipl::forceInstructionSet(index);
      if (index >= 0 && static_cast<std::size_t>(index) < names.size())
        std::printf("our filters run on %s\n", names[static_cast<std::size_t>(index)].c_str());
    } else {
      argv[kept++] = argv[i];
    }
  }
  argc = kept;
}

const char* yesNo(bool value) { return value ? "yes" : "no"; }

}  // namespace

int main(int argc, char** argv) {
  applyInstructionSet(argc, argv);
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;
  KXABenchReporter reporter;
  benchmark::RunSpecifiedBenchmarks(&reporter);
#ifdef KXA_HAVE_OPENCV
  std::printf("\n%zu x %zu, single-threaded, CPU ms; ratio = ours / OpenCV; identical = same bytes as OpenCV\n",
              kWidth, kHeight);
#else
  std::printf("\n%zu x %zu, CPU ms; OpenCV not found at build time: only the memcpy floor is shown\n", kWidth,
              kHeight);
#endif
  for (const std::size_t radius : {1, 5, 20}) {
    std::string suffix = "/";  // appended, not "/" + ...: GCC 12 warns falsely (-Wrestrict)
    suffix += std::to_string(radius);
    for (const std::size_t channels : {1, 4}) {
      const std::string c = std::to_string(channels);
      const std::vector<std::uint8_t>& image = channels == 1 ? grey() : colour();
      const char* sameBox = "";
      const char* sameErode = "";
      const char* sameDilate = "";
      const char* sameRepeated = "";
#ifdef KXA_HAVE_OPENCV
      sameRepeated = yesNo(identicalToOpenCV(Ours::repeated3Tap, CvFilter::threeTapPasses, image, channels, radius));
      sameBox = yesNo(identicalToOpenCV(Ours::box, CvFilter::blurTwoPasses, image, channels, radius));
      sameErode = yesNo(identicalToOpenCV(Ours::erode, CvFilter::erode, image, channels, radius));
      sameDilate = yesNo(identicalToOpenCV(Ours::dilate, CvFilter::dilate, image, channels, radius));
#else
      (void)image;
#endif
      printRow(reporter, "BM_Box" + c + suffix, "BM_CvBox" + c + suffix, "BM_Memcpy" + c, true, sameBox);
      printRow(reporter, "BM_Box" + c + suffix, "BM_CvBlur2D" + c + suffix, "BM_Memcpy" + c, false);
      printRow(reporter, "BM_Repeated3Tap" + c + suffix, "BM_CvRepeated3Tap" + c + suffix, "BM_Memcpy" + c, true,
               sameRepeated);
      printRow(reporter, "BM_Repeated3Tap" + c + suffix, "BM_CvBlur2D" + c + suffix, "BM_Memcpy" + c, false);
      printRow(reporter, "BM_Erode" + c + suffix, "BM_CvErode" + c + suffix, "BM_Memcpy" + c, true, sameErode);
      printRow(reporter, "BM_Dilate" + c + suffix, "BM_CvDilate" + c + suffix, "BM_Memcpy" + c, true, sameDilate);
    }
    const char* sameWhite = "";
#ifdef KXA_HAVE_OPENCV
    sameWhite = yesNo(identicalToOpenCV(Ours::erode, CvFilter::erode, whiteMask(), 1, radius));
#endif
    printRow(reporter, "BM_ErodeWhite" + suffix, "BM_CvErodeWhite" + suffix, "BM_Memcpy1", true, sameWhite);
  }
  std::printf("\nper-pixel operations on the 8-bit x 4 image\n");
  for (const char* name : {"BM_PixelMask", "BM_PixelTint", "BM_PixelTintPremultiplied", "BM_PixelClearAlpha",
                           "BM_PixelTone"})
    printRow(reporter, name, "", "BM_Memcpy4");
  benchmark::Shutdown();
  return 0;
}
