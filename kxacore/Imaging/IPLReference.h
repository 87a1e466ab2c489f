// Plain scalar forms of the blur family, line by line with a line buffer and
// a division table: the definition every fast path is tested against.
// Internal to the library and its tests.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace kxa::ipl {

// Division table for a window of 2k + 1 samples: entry s = round(s / (2k + 1)).
std::vector<std::uint8_t> makeDivisionTable(std::size_t halfWindow);

enum class Filter { box, gaussian, erode, dilate };

// Runs one filter of the family through its plain working form (_IPLBoxBlur ...),
// allocating the buffers as the public functions do.
void referenceFilter(Filter filter, const std::uint8_t* source, std::uint8_t* destination,
                     std::size_t width, std::size_t height, std::size_t sourceStep,
                     std::size_t destinationStep, std::size_t sourceRowBytes,
                     std::size_t destinationRowBytes, std::size_t radius);

}  // namespace kxa::ipl
