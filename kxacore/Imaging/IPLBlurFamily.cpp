// Public entry points of the blur family, on the fast forms.

#include "kxacore/Imaging/IPLFastFilters.h"
#include "kxacore/Imaging/IPLPixelOperations.h"
#include "kxacore/Imaging/IPLReference.h"

#include <algorithm>
#include <cstdint>
#include <vector>

namespace {

using kxa::ipl::Plane;

// Past the longest line every further radius gives the same erosion (all
// windows reach the zero padding) and dilation (all windows cover the line).
std::size_t effectiveMorphologyRadius(const Plane& plane, std::size_t radius) {
  return std::min(radius, std::max(plane.width, plane.height));
}

bool blurRadiusAccepted(std::size_t radius) { return radius <= IPLMaximumBlurRadius; }

void gaussian(const Plane& plane, std::size_t radius) { kxa::ipl::fastGaussianBlur(plane, radius); }

void box(const Plane& plane, std::size_t radius) {
  const auto table = kxa::ipl::makeDivisionTable(radius);
  kxa::ipl::fastBoxBlur(plane, radius, table.data());
}

}  // namespace

extern "C" {

void IPLBoxBlur(const uint8_t* source, uint8_t* destination, size_t width, size_t height,
                size_t sourceStep, size_t destinationStep, size_t sourceRowBytes,
                size_t destinationRowBytes, size_t radius) {
  if (width == 0 || height == 0 || !blurRadiusAccepted(radius)) return;
  box(Plane{source, destination, width, height, sourceStep, destinationStep, sourceRowBytes,
            destinationRowBytes, 1},
      radius);
}

void IPLGaussianBlur(const uint8_t* source, uint8_t* destination, size_t width, size_t height,
                     size_t sourceStep, size_t destinationStep, size_t sourceRowBytes,
                     size_t destinationRowBytes, size_t radius) {
  if (width == 0 || height == 0 || !blurRadiusAccepted(radius)) return;
  gaussian(Plane{source, destination, width, height, sourceStep, destinationStep, sourceRowBytes,
                 destinationRowBytes, 1},
           radius);
}

void IPLErode(const uint8_t* source, uint8_t* destination, size_t width, size_t height,
              size_t sourceStep, size_t destinationStep, size_t sourceRowBytes,
              size_t destinationRowBytes, size_t radius) {
  if (width == 0 || height == 0) return;
  const Plane plane{source, destination, width, height, sourceStep, destinationStep,
                    sourceRowBytes, destinationRowBytes, 1};
  kxa::ipl::fastErode(plane, effectiveMorphologyRadius(plane, radius));
}

void IPLDilate(const uint8_t* source, uint8_t* destination, size_t width, size_t height,
               size_t sourceStep, size_t destinationStep, size_t sourceRowBytes,
               size_t destinationRowBytes, size_t radius) {
  if (width == 0 || height == 0) return;
  const Plane plane{source, destination, width, height, sourceStep, destinationStep,
                    sourceRowBytes, destinationRowBytes, 1};
  kxa::ipl::fastDilate(plane, effectiveMorphologyRadius(plane, radius));
}

void IPLBlur(const uint8_t* source, uint8_t* destination, size_t width, size_t height,
             size_t sourceStep, size_t destinationStep, size_t sourceRowBytes,
             size_t destinationRowBytes, size_t radius, int morphology, int blur) {
  if (width == 0 || height == 0) return;
  const bool blurs = blur == IPLBlurBox || blur == IPLBlurGaussian;
  if (blurs && !blurRadiusAccepted(radius)) return;
  Plane plane{source, destination, width, height, sourceStep, destinationStep, sourceRowBytes,
              destinationRowBytes, 1};
  if (morphology == IPLMorphologyErode || morphology == IPLMorphologyDilate) {
    const std::size_t morphologyRadius = effectiveMorphologyRadius(plane, radius);
    if (morphology == IPLMorphologyErode) kxa::ipl::fastErode(plane, morphologyRadius);
    else kxa::ipl::fastDilate(plane, morphologyRadius);
    // The blur continues from the morphology's result.
    plane.source = destination;
    plane.sourceStep = destinationStep;
    plane.sourceRowBytes = destinationRowBytes;
  }
  if (blur == IPLBlurBox) box(plane, radius);
  else if (blur == IPLBlurGaussian) gaussian(plane, radius);
}

// Whole 32-bit pixels: the four bytes are four channels filtered together.

void IPLBoxBlur32BitAlphaFirstImage(const uint8_t* source, uint8_t* destination, size_t width,
                                    size_t height, size_t sourceRowBytes,
                                    size_t destinationRowBytes, size_t radius) {
  if (width == 0 || height == 0 || !blurRadiusAccepted(radius)) return;
  box(Plane{source, destination, width, height, 4, 4, sourceRowBytes, destinationRowBytes, 4},
      radius);
}

void IPLGaussianBlur32BitAlphaFirstImage(const uint8_t* source, uint8_t* destination,
                                         size_t width, size_t height, size_t sourceRowBytes,
                                         size_t destinationRowBytes, size_t radius) {
  if (width == 0 || height == 0 || !blurRadiusAccepted(radius)) return;
  gaussian(Plane{source, destination, width, height, 4, 4, sourceRowBytes, destinationRowBytes, 4},
           radius);
}

void IPLErode32BitAlphaFirstImage(const uint8_t* source, uint8_t* destination, size_t width,
                                  size_t height, size_t sourceRowBytes,
                                  size_t destinationRowBytes, size_t radius) {
  if (width == 0 || height == 0) return;
  const Plane plane{source, destination, width, height, 4, 4, sourceRowBytes, destinationRowBytes, 4};
  kxa::ipl::fastErode(plane, effectiveMorphologyRadius(plane, radius));
}

void IPLDilate32BitAlphaFirstImage(const uint8_t* source, uint8_t* destination, size_t width,
                                   size_t height, size_t sourceRowBytes,
                                   size_t destinationRowBytes, size_t radius) {
  if (width == 0 || height == 0) return;
  const Plane plane{source, destination, width, height, 4, 4, sourceRowBytes, destinationRowBytes, 4};
  kxa::ipl::fastDilate(plane, effectiveMorphologyRadius(plane, radius));
}

}  // extern "C"
