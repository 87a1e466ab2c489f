// The blur family over fuzz-chosen sizes, steps, row paddings and radii,
// against the plain line-by-line forms; the per-pixel operations over the
// same bytes for memory safety.
//
// Properties checked (abort on failure):
//   - every public filter writes exactly the bytes the plain form writes,
//     separate or in place, and leaves the bytes between samples alone;
//   - the whole-pixel forms equal four one-channel plain runs with step 4;
//   - no operation reads or writes outside the described buffers (ASan).
#include <fuzzer/FuzzedDataProvider.h>

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <vector>

#include "kxacore/Imaging/IPLPixelOperations.h"
#include "kxacore/Imaging/IPLReference.h"

namespace {

void check(bool condition) {
  if (!condition) std::abort();
}

using kxa::ipl::Filter;

void compareFilter(FuzzedDataProvider& input) {
  const auto filter = static_cast<Filter>(input.ConsumeIntegralInRange<int>(0, 3));
  // Wide enough for erosion and dilation past radius 128, where the fast
  // forms change method.
  const std::size_t width = input.ConsumeIntegralInRange<std::size_t>(1, 140);
  const std::size_t height = input.ConsumeIntegralInRange<std::size_t>(1, 40);
  const std::size_t step = input.ConsumeIntegralInRange<std::size_t>(1, 4);
  const std::size_t rowBytes = width * step + input.ConsumeIntegralInRange<std::size_t>(0, 5);
  const std::size_t radius =
      input.ConsumeIntegralInRange<std::size_t>(0, filter == Filter::gaussian ? 20 : 150);
  const bool inPlace = input.ConsumeBool();
  std::vector<std::uint8_t> source(rowBytes * height);
  for (auto& byte : source) byte = input.ConsumeIntegral<std::uint8_t>();
  std::vector<std::uint8_t> expected = source, actual = source;
  const std::uint8_t* from = inPlace ? nullptr : source.data();
  kxa::ipl::referenceFilter(filter, from ? from : expected.data(), expected.data(), width, height, step,
                            step, rowBytes, rowBytes, radius);
  const auto call = filter == Filter::box        ? IPLBoxBlur
                    : filter == Filter::gaussian ? IPLGaussianBlur
                    : filter == Filter::erode    ? IPLErode
                                                 : IPLDilate;
  call(from ? from : actual.data(), actual.data(), width, height, step, step, rowBytes, rowBytes, radius);
  check(expected == actual);
}

using PixelFilter = void (*)(const uint8_t*, uint8_t*, size_t, size_t, size_t, size_t, size_t);

void compareWholePixels(FuzzedDataProvider& input) {
  const auto filter = static_cast<Filter>(input.ConsumeIntegralInRange<int>(0, 3));
  const std::size_t width = input.ConsumeIntegralInRange<std::size_t>(1, 40);
  const std::size_t height = input.ConsumeIntegralInRange<std::size_t>(1, 40);
  const std::size_t rowBytes = width * 4 + input.ConsumeIntegralInRange<std::size_t>(0, 5);
  const std::size_t radius =
      input.ConsumeIntegralInRange<std::size_t>(0, filter == Filter::gaussian ? 20 : 50);
  const bool inPlace = input.ConsumeBool();
  std::vector<std::uint8_t> source(rowBytes * height);
  for (auto& byte : source) byte = input.ConsumeIntegral<std::uint8_t>();
  std::vector<std::uint8_t> expected = source, actual = source;
  for (std::size_t channel = 0; channel < 4; ++channel) {
    const std::uint8_t* from = (inPlace ? expected.data() : source.data()) + channel;
    kxa::ipl::referenceFilter(filter, from, expected.data() + channel, width, height, 4, 4, rowBytes,
                              rowBytes, radius);
  }
  const PixelFilter call = filter == Filter::box        ? IPLBoxBlur32BitAlphaFirstImage
                           : filter == Filter::gaussian ? IPLGaussianBlur32BitAlphaFirstImage
                           : filter == Filter::erode    ? IPLErode32BitAlphaFirstImage
                                                        : IPLDilate32BitAlphaFirstImage;
  call(inPlace ? actual.data() : source.data(), actual.data(), width, height, rowBytes, rowBytes, radius);
  check(expected == actual);
}

void runPixelOperations(FuzzedDataProvider& input) {
  const std::size_t side = input.ConsumeIntegralInRange<std::size_t>(0, 24);
  const std::size_t rowBytes = side * 4 + input.ConsumeIntegralInRange<std::size_t>(0, 8);
  std::vector<std::uint8_t> image(rowBytes * side + 1);
  for (auto& byte : image) byte = input.ConsumeIntegral<std::uint8_t>();
  std::vector<std::uint8_t> mask(side * side + 1, input.ConsumeIntegral<std::uint8_t>());
  std::uint8_t* pixels = image.data();
  const auto flag = [&] { return input.ConsumeBool() ? 1 : 0; };
  IPLTeethWhitenerFrom32BitARGBImage(pixels, pixels, side, rowBytes, rowBytes);
  IPLRemoveEncircledChromaFrom32BitARGBImage(pixels, pixels, side, rowBytes, rowBytes, flag());
  IPLApplyToneLUTTo32BitARGBImage(pixels, pixels, side, side, rowBytes, rowBytes, flag(),
                                  input.ConsumeFloatingPoint<float>(), input.ConsumeFloatingPoint<float>());
  IPLApplyCustomLUTTo32BitARGBImage(pixels, pixels, side, side, rowBytes, rowBytes,
                                    input.ConsumeIntegral<int>(), flag(), input.ConsumeFloatingPoint<float>());
  IPLApplyTintTo32BitAlphaFirstImage(pixels, pixels, side, side, rowBytes, rowBytes, flag(), flag(),
                                     input.ConsumeIntegral<std::uint8_t>());
  IPLClearAlphaChannelOf32BitAlphaFirstImage(pixels, pixels, side, side, rowBytes, rowBytes,
                                             input.ConsumeIntegral<std::uint8_t>(), flag(), flag());
  IPLApply8BitMaskTo32BitAlphaFirstImage(pixels, mask.data(), pixels, side, side, rowBytes, 1, side, rowBytes,
                                         flag(), flag(), flag());
  IPLDemultiplyAlphaFrom32BitAlphaFirstImage(pixels, pixels, side, side, rowBytes, rowBytes);
  const double hsv[3] = {input.ConsumeFloatingPoint<double>(), input.ConsumeFloatingPoint<double>(),
                         input.ConsumeFloatingPoint<double>()};
  double rgb[3];
  IPLRGBFromHueSaturatuinValue(rgb, hsv);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  FuzzedDataProvider input(data, size);
  switch (input.ConsumeIntegralInRange<int>(0, 2)) {
    case 0: compareFilter(input); break;
    case 1: compareWholePixels(input); break;
    default: runPixelOperations(input); break;
  }
  return 0;
}
