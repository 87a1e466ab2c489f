// Fast forms of the box blur, erosion and dilation: O(1) work per sample
// whatever the radius, columns processed as strips of neighbouring columns so
// that every memory access runs along rows. Byte-identical to the plain
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

void fastBoxBlur(const Plane& plane, std::size_t radius, const std::uint8_t* divisionTable);
void fastErode(const Plane& plane, std::size_t radius);
void fastDilate(const Plane& plane, std::size_t radius);

}  // namespace kxa::ipl
