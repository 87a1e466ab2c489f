#include "kxacore/Files/Archives/KXFZipCipher.h"

#include <openssl/rand.h>
#include <zlib.h>

#include <random>

namespace {

const z_crc_t* crcTable() noexcept {
  static const z_crc_t* const table = get_crc_table();
  return table;
}

inline std::uint32_t crcStep(std::uint32_t crc, std::uint8_t byte) noexcept {
  return static_cast<std::uint32_t>(crcTable()[(crc ^ byte) & 0xFFu]) ^ (crc >> 8);
}

}  // namespace

KXFZipCipher::KXFZipCipher(std::string_view password) noexcept {
  for (const char c : password) updateKeys(static_cast<std::uint8_t>(c));
}

std::uint8_t KXFZipCipher::keystreamByte() const noexcept {
  const std::uint32_t temp = (key2_ | 2u) & 0xFFFFu;
  return static_cast<std::uint8_t>((temp * (temp ^ 1u)) >> 8);
}

void KXFZipCipher::updateKeys(std::uint8_t plain) noexcept {
  key0_ = crcStep(key0_, plain);
  key1_ = (key1_ + (key0_ & 0xFFu)) * 134775813u + 1u;
  key2_ = crcStep(key2_, static_cast<std::uint8_t>(key1_ >> 24));
}

void KXFZipCipher::encrypt(std::span<std::uint8_t> bytes) noexcept {
  for (std::uint8_t& byte : bytes) {
    const std::uint8_t plain = byte;
    byte = static_cast<std::uint8_t>(plain ^ keystreamByte());
    updateKeys(plain);
  }
}

void KXFZipCipher::decrypt(std::span<std::uint8_t> bytes) noexcept {
  for (std::uint8_t& byte : bytes) {
    byte = static_cast<std::uint8_t>(byte ^ keystreamByte());
    updateKeys(byte);
  }
}

std::array<std::uint8_t, kKXFZipCipherHeaderSize> KXFZipCipher::makeHeader(std::uint8_t checkByte) {
  std::array<std::uint8_t, kKXFZipCipherHeaderSize> header{};
  // The random bytes hide equal plaintexts under one password; a weak source
  // only weakens a cipher that is weak anyway, so fall back rather than fail.
  if (RAND_bytes(header.data(), static_cast<int>(header.size() - 1)) != 1) {
    std::random_device device;
    for (std::size_t i = 0; i + 1 < header.size(); ++i) header[i] = static_cast<std::uint8_t>(device());
  }
  header.back() = checkByte;
  encrypt(header);
  return header;
}
