// KXCDataReader: walks a byte buffer from a read position and decodes the
// values of the compact binary stream (see KXCDataWriter.h for the format).
//
//   KXCDataReader reader(bytes, size);
//   const std::int32_t count = reader.get7BitEncodedInt();
//   const std::optional<std::string> name = reader.getString();
//
// Reading past the end throws std::out_of_range (naming the offset) and
// leaves the read position where it was before the call, for every get
// operation, including a 7-bit int or a string prefix cut short by the end.
// seekToLocation and passBytesLength never fail and may move the position
// past the end; the next read then throws.
//
// Hostile input is safe: a string's length prefix is checked against the
// bytes that remain before anything is allocated.
//
// Ownership: the pointer constructor wraps the caller's memory without
// copying; the caller keeps it alive for the reader's lifetime. The other
// constructors own or share their buffer.
// Thread safety: one thread at a time (every read moves the position).
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

class KXCDataReader {
 public:
  using Buffer = std::vector<std::uint8_t>;

  // Reads `length` bytes from `bytes + offset`. The bytes before the offset
  // stay reachable through seekToLocation (the wrapped span is offset +
  // length bytes from `bytes`). Not copied, not owned.
  KXCDataReader(const void* bytes, std::size_t length, std::size_t offset = 0);
  // Owns the bytes; reading starts at 0.
  explicit KXCDataReader(Buffer data);
  // Shares the bytes; a null `data` reads as empty.
  explicit KXCDataReader(std::shared_ptr<const Buffer> data);

  KXCDataReader(const KXCDataReader&) = delete;
  KXCDataReader& operator=(const KXCDataReader&) = delete;

  // Sets the read position, unchecked.
  void seekToLocation(std::uint64_t location) { location_ = location; }
  // The read position: a byte index from the start of the wrapped span.
  [[nodiscard]] std::uint64_t location() const { return location_; }
  // Size of the wrapped span (offset + length for the pointer constructor).
  [[nodiscard]] std::size_t size() const { return size_; }
  // Byte count of the last step of the most recent successful read: the
  // width of a fixed-size value, 1 after a 7-bit int, the text's bytes
  // after a string.
  [[nodiscard]] std::size_t lastReadLength() const { return lastReadLength_; }

  // Copies `count` bytes to `destination` and advances. Throws
  // std::out_of_range, position unchanged, when fewer remain.
  void getBytes(void* destination, std::size_t count);
  // Advances without reading or checking (saturates instead of wrapping).
  void passBytesLength(std::uint64_t count);

  std::uint8_t getByte();
  std::uint16_t getUInt16();
  std::int16_t getInt16();  // sign-extended
  std::uint32_t getUInt32();
  std::int32_t getInt32();
  float getSingle();

  // The 32-bit value as signed: 0xFFFFFFFF reads as -1, which is also the
  // mark of a malformed value (five bytes all with 0x80 set, which stay
  // consumed). Of a fifth byte only the low 4 bits count.
  std::int32_t get7BitEncodedInt();
  // "" for a zero prefix; nullopt for a negative prefix (a malformed one, or
  // 2^31 and above: nothing more is read) and for bytes that are not UTF-8
  // (those bytes are consumed). Throws std::out_of_range when the prefix or
  // the bytes it announces run past the end; the position is then back
  // before the prefix.
  std::optional<std::string> getString();

 private:
  // Throws std::out_of_range unless `count` bytes remain at the position.
  void require(std::size_t count) const;

  std::shared_ptr<const Buffer> owned_;
  const std::uint8_t* bytes_ = nullptr;
  std::size_t size_ = 0;
  std::uint64_t location_ = 0;
  std::size_t lastReadLength_ = 0;
};
