// Writes files from disk into a new or existing zip archive, optionally with
// traditional (ZipCrypto) encryption. Failures and progress go to an
// optional delegate; nothing is thrown.
//
// Ownership and threads: the archiver owns its open archive; the delegate is
// not owned (the caller keeps it alive while set). One thread at a time;
// delegate calls arrive synchronously on the calling thread.
#pragma once

#include <cstdint>
#include <filesystem>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "kxacore/Files/Archives/KXFZipEntryReader.h"

class KXFArchiver;

// Every call has a default body that does what an absent delegate does.
class KXFArchiverDelegate {
 public:
  virtual ~KXFArchiverDelegate() = default;
  // An entry could not be added: `code` is minizip's result, -1 when the
  // source could not be read for its CRC (with a password), or an errno value
  // when it cannot be opened or read (without one; no entry is added then).
  virtual void archiverDidRaiseError(KXFArchiver& archiver, std::int64_t code, const std::string& description);
  // Progress of one file, at most about 100 times per file; setting
  // `shouldStop` ends the entry early (it is kept, shortened).
  virtual void archiverArchivingFileWithName(KXFArchiver& archiver, const std::string& userFileName,
                                             std::uint64_t handledBytes, bool& shouldStop);
};

class KXFArchiver {
 public:
  // Opens `path` for writing: with `appendExisting` and an existing file,
  // entries are added to it; otherwise a new archive replaces any file
  // there. A non-empty password encrypts every entry added. None when the
  // archive cannot be opened (also for an existing file that is no zip).
  [[nodiscard]] static std::unique_ptr<KXFArchiver> forPath(const std::filesystem::path& path,
                                                            std::optional<std::string> password = std::nullopt,
                                                            bool appendExisting = false);
  [[nodiscard]] static std::unique_ptr<KXFArchiver> archiverForPath(const std::filesystem::path& path) {
    return forPath(path);
  }

  KXFArchiver(const KXFArchiver&) = delete;
  KXFArchiver& operator=(const KXFArchiver&) = delete;
  ~KXFArchiver();

  void setDelegate(KXFArchiverDelegate* delegate) noexcept { delegate_ = delegate; }
  [[nodiscard]] KXFArchiverDelegate* delegate() const noexcept { return delegate_; }

  // Deflate level for later entries: -1 (zlib's default) or 0 to 9.
  void setCompressionLevel(int level) noexcept { level_ = level < -1 || level > 9 ? -1 : level; }
  [[nodiscard]] int compressionLevel() const noexcept { return level_; }

  // Adds the file at `sourcePath` as `entryName`, with the file's
  // modification time. The source is streamed in 4096-byte chunks (never
  // loaded whole). Returns true on success, and also after the delegate
  // stopped the entry (it is closed shortened). An encrypted entry stopped
  // early keeps the check byte of the whole file's CRC, so other tools may
  // take it for a wrong password. False when the archive is closed or the
  // entry could not be opened, written or closed.
  bool addFileToArchiveAtPath(const std::filesystem::path& sourcePath, std::string_view entryName,
                              std::string_view userFileName);
  // The same with the source's last path component as the display name.
  bool addFileToArchiveAtPath(const std::filesystem::path& sourcePath, std::string_view entryName);

  // Writes the central directory and closes. True when minizip reported
  // success; false when it failed or nothing was open. Destruction closes.
  bool close();

 private:
  KXFArchiver(KXFUniqueZipFile file, std::optional<std::string> password) noexcept;
  void reportCannotAdd(std::int64_t code, std::string_view entryName);
  bool writePlainEntry(std::FILE* source, std::uint64_t size, std::string_view entryName,
                       std::string_view userFileName);
  bool writeEncryptedEntry(std::FILE* source, std::uint64_t size, std::uint32_t crc, std::string_view entryName,
                           std::string_view userFileName);

  KXFUniqueZipFile zipFile_;
  std::optional<std::string> password_;
  KXFArchiverDelegate* delegate_ = nullptr;
  int level_ = -1;
};
