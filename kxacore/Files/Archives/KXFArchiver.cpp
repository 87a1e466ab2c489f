#include "kxacore/Files/Archives/KXFArchiver.h"

#include <sys/stat.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <ctime>
#include <vector>

#include "kxacore/Platform/KXALocalizedString.h"
#include "kxacore/Platform/KXAStringFormat.h"

namespace {

constexpr std::size_t kChunkSize = 4096;
constexpr std::uint64_t kZip64Threshold = 0xFFFFFFFFull;
constexpr unsigned long kUTF8NameFlag = 0x800;

struct FileCloser {
  void operator()(std::FILE* file) const noexcept { std::fclose(file); }
};
using UniqueFile = std::unique_ptr<std::FILE, FileCloser>;

// Counts handled bytes and decides when the delegate hears of them:
// at most about 100 times per file, at most once per chunk.
class ProgressCounter {
 public:
  explicit ProgressCounter(std::uint64_t size) noexcept : step_(size < 100 ? 1 : size / 100) {}
  // True when the caller should stop.
  bool add(std::size_t bytes, KXFArchiver& archiver, KXFArchiverDelegate* delegate, const std::string& name) {
    handled_ += bytes;
    if (handled_ / step_ <= reports_ || delegate == nullptr) return false;
    bool stop = false;
    delegate->archiverArchivingFileWithName(archiver, name, handled_, stop);
    if (stop) return true;
    ++reports_;
    return false;
  }
  std::uint64_t handled() const noexcept { return handled_; }

 private:
  std::uint64_t step_;
  std::uint64_t handled_ = 0;
  std::uint64_t reports_ = 0;
};

// -1 when the source cannot be read through.
std::optional<std::uint32_t> crcOfFile(std::FILE* source) {
  std::array<unsigned char, kChunkSize> buffer{};
  uLong crc = crc32(0, nullptr, 0);
  while (const std::size_t n = std::fread(buffer.data(), 1, buffer.size(), source)) {
    crc = crc32(crc, buffer.data(), static_cast<uInt>(n));
  }
  if (std::ferror(source) != 0) return std::nullopt;
  std::rewind(source);
  return static_cast<std::uint32_t>(crc);
}

zip_fileinfo entryInfoFor(const struct stat* status) {
  zip_fileinfo info{};
  if (status == nullptr) return info;
  std::tm local{};
  if (localtime_r(&status->st_mtime, &local) == nullptr) return info;
  info.tmz_date.tm_sec = static_cast<uInt>(local.tm_sec);
  info.tmz_date.tm_min = static_cast<uInt>(local.tm_min);
  info.tmz_date.tm_hour = static_cast<uInt>(local.tm_hour);
  info.tmz_date.tm_mday = static_cast<uInt>(local.tm_mday);
  info.tmz_date.tm_mon = static_cast<uInt>(local.tm_mon);
  info.tmz_date.tm_year = static_cast<uInt>(local.tm_year + 1900);
  return info;
}

}  // namespace

void KXFArchiverDelegate::archiverDidRaiseError(KXFArchiver&, std::int64_t, const std::string&) {}
void KXFArchiverDelegate::archiverArchivingFileWithName(KXFArchiver&, const std::string&, std::uint64_t, bool&) {}

KXFArchiver::KXFArchiver(KXFUniqueZipFile file, std::optional<std::string> password) noexcept
    : zipFile_(std::move(file)), password_(std::move(password)) {}

KXFArchiver::~KXFArchiver() { close(); }

std::unique_ptr<KXFArchiver> KXFArchiver::forPath(const std::filesystem::path& path,
                                                  std::optional<std::string> password, bool appendExisting) {
  std::error_code error;
  const bool append = appendExisting && std::filesystem::exists(path, error);
  KXFUniqueZipFile file(zipOpen64(path.c_str(), append ? APPEND_STATUS_ADDINZIP : APPEND_STATUS_CREATE));
  if (!file) return nullptr;
  return std::unique_ptr<KXFArchiver>(new KXFArchiver(std::move(file), std::move(password)));
}

bool KXFArchiver::close() {
  if (!zipFile_) return false;
  return zipClose(zipFile_.release(), nullptr) == ZIP_OK;
}

void KXFArchiver::reportCannotAdd(std::int64_t code, std::string_view entryName) {
  if (delegate_ == nullptr) return;
  const std::string name(entryName);
  delegate_->archiverDidRaiseError(
      *this, code, KXAStringWithFormat(KXALocalizedString("KXFArchiveCannotAddError"), name));
}

bool KXFArchiver::addFileToArchiveAtPath(const std::filesystem::path& sourcePath, std::string_view entryName) {
  return addFileToArchiveAtPath(sourcePath, entryName, sourcePath.filename().string());
}

