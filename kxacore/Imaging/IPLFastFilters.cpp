// Sliding windows in O(1) per sample. The box blur keeps running sums; the
// morphology uses the van Herk / Gil-Werman split into blocks of one window
// length with prefix and suffix extremes, so a window's extreme is one
// comparison of a suffix and a prefix, with no rescans on flat regions.
// Columns are handled kStrip at a time: a strip is gathered into a small
// padded block whose rows are contiguous, so the inner loops run over
// neighbouring columns and vectorise.

#include "kxacore/Imaging/IPLFastFilters.h"

#include <algorithm>
#include <vector>

namespace kxa::ipl {
namespace {

constexpr std::size_t kStrip = 64;

// Mirrors `lanes`-wide rows around rows radius ... radius + count - 1 of a
// padded block, with the edge row repeated; left and right interleaved so
// that radii past the line keep reflecting (the plain form does the same).
void mirrorRows(std::uint8_t* block, std::size_t count, std::size_t radius, std::size_t lanes) {
  for (std::size_t j = 0; j < radius; ++j) {
    std::copy_n(block + (radius + j) * lanes, lanes, block + (radius - 1 - j) * lanes);
    std::copy_n(block + (radius + count - 1 - j) * lanes, lanes, block + (radius + count + j) * lanes);
  }
}

void zeroRows(std::uint8_t* block, std::size_t count, std::size_t radius, std::size_t lanes) {
  std::fill_n(block, radius * lanes, std::uint8_t{0});
  std::fill_n(block + (radius + count) * lanes, radius * lanes, std::uint8_t{0});
}

// Running sums down a padded block of `lanes` columns; writes count rows.
template <std::size_t lanes, typename Sum>
void boxRunning(const std::uint8_t* block, std::size_t count, std::size_t radius,
                const std::uint8_t* table, std::uint8_t* out) {
  Sum sums[lanes] = {};
  for (std::size_t i = 0; i <= 2 * radius; ++i) {
    const std::uint8_t* row = block + i * lanes;
    for (std::size_t l = 0; l < lanes; ++l) sums[l] = static_cast<Sum>(sums[l] + row[l]);
  }
  const bool multiply = radius <= RoundedDivider::kMaximumRadius;
  const RoundedDivider divide(multiply ? radius : 0);
  for (std::size_t y = 0; y < count; ++y) {
    std::uint8_t* target = out + y * lanes;
    if (multiply) {
      for (std::size_t l = 0; l < lanes; ++l) target[l] = divide(sums[l]);
    } else {
      for (std::size_t l = 0; l < lanes; ++l) target[l] = table[sums[l]];
    }
    if (y + 1 == count) break;
    const std::uint8_t* entering = block + (y + 2 * radius + 1) * lanes;
    const std::uint8_t* leaving = block + y * lanes;
    for (std::size_t l = 0; l < lanes; ++l)
      sums[l] = static_cast<Sum>(sums[l] + entering[l] - leaving[l]);
  }
}

template <bool isMinimum>
inline std::uint8_t pick(std::uint8_t a, std::uint8_t b) {
  return isMinimum ? std::min(a, b) : std::max(a, b);
}

// van Herk / Gil-Werman over a padded block of `length` rows: out row y is
// the extreme of rows y ... y + 2r.
template <bool isMinimum, std::size_t lanes>
void vanHerk(const std::uint8_t* block, std::size_t length, std::size_t radius,
             std::uint8_t* prefix, std::uint8_t* suffix, std::uint8_t* out, std::size_t count) {
  const std::size_t window = 2 * radius + 1;
  for (std::size_t start = 0; start < length; start += window) {
    const std::size_t end = std::min(start + window, length);
    std::copy_n(block + start * lanes, lanes, prefix + start * lanes);
    for (std::size_t i = start + 1; i < end; ++i) {
      const std::uint8_t* row = block + i * lanes;
      const std::uint8_t* before = prefix + (i - 1) * lanes;
      std::uint8_t* target = prefix + i * lanes;
      for (std::size_t l = 0; l < lanes; ++l) target[l] = pick<isMinimum>(before[l], row[l]);
    }
    std::copy_n(block + (end - 1) * lanes, lanes, suffix + (end - 1) * lanes);
    for (std::size_t i = end - 1; i-- > start;) {
      const std::uint8_t* row = block + i * lanes;
      const std::uint8_t* after = suffix + (i + 1) * lanes;
      std::uint8_t* target = suffix + i * lanes;
      for (std::size_t l = 0; l < lanes; ++l) target[l] = pick<isMinimum>(after[l], row[l]);
    }
  }
  for (std::size_t y = 0; y < count; ++y) {
    const std::uint8_t* left = suffix + y * lanes;
    const std::uint8_t* right = prefix + (y + 2 * radius) * lanes;
    std::uint8_t* target = out + y * lanes;
    for (std::size_t l = 0; l < lanes; ++l) target[l] = pick<isMinimum>(left[l], right[l]);
  }
}

// `passes` rounds of the rounded 3-tap mean over a padded block; the first
// and last rows stay as they are (their influence never reaches the output
// rows, which sit `passes` rows inside the padding).
template <std::size_t lanes>
void repeatedThreeTap(std::uint8_t* block, std::size_t length, std::size_t passes,
                      std::uint8_t* out, std::size_t count) {
  const RoundedDivider third(1);
  std::uint8_t previous[lanes];
  for (std::size_t pass = 0; pass < passes; ++pass) {
    std::copy_n(block, lanes, previous);
    for (std::size_t i = 1; i + 1 < length; ++i) {
      std::uint8_t* row = block + i * lanes;
      const std::uint8_t* next = row + lanes;
      for (std::size_t l = 0; l < lanes; ++l) {
        const std::uint8_t current = row[l];
        row[l] = third(static_cast<std::uint32_t>(previous[l]) + current + next[l]);
        previous[l] = current;
      }
    }
  }
  std::copy_n(block + passes * lanes, count * lanes, out);
}

enum class Kind { box, gaussian, erode, dilate };

struct Scratch {
  std::vector<std::uint8_t> block, prefix, suffix, out;
  void reserve(std::size_t paddedLength, std::size_t lanes, bool morphology) {
    block.resize(paddedLength * lanes);
    out.resize(paddedLength * lanes);
    if (morphology) {
      prefix.resize(paddedLength * lanes);
      suffix.resize(paddedLength * lanes);
    }
  }
};

template <Kind kind, std::size_t lanes>
void filterBlock(Scratch& scratch, std::size_t count, std::size_t radius,
                 const std::uint8_t* table) {
  std::uint8_t* block = scratch.block.data();
  if constexpr (kind == Kind::gaussian) {
    mirrorRows(block, count, radius, lanes);
    repeatedThreeTap<lanes>(block, count + 2 * radius, radius, scratch.out.data(), count);
  } else if constexpr (kind == Kind::box) {
    mirrorRows(block, count, radius, lanes);
    // 16-bit sums suffice up to a window of 257 samples.
    if (2 * radius + 1 <= 257) {
      boxRunning<lanes, std::uint16_t>(block, count, radius, table, scratch.out.data());
    } else {
      boxRunning<lanes, std::uint32_t>(block, count, radius, table, scratch.out.data());
    }
  } else {
    zeroRows(block, count, radius, lanes);
    vanHerk<kind == Kind::erode, lanes>(block, count + 2 * radius, radius, scratch.prefix.data(),
                                        scratch.suffix.data(), scratch.out.data(), count);
  }
}

template <Kind kind>
void run(const Plane& plane, std::size_t radius, const std::uint8_t* table) {
  const std::size_t width = plane.width, height = plane.height;
  if (width == 0 || height == 0) return;
  constexpr bool morphology = kind == Kind::erode || kind == Kind::dilate;
  Scratch scratch;

  // Rows, kStrip rows at once: the strip is transposed into the block so the
  // same lane-parallel loops run along the rows. Every source row of the
  // strip is read before any destination row is written.
  scratch.reserve(width + 2 * radius, kStrip, morphology);
  for (std::size_t first = 0; first < height; first += kStrip) {
    const std::size_t used = std::min(kStrip, height - first);
    std::uint8_t* block = scratch.block.data() + radius * kStrip;
    for (std::size_t lane = 0; lane < used; ++lane) {
      const std::uint8_t* in = plane.source + (first + lane) * plane.sourceRowBytes;
      for (std::size_t x = 0; x < width; ++x) block[x * kStrip + lane] = in[x * plane.sourceStep];
    }
    for (std::size_t lane = used; lane < kStrip; ++lane)
      for (std::size_t x = 0; x < width; ++x) block[x * kStrip + lane] = 0;
    filterBlock<kind, kStrip>(scratch, width, radius, table);
    for (std::size_t lane = 0; lane < used; ++lane) {
      std::uint8_t* out = plane.destination + (first + lane) * plane.destinationRowBytes;
      const std::uint8_t* filtered = scratch.out.data() + lane;
      for (std::size_t x = 0; x < width; ++x) out[x * plane.destinationStep] = filtered[x * kStrip];
    }
  }

  // Columns of the destination in place, kStrip neighbouring columns at once.
  scratch.reserve(height + 2 * radius, kStrip, morphology);
  const std::size_t step = plane.destinationStep;
  for (std::size_t first = 0; first < width; first += kStrip) {
    const std::size_t used = std::min(kStrip, width - first);
    std::uint8_t* base = plane.destination + first * step;
    for (std::size_t y = 0; y < height; ++y) {
      const std::uint8_t* row = base + y * plane.destinationRowBytes;
      std::uint8_t* lane = scratch.block.data() + (radius + y) * kStrip;
      if (step == 1) {
        std::copy_n(row, used, lane);
      } else {
        for (std::size_t l = 0; l < used; ++l) lane[l] = row[l * step];
      }
      std::fill(lane + used, lane + kStrip, std::uint8_t{0});
    }
    filterBlock<kind, kStrip>(scratch, height, radius, table);
    for (std::size_t y = 0; y < height; ++y) {
      std::uint8_t* row = base + y * plane.destinationRowBytes;
      const std::uint8_t* lane = scratch.out.data() + y * kStrip;
      if (step == 1) {
        std::copy_n(lane, used, row);
      } else {
        for (std::size_t l = 0; l < used; ++l) row[l * step] = lane[l];
      }
    }
  }
}

}  // namespace

void fastBoxBlur(const Plane& plane, std::size_t radius, const std::uint8_t* divisionTable) {
  run<Kind::box>(plane, radius, divisionTable);
}

void fastGaussianBlur(const Plane& plane, std::size_t radius) {
  run<Kind::gaussian>(plane, radius, nullptr);
}

void fastErode(const Plane& plane, std::size_t radius) { run<Kind::erode>(plane, radius, nullptr); }

void fastDilate(const Plane& plane, std::size_t radius) {
  run<Kind::dilate>(plane, radius, nullptr);
}

}  // namespace kxa::ipl
