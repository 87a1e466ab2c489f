// Per-pixel operations on 32-bit alpha-first images and 8-bit masks, and the
// RGB / HSV conversions. Built with -ffp-contract=off: the float steps must
// round exactly as written, not fused into multiply-adds.

#include "kxacore/Imaging/IPLPixelOperations.h"

#include "kxacore/Imaging/IPLFastPixels.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstddef>
#include <cstdint>

namespace {

constexpr std::size_t kAlpha = 0, kRed = 1, kGreen = 2, kBlue = 3;

inline std::uint8_t scale(unsigned alpha, unsigned colour) {
  return gAlphaLookUpTable[alpha * 256 + colour];
}

// Truncating 16-bit demultiply; only the low byte is kept, so colours larger
// than their alpha wrap instead of clamping.
inline std::uint8_t demultiplied(unsigned colour, unsigned alpha) {
  if (alpha == 0) return static_cast<std::uint8_t>(colour);
  const auto wide = static_cast<std::uint16_t>(colour * 255);
  return static_cast<std::uint8_t>(static_cast<std::uint16_t>(wide / alpha));
}

// Visits every pixel of two 32-bit images of the same size. fastRow(in,
// out, width) may do a leading part of each row with SIMD and returns how
// many pixels it did; function does the rest one pixel at a time.
template <typename FastRow, typename PixelFunction>
void forEachPixel(const std::uint8_t* source, std::uint8_t* destination, std::size_t width,
                  std::size_t height, std::size_t sourceRowBytes, std::size_t destinationRowBytes,
                  FastRow&& fastRow, PixelFunction&& function) {
  for (std::size_t y = 0; y < height; ++y) {
    const std::uint8_t* in = source + y * sourceRowBytes;
    std::uint8_t* out = destination + y * destinationRowBytes;
    for (std::size_t x = fastRow(in, out, width); x < width; ++x) function(in + 4 * x, out + 4 * x);
  }
}

// For operations with no SIMD form.
constexpr auto kNoFastRow = [](const std::uint8_t*, std::uint8_t*, std::size_t) -> std::size_t { return 0; };

// Three 256-entry colour tables, alpha copied.
void applyTables(const std::uint8_t* source, std::uint8_t* destination, std::size_t width,
                 std::size_t height, std::size_t sourceRowBytes, std::size_t destinationRowBytes,
                 const std::array<std::uint8_t, 256>& red, const std::array<std::uint8_t, 256>& green,
                 const std::array<std::uint8_t, 256>& blue) {
  forEachPixel(source, destination, width, height, sourceRowBytes, destinationRowBytes, kNoFastRow,
               [&](const std::uint8_t* in, std::uint8_t* out) {
                 const std::uint8_t a = in[kAlpha], r = in[kRed], g = in[kGreen], b = in[kBlue];
                 out[kAlpha] = a;
                 out[kRed] = red[r];
                 out[kGreen] = green[g];
                 out[kBlue] = blue[b];
               });
}

// At most 1, then at least 0; NaN (from NaN amounts) counts as 0.
inline float clampUnit(float value) {
  if (value > 1.0f) return 1.0f;
  return value >= 0.0f ? value : 0.0f;
}

// round() of the C library rounds halves away from zero, as the tables want.
inline std::uint8_t levelFromUnit(float value) {
  return static_cast<std::uint8_t>(std::round(clampUnit(value) * 255.0f));
}

// Offsets of the disc inscribed in a square of side n: odd sides are centred
// on a pixel; even sides skip the offset 0 so both halves are n / 2 wide.
struct Disc {
  long half;
  bool even;
  long limit;  // squared radius
  long offset(std::size_t i) const {
    long d = static_cast<long>(i) - half;
    if (even && d >= 0) ++d;
    return d;
  }
};

Disc discOfSide(std::size_t side) {
  const long half = static_cast<long>(side / 2);
  const bool even = side % 2 == 0;
  return Disc{half, even, half * half + (even ? 1 : 0)};
}

}  // namespace

