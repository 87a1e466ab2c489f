// The SIMD rows of the per-pixel operations against the plain per-pixel
// forms: the same public call under the scalar baseline (where the kernels
// do nothing) and under every other instruction set this CPU runs.

#include "kxacore/Imaging/IPLFastFilters.h"
#include "kxacore/Imaging/IPLPixelOperations.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <functional>
#include <initializer_list>
#include <random>
#include <string>
#include <vector>

namespace {

std::size_t baselineInstructionSet(const std::vector<std::string>& names) {
  for (std::size_t i = 0; i < names.size(); ++i)
    if (names[i] == "SCALAR" || names[i] == "EMU128") return i;
  return names.size() - 1;
}

// Runs operation(bytes) once on the baseline and once per other instruction
// set, each on a copy of the same bytes, and expects the same result.
void expectSameOnEveryInstructionSet(const std::vector<std::uint8_t>& start,
                                     const std::function<void(std::vector<std::uint8_t>&)>& operation,
                                     const std::string& what) {
  const auto names = kxa::ipl::availableInstructionSets();
  const std::size_t baseline = baselineInstructionSet(names);
  auto expected = start;
  kxa::ipl::forceInstructionSet(static_cast<int>(baseline));
  operation(expected);
  for (std::size_t i = 0; i < names.size(); ++i) {
    if (i == baseline) continue;
    auto actual = start;
    kxa::ipl::forceInstructionSet(static_cast<int>(i));
    operation(actual);
    kxa::ipl::forceInstructionSet(-1);
    ASSERT_EQ(expected, actual) << what << " on " << names[i];
  }
  kxa::ipl::forceInstructionSet(-1);
}

// One buffer holding a source image, a destination image and a mask, so
// that in place and separate calls are both one operation on one vector.
struct Layout {
  std::size_t width, height, imageRowBytes, destinationRowBytes, maskStep, maskRowBytes;
  bool inPlace;
  std::size_t imageBytes() const { return height * imageRowBytes; }
  std::size_t destinationOffset() const { return inPlace ? 0 : imageBytes(); }
  std::size_t maskOffset() const { return destinationOffset() + height * destinationRowBytes; }
  std::size_t total() const { return maskOffset() + height * maskRowBytes; }
};

Layout randomLayout(std::mt19937& random, int round) {
  std::uniform_int_distribution<std::size_t> side(1, 150), padding(0, 7);
  Layout layout{};
  layout.width = round < 3 ? 64 * static_cast<std::size_t>(round + 1) + 3 : side(random);
  layout.height = 1 + static_cast<std::size_t>(round) % 4;
  layout.imageRowBytes = layout.width * 4 + padding(random);
  layout.inPlace = round % 3 == 1;
  layout.destinationRowBytes = layout.inPlace ? layout.imageRowBytes : layout.width * 4 + padding(random);
  layout.maskStep = round % 5 == 4 ? 2 : 1;  // strided masks stay on the plain path
  layout.maskRowBytes = layout.width * layout.maskStep + padding(random);
  return layout;
}

std::vector<std::uint8_t> randomBytes(std::mt19937& random, std::size_t count) {
  std::uniform_int_distribution<int> byte(0, 255);
  std::vector<std::uint8_t> bytes(count);
  for (auto& b : bytes) b = static_cast<std::uint8_t>(byte(random) < 40 ? (byte(random) < 128 ? 0 : 255) : byte(random));
  return bytes;
}

// Random layouts, each under every flag combination and every level.
using PixelCall = std::function<void(const Layout&, int flags, int level, std::vector<std::uint8_t>&)>;

void expectSameForLayoutsFlagsAndLevels(unsigned seed, int flagCombinations, std::initializer_list<int> levels,
                                        const PixelCall& call) {
  std::mt19937 random(seed);
  for (int round = 0; round < 16; ++round) {
    const Layout l = randomLayout(random, round);
    const auto start = randomBytes(random, l.total());
    for (int flags = 0; flags < flagCombinations; ++flags) {
      for (const int level : levels) {
        expectSameOnEveryInstructionSet(
            start, [&](std::vector<std::uint8_t>& bytes) { call(l, flags, level, bytes); },
            "flags " + std::to_string(flags) + " level " + std::to_string(level) + " width " +
                std::to_string(l.width) + (l.inPlace ? " in place" : ""));
        if (::testing::Test::HasFatalFailure()) return;
      }
    }
  }
}

TEST(FastPixels, MaskEveryFlagCombination) {
  expectSameForLayoutsFlagsAndLevels(11, 8, {0}, [](const Layout& l, int flags, int, std::vector<std::uint8_t>& b) {
    IPLApply8BitMaskTo32BitAlphaFirstImage(b.data(), b.data() + l.maskOffset(), b.data() + l.destinationOffset(),
                                           l.width, l.height, l.imageRowBytes, l.maskStep, l.maskRowBytes,
                                           l.destinationRowBytes, flags & 1, (flags >> 1) & 1, (flags >> 2) & 1);
  });
}

TEST(FastPixels, TintEveryFormAndAmount) {
  expectSameForLayoutsFlagsAndLevels(
      12, 4, {0, 1, 40, 254, 255}, [](const Layout& l, int flags, int amount, std::vector<std::uint8_t>& b) {
        IPLApplyTintTo32BitAlphaFirstImage(b.data(), b.data() + l.destinationOffset(), l.width, l.height,
                                           l.imageRowBytes, l.destinationRowBytes, flags & 1, (flags >> 1) & 1,
                                           static_cast<std::uint8_t>(amount));
      });
}

TEST(FastPixels, ClearAlphaEveryFormAndLevel) {
  expectSameForLayoutsFlagsAndLevels(
      13, 4, {0, 1, 128, 254, 255}, [](const Layout& l, int flags, int alpha, std::vector<std::uint8_t>& b) {
        IPLClearAlphaChannelOf32BitAlphaFirstImage(b.data(), b.data() + l.destinationOffset(), l.width, l.height,
                                                   l.imageRowBytes, l.destinationRowBytes,
                                                   static_cast<std::uint8_t>(alpha), flags & 1, (flags >> 1) & 1);
      });
}

// Every pair of 8-bit values through the combined masks: the SIMD product
// must be the alpha table's floor(a * b / 255), on every instruction set.
TEST(FastPixels, MaskProductOfEveryPairIsTheAlphaTable) {
  std::vector<std::uint8_t> first(65536), second(65536), combined(65536);
  for (std::size_t i = 0; i < 65536; ++i) {
    first[i] = static_cast<std::uint8_t>(i >> 8);
    second[i] = static_cast<std::uint8_t>(i & 255);
  }
  const auto names = kxa::ipl::availableInstructionSets();
  for (std::size_t set = 0; set < names.size(); ++set) {
    kxa::ipl::forceInstructionSet(static_cast<int>(set));
    IPLCombine8BitMasks(first.data(), second.data(), combined.data(), 65536, 1, 65536, 65536, 65536, 0, 0, 0);
    kxa::ipl::forceInstructionSet(-1);
    for (std::size_t i = 0; i < 65536; ++i)
      ASSERT_EQ(combined[i], gAlphaLookUpTable[i]) << names[set] << " " << (i >> 8) << " x " << (i & 255);
  }
}

TEST(FastPixels, CombineMasksEveryInversion) {
  std::mt19937 random(14);
  for (int round = 0; round < 12; ++round) {
    const std::size_t width = round < 2 ? 200 : std::uniform_int_distribution<std::size_t>(1, 150)(random);
    const std::size_t height = 3, rowBytes = width + static_cast<std::size_t>(round % 5);
    const auto start = randomBytes(random, 3 * height * rowBytes);
    for (int flags = 0; flags < 8; ++flags) {
      expectSameOnEveryInstructionSet(
          start,
          [&](std::vector<std::uint8_t>& b) {
            std::uint8_t* out = round % 2 ? b.data() : b.data() + 2 * height * rowBytes;  // in place over A
            IPLCombine8BitMasks(b.data(), b.data() + height * rowBytes, out, width, height, rowBytes, rowBytes,
                                rowBytes, flags & 1, (flags >> 1) & 1, (flags >> 2) & 1);
          },
          "combine flags " + std::to_string(flags));
      if (HasFatalFailure()) return;
    }
  }
}

}  // namespace
