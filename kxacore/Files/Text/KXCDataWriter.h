// KXCDataWriter: appends values to a byte buffer in the compact binary stream
// that KXCDataReader decodes.
//
// Wire format (little-endian, no alignment, no tags, no headers):
//   byte       1 byte, the low 8 bits of the argument
//   UInt32     4 bytes, two's complement
//   Single     4 bytes, the IEEE 754 bit pattern written as a UInt32
//   7-bit int  1 to 5 bytes: an unsigned 32-bit value, 7 bits per byte, least
//              significant group first; 0x80 set on every byte but the last
//   string     a 7-bit int n (the UTF-8 byte count), then the n bytes
//
//   KXCDataWriter writer;
//   writer.write7BitEncodedInt(300);   // AC 02
//   writer.writeString("\xC3\xA9");    // 02 C3 A9
//
// The writer deliberately has no 16-bit and no signed 32-bit writers although
// the reader reads both: peers of the format only ever write these widths.
//
// Ownership: the buffer is shared with whoever handed it in (or created here)
// and is the very buffer appended to, never a copy.
// Thread safety: one thread at a time; the shared buffer is not guarded.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string_view>
#include <vector>

class KXCDataWriter {
 public:
  using Buffer = std::vector<std::uint8_t>;

  // Appends to a new empty buffer.
  KXCDataWriter();
  // Appends to `data`, shared with the caller; a null `data` gets a new buffer.
  explicit KXCDataWriter(std::shared_ptr<Buffer> data);

  KXCDataWriter(const KXCDataWriter&) = delete;
  KXCDataWriter& operator=(const KXCDataWriter&) = delete;

  // Raw bytes, as they are. A null `bytes` with a zero `length` appends nothing.
  void appendBytes(const void* bytes, std::size_t length);
  // The low 8 bits of `value`.
  void writeByte(std::int64_t value);
  // 1 to 5 bytes; a negative int32 passed here is its unsigned bit pattern
  // and takes 5 bytes (-1 is FF FF FF FF 0F).
  void write7BitEncodedInt(std::uint32_t value);
  // The byte count as a 7-bit int, then the UTF-8 bytes. nullopt and the
  // empty string write the single byte 00. The text is cut at its first NUL
  // byte (kept for compatibility with existing streams). Text that is not
  // valid UTF-8 has no UTF-8 form to write and is written as 00 as well.
  void writeString(std::optional<std::string_view> text);
  void writeUInt32(std::uint32_t value);
  void writeSingle(float value);

  // The buffer being appended to.
  [[nodiscard]] const Buffer& data() const { return *data_; }
  // The same buffer, for callers that want to keep it beyond the writer.
  [[nodiscard]] const std::shared_ptr<Buffer>& sharedData() const { return data_; }

 private:
  std::shared_ptr<Buffer> data_;
};
