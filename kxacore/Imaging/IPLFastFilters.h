// Fast forms of the blur family: O(1) work per sample whatever the radius
// (except the repeated 3-tap blur, radius passes by definition). Rows and
// columns are processed as strips of 64 neighbouring lines laid side by side,
// so the inner loops run over 64 independent lanes and vectorise. Byte-identical to the plain
// forms in IPLReference.h (the tests compare them). Internal.
#pragma once

#include <cstddef>
#include <cstdint>

namespace kxa::ipl {

struct Plane {
  const std::uint8_t* source;
  std::uint8_t* destination;
  std::size_t width, height;
  std::size_t sourceStep, destinationStep;
  std::size_t sourceRowBytes, destinationRowBytes;
};

// round(sum / (2r + 1)) as a multiply and shift, for windows whose sums
// vectorise: exact for every window sum of 8-bit samples when r <= 90, since
// then sum * e < 2^23 for the rounding error e of the multiplier.
struct RoundedDivider {
  static constexpr std::size_t kMaximumRadius = 90;
  static constexpr unsigned kShift = 23;
  std::uint32_t radius, multiplier;
  explicit RoundedDivider(std::size_t r)
      : radius(static_cast<std::uint32_t>(r)),
        multiplier(static_cast<std::uint32_t>(((std::uint32_t{1} << kShift) + 2 * r) / (2 * r + 1))) {}
  std::uint8_t operator()(std::uint32_t sum) const {
    return static_cast<std::uint8_t>(((sum + radius) * multiplier) >> kShift);
  }
};

void fastBoxBlur(const Plane& plane, std::size_t radius, const std::uint8_t* divisionTable);
// The repeated 3-tap blur: still radius passes, but over 64 lanes at once.
void fastGaussianBlur(const Plane& plane, std::size_t radius);
void fastErode(const Plane& plane, std::size_t radius);
void fastDilate(const Plane& plane, std::size_t radius);

}  // namespace kxa::ipl