extern "C" {

void IPLApply8BitMaskTo32BitAlphaFirstImage(const uint8_t* image, const uint8_t* mask,
                                            uint8_t* destination, size_t width, size_t height,
                                            size_t imageRowBytes, size_t maskStep,
                                            size_t maskRowBytes, size_t destinationRowBytes,
                                            int useImageAlpha, int scaleColors, int invert) {
  using kxa::ipl::MaskMode;
  const MaskMode maskMode = useImageAlpha ? (scaleColors ? MaskMode::scaleAll : MaskMode::scaleAlpha)
                                          : (scaleColors ? MaskMode::plainAlphaColours : MaskMode::maskAsAlpha);
  for (std::size_t y = 0; y < height; ++y) {
    const std::uint8_t* in = image + y * imageRowBytes;
    const std::uint8_t* maskRow = mask + y * maskRowBytes;
    std::uint8_t* out = destination + y * destinationRowBytes;
    const std::size_t done =
        maskStep == 1 ? kxa::ipl::fastMaskPixels(in, maskRow, out, width, maskMode, invert != 0) : 0;
    for (std::size_t x = done; x < width; ++x) {
      const std::uint8_t* pixel = in + 4 * x;
      std::uint8_t* target = out + 4 * x;
      const unsigned plain = maskRow[x * maskStep];
      const unsigned m = invert ? 255 - plain : plain;
      if (useImageAlpha) {
        const std::uint8_t a = pixel[kAlpha], r = pixel[kRed], g = pixel[kGreen], b = pixel[kBlue];
        target[kAlpha] = scale(m, a);
        if (scaleColors) {
          target[kRed] = scale(m, r);
          target[kGreen] = scale(m, g);
          target[kBlue] = scale(m, b);
        }
      } else if (scaleColors) {
        // Deliberately asymmetric: alpha takes the plain mask even when
        // inverted; only the colours see the inverted one.
        const std::uint8_t r = pixel[kRed], g = pixel[kGreen], b = pixel[kBlue];
        target[kAlpha] = static_cast<std::uint8_t>(plain);
        target[kRed] = scale(m, r);
        target[kGreen] = scale(m, g);
        target[kBlue] = scale(m, b);
      } else {
        target[kAlpha] = static_cast<std::uint8_t>(m);
      }
    }
  }
}

void IPLCombine8BitMasks(const uint8_t* maskA, const uint8_t* maskB, uint8_t* destination,
                         size_t width, size_t height, size_t maskARowBytes, size_t maskBRowBytes,
                         size_t destinationRowBytes, int invertA, int invertB, int invertResult) {
  for (std::size_t y = 0; y < height; ++y) {
    const std::uint8_t* a = maskA + y * maskARowBytes;
    const std::uint8_t* b = maskB + y * maskBRowBytes;
    std::uint8_t* out = destination + y * destinationRowBytes;
    const std::size_t done =
        kxa::ipl::fastCombineMasks(a, b, out, width, invertA != 0, invertB != 0, invertResult != 0);
    for (std::size_t x = done; x < width; ++x) {
      const unsigned first = invertA ? 255u - a[x] : a[x];
      const unsigned second = invertB ? 255u - b[x] : b[x];
      const std::uint8_t combined = scale(first, second);
      out[x] = invertResult ? static_cast<std::uint8_t>(255 - combined) : combined;
    }
  }
}

void IPLCeil8BitMask(const uint8_t* source, uint8_t* destination, size_t width, size_t height,
                     size_t sourceRowBytes, size_t destinationRowBytes, int fullLevel,
                     int invert) {
  // invert fullLevel: 0 0 s > 0 -> 255; 0 1 s < 255 -> 255;
  //                   1 0 s > 0 -> 0;   1 1 s == 255 -> 255.
  std::array<std::uint8_t, 256> table{};
  for (unsigned s = 0; s < 256; ++s) {
    bool white = false;
    if (!invert) white = fullLevel ? s < 255 : s > 0;
    else white = fullLevel ? s == 255 : s == 0;
    table[s] = white ? 255 : 0;
  }
  for (std::size_t y = 0; y < height; ++y) {
    const std::uint8_t* in = source + y * sourceRowBytes;
    std::uint8_t* out = destination + y * destinationRowBytes;
    for (std::size_t x = 0; x < width; ++x) out[x] = table[in[x]];
  }
}

void IPLDemultiplyAlphaFrom32BitAlphaFirstImage(const uint8_t* source, uint8_t* destination,
                                                size_t width, size_t height,
                                                size_t sourceRowBytes,
                                                size_t destinationRowBytes) {
  forEachPixel(source, destination, width, height, sourceRowBytes, destinationRowBytes, kNoFastRow,
               [](const std::uint8_t* in, std::uint8_t* out) {
                 const std::uint8_t a = in[kAlpha], r = in[kRed], g = in[kGreen], b = in[kBlue];
                 out[kAlpha] = a;
                 out[kRed] = demultiplied(r, a);
                 out[kGreen] = demultiplied(g, a);
                 out[kBlue] = demultiplied(b, a);
               });
}

void IPLRemoveBackgroundColorFrom32BitAlphaFirstImage(const uint8_t* source,
                                                      uint8_t* destination, size_t width,
                                                      size_t height, size_t sourceRowBytes,
                                                      size_t destinationRowBytes, uint8_t red,
                                                      uint8_t green, uint8_t blue) {
  forEachPixel(source, destination, width, height, sourceRowBytes, destinationRowBytes, kNoFastRow,
               [&](const std::uint8_t* in, std::uint8_t* out) {
                 const std::uint8_t a = in[kAlpha], r = in[kRed], g = in[kGreen], b = in[kBlue];
                 out[kAlpha] = a;
                 out[kRed] = static_cast<std::uint8_t>(a - red + r);
                 out[kGreen] = static_cast<std::uint8_t>(a - green + g);
                 out[kBlue] = static_cast<std::uint8_t>(a - blue + b);
               });
}

void IPLApplyCustomLUTTo32BitARGBImage(const uint8_t* source, uint8_t* destination,
                                       size_t width, size_t height, size_t sourceRowBytes,
                                       size_t destinationRowBytes, int angle, int constantWeight,
                                       float amount) {
  if (width == 0 || height == 0) return;
  constexpr double kRadiansPerDegree = 0.017453292519943295;
  const double degrees = angle;  // in double: angle - 240 must not overflow an int
  const float kRed = static_cast<float>(std::cos(degrees * kRadiansPerDegree) * amount);
  const float kGreen = static_cast<float>(std::cos((degrees - 120) * kRadiansPerDegree) * amount);
  const float kBlue = static_cast<float>(std::cos((degrees - 240) * kRadiansPerDegree) * amount);
  std::array<std::uint8_t, 256> red{}, green{}, blue{};
  for (unsigned i = 0; i < 256; ++i) {
    const float x = static_cast<float>(i) / 255.0f;
    const float weight = constantWeight ? 0.5f : _maxGenericOneHumpLUT[i];
    red[i] = levelFromUnit(x + weight * kRed);
    green[i] = levelFromUnit(x + weight * kGreen);
    blue[i] = levelFromUnit(x + weight * kBlue);
  }
  applyTables(source, destination, width, height, sourceRowBytes, destinationRowBytes, red,
              green, blue);
}

IPLToneAmounts IPLApplyToneLUTTo32BitARGBImage(const uint8_t* source, uint8_t* destination,
                                               size_t width, size_t height,
                                               size_t sourceRowBytes,
                                               size_t destinationRowBytes, int alternativeCurve,
                                               float brightness, float contrast) {
  float b = brightness, c = contrast;
  std::array<std::uint8_t, 256> table{};
  if (alternativeCurve) {
    for (unsigned i = 0; i < 256; ++i) {
      const float x = static_cast<float>(i) / 255.0f;
      const float bend = x >= 0.5f ? 4.0f * x - 2.0f : 0.8f * x - 0.4f;
      table[i] = levelFromUnit(x + 0.5f * b + c * bend);
    }
  } else {
    // Limit the pair where the curve would clip a wide band of levels.
    if (b > 0 && c > 0) {
      const float s = 0.116f * c + 0.141f * b;
      if (s > 0.14294118f) {
        const float factor = 0.14294118f / s;
        b *= factor;
        c *= factor;
      }
    }
    if (b < 0 && c > 0) {
      const float d = -0.117f * c + 0.145f * b;
      if (d < -0.14686275f) {
        const float factor = -0.14686275f / d;
        b *= factor;
        c *= factor;
      }
    }
    if (c < 0 && std::fabs(b * c) > 0.8f) {
      b *= 0.9f;
      c *= 0.9f;
    }
    for (unsigned i = 0; i < 256; ++i) {
      const float x = static_cast<float>(i) / 255.0f;
      const float y = x + _maxGenericOneHumpLUT[i] * b + _maxGenericOgeeLUT[i] * c;
      table[i] = levelFromUnit(y);
    }
  }
  applyTables(source, destination, width, height, sourceRowBytes, destinationRowBytes, table,
              table, table);
  return IPLToneAmounts{b, c};
}

void IPLApplyTintTo32BitAlphaFirstImage(const uint8_t* source, uint8_t* destination,
                                        size_t width, size_t height, size_t sourceRowBytes,
                                        size_t destinationRowBytes, int sourcePremultiplied,
                                        int premultiply, uint8_t amount) {
  const unsigned t = amount;
  const unsigned keep = 255 - t;
  const auto capped = [](unsigned value) { return static_cast<std::uint8_t>(std::min(value, 255u)); };
  const auto fastRow = [amount](kxa::ipl::TintMode mode) {
    return [amount, mode](const std::uint8_t* in, std::uint8_t* out, std::size_t count) {
      return kxa::ipl::fastTintPixels(in, out, count, mode, amount);
    };
  };
  if (!sourcePremultiplied && !premultiply) {
    if (t == 0) return;
    forEachPixel(source, destination, width, height, sourceRowBytes, destinationRowBytes,
                 fastRow(kxa::ipl::TintMode::straight), [&](const std::uint8_t* in, std::uint8_t* out) {
                   const std::uint8_t a = in[kAlpha];
                   for (std::size_t i = kRed; i <= kBlue; ++i) out[i] = capped(scale(keep, in[i]) + t);
                   out[kAlpha] = a;
                 });
  } else if (!sourcePremultiplied) {
    // Runs for t = 0 too: the colours are then only premultiplied.
    forEachPixel(source, destination, width, height, sourceRowBytes, destinationRowBytes,
                 fastRow(kxa::ipl::TintMode::premultiplying), [&](const std::uint8_t* in, std::uint8_t* out) {
                   const std::uint8_t a = in[kAlpha];
                   const unsigned lift = scale(a, t);
                   for (std::size_t i = kRed; i <= kBlue; ++i)
                     out[i] = capped(scale(keep, scale(a, in[i])) + lift);
                   out[kAlpha] = a;
                 });
  } else if (!premultiply) {
    if (t == 0) {
      IPLDemultiplyAlphaFrom32BitAlphaFirstImage(source, destination, width, height,
                                                 sourceRowBytes, destinationRowBytes);
      return;
    }
    forEachPixel(source, destination, width, height, sourceRowBytes, destinationRowBytes, kNoFastRow,
                 [&](const std::uint8_t* in, std::uint8_t* out) {
                   const std::uint8_t a = in[kAlpha];
                   for (std::size_t i = kRed; i <= kBlue; ++i) {
                     const unsigned c = in[i];
                     const unsigned lowered =
                         a > 0 ? static_cast<std::uint16_t>(static_cast<std::uint16_t>(c * keep) / a) : c;
                     out[i] = capped(lowered + t);
                   }
                   out[kAlpha] = a;
                 });
  } else {
    if (t == 0) return;
    forEachPixel(source, destination, width, height, sourceRowBytes, destinationRowBytes,
                 fastRow(kxa::ipl::TintMode::premultiplied), [&](const std::uint8_t* in, std::uint8_t* out) {
                   const std::uint8_t a = in[kAlpha];
                   const unsigned lift = scale(t, a);
                   for (std::size_t i = kRed; i <= kBlue; ++i) out[i] = capped(scale(keep, in[i]) + lift);
                   out[kAlpha] = a;
                 });
  }
}

void IPLClearAlphaChannelOf32BitAlphaFirstImage(const uint8_t* source, uint8_t* destination,
                                                size_t width, size_t height,
                                                size_t sourceRowBytes,
                                                size_t destinationRowBytes, uint8_t alpha,
                                                int demultiply, int premultiply) {
  const bool scaleByAlpha = premultiply && alpha < 255;
  const auto fastRow = [&](const std::uint8_t* in, std::uint8_t* out, std::size_t count) -> std::size_t {
    return demultiply ? 0 : kxa::ipl::fastClearAlpha(in, out, count, alpha, scaleByAlpha);
  };
  forEachPixel(source, destination, width, height, sourceRowBytes, destinationRowBytes, fastRow,
               [&](const std::uint8_t* in, std::uint8_t* out) {
                 const std::uint8_t a = in[kAlpha];
                 std::uint8_t colours[3] = {in[kRed], in[kGreen], in[kBlue]};
                 if (demultiply || scaleByAlpha) {
                   for (std::uint8_t& c : colours) {
                     if (demultiply) c = demultiplied(c, a);
                     if (scaleByAlpha) c = scale(alpha, c);
                   }
                   out[kRed] = colours[0];
                   out[kGreen] = colours[1];
                   out[kBlue] = colours[2];
                 }
                 out[kAlpha] = alpha;
               });
}

void IPLTeethWhitenerFrom32BitARGBImage(const uint8_t* source, uint8_t* destination,
                                        size_t sideLength, size_t sourceRowBytes,
                                        size_t destinationRowBytes) {
  const Disc disc = discOfSide(sideLength);
  constexpr float kSlightly = 0.975f, kStrongly = 0.9f, kLift = 0.0001f;
  for (std::size_t y = 0; y < sideLength; ++y) {
    const long dy = disc.offset(y);
    for (std::size_t x = 0; x < sideLength; ++x) {
      const long dx = disc.offset(x);
      if (dx * dx + dy * dy > disc.limit) continue;
      const std::uint8_t* in = source + y * sourceRowBytes + 4 * x;
      std::uint8_t* out = destination + y * destinationRowBytes + 4 * x;
      const double rgb[3] = {double(in[kRed]), double(in[kGreen]), double(in[kBlue])};
      double hsv[3];
      IPLHueSaturatuinValueFromRGB(hsv, rgb);
      if (hsv[1] > 0 && hsv[0] >= 15 && hsv[0] <= 105) {
        const bool yellowest = hsv[0] >= 45 && hsv[0] <= 75;
        hsv[1] = std::floor(hsv[1] * double(yellowest ? kStrongly : kSlightly));
        // max, not min: such pixels end up white; kept as designed.
        hsv[2] = std::max(hsv[2] + double(kLift), 1.0);
      }
      double whitened[3];
      IPLRGBFromHueSaturatuinValue(whitened, hsv);
      const std::uint8_t a = in[kAlpha];
      for (std::size_t i = 0; i < 3; ++i) {
        const double blended = std::trunc(whitened[i]) * 0.1 + out[kRed + i] * 0.9;
        out[kRed + i] = static_cast<std::uint8_t>(blended);
      }
      out[kAlpha] = a;
    }
  }
}

void IPLRemoveEncircledChromaFrom32BitARGBImage(const uint8_t* source, uint8_t* destination,
                                                size_t sideLength, size_t sourceRowBytes,
                                                size_t destinationRowBytes, int mode) {
  const Disc disc = discOfSide(sideLength);
  const int* profile = _squaredProximityDropoffProfile;
  for (std::size_t y = 0; y < sideLength; ++y) {
    const long dy = disc.offset(y);
    for (std::size_t x = 0; x < sideLength; ++x) {
      const long dx = disc.offset(x);
      const long distance = dx * dx + dy * dy;
      if (distance > disc.limit) continue;
      // A side of 1 has a zero limit: its one pixel is the centre.
      const long p = disc.limit > 0 ? distance * 100 / disc.limit : 0;
      int v = profile[p / 10];
      if (p % 10 != 0) v += static_cast<int>((p % 10) * (profile[p / 10 + 1] - profile[p / 10]) / 10);
      float weight = static_cast<float>(v) * 0.01f * 0.9f;
      const std::uint8_t* in = source + y * sourceRowBytes + 4 * x;
      std::uint8_t* out = destination + y * destinationRowBytes + 4 * x;
      const int a = in[kAlpha], r = in[kRed], g = in[kGreen], b = in[kBlue];
      if (mode == 1) {
        const int lowest = std::min(g, b);
        const int total = (r - lowest) + (g - lowest) + (b - lowest);
        if (r >= lowest && total != 0) {
          weight *= static_cast<float>(r - lowest) / static_cast<float>(total);
        } else {
          weight = 0;
        }
      }
      const int average = (r + g + b) / 3;
      const int colours[3] = {r, g, b};
      for (std::size_t i = 0; i < 3; ++i) {
        const int c = colours[i];
        out[kRed + i] = static_cast<std::uint8_t>(c + static_cast<int>(static_cast<float>(average - c) * weight));
      }
      out[kAlpha] = static_cast<std::uint8_t>(a);
    }
  }
}

void IPLHueSaturatuinValueFromRGB(double* hsv, const double* rgb) {
  if (hsv == nullptr || rgb == nullptr) return;
  const double r = rgb[0], g = rgb[1], b = rgb[2];
  double maximum = r, minimum = std::min(g, b), huePrime = 0;
  double hue = 0, saturation = 0;
  // Ties go to red, then green: blue wins only when strictly greatest.
  int channel = 0;
  if (b > r && b > g) {
    channel = 2;
    maximum = b;
    minimum = std::min(r, g);
  } else if (g > r) {
    channel = 1;
    maximum = g;
    minimum = std::min(r, b);
  }
  if (maximum != 0) {
    const double delta = maximum - minimum;
    saturation = delta / maximum;
    if (channel == 0) huePrime = delta == 0 ? 0 : (g - b) / delta;
    else if (channel == 1) huePrime = (b - r) / delta + 2;
    else huePrime = (r - g) / delta + 4;
    hue = std::fmod(std::fmod(huePrime * 60, 360) + 360, 360);
  }
  hsv[0] = hue;
  hsv[1] = saturation;
  hsv[2] = maximum / 255;
}

void IPLRGBFromHueSaturatuinValue(double* rgb, const double* hsv) {
  if (rgb == nullptr || hsv == nullptr) return;
  const double h = std::fmod(std::fmod(hsv[0], 360) + 360, 360);
  const double s = hsv[1], v = hsv[2];
  double r = 0, g = 0, b = 0;
  if (v <= 0) {
    r = g = b = 0;
  } else if (s <= 0) {
    r = g = b = v;
  } else {
    const double sector = std::floor(h / 60);
    const double f = h / 60 - sector;
    const double p = (1 - s) * v, q = (1 - s * f) * v, t = (1 - (1 - f) * s) * v;
    if (sector == 0 || sector == 6) r = v, g = t, b = p;
    else if (sector == 1) r = q, g = v, b = p;
    else if (sector == 2) r = p, g = v, b = t;
    else if (sector == 3) r = p, g = q, b = v;
    else if (sector == 4) r = t, g = p, b = v;
    else if (sector == 5 || sector == -1) r = v, g = p, b = q;
    else r = g = b = v;  // NaN or infinite hue
  }
  rgb[0] = std::round(r * 255);
  rgb[1] = std::round(g * 255);
  rgb[2] = std::round(b * 255);
}

}  // extern "C"
