// The fast blur family against the plain line-by-line forms, and the few
// outputs worth pinning by value.

#include "kxacore/Imaging/IPLFastFilters.h"
#include "kxacore/Imaging/IPLPixelOperations.h"
#include "kxacore/Imaging/IPLReference.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <random>
#include <string>
#include <vector>

namespace {

using kxa::ipl::Filter;

// One 8-bit channel inside an interleaved, row-padded buffer.
struct Layout {
  std::size_t width, height, step, rowBytes, offset;
  std::size_t bytes() const { return height * rowBytes; }
};

Layout randomLayout(std::mt19937& random, std::size_t width, std::size_t height) {
  const std::size_t step = std::uniform_int_distribution<std::size_t>(1, 4)(random);
  const std::size_t padding = std::uniform_int_distribution<std::size_t>(0, 9)(random);
  const std::size_t offset = std::uniform_int_distribution<std::size_t>(0, step - 1)(random);
  return Layout{width, height, step, width * step + padding, offset};
}

std::vector<std::uint8_t> randomBytes(std::mt19937& random, std::size_t count, int flavour) {
  std::vector<std::uint8_t> bytes(count);
  std::uniform_int_distribution<int> level(0, 255);
  const int flat = level(random);
  for (auto& byte : bytes) {
    switch (flavour) {
      case 0: byte = static_cast<std::uint8_t>(level(random)); break;
      case 1: byte = static_cast<std::uint8_t>(flat); break;  // flat masks rescan most
      default: byte = level(random) < 128 ? 0 : 255; break;
    }
  }
  return bytes;
}

void runPublic(Filter filter, const std::uint8_t* source, std::uint8_t* destination,
               const Layout& in, const Layout& out, std::size_t radius) {
  const auto call = filter == Filter::box        ? IPLBoxBlur
                    : filter == Filter::gaussian ? IPLGaussianBlur
                    : filter == Filter::erode    ? IPLErode
                                                 : IPLDilate;
  call(source, destination, in.width, in.height, in.step, out.step, in.rowBytes, out.rowBytes,
       radius);
}

std::string describe(Filter filter, const Layout& in, const Layout& out, std::size_t radius) {
  return "filter " + std::to_string(static_cast<int>(filter)) + " size " +
         std::to_string(in.width) + "x" + std::to_string(in.height) + " steps " +
         std::to_string(in.step) + "/" + std::to_string(out.step) + " rows " +
         std::to_string(in.rowBytes) + "/" + std::to_string(out.rowBytes) + " radius " +
         std::to_string(radius);
}

// Same source, same destination contents before the call (bytes between
// samples must survive too), public call versus plain form.
void expectSameAsReference(std::mt19937& random, Filter filter, std::size_t width,
                           std::size_t height, std::size_t radius, bool inPlace) {
  const Layout in = randomLayout(random, width, height);
  const Layout out = inPlace ? in : randomLayout(random, width, height);
  const int flavour = std::uniform_int_distribution<int>(0, 2)(random);
  const auto source = randomBytes(random, in.bytes(), flavour);
  auto expected = inPlace ? source : randomBytes(random, out.bytes(), 0);
  auto actual = expected;
  const std::uint8_t* referenceSource = inPlace ? expected.data() : source.data();
  const std::uint8_t* fastSource = inPlace ? actual.data() : source.data();
  kxa::ipl::referenceFilter(filter, referenceSource + in.offset, expected.data() + out.offset,
                            width, height, in.step, out.step, in.rowBytes, out.rowBytes, radius);
  runPublic(filter, fastSource + in.offset, actual.data() + out.offset, in, out, radius);
  ASSERT_EQ(expected, actual) << describe(filter, in, out, radius) << (inPlace ? " in place" : "");
}

class BlurFamilyMatchesReference : public ::testing::TestWithParam<Filter> {};

// Runs body once per instruction set the filters were compiled for and this
// CPU runs, so every SIMD form is held to the reference, not just the best.
template <typename Body>
void forEachInstructionSet(Body body) {
  const auto names = kxa::ipl::availableInstructionSets();
  ASSERT_FALSE(names.empty());
  for (std::size_t i = 0; i < names.size(); ++i) {
    SCOPED_TRACE("instruction set " + names[i]);
    kxa::ipl::forceInstructionSet(static_cast<int>(i));
    body();
    kxa::ipl::forceInstructionSet(-1);
    if (::testing::Test::HasFatalFailure()) return;
  }
}

TEST_P(BlurFamilyMatchesReference, SmallImagesEveryRadiusPastTheImage) {
  forEachInstructionSet([this] {
    std::mt19937 random(1234 + static_cast<unsigned>(GetParam()));
    for (std::size_t width = 1; width <= 13; width += 3) {
      for (std::size_t height = 1; height <= 11; height += 2) {
        for (std::size_t radius = 0; radius <= std::max(width, height) + 3; ++radius) {
          expectSameAsReference(random, GetParam(), width, height, radius, radius % 2 == 1);
          if (HasFatalFailure()) return;
        }
      }
    }
  });
}

TEST_P(BlurFamilyMatchesReference, RandomSizesAcrossColumnStrips) {
  forEachInstructionSet([this] {
    std::mt19937 random(99 + static_cast<unsigned>(GetParam()));
    std::uniform_int_distribution<std::size_t> side(1, 200);
    for (int round = 0; round < 40; ++round) {
      const std::size_t width = side(random), height = side(random);
      const std::size_t longest = std::max(width, height);
      const std::size_t radius =
          round % 5 == 0 ? longest + 1 : std::uniform_int_distribution<std::size_t>(0, 25)(random);
      // The repeated 3-tap blur runs radius passes: keep it cheap.
      const std::size_t used = GetParam() == Filter::gaussian ? std::min<std::size_t>(radius, 12) : radius;
      expectSameAsReference(random, GetParam(), width, height, used, round % 3 == 0);
      if (HasFatalFailure()) return;
    }
  });
}

// Windows whose length crosses a power of two change the number of doubling
// levels, and radius 128 is where erosion and dilation leave the streamed
// ring for the strips; both sides of each edge, on an image wider than them.
TEST_P(BlurFamilyMatchesReference, RadiiAroundDoublingLevelsAndPathEdges) {
  forEachInstructionSet([this] {
    std::mt19937 random(31 + static_cast<unsigned>(GetParam()));
    int round = 0;
    for (const std::size_t radius : {3u, 4u, 7u, 8u, 31u, 32u, 127u, 128u, 129u}) {
      expectSameAsReference(random, GetParam(), 290, 270, radius, ++round % 2 == 0);
      if (HasFatalFailure()) return;
    }
  });
}

// Packed samples take the transposing row path in groups of 16 rows and 16
// columns within strips of 64 rows; sizes around those edges leave partial
// groups and strips on both sides.
TEST_P(BlurFamilyMatchesReference, PackedSamplesAroundTransposeEdges) {
  const std::size_t sides[] = {1, 15, 16, 17, 63, 64, 65, 97};
  forEachInstructionSet([&] {
    std::mt19937 random(5 + static_cast<unsigned>(GetParam()));
    for (const std::size_t width : sides) {
      for (const std::size_t height : sides) {
        const std::size_t radius = std::uniform_int_distribution<std::size_t>(0, 9)(random);
        const Layout in{width, height, 1, width + (height % 3), 0};
        const Layout out{width, height, 1, width + (width % 4), 0};
        const auto source = randomBytes(random, in.bytes(), 0);
        auto expected = randomBytes(random, out.bytes(), 0);
        auto actual = expected;
        kxa::ipl::referenceFilter(GetParam(), source.data(), expected.data(), width, height, 1, 1,
                                  in.rowBytes, out.rowBytes, radius);
        runPublic(GetParam(), source.data(), actual.data(), in, out, radius);
        ASSERT_EQ(expected, actual) << describe(GetParam(), in, out, radius);
      }
    }
  });
}

using PixelFilter = void (*)(const uint8_t*, uint8_t*, size_t, size_t, size_t, size_t, size_t);

PixelFilter pixelFilterFor(Filter filter) {
  return filter == Filter::box        ? IPLBoxBlur32BitAlphaFirstImage
         : filter == Filter::gaussian ? IPLGaussianBlur32BitAlphaFirstImage
         : filter == Filter::erode    ? IPLErode32BitAlphaFirstImage
                                      : IPLDilate32BitAlphaFirstImage;
}

// The whole-pixel forms must equal four one-channel reference runs, one per
// byte of the pixel, with the row padding left alone.
TEST_P(BlurFamilyMatchesReference, WholePixelsEqualFourChannels) {
  forEachInstructionSet([this] {
    std::mt19937 random(77 + static_cast<unsigned>(GetParam()));
    std::uniform_int_distribution<std::size_t> side(1, 90);
    for (int round = 0; round < 30; ++round) {
      const std::size_t width = round < 4 ? 1 + static_cast<std::size_t>(round) * 5 : side(random);
      const std::size_t height = round < 4 ? 40 - static_cast<std::size_t>(round) * 13 : side(random);
      const std::size_t longest = std::max(width, height);
      std::size_t radius =
          round % 6 == 0 ? longest + 2 : std::uniform_int_distribution<std::size_t>(0, 12)(random);
      if (GetParam() == Filter::gaussian) radius = std::min<std::size_t>(radius, 10);
      const bool inPlace = round % 3 == 1;
      const std::size_t inRow = width * 4 + std::uniform_int_distribution<std::size_t>(0, 7)(random);
      const std::size_t outRow = inPlace ? inRow : width * 4 + std::uniform_int_distribution<std::size_t>(0, 7)(random);
      const auto source = randomBytes(random, height * inRow, round % 3);
      auto expected = inPlace ? source : randomBytes(random, height * outRow, 0);
      auto actual = expected;
      for (std::size_t channel = 0; channel < 4; ++channel) {
        const std::uint8_t* from = (inPlace ? expected.data() : source.data()) + channel;
        kxa::ipl::referenceFilter(GetParam(), from, expected.data() + channel, width, height, 4, 4, inRow,
                                  outRow, radius);
      }
      pixelFilterFor(GetParam())(inPlace ? actual.data() : source.data(), actual.data(), width, height,
                                 inRow, outRow, radius);
      ASSERT_EQ(expected, actual) << "filter " << static_cast<int>(GetParam()) << " size " << width << "x"
                                  << height << " rows " << inRow << "/" << outRow << " radius " << radius
                                  << (inPlace ? " in place" : "");
    }
  });
}

INSTANTIATE_TEST_SUITE_P(Filters, BlurFamilyMatchesReference,
                         ::testing::Values(Filter::box, Filter::gaussian, Filter::erode,
                                           Filter::dilate));

TEST(BlurFamily, BlurChainsMorphologyThenBlurOnTheDestination) {
  std::mt19937 random(7);
  for (int morphology = 0; morphology <= 2; ++morphology) {
    for (int blur = 0; blur <= 2; ++blur) {
      const Layout in{37, 29, 1, 40, 0};
      const Layout out{37, 29, 2, 80, 1};
      const auto source = randomBytes(random, in.bytes(), 0);
      auto expected = randomBytes(random, out.bytes(), 0);
      auto actual = expected;
      const std::size_t radius = 3;
      const std::uint8_t* blurSource = source.data();
      std::size_t blurStep = in.step, blurRow = in.rowBytes;
      if (morphology != 2) {
        kxa::ipl::referenceFilter(morphology == 0 ? Filter::erode : Filter::dilate, source.data(),
                                  expected.data() + 1, 37, 29, 1, 2, 40, 80, radius);
        blurSource = expected.data() + 1;
        blurStep = 2;
        blurRow = 80;
      }
      if (blur != 2) {
        kxa::ipl::referenceFilter(blur == 0 ? Filter::box : Filter::gaussian, blurSource,
                                  expected.data() + 1, 37, 29, blurStep, 2, blurRow, 80, radius);
      }
      IPLBlur(source.data(), actual.data() + 1, 37, 29, 1, 2, 40, 80, radius, morphology, blur);
      EXPECT_EQ(expected, actual) << "morphology " << morphology << " blur " << blur;
    }
  }
}

TEST(BlurFamily, BoxBlurOfRadiusZeroCopies) {
  std::mt19937 random(3);
  const auto source = randomBytes(random, 9 * 7, 0);
  std::vector<std::uint8_t> destination(source.size());
  IPLBoxBlur(source.data(), destination.data(), 9, 7, 1, 1, 9, 9, 0);
  EXPECT_EQ(source, destination);
}

TEST(BlurFamily, ErosionBlackensEveryEdgeWithinTheRadius) {
  std::vector<std::uint8_t> image(25, 255);
  IPLErode(image.data(), image.data(), 5, 5, 1, 1, 5, 5, 1);
  for (std::size_t y = 0; y < 5; ++y)
    for (std::size_t x = 0; x < 5; ++x) {
      const bool edge = x == 0 || y == 0 || x == 4 || y == 4;
      EXPECT_EQ(image[y * 5 + x], edge ? 0 : 255) << x << "," << y;
    }
}

// Borders mirror with the edge repeated and keep mirroring past the line:
// [0 255] extends to ... 255 0 | 0 255 | 255 0 0 255 ...
TEST(BlurFamily, BoxBlurRadiusPastTheLineKeepsMirroring) {
  const std::uint8_t line[2] = {0, 255};
  std::uint8_t out[2] = {};
  IPLBoxBlur(line, out, 2, 1, 1, 1, 2, 2, 2);
  EXPECT_EQ(out[0], 153);  // (255 + 0 + 0 + 255 + 255) / 5 = 153
  EXPECT_EQ(out[1], 102);  // (0 + 0 + 255 + 255 + 0) / 5 = 102
}

TEST(BlurFamily, WholePixelFormsIgnoreEmptyImagesAndHugeBlurRadii) {
  std::vector<std::uint8_t> image{1, 2, 3, 4, 5, 6, 7, 8};
  const auto original = image;
  for (const Filter filter : {Filter::box, Filter::gaussian, Filter::erode, Filter::dilate}) {
    pixelFilterFor(filter)(image.data(), image.data(), 0, 2, 4, 4, 1);
    pixelFilterFor(filter)(image.data(), image.data(), 1, 0, 4, 4, 1);
  }
  IPLBoxBlur32BitAlphaFirstImage(image.data(), image.data(), 1, 2, 4, 4, IPLMaximumBlurRadius + 1);
  IPLGaussianBlur32BitAlphaFirstImage(image.data(), image.data(), 1, 2, 4, 4, IPLMaximumBlurRadius + 1);
  EXPECT_EQ(image, original);
  IPLDilate32BitAlphaFirstImage(image.data(), image.data(), 1, 2, 4, 4, SIZE_MAX / 4);
  EXPECT_EQ(image, (std::vector<std::uint8_t>{5, 6, 7, 8, 5, 6, 7, 8}));
}

TEST(BlurFamily, HugeRadiiAreHarmless) {
  std::vector<std::uint8_t> image{10, 200, 30, 40, 50, 60};
  const auto original = image;
  IPLBoxBlur(image.data(), image.data(), 3, 2, 1, 1, 3, 3, IPLMaximumBlurRadius + 1);
  EXPECT_EQ(image, original);
  IPLDilate(image.data(), image.data(), 3, 2, 1, 1, 3, 3, SIZE_MAX / 4);
  EXPECT_EQ(image, std::vector<std::uint8_t>(6, 200));
  IPLErode(image.data(), image.data(), 3, 2, 1, 1, 3, 3, SIZE_MAX / 4);
  EXPECT_EQ(image, std::vector<std::uint8_t>(6, 0));
}

TEST(BlurFamily, DivisionTableRoundsToNearest) {
  const auto identity = kxa::ipl::makeDivisionTable(0);
  ASSERT_EQ(identity.size(), 256u);
  EXPECT_EQ(identity[200], 200);
  const auto thirds = kxa::ipl::makeDivisionTable(1);
  ASSERT_EQ(thirds.size(), 766u);
  EXPECT_EQ(thirds[4], 1);  // 1.33
  EXPECT_EQ(thirds[5], 2);  // 1.67
  EXPECT_EQ(thirds[765], 255);
}

}  // namespace

namespace {

TEST(BlurFamily, MultiplyShiftDivisionMatchesTheTableForEveryWindowSum) {
  for (std::size_t radius = 0; radius <= kxa::ipl::RoundedDivider::kMaximumRadius; ++radius) {
    const auto table = kxa::ipl::makeDivisionTable(radius);
    const kxa::ipl::RoundedDivider divide(radius);
    for (std::uint32_t sum = 0; sum < table.size(); ++sum)
      ASSERT_EQ(divide(sum), table[sum]) << "radius " << radius << " sum " << sum;
  }
}

}  // namespace
