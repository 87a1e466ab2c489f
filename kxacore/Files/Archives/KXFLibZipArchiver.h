// KXFLibZipArchiver: edits a zip archive through libzip. It adds files
// (optionally replacing an entry of the same name, optionally encrypted with
// AES-128), deletes and renames entries, tells whether an entry exists,
// extracts one entry into a folder, and commits or discards every change at
// the end. Changes are collected by libzip and written only by close(), whose
// progress goes to the delegate as a fraction.
//
//   auto archiver = KXFLibZipArchiver::archiverForPath("notes.zip", "secret", true);
//   if (!archiver) return;                               // cannot be opened
//   archiver->setDelegate(&myDelegate);
//   archiver->addFileToArchiveAtPath("/tmp/a.txt", "a.txt", true);
//   archiver->renameFile("old.txt", "new.txt");
//   if (!archiver->close()) { /* nothing was written */ }
//
// Commit on destruction: an archiver that is simply destroyed closes, and so
// commits its pending changes; call discardChanges() first to drop them.
// After discardChanges() (or close()) the archiver holds no archive: every
// operation answers false or nothing, close() answers false, and destruction
// does nothing.
//
// Files added are read when the archive is closed, not when they are added:
// they must still exist and be readable then, or close() fails and drops
// every change. Their bytes are streamed, never loaded whole.
//
// Closing an archive that holds no entries writes no file; an existing
// archive whose last entry was deleted is removed (libzip's behaviour).
//
// Errors: no exceptions. Only the adding calls report failures to the
// delegate (libzip's error code and the localized "KXFArchiveCannotAddError"
// text); everything else answers false or nothing.
//
// Thread safety: one archiver serves one thread at a time. Delegate calls
// come synchronously on the calling thread (progress from inside close()).
#pragma once

#include <cstdint>
#include <filesystem>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

struct zip;

class KXFLibZipArchiver;

// Receives failures and progress. Both callbacks are optional: the default
// bodies do nothing, as an unanswered delegate call would. Held as a
// non-owning pointer; the caller keeps it alive while the archiver uses it.
class KXFLibZipArchiverDelegate {
 public:
  virtual ~KXFLibZipArchiverDelegate() = default;
  // Adding a file failed: `code` is libzip's error code (ZIP_ER_...),
  // `description` the localized text naming the file or entry.
  virtual void archiverDidRaiseError(KXFLibZipArchiver& archiver, std::int64_t code,
                                     std::string_view description) {
    static_cast<void>(archiver);
    static_cast<void>(code);
    static_cast<void>(description);
  }
  // Progress of writing the archive during close(), from 0.0 to 1.0.
  virtual void archiverProgress(KXFLibZipArchiver& archiver, double fraction) {
    static_cast<void>(archiver);
    static_cast<void>(fraction);
  }
};

class KXFLibZipArchiver {
 public:
  // Encryption method of entries added under a non-empty password.
  static constexpr std::uint16_t kEncryptionMethodAES128 = 257;
  // Progress is reported each time the write has advanced by this fraction.
  static constexpr double kProgressPrecision = 0.5;

  // Opens (or, when missing, prepares to create) the archive at `path`.
  // An existing archive is always opened with its entries kept, never
  // truncated. With `appendExisting` the archive is opened without libzip's
  // create flag when a file exists there; either way the result is the same
  // for a valid archive. A password (even an empty one) becomes the default
  // password of the archive; a non-empty one encrypts every entry added with
  // AES-128 and opens encrypted entries for reading.
  // Returns null when the file is not a readable zip archive (or libzip
  // refuses the password or the progress callback); nothing is then touched.
  [[nodiscard]] static std::unique_ptr<KXFLibZipArchiver> archiverForPath(
      const std::filesystem::path& path, const std::optional<std::string>& password = std::nullopt,
      bool appendExisting = false);
  [[nodiscard]] static std::unique_ptr<KXFLibZipArchiver> archiverForPath(
      const std::filesystem::path& path, bool appendExisting) {
    return archiverForPath(path, std::nullopt, appendExisting);
  }

