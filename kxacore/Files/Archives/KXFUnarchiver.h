// Reads zip archives: extracts all entries below a folder, walks entries into
// memory, extracts the first entry to a file, and answers whether an archive
// is password-protected and whether a password is right. Stored and deflate
// entries, plain or with traditional (ZipCrypto) encryption. Failures and
// progress go to an optional delegate; nothing is thrown.
//
// Hostile archives. Beyond the codes below, these rules hold:
// - unarchiveFileTo refuses (kKXFArchiveErrorUnsafeName) an entry whose name,
//   after '\' becomes '/', is empty or has a ".." component, a leading '/' or
//   a drive prefix ("C:"), also when a delegate's corrected name is unsafe;
//   nothing is written and the run goes on with the next entry.
// - Symbolic-link entries (Unix mode S_IFLNK) are never created: reported as
//   kKXFArchiveErrorSymbolicLink and skipped. Folders below the destination
//   are opened one component at a time refusing links, and files are created
//   beside their target and renamed over it, so nothing is written through a
//   link below the destination (the destination itself is the caller's).
// - No buffer is reserved from a size a header declares: reading stops at the
//   real end of the data. An entry read into memory may produce at most
//   maximumEntryBytesInMemory() bytes; beyond that it is reported as
//   kKXFArchiveErrorEntryTooLarge and not handed out.
// - Methods other than stored (0) and deflate (8) are reported as
//   kKXFArchiveErrorUnsupportedMethod, never handed out undecoded.
// - Every entry read through is checked against its CRC: a mismatch is
//   reported as UNZ_CRCERROR (-105) and the entry is not handed out; its file
//   is deleted. A file is only ever written under its real name once its
//   entry was read without error (or the delegate stopped the read, in which
//   case it stays, shortened).
// - A wrong password on a deflated entry gives kKXFArchiveErrorWrongPassword;
//   on a stored entry it shows as the CRC failure.
//
// Ownership and threads: the unarchiver owns its open reader; the delegate is
// not owned. One thread at a time; delegate calls and blocks arrive
// synchronously on the calling thread.
#pragma once

#include <cstdint>
#include <filesystem>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "kxacore/Files/Archives/KXFZipEntryReader.h"

class KXFUnarchiver;

// Codes of the library's own beyond minizip's (negative) and errno (positive).
inline constexpr std::int64_t kKXFArchiveErrorWrongPassword = -7001;
inline constexpr std::int64_t kKXFArchiveErrorUnsafeName = -7002;
inline constexpr std::int64_t kKXFArchiveErrorSymbolicLink = -7003;
inline constexpr std::int64_t kKXFArchiveErrorUnsupportedMethod = -7004;
inline constexpr std::int64_t kKXFArchiveErrorEntryTooLarge = -7005;

// Every call has a default body that does what an absent delegate does.
class KXFUnarchiverDelegate {
 public:
  virtual ~KXFUnarchiverDelegate() = default;
  virtual void unarchiverDidRaiseError(KXFUnarchiver& unarchiver, std::int64_t code, const std::string& description);
  // The name every later call, target path and block sees; default unchanged.
  virtual std::string correctedNameForUnarchiverAndFileName(KXFUnarchiver& unarchiver, const std::string& fileName);
  virtual void unarchiverWillUnarchiveFileTo(KXFUnarchiver& unarchiver, const std::string& fileName, bool isDirectory,
                                             bool& shouldSkip, bool& shouldStop);
  virtual void unarchiverUnarchivingFileTo(KXFUnarchiver& unarchiver, const std::string& fileName,
                                           std::uint64_t handledBytes, bool& shouldStop);
  virtual void unarchiverDidUnarchiveFileTo(KXFUnarchiver& unarchiver, const std::string& fileName, bool& shouldStop);
};

// What the central directory says of one entry (header values, unverified).
struct KXFArchiveEntryInfo {
  std::string name;
  std::uint64_t size = 0;
  std::uint64_t compressedSize = 0;
  std::uint32_t crc = 0;
  bool encrypted = false;
  bool directory = false;
  bool symbolicLink = false;
  unsigned long method = 0;
  std::optional<std::time_t> modified;
};

class KXFUnarchiver {
 public:
  // Block of enumerateFilesWithBlock: the entry's name and bytes (the block
  // may move them out) and the stop flag.
  using EntryBlock = std::function<void(const std::string& name, std::vector<std::uint8_t>& bytes, bool& stop)>;

