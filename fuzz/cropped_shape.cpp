// Cropped-shape JSON reading over fuzz-chosen text.
//
// Properties checked (abort on failure):
//   - reading never throws or crashes;
//   - a shape that reads back writes JSON that reads to an equal shape, with
//     the same hash and the same answer to croppedByWholeImage.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string_view>

#include "kxacore/Imaging/KXCCroppedShape.h"

namespace {

void check(bool condition) {
  if (!condition) std::abort();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string_view text(reinterpret_cast<const char*>(data), size);
  const auto shape = KXCCroppedShape::croppedShapeFromJSONString(text);
  if (!shape) return 0;
  const auto again = KXCCroppedShape::croppedShapeFromJSONString(shape->jsonString());
  check(again.has_value());
  check(*again == *shape);
  check(again->hash() == shape->hash());
  check(again->croppedByWholeImage() == shape->croppedByWholeImage());
  return 0;
}
