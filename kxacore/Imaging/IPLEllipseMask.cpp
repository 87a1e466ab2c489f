#include "kxacore/Imaging/IPLEllipseMask.h"

#include "kxacore/Imaging/IPLPixelOperations.h"

#include <cmath>
#include <cstring>

namespace {

struct SurfaceDeleter {
  void operator()(cairo_surface_t* surface) const { cairo_surface_destroy(surface); }
};
using Surface = std::unique_ptr<cairo_surface_t, SurfaceDeleter>;

constexpr double kCairoLimit = 32767;  // Cairo's largest image side

}  // namespace

std::size_t IPLEllipseMaskRowBytes(std::size_t width) { return (width + 15) / 16 * 16; }

std::optional<std::vector<std::uint8_t>> CreateEllipseImageMaskData(bool softEdge,
                                                                    KXACairoContext* context,
                                                                    double width, double height) {
  if (!(width > 0 && height > 0) || width >= kCairoLimit + 1 || height >= kCairoLimit + 1)
    return std::nullopt;
  const auto pixelsWide = static_cast<std::size_t>(width);
  const auto pixelsHigh = static_cast<std::size_t>(height);
  if (pixelsWide == 0 || pixelsHigh == 0) return std::nullopt;
  const std::size_t rowBytes = IPLEllipseMaskRowBytes(pixelsWide);
  std::vector<std::uint8_t> block(rowBytes * pixelsHigh, 0);

  // An A8 surface stores coverage only: grey 0 is "nothing", grey 1 "full".
  Surface surface(cairo_image_surface_create_for_data(block.data(), CAIRO_FORMAT_A8,
                                                      static_cast<int>(pixelsWide),
                                                      static_cast<int>(pixelsHigh),
                                                      static_cast<int>(rowBytes)));
  if (cairo_surface_status(surface.get()) != CAIRO_STATUS_SUCCESS) return std::nullopt;
  KXACairoContext drawing(cairo_create(surface.get()));
  if (cairo_status(drawing.get()) != CAIRO_STATUS_SUCCESS) return std::nullopt;

  cairo_set_operator(drawing.get(), CAIRO_OPERATOR_SOURCE);
  cairo_set_source_rgba(drawing.get(), 0, 0, 0, 0);
  cairo_rectangle(drawing.get(), 0, 0, width, height);
  cairo_fill(drawing.get());
  cairo_set_source_rgba(drawing.get(), 1, 1, 1, 1);
  cairo_save(drawing.get());
  cairo_translate(drawing.get(), width / 2, height / 2);
  cairo_scale(drawing.get(), width / 2, height / 2);
  cairo_arc(drawing.get(), 0, 0, 1, 0, 2 * M_PI);
  cairo_restore(drawing.get());
  cairo_fill(drawing.get());
  cairo_set_operator(drawing.get(), CAIRO_OPERATOR_OVER);
  cairo_surface_flush(surface.get());
  if (cairo_status(drawing.get()) != CAIRO_STATUS_SUCCESS) return std::nullopt;

  if (softEdge && pixelsWide >= 9 && pixelsHigh >= 9) {
    IPLBlur(block.data(), block.data(), pixelsWide, pixelsHigh, 1, 1, rowBytes, rowBytes, 2,
            IPLMorphologyErode, IPLBlurBox);
    cairo_surface_mark_dirty(surface.get());
  }
  if (context != nullptr) *context = std::move(drawing);
  // Moving keeps the buffer, so a returned context still draws into it.
  return std::optional<std::vector<std::uint8_t>>(std::move(block));
}

std::optional<KXAImage> CreateEllipseImageMask(bool softEdge, double width, double height) {
  auto block = CreateEllipseImageMaskData(softEdge, nullptr, width, height);
  if (!block) return std::nullopt;
  const auto pixelsWide = static_cast<std::size_t>(width);
  const auto pixelsHigh = static_cast<std::size_t>(height);
  KXAImage image(pixelsWide, pixelsHigh, KXAPixelLayout::grey8, IPLEllipseMaskRowBytes(pixelsWide));
  std::memcpy(image.bytes(), block->data(), block->size());
  return image;
}
