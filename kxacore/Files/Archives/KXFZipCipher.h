// Traditional PKWARE zip encryption ("ZipCrypto"): the short published stream
// cipher of three 32-bit keys stepped by CRC-32 per byte, with the 12-byte
// header that precedes each encrypted entry's data. Weak by today's measure;
// kept because every zip tool reads it. Used by the archiver and the
// unarchiver because the system minizip has its own copy compiled out.
//
// A value type: one cipher per entry, one thread at a time.
#pragma once

#include <array>
#include <cstdint>
#include <span>
#include <string_view>

inline constexpr std::size_t kKXFZipCipherHeaderSize = 12;

class KXFZipCipher {
 public:
  // Keys initialised from `password` (its bytes as given; an empty password
  // is a valid, if pointless, key).
  explicit KXFZipCipher(std::string_view password) noexcept;

  void encrypt(std::span<std::uint8_t> bytes) noexcept;
  void decrypt(std::span<std::uint8_t> bytes) noexcept;

  // A 12-byte encryption header, already encrypted: 11 random bytes then
  // `checkByte` (the CRC's high byte, or the time's when bit 3 is used).
  [[nodiscard]] std::array<std::uint8_t, kKXFZipCipherHeaderSize> makeHeader(std::uint8_t checkByte);

 private:
  [[nodiscard]] std::uint8_t keystreamByte() const noexcept;
  void updateKeys(std::uint8_t plain) noexcept;

  std::uint32_t key0_ = 0x12345678;
  std::uint32_t key1_ = 0x23456789;
  std::uint32_t key2_ = 0x34567890;
};
