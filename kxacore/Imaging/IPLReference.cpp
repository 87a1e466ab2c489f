// The blur family as plain line-by-line passes. Kept deliberately simple:
// the fast paths in IPLFastFilters.cpp must match these byte for byte.

#include "kxacore/Imaging/IPLReference.h"

#include "kxacore/Imaging/IPLPixelOperations.h"

#include <algorithm>
#include <cstdint>

namespace {

// A line is read into the buffer whole before anything is written, so input
// and output may be the same samples.
struct Line {
  const std::uint8_t* in;
  std::size_t inStep;
  std::uint8_t* out;
  std::size_t outStep;
  std::size_t count;
};
using LineFilter = void (*)(std::uint8_t* buffer, const Line& line, std::size_t radius,
                            const std::uint8_t* table);

// Copies a line into buffer[r ...] and mirrors both borders with the edge
// sample repeated. Left and right are filled in one loop so that radii
// larger than the line keep mirroring the already mirrored samples.
void fillMirrored(std::uint8_t* buffer, const std::uint8_t* line, std::size_t count,
                  std::size_t step, std::size_t radius) {
  for (std::size_t i = 0; i < count; ++i) buffer[radius + i] = line[i * step];
  for (std::size_t j = 0; j < radius; ++j) {
    buffer[radius - 1 - j] = buffer[radius + j];
    buffer[radius + count + j] = buffer[radius + count - 1 - j];
  }
}

void fillZeroPadded(std::uint8_t* buffer, const std::uint8_t* line, std::size_t count,
                    std::size_t step, std::size_t radius) {
  std::fill(buffer, buffer + radius, std::uint8_t{0});
  for (std::size_t i = 0; i < count; ++i) buffer[radius + i] = line[i * step];
  std::fill(buffer + radius + count, buffer + radius + count + radius, std::uint8_t{0});
}

void boxLine(std::uint8_t* buffer, const Line& line, std::size_t radius,
             const std::uint8_t* table) {
  const std::size_t count = line.count;
  fillMirrored(buffer, line.in, count, line.inStep, radius);
  std::size_t sum = 0;
  for (std::size_t i = 0; i <= 2 * radius; ++i) sum += buffer[i];
  for (std::size_t x = 0; x < count; ++x) {
    line.out[x * line.outStep] = table[sum];
    if (x + 1 < count) sum = sum + buffer[x + 2 * radius + 1] - buffer[x];
  }
}

void gaussianLine(std::uint8_t* buffer, const Line& line, std::size_t radius,
                  const std::uint8_t* table) {
  const std::size_t count = line.count;
  fillMirrored(buffer, line.in, count, line.inStep, radius);
  const std::size_t length = count + 2 * radius;
  for (std::size_t pass = 0; pass < radius; ++pass) {
    std::uint8_t previous = buffer[0];
    for (std::size_t i = 1; i + 1 < length; ++i) {
      const std::uint8_t current = buffer[i];
      buffer[i] = table[previous + current + buffer[i + 1]];
      previous = current;
    }
  }
  for (std::size_t x = 0; x < count; ++x) line.out[x * line.outStep] = buffer[radius + x];
}

// Running extreme that rescans the window only when the extreme leaves it.
template <bool isMinimum>
void morphologyLine(std::uint8_t* buffer, const Line& line, std::size_t radius,
                    const std::uint8_t*) {
  const std::size_t count = line.count;
  fillZeroPadded(buffer, line.in, count, line.inStep, radius);
  const auto better = [](std::uint8_t a, std::uint8_t b) { return isMinimum ? a < b : a > b; };
  const auto extremeOf = [&](std::size_t first, std::size_t last) {
    std::uint8_t value = isMinimum ? 255 : 0;
    for (std::size_t i = first; i <= last; ++i)
      if (better(buffer[i], value)) value = buffer[i];
    return value;
  };
  std::uint8_t current = extremeOf(0, 2 * radius);
  for (std::size_t x = 0; x < count; ++x) {
    line.out[x * line.outStep] = current;
    if (x + 1 == count) break;
    const std::uint8_t leaving = buffer[x];
    if (leaving == current || better(leaving, current)) {
      current = extremeOf(x + 1, x + 2 * radius + 1);
    } else if (better(buffer[x + 2 * radius + 1], current)) {
      current = buffer[x + 2 * radius + 1];
    }
  }
}

// Rows from source to destination, then columns of the destination in place.
void separable(LineFilter filter, const std::uint8_t* source, std::uint8_t* destination,
               std::size_t width, std::size_t height, std::size_t sourceStep,
               std::size_t destinationStep, std::size_t sourceRowBytes,
               std::size_t destinationRowBytes, std::size_t radius, std::uint8_t* buffer,
               const std::uint8_t* table) {
  if (width == 0 || height == 0) return;
  for (std::size_t y = 0; y < height; ++y) {
    const Line row{source + y * sourceRowBytes, sourceStep, destination + y * destinationRowBytes,
                   destinationStep, width};
    filter(buffer, row, radius, table);
  }
  for (std::size_t x = 0; x < width; ++x) {
    std::uint8_t* column = destination + x * destinationStep;
    filter(buffer, Line{column, destinationRowBytes, column, destinationRowBytes, height}, radius,
           table);
  }
}

}  // namespace