bool KXFArchiver::addFileToArchiveAtPath(const std::filesystem::path& sourcePath, std::string_view entryName,
                                         std::string_view userFileName) {
  if (!zipFile_) return false;
  struct stat status {};
  const bool haveStatus = ::stat(sourcePath.c_str(), &status) == 0;
  const std::uint64_t size = haveStatus ? static_cast<std::uint64_t>(status.st_size) : 0;
  const zip_fileinfo info = entryInfoFor(haveStatus ? &status : nullptr);
  const int zip64 = size >= kZip64Threshold ? 1 : 0;
  const std::string name(entryName);
  // Bit 11 tells readers the name is UTF-8; without it they assume code page 437.
  const bool asciiName = std::all_of(name.begin(), name.end(), [](char c) { return (c & 0x80) == 0; });
  const unsigned long flags = asciiName ? 0 : kUTF8NameFlag;

  UniqueFile source(std::fopen(sourcePath.c_str(), "rb"));
  const bool encrypt = password_ && !password_->empty();
  if (encrypt) {
    const auto crc = source ? crcOfFile(source.get()) : std::nullopt;
    if (!crc) {
      reportCannotAdd(-1, entryName);
      return false;
    }
    const int opened = zipOpenNewFileInZip4_64(zipFile_.get(), name.c_str(), &info, nullptr, 0, nullptr, 0, nullptr,
                                               Z_DEFLATED, level_, 1, -MAX_WBITS, 8, Z_DEFAULT_STRATEGY, nullptr, 0,
                                               0, kKXFZipEncryptedFlag | flags, zip64);
    if (opened != ZIP_OK) {
      reportCannotAdd(opened, entryName);
      return false;
    }
    return writeEncryptedEntry(source.get(), size, *crc, entryName, userFileName);
  }
  // An unreadable source is refused before its entry exists, so no empty entry is left behind.
  if (!source) {
    reportCannotAdd(errno, entryName);
    return false;
  }
  const int opened = zipOpenNewFileInZip4_64(zipFile_.get(), name.c_str(), &info, nullptr, 0, nullptr, 0, nullptr,
                                             Z_DEFLATED, level_, 0, -MAX_WBITS, 8, Z_DEFAULT_STRATEGY, nullptr, 0, 0,
                                             flags, zip64);
  if (opened != ZIP_OK) {
    reportCannotAdd(opened, entryName);
    return false;
  }
  return writePlainEntry(source.get(), size, entryName, userFileName);
}

bool KXFArchiver::writePlainEntry(std::FILE* source, std::uint64_t size, std::string_view entryName,
                                  std::string_view userFileName) {
  const std::string displayName(userFileName);
  ProgressCounter progress(size);
  std::array<unsigned char, kChunkSize> buffer{};
  while (const std::size_t n = std::fread(buffer.data(), 1, buffer.size(), source)) {
    const int written = zipWriteInFileInZip(zipFile_.get(), buffer.data(), static_cast<unsigned>(n));
    if (written != ZIP_OK) {
      reportCannotAdd(written, entryName);
      return false;
    }
    if (progress.add(n, *this, delegate_, displayName)) break;
  }
  if (std::ferror(source) != 0) {
    reportCannotAdd(EIO, entryName);
    return false;
  }
  const int closed = zipCloseFileInZip(zipFile_.get());
  if (closed != ZIP_OK) {
    reportCannotAdd(closed, entryName);
    return false;
  }
  return true;
}

bool KXFArchiver::writeEncryptedEntry(std::FILE* source, std::uint64_t size, std::uint32_t crc,
                                      std::string_view entryName, std::string_view userFileName) {
  KXFZipCipher cipher(*password_);
  auto header = cipher.makeHeader(static_cast<std::uint8_t>(crc >> 24));
  int status = zipWriteInFileInZip(zipFile_.get(), header.data(), static_cast<unsigned>(header.size()));
  if (status != ZIP_OK) {
    reportCannotAdd(status, entryName);
    return false;
  }
  z_stream deflater{};
  if (deflateInit2(&deflater, level_, Z_DEFLATED, -MAX_WBITS, 8, Z_DEFAULT_STRATEGY) != Z_OK) {
    reportCannotAdd(Z_MEM_ERROR, entryName);
    return false;
  }
  const std::unique_ptr<z_stream, int (*)(z_stream*)> deflaterGuard(&deflater, deflateEnd);
  std::array<unsigned char, kChunkSize> input{};
  std::array<unsigned char, kChunkSize * 4> output{};
  // Deflates what is in `deflater`, encrypts and writes it; false on a write failure.
  const auto pump = [&](int flush) {
    do {
      deflater.next_out = output.data();
      deflater.avail_out = static_cast<uInt>(output.size());
      deflate(&deflater, flush);
      const std::size_t produced = output.size() - deflater.avail_out;
      if (produced == 0) continue;
      cipher.encrypt(std::span(output).first(produced));
      status = zipWriteInFileInZip(zipFile_.get(), output.data(), static_cast<unsigned>(produced));
      if (status != ZIP_OK) return false;
    } while (deflater.avail_out == 0);
    return true;
  };

  const std::string displayName(userFileName);
  ProgressCounter progress(size);
  uLong writtenCrc = crc32(0, nullptr, 0);
  while (const std::size_t n = std::fread(input.data(), 1, input.size(), source)) {
    writtenCrc = crc32(writtenCrc, input.data(), static_cast<uInt>(n));
    deflater.next_in = input.data();
    deflater.avail_in = static_cast<uInt>(n);
    if (!pump(Z_NO_FLUSH)) {
      reportCannotAdd(status, entryName);
      return false;
    }
    if (progress.add(n, *this, delegate_, displayName)) break;
  }
  if (std::ferror(source) != 0) {
    reportCannotAdd(EIO, entryName);
    return false;
  }
  if (!pump(Z_FINISH)) {
    reportCannotAdd(status, entryName);
    return false;
  }
  status = zipCloseFileInZipRaw64(zipFile_.get(), progress.handled(), writtenCrc);
  if (status != ZIP_OK) {
    reportCannotAdd(status, entryName);
    return false;
  }
  return true;
}
