#include "kxacore/Files/Archives/KXFUnarchiver.h"

#include <algorithm>
#include <array>

#include "kxacore/Extensions/KXAStringExtensions.h"
#include "kxacore/Files/Archives/KXFZipSafeFiles.h"
#include "kxacore/Platform/KXALocalizedString.h"
#include "kxacore/Platform/KXAStringFormat.h"

namespace {

constexpr std::size_t kChunkSize = 4096;
constexpr std::size_t kInitialReserve = std::size_t{1} << 20;

// Names that are not UTF-8 are taken as Latin-1, so every byte maps to a character.
std::string decodeName(std::string_view stored) {
  if (kxa_isValidUTF8(stored)) return std::string(stored);
  std::string decoded;
  decoded.reserve(stored.size() * 2);
  for (const char c : stored) {
    const auto byte = static_cast<unsigned char>(c);
    if (byte < 0x80) {
      decoded.push_back(c);
    } else {
      decoded.push_back(static_cast<char>(0xC0 | (byte >> 6)));
      decoded.push_back(static_cast<char>(0x80 | (byte & 0x3F)));
    }
  }
  return decoded;
}

// Reads the current entry's information and stored name.
int readCurrentInfo(unzFile file, unz_file_info64& info, std::string& storedName) {
  int result = unzGetCurrentFileInfo64(file, &info, nullptr, 0, nullptr, 0, nullptr, 0);
  if (result != UNZ_OK) return result;
  std::vector<char> buffer(info.size_filename + 1, '\0');
  result = unzGetCurrentFileInfo64(file, &info, buffer.data(), static_cast<uLong>(buffer.size()), nullptr, 0,
                                   nullptr, 0);
  if (result != UNZ_OK) return result;
  storedName.assign(buffer.data(), info.size_filename);
  return UNZ_OK;
}

std::string formatWithName(std::string_view key, const std::string& name) {
  return KXAStringWithFormat(KXALocalizedString(key), name);
}

}  // namespace

struct KXFUnarchiver::Entry {
  unz_file_info64 info{};
  std::string name;
  bool isDirectory = false;
  int openResult = UNZ_OK;
  KXFZipEntryReader* reader = nullptr;
};

void KXFUnarchiverDelegate::unarchiverDidRaiseError(KXFUnarchiver&, std::int64_t, const std::string&) {}
std::string KXFUnarchiverDelegate::correctedNameForUnarchiverAndFileName(KXFUnarchiver&, const std::string& fileName) {
  return fileName;
}
void KXFUnarchiverDelegate::unarchiverWillUnarchiveFileTo(KXFUnarchiver&, const std::string&, bool, bool&, bool&) {}
void KXFUnarchiverDelegate::unarchiverUnarchivingFileTo(KXFUnarchiver&, const std::string&, std::uint64_t, bool&) {}
void KXFUnarchiverDelegate::unarchiverDidUnarchiveFileTo(KXFUnarchiver&, const std::string&, bool&) {}

KXFUnarchiver::KXFUnarchiver(KXFUniqueUnzFile file, std::optional<std::string> password) noexcept
    : unzFile_(std::move(file)), password_(std::move(password)) {
  unz_global_info64 global{};
  if (unzGetGlobalInfo64(unzFile_.get(), &global) == UNZ_OK) totalFiles_ = global.number_entry;
}

KXFUnarchiver::~KXFUnarchiver() { close(); }

std::unique_ptr<KXFUnarchiver> KXFUnarchiver::withPath(const std::filesystem::path& path,
                                                       std::optional<std::string> password) {
  KXFUniqueUnzFile file(unzOpen64(path.c_str()));
  if (!file) return nullptr;
  return std::unique_ptr<KXFUnarchiver>(new KXFUnarchiver(std::move(file), std::move(password)));
}

bool KXFUnarchiver::close() {
  if (!unzFile_) return false;
  return unzClose(unzFile_.release()) == UNZ_OK;
}

std::string_view KXFUnarchiver::password() const noexcept {
  return password_ ? std::string_view(*password_) : std::string_view();
}

void KXFUnarchiver::report(std::int64_t code, const std::string& description) {
  if (delegate_ != nullptr) delegate_->unarchiverDidRaiseError(*this, code, description);
}

