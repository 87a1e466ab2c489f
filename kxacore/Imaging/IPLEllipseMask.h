// Ellipse masks: the hard or soft edge of an oval crop, drawn with Cairo.
//
// A mask is 8 bits a pixel, 0 outside the ellipse inscribed in
// (0, 0, width, height) and 255 inside, with antialiased edge pixels in
// between. Rows are the width rounded up to a multiple of 16 bytes.
// A soft mask (width and height both at least 9) is then eroded by 2 pixels
// and box-blurred by 2, so the oval shrinks and its edge fades.
//
// Thread safety: any thread; nothing is shared between calls.
#pragma once

#include "kxacore/Platform/KXAImage.h"

#include <cairo.h>

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <vector>

struct KXACairoContextDeleter {
  void operator()(cairo_t* context) const { cairo_destroy(context); }
};
// A Cairo drawing context over a mask block; it draws into the block it was
// made with, so it must not outlive that block (moving the vector is fine).
using KXACairoContext = std::unique_ptr<cairo_t, KXACairoContextDeleter>;

// Row length of a mask of `width` pixels: rounded up to 16 bytes.
[[nodiscard]] std::size_t IPLEllipseMaskRowBytes(std::size_t width);

// The mask's bytes (row length IPLEllipseMaskRowBytes(width), height rows),
// owned by the caller. width and height are truncated to whole pixels.
// nullopt when either is not above 0, truncates to 0, exceeds Cairo's limit
// of 32767, or Cairo cannot draw. When `context` is given it receives the
// drawing context over the returned block (an 8-bit coverage surface: 0 is
// black, 255 white).
[[nodiscard]] std::optional<std::vector<std::uint8_t>> CreateEllipseImageMaskData(
    bool softEdge, KXACairoContext* context, double width, double height);

// The same mask as a grey image the caller owns; nullopt as above.
[[nodiscard]] std::optional<KXAImage> CreateEllipseImageMask(bool softEdge, double width,
                                                              double height);
