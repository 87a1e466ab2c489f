#include "kxacore/Imaging/KXCCroppedShape.h"

#include "kxacore/Extensions/KXAStringExtensions.h"

#include <algorithm>
#include <cmath>
#include <limits>

namespace {

// Half away from zero, saturating; non-finite values write as 0.
std::int64_t roundedCoordinate(double value) {
  if (!std::isfinite(value)) return 0;
  const double rounded = std::round(value);
  constexpr double kLimit = 9223372036854775807.0;  // 2^63, the first double out of range
  if (rounded >= kLimit) return std::numeric_limits<std::int64_t>::max();
  if (rounded <= -kLimit) return std::numeric_limits<std::int64_t>::min();
  return static_cast<std::int64_t>(rounded);
}

// The integer value of a JSON entry, as a loosely typed reader would take it.
std::optional<std::int64_t> integerOf(const nlohmann::json& value) {
  if (value.is_number_integer()) {
    if (value.is_number_unsigned()) {
      const auto wide = value.get<std::uint64_t>();
      return static_cast<std::int64_t>(
          std::min<std::uint64_t>(wide, std::numeric_limits<std::int64_t>::max()));
    }
    return value.get<std::int64_t>();
  }
  if (value.is_number_float()) {
    const double number = value.get<double>();
    return roundedCoordinate(std::trunc(number));
  }
  if (value.is_boolean()) return value.get<bool>() ? 1 : 0;
  if (value.is_string()) return kxa_integerValue(value.get_ref<const std::string&>());
  return std::nullopt;
}

std::optional<std::int64_t> optionalInteger(const nlohmann::json& object, const char* key,
                                            bool& malformed) {
  const auto found = object.find(key);
  if (found == object.end()) return std::nullopt;
  const auto value = integerOf(*found);
  if (!value) malformed = true;
  return value;
}

std::string optionalString(const nlohmann::json& object, const char* key) {
  const auto found = object.find(key);
  if (found == object.end() || !found->is_string()) return {};
  return found->get<std::string>();
}

KXCRect standardized(const KXCRect& rect) {
  KXCRect result = rect;
  if (result.width < 0) {
    result.x += result.width;
    result.width = -result.width;
  }
  if (result.height < 0) {
    result.y += result.height;
    result.height = -result.height;
  }
  return result;
}

}  // namespace

KXCCroppedShape::KXCCroppedShape(const KXCRect& rect, std::int64_t type)
    : type_(type), rect_(rect) {}

std::string KXCCroppedShape::stringFromType(std::int64_t type) {
  return type == kTypeRectangle ? "rectangle" : "";
}

std::int64_t KXCCroppedShape::typeFromString(std::string_view name) {
  static_cast<void>(name == "rectangle");  // the only name; unknown ones still read as it
  return kTypeRectangle;
}

std::optional<KXCCroppedShape> KXCCroppedShape::croppedShapeFromJSONString(std::string_view json) {
  if (json.empty()) return std::nullopt;
  const auto object = nlohmann::json::parse(json, nullptr, /*allow_exceptions=*/false);
  if (!object.is_object() || object.empty()) return std::nullopt;
  const auto type = object.find("type");
  if (type == object.end() || !type->is_string() || type->get_ref<const std::string&>().empty())
    return std::nullopt;
  bool malformed = false;
  const auto x = optionalInteger(object, "x", malformed);
  const auto y = optionalInteger(object, "y", malformed);
  const auto width = optionalInteger(object, "width", malformed);
  const auto height = optionalInteger(object, "height", malformed);
  const auto imageWidth = optionalInteger(object, "imageWidthPixels", malformed);
  const auto imageHeight = optionalInteger(object, "imageHeightPixels", malformed);
  if (malformed || !x || !y || !width || !height) return std::nullopt;

  KXCCroppedShape shape(KXCRect{double(*x), double(*y), double(*width), double(*height)},
                        typeFromString(type->get_ref<const std::string&>()));
  shape.setImageSize(KXCSize{double(imageWidth.value_or(0)), double(imageHeight.value_or(0))});
  shape.setImageHash(optionalString(object, "fileHash"));
  shape.setCroppedFileHash(optionalString(object, "croppedFileHash"));
  return shape;
}

nlohmann::ordered_json KXCCroppedShape::jsonDictionary() const {
  return nlohmann::ordered_json{
      {"type", stringFromType(type_)},
      {"x", roundedCoordinate(rect_.x)},
      {"y", roundedCoordinate(rect_.y)},
      {"width", roundedCoordinate(rect_.width)},
      {"height", roundedCoordinate(rect_.height)},
      {"imageWidthPixels", roundedCoordinate(imageSize_.width)},
      {"imageHeightPixels", roundedCoordinate(imageSize_.height)},
      {"fileHash", imageHash_},
      {"croppedFileHash", croppedFileHash_},
  };
}

std::string KXCCroppedShape::jsonString() const {
  return jsonDictionary().dump(2, ' ', false, nlohmann::ordered_json::error_handler_t::replace);
}

bool KXCCroppedShape::croppedByWholeImage() const {
  if (!(imageSize_.width > 0 && imageSize_.height > 0)) return false;
  const KXCRect crop = standardized(rect_);
  const double left = std::max(crop.x, 0.0);
  const double top = std::max(crop.y, 0.0);
  const double right = std::min(crop.x + crop.width, imageSize_.width);
  const double bottom = std::min(crop.y + crop.height, imageSize_.height);
  return left == 0 && top == 0 && right == imageSize_.width && bottom == imageSize_.height;
}

std::size_t KXCCroppedShape::hash() const {
  return std::hash<std::string>{}(
      jsonDictionary().dump(-1, ' ', false, nlohmann::ordered_json::error_handler_t::replace));
}
