// KXCCroppedShape: how a photo was cropped. A rectangle on the uncropped
// image (pixel coordinates), that image's pixel size, and content hashes of
// the uncropped and of the cropped file.
//
//   KXCCroppedShape shape({10, 20, 300, 200}, 0);
//   shape.setImageSize({640, 480});
//   shape.jsonString();  // {"type": "rectangle", "x": 10, ... "croppedFileHash": ""}
//   KXCCroppedShape::croppedShapeFromJSONString(shape.jsonString()) == shape;  // true
//
// JSON form, keys in this order, every number an integer rounded half away
// from zero: "type" ("rectangle"), "x", "y", "width", "height",
// "imageWidthPixels", "imageHeightPixels", "fileHash" (the image hash),
// "croppedFileHash". Equality and hash() work on that rounded form, so
// shapes that differ by less than half a pixel are equal. Non-finite
// coordinates write as 0; magnitudes beyond 2^63 saturate.
//
// An absent hash and an empty one are the same here (both write as "").
//
// Thread safety: a value; const members may be called from any thread.
#pragma once

#include <nlohmann/json.hpp>

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

struct KXCSize {
  double width = 0;
  double height = 0;
};

struct KXCRect {
  double x = 0;
  double y = 0;
  double width = 0;
  double height = 0;
};

class KXCCroppedShape {
 public:
  // The one shape type there is.
  static constexpr std::int64_t kTypeRectangle = 0;

  KXCCroppedShape() = default;
  // Image size zero, hashes empty.
  KXCCroppedShape(const KXCRect& rect, std::int64_t type);

  // Reads the JSON form. nullopt for empty text, text that is not a JSON
  // object with at least one entry, a missing or empty "type" string, or a
  // missing "x", "y", "width" or "height". Numbers count by their integer
  // value (fractions truncated), numeric strings by their leading integer;
  // a coordinate of any other kind (null, array, object) yields nullopt.
  // Missing image sizes read as 0, missing hashes as "".
  [[nodiscard]] static std::optional<KXCCroppedShape> croppedShapeFromJSONString(
      std::string_view json);

  // "rectangle" for 0, "" for any other type.
  [[nodiscard]] static std::string stringFromType(std::int64_t type);
  // Always 0: unknown names read as a rectangle, so data written by a newer
  // version with more shapes still opens (deliberately kept).
  [[nodiscard]] static std::int64_t typeFromString(std::string_view name);

  const std::string& imageHash() const { return imageHash_; }
  void setImageHash(std::string hash) { imageHash_ = std::move(hash); }
  const std::string& croppedFileHash() const { return croppedFileHash_; }
  void setCroppedFileHash(std::string hash) { croppedFileHash_ = std::move(hash); }
  std::int64_t type() const { return type_; }
  void setType(std::int64_t type) { type_ = type; }
  const KXCSize& imageSize() const { return imageSize_; }
  void setImageSize(const KXCSize& size) { imageSize_ = size; }
  const KXCRect& rect() const { return rect_; }
  void setRect(const KXCRect& rect) { rect_ = rect; }

  // The nine keys of the JSON form, in order.
  [[nodiscard]] nlohmann::ordered_json jsonDictionary() const;
  // jsonDictionary() pretty-printed (two-space indent), UTF-8; invalid UTF-8
  // in a hash is replaced rather than thrown about.
  [[nodiscard]] std::string jsonString() const;

  // True when the crop covers the whole image: the intersection of rect()
  // with (0, 0, imageSize()) is that image rectangle. An empty image
  // (a zero or negative side) is never covered.
  [[nodiscard]] bool croppedByWholeImage() const;

  bool operator==(const KXCCroppedShape& other) const {
    return jsonDictionary() == other.jsonDictionary();
  }
  [[nodiscard]] std::size_t hash() const;

 private:
  std::string imageHash_;
  std::string croppedFileHash_;
  std::int64_t type_ = kTypeRectangle;
  KXCSize imageSize_;
  KXCRect rect_;
};

template <>
struct std::hash<KXCCroppedShape> {
  std::size_t operator()(const KXCCroppedShape& shape) const { return shape.hash(); }
};
