// Row kernels of the per-pixel operations: pixels are split into alpha,
// red, green and blue planes of one vector each (LoadInterleaved4), worked
// on as whole vectors, and interleaved back. floor(m * c / 255), the
// alpha table's value, is computed as ((m * c + 1) * 257) >> 16 on the even
// and odd bytes in 16-bit lanes: exact for every pair of 8-bit values, and a
// table look-up per byte would not vectorise. Compiled per instruction set
// (Highway's foreach_target); the scalar baseline leaves everything to the
// plain per-pixel forms.

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "kxacore/Imaging/IPLFastPixels.cpp"
#include <hwy/foreach_target.h>  // re-includes this file per target
#include <hwy/highway.h>

#include "kxacore/Imaging/IPLFastPixels.h"

HWY_BEFORE_NAMESPACE();
namespace kxa::ipl {
namespace HWY_NAMESPACE {
namespace {

namespace hn = hwy::HWY_NAMESPACE;

#if HWY_TARGET != HWY_SCALAR && HWY_TARGET != HWY_EMU128
#define KXA_PIXEL_KERNELS 1
using D8 = hn::ScalableTag<std::uint8_t>;
using V8 = hn::Vec<D8>;

// floor(m * c / 255) in every byte lane.
HWY_INLINE V8 scaled(V8 m, V8 c) {
  const D8 d8;
  const hn::Repartition<std::uint16_t, D8> d16;
  const auto lowByte = hn::Set(d16, 0x00FF);
  const auto one = hn::Set(d16, 1);
  const auto factor = hn::Set(d16, 257);
  const auto m16 = hn::BitCast(d16, m), c16 = hn::BitCast(d16, c);
  const auto even = hn::MulHigh(hn::Add(hn::Mul(hn::And(m16, lowByte), hn::And(c16, lowByte)), one), factor);
  const auto odd = hn::MulHigh(hn::Add(hn::Mul(hn::ShiftRight<8>(m16), hn::ShiftRight<8>(c16)), one), factor);
  return hn::BitCast(d8, hn::Or(even, hn::ShiftLeft<8>(odd)));
}

struct Pixels {
  V8 alpha, red, green, blue;
};

HWY_INLINE Pixels load(const std::uint8_t* bytes) {
  const D8 d;
  Pixels p;
  hn::LoadInterleaved4(d, bytes, p.alpha, p.red, p.green, p.blue);
  return p;
}

HWY_INLINE void store(const Pixels& p, std::uint8_t* bytes) {
  hn::StoreInterleaved4(p.alpha, p.red, p.green, p.blue, D8(), bytes);
}
#endif

}  // namespace

std::size_t MaskPixels(const std::uint8_t* image, const std::uint8_t* mask, std::uint8_t* out, std::size_t count,
                       int mode, bool invert) {
#ifdef KXA_PIXEL_KERNELS
  const D8 d;
  const std::size_t n = hn::Lanes(d);
  const auto full = hn::Set(d, 255);
  const auto maskMode = static_cast<MaskMode>(mode);
  std::size_t x = 0;
  for (; x + n <= count; x += n) {
    const Pixels in = load(image + 4 * x);
    const V8 plain = hn::LoadU(d, mask + x);
    const V8 m = invert ? hn::Sub(full, plain) : plain;
    Pixels result = in;
    switch (maskMode) {
      case MaskMode::scaleAll:
        result = Pixels{scaled(m, in.alpha), scaled(m, in.red), scaled(m, in.green), scaled(m, in.blue)};
        break;
      case MaskMode::scaleAlpha:
        result = load(out + 4 * x);
        result.alpha = scaled(m, in.alpha);
        break;
      case MaskMode::plainAlphaColours:
        result = Pixels{plain, scaled(m, in.red), scaled(m, in.green), scaled(m, in.blue)};
        break;
      case MaskMode::maskAsAlpha:
        result = load(out + 4 * x);
        result.alpha = m;
        break;
    }
    store(result, out + 4 * x);
  }
  return x;
#else
  (void)image, (void)mask, (void)out, (void)count, (void)mode, (void)invert;
  return 0;
#endif
}

std::size_t TintPixels(const std::uint8_t* source, std::uint8_t* out, std::size_t count, int mode,
                       std::uint8_t amount) {
#ifdef KXA_PIXEL_KERNELS
  const D8 d;
  const std::size_t n = hn::Lanes(d);
  const auto tint = hn::Set(d, amount);
  const auto keep = hn::Set(d, static_cast<std::uint8_t>(255 - amount));
  const auto tintMode = static_cast<TintMode>(mode);
  std::size_t x = 0;
  for (; x + n <= count; x += n) {
    const Pixels in = load(source + 4 * x);
    Pixels result = in;
    const auto colour = [&](V8 c) {
      switch (tintMode) {
        case TintMode::straight: return hn::SaturatedAdd(scaled(keep, c), tint);
        case TintMode::premultiplying:
          return hn::SaturatedAdd(scaled(keep, scaled(in.alpha, c)), scaled(in.alpha, tint));
        case TintMode::premultiplied: break;
      }
      return hn::SaturatedAdd(scaled(keep, c), scaled(tint, in.alpha));
    };
    result.red = colour(in.red);
    result.green = colour(in.green);
    result.blue = colour(in.blue);
    store(result, out + 4 * x);
  }
  return x;
#else
  (void)source, (void)out, (void)count, (void)mode, (void)amount;
  return 0;
#endif
}

std::size_t ClearAlpha(const std::uint8_t* source, std::uint8_t* out, std::size_t count, std::uint8_t alpha,
                       bool scaleColours) {
#ifdef KXA_PIXEL_KERNELS
  const D8 d;
  const std::size_t n = hn::Lanes(d);
  const auto level = hn::Set(d, alpha);
  std::size_t x = 0;
  for (; x + n <= count; x += n) {
    Pixels result;
    if (scaleColours) {
      const Pixels in = load(source + 4 * x);
      result = Pixels{level, scaled(level, in.red), scaled(level, in.green), scaled(level, in.blue)};
    } else {
      result = load(out + 4 * x);
      result.alpha = level;
    }
    store(result, out + 4 * x);
  }
  return x;
#else
  (void)source, (void)out, (void)count, (void)alpha, (void)scaleColours;
  return 0;
#endif
}

std::size_t CombineMasks(const std::uint8_t* a, const std::uint8_t* b, std::uint8_t* out, std::size_t count,
                         bool invertA, bool invertB, bool invertResult) {
#ifdef KXA_PIXEL_KERNELS
  const D8 d;
  const std::size_t n = hn::Lanes(d);
  const auto full = hn::Set(d, 255);
  std::size_t x = 0;
  for (; x + n <= count; x += n) {
    V8 first = hn::LoadU(d, a + x), second = hn::LoadU(d, b + x);
    if (invertA) first = hn::Sub(full, first);
    if (invertB) second = hn::Sub(full, second);
    V8 combined = scaled(first, second);
    if (invertResult) combined = hn::Sub(full, combined);
    hn::StoreU(combined, d, out + x);
  }
  return x;
#else
  (void)a, (void)b, (void)out, (void)count, (void)invertA, (void)invertB, (void)invertResult;
  return 0;
#endif
}

#undef KXA_PIXEL_KERNELS

}  // namespace HWY_NAMESPACE
}  // namespace kxa::ipl
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace kxa::ipl {

HWY_EXPORT(MaskPixels);
HWY_EXPORT(TintPixels);
HWY_EXPORT(ClearAlpha);
HWY_EXPORT(CombineMasks);

std::size_t fastMaskPixels(const std::uint8_t* image, const std::uint8_t* mask, std::uint8_t* out,
                           std::size_t count, MaskMode mode, bool invert) {
  return HWY_DYNAMIC_DISPATCH(MaskPixels)(image, mask, out, count, static_cast<int>(mode), invert);
}

std::size_t fastTintPixels(const std::uint8_t* in, std::uint8_t* out, std::size_t count, TintMode mode,
                           std::uint8_t amount) {
  return HWY_DYNAMIC_DISPATCH(TintPixels)(in, out, count, static_cast<int>(mode), amount);
}

std::size_t fastClearAlpha(const std::uint8_t* in, std::uint8_t* out, std::size_t count, std::uint8_t alpha,
                           bool scaleColours) {
  return HWY_DYNAMIC_DISPATCH(ClearAlpha)(in, out, count, alpha, scaleColours);
}

std::size_t fastCombineMasks(const std::uint8_t* a, const std::uint8_t* b, std::uint8_t* out, std::size_t count,
                             bool invertA, bool invertB, bool invertResult) {
  return HWY_DYNAMIC_DISPATCH(CombineMasks)(a, b, out, count, invertA, invertB, invertResult);
}

}  // namespace kxa::ipl
#endif  // HWY_ONCE