void KXFUnarchiver::reportCannotOpen(std::int64_t code) {
  report(code, KXALocalizedString("KXFArchiveCannotOpenFileError"));
}

void KXFUnarchiver::reportReadError(int readCode, const Entry& entry) {
  if (readCode == Z_DATA_ERROR && (entry.info.flag & kKXFZipEncryptedFlag) != 0) {
    reportCannotOpen(kKXFArchiveErrorWrongPassword);
  } else if (entry.openResult != UNZ_BADZIPFILE) {
    reportCannotOpen(0);
  }
}

void KXFUnarchiver::reportCorruption(std::int64_t code, const std::string& name) {
  switch (code) {
    case kKXFArchiveErrorUnsafeName:
      report(code, formatWithName("KXFArchiveUnsafeNameError", name));
      break;
    case kKXFArchiveErrorSymbolicLink:
      report(code, formatWithName("KXFArchiveSymbolicLinkError", name));
      break;
    case kKXFArchiveErrorUnsupportedMethod:
      report(code, formatWithName("KXFArchiveUnsupportedMethodError", name));
      break;
    case kKXFArchiveErrorEntryTooLarge:
      report(code, formatWithName("KXFArchiveEntryTooLargeError", name));
      break;
    default:
      report(code, formatWithName("KXFArchiveChecksumError", name));
      break;
  }
}

bool KXFUnarchiver::unarchiveFileTo(const std::filesystem::path& destination) {
  return walkEntries(Mode::kExtract, destination, nullptr);
}

bool KXFUnarchiver::enumerateFilesWithBlock(const EntryBlock& block) {
  return walkEntries(Mode::kEnumerate, {}, &block);
}

bool KXFUnarchiver::walkEntries(Mode mode, const std::filesystem::path& destination, const EntryBlock* block) {
  if (!unzFile_) return false;
  unzFile file = unzFile_.get();
  const int first = unzGoToFirstFile(file);
  if (first != UNZ_OK) {
    unzCloseCurrentFile(file);
    reportCannotOpen(first);
    return false;
  }
  bool stop = false;
  for (;;) {
    KXFZipEntryReader reader(file);
    Entry entry;
    entry.reader = &reader;
    std::string storedName;
    const int infoResult = readCurrentInfo(file, entry.info, storedName);
    entry.openResult = infoResult == UNZ_OK ? reader.open(entry.info, password()) : reader.openPlain();
    if (entry.openResult != UNZ_OK && entry.openResult != UNZ_BADZIPFILE) {
      reportCannotOpen(entry.openResult);
      return false;
    }
    if (infoResult != UNZ_OK) {
      reportCannotOpen(infoResult);
      return false;
    }
    entry.name = decodeName(storedName);
    entry.isDirectory = !storedName.empty() && (storedName.back() == '/' || storedName.back() == '\\');
    if (!entry.name.empty()) {
      bool skip = false;
      if (delegate_ != nullptr) {
        entry.name = delegate_->correctedNameForUnarchiverAndFileName(*this, entry.name);
        delegate_->unarchiverWillUnarchiveFileTo(*this, entry.name, entry.isDirectory, skip, stop);
      }
      if (!skip && !stop) {
        std::replace(entry.name.begin(), entry.name.end(), '\\', '/');
        if (mode == Mode::kExtract) {
          extractEntry(entry, destination, stop);
        } else if (!entry.isDirectory) {
          enumerateEntry(entry, *block, stop);
        }
      }
    }
    reader.close();
    if (!stop && delegate_ != nullptr) {
      delegate_->unarchiverDidUnarchiveFileTo(*this, entry.name, stop);
      if (entry.openResult == UNZ_BADZIPFILE) stop = false;
    }
    if (stop) return true;
    if (unzGoToNextFile(file) != UNZ_OK) return true;
  }
}

