#include "kxacore/Files/Archives/KXFLibZipArchiver.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>
#include <zip.h>

#include <array>
#include <cerrno>
#include <string>
#include <system_error>

#include "kxacore/Platform/KXALocalizedString.h"
#include "kxacore/Platform/KXAStringFormat.h"

namespace {

namespace fs = std::filesystem;

struct ZipSourceFree {
  void operator()(zip_source_t* source) const noexcept { zip_source_free(source); }
};
using ZipSourceHandle = std::unique_ptr<zip_source_t, ZipSourceFree>;

struct ZipFileClose {
  void operator()(zip_file_t* file) const noexcept { zip_fclose(file); }
};
using ZipFileHandle = std::unique_ptr<zip_file_t, ZipFileClose>;

struct ZipErrorGuard {
  zip_error_t error{};
  ZipErrorGuard() noexcept { zip_error_init(&error); }
  ZipErrorGuard(const ZipErrorGuard&) = delete;
  ZipErrorGuard& operator=(const ZipErrorGuard&) = delete;
  ~ZipErrorGuard() { zip_error_fini(&error); }
};

class FileDescriptor {
 public:
  explicit FileDescriptor(int fd) noexcept : fd_(fd) {}
  FileDescriptor(const FileDescriptor&) = delete;
  FileDescriptor& operator=(const FileDescriptor&) = delete;
  ~FileDescriptor() { closeNow(); }
  [[nodiscard]] int get() const noexcept { return fd_; }
  [[nodiscard]] bool valid() const noexcept { return fd_ >= 0; }
  // False when the final flush of the kernel reported an error.
  bool closeNow() noexcept {
    if (fd_ < 0) return true;
    const bool closed = ::close(fd_) == 0;
    fd_ = -1;
    return closed;
  }

 private:
  int fd_;
};

// Large enough to keep the system calls cheap, small enough for the stack.
constexpr std::size_t kCopyChunk = 64 * 1024;

void forwardProgress(zip_t* archive, double fraction, void* state) {
  static_cast<void>(archive);
  static_cast<KXFLibZipArchiver*>(state)->reportProgress(fraction);
}

bool writeAll(int fd, const std::uint8_t* bytes, std::size_t count) {
  while (count > 0) {
    const ssize_t written = ::write(fd, bytes, count);
    if (written < 0) {
      if (errno == EINTR) continue;
      return false;
    }
    bytes += written;
    count -= static_cast<std::size_t>(written);
  }
  return true;
}

}  // namespace

bool KXFLibZipArchiver::isSafeEntryName(std::string_view name) {
  if (name.empty() || name.front() == '/' || name.front() == '\\') return false;
  if (name.size() >= 2 && name[1] == ':') return false;
  std::size_t start = 0;
  while (start <= name.size()) {
    std::size_t end = name.find_first_of("/\\", start);
    if (end == std::string_view::npos) end = name.size();
    if (name.substr(start, end - start) == "..") return false;
    start = end + 1;
  }
  return name.back() != '/' && name.back() != '\\';
}

namespace {

// Opens an entry whose size is known, filling `stat`. Methods libzip cannot
// decode are refused before zip_fopen_index, whose failure path in libzip
// 1.7.3 leaks the entry's source for them.
ZipFileHandle openEntry(zip_t* archive, std::uint64_t index, zip_stat_t& stat) {
  if (zip_stat_index(archive, index, 0, &stat) != 0) return nullptr;
  const zip_uint64_t needed = ZIP_STAT_SIZE | ZIP_STAT_COMP_METHOD | ZIP_STAT_ENCRYPTION_METHOD;
  if ((stat.valid & needed) != needed || !zip_compression_method_supported(stat.comp_method, 0) ||
      (stat.encryption_method != ZIP_EM_NONE && !zip_encryption_method_supported(stat.encryption_method, 0))) {
    return nullptr;
  }
  return ZipFileHandle(zip_fopen_index(archive, index, 0));
}

// True when no folder between `folder` and `target` is a symbolic link, so
// a write cannot be steered outside `folder` by one planted there.
bool hasNoLinkedFolderBelow(const fs::path& folder, const fs::path& target) {
  fs::path walked = folder;
  const fs::path relative = target.lexically_relative(folder);
  for (auto part = relative.begin(); part != relative.end(); ++part) {
    if (std::next(part) == relative.end()) break;  // the target itself is opened with O_EXCL
    walked /= *part;
    std::error_code error;
    if (fs::is_symlink(fs::symlink_status(walked, error))) return false;
  }
  return true;
}

}  // namespace

