// Per-pixel operations, tables and colour conversions.

#include "kxacore/Imaging/IPLPixelOperations.h"

#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <cstdint>
#include <vector>

extern "C" int kxaImagingCallFromC(void);

namespace {

using Pixel = std::array<std::uint8_t, 4>;  // alpha, red, green, blue

TEST(PixelOperations, HeaderWorksFromC) { EXPECT_EQ(kxaImagingCallFromC(), 1); }

TEST(PixelOperations, AlphaTableTruncates) {
  for (unsigned a = 0; a < 256; ++a)
    for (unsigned c = 0; c < 256; ++c) ASSERT_EQ(gAlphaLookUpTable[a * 256 + c], a * c / 255);
}

TEST(PixelOperations, HumpPassesThroughItsSamplesAndStaysInRange) {
  const std::array<std::pair<int, float>, 10> samples{{{0, 0.0f}, {32, 0.117f}, {64, 0.217f},
                                                       {96, 0.297f}, {127, 0.33f}, {128, 0.33f},
                                                       {160, 0.295f}, {192, 0.214f}, {224, 0.113f},
                                                       {255, 0.0f}}};
  for (const auto& [level, value] : samples) EXPECT_FLOAT_EQ(_maxGenericOneHumpLUT[level], value) << level;
  for (int i = 0; i < 256; ++i) {
    EXPECT_GE(_maxGenericOneHumpLUT[i], 0.0f);
    EXPECT_LE(_maxGenericOneHumpLUT[i], 0.33f);
    if (i > 0 && i <= 127) {
      EXPECT_GE(_maxGenericOneHumpLUT[i], _maxGenericOneHumpLUT[i - 1]) << i;
    }
    if (i > 128) {
      EXPECT_LE(_maxGenericOneHumpLUT[i], _maxGenericOneHumpLUT[i - 1]) << i;
    }
    EXPECT_NEAR(_maxGenericOgeeLUT[i], -_maxGenericOgeeLUT[255 - i], 1e-5f) << i;
  }
}

// One pixel through a 32-bit operation, source and destination separate.
template <typename Operation>
Pixel onePixel(Pixel source, Pixel destination, Operation&& operation) {
  operation(source.data(), destination.data());
  return destination;
}

struct MaskRow {
  int useImageAlpha, scaleColors, invert;
  Pixel expected;
};

TEST(PixelOperations, MaskFlagsFollowTheirTable) {
  // Image (200, 100, 50, 255), mask 51 (inverted 204), destination colours 7.
  const MaskRow rows[] = {
      {0, 0, 0, {51, 7, 7, 7}},     {0, 1, 0, {51, 20, 10, 51}},
      {1, 0, 0, {40, 7, 7, 7}},     {1, 1, 0, {40, 20, 10, 51}},
      {0, 0, 1, {204, 7, 7, 7}},    {0, 1, 1, {51, 80, 40, 204}},  // alpha keeps the plain mask
      {1, 0, 1, {160, 7, 7, 7}},    {1, 1, 1, {160, 80, 40, 204}},
  };
  for (const auto& row : rows) {
    const std::uint8_t mask = 51;
    const Pixel result = onePixel({200, 100, 50, 255}, {7, 7, 7, 7}, [&](auto* in, auto* out) {
      IPLApply8BitMaskTo32BitAlphaFirstImage(in, &mask, out, 1, 1, 4, 1, 1, 4, row.useImageAlpha,
                                             row.scaleColors, row.invert);
    });
    EXPECT_EQ(result, row.expected) << row.useImageAlpha << row.scaleColors << row.invert;
  }
}

TEST(PixelOperations, CeilThresholdsPerFlags) {
  const std::uint8_t levels[] = {0, 1, 254, 255};
  const std::array<std::uint8_t, 4> expected[2][2] = {
      {{0, 255, 255, 255}, {255, 255, 255, 0}},  // not inverted: any level, below full
      {{255, 0, 0, 0}, {0, 0, 0, 255}},          // inverted: zero only, full only
  };
  for (int invert = 0; invert < 2; ++invert)
    for (int full = 0; full < 2; ++full) {
      std::array<std::uint8_t, 4> out{};
      IPLCeil8BitMask(levels, out.data(), 4, 1, 4, 4, full, invert);
      EXPECT_EQ(out, expected[invert][full]) << invert << full;
    }
}

TEST(PixelOperations, CombineMultipliesAndInverts) {
  const std::uint8_t a = 200, b = 100;
  const struct {
    int invertA, invertB, invertResult;
    std::uint8_t expected;
  } rows[] = {{0, 0, 0, 78}, {1, 0, 0, 21}, {0, 1, 0, 121}, {1, 1, 1, 255 - 33}};
  for (const auto& row : rows) {
    std::uint8_t out = 0;
    IPLCombine8BitMasks(&a, &b, &out, 1, 1, 1, 1, 1, row.invertA, row.invertB, row.invertResult);
    EXPECT_EQ(out, row.expected) << row.invertA << row.invertB << row.invertResult;
  }
}

TEST(PixelOperations, DemultiplyWrapsInsteadOfClamping) {
  const Pixel result = onePixel({100, 200, 50, 0}, {}, [](auto* in, auto* out) {
    IPLDemultiplyAlphaFrom32BitAlphaFirstImage(in, out, 1, 1, 4, 4);
  });
  EXPECT_EQ(result, (Pixel{100, 254, 127, 0}));  // 510 mod 256, 127
  const Pixel transparent = onePixel({0, 9, 8, 7}, {}, [](auto* in, auto* out) {
    IPLDemultiplyAlphaFrom32BitAlphaFirstImage(in, out, 1, 1, 4, 4);
  });
  EXPECT_EQ(transparent, (Pixel{0, 9, 8, 7}));
}

TEST(PixelOperations, RemoveBackgroundWrapsModulo256) {
  const Pixel result = onePixel({100, 10, 200, 0}, {}, [](auto* in, auto* out) {
    IPLRemoveBackgroundColorFrom32BitAlphaFirstImage(in, out, 1, 1, 4, 4, 200, 50, 0);
  });
  EXPECT_EQ(result, (Pixel{100, 166, 250, 100}));  // (100 - 200 + 10) mod 256 = 166; 250; 100
}

struct TintRow {
  int premultipliedSource, premultiply;
  std::uint8_t amount;
  Pixel expected;
};

TEST(PixelOperations, TintFollowsItsFlags) {
  // Source alpha 128, colours 100, 0, 250; destination starts as 1s.
  const TintRow rows[] = {
      {0, 0, 0, {1, 1, 1, 1}},          // nothing done
      {0, 0, 51, {128, 131, 51, 251}},  // scale(204, c) + 51
      {0, 1, 0, {128, 50, 0, 125}},     // only premultiplied
      {0, 1, 51, {128, 65, 25, 125}},   // scale(204, scale(128, c)) + scale(128, 51)
      {1, 0, 0, {128, 199, 0, 242}},    // only demultiplied: 498 & 255 = 242
      {1, 0, 51, {128, 210, 51, 255}},  // c * 204 / 128 + 51, capped
      {1, 1, 0, {1, 1, 1, 1}},
      {1, 1, 51, {128, 105, 25, 225}},  // scale(204, c) + scale(51, 128)
  };
  for (const auto& row : rows) {
    const Pixel result = onePixel({128, 100, 0, 250}, {1, 1, 1, 1}, [&](auto* in, auto* out) {
      IPLApplyTintTo32BitAlphaFirstImage(in, out, 1, 1, 4, 4, row.premultipliedSource,
                                         row.premultiply, row.amount);
    });
    EXPECT_EQ(result, row.expected) << row.premultipliedSource << row.premultiply << int(row.amount);
  }
}

TEST(PixelOperations, ClearAlphaFollowsItsFlags) {
  const struct {
    std::uint8_t alpha;
    int demultiply, premultiply;
    Pixel expected;
  } rows[] = {
      {128, 0, 0, {128, 1, 1, 1}},     {128, 0, 1, {128, 50, 0, 125}},
      {255, 0, 1, {255, 1, 1, 1}},     // premultiply counts only below 255
      {255, 1, 0, {255, 199, 0, 242}}, {64, 1, 1, {64, 49, 0, 60}},
  };
  for (const auto& row : rows) {
    const Pixel result = onePixel({128, 100, 0, 250}, {1, 1, 1, 1}, [&](auto* in, auto* out) {
      IPLClearAlphaChannelOf32BitAlphaFirstImage(in, out, 1, 1, 4, 4, row.alpha, row.demultiply,
                                                 row.premultiply);
    });
    EXPECT_EQ(result, row.expected) << int(row.alpha) << row.demultiply << row.premultiply;
  }
}

TEST(PixelOperations, ColourShiftOfZeroAmountIsIdentityAndShiftsAlongTheAngle) {
  std::vector<std::uint8_t> image(256 * 4);
  for (int i = 0; i < 256; ++i) {
    image[4 * i] = static_cast<std::uint8_t>(255 - i);
    image[4 * i + 1] = image[4 * i + 2] = image[4 * i + 3] = static_cast<std::uint8_t>(i);
  }
  std::vector<std::uint8_t> out(image.size());
  IPLApplyCustomLUTTo32BitARGBImage(image.data(), out.data(), 256, 1, 1024, 1024, 0, 0, 0.0f);
  EXPECT_EQ(out, image);
  // Angle 0 pushes red up and green and blue down; weight 0.5 everywhere.
  IPLApplyCustomLUTTo32BitARGBImage(image.data(), out.data(), 256, 1, 1024, 1024, 0, 1, 0.2f);
  EXPECT_EQ(out[4 * 0], 255);
  EXPECT_EQ(out[4 * 0 + 1], 26);  // round(0.1 * 255) = 25.5 -> 26
  EXPECT_EQ(out[4 * 0 + 2], 0);
  EXPECT_EQ(out[4 * 100 + 2], 87);  // round((100/255 - 0.05) * 255) = 87.25
}

TEST(PixelOperations, ToneLimitsTheAmountsAndReturnsThem) {
  std::vector<std::uint8_t> image(4, 128);
  const struct {
    float brightness, contrast;
    bool limited;
  } rows[] = {{0.6f, 0.6f, true}, {0.5f, 0.5f, false}, {-0.8f, 0.5f, true}, {0.95f, -0.95f, true},
              {0.0f, 0.0f, false}};
  for (const auto& row : rows) {
    const IPLToneAmounts used = IPLApplyToneLUTTo32BitARGBImage(image.data(), image.data(), 1, 1,
                                                                4, 4, 0, row.brightness, row.contrast);
    EXPECT_EQ(used.brightness != row.brightness, row.limited) << row.brightness << row.contrast;
    if (row.brightness > 0 && row.contrast > 0 && row.limited) {
      EXPECT_NEAR(0.116f * used.contrast + 0.141f * used.brightness, 0.14294118f, 1e-6f);
    }
  }
  // The alternative curve skips the limits.
  const IPLToneAmounts raw =
      IPLApplyToneLUTTo32BitARGBImage(image.data(), image.data(), 1, 1, 4, 4, 1, 0.5f, 0.5f);
  EXPECT_EQ(raw.brightness, 0.5f);
  // NaN amounts give a defined (black) curve rather than undefined casts.
  std::vector<std::uint8_t> grey(4, 128);
  IPLApplyToneLUTTo32BitARGBImage(grey.data(), grey.data(), 1, 1, 4, 4, 1, NAN, 0.0f);
  EXPECT_EQ(grey, (std::vector<std::uint8_t>{128, 0, 0, 0}));
  // Zero amounts leave every level as it was.
  std::vector<std::uint8_t> ramp(1024);
  for (std::size_t i = 0; i < ramp.size(); ++i) ramp[i] = static_cast<std::uint8_t>(i / 4);
  auto toned = ramp;
  IPLApplyToneLUTTo32BitARGBImage(ramp.data(), toned.data(), 256, 1, 1024, 1024, 0, 0.0f, 0.0f);
  EXPECT_EQ(toned, ramp);
}

TEST(PixelOperations, HsvConversionsPinTheTies) {
  const struct {
    double rgb[3];
    double hsv[3];
  } rows[] = {
      {{255, 255, 0}, {60, 1, 1}},        // red wins the tie with green
      {{0, 255, 255}, {180, 1, 1}},       // green wins the tie with blue
      {{0, 0, 0}, {0, 0, 0}},             {{128, 128, 128}, {0, 0, 128 / 255.0}},
      {{255, 0, 128}, {360 - 128 * 60 / 255.0, 1, 1}},
  };
  for (const auto& row : rows) {
    double hsv[3] = {-1, -1, -1};
    IPLHueSaturatuinValueFromRGB(hsv, row.rgb);
    for (int i = 0; i < 3; ++i) EXPECT_DOUBLE_EQ(hsv[i], row.hsv[i]) << row.rgb[0] << row.rgb[1] << row.rgb[2];
  }
  const struct {
    double hsv[3];
    double rgb[3];
  } back[] = {{{360, 1, 1}, {255, 0, 0}},  {{-120, 1, 1}, {0, 0, 255}}, {{90, 0, 0.5}, {128, 128, 128}},
              {{90, 1, 0}, {0, 0, 0}},     {{NAN, 1, 1}, {255, 255, 255}}};
  for (const auto& row : back) {
    double rgb[3] = {-1, -1, -1};
    IPLRGBFromHueSaturatuinValue(rgb, row.hsv);
    for (int i = 0; i < 3; ++i) EXPECT_EQ(rgb[i], row.rgb[i]) << row.hsv[0];
  }
  IPLRGBFromHueSaturatuinValue(nullptr, back[0].hsv);
  IPLHueSaturatuinValueFromRGB(nullptr, rows[0].rgb);
}

TEST(PixelOperations, EveryColourSurvivesTheHsvRoundTrip) {
  for (int colour = 0; colour < (1 << 24); ++colour) {
    const double rgb[3] = {double(colour >> 16), double((colour >> 8) & 255), double(colour & 255)};
    double hsv[3], back[3];
    IPLHueSaturatuinValueFromRGB(hsv, rgb);
    IPLRGBFromHueSaturatuinValue(back, hsv);
    if (back[0] != rgb[0] || back[1] != rgb[1] || back[2] != rgb[2]) {
      FAIL() << "colour " << colour << " came back as " << back[0] << "," << back[1] << "," << back[2];
    }
  }
}

// A 3x3 or 4x4 square: which pixels are in the disc, and what they become.
TEST(PixelOperations, TeethWhitenerBlendsTenPercentOfWhiteInsideTheDisc) {
  for (std::size_t side : {std::size_t{3}, std::size_t{4}}) {
    std::vector<std::uint8_t> image(side * side * 4);
    for (std::size_t i = 0; i < side * side; ++i) {
      image[4 * i] = 255;
      image[4 * i + 1] = 220;  // yellowish: hue 60
      image[4 * i + 2] = 200;
      image[4 * i + 3] = 40;
    }
    auto destination = image;
    IPLTeethWhitenerFrom32BitARGBImage(image.data(), destination.data(), side, side * 4, side * 4);
    // Odd sides: disc of radius 1 (corners out). Even sides: offsets -2 -1 1 2,
    // limit 5: corners (8) out, the rest in.
    for (std::size_t y = 0; y < side; ++y)
      for (std::size_t x = 0; x < side; ++x) {
        const bool corner = (x == 0 || x == side - 1) && (y == 0 || y == side - 1);
        const std::uint8_t* pixel = &destination[(y * side + x) * 4];
        if (corner) {
          EXPECT_EQ(pixel[1], 220) << side << ": " << x << "," << y;
        } else {
          EXPECT_EQ(pixel[1], 223) << side << ": " << x << "," << y;  // 25.5 + 198 = 223.5
          EXPECT_EQ(pixel[2], 205);                                     // 25.5 + 180
          EXPECT_EQ(pixel[3], 61);                                      // 25.5 + 36
        }
      }
  }
}

TEST(PixelOperations, EncircledChromaFadesWithDistance) {
  const std::size_t side = 5;
  std::vector<std::uint8_t> image(side * side * 4);
  for (std::size_t i = 0; i < side * side; ++i) {
    image[4 * i] = 255;
    image[4 * i + 1] = 200;
    image[4 * i + 2] = 100;
    image[4 * i + 3] = 60;
  }
  auto all = image, redOnly = image;
  IPLRemoveEncircledChromaFrom32BitARGBImage(image.data(), all.data(), side, 20, 20, 0);
  IPLRemoveEncircledChromaFrom32BitARGBImage(image.data(), redOnly.data(), side, 20, 20, 1);
  const auto at = [&](const std::vector<std::uint8_t>& pixels, std::size_t x, std::size_t y) {
    return Pixel{pixels[(y * side + x) * 4], pixels[(y * side + x) * 4 + 1],
                 pixels[(y * side + x) * 4 + 2], pixels[(y * side + x) * 4 + 3]};
  };
  // Centre: weight 0.9, average 120: 200 - 72, 100 + 18, 60 + 54.
  EXPECT_EQ(at(all, 2, 2), (Pixel{255, 128, 118, 114}));
  // (1, 0): distance 4 of limit 4: p = 100, profile 9 -> weight 0.081.
  EXPECT_EQ(at(all, 2, 0), (Pixel{255, 194, 101, 64}));
  // Corner: outside the disc, untouched.
  EXPECT_EQ(at(all, 0, 0), (Pixel{255, 200, 100, 60}));
  // Red only: weight scaled by (200 - 60) / (140 + 40) = 7/9 at the centre.
  EXPECT_EQ(at(redOnly, 2, 2), (Pixel{255, 144, 114, 102}));
  // A 1x1 square is its own centre.
  Pixel single{9, 90, 30, 0};
  IPLRemoveEncircledChromaFrom32BitARGBImage(single.data(), single.data(), 1, 4, 4, 0);
  EXPECT_EQ(single, (Pixel{9, 45, 39, 36}));  // average 40, weight 0.9
}

}  // namespace
