// Writing below a destination folder without ever leaving it: lexical checks
// of entry names, folders created one component at a time refusing symbolic
// links, and files written to a temporary beside their target and renamed
// into place, so a failed read never leaves a half-written file under the
// real name. Internal to the archive classes. POSIX only.
#pragma once

#include <cstdint>
#include <ctime>
#include <filesystem>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

// True when `name` (already using '/' only) may be joined below a folder: not
// empty, no leading '/', no ".." component, no drive prefix such as "C:".
[[nodiscard]] bool KXFIsSafeEntryName(std::string_view name) noexcept;

// Creates `relativeName` (a safe entry name) as a folder below `destination`,
// with its intermediate folders, never following a symbolic link below the
// destination. Returns 0 or an errno value (ELOOP or ENOTDIR for a link).
[[nodiscard]] int KXFCreateFoldersBelow(const std::filesystem::path& destination, std::string_view relativeName);

// One output file: created as a hidden temporary in its folder, renamed over
// the target by commit(), unlinked by discard() or by destruction.
class KXFSafeTargetFile {
 public:
  KXFSafeTargetFile() = default;
  KXFSafeTargetFile(const KXFSafeTargetFile&) = delete;
  KXFSafeTargetFile& operator=(const KXFSafeTargetFile&) = delete;
  ~KXFSafeTargetFile();

  // Opens a temporary for `relativeName` below `folder`; with `createParents`
  // the name's folders are created first (refusing links). Returns 0 or errno.
  [[nodiscard]] int open(const std::filesystem::path& folder, std::string_view relativeName, bool createParents);
  // Appends bytes (buffered). Returns 0 or errno.
  [[nodiscard]] int write(std::span<const std::uint8_t> bytes);
  // Flushes, sets the modification time when given, renames over the target
  // (replacing a link there, never writing through it). Returns 0 or errno.
  [[nodiscard]] int commit(std::optional<std::time_t> modified);
  // Drops the temporary. Safe to call more than once.
  void discard() noexcept;

 private:
  [[nodiscard]] int flush();

  int folderFd_ = -1;
  int fileFd_ = -1;
  std::string temporaryName_;
  std::string finalName_;
  std::vector<std::uint8_t> buffer_;
};
