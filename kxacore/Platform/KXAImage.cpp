#include "kxacore/Platform/KXAImage.h"

#include "kxacore/Platform/KXAFileUtilities.h"

#include <vips/vips8>

#include <algorithm>
#include <cctype>
#include <climits>
#include <cstring>
#include <memory>
#include <mutex>
#include <string_view>

namespace {

bool startVips() {
  static std::once_flag once;
  static bool started = false;
  std::call_once(once, [] { started = VIPS_INIT("kxacore") == 0; });
  return started;
}

void setError(std::string* error, std::string message) {
  if (error != nullptr) *error = std::move(message);
}

struct GFreeDeleter {
  void operator()(void* pointer) const { g_free(pointer); }
};

}  // namespace

KXAImage::KXAImage(std::size_t width, std::size_t height, KXAPixelLayout layout,
                   std::size_t rowBytes)
    : width_(width), height_(height), layout_(layout) {
  rowBytes_ = std::max(rowBytes, width * bytesPerPixel());
  bytes_.assign(rowBytes_ * height_, 0);
}

namespace {

// Decodes what `open` returns into an image value of the layout `mode` asks for.
template <typename Open>
std::optional<KXAImage> decodedImage(const Open& open, KXAImage::Load mode, std::string* error) {
  using Load = KXAImage::Load;
  if (!startVips()) {
    setError(error, "the image library could not start");
    return std::nullopt;
  }
  try {
    vips::VImage image = open();
    const bool grey = mode == Load::grey || (mode == Load::asStored && image.bands() == 1);
    // Converting the colour space also brings 16-bit files to 8 bits.
    image = image.colourspace(grey ? VIPS_INTERPRETATION_B_W : VIPS_INTERPRETATION_sRGB);
    if (image.format() != VIPS_FORMAT_UCHAR) image = image.cast(VIPS_FORMAT_UCHAR);
    if (!grey) {
      if (image.bands() == 3) image = image.bandjoin_const({255});
      if (image.bands() > 4) image = image.extract_band(0, vips::VImage::option()->set("n", 4));
    } else if (image.bands() > 1) {
      image = image.extract_band(0);
    }
    const auto width = static_cast<std::size_t>(image.width());
    const auto height = static_cast<std::size_t>(image.height());
    KXAImage result(width, height, grey ? KXAPixelLayout::grey8 : KXAPixelLayout::argb32);
    std::size_t size = 0;
    std::unique_ptr<std::uint8_t, GFreeDeleter> memory(
        static_cast<std::uint8_t*>(image.write_to_memory(&size)));
    const std::size_t tight = width * result.bytesPerPixel();
    if (size != tight * height) {
      setError(error, "unexpected pixel data size");
      return std::nullopt;
    }
    for (std::size_t y = 0; y < height; ++y) {
      const std::uint8_t* in = memory.get() + y * tight;
      std::uint8_t* out = result.row(y);
      if (grey) {
        std::memcpy(out, in, tight);
      } else {
        for (std::size_t x = 0; x < width; ++x) {  // RGBA to alpha first
          out[4 * x] = in[4 * x + 3];
          out[4 * x + 1] = in[4 * x];
          out[4 * x + 2] = in[4 * x + 1];
          out[4 * x + 3] = in[4 * x + 2];
        }
      }
    }
    return result;
  } catch (const vips::VError& failure) {
    vips_error_clear();
    setError(error, failure.what());
    return std::nullopt;
  }
}

}  // namespace

std::optional<KXAImage> KXAImage::imageWithContentsOfFile(const std::filesystem::path& path,
                                                          Load mode, std::string* error) {
  return decodedImage(
      [&] {
        return vips::VImage::new_from_file(
            path.c_str(), vips::VImage::option()->set("access", VIPS_ACCESS_SEQUENTIAL));
      },
      mode, error);
}

std::optional<KXAImage> KXAImage::thumbnailWithContentsOfFile(const std::filesystem::path& path,
                                                              std::size_t maxSide, Load mode,
                                                              std::string* error) {
  if (maxSide == 0 || maxSide > INT_MAX) {
    setError(error, "the thumbnail size is out of range");
    return std::nullopt;
  }
  const int side = static_cast<int>(maxSide);
  return decodedImage(
      [&] {
        // Shrink-on-load where the format allows it; never enlarges.
        return vips::VImage::thumbnail(
            path.c_str(), side, vips::VImage::option()->set("height", side)->set("size", VIPS_SIZE_DOWN));
      },
      mode, error);
}

bool KXAImage::writeToFile(const std::filesystem::path& path, std::string* error) const {
  if (empty()) {
    setError(error, "the image is empty");
    return false;
  }
  if (!startVips()) {
    setError(error, "the image library could not start");
    return false;
  }
  if (width_ > INT_MAX || height_ > INT_MAX) {
    setError(error, "the image is too large");
    return false;
  }
  const std::size_t bands = bytesPerPixel();
  std::vector<std::uint8_t> tight(width_ * height_ * bands);
  for (std::size_t y = 0; y < height_; ++y) {
    const std::uint8_t* in = row(y);
    std::uint8_t* out = tight.data() + y * width_ * bands;
    if (bands == 1) {
      std::memcpy(out, in, width_);
    } else {
      for (std::size_t x = 0; x < width_; ++x) {  // alpha first to RGBA
        out[4 * x] = in[4 * x + 1];
        out[4 * x + 1] = in[4 * x + 2];
        out[4 * x + 2] = in[4 * x + 3];
        out[4 * x + 3] = in[4 * x];
      }
    }
  }
  try {
    vips::VImage image = vips::VImage::new_from_memory(
        tight.data(), tight.size(), static_cast<int>(width_), static_cast<int>(height_),
        static_cast<int>(bands), VIPS_FORMAT_UCHAR);
    image = image.copy(vips::VImage::option()->set(
        "interpretation", bands == 1 ? VIPS_INTERPRETATION_B_W : VIPS_INTERPRETATION_sRGB));
    std::string extension = path.extension().string();
    std::transform(extension.begin(), extension.end(), extension.begin(),
                   [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
    if ((extension == ".jpg" || extension == ".jpeg") && bands == 4)
      image = image.extract_band(0, vips::VImage::option()->set("n", 3));
    void* encoded = nullptr;
    std::size_t size = 0;
    image.write_to_buffer(extension.c_str(), &encoded, &size);
    std::unique_ptr<void, GFreeDeleter> owned(encoded);
    if (!KXAWriteFileAtomically(path,
                                std::string_view(static_cast<const char*>(encoded), size))) {
      setError(error, "cannot write " + path.string());
      return false;
    }
    return true;
  } catch (const vips::VError& failure) {
    vips_error_clear();
    setError(error, failure.what());
    return false;
  }
}