void KXFUnarchiver::extractEntry(Entry& entry, const std::filesystem::path& destination, bool& stop) {
  if (!KXFIsSafeEntryName(entry.name)) {
    reportCorruption(kKXFArchiveErrorUnsafeName, entry.name);
    return;
  }
  if (entry.isDirectory) {
    static_cast<void>(KXFCreateFoldersBelow(destination, entry.name));
    return;
  }
  if (KXFIsSymbolicLinkEntry(entry.info)) {
    reportCorruption(kKXFArchiveErrorSymbolicLink, entry.name);
    return;
  }
  if (!KXFIsSupportedZipMethod(entry.info.compression_method)) {
    reportCorruption(kKXFArchiveErrorUnsupportedMethod, entry.name);
    return;
  }
  KXFSafeTargetFile target;
  if (const int error = target.open(destination, entry.name, true)) {
    reportCannotOpen(error);
    stop = true;
    return;
  }
  std::array<std::uint8_t, kChunkSize> buffer;
  std::uint64_t handled = 0;
  bool stopped = false;
  for (;;) {
    const int n = entry.reader->read(buffer);
    if (n < 0) {
      reportReadError(n, entry);
      return;  // the target's destructor deletes the partial file
    }
    if (n == 0) break;
    if (const int error = target.write(std::span(buffer).first(static_cast<std::size_t>(n)))) {
      reportCannotOpen(error);
      return;
    }
    handled += static_cast<std::uint64_t>(n);
    if (delegate_ != nullptr) delegate_->unarchiverUnarchivingFileTo(*this, entry.name, handled, stopped);
    if (stopped) {
      stop = true;
      break;
    }
  }
  if (entry.reader->close() == UNZ_CRCERROR && !stopped) {
    reportCorruption(UNZ_CRCERROR, entry.name);
    return;
  }
  if (const int error = target.commit(KXFModificationTimeOf(entry.info))) reportCannotOpen(error);
}

void KXFUnarchiver::enumerateEntry(Entry& entry, const EntryBlock& block, bool& stop) {
  if (!KXFIsSupportedZipMethod(entry.info.compression_method)) {
    reportCorruption(kKXFArchiveErrorUnsupportedMethod, entry.name);
    return;
  }
  std::vector<std::uint8_t> bytes;
  bytes.reserve(static_cast<std::size_t>(std::min<std::uint64_t>(
      {entry.info.uncompressed_size, maximumEntryBytes_, kInitialReserve})));
  std::array<std::uint8_t, kChunkSize> buffer;
  bool stopped = false;
  for (;;) {
    const int n = entry.reader->read(buffer);
    if (n < 0) {
      reportReadError(n, entry);
      return;
    }
    if (n == 0) break;
    if (bytes.size() + static_cast<std::size_t>(n) > maximumEntryBytes_) {
      reportCorruption(kKXFArchiveErrorEntryTooLarge, entry.name);
      return;
    }
    bytes.insert(bytes.end(), buffer.begin(), buffer.begin() + n);
    if (delegate_ != nullptr) delegate_->unarchiverUnarchivingFileTo(*this, entry.name, bytes.size(), stopped);
    if (stopped) {
      stop = true;
      break;
    }
  }
  if (entry.reader->close() == UNZ_CRCERROR && !stopped) {
    reportCorruption(UNZ_CRCERROR, entry.name);
    return;
  }
  block(entry.name, bytes, stop);
}

std::uint64_t KXFUnarchiver::totalNumberOfBytes() {
  if (!unzFile_) return 0;
  unzFile file = unzFile_.get();
  std::uint64_t total = 0;
  for (int result = unzGoToFirstFile(file); result == UNZ_OK; result = unzGoToNextFile(file)) {
    KXFZipEntryReader reader(file);
    if (reader.openPlain() != UNZ_OK) break;
    unz_file_info64 info{};
    if (unzGetCurrentFileInfo64(file, &info, nullptr, 0, nullptr, 0, nullptr, 0) != UNZ_OK) break;
    total += info.uncompressed_size;
  }
  return total;
}

std::optional<std::vector<KXFArchiveEntryInfo>> KXFUnarchiver::entries() {
  if (!unzFile_) return std::nullopt;
  unzFile file = unzFile_.get();
  std::vector<KXFArchiveEntryInfo> list;
  int result = unzGoToFirstFile(file);
  if (result == UNZ_END_OF_LIST_OF_FILE && totalFiles_ == 0) return list;
  for (; result == UNZ_OK; result = unzGoToNextFile(file)) {
    unz_file_info64 info{};
    std::string storedName;
    if (readCurrentInfo(file, info, storedName) != UNZ_OK) return std::nullopt;
    KXFArchiveEntryInfo entry;
    entry.name = decodeName(storedName);
    entry.directory = !storedName.empty() && (storedName.back() == '/' || storedName.back() == '\\');
    std::replace(entry.name.begin(), entry.name.end(), '\\', '/');
    entry.size = info.uncompressed_size;
    entry.compressedSize = info.compressed_size;
    entry.crc = static_cast<std::uint32_t>(info.crc);
    entry.encrypted = (info.flag & kKXFZipEncryptedFlag) != 0;
    entry.symbolicLink = KXFIsSymbolicLinkEntry(info);
    entry.method = info.compression_method;
    entry.modified = KXFModificationTimeOf(info);
    list.push_back(std::move(entry));
  }
  if (result != UNZ_END_OF_LIST_OF_FILE) return std::nullopt;
  return list;
}