  KXFLibZipArchiver(const KXFLibZipArchiver&) = delete;
  KXFLibZipArchiver& operator=(const KXFLibZipArchiver&) = delete;
  // Closes, which commits pending changes (see the top of this file).
  ~KXFLibZipArchiver();

  [[nodiscard]] KXFLibZipArchiverDelegate* delegate() const { return delegate_; }
  void setDelegate(KXFLibZipArchiverDelegate* delegate) { delegate_ = delegate; }
  // The libzip handle (owned by the archiver), or null once closed or discarded.
  [[nodiscard]] zip* zipFile() const { return zipFile_.get(); }
  [[nodiscard]] const std::optional<std::string>& password() const { return password_; }
  // Also becomes libzip's default password, so entries added afterwards are
  // encrypted with it; false (and the old password kept) when libzip refuses.
  bool setPassword(const std::optional<std::string>& password);

  // Adds the file at `sourcePath` as `entryName` (UTF-8). Without
  // `replaceExisting` an existing entry of that name is an error
  // (ZIP_ER_EXISTS); with it the entry is overwritten. Returns false and
  // reports to the delegate when the source cannot be used or the entry
  // cannot be added; when only the encryption cannot be set, the entry stays
  // added unencrypted, the returned -1 is reported and the result is false.
  bool addFileToArchiveAtPath(const std::filesystem::path& sourcePath, std::string_view entryName,
                              bool replaceExisting = false);

  // Found and readable: an empty buffer (kept so, by design: it tells
  // found-and-readable from not; use extractFileWithName for the bytes).
  // Missing, unreadable, a wrong password, a bad CRC or a size different from
  // the one recorded: nothing. Memory stays bounded whatever the recorded size.
  [[nodiscard]] std::optional<std::vector<std::uint8_t>> fileDataForFileWithName(
      std::string_view entryName);

  // Writes entry `entryName` to `folder`/`entryName`. Returns false when the
  // target already exists (left untouched, also when it is a symbolic link),
  // when its parent folder is missing (no folders are made), when the name
  // holds a ".." component, starts with '/' or a drive prefix ("C:"), when a
  // folder on the way below `folder` is a symbolic link, or when reading
  // fails (wrong password, bad CRC, damaged data: the partial target is then
  // deleted).
  bool extractFileWithName(std::string_view entryName, const std::filesystem::path& folder);

  // Each returns true when the entry was found and the change recorded.
  bool deleteFile(std::string_view entryName);
  // The new name is stored as UTF-8; an existing entry of that name is an error.
  bool renameFile(std::string_view oldName, std::string_view newName);
  // False for a name that would leave the folder it is extracted to: empty,
  // ending in a separator, starting with '/' or '\\' or a drive prefix
  // ("C:"), or holding a ".." component (either separator counts).
  [[nodiscard]] static bool isSafeEntryName(std::string_view entryName);
  // Exact, case-sensitive, full-path match.
  [[nodiscard]] bool checkContainsFile(std::string_view entryName);

  // Drops every pending change and the archive without writing anything.
  void discardChanges();
  // Writes every pending change (progress to the delegate; a final 1.0 is
  // added when libzip stopped short of it) and releases the archive. Returns
  // true only when the write succeeded; on failure every change is dropped
  // and the file is as it was. False when nothing was open.
  bool close();

  // Forwards `fraction` to the delegate; called by libzip's progress callback.
  void reportProgress(double fraction);

 private:
  struct ZipDiscard {
    void operator()(zip* archive) const noexcept;
  };
  using ZipHandle = std::unique_ptr<zip, ZipDiscard>;

  KXFLibZipArchiver(ZipHandle zipFile, std::optional<std::string> password);
  void raiseAddError(std::int64_t code, std::string_view subject);
  [[nodiscard]] std::optional<std::uint64_t> locate(std::string_view entryName);

  ZipHandle zipFile_;
  std::optional<std::string> password_;
  KXFLibZipArchiverDelegate* delegate_ = nullptr;
  double lastProgress_ = -1.0;
};
