// Fast forms of the blur family. Erosion and dilation stream through the
// image once, with log2(2r + 1) + 1 vector operations per sample and
// direction (windows by doubling, up to radius 128; van Herk strips past
// it). The box blur keeps running sums, O(1) per sample; the repeated 3-tap
// blur runs its radius passes, four at a time in registers. Blurs (and
// morphology past radius 128) work on strips of 64 lanes laid side by side
// (64 lines of one channel, or 16 lines of 4-byte pixels), so the inner
// loops run over independent lanes as SIMD vectors. Compiled for several
// instruction sets and chosen at run time (Highway). Byte-identical to the
// plain forms in IPLReference.h on every instruction set (the tests compare
// them). Internal.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace kxa::ipl {

struct Plane {
  const std::uint8_t* source;
  std::uint8_t* destination;
  std::size_t width, height;
  std::size_t sourceStep, destinationStep;
  std::size_t sourceRowBytes, destinationRowBytes;
  // Adjacent bytes filtered together as separate channels: 1, or 4 for
  // whole 32-bit pixels (then both steps are 4).
  std::size_t channels;
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
// The repeated 3-tap blur: still radius passes, but over 64 lanes at once
// and four passes per sweep of memory.
void fastGaussianBlur(const Plane& plane, std::size_t radius);
void fastErode(const Plane& plane, std::size_t radius);
void fastDilate(const Plane& plane, std::size_t radius);

// The instruction sets compiled in that this CPU runs, by name, best first;
// forceInstructionSet(i) makes the filters use the i-th of them until
// forceInstructionSet(-1) (or listing them again) restores the automatic
// choice. For tests and benchmarks only: it changes the choice for the whole
// process, so no filter may run on another thread meanwhile.
std::vector<std::string> availableInstructionSets();
void forceInstructionSet(int index);

}  // namespace kxa::ipl