  // Opens the archive at `path`; a non-empty password is used for every
  // encrypted entry. None when the file is missing or no zip.
  [[nodiscard]] static std::unique_ptr<KXFUnarchiver> withPath(const std::filesystem::path& path,
                                                               std::optional<std::string> password = std::nullopt);
  [[nodiscard]] static std::unique_ptr<KXFUnarchiver> unarchiverWithPath(const std::filesystem::path& path) {
    return withPath(path);
  }

  KXFUnarchiver(const KXFUnarchiver&) = delete;
  KXFUnarchiver& operator=(const KXFUnarchiver&) = delete;
  ~KXFUnarchiver();

  void setDelegate(KXFUnarchiverDelegate* delegate) noexcept { delegate_ = delegate; }
  [[nodiscard]] KXFUnarchiverDelegate* delegate() const noexcept { return delegate_; }

  // Bytes one entry may produce in memory (enumerateFilesWithBlock); 1 GiB by default.
  void setMaximumEntryBytesInMemory(std::uint64_t bytes) noexcept { maximumEntryBytes_ = bytes; }
  [[nodiscard]] std::uint64_t maximumEntryBytesInMemory() const noexcept { return maximumEntryBytes_; }

  // Extracts every entry below `destination` (created when missing). True at
  // the end of the list, after a delegate's stop, and after a target file
  // could not be created (which stops the run); false when the first entry
  // cannot be reached, an entry cannot be opened (other than -103, which is
  // tolerated) or described. Read errors are reported and the run goes on.
  bool unarchiveFileTo(const std::filesystem::path& destination);

  // Reads each file entry into memory and hands it to `block`. Directories,
  // skipped entries and entries that failed do not reach the block. Result
  // as for unarchiveFileTo.
  bool enumerateFilesWithBlock(const EntryBlock& block);

  // Entry count from the archive's directory.
  [[nodiscard]] std::uint64_t totalNumberOfFiles() const noexcept { return totalFiles_; }
  // Sum of the declared uncompressed sizes, up to the first entry that
  // cannot be opened or described.
  [[nodiscard]] std::uint64_t totalNumberOfBytes();
  // The central directory's view of every entry, without reading data; none
  // when the directory cannot be walked.
  [[nodiscard]] std::optional<std::vector<KXFArchiveEntryInfo>> entries();

  // Extracts the first entry (opened without the password) to `target`,
  // replacing any file there. False only when the first entry cannot be
  // reached, opened or described; true once its information was read, even
  // after a read error or an uncreatable target (both reported). An empty
  // target writes nothing.
  bool extractFirstFileToFile(const std::filesystem::path& target);

  // Closes the reader; true on success, false when it failed or was closed.
  bool close();

  // True when the first entry can be read and is encrypted (only it is examined).
  [[nodiscard]] static bool isProtectedArchiveAtPath(const std::filesystem::path& path);
  // True when the first entry opened with `password` yields bytes in its
  // first 4096 (an empty first entry therefore answers false). An encrypted
  // entry whose header check byte refuses the password answers false.
  [[nodiscard]] static bool isCorrectPassword(std::string_view password, const std::filesystem::path& path);

 private:
  enum class Mode { kExtract, kEnumerate };
  struct Entry;

  KXFUnarchiver(KXFUniqueUnzFile file, std::optional<std::string> password) noexcept;
  bool walkEntries(Mode mode, const std::filesystem::path& destination, const EntryBlock* block);
  void report(std::int64_t code, const std::string& description);
  void reportCannotOpen(std::int64_t code);
  void reportReadError(int readCode, const Entry& entry);
  void reportCorruption(std::int64_t code, const std::string& name);
  void extractEntry(Entry& entry, const std::filesystem::path& destination, bool& stop);
  void enumerateEntry(Entry& entry, const EntryBlock& block, bool& stop);
  [[nodiscard]] std::string_view password() const noexcept;

  KXFUniqueUnzFile unzFile_;
  std::optional<std::string> password_;
  KXFUnarchiverDelegate* delegate_ = nullptr;
  std::uint64_t totalFiles_ = 0;
  std::uint64_t maximumEntryBytes_ = std::uint64_t{1} << 30;
};
