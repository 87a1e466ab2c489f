#include "kxacore/Files/Text/KXCDataReader.h"

#include <bit>
#include <cstring>
#include <limits>
#include <stdexcept>
#include <string_view>

#include "kxacore/Extensions/KXAStringExtensions.h"

KXCDataReader::KXCDataReader(const void* bytes, std::size_t length, std::size_t offset)
    : bytes_(static_cast<const std::uint8_t*>(bytes)),
      size_(bytes ? offset + length : 0),
      location_(offset) {}

KXCDataReader::KXCDataReader(Buffer data)
    : KXCDataReader(std::make_shared<const Buffer>(std::move(data))) {}

KXCDataReader::KXCDataReader(std::shared_ptr<const Buffer> data) : owned_(std::move(data)) {
  if (owned_) {
    bytes_ = owned_->data();
    size_ = owned_->size();
  }
}

void KXCDataReader::require(std::size_t count) const {
  if (location_ <= size_ && count <= size_ - location_) return;
  throw std::out_of_range("reading " + std::to_string(count) + " byte" +
                          (count == 1 ? "" : "s") + " at byte offset " +
                          std::to_string(location_) + " runs past the end (" +
                          std::to_string(size_) + " bytes)");
}

void KXCDataReader::getBytes(void* destination, std::size_t count) {
  require(count);
  if (count > 0) std::memcpy(destination, bytes_ + location_, count);
  lastReadLength_ = count;
  location_ += count;
}

void KXCDataReader::passBytesLength(std::uint64_t count) {
  const std::uint64_t room = std::numeric_limits<std::uint64_t>::max() - location_;
  location_ += count < room ? count : room;
}

std::uint8_t KXCDataReader::getByte() {
  std::uint8_t byte = 0;
  getBytes(&byte, 1);
  return byte;
}

std::uint16_t KXCDataReader::getUInt16() {
  std::uint8_t b[2];
  getBytes(b, sizeof b);
  return static_cast<std::uint16_t>(b[0] | (b[1] << 8));
}

std::int16_t KXCDataReader::getInt16() { return static_cast<std::int16_t>(getUInt16()); }

std::uint32_t KXCDataReader::getUInt32() {
  std::uint8_t b[4];
  getBytes(b, sizeof b);
  return static_cast<std::uint32_t>(b[0]) | (static_cast<std::uint32_t>(b[1]) << 8) |
         (static_cast<std::uint32_t>(b[2]) << 16) | (static_cast<std::uint32_t>(b[3]) << 24);
}

std::int32_t KXCDataReader::getInt32() { return static_cast<std::int32_t>(getUInt32()); }

float KXCDataReader::getSingle() { return std::bit_cast<float>(getUInt32()); }

std::int32_t KXCDataReader::get7BitEncodedInt() {
  // Decoded straight from the buffer: the position moves only once the whole
  // integer is there, so one cut short by the end is not half-consumed.
  // With five bytes left no step can run past the end: check once.
  const bool roomForAll = location_ <= size_ && size_ - location_ >= 5;
  std::uint32_t result = 0;
  for (std::size_t i = 0; i < 5; ++i) {
    if (!roomForAll) require(i + 1);
    const std::uint8_t byte = bytes_[location_ + i];
    result |= static_cast<std::uint32_t>(byte & 0x7F) << (7 * i);  // 5th byte: low 4 bits survive
    if ((byte & 0x80) == 0) {
      location_ += i + 1;
      lastReadLength_ = 1;
      return static_cast<std::int32_t>(result);
    }
  }
  location_ += 5;
  lastReadLength_ = 1;
  return -1;
}

std::optional<std::string> KXCDataReader::getString() {
  const std::uint64_t start = location_;
  const std::int32_t length = get7BitEncodedInt();
  if (length == 0) return std::string();
  if (length < 0) return std::nullopt;
  const auto count = static_cast<std::size_t>(length);
  try {
    require(count);  // before any allocation: a hostile prefix costs nothing
  } catch (const std::out_of_range&) {
    location_ = start;
    throw;
  }
  const std::string_view bytes(reinterpret_cast<const char*>(bytes_ + location_), count);
  lastReadLength_ = count;
  location_ += count;
  if (!kxa_isValidUTF8(bytes)) return std::nullopt;
  return std::string(bytes);
}
