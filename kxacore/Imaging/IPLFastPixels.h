// SIMD row kernels for the per-pixel operations on 32-bit alpha-first
// pixels and 8-bit masks (IPLPixelOperations.cpp). Each filters the leading
// pixels of one row, a whole number of vectors, and returns how many it did;
// the caller finishes the row with its plain per-pixel form, so the plain
// form stays the definition and the tests hold these to it. On the scalar
// baseline they do nothing and return 0. Compiled per instruction set and
// chosen at run time like the blur family (forceInstructionSet applies).
// Input and output rows may be the same memory. Internal.
#pragma once

#include <cstddef>
#include <cstdint>

namespace kxa::ipl {

// What IPLApply8BitMaskTo32BitAlphaFirstImage writes, by its two flags.
enum class MaskMode {
  scaleAll,          // useImageAlpha, scaleColors: every byte times the mask
  scaleAlpha,        // useImageAlpha only: alpha times the mask, colours kept
  plainAlphaColours, // scaleColors only: alpha = plain mask, colours times the mask
  maskAsAlpha,       // neither: alpha = the mask, colours kept
};

// Mask bytes are contiguous (step 1). invert applies as the plain form says.
std::size_t fastMaskPixels(const std::uint8_t* image, const std::uint8_t* mask, std::uint8_t* out,
                           std::size_t count, MaskMode mode, bool invert);

// The tint of IPLApplyTintTo32BitAlphaFirstImage for the three forms without
// a division: neither premultiplied, premultiplying a straight source, and
// premultiplied in and out. amount > 0 where the plain form returns early.
enum class TintMode { straight, premultiplying, premultiplied };
std::size_t fastTintPixels(const std::uint8_t* in, std::uint8_t* out, std::size_t count, TintMode mode,
                           std::uint8_t amount);

// IPLClearAlphaChannelOf32BitAlphaFirstImage without demultiplying: alpha
// set, colours scaled by it when scaleColours, else left as out has them.
std::size_t fastClearAlpha(const std::uint8_t* in, std::uint8_t* out, std::size_t count, std::uint8_t alpha,
                           bool scaleColours);

// IPLCombine8BitMasks over one row of mask bytes.
std::size_t fastCombineMasks(const std::uint8_t* a, const std::uint8_t* b, std::uint8_t* out, std::size_t count,
                             bool invertA, bool invertB, bool invertResult);

}  // namespace kxa::ipl
