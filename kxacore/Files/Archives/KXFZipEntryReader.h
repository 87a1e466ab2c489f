// Internal to the archive classes: owning handles of minizip's writer and
// reader, and the reading of one entry. Encrypted entries are read raw and
// decrypted and inflated here, because the system minizip has its
// decryption compiled out; every entry's CRC is checked here too, since
// minizip skips the check when a header's size lies.
#pragma once

#include <minizip/unzip.h>
#include <minizip/zip.h>
#include <zlib.h>

#include <array>
#include <cstdint>
#include <ctime>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>

#include "kxacore/Files/Archives/KXFZipCipher.h"

struct KXFZipFileCloser {
  void operator()(void* file) const noexcept { zipClose(file, nullptr); }
};
using KXFUniqueZipFile = std::unique_ptr<void, KXFZipFileCloser>;

struct KXFUnzFileCloser {
  void operator()(void* file) const noexcept { unzClose(file); }
};
using KXFUniqueUnzFile = std::unique_ptr<void, KXFUnzFileCloser>;

inline constexpr unsigned long kKXFZipEncryptedFlag = 1;
inline constexpr unsigned long kKXFZipDataDescriptorFlag = 8;

// True for stored and deflate, the only methods the reader decodes.
[[nodiscard]] inline bool KXFIsSupportedZipMethod(unsigned long method) noexcept {
  return method == 0 || method == Z_DEFLATED;
}

// True when the entry's Unix mode (high half of the external attributes)
// says symbolic link.
[[nodiscard]] bool KXFIsSymbolicLinkEntry(const unz_file_info64& info) noexcept;

// The entry's stored date as local time, or none when the fields are invalid.
[[nodiscard]] std::optional<std::time_t> KXFModificationTimeOf(const unz_file_info64& info) noexcept;

// Reads the current entry of an open reader. Not copyable; closes the entry
// on destruction if still open.
class KXFZipEntryReader {
 public:
  explicit KXFZipEntryReader(unzFile file) noexcept : file_(file) {}
  KXFZipEntryReader(const KXFZipEntryReader&) = delete;
  KXFZipEntryReader& operator=(const KXFZipEntryReader&) = delete;
  ~KXFZipEntryReader();

  // Opens the current entry described by `info`. With a non-empty password
  // and the encrypted flag, decrypts itself (raw read); otherwise minizip
  // decodes. Returns minizip's open code (0, -103 for a bad local header ...).
  [[nodiscard]] int open(const unz_file_info64& info, std::string_view password);
  // Opens without the entry's information: plain minizip decoding, no CRC check.
  [[nodiscard]] int openPlain();
  // Up to `buffer.size()` bytes; 0 at the end; negative on failure
  // (Z_DATA_ERROR, -3, for a damaged or undecryptable stream).
  [[nodiscard]] int read(std::span<std::uint8_t> buffer);
  // Closes the entry. UNZ_CRCERROR when the whole entry was read and its
  // bytes do not match the stored CRC; otherwise minizip's close code.
  int close();
  // True when the encryption header's check byte did not match the password.
  [[nodiscard]] bool checkByteMismatch() const noexcept { return checkByteMismatch_; }

 private:
  [[nodiscard]] int readDecrypted(std::span<std::uint8_t> buffer);
  [[nodiscard]] int readDecryptedDeflate(std::span<std::uint8_t> buffer);

  unzFile file_;
  bool open_ = false;
  bool raw_ = false;
  bool checkCrc_ = false;
  bool reachedEnd_ = false;
  bool checkByteMismatch_ = false;
  int pendingError_ = 0;
  unsigned long method_ = 0;
  std::uint32_t expectedCrc_ = 0;
  std::uint32_t crc_ = 0;
  std::optional<KXFZipCipher> cipher_;
  z_stream inflater_{};
  bool inflaterReady_ = false;
  bool streamEnded_ = false;
  std::array<std::uint8_t, 4096> input_{};
};