void KXFLibZipArchiver::ZipDiscard::operator()(zip* archive) const noexcept { zip_discard(archive); }

KXFLibZipArchiver::KXFLibZipArchiver(ZipHandle zipFile, std::optional<std::string> password)
    : zipFile_(std::move(zipFile)), password_(std::move(password)) {}

KXFLibZipArchiver::~KXFLibZipArchiver() { static_cast<void>(close()); }

std::unique_ptr<KXFLibZipArchiver> KXFLibZipArchiver::archiverForPath(
    const fs::path& path, const std::optional<std::string>& password, bool appendExisting) {
  std::error_code error;
  const bool exists = fs::exists(path, error);
  const int flags = appendExisting && exists ? 0 : ZIP_CREATE;
  int openError = 0;
  // The handle is held before the object exists, so a failed open leaves
  // nothing to clean up and nothing to commit.
  ZipHandle handle(zip_open(path.c_str(), flags, &openError));
  if (!handle) return nullptr;
  std::unique_ptr<KXFLibZipArchiver> archiver(new KXFLibZipArchiver(std::move(handle), password));
  const bool ready = zip_register_progress_callback_with_state(archiver->zipFile(), kProgressPrecision,
                                                               forwardProgress, nullptr,
                                                               archiver.get()) == 0 &&
                     (!password || zip_set_default_password(archiver->zipFile(), password->c_str()) == 0);
  if (!ready) {
    archiver->discardChanges();  // never commit an archiver that was refused
    return nullptr;
  }
  return archiver;
}

bool KXFLibZipArchiver::setPassword(const std::optional<std::string>& password) {
  if (zipFile_ && zip_set_default_password(zipFile(), password ? password->c_str() : nullptr) != 0) {
    return false;
  }
  password_ = password;
  return true;
}

void KXFLibZipArchiver::raiseAddError(std::int64_t code, std::string_view subject) {
  if (!delegate_) return;
  const std::string description =
      KXAStringWithFormat(KXALocalizedString("KXFArchiveCannotAddError"), subject);
  delegate_->archiverDidRaiseError(*this, code, description);
}

std::optional<std::uint64_t> KXFLibZipArchiver::locate(std::string_view entryName) {
  if (!zipFile_) return std::nullopt;
  const std::string name(entryName);
  const zip_int64_t index = zip_name_locate(zipFile(), name.c_str(), 0);
  if (index < 0) return std::nullopt;
  return static_cast<std::uint64_t>(index);
}

bool KXFLibZipArchiver::addFileToArchiveAtPath(const fs::path& sourcePath, std::string_view entryName,
                                               bool replaceExisting) {
  if (!zipFile_) return false;
  ZipErrorGuard sourceError;
  ZipSourceHandle source(zip_source_file_create(sourcePath.c_str(), 0, 0, &sourceError.error));
  if (!source) {
    raiseAddError(zip_error_code_zip(&sourceError.error), sourcePath.string());
    return false;
  }
  // libzip opens the file only at close; a missing one would then fail the
  // whole write, so it is caught here, where the caller can still act.
  zip_stat_t sourceStat;
  if (zip_source_stat(source.get(), &sourceStat) != 0) {
    raiseAddError(zip_error_code_zip(zip_source_error(source.get())), sourcePath.string());
    return false;
  }
  const std::string name(entryName);
  const zip_flags_t flags = ZIP_FL_ENC_UTF_8 | (replaceExisting ? ZIP_FL_OVERWRITE : 0);
  const zip_int64_t index = zip_file_add(zipFile(), name.c_str(), source.get(), flags);
  if (index < 0) {
    raiseAddError(zip_error_code_zip(zip_get_error(zipFile())), name);
    return false;  // the source is still ours and freed here
  }
  static_cast<void>(source.release());  // the archive owns it now
  if (password_ && !password_->empty()) {
    const int result = zip_file_set_encryption(zipFile(), static_cast<zip_uint64_t>(index),
                                               kEncryptionMethodAES128, nullptr);
    if (result != 0) {
      raiseAddError(result, name);
      return false;
    }
  }
  return true;
}