bool KXFUnarchiver::extractFirstFileToFile(const std::filesystem::path& target) {
  if (!target.empty()) {
    std::error_code ignored;
    std::filesystem::remove(target, ignored);
  }
  if (!unzFile_) return false;
  unzFile file = unzFile_.get();
  const int first = unzGoToFirstFile(file);
  if (first != UNZ_OK) {
    reportCannotOpen(first);
    return false;
  }
  KXFZipEntryReader reader(file);
  Entry entry;
  entry.reader = &reader;
  std::string storedName;
  const int infoResult = readCurrentInfo(file, entry.info, storedName);
  entry.openResult = infoResult == UNZ_OK ? reader.open(entry.info, {}) : reader.openPlain();
  if (entry.openResult != UNZ_OK) {
    reportCannotOpen(entry.openResult);
    return false;
  }
  if (infoResult != UNZ_OK) {
    reportCannotOpen(infoResult);
    return false;
  }
  entry.name = decodeName(storedName);
  if (target.empty()) return true;
  if (!KXFIsSupportedZipMethod(entry.info.compression_method)) {
    reportCorruption(kKXFArchiveErrorUnsupportedMethod, entry.name);
    return true;
  }
  KXFSafeTargetFile output;
  if (const int error = output.open(target.parent_path(), target.filename().string(), false)) {
    reportCannotOpen(error);
    return true;
  }
  std::array<std::uint8_t, kChunkSize> buffer;
  std::uint64_t handled = 0;
  bool stopped = false;
  for (;;) {
    const int n = reader.read(buffer);
    if (n < 0) {
      reportCannotOpen(0);
      return true;
    }
    if (n == 0) break;
    if (const int error = output.write(std::span(buffer).first(static_cast<std::size_t>(n)))) {
      reportCannotOpen(error);
      return true;
    }
    handled += static_cast<std::uint64_t>(n);
    if (delegate_ != nullptr) delegate_->unarchiverUnarchivingFileTo(*this, entry.name, handled, stopped);
    if (stopped) break;
  }
  if (reader.close() == UNZ_CRCERROR && !stopped) {
    reportCorruption(UNZ_CRCERROR, entry.name);
    return true;
  }
  if (const int error = output.commit(KXFModificationTimeOf(entry.info))) reportCannotOpen(error);
  return true;
}

bool KXFUnarchiver::isProtectedArchiveAtPath(const std::filesystem::path& path) {
  const KXFUniqueUnzFile file(unzOpen64(path.c_str()));
  if (!file || unzGoToFirstFile(file.get()) != UNZ_OK) return false;
  unz_file_info64 info{};
  if (unzGetCurrentFileInfo64(file.get(), &info, nullptr, 0, nullptr, 0, nullptr, 0) != UNZ_OK) return false;
  return (info.flag & kKXFZipEncryptedFlag) != 0;
}

bool KXFUnarchiver::isCorrectPassword(std::string_view password, const std::filesystem::path& path) {
  const KXFUniqueUnzFile file(unzOpen64(path.c_str()));
  if (!file || unzGoToFirstFile(file.get()) != UNZ_OK) return false;
  unz_file_info64 info{};
  if (unzGetCurrentFileInfo64(file.get(), &info, nullptr, 0, nullptr, 0, nullptr, 0) != UNZ_OK) return false;
  KXFZipEntryReader reader(file.get());
  if (reader.open(info, password) != UNZ_OK || reader.checkByteMismatch()) return false;
  std::array<std::uint8_t, kChunkSize> buffer;
  return reader.read(buffer) > 0;
}
