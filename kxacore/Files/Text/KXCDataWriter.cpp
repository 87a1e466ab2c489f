#include "kxacore/Files/Text/KXCDataWriter.h"

#include <bit>
#include <cstring>

#include "kxacore/Extensions/KXAStringExtensions.h"

KXCDataWriter::KXCDataWriter() : data_(std::make_shared<Buffer>()) {}

KXCDataWriter::KXCDataWriter(std::shared_ptr<Buffer> data)
    : data_(data ? std::move(data) : std::make_shared<Buffer>()) {}

void KXCDataWriter::appendBytes(const void* bytes, std::size_t length) {
  if (length == 0) return;
  const auto* first = static_cast<const std::uint8_t*>(bytes);
  data_->insert(data_->end(), first, first + length);
}

void KXCDataWriter::writeByte(std::int64_t value) {
  data_->push_back(static_cast<std::uint8_t>(value & 0xFF));
}

void KXCDataWriter::write7BitEncodedInt(std::uint32_t value) {
  while (value >= 0x80) {
    data_->push_back(static_cast<std::uint8_t>((value & 0x7F) | 0x80));
    value >>= 7;
  }
  data_->push_back(static_cast<std::uint8_t>(value));
}

void KXCDataWriter::writeString(std::optional<std::string_view> text) {
  if (!text || text->empty() || !kxa_isValidUTF8(*text)) {
    write7BitEncodedInt(0);
    return;
  }
  // Measured as a C string: an embedded NUL ends the text.
  const std::string_view bytes = text->substr(0, text->find('\0'));
  write7BitEncodedInt(static_cast<std::uint32_t>(bytes.size()));
  appendBytes(bytes.data(), bytes.size());
}

void KXCDataWriter::writeUInt32(std::uint32_t value) {
  const std::uint8_t bytes[4] = {
      static_cast<std::uint8_t>(value), static_cast<std::uint8_t>(value >> 8),
      static_cast<std::uint8_t>(value >> 16), static_cast<std::uint8_t>(value >> 24)};
  appendBytes(bytes, sizeof bytes);
}

void KXCDataWriter::writeSingle(float value) { writeUInt32(std::bit_cast<std::uint32_t>(value)); }