std::optional<std::vector<std::uint8_t>> KXFLibZipArchiver::fileDataForFileWithName(
    std::string_view entryName) {
  const auto index = locate(entryName);
  if (!index) return std::nullopt;
  zip_stat_t stat;
  ZipFileHandle file = openEntry(zipFile(), *index, stat);
  if (!file) return std::nullopt;
  // The bytes are read (and checked) but not kept, so a recorded size, true
  // or not, never decides how much memory is taken.
  std::array<std::uint8_t, kCopyChunk> scratch;
  std::uint64_t total = 0;
  for (;;) {
    const zip_int64_t count = zip_fread(file.get(), scratch.data(), scratch.size());
    if (count < 0) return std::nullopt;
    if (count == 0) break;
    total += static_cast<std::uint64_t>(count);
    if (total > stat.size) return std::nullopt;
  }
  if (total != stat.size) return std::nullopt;
  return std::vector<std::uint8_t>{};
}

bool KXFLibZipArchiver::extractFileWithName(std::string_view entryName, const fs::path& folder) {
  if (!zipFile_ || !isSafeEntryName(entryName)) return false;
  const fs::path target = folder / fs::path(std::string(entryName));
  std::error_code error;
  if (fs::exists(fs::symlink_status(target, error)) || !hasNoLinkedFolderBelow(folder, target)) {
    return false;
  }
  const auto index = locate(entryName);
  if (!index) return false;
  zip_stat_t stat;
  ZipFileHandle file = openEntry(zipFile(), *index, stat);
  if (!file) return false;
  // O_EXCL with O_CREAT refuses an existing path, a symbolic link included,
  // so a file or link planted after the check above is not written through.
  FileDescriptor output(
      ::open(target.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0644));
  if (!output.valid()) return false;
  std::array<std::uint8_t, kCopyChunk> scratch;
  std::uint64_t total = 0;
  bool ok = true;
  // Read to the end rather than to the recorded size: libzip checks the CRC
  // only when it reaches the end of the data.
  for (;;) {
    const zip_int64_t count = zip_fread(file.get(), scratch.data(), scratch.size());
    if (count <= 0) {
      ok = count == 0;
      break;
    }
    total += static_cast<std::uint64_t>(count);
    if (total > stat.size || !writeAll(output.get(), scratch.data(), static_cast<std::size_t>(count))) {
      ok = false;
      break;
    }
  }
  ok = output.closeNow() && ok && total == stat.size;
  if (!ok) fs::remove(target, error);
  return ok;
}

bool KXFLibZipArchiver::deleteFile(std::string_view entryName) {
  const auto index = locate(entryName);
  return index && zip_delete(zipFile(), *index) == 0;
}

bool KXFLibZipArchiver::renameFile(std::string_view oldName, std::string_view newName) {
  const auto index = locate(oldName);
  const std::string name(newName);
  return index && zip_file_rename(zipFile(), *index, name.c_str(), ZIP_FL_ENC_UTF_8) == 0;
}

bool KXFLibZipArchiver::checkContainsFile(std::string_view entryName) {
  return locate(entryName).has_value();
}

void KXFLibZipArchiver::discardChanges() { zipFile_.reset(); }

bool KXFLibZipArchiver::close() {
  if (!zipFile_) return false;
  lastProgress_ = -1.0;
  if (zip_close(zipFile()) != 0) {
    zipFile_.reset();  // zip_discard: nothing is written
    return false;
  }
  static_cast<void>(zipFile_.release());  // zip_close freed it
  // libzip stops short of reporting the end; a progress bar should see it.
  if (lastProgress_ >= 0.0 && lastProgress_ < 1.0) reportProgress(1.0);
  return true;
}

void KXFLibZipArchiver::reportProgress(double fraction) {
  lastProgress_ = fraction;
  if (delegate_) delegate_->archiverProgress(*this, fraction);
}