extern "C" void _IPLBoxBlur(const uint8_t* source, uint8_t* destination, size_t width,
                            size_t height, size_t sourceStep, size_t destinationStep,
                            size_t sourceRowBytes, size_t destinationRowBytes, size_t radius,
                            uint8_t* lineBuffer, const uint8_t* divisionTable) {
  separable(boxLine, source, destination, width, height, sourceStep, destinationStep,
            sourceRowBytes, destinationRowBytes, radius, lineBuffer, divisionTable);
}

extern "C" void _IPLGaussianBlur(const uint8_t* source, uint8_t* destination, size_t width,
                                 size_t height, size_t sourceStep, size_t destinationStep,
                                 size_t sourceRowBytes, size_t destinationRowBytes,
                                 size_t radius, uint8_t* lineBuffer,
                                 const uint8_t* divisionTable) {
  separable(gaussianLine, source, destination, width, height, sourceStep, destinationStep,
            sourceRowBytes, destinationRowBytes, radius, lineBuffer, divisionTable);
}

extern "C" void _IPLErode(const uint8_t* source, uint8_t* destination, size_t width,
                          size_t height, size_t sourceStep, size_t destinationStep,
                          size_t sourceRowBytes, size_t destinationRowBytes, size_t radius,
                          uint8_t* lineBuffer) {
  separable(morphologyLine<true>, source, destination, width, height, sourceStep,
            destinationStep, sourceRowBytes, destinationRowBytes, radius, lineBuffer, nullptr);
}

extern "C" void _IPLDilate(const uint8_t* source, uint8_t* destination, size_t width,
                           size_t height, size_t sourceStep, size_t destinationStep,
                           size_t sourceRowBytes, size_t destinationRowBytes, size_t radius,
                           uint8_t* lineBuffer) {
  separable(morphologyLine<false>, source, destination, width, height, sourceStep,
            destinationStep, sourceRowBytes, destinationRowBytes, radius, lineBuffer, nullptr);
}

namespace kxa::ipl {

std::vector<std::uint8_t> makeDivisionTable(std::size_t halfWindow) {
  const std::size_t window = 2 * halfWindow + 1;
  std::vector<std::uint8_t> table(window * 255 + 1);
  for (std::size_t s = 0; s < table.size(); ++s)
    table[s] = static_cast<std::uint8_t>((s + halfWindow) / window);
  return table;
}

void referenceFilter(Filter filter, const std::uint8_t* source, std::uint8_t* destination,
                     std::size_t width, std::size_t height, std::size_t sourceStep,
                     std::size_t destinationStep, std::size_t sourceRowBytes,
                     std::size_t destinationRowBytes, std::size_t radius) {
  if (width == 0 || height == 0) return;
  // One spare byte past the padded line, as the public functions allocate.
  std::vector<std::uint8_t> buffer(std::max(width, height) + 2 * radius + 1);
  switch (filter) {
    case Filter::box: {
      const auto table = makeDivisionTable(radius);
      _IPLBoxBlur(source, destination, width, height, sourceStep, destinationStep,
                  sourceRowBytes, destinationRowBytes, radius, buffer.data(), table.data());
      break;
    }
    case Filter::gaussian: {
      const auto table = makeDivisionTable(1);
      _IPLGaussianBlur(source, destination, width, height, sourceStep, destinationStep,
                       sourceRowBytes, destinationRowBytes, radius, buffer.data(), table.data());
      break;
    }
    case Filter::erode:
      _IPLErode(source, destination, width, height, sourceStep, destinationStep, sourceRowBytes,
                destinationRowBytes, radius, buffer.data());
      break;
    case Filter::dilate:
      _IPLDilate(source, destination, width, height, sourceStep, destinationStep, sourceRowBytes,
                 destinationRowBytes, radius, buffer.data());
      break;
  }
}

}  // namespace kxa::ipl
