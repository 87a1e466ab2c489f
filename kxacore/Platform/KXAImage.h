// KXAImage: the library's small image value. Owned pixel bytes with their
// width, height, row length and layout; read and written through libvips.
//
// Layouts: grey8 (1 byte a pixel) and argb32 (4 bytes a pixel, alpha first,
// straight - not premultiplied - alpha, as the pixel functions expect).
//
// Thread safety: a value. Loading and saving may run on any thread; libvips
// is started once, on first use, under a one-time guard.
#pragma once

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>
#include <vector>

enum class KXAPixelLayout { grey8, argb32 };

class KXAImage {
 public:
  KXAImage() = default;
  // Zero-filled pixels; rowBytes 0 picks the tight row length. A rowBytes
  // below the tight length is raised to it.
  KXAImage(std::size_t width, std::size_t height, KXAPixelLayout layout, std::size_t rowBytes = 0);

  std::size_t width() const { return width_; }
  std::size_t height() const { return height_; }
  std::size_t rowBytes() const { return rowBytes_; }
  KXAPixelLayout layout() const { return layout_; }
  std::size_t bytesPerPixel() const { return layout_ == KXAPixelLayout::grey8 ? 1 : 4; }
  std::uint8_t* bytes() { return bytes_.data(); }
  const std::uint8_t* bytes() const { return bytes_.data(); }
  std::uint8_t* row(std::size_t y) { return bytes_.data() + y * rowBytes_; }
  const std::uint8_t* row(std::size_t y) const { return bytes_.data() + y * rowBytes_; }
  bool empty() const { return width_ == 0 || height_ == 0; }

  enum class Load {
    asStored,  // one band (grey, with or without alpha dropped) stays grey8, the rest argb32
    colour,    // always argb32
    grey,      // always grey8 (colour converted to luminance, alpha dropped)
  };

  // Reads any image libvips can decode (PNG, JPEG ...), 8 bits a sample,
  // sRGB; argb32 gets alpha 255 where the file has none. nullopt when the
  // file cannot be read or decoded; `error` then says why.
  [[nodiscard]] static std::optional<KXAImage> imageWithContentsOfFile(
      const std::filesystem::path& path, Load mode = Load::asStored, std::string* error = nullptr);

  // The image at `path` scaled down, aspect kept, so that neither side
  // exceeds `maxSide` pixels (a smaller image keeps its size). Layout and
  // failures as for imageWithContentsOfFile; nullopt for a maxSide of 0.
  [[nodiscard]] static std::optional<KXAImage> thumbnailWithContentsOfFile(
      const std::filesystem::path& path, std::size_t maxSide, Load mode = Load::asStored,
      std::string* error = nullptr);

  // Writes the image in the format its extension names (".png", ".jpg" ...),
  // replacing the file atomically. JPEG drops alpha. False (with `error`)
  // when encoding or writing fails; the target is then untouched.
  bool writeToFile(const std::filesystem::path& path, std::string* error = nullptr) const;

 private:
  std::size_t width_ = 0, height_ = 0, rowBytes_ = 0;
  KXAPixelLayout layout_ = KXAPixelLayout::grey8;
  std::vector<std::uint8_t> bytes_;
};
