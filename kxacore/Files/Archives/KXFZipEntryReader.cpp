#include "kxacore/Files/Archives/KXFZipEntryReader.h"

#include <sys/stat.h>

bool KXFIsSymbolicLinkEntry(const unz_file_info64& info) noexcept {
  return ((info.external_fa >> 16) & S_IFMT) == S_IFLNK;
}

std::optional<std::time_t> KXFModificationTimeOf(const unz_file_info64& info) noexcept {
  std::tm parts{};
  parts.tm_sec = static_cast<int>(info.tmu_date.tm_sec);
  parts.tm_min = static_cast<int>(info.tmu_date.tm_min);
  parts.tm_hour = static_cast<int>(info.tmu_date.tm_hour);
  parts.tm_mday = static_cast<int>(info.tmu_date.tm_mday);
  parts.tm_mon = static_cast<int>(info.tmu_date.tm_mon);
  parts.tm_year = static_cast<int>(info.tmu_date.tm_year) - 1900;
  parts.tm_isdst = -1;
  const std::time_t time = std::mktime(&parts);
  if (time == static_cast<std::time_t>(-1)) return std::nullopt;
  return time;
}

KXFZipEntryReader::~KXFZipEntryReader() { close(); }

int KXFZipEntryReader::openPlain() {
  const int result = unzOpenCurrentFile(file_);
  open_ = true;
  return result;
}

int KXFZipEntryReader::open(const unz_file_info64& info, std::string_view password) {
  method_ = info.compression_method;
  expectedCrc_ = static_cast<std::uint32_t>(info.crc);
  checkCrc_ = true;
  if (password.empty() || (info.flag & kKXFZipEncryptedFlag) == 0) return openPlain();

  int method = 0;
  int level = 0;
  const int result = unzOpenCurrentFile3(file_, &method, &level, 1, nullptr);
  open_ = true;
  raw_ = true;
  if (result != UNZ_OK) return result;
  cipher_.emplace(password);
  std::array<std::uint8_t, kKXFZipCipherHeaderSize> header{};
  std::size_t have = 0;
  while (have < header.size()) {
    const int n = unzReadCurrentFile(file_, header.data() + have, static_cast<unsigned>(header.size() - have));
    if (n <= 0) {
      pendingError_ = n < 0 ? n : Z_DATA_ERROR;
      return result;
    }
    have += static_cast<std::size_t>(n);
  }
  cipher_->decrypt(header);
  const std::uint8_t expected = (info.flag & kKXFZipDataDescriptorFlag) != 0
                                    ? static_cast<std::uint8_t>(info.dosDate >> 8)
                                    : static_cast<std::uint8_t>(info.crc >> 24);
  checkByteMismatch_ = header.back() != expected;
  if (method_ == Z_DEFLATED) {
    if (inflateInit2(&inflater_, -MAX_WBITS) != Z_OK) {
      pendingError_ = Z_MEM_ERROR;
      return result;
    }
    inflaterReady_ = true;
  }
  return result;
}

int KXFZipEntryReader::read(std::span<std::uint8_t> buffer) {
  if (!open_) return UNZ_PARAMERROR;
  if (pendingError_ != 0) return pendingError_;
  const int n = raw_ ? readDecrypted(buffer)
                     : unzReadCurrentFile(file_, buffer.data(), static_cast<unsigned>(buffer.size()));
  if (n > 0) {
    crc_ = static_cast<std::uint32_t>(crc32(crc_, buffer.data(), static_cast<uInt>(n)));
  } else if (n == 0) {
    reachedEnd_ = true;
  }
  return n;
}

int KXFZipEntryReader::readDecrypted(std::span<std::uint8_t> buffer) {
  if (method_ == Z_DEFLATED) return readDecryptedDeflate(buffer);
  const int n = unzReadCurrentFile(file_, buffer.data(), static_cast<unsigned>(buffer.size()));
  if (n > 0) cipher_->decrypt(buffer.first(static_cast<std::size_t>(n)));
  return n;
}

int KXFZipEntryReader::readDecryptedDeflate(std::span<std::uint8_t> buffer) {
  inflater_.next_out = buffer.data();
  inflater_.avail_out = static_cast<uInt>(buffer.size());
  while (inflater_.avail_out == buffer.size() && !streamEnded_) {
    if (inflater_.avail_in == 0) {
      const int n = unzReadCurrentFile(file_, input_.data(), static_cast<unsigned>(input_.size()));
      if (n < 0) return n;
      if (n == 0) return Z_DATA_ERROR;  // the data ended inside the stream
      cipher_->decrypt(std::span(input_).first(static_cast<std::size_t>(n)));
      inflater_.next_in = input_.data();
      inflater_.avail_in = static_cast<uInt>(n);
    }
    const int status = inflate(&inflater_, Z_NO_FLUSH);
    if (status == Z_STREAM_END) {
      streamEnded_ = true;
    } else if (status != Z_OK && status != Z_BUF_ERROR) {
      return Z_DATA_ERROR;
    }
  }
  return static_cast<int>(buffer.size() - inflater_.avail_out);
}

int KXFZipEntryReader::close() {
  if (!open_) return UNZ_OK;
  open_ = false;
  if (inflaterReady_) {
    inflateEnd(&inflater_);
    inflaterReady_ = false;
  }
  const int result = unzCloseCurrentFile(file_);
  if (checkCrc_ && reachedEnd_ && crc_ != expectedCrc_) return UNZ_CRCERROR;
  return result;
}
