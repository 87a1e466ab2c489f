#include "kxacore/Imaging/IPLEllipseMask.h"

#include "kxacore/Imaging/IPLPixelOperations.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <vector>

namespace {

TEST(EllipseMask, UnusableSizesMakeNothing) {
  for (const auto& [width, height] : std::vector<std::pair<double, double>>{
           {0, 10}, {10, 0}, {-1, 5}, {0.5, 5}, {NAN, 5}, {1e300, 5}, {40000, 2}}) {
    EXPECT_FALSE(CreateEllipseImageMaskData(false, nullptr, width, height)) << width << "x" << height;
    EXPECT_FALSE(CreateEllipseImageMask(true, width, height)) << width << "x" << height;
  }
}

TEST(EllipseMask, RowsRoundUpToSixteenBytes) {
  const auto block = CreateEllipseImageMaskData(false, nullptr, 10.7, 3);
  ASSERT_TRUE(block);
  EXPECT_EQ(block->size(), 16u * 3);
  EXPECT_EQ(IPLEllipseMaskRowBytes(16), 16u);
  EXPECT_EQ(IPLEllipseMaskRowBytes(17), 32u);
  const auto image = CreateEllipseImageMask(false, 10, 3);
  ASSERT_TRUE(image);
  EXPECT_EQ(image->rowBytes(), 16u);
  EXPECT_EQ(image->layout(), KXAPixelLayout::grey8);
}

TEST(EllipseMask, HardMaskIsWhiteInsideBlackOutsideAndSymmetric) {
  const std::size_t side = 31, row = IPLEllipseMaskRowBytes(side);
  const auto block = CreateEllipseImageMaskData(false, nullptr, side, side);
  ASSERT_TRUE(block);
  const auto at = [&](std::size_t x, std::size_t y) { return (*block)[y * row + x]; };
  EXPECT_EQ(at(15, 15), 255);
  EXPECT_EQ(at(0, 0), 0);
  EXPECT_EQ(at(30, 30), 0);
  EXPECT_GT(at(15, 0), 100);  // the top edge touches the rectangle
  for (std::size_t y = 0; y < side; ++y)
    for (std::size_t x = 0; x < side; ++x) {
      // Cairo samples its antialiasing, so mirrored pixels agree only roughly.
      EXPECT_NEAR(at(x, y), at(side - 1 - x, y), 16) << x << "," << y;
      EXPECT_NEAR(at(x, y), at(y, x), 16) << x << "," << y;
    }
  // Padding bytes past the width stay black.
  EXPECT_EQ((*block)[15 * row + side], 0);
}

TEST(EllipseMask, SoftEdgeErodesThenBlursFromNineByNine) {
  for (const std::size_t side : {std::size_t{8}, std::size_t{9}, std::size_t{40}}) {
    auto hard = CreateEllipseImageMaskData(false, nullptr, side, side);
    const auto soft = CreateEllipseImageMaskData(true, nullptr, side, side);
    ASSERT_TRUE(hard && soft);
    if (side < 9) {
      EXPECT_EQ(*hard, *soft);
      continue;
    }
    const std::size_t row = IPLEllipseMaskRowBytes(side);
    IPLBlur(hard->data(), hard->data(), side, side, 1, 1, row, row, 2, IPLMorphologyErode,
            IPLBlurBox);
    EXPECT_EQ(*hard, *soft) << side;
  }
}

TEST(EllipseMask, ReturnedContextDrawsIntoTheBlock) {
  KXACairoContext context;
  auto block = CreateEllipseImageMaskData(false, &context, 20, 20);
  ASSERT_TRUE(block && context);
  cairo_set_source_rgba(context.get(), 1, 1, 1, 1);
  cairo_rectangle(context.get(), 0, 0, 1, 1);
  cairo_fill(context.get());
  cairo_surface_flush(cairo_get_target(context.get()));
  EXPECT_EQ((*block)[0], 255);
}

}  // namespace
